// FakeAccessoryQueries: earbuds that a test lays out. Threads: one at a time.
#pragma once

#include <cstddef>
#include <cstdint>
#include <map>
#include <vector>

#include "platform/AccessoryQueries.h"

namespace tarn::testing {

class FakeAccessoryQueries final : public platform::AccessoryQueries {
 public:
  using Accessory = std::map<platform::AccessoryPart, plist::Dictionary>;

  // The interface.
  platform::Outcome<std::uint16_t> enumerate() override {
    ++enumerations_;
    if (error_) return {0, error_};
    found_ = accessories_;
    return {static_cast<std::uint16_t>(found_.size()), {}};
  }
  bool hasCase(std::uint16_t accessoryIndex) const override {
    return accessoryIndex < found_.size() && found_[accessoryIndex].contains(platform::AccessoryPart::Case);
  }
  plist::Dictionary parameters(platform::AccessoryPart part, std::uint16_t accessoryIndex) const override {
    if (accessoryIndex >= found_.size()) return {};
    const auto found = found_[accessoryIndex].find(part);
    return found == found_[accessoryIndex].end() ? plist::Dictionary() : found->second;
  }

  // Controls. What is laid out is seen by the next enumeration.
  void add(Accessory accessory) { accessories_.push_back(std::move(accessory)); }
  void failEnumeration(platform::MaybeError error) { error_ = std::move(error); }

  // Observations.
  std::size_t enumerations() const noexcept { return enumerations_; }

 private:
  std::vector<Accessory> accessories_;
  std::vector<Accessory> found_;
  platform::MaybeError error_;
  std::size_t enumerations_ = 0;
};

}  // namespace tarn::testing
