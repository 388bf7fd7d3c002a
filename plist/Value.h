// Value: a property-list value that owns itself; what a ValueView looks at when the value must outlive its place.
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

struct Data {
  std::string bytes;
};

class Value {
 public:
  Value() noexcept = default;  // absent
  // The constructors are implicit, as those of ValueView: a copy of what is handed over.
  // NOLINTBEGIN(google-explicit-constructor)
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

  ValueView view() const noexcept;
  Kind kind() const noexcept { return view().kind(); }
  bool present() const noexcept { return kind() != Kind::None; }

  friend bool operator==(const Value& a, const Value& b) noexcept { return a.view() == b.view(); }

 private:
  std::variant<std::monostate, bool, std::int64_t, std::uint64_t, float, double, Date, std::string, Data, Array,
               Dictionary>
      held_;
};

}  // namespace tarn::plist
