// SPDX-License-Identifier: Apache-2.0
// VariantMap: a message as most programs would keep it, a map from text to variant. A peer for memory and equality.
#pragma once

#include <cstdint>
#include <map>
#include <string>
#include <variant>

#include "plist/Dictionary.h"

namespace tarn::bench {

using VariantMap = std::map<std::string, std::variant<bool, std::int64_t, double, std::string>>;

inline VariantMap variantMapOf(const plist::Dictionary& message) {
  VariantMap map;
  for (const plist::Dictionary::Entry& entry : message) {
    auto& value = map[std::string(entry.key.text())];
    switch (entry.value.kind()) {
      case plist::Kind::Bool:
        value = entry.value.boolValue();
        break;
      case plist::Kind::Signed:
      case plist::Kind::Unsigned:
        value = entry.value.asInt64();
        break;
      case plist::Kind::Text:
        value = std::string(entry.value.text());
        break;
      default:
        value = entry.value.asDouble();
        break;
    }
  }
  return map;
}

}  // namespace tarn::bench
