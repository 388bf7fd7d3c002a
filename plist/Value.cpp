// SPDX-License-Identifier: Apache-2.0
#include "plist/Value.h"

namespace tarn::plist {

Value::Value(const ValueView& view) {
  switch (view.kind()) {
    case Kind::None:
      break;
    case Kind::Bool:
      held_ = view.boolValue();
      break;
    case Kind::Signed:
      held_ = view.signedValue();
      break;
    case Kind::Unsigned:
      held_ = view.unsignedValue();
      break;
    case Kind::Float:
      held_ = view.floatValue();
      break;
    case Kind::Double:
      held_ = view.doubleValue();
      break;
    case Kind::Date:
      held_ = view.dateValue();
      break;
    case Kind::Text:
      held_ = std::string(view.text());
      break;
    case Kind::Data:
      held_ = Data{std::string(view.data())};
      break;
    case Kind::Array:
      held_ = view.array();
      break;
    case Kind::Dictionary:
      held_ = view.dictionary();
      break;
  }
}

ValueView Value::view() const noexcept {
  struct Viewer {
    ValueView operator()(std::monostate) const noexcept { return {}; }
    ValueView operator()(const Data& data) const noexcept { return DataView{data.bytes}; }
    ValueView operator()(const std::string& text) const noexcept { return std::string_view(text); }
    ValueView operator()(const Array& array) const noexcept { return array; }
    ValueView operator()(const Dictionary& dictionary) const noexcept { return dictionary; }
    ValueView operator()(bool value) const noexcept { return value; }
    ValueView operator()(std::int64_t value) const noexcept { return value; }
    ValueView operator()(std::uint64_t value) const noexcept { return value; }
    ValueView operator()(float value) const noexcept { return value; }
    ValueView operator()(double value) const noexcept { return value; }
    ValueView operator()(Date value) const noexcept { return value; }
  };
  return std::visit(Viewer{}, held_);
}

}  // namespace tarn::plist
