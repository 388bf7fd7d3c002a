// SPDX-License-Identifier: Apache-2.0
#include "fleet/collect/CleanText.h"

#include <algorithm>
#include <charconv>
#include <optional>

#include "plist/Characters.h"

namespace tarn::fleet {

namespace {

constexpr std::string_view kReplacement = "\xEF\xBF\xBD";
constexpr std::string_view kReplacementEscape = "\\ufffd";
constexpr std::size_t kEscape = 6;  // of "\u0000"

bool isSurrogate(char32_t character) {
  return character >= 0xD800 && character <= 0xDFFF;
}
bool isHighHalf(char32_t character) {
  return character >= 0xD800 && character <= 0xDBFF;
}
bool isLowHalf(char32_t character) {
  return character >= 0xDC00 && character <= 0xDFFF;
}

bool isPlain(std::string_view text) {
  return std::all_of(text.begin(), text.end(), [](char c) { return static_cast<signed char>(c) > 0; });
}

// How much of the front can be taken as it is: up to the end, or the first byte to replace.
std::size_t goodFront(std::string_view text) {
  std::string_view rest = text;
  while (!rest.empty()) {
    const std::size_t left = rest.size();
    const std::optional<char32_t> character = plist::takeCharacter(rest);
    if (!character || *character == 0 || isSurrogate(*character)) return text.size() - left;
  }
  return text.size();
}

// What the escape at a place names; nothing where there is none, or no whole one.
std::optional<char32_t> escapeAt(std::string_view text, std::size_t place) {
  if (place + kEscape > text.size() || text[place] != '\\' || text[place + 1] != 'u') return std::nullopt;
  const char* const begin = text.data() + place + 2;
  unsigned value = 0;
  const auto [end, error] = std::from_chars(begin, begin + 4, value, 16);
  if (error != std::errc() || end != begin + 4) return std::nullopt;
  return value;
}

// Copies the text with such escapes replaced.
void appendEscapes(std::string& out, std::string_view text) {
  for (std::size_t i = 0; i < text.size();) {
    const std::optional<char32_t> named = escapeAt(text, i);
    if (named && isHighHalf(*named) && isLowHalf(escapeAt(text, i + kEscape).value_or(0))) {
      out += text.substr(i, 2 * kEscape);
      i += 2 * kEscape;
    } else if (named) {
      out += *named == 0 || isSurrogate(*named) ? kReplacementEscape : text.substr(i, kEscape);
      i += kEscape;
    } else {
      // A backslash takes the next character with it, so that "\\u0000" is six characters and no escape.
      const std::size_t taken = text[i] == '\\' ? 2 : 1;
      out += text.substr(i, taken);
      i += taken;
    }
  }
}

}  // namespace

std::string_view cleanText(std::string_view text, std::string& made) {
  if (isPlain(text)) return text;
  std::size_t good = goodFront(text);
  if (good == text.size()) return text;
  made.clear();
  while (!text.empty()) {
    made += text.substr(0, good);
    text.remove_prefix(good);
    if (!text.empty()) {
      made += kReplacement;
      text.remove_prefix(1);
    }
    good = goodFront(text);
  }
  return made;
}

std::string_view cleanJson(std::string_view text, std::string& made) {
  const std::string_view clean = cleanText(text, made);
  if (clean.find("\\u0000") == clean.npos && clean.find("\\ud") == clean.npos && clean.find("\\uD") == clean.npos) {
    return clean;
  }
  std::string escaped;
  appendEscapes(escaped, clean);
  made = std::move(escaped);
  return made;
}

}  // namespace tarn::fleet
