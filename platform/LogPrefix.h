// SPDX-License-Identifier: Apache-2.0
// What every log line begins with: the module, flush right, and the line of its source.
//
// Stateless. Threads: any.
#pragma once

#include <algorithm>
#include <cstddef>
#include <string>
#include <string_view>

namespace tarn::platform {

// What is written in the place of a line that there was no memory to form.
inline constexpr std::string_view kNoMemoryForLine = "out of memory for this line";

// Appends "%25s:%-5d ": 32 columns for most, so that texts begin below each other. A longer module or number is written
// whole and moves its text to the right. Allocates for `out` alone.
inline void appendLogPrefix(std::string& out, std::string_view module, int line) {
  // Wide enough for all but the longest of our class names; a line number of five digits is more than any file has.
  constexpr std::size_t kModuleWidth = 25;
  constexpr std::size_t kLineWidth = 5;
  out.append(kModuleWidth - std::min(module.size(), kModuleWidth), ' ').append(module).append(":");
  const std::string number = std::to_string(line);
  out.append(number).append(kLineWidth - std::min(number.size(), kLineWidth), ' ').append(" ");
}

}  // namespace tarn::platform
