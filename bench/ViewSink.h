// SPDX-License-Identifier: Apache-2.0
// ViewSink: takes a message as views into its bytes and refuses repeated keys, as the service's own sink does; it only
// makes no dictionary. The service itself always makes one.
#pragma once

#include <cstddef>
#include <span>
#include <string_view>
#include <vector>

#include "plist/PackedBuilder.h"
#include "wire/CborReader.h"
#include "wire/PropertyListReader.h"

namespace tarn::bench {

class ViewSink {
 public:
  ViewSink() : keys_(kMost), values_(kMost) {}

  void begin() {}
  void add(std::string_view key, const plist::ValueView& value) {
    if (count_ == kMost) return;
    keys_[count_] = key;
    values_[count_] = value;
    ++count_;
    hash_ = plist::KeyList::combineHash(hash_, plist::Key::hashOf(key));
  }
  void add(const plist::ValueView&) {}
  bool endDictionary(const std::string_view*) { return true; }
  bool endArray(const std::string_view*) { return true; }

  // Whether the bytes are a dictionary of so many different keys, none of them a container. The values stay to be
  // looked at until the next read.
  bool read(std::span<const std::byte> bytes, std::size_t expected) {
    count_ = 0;
    hash_ = 0;
    wire::CborReader in(bytes);
    wire::PropertyListReader<ViewSink> reader(in, *this);
    wire::CborHead head;
    return in.readHead(head) && reader.readEntries(head, 1) && count_ == expected &&
           keyLists_.find(hash_, std::span(keys_).first(count_)).has_value();
  }
  const std::vector<plist::ValueView>& values() const noexcept { return values_; }

 private:
  static constexpr std::size_t kMost = 64;
  plist::KeyListCache keyLists_;
  std::vector<std::string_view> keys_;
  std::vector<plist::ValueView> values_;
  std::size_t count_ = 0;
  std::uint64_t hash_ = 0;
};

}  // namespace tarn::bench
