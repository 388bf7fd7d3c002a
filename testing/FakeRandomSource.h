// SPDX-License-Identifier: Apache-2.0
// FakeRandomSource: gives the numbers that a test put in, then 0 for ever. Threads: one at a time.
#pragma once

#include <cstdint>
#include <deque>
#include <vector>

#include "platform/RandomSource.h"

namespace tarn::testing {

class FakeRandomSource final : public platform::RandomSource {
 public:
  // The interface.
  std::uint64_t below(std::uint64_t bound) override {
    bounds_.push_back(bound);
    if (next_.empty() || bound == 0) return 0;
    const auto number = next_.front();
    next_.pop_front();
    return number < bound ? number : bound - 1;
  }

  // Controls. A number that is too large for the bound counts as the largest that fits.
  void push(std::uint64_t number) { next_.push_back(number); }

  // Observations.
  const std::vector<std::uint64_t>& bounds() const noexcept { return bounds_; }

 private:
  std::deque<std::uint64_t> next_;
  std::vector<std::uint64_t> bounds_;
};

}  // namespace tarn::testing
