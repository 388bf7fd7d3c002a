// SPDX-License-Identifier: Apache-2.0
// Text forms of values.
#include <array>
#include <charconv>
#include <cmath>

#include "plist/CalendarDate.h"
#include "plist/Dictionary.h"
#include "plist/EscapedText.h"
#include "plist/Hex.h"
#include "plist/ValueView.h"

namespace tarn::plist {

namespace {

// Decimal exponents from here up to there are written out in full; beyond them a power of ten is easier to read.
constexpr int kFirstFixedExponent = -4;
constexpr int kFirstLargeExponent = 16;

void appendInteger(std::string& out, auto value) {
  std::array<char, 24> digits;
  const auto result = std::to_chars(digits.begin(), digits.end(), value);
  out.append(digits.data(), result.ptr);
}

void appendExponent(std::string& out, int exponent) {
  out += exponent < 0 ? "e-" : "e+";
  const int magnitude = std::abs(exponent);
  if (magnitude < 10) {
    out += '0';
  }
  appendInteger(out, magnitude);
}

template <class Floating>
void appendShortest(std::string& out, Floating value) {
  if (std::isnan(value)) {
    out += "nan";
    return;
  }
  if (std::isinf(value)) {
    out += value < 0 ? "-inf" : "inf";
    return;
  }
  // The shortest digits that read back the same, as d[.ddd]e±xx; then laid out as a person would.
  std::array<char, 48> buffer;
  const auto result = std::to_chars(buffer.begin(), buffer.end(), value, std::chars_format::scientific);
  std::string_view text(buffer.data(), static_cast<std::size_t>(result.ptr - buffer.data()));
  if (text.front() == '-') {
    out += '-';
    text.remove_prefix(1);
  }
  const std::size_t mark = text.find('e');
  int exponent = 0;
  const char* const from = text.data() + mark + (text[mark + 1] == '+' ? 2 : 1);
  std::from_chars(from, text.data() + text.size(), exponent);
  std::string digits(text.substr(0, 1));
  if (mark > 2) {
    digits += text.substr(2, mark - 2);
  }
  const int count = static_cast<int>(digits.size());
  if (exponent < kFirstFixedExponent || exponent >= kFirstLargeExponent) {
    out += digits.front();
    if (count > 1) {
      out += '.';
      out.append(digits, 1);
    }
    appendExponent(out, exponent);
  } else if (exponent < 0) {
    out += "0.";
    out.append(static_cast<std::size_t>(-exponent - 1), '0');
    out += digits;
  } else if (count <= exponent + 1) {
    out += digits;
    out.append(static_cast<std::size_t>(exponent + 1 - count), '0');
  } else {
    const auto whole = static_cast<std::size_t>(exponent + 1);
    out.append(digits, 0, whole);
    out += '.';
    out.append(digits, whole);
  }
}

void appendDate(std::string& out, Date date) {
  if (const auto calendar = calendarDate(std::floor(date.epochSeconds))) {
    appendDateAndTime(out, *calendar, ' ');
    out += " +0000";
  } else {
    appendNumber(out, date.epochSeconds);
  }
}

void appendData(std::string& out, std::string_view bytes) {
  out += '<';
  appendHex(out, bytes);
  out += '>';
}

// Texts inside a container: control characters would break a line that holds the container.
void appendContained(std::string& out, const ValueView& value) {
  if (value.isText()) {
    appendEscapedControls(out, value.text());
  } else {
    appendDescription(out, value);
  }
}

void appendArray(std::string& out, const Array& array) {
  out += '(';
  bool first = true;
  for (const ValueView& item : array) {
    out += first ? "" : ", ";
    first = false;
    appendContained(out, item);
  }
  out += ')';
}

void appendDictionary(std::string& out, const Dictionary& dictionary) {
  out += '{';
  bool first = true;
  for (const Dictionary::Entry& entry : dictionary) {
    out += first ? "" : "; ";
    first = false;
    appendEscapedControls(out, entry.key.text());
    out += " = ";
    appendContained(out, entry.value);
  }
  out += '}';
}

}  // namespace

void appendNumber(std::string& out, double value) {
  appendShortest(out, value);
}

void appendNumber(std::string& out, float value) {
  appendShortest(out, value);
}

void appendNumber(std::string& out, std::int64_t value) {
  appendInteger(out, value);
}

void appendNumber(std::string& out, std::uint64_t value) {
  appendInteger(out, value);
}

void appendDescription(std::string& out, const ValueView& value) {
  switch (value.kind()) {
    case Kind::None:
      out += "(null)";
      return;
    case Kind::Bool:
      out += value.boolValue() ? '1' : '0';
      return;
    case Kind::Signed:
      return appendNumber(out, value.signedValue());
    case Kind::Unsigned:
      return appendNumber(out, value.unsignedValue());
    case Kind::Float:
      return appendNumber(out, value.floatValue());
    case Kind::Double:
      return appendNumber(out, value.doubleValue());
    case Kind::Date:
      return appendDate(out, value.dateValue());
    case Kind::Text:
      out += value.text();
      return;
    case Kind::Data:
      return appendData(out, value.data());
    case Kind::Array:
      return appendArray(out, value.array());
    case Kind::Dictionary:
      return appendDictionary(out, value.dictionary());
  }
}

std::string description(const ValueView& value) {
  std::string out;
  appendDescription(out, value);
  return out;
}

}  // namespace tarn::plist
