// SPDX-License-Identifier: Apache-2.0
// LinuxClock: the machine's clocks. Owned by the platform, which outlives all who ask it. Threads: any; no call fails
// or allocates. The processor's time costs a system call, the others none where the kernel shares its clocks with
// programs.
#pragma once

#include "platform/Clock.h"

namespace tarn::linux_host {

class LinuxClock final : public platform::Clock {
 public:
  // CLOCK_REALTIME, in seconds; a double tells a quarter of a microsecond apart today.
  double epochSeconds() const noexcept override;
  // CLOCK_MONOTONIC: time that the machine slept doesn't count, so a timeout isn't over when it wakes.
  std::chrono::nanoseconds monotonic() const noexcept override;
  // CLOCK_BOOTTIME: time that the machine slept counts.
  double systemUptimeSeconds() const noexcept override;
  // Microseconds of processor time of all threads together.
  std::int64_t processorTicks() const noexcept override;
};

}  // namespace tarn::linux_host
