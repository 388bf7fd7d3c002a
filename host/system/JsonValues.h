// JsonValues: property-list values as JSON text that people write by hand: defaults files, device properties, scripts.
//
// JSON integers are integers, other numbers doubles. Two forms hold what JSON has no word for: {"$date": seconds} is a
// date, {"$data": "base64"} is data; an object is such a form when that is its one member. There is no null. What is
// written here reads back equal.
//
// Reading builds the values while it goes, never recurses, and stops at the first fault with its line and column.
// Nesting is bounded. Threads: any; everything is stateless. Nothing is thrown.
#pragma once

#include <cstddef>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "plist/Value.h"
#include "plist/formats/Json.h"

namespace tarn::linux_host {

using plist::JsonLayout;
using plist::jsonText;
using plist::kMaximumJsonNesting;

// What is wrong with a JSON text, and where: both counted from 1, the column in bytes, at the end of what was read.
struct JsonFault {
  std::size_t line = 1;
  std::size_t column = 1;
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
  Fault,
  Absent,  // the member isn't there; for files that people and other programs write
};

// Reads a whole text as one value. An object's member given twice is a fault.
JsonReading readJson(std::string_view text, std::size_t maximumNesting = kMaximumJsonNesting,
                     JsonNull nullMember = JsonNull::Fault);

}  // namespace tarn::linux_host
