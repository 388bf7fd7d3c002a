// SPDX-License-Identifier: Apache-2.0
// ManualClock: a clock that stands still until a test moves it.
//
// It starts in the middle of 2025 with an hour of uptime, so that no reading is 0 by accident. Threads: any; moving it
// is for one thread at a time.
#pragma once

#include <atomic>
#include <chrono>
#include <cstdint>

#include "platform/Clock.h"

namespace tarn::testing {

class ManualClock final : public platform::Clock {
 public:
  ManualClock() = default;
  ManualClock(const ManualClock&) = delete;
  ManualClock& operator=(const ManualClock&) = delete;

  // The interface.
  double epochSeconds() const noexcept override { return epochBase_.load() + seconds(moved_.load()); }
  std::chrono::nanoseconds monotonic() const noexcept override {
    return std::chrono::nanoseconds(monotonicBase_.load() + moved_.load());
  }
  double systemUptimeSeconds() const noexcept override { return uptimeBase_.load() + seconds(moved_.load()); }
  std::int64_t processorTicks() const noexcept override { return processorTicks_.load(); }

  // Controls. Each setter moves its own reading and leaves the others alone.
  void setEpochSeconds(double value) noexcept { epochBase_ = value - seconds(moved_.load()); }
  void setMonotonic(std::chrono::nanoseconds value) noexcept { monotonicBase_ = value.count() - moved_.load(); }
  void setSystemUptimeSeconds(double value) noexcept { uptimeBase_ = value - seconds(moved_.load()); }
  void setProcessorTicks(std::int64_t value) noexcept { processorTicks_ = value; }
  // Moves epoch, monotonic time and uptime on together. Work that becomes due runs only when its queues are told; see
  // ManualWorkQueues::advance for both at once.
  void advance(std::chrono::nanoseconds duration) noexcept { moved_ += duration.count(); }

 private:
  static constexpr double seconds(std::int64_t nanoseconds) noexcept { return static_cast<double>(nanoseconds) / 1e9; }

  std::atomic<std::int64_t> moved_{0};
  std::atomic<double> epochBase_{1750000000.0};
  std::atomic<std::int64_t> monotonicBase_{3'600'000'000'000};
  std::atomic<double> uptimeBase_{3600.0};
  std::atomic<std::int64_t> processorTicks_{0};
};

}  // namespace tarn::testing
