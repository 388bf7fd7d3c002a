// SPDX-License-Identifier: Apache-2.0
#include "wire/KeyShapes.h"

#include <algorithm>
#include <utility>

#include "wire/Encoder.h"

namespace tarn::wire {

void KeyShape::set(const plist::KeyList& keys) {
  keys_ = {};
  ends_.clear();
  bytes_.clear();
  std::vector<std::size_t> ends;
  ends.reserve(keys.size());
  for (std::size_t i = 0; i < keys.size(); ++i) {
    appendValue(bytes_, keys[i].text());
    ends.push_back(bytes_.size());
  }
  ends_ = std::move(ends);
  keys_ = keys;
}

const KeyShape* KeyShapes::next(const CborReader& in, std::uint64_t count, const KeyShape* shape,
                                std::size_t known) noexcept {
  const std::string_view before = known == 0 ? std::string_view() : shape->firstKeys(known);
  const auto goesOn = [&](const KeyShape& candidate) {
    return candidate.size() == count && in.startsWith(candidate.key(known)) && candidate.firstKeys(known) == before;
  };
  if (last_ < shapes_.size() && goesOn(shapes_[last_])) return &shapes_[last_];
  const auto found = std::find_if(shapes_.begin(), shapes_.end(), goesOn);
  if (found == shapes_.end()) return nullptr;
  last_ = static_cast<std::size_t>(found - shapes_.begin());
  return &*found;
}

void KeyShapes::remember(const plist::KeyList& keys) {
  const auto isThis = [&](const KeyShape& shape) { return shape.keys() == keys; };
  if (keys.empty() || keys.size() > kMostKeys || std::any_of(shapes_.begin(), shapes_.end(), isThis)) return;
  std::size_t bytes = 0;
  for (std::size_t i = 0; i < keys.size(); ++i) {
    bytes += keys[i].text().size();
  }
  if (bytes > kMostBytes) return;
  if (shapes_.size() < kMostShapes) {
    shapes_.emplace_back();
    last_ = shapes_.size() - 1;
  } else {
    last_ = oldest_;
    oldest_ = (oldest_ + 1) % kMostShapes;
  }
  shapes_[last_].set(keys);
}

}  // namespace tarn::wire
