// SPDX-License-Identifier: Apache-2.0
// Clock: every notion of time that the system has, so that a test can own all of them.
//
// Threads: any.
#pragma once

#include <chrono>
#include <cstdint>

namespace tarn::platform {

// Owned by the platform and there as long as anything is. Reading is cheap and never fails.
class Clock {
 public:
  virtual ~Clock() = default;
  // Wall-clock time: seconds since 1970-01-01 00:00:00 UTC. May jump when somebody sets the clock.
  virtual double epochSeconds() const noexcept = 0;
  // Time since an arbitrary moment; never goes back, and may stand still while the system sleeps. For every delay and
  // deadline.
  virtual std::chrono::nanoseconds monotonic() const noexcept = 0;
  // Seconds since the system was started, its sleep included.
  virtual double systemUptimeSeconds() const noexcept = 0;
  // Processor time that this process has used, in ticks of which a million make a second.
  virtual std::int64_t processorTicks() const noexcept = 0;
};

}  // namespace tarn::platform
