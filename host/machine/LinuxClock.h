// LinuxClock: the machine's clocks. Threads: any.
#pragma once

#include "platform/Clock.h"

namespace tarn::linux_host {

class LinuxClock final : public platform::Clock {
 public:
  double epochSeconds() const noexcept override;
  std::chrono::nanoseconds monotonic() const noexcept override;
  // Time that the machine slept counts.
  double systemUptimeSeconds() const noexcept override;
  // Microseconds of processor time of all threads together.
  std::int64_t processorTicks() const noexcept override;
};

}  // namespace tarn::linux_host
