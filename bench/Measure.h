// SPDX-License-Identifier: Apache-2.0
// Measuring: the clock and medians; how figures are written is in Quantity.h.
//
// Machines are noisy, so what is compared takes turns: a round measures ours and each peer once, and the figures are
// the medians over the rounds.
#pragma once

#include <cstddef>
#include <vector>

namespace tarn::bench {

// Of the steady clock.
double nowSeconds();
// Processor time of this process so far.
double ownProcessorSeconds();

using Samples = std::vector<double>;
// Of at least one sample.
double median(Samples samples);
// The sample that so large a part (0 to 1) of them doesn't exceed.
double percentile(Samples samples, double part);

// Nanoseconds of processor time that one call takes, on average over `count` of them; what else runs on the machine
// counts little.
template <class Call>
double nanosecondsEach(std::size_t count, Call&& call) {
  const double start = ownProcessorSeconds();
  for (std::size_t i = 0; i < count; ++i) {
    call(i);
  }
  return (ownProcessorSeconds() - start) * 1e9 / static_cast<double>(count);
}

// Keeps the compiler from leaving out what made the value.
template <class Value>
inline void keep(const Value& value) {
  asm volatile("" : : "r,m"(value) : "memory");
}

}  // namespace tarn::bench
