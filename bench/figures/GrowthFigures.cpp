// SPDX-License-Identifier: Apache-2.0
// Whether a message costs the same in a long session as in a short one. In this process, with the real workers and an
// analytics service that wants nothing.
#include <malloc.h>

#include <memory>
#include <vector>

#include "bench/Intake.h"
#include "bench/Measure.h"
#include "bench/Processes.h"
#include "bench/SessionPlatform.h"
#include "bench/figures/Figures.h"

namespace tarn::bench {

namespace {

constexpr double kTarget = 1.2;

// One session's way through all lengths, in a process as fresh as the service is.
std::vector<double> measureLengths(const std::vector<std::size_t>& lengths) {
  ::malloc_trim(0);  // what this program freed before must not serve again
  const SessionPlatform platform(Tally::WantsNothing);
  const auto warm = makeSession();
  Feeder(*warm).fillTo(10 * Feeder::kWindow);
  const auto session = makeSession();
  Feeder feeder(*session);
  std::vector<double> results;
  for (const std::size_t length : lengths) {
    feeder.fillTo(length);
    results.push_back(feeder.measure());
  }
  return results;
}

std::string nameOf(std::size_t length) {
  std::size_t power = 0;
  for (std::size_t rest = length; rest >= 10; rest /= 10) {
    ++power;
  }
  return "intake with 10^" + std::to_string(power) + " messages logged";
}

}  // namespace

void measureGrowth(const Settings& settings, Table& table) {
  const std::vector<std::size_t> lengths = settings.quick ? std::vector<std::size_t>{1'000, 10'000, 20'000}
                                                          : std::vector<std::size_t>{1'000, 100'000, 1'000'000};
  std::vector<Samples> samples(lengths.size());
  for (int round = 0; round < settings.rounds; ++round) {
    const std::vector<double> results = measureInChild([&] { return measureLengths(lengths); });
    for (std::size_t i = 0; i < results.size(); ++i) {
      samples[i].push_back(results[i]);
    }
  }
  const double first = median(samples.front());
  table.add({nameOf(lengths.front()), nanoseconds(first), {}, {}, "", {}});
  for (std::size_t i = 1; i < lengths.size(); ++i) {
    const double ours = median(samples[i]);
    table.addWithTarget({nameOf(lengths[i]),
                         nanoseconds(ours),
                         "with 10^3 " + nanoseconds(first),
                         times(ours / first),
                         "<= 1.20 x the first",
                         {}},
                        ours / first, kTarget);
  }
}

}  // namespace tarn::bench
