// SPDX-License-Identifier: Apache-2.0
// Bytes as base64 text (RFC 4648, padded, no line breaks). Stateless. Threads: any.
#pragma once

#include <optional>
#include <string>
#include <string_view>

namespace tarn::plist {

// Appends four characters for each three bytes, the last ones padded with "=".
void appendBase64(std::string& out, std::string_view bytes);
// The bytes of a text; nothing when it is no such text: a wrong character, a blank included, a length that is no
// multiple of 4, padding in the middle, bits left over that aren't 0.
std::optional<std::string> decodeBase64(std::string_view text);

}  // namespace tarn::plist
