// QueueProgress: what the server queue's thread tells the watchdog about itself.
//
// Written by the queue's thread, with no more than a relaxed store a step; read by the watchdog's thread at any time.
#pragma once

#include <atomic>
#include <chrono>
#include <cstdint>
#include <optional>

namespace tarn::linux_host {

class QueueProgress {
 public:
  struct Sample {
    std::uint64_t steps = 0;  // differs from an earlier sample's when something was done in between
    std::uint64_t turns = 0;  // the same of turns: everybody who waited was looked at in between
    bool idle = false;        // nothing to do: asleep until something comes
    std::optional<std::chrono::nanoseconds> waitingSince;  // start of a deliberate wait, on the monotonic clock
  };

  void step() noexcept { steps_.store(steps_.load(std::memory_order_relaxed) + 1, std::memory_order_relaxed); }
  void turn() noexcept {
    step();
    turns_.store(turns_.load(std::memory_order_relaxed) + 1, std::memory_order_relaxed);
  }
  void setIdle(bool idle) noexcept { idle_.store(idle, std::memory_order_relaxed); }
  void beginWait(std::chrono::nanoseconds now) noexcept { waitingSince_.store(now.count(), std::memory_order_relaxed); }
  void endWait() noexcept {
    step();
    waitingSince_.store(kNotWaiting, std::memory_order_relaxed);
  }

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
  static constexpr std::int64_t kNotWaiting = INT64_MIN;

  std::atomic<std::uint64_t> steps_{0};
  std::atomic<std::uint64_t> turns_{0};
  std::atomic<bool> idle_{false};
  std::atomic<std::int64_t> waitingSince_{kNotWaiting};
};

}  // namespace tarn::linux_host
