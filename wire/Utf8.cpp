// SPDX-License-Identifier: Apache-2.0
#include "wire/Utf8.h"

namespace tarn::wire {

namespace {

// What may follow a leading byte: how many bytes in all, and the range of the second, which is where overlong forms,
// surrogates and too large values show. The rest are 0x80 to 0xBF.
struct Lead {
  std::size_t length;
  unsigned char secondMin = 0;
  unsigned char secondMax = 0;
};

Lead leadOf(unsigned char byte) noexcept {
  if (byte < 0x80) return {1};
  if (byte < 0xC2) return {0};
  if (byte < 0xE0) return {2, 0x80, 0xBF};
  if (byte == 0xE0) return {3, 0xA0, 0xBF};
  if (byte == 0xED) return {3, 0x80, 0x9F};
  if (byte < 0xF0) return {3, 0x80, 0xBF};
  if (byte == 0xF0) return {4, 0x90, 0xBF};
  if (byte < 0xF4) return {4, 0x80, 0xBF};
  if (byte == 0xF4) return {4, 0x80, 0x8F};
  return {0};
}

}  // namespace

std::size_t utf8CharacterLength(std::string_view text) noexcept {
  const Lead lead = leadOf(static_cast<unsigned char>(text[0]));
  if (lead.length < 2) return lead.length;
  if (text.size() < lead.length) return 0;
  const auto second = static_cast<unsigned char>(text[1]);
  if (second < lead.secondMin || second > lead.secondMax) return 0;
  for (std::size_t i = 2; i < lead.length; ++i) {
    if ((static_cast<unsigned char>(text[i]) & 0xC0U) != 0x80) return 0;
  }
  return lead.length;
}

bool isUtf8ByCharacter(std::string_view text) noexcept {
  while (!text.empty()) {
    const std::size_t length = utf8CharacterLength(text);
    if (length == 0) return false;
    text.remove_prefix(length);
  }
  return true;
}

void appendMendedUtf8(std::string& out, std::string_view text) {
  while (!text.empty()) {
    const std::size_t length = utf8CharacterLength(text);
    if (length == 0) {
      out += "\xEF\xBF\xBD";
    } else {
      out += text.substr(0, length);
    }
    text.remove_prefix(length == 0 ? 1 : length);
  }
}

}  // namespace tarn::wire
