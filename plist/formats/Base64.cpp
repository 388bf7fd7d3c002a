// SPDX-License-Identifier: Apache-2.0
#include "plist/formats/Base64.h"

#include <cstdint>
#include <utility>

namespace tarn::plist {

namespace {

constexpr std::string_view kBase64Alphabet = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";

}  // namespace

void appendBase64(std::string& out, std::string_view bytes) {
  const auto byteAt = [&](std::size_t at) -> std::uint32_t {
    return at < bytes.size() ? static_cast<unsigned char>(bytes[at]) : 0U;
  };
  for (std::size_t at = 0; at < bytes.size(); at += 3) {
    const std::uint32_t group = byteAt(at) << 16U | byteAt(at + 1) << 8U | byteAt(at + 2);
    out += kBase64Alphabet[group >> 18U];
    out += kBase64Alphabet[(group >> 12U) & 63U];
    out += at + 1 < bytes.size() ? kBase64Alphabet[(group >> 6U) & 63U] : '=';
    out += at + 2 < bytes.size() ? kBase64Alphabet[group & 63U] : '=';
  }
}

std::optional<std::string> decodeBase64(std::string_view text) {
  if (text.size() % 4 != 0) return std::nullopt;
  const std::size_t padding = text.ends_with("==") ? 2 : (text.ends_with('=') ? 1 : 0);
  std::string bytes;
  std::uint32_t bits = 0;
  int held = 0;
  for (const char c : text.substr(0, text.size() - padding)) {
    const std::size_t digit = kBase64Alphabet.find(c);
    if (digit == std::string_view::npos) return std::nullopt;
    bits = (bits << 6U) | static_cast<std::uint32_t>(digit);
    held += 6;
    if (held >= 8) {
      held -= 8;
      bytes.push_back(static_cast<char>((bits >> static_cast<unsigned>(held)) & 0xFFU));
    }
  }
  const bool leftOver = (bits & ((1U << static_cast<unsigned>(held)) - 1U)) != 0;
  return leftOver ? std::nullopt : std::optional(std::move(bytes));
}

}  // namespace tarn::plist
