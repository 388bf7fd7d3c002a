// SPDX-License-Identifier: Apache-2.0
// JsonObject: one object of JSON, member by member, as the commands print it with --json. Threads: one.
#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "plist/ValueView.h"

namespace tarn::ctl {

// Members stand in the order in which they are added; nobody looks for a name given twice.
class JsonObject {
 public:
  // A value as plist::appendJson writes it: an absent one as null.
  JsonObject& add(std::string_view name, const plist::ValueView& value);
  JsonObject& addOptional(std::string_view name, const std::optional<double>& number);
  JsonObject& addOptional(std::string_view name, const std::optional<std::int64_t>& number);
  // A text that stands there as null when it is empty.
  JsonObject& addOrNull(std::string_view name, std::string_view text);
  // JSON as it is.
  JsonObject& addJson(std::string_view name, std::string_view json);
  JsonObject& addArray(std::string_view name, const std::vector<std::string>& items);

  std::string text() const { return text_ + '}'; }

 private:
  void addName(std::string_view name);

  std::string text_ = "{";
};

}  // namespace tarn::ctl
