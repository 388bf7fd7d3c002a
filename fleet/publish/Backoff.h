// SPDX-License-Identifier: Apache-2.0
// Backoff: how long to wait after a failure: twice as long after each, up to a cap, and never the same on two devices,
// so that a server that comes back isn't met by all at once. Threads: one.
#pragma once

#include <algorithm>
#include <chrono>
#include <cstdint>
#include <random>

namespace tarn::fleet {

struct BackoffLimits {
  std::chrono::milliseconds first{250};
  std::chrono::milliseconds most{60'000};
};

class Backoff {
 public:
  explicit Backoff(std::uint64_t seed, BackoffLimits limits = {}) : limits_(limits), random_(seed) {}

  // The pause after one more failure: between half of the present step and all of it.
  std::chrono::milliseconds next() {
    const std::int64_t step = std::min(limits_.most.count(), limits_.first.count() << std::min(failures_, kMostSteps));
    ++failures_;
    return std::chrono::milliseconds(std::uniform_int_distribution<std::int64_t>(step / 2, step)(random_));
  }
  void succeeded() noexcept { failures_ = 0; }
  // Since the last success.
  int failures() const noexcept { return failures_; }

 private:
  static constexpr int kMostSteps = 30;

  const BackoffLimits limits_;
  std::mt19937_64 random_;
  int failures_ = 0;
};

}  // namespace tarn::fleet
