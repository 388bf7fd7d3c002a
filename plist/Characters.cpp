// SPDX-License-Identifier: Apache-2.0
#include "plist/Characters.h"

namespace tarn::plist {

namespace {

// How many bytes the character has that begins with this one; 0: none does.
std::size_t lengthBehind(unsigned char lead) {
  if (lead < 0x80) return 1;
  if (lead < 0xC2) return 0;
  if (lead < 0xE0) return 2;
  if (lead < 0xF0) return 3;
  return lead < 0xF5 ? 4 : 0;
}

}  // namespace

std::optional<char32_t> takeCharacter(std::string_view& text) {
  const auto lead = static_cast<unsigned char>(text.front());
  const std::size_t length = lengthBehind(lead);
  if (length == 0 || length > text.size()) return std::nullopt;
  constexpr unsigned char kLeadBits[] = {0, 0x7F, 0x1F, 0x0F, 0x07};
  char32_t character = lead & kLeadBits[length];
  for (std::size_t index = 1; index < length; ++index) {
    const auto next = static_cast<unsigned char>(text[index]);
    if ((next & 0xC0) != 0x80) return std::nullopt;
    character = (character << 6) | (next & 0x3F);
  }
  constexpr char32_t kLeast[] = {0, 0, 0x80, 0x800, 0x10000};  // a longer form of a smaller character is malformed
  if (character < kLeast[length] || character > 0x10FFFF) return std::nullopt;
  text.remove_prefix(length);
  return character;
}

void appendCharacter(std::string& out, char32_t character) {
  const auto continuation = [&](unsigned shift) {
    out += static_cast<char>(0x80U | ((static_cast<unsigned>(character) >> shift) & 0x3FU));
  };
  const auto bits = static_cast<unsigned>(character);
  if (bits < 0x80) {
    out += static_cast<char>(bits);
  } else if (bits < 0x800) {
    out += static_cast<char>(0xC0U | (bits >> 6U));
    continuation(0);
  } else if (bits < 0x10000) {
    out += static_cast<char>(0xE0U | (bits >> 12U));
    continuation(6);
    continuation(0);
  } else {
    out += static_cast<char>(0xF0U | (bits >> 18U));
    continuation(12);
    continuation(6);
    continuation(0);
  }
}

bool isXmlCharacter(char32_t character) {
  return character == 0x9 || character == 0xA || character == 0xD || (character >= 0x20 && character <= 0xD7FF) ||
         (character >= 0xE000 && character <= 0xFFFD) || (character >= 0x10000 && character <= 0x10FFFF);
}

}  // namespace tarn::plist
