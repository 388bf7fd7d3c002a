// SPDX-License-Identifier: Apache-2.0
#include "fleet/privacy/JsonMembers.h"

#include <array>

namespace tarn::fleet {

namespace {

// As deep as anything is that the recorder writes, and some.
constexpr std::size_t kDeepest = 128;

constexpr std::string_view kNumber = "+-.0123456789eE";

}  // namespace

bool JsonMembers::fail() noexcept {
  failed_ = true;
  return false;
}

void JsonMembers::passBlanks() noexcept {
  while (at(place_) == ' ' || at(place_) == '\n' || at(place_) == '\r' || at(place_) == '\t') {
    ++place_;
  }
}

// From the first quote to past the last one.
bool JsonMembers::passText() noexcept {
  if (at(place_) != '"') return false;
  for (std::size_t i = place_ + 1; i < text_.size(); ++i) {
    if (text_[i] == '\\') {
      ++i;
    } else if (text_[i] == '"') {
      place_ = i + 1;
      return true;
    } else if (static_cast<unsigned char>(text_[i]) < ' ') {
      return false;
    }
  }
  return false;
}

bool JsonMembers::passPlain() noexcept {
  for (const std::string_view word : {"true", "false", "null"}) {
    if (text_.substr(place_, word.size()) == word) {
      place_ += word.size();
      return true;
    }
  }
  const std::size_t begin = place_;
  while (place_ < text_.size() && kNumber.find(text_[place_]) != std::string_view::npos) {
    ++place_;
  }
  return place_ > begin;
}

// Brackets that match, and texts between them; what else is there isn't looked at closer than that.
bool JsonMembers::passNested() noexcept {
  std::array<char, kDeepest> closing{};
  std::size_t depth = 0;
  while (place_ < text_.size()) {
    const char c = text_[place_];
    if (c == '"') {
      if (!passText()) return false;
      continue;
    }
    if (static_cast<unsigned char>(c) < ' ' && c != '\n' && c != '\r' && c != '\t') return false;
    ++place_;
    if (c == '{' || c == '[') {
      if (depth == kDeepest) return false;
      closing[depth++] = c == '{' ? '}' : ']';
    } else if (c == '}' || c == ']') {
      if (closing[--depth] != c) return false;
      if (depth == 0) return true;
    }
  }
  return false;
}

bool JsonMembers::passValue() noexcept {
  switch (at(place_)) {
    case '"':
      return passText();
    case '{':
    case '[':
      return passNested();
    default:
      return passPlain();
  }
}

bool JsonMembers::atEnd() noexcept {
  ++place_;
  passBlanks();
  failed_ = place_ != text_.size();
  return false;
}

bool JsonMembers::next() {
  passBlanks();
  if (!begun_) {
    if (at(place_) != '{') return fail();
    begun_ = true;
    ++place_;
    passBlanks();
    if (at(place_) == '}') return atEnd();
  } else if (at(place_) == ',') {
    ++place_;
    passBlanks();
  } else {
    return at(place_) == '}' ? atEnd() : fail();
  }
  const std::size_t key = place_;
  if (!passText()) return fail();
  key_ = text_.substr(key + 1, place_ - key - 2);
  passBlanks();
  if (at(place_) != ':') return fail();
  ++place_;
  passBlanks();
  const std::size_t value = place_;
  if (!passValue()) return fail();
  value_ = text_.substr(value, place_ - value);
  return true;
}

}  // namespace tarn::fleet
