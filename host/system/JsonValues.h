// SPDX-License-Identifier: Apache-2.0
// JsonValues: property-list values as JSON text that people write by hand: defaults files, device properties, driver
// report channels, scripts.
//
// JSON integers are integers, other numbers doubles. Two forms hold what JSON has no word for: {"$date": seconds} is a
// date, {"$data": "base64"} is data; an object is such a form when that is its one member. There is no null. What is
// written here reads back equal.
//
// Reading builds the values while it goes, never recurses, and stops at the first fault with its line and column.
// Nesting is bounded; the size of the text is not: who reads a file bounds its bytes first. Threads: any; everything is
// stateless. Nothing is thrown.
#pragma once

#include <cstddef>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "plist/Value.h"
#include "plist/formats/Json.h"

namespace tarn::linux_host {

// Writing stands with the values, as floors below write JSON too; who reads here finds both under one roof.
using plist::JsonLayout;
using plist::jsonText;
using plist::kMaximumJsonNesting;

// What is wrong with a JSON text, and where: both counted from 1, the column in bytes, at the end of what was read.
struct JsonFault {
  std::size_t line = 1;
  std::size_t column = 1;
  // What is wrong, in printable ASCII, cut after 200 characters: it may quote the text, which others wrote.
  std::string text;

  // "3:14: null is not allowed here"
  std::string description() const;
};

struct JsonReading {
  plist::Value value;  // absent when there is a fault
  std::optional<JsonFault> fault;
  std::vector<std::size_t> memberLines;  // where each member of the outermost object begins, in its order
};

// What a null as the member of an object is. Anywhere else it is a fault.
enum class JsonNull {
  // Of scripts, device properties and what people type: who writes a null there means something that isn't so.
  Fault,
  Absent,  // the member isn't there; for files that people and other programs write
};

// Reads a whole text as one value; blanks may stand around it. Faults are: bad syntax or UTF-8, an object's member
// given twice, an integer outside -2^63 to 2^64-1, a NUL anywhere, a $date or $data whose content is no such, nesting
// beyond `maximumNesting` (the outermost container is level 1), anything after the value. With a fault there is no
// value and there are no lines. An empty text is a fault.
JsonReading readJson(std::string_view text, std::size_t maximumNesting = kMaximumJsonNesting,
                     JsonNull nullMember = JsonNull::Fault);

}  // namespace tarn::linux_host
