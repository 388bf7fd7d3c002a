// SPDX-License-Identifier: Apache-2.0
// QueueProgress: what the server queue's thread tells the watchdog about itself.
//
// Owned by the MainLoop. Written by the queue's thread alone, with no more than a relaxed store a step, which costs
// less than an atomic addition; read by the watchdog's thread at any time. That is exact enough, as the watchdog's
// samples lie far apart.
#pragma once

#include <atomic>
#include <chrono>
#include <cstdint>
#include <optional>

namespace tarn::linux_host {

class QueueProgress {
 public:
  // What one look sees. The counts have no meaning of their own, only their change has.
  struct Sample {
    std::uint64_t steps = 0;  // differs from an earlier sample's when something was done in between
    std::uint64_t turns = 0;  // the same of turns: everybody who waited was looked at in between
    bool idle = false;        // nothing to do: asleep until something comes
    std::optional<std::chrono::nanoseconds> waitingSince;  // start of a deliberate wait, on the monotonic clock
  };

  // A piece of work begins.
  void step() noexcept { steps_.store(steps_.load(std::memory_order_relaxed) + 1, std::memory_order_relaxed); }
  // A turn of the loop is over: sockets, timers and other clients were looked at.
  void turn() noexcept {
    step();
    turns_.store(turns_.load(std::memory_order_relaxed) + 1, std::memory_order_relaxed);
  }
  // True from before the sleep until after it, so a thread that the system starves in between counts as idle.
  void setIdle(bool idle) noexcept { idle_.store(idle, std::memory_order_relaxed); }
  // What follows may block the queue on purpose, up to the watchdog's bound from `now` on. Doesn't nest.
  void beginWait(std::chrono::nanoseconds now) noexcept { waitingSince_.store(now.count(), std::memory_order_relaxed); }
  // Counts as a step: the wait's end is progress even when its work goes on.
  void endWait() noexcept {
    step();
    waitingSince_.store(kNotWaiting, std::memory_order_relaxed);
  }

  // From any thread, without stopping anybody: the members may be of moments that lie a step apart.
  Sample sample() const noexcept {
    Sample sample;
    sample.steps = steps_.load(std::memory_order_relaxed);
    sample.turns = turns_.load(std::memory_order_relaxed);
    sample.idle = idle_.load(std::memory_order_relaxed);
    if (const std::int64_t since = waitingSince_.load(std::memory_order_relaxed); since != kNotWaiting) {
      sample.waitingSince = std::chrono::nanoseconds(since);
    }
    return sample;
  }

 private:
  // A moment that no clock tells, so that a load is enough to know both whether and since when.
  static constexpr std::int64_t kNotWaiting = INT64_MIN;

  // Each has one writer, so a load and a store do where others would need an addition.
  std::atomic<std::uint64_t> steps_{0};
  std::atomic<std::uint64_t> turns_{0};
  std::atomic<bool> idle_{false};
  // Nanoseconds of the monotonic clock.
  std::atomic<std::int64_t> waitingSince_{kNotWaiting};
};

}  // namespace tarn::linux_host
