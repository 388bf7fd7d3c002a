// Strict JSON text for people and for comparing files: indented, with sorted keys.
//
// Beside appendJson (plist/formats/Json.h), which writes what JSON can't hold in another form, this one refuses it.
// Numbers, bools and texts are written alike.
#pragma once

#include <cstddef>
#include <optional>
#include <string>

#include "plist/ValueView.h"

namespace tarn::plist {

// Appends the value: two spaces a level, one member or item a line, members sorted by the bytes of their keys, empty
// containers as {} and []. `level` is the level at which the value begins, for the lines after its first.
//
// A date, data or a number that is not finite, at any depth, can't be written: then `out` stays as it was, and the
// result says what it is and where. Nothing: it worked.
[[nodiscard]] std::optional<std::string> appendPrettyJson(std::string& out, const ValueView& value,
                                                          std::size_t level = 0);

}  // namespace tarn::plist
