// SPDX-License-Identifier: Apache-2.0
// JSON text of property-list values, by three policies: compact, sorted and pretty, and such that it reads back equal.
//
// Numbers keep their kind: a bool is true or false, an integer has no point, a float or double always reads back as one
// (10.0). The policies differ in what they do about what JSON can't hold. Stateless. Threads: any.
#pragma once

#include <cstddef>
#include <optional>
#include <string>

#include "plist/ValueView.h"

namespace tarn::plist {

// Appends the value as compact JSON, members in their own order. What JSON can't hold is written as text or number: a
// date as ISO 8601 text in UTC (2026-11-20T10:00:00Z, with the decimals it has, at most microseconds), a date outside
// the years 1 to 9999 as its seconds, data as base64 text, a number that is not finite as the text "nan", "inf" or
// "-inf", an absent value as null.
void appendJson(std::string& out, const ValueView& value);

// Appends the value for people and for comparing files: two spaces a level, one member or item a line, members sorted
// by the bytes of their keys, empty containers as {} and []. `level` is the level at which the value begins, for the
// lines after its first.
//
// A date, data or a number that is not finite, at any depth, can't be written: then `out` stays as it was, and the
// result says what it is and where. Nothing: it worked.
[[nodiscard]] std::optional<std::string> appendPrettyJson(std::string& out, const ValueView& value,
                                                          std::size_t level = 0);

// As deep as a dictionary may be on the wire; the outermost container is level 1.
constexpr std::size_t kMaximumJsonNesting = 64;

enum class JsonLayout {
  OneLine,   // without a line end
  Indented,  // a member or item a line, two blanks a level, a line end at the end
};

// The value as a text that reads back equal, members in their own order: a date is {"$date": seconds}, data is
// {"$data": "base64"}, either of which counts as a level. Nothing for what would not read back equal: an absent value,
// a number that is not finite, text that is not UTF-8, a dictionary that would read as one of the $ forms, nesting
// beyond the limit.
std::optional<std::string> jsonText(const ValueView& value, JsonLayout layout = JsonLayout::OneLine);

}  // namespace tarn::plist
