// BuilderSink: the sink of a PropertyListReader that makes finished containers. Internal to wire/.
#pragma once

#include <optional>
#include <string_view>

#include "plist/PackedBuilder.h"

namespace tarn::wire {

class BuilderSink {
 public:
  BuilderSink(plist::PackedBuilder& builder, plist::KeyListCache& keyLists) noexcept
      : builder_(builder), keyLists_(keyLists) {}

  void begin() { builder_.begin(); }
  void add(std::string_view key, const plist::ValueView& value) { builder_.add(key, value); }
  void add(const plist::ValueView& value) { builder_.add(value); }
  bool endDictionary(const std::string_view* key) {
    const std::optional<plist::Dictionary> dictionary = builder_.finishDictionary(keyLists_);
    if (dictionary) {
      join(key, *dictionary);
    }
    return dictionary.has_value();
  }
  bool endArray(const std::string_view* key) {
    join(key, builder_.finishArray());
    return true;
  }

 private:
  void join(const std::string_view* key, const plist::ValueView& container) {
    if (key != nullptr) {
      builder_.add(*key, container);
    } else {
      builder_.add(container);
    }
  }

  plist::PackedBuilder& builder_;
  plist::KeyListCache& keyLists_;
};

}  // namespace tarn::wire
