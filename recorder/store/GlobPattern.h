// SPDX-License-Identifier: Apache-2.0
// GlobPattern: matches event names the way people write file patterns.
//
//   *      any characters, none too (dots and slashes are ordinary characters)
//   ?      one character (a whole UTF-8 sequence)
//   [a-z]  one character of the set; [!...] and [^...] one that is not in it; "]" stands first to be in the set
//   \x     the character x itself
//
// A set that is never closed stands for its own characters. The whole name must match, case counts, and any bytes are
// fine on either side. Takes time in proportion to pattern times name at the worst. Threads: any.
#pragma once

#include <string_view>

namespace tarn::recorder {

bool globMatches(std::string_view pattern, std::string_view name) noexcept;

}  // namespace tarn::recorder
