// SPDX-License-Identifier: Apache-2.0
// Bytes in hexadecimal, two small digits each: "\x00\x9F" is 009f. For data in texts, metrics' bytes in what is
// recorded, and characters that can't be shown. Stateless. Threads: any. Allocates for `out` alone.
#pragma once

#include <string>
#include <string_view>

namespace tarn::plist {

// Appends one byte as two digits, the high half first.
inline void appendHex(std::string& out, char byte) {
  constexpr std::string_view kDigits = "0123456789abcdef";
  const auto value = static_cast<unsigned char>(byte);
  out += kDigits[value >> 4U];
  out += kDigits[value & 0xFU];
}

// Appends all bytes, without blanks between them or a mark before.
inline void appendHex(std::string& out, std::string_view bytes) {
  for (const char byte : bytes) {
    appendHex(out, byte);
  }
}

}  // namespace tarn::plist
