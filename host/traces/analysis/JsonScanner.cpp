// SPDX-License-Identifier: Apache-2.0
#include "host/traces/analysis/JsonScanner.h"

#include <array>
#include <charconv>
#include <cmath>
#include <string>
#include <system_error>
#include <vector>

namespace tarn::trace_analysis {

namespace {

constexpr std::string_view kByteOrderMark = "\xEF\xBB\xBF";
constexpr std::uint32_t kFirstSurrogate = 0xD800;
constexpr std::uint32_t kFirstLowSurrogate = 0xDC00;
constexpr std::uint32_t kBehindSurrogates = 0xE000;

// The characters of a string that stand for themselves and need no look at their neighbours.
constexpr std::array<bool, 256> kPlain = [] {
  std::array<bool, 256> plain{};
  for (std::size_t i = 0x20; i < 0x80; ++i) {
    plain[i] = i != '"' && i != '\\';
  }
  return plain;
}();

bool isPlain(char character) noexcept {
  return kPlain[static_cast<unsigned char>(character)];
}

bool isDigit(char character) noexcept {
  return character >= '0' && character <= '9';
}

// How many bytes the UTF-8 sequence at the beginning has; 0 when it is none.
std::size_t sequenceBytes(std::string_view text) noexcept {
  const auto byte = [&](std::size_t i) { return static_cast<unsigned char>(text[i]); };
  const unsigned first = byte(0);
  const std::size_t bytes = first >= 0xF0 ? 4 : first >= 0xE0 ? 3 : 2;
  if (first < 0xC2 || first > 0xF4 || text.size() < bytes) return 0;
  // No longer than need be, no surrogate, none after the last character.
  const unsigned least = first == 0xE0 ? 0xA0 : first == 0xF0 ? 0x90 : 0x80;
  const unsigned most = first == 0xED ? 0x9F : first == 0xF4 ? 0x8F : 0xBF;
  if (byte(1) < least || byte(1) > most) return 0;
  for (std::size_t i = 2; i < bytes; ++i) {
    if (byte(i) < 0x80 || byte(i) > 0xBF) return 0;
  }
  return bytes;
}

void appendUtf8(std::string& out, std::uint32_t point) {
  const auto tail = [&](unsigned shift) { out += static_cast<char>(0x80 | (point >> shift & 0x3F)); };
  if (point < 0x80) {
    out += static_cast<char>(point);
  } else if (point < 0x800) {
    out += static_cast<char>(0xC0 | point >> 6);
    tail(0);
  } else if (point < 0x10000) {
    out += static_cast<char>(0xE0 | point >> 12);
    tail(6);
    tail(0);
  } else {
    out += static_cast<char>(0xF0 | point >> 18);
    tail(12);
    tail(6);
    tail(0);
  }
}

class Scanner {
 public:
  Scanner(std::string_view text, JsonListener& listener)
      : begin_(text.data()), at_(begin_), end_(begin_ + text.size()), listener_(listener) {}

  std::size_t position() const { return static_cast<std::size_t>(at_ - begin_) + 1; }

  // Whether the rest is one value.
  bool scan() {
    while (value()) {
      bool next = false;
      while (!next) {
        skipBlanks();
        if (open_.empty()) return at_ == end_;
        if (take(',')) {
          if (open_.back() == '}' && !key()) return false;
          next = true;
        } else if (take(open_.back())) {
          if (!close()) return false;
        } else {
          return false;
        }
      }
    }
    return false;
  }

 private:
  void skipBlanks() {
    while (at_ != end_ && (*at_ == ' ' || *at_ == '\n' || *at_ == '\r' || *at_ == '\t')) {
      ++at_;
    }
  }
  bool take(char character) {
    if (at_ == end_ || *at_ != character) return false;
    ++at_;
    return true;
  }
  bool takeWord(std::string_view word) {
    for (const char character : word) {
      if (!take(character)) return false;
    }
    return true;
  }

  // Takes a value; of one that holds others all up to the first of them that holds none.
  bool value() {
    for (;;) {
      skipBlanks();
      if (at_ == end_) return false;
      switch (*at_) {
        case '{':
          ++at_;
          open_.push_back('}');
          if (!listener_.beginObject()) return false;
          skipBlanks();
          if (take('}')) return close();
          if (!key()) return false;
          break;
        case '[':
          ++at_;
          open_.push_back(']');
          if (!listener_.beginArray()) return false;
          skipBlanks();
          if (take(']')) return close();
          break;
        default:
          return scalar();
      }
    }
  }
  bool close() {
    const bool isObject = open_.back() == '}';
    open_.pop_back();
    return isObject ? listener_.endObject() : listener_.endArray();
  }
  bool key() {
    skipBlanks();
    std::string_view text;
    if (!take('"') || !takeText(text) || !listener_.key(text)) return false;
    skipBlanks();
    return take(':');
  }
  bool scalar() {
    switch (*at_) {
      case '"': {
        ++at_;
        std::string_view text;
        return takeText(text) && listener_.text(text);
      }
      case 't':
        return takeWord("true");
      case 'f':
        return takeWord("false");
      case 'n':
        return takeWord("null");
      default:
        return takeNumber();
    }
  }

  // The text up to the quotation mark, which is taken too.
  bool takeText(std::string_view& text) {
    const char* const begin = at_;
    while (at_ != end_ && isPlain(*at_)) {
      ++at_;
    }
    text = std::string_view(begin, static_cast<std::size_t>(at_ - begin));
    if (take('"')) return true;
    decoded_.assign(text);
    while (!take('"')) {
      if (!takeCharacter()) return false;
    }
    text = decoded_;
    return true;
  }
  bool takeCharacter() {
    if (at_ == end_) return false;
    if (take('\\')) return takeEscape();
    const std::string_view rest(at_, static_cast<std::size_t>(end_ - at_));
    const std::size_t bytes = isPlain(*at_) ? 1 : sequenceBytes(rest);
    decoded_.append(at_, bytes);
    at_ += bytes;
    return bytes != 0;
  }
  bool takeEscape() {
    constexpr std::string_view kLetters = "\"\\/bfnrt";
    constexpr std::string_view kMeanings = "\"\\/\b\f\n\r\t";
    if (take('u')) return takeCodePoint();
    const std::size_t place = at_ == end_ ? std::string_view::npos : kLetters.find(*at_);
    if (place == std::string_view::npos) return false;
    decoded_ += kMeanings[place];
    ++at_;
    return true;
  }
  bool takeCodePoint() {
    std::uint32_t point = 0;
    if (!takeHex(point)) return false;
    if (point >= kFirstSurrogate && point < kBehindSurrogates) {
      std::uint32_t low = 0;
      const bool isPair = point < kFirstLowSurrogate && takeWord("\\u") && takeHex(low) && low >= kFirstLowSurrogate &&
                          low < kBehindSurrogates;
      if (!isPair) return false;
      point = 0x10000 + ((point - kFirstSurrogate) << 10) + (low - kFirstLowSurrogate);
    }
    appendUtf8(decoded_, point);
    return true;
  }
  bool takeHex(std::uint32_t& number) {
    constexpr std::ptrdiff_t kDigits = 4;
    if (end_ - at_ < kDigits) return false;
    const auto read = std::from_chars(at_, at_ + kDigits, number, 16);
    if (read.ptr != at_ + kDigits) return false;
    at_ += kDigits;
    return true;
  }

  bool takeDigits() {
    const char* const begin = at_;
    while (at_ != end_ && isDigit(*at_)) {
      ++at_;
    }
    return at_ != begin;
  }
  bool takeNumber() {
    const char* const begin = at_;
    const bool isNegative = take('-');
    if (!take('0') && !takeDigits()) return false;
    JsonListener::Number number;
    number.isWhole = true;
    if (take('.')) {
      number.isWhole = false;
      if (!takeDigits()) return false;
    }
    if (take('e') || take('E')) {
      number.isWhole = false;
      if (!take('+')) {
        static_cast<void>(take('-'));
      }
      if (!takeDigits()) return false;
    }
    if (std::from_chars(begin, at_, number.value).ec != std::errc()) {
      // Too small, which is as good as zero, or too large.
      long double wide = 0;
      if (std::from_chars(begin, at_, wide).ec != std::errc()) return false;
      number.value = static_cast<double>(wide);
      if (std::isinf(number.value)) return false;
    }
    if (number.isWhole && std::from_chars(begin, at_, number.whole).ec != std::errc()) {
      number.whole = isNegative ? INT64_MIN : INT64_MAX;
    }
    return listener_.number(number);
  }

  const char* const begin_;
  const char* at_;
  const char* const end_;
  JsonListener& listener_;
  std::vector<char> open_;  // what ends each value that is open, innermost last
  std::string decoded_;     // the last text with escapes
};

}  // namespace

std::optional<std::size_t> scanJson(std::string_view text, JsonListener& listener) {
  const std::size_t mark = text.starts_with(kByteOrderMark) ? kByteOrderMark.size() : 0;
  Scanner scanner(text.substr(mark), listener);
  return scanner.scan() ? std::nullopt : std::optional(mark + scanner.position());
}

}  // namespace tarn::trace_analysis
