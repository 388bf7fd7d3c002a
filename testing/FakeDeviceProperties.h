// SPDX-License-Identifier: Apache-2.0
// FakeDeviceProperties: device properties that a test sets; without that the device doesn't tell. Threads: any.
#pragma once

#include <map>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "platform/DeviceProperties.h"

namespace tarn::testing {

class FakeDeviceProperties final : public platform::DeviceProperties {
 public:
  // The interface.
  std::optional<bool> boolean(std::string_view name) const override {
    const std::lock_guard lock(mutex_);
    asked_.emplace_back(name);
    const auto found = values_.find(name);
    return found == values_.end() ? std::nullopt : std::optional(found->second);
  }

  // Controls. No value: the device doesn't tell.
  void set(std::string_view name, std::optional<bool> value) {
    const std::lock_guard lock(mutex_);
    if (value.has_value()) {
      values_.insert_or_assign(std::string(name), *value);
    } else {
      values_.erase(std::string(name));
    }
  }

  // Observations: the names asked for, in order.
  std::vector<std::string> asked() const {
    const std::lock_guard lock(mutex_);
    return asked_;
  }

 private:
  mutable std::mutex mutex_;
  std::map<std::string, bool, std::less<>> values_;  // guarded by mutex_
  mutable std::vector<std::string> asked_;           // guarded by mutex_
};

}  // namespace tarn::testing
