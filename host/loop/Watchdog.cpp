// SPDX-License-Identifier: Apache-2.0
#include "host/loop/Watchdog.h"

namespace tarn::linux_host {

bool queueIsAlive(const QueueProgress::Sample& before, const QueueProgress::Sample& now,
                  std::chrono::nanoseconds monotonicNow) noexcept {
  if (now.steps != before.steps || now.idle) return true;
  return now.waitingSince && monotonicNow - *now.waitingSince < kLongestDeliberateWait;
}

bool othersHaveTurns(std::chrono::nanoseconds lastTurn, std::chrono::nanoseconds monotonicNow) noexcept {
  return monotonicNow - lastTurn <= kLongestTurn;
}

Watchdog::Watchdog(const platform::Clock& clock, const QueueProgress& progress, ServiceManager& manager)
    : clock_(clock), progress_(progress), manager_(manager) {}

void Watchdog::start() {
  const auto interval = manager_.watchdogInterval();
  if (!interval || thread_.joinable()) return;
  thread_ = std::thread([this, period = *interval / 2] { serve(period); });
}

void Watchdog::stop() {
  {
    const MutexLock lock(mutex_);
    stopping_ = true;
  }
  changed_.notifyAll();
  if (thread_.joinable()) {
    thread_.join();
  }
}

bool Watchdog::check() {
  const auto now = progress_.sample();
  const auto monotonicNow = clock_.monotonic();
  if (!lastTurn_ || now.turns != before_.turns || now.idle || now.waitingSince) {
    lastTurn_ = monotonicNow;
  }
  const bool alive = queueIsAlive(before_, now, monotonicNow) && othersHaveTurns(*lastTurn_, monotonicNow);
  before_ = now;
  if (alive) {
    manager_.notifyWatchdog();
  }
  return alive;
}

void Watchdog::serve(std::chrono::microseconds period) {
  mutex_.lock();
  while (!changed_.waitFor(mutex_, period, [this]() TARN_REQUIRES(mutex_) { return stopping_; })) {
    mutex_.unlock();
    check();
    mutex_.lock();
  }
  mutex_.unlock();
}

}  // namespace tarn::linux_host
