// SPDX-License-Identifier: Apache-2.0
#include "host/machine/LinuxClock.h"

#include <ctime>

namespace tarn::linux_host {

namespace {

std::chrono::nanoseconds read(clockid_t clock) noexcept {
  timespec now{};
  ::clock_gettime(clock, &now);
  return std::chrono::seconds(now.tv_sec) + std::chrono::nanoseconds(now.tv_nsec);
}

double seconds(std::chrono::nanoseconds time) noexcept {
  return std::chrono::duration<double>(time).count();
}

}  // namespace

double LinuxClock::epochSeconds() const noexcept {
  return seconds(read(CLOCK_REALTIME));
}

std::chrono::nanoseconds LinuxClock::monotonic() const noexcept {
  return read(CLOCK_MONOTONIC);
}

double LinuxClock::systemUptimeSeconds() const noexcept {
  return seconds(read(CLOCK_BOOTTIME));
}

std::int64_t LinuxClock::processorTicks() const noexcept {
  return std::chrono::duration_cast<std::chrono::microseconds>(read(CLOCK_PROCESS_CPUTIME_ID)).count();
}

}  // namespace tarn::linux_host
