// SPDX-License-Identifier: Apache-2.0
// SteadyClock: the machine's monotonic clock, for tests that run a real loop. Threads: any.
#pragma once

#include <chrono>

#include "platform/Clock.h"

namespace tarn::testing {

class SteadyClock final : public platform::Clock {
 public:
  double epochSeconds() const noexcept override { return 0; }
  std::chrono::nanoseconds monotonic() const noexcept override {
    return std::chrono::steady_clock::now().time_since_epoch();
  }
  double systemUptimeSeconds() const noexcept override { return 0; }
  std::int64_t processorTicks() const noexcept override { return 0; }
};

}  // namespace tarn::testing
