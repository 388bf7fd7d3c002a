// SPDX-License-Identifier: Apache-2.0
// Whether a text is UTF-8: no stray byte, no overlong form, no surrogate, nothing over U+10FFFF. Bounded by the text's
// length, and eight bytes at a time where they are ASCII. Stateless. Threads: any.
//
//   00-7F                      one byte
//   C2-DF 80-BF                two
//   E0-EF 80-BF 80-BF          three; after E0 from A0 on, after ED up to 9F
//   F0-F4 80-BF 80-BF 80-BF    four; after F0 from 90 on, after F4 up to 8F
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstring>

namespace tarn::reporting {

// Bytes of the well-formed character at the front, 1 to 4; 0 when there is none. At least one byte must be left.
inline std::size_t characterLength(const unsigned char* at, std::size_t left) noexcept {
  const unsigned first = at[0];
  if (first < 0x80) return 1;
  const std::size_t length = first >= 0xF0 ? 4 : first >= 0xE0 ? 3 : 2;
  if (first < 0xC2 || first > 0xF4 || left < length) return 0;
  // The second byte has a narrower range after some first ones.
  const unsigned least = first == 0xE0 ? 0xA0 : first == 0xF0 ? 0x90 : 0x80;
  const unsigned most = first == 0xED ? 0x9F : first == 0xF4 ? 0x8F : 0xBF;
  if (at[1] < least || at[1] > most) return 0;
  for (std::size_t i = 2; i < length; ++i) {
    if ((at[i] & 0xC0U) != 0x80) return 0;
  }
  return length;
}

// Whether the eight or the four bytes from here on are ASCII.
inline bool isAscii8(const unsigned char* at) noexcept {
  std::uint64_t word = 0;
  std::memcpy(&word, at, sizeof word);
  return (word & 0x8080808080808080U) == 0;
}
inline bool isAscii4(const unsigned char* at) noexcept {
  std::uint32_t word = 0;
  std::memcpy(&word, at, sizeof word);
  return (word & 0x80808080U) == 0;
}

// Whether all of it is well-formed; of an empty text it is. Used in post(), so it neither allocates nor calls anything.
inline bool isUtf8(const char* text, std::size_t length) noexcept {
  const auto* at = reinterpret_cast<const unsigned char*>(text);
  const unsigned char* const end = at + length;
  while (at != end) {
    const auto left = static_cast<std::size_t>(end - at);
    if (left >= 8) {
      if (isAscii8(at)) {
        at += 8;
        continue;
      }
    } else if (length >= 8) {
      // The few last ones together with some that were looked at before.
      if (isAscii8(end - 8)) return true;
    } else if (left >= 4 && isAscii4(at) && isAscii4(end - 4)) {
      return true;
    }
    const std::size_t taken = characterLength(at, left);
    if (taken == 0) return false;
    at += taken;
  }
  return true;
}

}  // namespace tarn::reporting
