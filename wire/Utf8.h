// The UTF-8 check. Nearly all texts of messages are ASCII, so that case is inline and takes eight bytes at a time.
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
// missing continuation, an overlong form, a surrogate, or more than U+10FFFF.
std::size_t utf8CharacterLength(std::string_view text) noexcept;
// Whether the whole text is well-formed, whatever it holds.
bool isUtf8ByCharacter(std::string_view text) noexcept;
// Appends the text, each byte that belongs to no character replaced by U+FFFD.
void appendMendedUtf8(std::string& out, std::string_view text);

inline bool isAscii(std::string_view text) noexcept {
  const char* at = text.data();
  std::size_t left = text.size();
  std::uint64_t bits = 0;
  if (left >= sizeof bits) {
    std::uint64_t word;
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

inline bool isUtf8(std::string_view text) noexcept {
  return isAscii(text) || isUtf8ByCharacter(text);
}

}  // namespace tarn::wire
