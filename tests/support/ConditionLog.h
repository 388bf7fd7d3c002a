// SPDX-License-Identifier: Apache-2.0
// ConditionLog: a log that notes nothing of its entries but the conditions that they tell of. Threads: any.
#pragma once

#include <algorithm>
#include <cstddef>
#include <mutex>
#include <vector>

#include "platform/Log.h"
#include "platform/LogCondition.h"

namespace tarn::testing {

class ConditionLog : public platform::Log {
 public:
  void write(const platform::LogEntry&) noexcept override {
    const std::lock_guard lock(mutex_);
    conditions_.push_back(platform::LogConditionScope::current());
  }

  std::size_t countOf(platform::LogCondition condition) const {
    const std::lock_guard lock(mutex_);
    return static_cast<std::size_t>(std::count(conditions_.begin(), conditions_.end(), condition));
  }

 private:
  mutable std::mutex mutex_;
  std::vector<platform::LogCondition> conditions_;
};

}  // namespace tarn::testing
