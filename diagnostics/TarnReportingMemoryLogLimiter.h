// SPDX-License-Identifier: Apache-2.0
// TarnReportingMemoryLogLimiter: lets a memory log through once in 5 seconds.
//
// The tools that make one are a burden to a device that is short of memory already. One limiter serves all sessions.
// Threads: any.
#pragma once

#include <chrono>
#include <optional>

#include "plist/ThreadSafety.h"

namespace tarn {

// Belongs to the process (ProcessState), since the tools look at the whole device.
class TarnReportingMemoryLogLimiter {
 public:
  // A request exactly so long after the last one is refused still.
  static constexpr std::chrono::nanoseconds kInterval = std::chrono::seconds(5);

  TarnReportingMemoryLogLimiter() = default;
  TarnReportingMemoryLogLimiter(const TarnReportingMemoryLogLimiter&) = delete;
  TarnReportingMemoryLogLimiter& operator=(const TarnReportingMemoryLogLimiter&) = delete;

  // Whether a log may be made now, on the monotonic clock; a yes restarts the interval. The first is always a yes. A no
  // restarts nothing.
  bool claim(std::chrono::nanoseconds now) {
    const MutexLock lock(mutex_);
    if (lastRun_ && now - *lastRun_ <= kInterval) return false;
    lastRun_ = now;
    return true;
  }

 private:
  Mutex mutex_;
  std::optional<std::chrono::nanoseconds> lastRun_ TARN_GUARDED_BY(mutex_);
};

}  // namespace tarn
