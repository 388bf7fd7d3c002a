// SPDX-License-Identifier: Apache-2.0
#include "recorder/store/GlobPattern.h"

#include <cstddef>

namespace tarn::recorder {

namespace {

constexpr std::size_t kNone = std::string_view::npos;

// The length of the character that begins here; a byte that begins no whole sequence is a character of its own.
std::size_t characterSize(std::string_view text, std::size_t at) noexcept {
  const auto lead = static_cast<unsigned char>(text[at]);
  const std::size_t size = lead < 0xC0 ? 1 : lead < 0xE0 ? 2 : lead < 0xF0 ? 3 : lead < 0xF8 ? 4 : 1;
  if (at + size > text.size()) return 1;
  for (std::size_t i = 1; i < size; ++i) {
    if ((static_cast<unsigned char>(text[at + i]) & 0xC0) != 0x80) return 1;
  }
  return size;
}

std::string_view characterAt(std::string_view text, std::size_t at) noexcept {
  return text.substr(at, characterSize(text, at));
}

// Characters compare by code point, which for UTF-8 is the order of their bytes once longer sequences come later.
bool notAfter(std::string_view a, std::string_view b) noexcept {
  return a.size() != b.size() ? a.size() < b.size() : a <= b;
}

struct SetMatch {
  std::size_t end = kNone;  // after the closing bracket; kNone when the set is never closed
  bool matches = false;
};

// Reads the set whose bracket stands at `at` and tests one character against it.
SetMatch matchSet(std::string_view pattern, std::size_t at, std::string_view character) noexcept {
  std::size_t next = at + 1;
  const bool negated = next < pattern.size() && (pattern[next] == '!' || pattern[next] == '^');
  if (negated) {
    ++next;
  }
  bool found = false;
  for (bool first = true; next < pattern.size(); first = false) {
    if (pattern[next] == ']' && !first) return {next + 1, found != negated};
    if (pattern[next] == '\\' && next + 1 < pattern.size()) {
      ++next;
    }
    const std::string_view low = characterAt(pattern, next);
    next += low.size();
    std::string_view high = low;
    if (next + 1 < pattern.size() && pattern[next] == '-' && pattern[next + 1] != ']') {
      ++next;
      if (pattern[next] == '\\' && next + 1 < pattern.size()) {
        ++next;
      }
      high = characterAt(pattern, next);
      next += high.size();
    }
    found = found || (notAfter(low, character) && notAfter(character, high));
  }
  return {};
}

// Matches the single element of the pattern at `at` (not a star) with the character; where the next element begins, or
// kNone when they don't match.
std::size_t matchOne(std::string_view pattern, std::size_t at, std::string_view character) noexcept {
  if (pattern[at] == '?') return at + 1;
  if (pattern[at] == '[') {
    const SetMatch set = matchSet(pattern, at, character);
    if (set.end != kNone) return set.matches ? set.end : kNone;
  }
  if (pattern[at] == '\\' && at + 1 < pattern.size()) {
    ++at;
  }
  const std::string_view wanted = characterAt(pattern, at);
  return wanted == character ? at + wanted.size() : kNone;
}

}  // namespace

bool globMatches(std::string_view pattern, std::string_view name) noexcept {
  std::size_t inPattern = 0;
  std::size_t inName = 0;
  std::size_t behindStar = kNone;  // where to go on when the last star must take one character more
  std::size_t starTook = 0;
  while (inName < name.size()) {
    if (inPattern < pattern.size() && pattern[inPattern] == '*') {
      behindStar = ++inPattern;
      starTook = inName;
      continue;
    }
    const std::string_view character = characterAt(name, inName);
    const std::size_t next = inPattern < pattern.size() ? matchOne(pattern, inPattern, character) : kNone;
    if (next != kNone) {
      inPattern = next;
      inName += character.size();
    } else if (behindStar != kNone) {
      starTook += characterSize(name, starTook);
      inName = starTook;
      inPattern = behindStar;
    } else {
      return false;
    }
  }
  while (inPattern < pattern.size() && pattern[inPattern] == '*') {
    ++inPattern;
  }
  return inPattern == pattern.size();
}

}  // namespace tarn::recorder
