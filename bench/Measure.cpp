// SPDX-License-Identifier: Apache-2.0
#include "bench/Measure.h"

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <ctime>

namespace tarn::bench {

namespace {

std::string withUnit(double value, const char* unit) {
  char text[48];
  const int decimals = value >= 100 ? 0 : value >= 10 ? 1 : 2;
  std::snprintf(text, sizeof text, "%.*f%s", decimals, value, unit);
  return text;
}

}  // namespace

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

std::string microseconds(double seconds) {
  return withUnit(seconds * 1e6, " us");
}

std::string milliseconds(double seconds) {
  return withUnit(seconds * 1e3, " ms");
}

std::string nanoseconds(double nanoseconds) {
  return withUnit(nanoseconds, " ns");
}

std::string perSecond(double rate) {
  return withUnit(rate / 1e3, " k/s");
}

std::string bytes(double count) {
  return withUnit(count, " B");
}

std::string megabytes(double count) {
  return withUnit(count / 1e6, " MB");
}

std::string counted(double count, const std::string& what) {
  return std::to_string(static_cast<int>(count + 0.5)) + " " + what;
}

std::string times(double ratio) {
  char text[32];
  std::snprintf(text, sizeof text, "%.2f", ratio);
  return text;
}

}  // namespace tarn::bench
