// SPDX-License-Identifier: Apache-2.0
// FakeAccessoryQueries: earbuds that a test lays out. Threads: one at a time.
#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>
#include <map>
#include <utility>
#include <vector>

#include "platform/AccessoryQueries.h"

namespace tarn::testing {

class FakeAccessoryQueries final : public platform::AccessoryQueries {
 public:
  using Accessory = std::map<platform::AccessoryPart, plist::Dictionary>;

  // The interface.
  Result<std::uint16_t> enumerate() override {
    ++enumerations_;
    if (onEnumerate_) {
      onEnumerate_();
    }
    if (error_.failed()) return {0, error_};
    found_ = accessories_;
    return {static_cast<std::uint16_t>(found_.size()), {}};
  }
  bool hasCase(std::uint16_t accessoryIndex) const override {
    return accessoryIndex < found_.size() && found_[accessoryIndex].contains(platform::AccessoryPart::Case);
  }
  plist::Dictionary parameters(platform::AccessoryPart part, std::uint16_t accessoryIndex) const override {
    askedFor_.push_back(accessoryIndex);
    if (accessoryIndex >= found_.size()) return {};
    const auto found = found_[accessoryIndex].find(part);
    return found == found_[accessoryIndex].end() ? plist::Dictionary() : found->second;
  }

  // Controls. What is laid out is seen by the next enumeration.
  void add(Accessory accessory) { accessories_.push_back(std::move(accessory)); }
  void clear() { accessories_.clear(); }
  // What happens while an enumeration runs.
  void onEnumerate(std::function<void()> hook) { onEnumerate_ = std::move(hook); }
  void failEnumeration(Status error) { error_ = std::move(error); }

  // Observations.
  std::size_t enumerations() const noexcept { return enumerations_; }
  // The accessories whose parts somebody asked for, in order.
  const std::vector<std::uint16_t>& askedFor() const noexcept { return askedFor_; }

 private:
  std::vector<Accessory> accessories_;
  std::vector<Accessory> found_;
  Status error_;
  std::function<void()> onEnumerate_;
  mutable std::vector<std::uint16_t> askedFor_;
  std::size_t enumerations_ = 0;
};

}  // namespace tarn::testing
