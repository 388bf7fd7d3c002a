// SPDX-License-Identifier: Apache-2.0
// Characters: UTF-8 one character at a time, for the readers and writers of property-list files. Stateless. Threads:
// any.
#pragma once

#include <optional>
#include <string>
#include <string_view>

namespace tarn::plist {

// Takes one character off the front of a text that isn't empty; nothing, and nothing taken, when it is malformed. A
// surrogate encoded as UTF-8 is taken as it is.
std::optional<char32_t> takeCharacter(std::string_view& text);
// Appends the character, which is at most U+10FFFF.
void appendCharacter(std::string& out, char32_t character);
// Whether an XML document may hold the character at all; escaping doesn't help those that it may not.
bool isXmlCharacter(char32_t character);

}  // namespace tarn::plist
