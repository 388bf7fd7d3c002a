// Value: a property-list value that owns itself; what a ValueView looks at when the value must outlive its place.
#pragma once

#include <cstdint>
#include <string>
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
  Value(const ValueView& view);  // NOLINT(google-explicit-constructor): a copy of what is looked at
  template <class T>
    requires std::constructible_from<ValueView, const T&> && (!std::same_as<T, ValueView>) &&
             (!std::same_as<T, Value>)
  Value(const T& value) : Value(ValueView(value)) {}  // NOLINT(google-explicit-constructor)

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
