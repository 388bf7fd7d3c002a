// SPDX-License-Identifier: Apache-2.0
#include "bench/Measure.h"

#include <algorithm>
#include <chrono>
#include <ctime>

namespace tarn::bench {

double nowSeconds() {
  return std::chrono::duration<double>(std::chrono::steady_clock::now().time_since_epoch()).count();
}

double ownProcessorSeconds() {
  timespec time{};
  ::clock_gettime(CLOCK_PROCESS_CPUTIME_ID, &time);
  return static_cast<double>(time.tv_sec) + static_cast<double>(time.tv_nsec) / 1e9;
}

double median(Samples samples) {
  std::sort(samples.begin(), samples.end());
  const std::size_t middle = samples.size() / 2;
  return samples.size() % 2 == 1 ? samples[middle] : (samples[middle - 1] + samples[middle]) / 2;
}

double percentile(Samples samples, double part) {
  const auto last = static_cast<double>(samples.size() - 1);
  const auto at = samples.begin() + static_cast<std::ptrdiff_t>(last * part);
  std::nth_element(samples.begin(), at, samples.end());
  return *at;
}

}  // namespace tarn::bench
