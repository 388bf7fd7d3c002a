// SPDX-License-Identifier: Apache-2.0
// Value: a property-list value that owns itself; what a ValueView looks at when the value must outlive its place.
//
//   ValueView view = message.get("volume");    looks into the message
//   Value kept = view;                         stays when the message goes
//
// Threads: as dictionaries: copies are independent, one object is for one thread at a time.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <type_traits>
#include <variant>
#include <vector>

#include "plist/Dictionary.h"
#include "plist/ValueView.h"

namespace tarn::plist {

// Bytes that are no text. A type of its own, so that a string is always a text.
struct Data {
  std::string bytes;
};

// A property-list value with its own copy of texts and data; arrays and dictionaries are shared, as their copies are.
// Some 40 bytes beside what a text allocates, so long lists of values are better kept in an Array.
class Value {
 public:
  // Absent: Kind::None.
  Value() noexcept = default;  // absent
  // The constructors are implicit, as those of ValueView: a copy of what is handed over, which need not stay.
  // NOLINTBEGIN(google-explicit-constructor)
  // Of whatever the view looks at; an absent one makes an absent value. Kind and width stay: a float stays a float.
  Value(const ValueView& view);
  template <class Number>
  requires std::is_arithmetic_v<Number> Value(Number value) : Value(ValueView(value)) {}
  Value(Date value) : Value(ValueView(value)) {}
  Value(std::string_view text) : Value(ValueView(text)) {}
  Value(const std::string& text) : Value(ValueView(text)) {}
  Value(const char* text) : Value(ValueView(text)) {}
  Value(DataView data) : Value(ValueView(data)) {}
  Value(const Array& array) : Value(ValueView(array)) {}
  Value(const Dictionary& dictionary) : Value(ValueView(dictionary)) {}
  // NOLINTEND(google-explicit-constructor)

  // A look at it, to be used as long as this value stays as it is.
  ValueView view() const noexcept;
  // As of the view.
  Kind kind() const noexcept { return view().kind(); }
  bool present() const noexcept { return kind() != Kind::None; }

  // As values are compared: see ValueView.h.
  friend bool operator==(const Value& a, const Value& b) noexcept { return a.view() == b.view(); }

 private:
  // In the order of Kind.
  std::variant<std::monostate, bool, std::int64_t, std::uint64_t, float, double, Date, std::string, Data, Array,
               Dictionary>
      held_;
};

}  // namespace tarn::plist
