// SPDX-License-Identifier: Apache-2.0
// RangeSection: what the page says of many sessions together. Stateless. Threads: any.
#pragma once

#include <cstdint>
#include <set>

#include "tools/report/Markup.h"
#include "tools/report/RangePicture.h"

namespace tarn::report {

// Appends the section, with headings of the second and third level: totals, sessions by application and type, active
// hours a day, overloads an hour, volumes, the worst sessions. Each picture has a table of the same numbers.
// `linked` are the sessions that have a section of their own in the page.
void writeRange(Markup& markup, const RangePicture& picture, const std::set<std::int64_t>& linked);

}  // namespace tarn::report
