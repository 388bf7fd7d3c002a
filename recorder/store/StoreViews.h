// SPDX-License-Identifier: Apache-2.0
// StoreViews: the views by which people read the recorder's file with stock tools; docs/recorded.md tells what each is
// for. A view that is missing or reads otherwise is made anew when the file is opened, so they may change within one
// version of the layout. Nothing of ours reads through them. Threads: any.
#pragma once

#include <span>
#include <string_view>

namespace tarn::recorder {

// Something that the schema has, by its name, and the text that makes it.
struct Made {
  std::string_view name;
  std::string_view sql;
};

// One row an event, with the columns of `events`, for a file of which nothing is trusted but the rows themselves. The
// event's own row is `r`, its kind `k`.
constexpr std::string_view kSelectEvents =
    // Rows go ahead: nothing finds the rows of a kind but going through them.
    "SELECT r.id AS id, r.time AS time, k.backend AS backend, k.name AS name, CASE WHEN r.payload IS NULL THEN '{}' "
    "WHEN r.cut IS NULL THEN p.text ELSE substr(p.text, 1, r.cut >> 16) || substr(p.text, (r.cut >> 16) + "
    "(r.cut & 65535) + 1) END AS payload, k.text AS detail, r.session AS session FROM event_rows AS r CROSS JOIN "
    "event_texts AS k ON k.id = 2 * (r.id - r.kind) + 1 LEFT JOIN event_texts AS p ON p.id = 2 * (r.id - r.payload)";

// In the order in which they can be made.
std::span<const Made> storeViews();

}  // namespace tarn::recorder
