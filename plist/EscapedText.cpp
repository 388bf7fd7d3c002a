// SPDX-License-Identifier: Apache-2.0
#include "plist/EscapedText.h"

#include <cstddef>
#include <cstdint>
#include <cstring>
#include <optional>

#include "plist/Characters.h"
#include "plist/Hex.h"

namespace tarn::plist {

namespace {

void appendControl(std::string& out, char character) {
  switch (character) {
    case '\b':
      out += "\\b";
      return;
    case '\f':
      out += "\\f";
      return;
    case '\n':
      out += "\\n";
      return;
    case '\r':
      out += "\\r";
      return;
    case '\t':
      out += "\\t";
      return;
    default:
      out += "\\u00";
      appendHex(out, character);
  }
}

bool isControl(char character) {
  return static_cast<unsigned char>(character) < 0x20;
}

void appendCodePoint(std::string& out, char32_t character) {
  out += "\\u";
  appendHex(out, static_cast<char>(character >> 8U));
  appendHex(out, static_cast<char>(character & 0xFFU));
}

// Those above 127 that a terminal or a reader of lines obeys.
bool isObeyed(char32_t character) {
  return character < 0xA0 || character == 0x061C || (character >= 0x200E && character <= 0x200F) ||
         (character >= 0x2028 && character <= 0x202E) || (character >= 0x2066 && character <= 0x2069);
}

// Takes what begins with a byte that is no plain ASCII character off the front of the text.
void appendUnusual(std::string& out, std::string_view& text) {
  const std::string_view before = text;
  const std::optional<char32_t> character = takeCharacter(text);
  if (!character) {
    appendCodePoint(out, static_cast<unsigned char>(text.front()));
    text.remove_prefix(1);
  } else if (*character < 0x80 || isObeyed(*character)) {
    appendCodePoint(out, *character);
  } else {
    out.append(before.substr(0, before.size() - text.size()));
  }
}

bool isPlain(char character) {
  return character >= 0x20 && character < 0x7F;
}

// Texts are looked at by words of eight characters, in whatever order they lie in them: whether any of the eight is of
// a kind. A borrow only ever comes from a character that is of the kind itself.
constexpr std::uint64_t kOnes = 0x0101010101010101;
constexpr std::uint64_t kHighest = 0x80 * kOnes;
constexpr std::size_t kWord = sizeof(std::uint64_t);

std::uint64_t wordAt(std::string_view text, std::size_t at) {
  std::uint64_t eight = 0;
  std::memcpy(&eight, text.data() + at, kWord);
  return eight;
}

std::uint64_t below(std::uint64_t eight, std::uint64_t limit) {
  return (eight - limit * kOnes) & ~eight & kHighest;
}

bool anyIsUnusual(std::uint64_t eight) {
  return ((eight & kHighest) | below(eight, 0x20) | below(eight ^ 0x7F * kOnes, 1)) != 0;
}

// How many plain characters a text begins with.
std::size_t plainLength(std::string_view text) {
  std::size_t length = 0;
  while (text.size() - length >= kWord && !anyIsUnusual(wordAt(text, length))) {
    length += kWord;
  }
  while (length < text.size() && isPlain(text[length])) {
    ++length;
  }
  return length;
}

bool needsJsonEscape(char character) {
  return isControl(character) || character == '"' || character == '\\';
}

bool anyNeedsJsonEscape(std::uint64_t eight) {
  return (below(eight, 0x20) | below(eight ^ '"' * kOnes, 1) | below(eight ^ '\\' * kOnes, 1)) != 0;
}

// Nearly all keys and most texts are. The last word overlaps the one before.
bool isPlainJson(std::string_view text) {
  if (text.size() < kWord) {
    for (const char character : text) {
      if (needsJsonEscape(character)) return false;
    }
    return true;
  }
  for (std::size_t at = 0; at + kWord < text.size(); at += kWord) {
    if (anyNeedsJsonEscape(wordAt(text, at))) return false;
  }
  return !anyNeedsJsonEscape(wordAt(text, text.size() - kWord));
}

template <class NeedsEscape, class AppendEscape>
void appendEscaped(std::string& out, std::string_view text, NeedsEscape needsEscape, AppendEscape appendEscape) {
  std::size_t begin = 0;
  for (std::size_t at = 0; at < text.size(); ++at) {
    if (needsEscape(text[at])) [[unlikely]] {
      out.append(text, begin, at - begin);
      appendEscape(text[at]);
      begin = at + 1;
    }
  }
  out.append(text, begin);
}

}  // namespace

void appendEscapedControls(std::string& out, std::string_view text) {
  appendEscaped(out, text, isControl, [&](char character) { appendControl(out, character); });
}

void appendPrintable(std::string& out, std::string_view text, LineEnds lineEnds) {
  while (!text.empty()) {
    const std::size_t plain = plainLength(text);
    out.append(text.substr(0, plain));
    text.remove_prefix(plain);
    if (text.empty()) return;
    if (text.front() == '\n' && lineEnds != LineEnds::Escaped) {
      out += lineEnds == LineEnds::Indented ? "\n\t" : "\n";
      text.remove_prefix(1);
    } else {
      appendUnusual(out, text);
    }
  }
}

void appendJsonText(std::string& out, std::string_view text) {
  out += '"';
  if (isPlainJson(text)) [[likely]] {
    out += text;
  } else {
    appendEscaped(out, text, needsJsonEscape, [&](char character) {
      if (isControl(character)) {
        appendControl(out, character);
      } else {
        out += '\\';
        out += character;
      }
    });
  }
  out += '"';
}

}  // namespace tarn::plist
