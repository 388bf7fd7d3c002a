// SPDX-License-Identifier: Apache-2.0
// The UTF-8 check. Nearly all texts of messages are ASCII, so that case is inline and takes eight bytes at a time.
//
//   bytes of a character                    stands for
//   00-7F                                   U+0000 to U+007F
//   C2-DF 80-BF                             U+0080 to U+07FF
//   E0-EF 80-BF 80-BF                       U+0800 to U+FFFF, after E0 from A0 on, after ED up to 9F
//   F0-F4 80-BF 80-BF 80-BF                 U+10000 to U+10FFFF, after F0 from 90 on, after F4 up to 8F
//
// Nothing else is well-formed. Nothing allocates but appendMendedUtf8().
//
// Stateless. Threads: any.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstring>
#include <string>
#include <string_view>

namespace tarn::wire {

// Length of the well-formed character at the front of a text that isn't empty: 1 to 4; 0 when there is none: a stray or
// missing continuation, an overlong form, a surrogate, or more than U+10FFFF. Looks at no byte beyond that character.
std::size_t utf8CharacterLength(std::string_view text) noexcept;
// Whether the whole text is well-formed, whatever it holds, a zero included. One character after the other: for texts
// that aren't ASCII.
bool isUtf8ByCharacter(std::string_view text) noexcept;
// Appends the text, each byte that belongs to no character replaced by U+FFFD. Up to three times as long as the text; a
// text that is well-formed comes out as it was. For texts of others that are recorded or sent: names of processes,
// errors.
void appendMendedUtf8(std::string& out, std::string_view text);

// Whether no byte has its highest bit. Loads eight at a time, the last ones overlapping those before, so there is no
// tail to go through byte by byte; an empty text is ASCII.
inline bool isAscii(std::string_view text) noexcept {
  const char* at = text.data();
  std::size_t left = text.size();
  std::uint64_t bits = 0;
  if (left >= sizeof bits) {
    std::uint64_t word;
    // All words are gathered before they are looked at: no branch a word.
    for (; left > sizeof word; at += sizeof word, left -= sizeof word) {
      std::memcpy(&word, at, sizeof word);
      bits |= word;
    }
    std::memcpy(&word, at + left - sizeof word, sizeof word);  // the last eight, some of them seen before
    bits |= word;
  } else if (left >= 4) {
    std::uint32_t first;
    std::uint32_t last;
    std::memcpy(&first, at, sizeof first);
    std::memcpy(&last, at + left - sizeof last, sizeof last);
    bits = first | last;
  } else {
    for (; left > 0; ++at, --left) {
      bits |= static_cast<unsigned char>(*at);
    }
  }
  return (bits & 0x8080808080808080U) == 0;
}

// Whether the text is well-formed UTF-8. It costs a load for eight bytes when it is ASCII; anything else is looked at
// twice.
inline bool isUtf8(std::string_view text) noexcept {
  return isAscii(text) || isUtf8ByCharacter(text);
}

}  // namespace tarn::wire
