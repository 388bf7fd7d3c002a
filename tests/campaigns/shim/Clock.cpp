// SPDX-License-Identifier: Apache-2.0
// Clock: moves the wall clock of one program by what the control page says. Other clocks and the machine's stay.
#include <sys/time.h>
#include <unistd.h>

#include <ctime>

#include "tests/campaigns/shim/Control.h"

namespace tarn::campaigns {

namespace {

constexpr std::int64_t kNanoseconds = 1'000'000'000;

bool isWallClock(clockid_t clock) noexcept {
  return clock == CLOCK_REALTIME || clock == CLOCK_REALTIME_COARSE;
}

timespec moved(const timespec& time) noexcept {
  Words* const words = controlWords();
  if (words == nullptr) return time;
  const auto offset = static_cast<std::int64_t>(word(words, Word::ClockOffset).load());
  std::int64_t seconds = time.tv_sec + offset / kNanoseconds;
  std::int64_t rest = time.tv_nsec + offset % kNanoseconds;
  if (rest < 0) {
    rest += kNanoseconds;
    --seconds;
  } else if (rest >= kNanoseconds) {
    rest -= kNanoseconds;
    ++seconds;
  }
  return {seconds, rest};
}

timespec wallClock() noexcept {
  static const auto next = nextFunction<int(clockid_t, timespec*)>("clock_gettime");
  timespec now{};
  next(CLOCK_REALTIME, &now);
  return moved(now);
}

}  // namespace

// By other names in here, so that the library's own declarations needn't be met exactly.
extern "C" {

int tarnClockGetTime(clockid_t clock, timespec* time) __asm__("clock_gettime");
int tarnClockGetTime(clockid_t clock, timespec* time) {
  static const auto next = nextFunction<int(clockid_t, timespec*)>("clock_gettime");
  const int result = next(clock, time);
  if (result == 0 && isWallClock(clock)) {
    *time = moved(*time);
  }
  return result;
}

int tarnGetTimeOfDay(timeval* time, void* zone) __asm__("gettimeofday");
int tarnGetTimeOfDay(timeval* time, void*) {
  const timespec now = wallClock();
  *time = {now.tv_sec, now.tv_nsec / 1000};
  return 0;
}

std::time_t tarnTime(std::time_t* time) __asm__("time");
std::time_t tarnTime(std::time_t* time) {
  const std::time_t now = wallClock().tv_sec;
  if (time != nullptr) {
    *time = now;
  }
  return now;
}

}  // extern "C"

}  // namespace tarn::campaigns
