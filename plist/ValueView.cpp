// SPDX-License-Identifier: Apache-2.0
#include "plist/ValueView.h"

#include <charconv>
#include <cmath>
#include <limits>

#include "plist/Packed.h"
#include "plist/Value.h"

namespace tarn::plist {

namespace {

constexpr double kTwoTo63 = 9223372036854775808.0;
constexpr double kTwoTo64 = 18446744073709551616.0;

// The part of a text that is a number: leading white space skipped, then sign, digits, point and exponent.
std::string_view numberPart(std::string_view text) noexcept {
  const std::size_t begin = text.find_first_not_of(" \t\n\v\f\r");
  if (begin == std::string_view::npos) return {};
  text.remove_prefix(begin);
  if (text.front() == '+') {
    text.remove_prefix(1);
    if (!text.empty() && text.front() == '-') return {};
  }
  const std::size_t first = !text.empty() && text.front() == '-' ? 1 : 0;
  const bool isDigitOrPoint = first < text.size() && (text[first] == '.' || (text[first] >= '0' && text[first] <= '9'));
  return isDigitOrPoint ? text : std::string_view();  // no "inf", no "nan"
}

double leadingDouble(std::string_view text) noexcept {
  const std::string_view number = numberPart(text);
  double value = 0;
  const auto result = std::from_chars(number.data(), number.data() + number.size(), value);
  if (result.ec == std::errc::result_out_of_range) {
    // Too large or too small for a double: which of the two tells the exponent's sign.
    const std::string_view used(number.data(), static_cast<std::size_t>(result.ptr - number.data()));
    const std::size_t exponent = used.find_first_of("eE");
    const bool tiny = exponent != std::string_view::npos ? used.find('-', exponent) != std::string_view::npos
                                                         : used.find_first_of("123456789") > used.find('.');
    const double magnitude = tiny ? 0.0 : HUGE_VAL;
    return used.front() == '-' ? -magnitude : magnitude;
  }
  return result.ec == std::errc() ? value : 0;
}

std::int64_t toInt64(double value) noexcept {
  if (std::isnan(value)) return 0;
  if (value >= kTwoTo63) return std::numeric_limits<std::int64_t>::max();
  if (value < -kTwoTo63) return std::numeric_limits<std::int64_t>::min();
  return static_cast<std::int64_t>(value);
}

std::uint64_t toUInt64(double value) noexcept {
  if (std::isnan(value) || value <= 0) return 0;
  return value >= kTwoTo64 ? std::numeric_limits<std::uint64_t>::max() : static_cast<std::uint64_t>(value);
}

bool integerEqualsDouble(std::int64_t integer, double number) noexcept {
  return number >= -kTwoTo63 && number < kTwoTo63 && std::trunc(number) == number &&
         static_cast<std::int64_t>(number) == integer;
}

bool unsignedEqualsDouble(std::uint64_t integer, double number) noexcept {
  return number >= 0 && number < kTwoTo64 && std::trunc(number) == number &&
         static_cast<std::uint64_t>(number) == integer;
}

bool isFloating(const ValueView& value) noexcept {
  return value.kind() == Kind::Float || value.kind() == Kind::Double;
}

bool integerEqualsFloating(const ValueView& integer, double number) noexcept {
  return integer.kind() == Kind::Unsigned ? unsignedEqualsDouble(integer.unsignedValue(), number)
                                          : integerEqualsDouble(integer.signedValue(), number);
}

bool numbersEqual(const ValueView& a, const ValueView& b) noexcept {
  if (isFloating(a) && isFloating(b)) {
    const double left = a.asDouble();
    const double right = b.asDouble();
    return left == right || (std::isnan(left) && std::isnan(right));
  }
  if (isFloating(a)) return integerEqualsFloating(b, a.asDouble());
  if (isFloating(b)) return integerEqualsFloating(a, b.asDouble());
  const bool leftUnsigned = a.kind() == Kind::Unsigned;
  if (leftUnsigned == (b.kind() == Kind::Unsigned)) return a.unsignedValue() == b.unsignedValue();
  const ValueView& plain = leftUnsigned ? b : a;
  return plain.signedValue() >= 0 && a.unsignedValue() == b.unsignedValue();
}

bool arraysEqual(const Array& a, const Array& b) noexcept {
  if (a.size() != b.size()) return false;
  for (auto left = a.begin(), right = b.begin(); left != a.end(); ++left, ++right) {
    if (!(*left == *right)) return false;
  }
  return true;
}

}  // namespace

ValueView::ValueView(const Array& array) noexcept : body_(array.body_), kind_(Kind::Array) {}

ValueView::ValueView(const Dictionary& dictionary) noexcept : body_(dictionary.body_), kind_(Kind::Dictionary) {}

ValueView::ValueView(const Value& value) noexcept : ValueView(value.view()) {}

Array ValueView::array() const noexcept {
  if (kind_ != Kind::Array) return {};
  detail::retainBody(body_);
  return Array(body_);
}

Dictionary ValueView::dictionary() const noexcept {
  if (kind_ != Kind::Dictionary) return {};
  detail::retainBody(body_);
  return Dictionary(body_);
}

double ValueView::asDouble() const noexcept {
  switch (kind_) {
    case Kind::Bool:
    case Kind::Signed:
      return static_cast<double>(signed_);
    case Kind::Unsigned:
      return static_cast<double>(unsigned_);
    case Kind::Float:
      return static_cast<double>(float_);
    case Kind::Double:
    case Kind::Date:
      return double_;
    case Kind::Text:
      return leadingDouble(text());
    case Kind::None:
    case Kind::Data:
    case Kind::Array:
    case Kind::Dictionary:
      return 0;
  }
  return 0;
}

std::int64_t ValueView::asInt64() const noexcept {
  switch (kind_) {
    case Kind::Bool:
    case Kind::Signed:
      return signed_;
    case Kind::Unsigned:
      return unsigned_ > static_cast<std::uint64_t>(std::numeric_limits<std::int64_t>::max())
                 ? std::numeric_limits<std::int64_t>::max()
                 : signed_;
    case Kind::Text: {
      // A plain integer keeps all its digits; anything else goes through a double.
      const std::string_view number = numberPart(text());
      std::int64_t value = 0;
      const auto result = std::from_chars(number.data(), number.data() + number.size(), value);
      const bool plain = result.ec == std::errc() && (result.ptr == number.data() + number.size() ||
                                                      (*result.ptr != '.' && (*result.ptr | 0x20) != 'e'));
      return plain ? value : toInt64(asDouble());
    }
    default:
      return toInt64(asDouble());
  }
}

std::uint64_t ValueView::asUInt64() const noexcept {
  switch (kind_) {
    case Kind::Bool:
    case Kind::Signed:
      return signed_ < 0 ? 0 : unsigned_;
    case Kind::Unsigned:
      return unsigned_;
    case Kind::Text: {
      const std::int64_t whole = asInt64();
      return whole == std::numeric_limits<std::int64_t>::max() ? toUInt64(asDouble())
                                                               : (whole < 0 ? 0 : static_cast<std::uint64_t>(whole));
    }
    default:
      return toUInt64(asDouble());
  }
}

bool ValueView::asBool() const noexcept {
  if (kind_ == Kind::Bool || kind_ == Kind::Signed) return signed_ != 0;  // nearly always, and no number is lost
  return asDouble() != 0;
}

std::string ValueView::asText() const {
  return description(*this);
}

bool operator==(const ValueView& a, const ValueView& b) noexcept {
  if (a.isNumber() && b.isNumber()) return numbersEqual(a, b);
  if (a.kind() != b.kind()) return false;
  switch (a.kind()) {
    case Kind::Text:
      return a.text() == b.text();
    case Kind::Data:
      return a.data() == b.data();
    case Kind::Date:
      return a.dateValue() == b.dateValue();
    case Kind::Array:
      return arraysEqual(a.array(), b.array());
    case Kind::Dictionary:
      return a.dictionary().equalsIgnoring(b.dictionary(), {});
    default:
      return true;
  }
}

}  // namespace tarn::plist
