// SPDX-License-Identifier: Apache-2.0
// Texts as the database takes them. A device's texts are bytes: what isn't UTF-8, or is the character 0, becomes
// U+FFFD, one for each byte. Threads: any.
#pragma once

#include <string>
#include <string_view>

namespace tarn::fleet {

// The text itself where nothing is to be replaced, else `made`.
std::string_view cleanText(std::string_view text, std::string& made);
// The same of a JSON document, in which also escapes can name what the database doesn't take: the character 0, and
// halves of pairs.
std::string_view cleanJson(std::string_view text, std::string& made);

}  // namespace tarn::fleet
