// SPDX-License-Identifier: Apache-2.0
// ValueView: a property-list value that lies somewhere else: inside a dictionary or an array, in a decoder's input, in
// a local variable. The argument and result type of everything that stores or reads values.
//
// A view is as long-lived as what it looks at: it is used at once or turned into a Value. Kind::None stands for "there
// is no value" (an absent key) and is never stored.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>

namespace tarn::plist {

class Array;
class Dictionary;
class Value;

namespace detail {
struct Body;
}

// Seconds since 1970-01-01 00:00:00 UTC.
// A kind of its own: a date isn't equal to the number of its seconds.
struct Date {
  double epochSeconds = 0;
  friend bool operator==(const Date&, const Date&) = default;
};

// Bytes of a data value, not owned.
// A type of its own, so that bytes aren't taken for a text.
struct DataView {
  std::string_view bytes;
};

// What a value is. The numbers lie together, from Bool to Double: see isNumber(). Signed and Unsigned are two kinds
// since a value above 2^63 - 1 must come out as it came in.
enum class Kind : std::uint8_t { None, Bool, Signed, Unsigned, Float, Double, Date, Text, Data, Array, Dictionary };

// 24 bytes, passed by reference or by value as one likes; nothing allocates, throws or counts but where it is told.
class ValueView {
 public:
  // Absent.
  constexpr ValueView() noexcept : signed_(0) {}
  // The constructors are implicit: whatever is a property-list value can be handed over as one.
  // NOLINTBEGIN(google-explicit-constructor)
  // Numbers keep their kind and, of the floating ones, their width; integers are held in 64 bits. A text is UTF-8 by
  // convention, which nothing here checks.
  constexpr ValueView(bool value) noexcept : signed_(value ? 1 : 0), kind_(Kind::Bool) {}
  constexpr ValueView(int value) noexcept : signed_(value), kind_(Kind::Signed) {}
  constexpr ValueView(long value) noexcept : signed_(value), kind_(Kind::Signed) {}
  constexpr ValueView(long long value) noexcept : signed_(value), kind_(Kind::Signed) {}
  constexpr ValueView(unsigned value) noexcept : unsigned_(value), kind_(Kind::Unsigned) {}
  constexpr ValueView(unsigned long value) noexcept : unsigned_(value), kind_(Kind::Unsigned) {}
  constexpr ValueView(unsigned long long value) noexcept : unsigned_(value), kind_(Kind::Unsigned) {}
  constexpr ValueView(float value) noexcept : float_(value), kind_(Kind::Float) {}
  constexpr ValueView(double value) noexcept : double_(value), kind_(Kind::Double) {}
  constexpr ValueView(Date value) noexcept : double_(value.epochSeconds), kind_(Kind::Date) {}
  // The characters must stay as long as the view is looked at; so must what the views of containers and values look at.
  constexpr ValueView(std::string_view text) noexcept : chars_(text.data()), size_(text.size()), kind_(Kind::Text) {}
  constexpr ValueView(const char* text) noexcept : ValueView(std::string_view(text)) {}
  ValueView(const std::string& text) noexcept : ValueView(std::string_view(text)) {}
  constexpr ValueView(DataView data) noexcept
      : chars_(data.bytes.data()), size_(data.bytes.size()), kind_(Kind::Data) {}
  // Looks at the container's block, without holding it.
  ValueView(const Array& array) noexcept;
  ValueView(const Dictionary& dictionary) noexcept;
  ValueView(const Value& value) noexcept;
  // NOLINTEND(google-explicit-constructor)
  ValueView(const void*) = delete;  // no pointer is a bool

  // A bool counts as a number, as 1 or 0; a date doesn't.
  constexpr Kind kind() const noexcept { return kind_; }
  // False of an absent value alone: an empty text, an empty container and false are present.
  constexpr bool present() const noexcept { return kind_ != Kind::None; }
  constexpr explicit operator bool() const noexcept { return present(); }
  constexpr bool isNumber() const noexcept { return kind_ >= Kind::Bool && kind_ <= Kind::Double; }
  constexpr bool isText() const noexcept { return kind_ == Kind::Text; }

  // The stored value; only for the kind that the name says.
  constexpr bool boolValue() const noexcept { return signed_ != 0; }
  constexpr std::int64_t signedValue() const noexcept { return signed_; }
  constexpr std::uint64_t unsignedValue() const noexcept { return unsigned_; }
  constexpr float floatValue() const noexcept { return float_; }
  constexpr double doubleValue() const noexcept { return double_; }
  constexpr Date dateValue() const noexcept { return Date{double_}; }
  // Without a zero at the end; may hold zeros.
  constexpr std::string_view text() const noexcept { return {chars_, size_}; }
  constexpr std::string_view data() const noexcept { return {chars_, size_}; }
  // Holds the container from here on, for the price of a count; empty for a value of another kind.
  Array array() const noexcept;            // shares the array
  Dictionary dictionary() const noexcept;  // shares the dictionary

  // Conversions that take any kind, so that a key with a surprising value never surprises a reader.
  //
  // As a number: text counts by its leading number after blanks ("12 dB" is 12, "x" is 0, "inf" is 0), a bool as 1 or
  // 0, a date as its epoch seconds, anything else, an absent value included, as 0. A text beyond a double's range is
  // infinite or 0.
  double asDouble() const noexcept;
  // The same cut toward zero and held to the range of the integer; not a number reads 0. A text that begins with an
  // integer keeps all its digits, where a double has 53 bits.
  std::int64_t asInt64() const noexcept;
  // Below 0 it reads 0.
  std::uint64_t asUInt64() const noexcept;
  // Whether asDouble is not 0.
  bool asBool() const noexcept;
  // As text: see description(). Allocates.
  std::string asText() const;

 private:
  friend class Array;
  friend class Dictionary;
  friend class Packed;
  // What is looked at, by kind: a bool in signed_, a date in double_, text and data in chars_ with size_.
  union {
    std::int64_t signed_;
    std::uint64_t unsigned_;
    float float_;
    double double_;
    const char* chars_;
    detail::Body* body_;  // of an array or a dictionary; null for an empty one
  };
  // Of text and data, in bytes.
  std::size_t size_ = 0;
  Kind kind_ = Kind::None;
};

// Value equality. Numbers compare by value across their kinds (1 == 1.0 == true, and not-a-number equals itself), dates
// with dates by their seconds, arrays item by item, dictionaries key by key whatever their order. Values of other pairs
// of kinds differ. Two absent values are equal.
bool operator==(const ValueView& a, const ValueView& b) noexcept;

// The text form of a value: text as it is; integers in decimal; a bool as 1 or 0; a float or double as the shortest
// decimal digits that read back the same in its own precision, without a trailing ".0" (10, 0.1, 2.5, 1e+20); a date as
// 2026-11-20 10:00:00 +0000 (UTC); data as <0a1b>; an array as (1, 2); a dictionary as {a = 1; b = 2} in its own order,
// control characters of texts inside a container escaped as in JSON; no value as (null).
std::string description(const ValueView& value);
// The same without a string of its own.
void appendDescription(std::string& out, const ValueView& value);

// The text form of a number alone, for numbers that are not in a value.
// Shortest digits that read back the same in the precision of the type; "nan", "inf" and "-inf" for what is no number.
void appendNumber(std::string& out, double value);
void appendNumber(std::string& out, float value);
void appendNumber(std::string& out, std::int64_t value);
void appendNumber(std::string& out, std::uint64_t value);

}  // namespace tarn::plist
