// SPDX-License-Identifier: Apache-2.0
#include "tools/ctl/terminal/JsonObject.h"

#include "plist/EscapedText.h"
#include "plist/formats/Json.h"

namespace tarn::ctl {

void JsonObject::addName(std::string_view name) {
  text_ += text_.size() > 1 ? "," : "";
  plist::appendJsonText(text_, name);
  text_ += ':';
}

JsonObject& JsonObject::add(std::string_view name, const plist::ValueView& value) {
  addName(name);
  plist::appendJson(text_, value);
  return *this;
}

JsonObject& JsonObject::addOptional(std::string_view name, const std::optional<double>& number) {
  return add(name, number ? plist::ValueView(*number) : plist::ValueView());
}

JsonObject& JsonObject::addOptional(std::string_view name, const std::optional<std::int64_t>& number) {
  return add(name, number ? plist::ValueView(*number) : plist::ValueView());
}

JsonObject& JsonObject::addOrNull(std::string_view name, std::string_view text) {
  return add(name, text.empty() ? plist::ValueView() : plist::ValueView(text));
}

JsonObject& JsonObject::addJson(std::string_view name, std::string_view json) {
  addName(name);
  text_ += json;
  return *this;
}

JsonObject& JsonObject::addArray(std::string_view name, const std::vector<std::string>& items) {
  addName(name);
  text_ += '[';
  for (std::size_t i = 0; i < items.size(); ++i) {
    text_.append(i > 0 ? "," : "").append(items[i]);
  }
  text_ += ']';
  return *this;
}

}  // namespace tarn::ctl
