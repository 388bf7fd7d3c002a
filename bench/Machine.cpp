// SPDX-License-Identifier: Apache-2.0
#include "bench/Machine.h"

#include <algorithm>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <nlohmann/json.hpp>
#include <thread>

#include "bench/Measure.h"
#include "bench/Processes.h"
#include "bench/Quantity.h"
#include "bench/peers/BareReceiver.h"

namespace tarn::bench {

namespace {

constexpr int kTrips = 4000;
constexpr int kPieces = 9;
constexpr std::uint64_t kSteps = 4'000'000;
// Slower by this counts.
constexpr double kSlow = 1.25;

double measureTrips() {
  const OneProcessor one;
  BareReceiver bare(Writes::OneEach);
  Samples samples;
  for (int trip = 0; trip < kTrips; ++trip) {
    const double start = nowSeconds();
    bare.roundTrip();
    samples.push_back(nowSeconds() - start);
  }
  return median(std::move(samples));
}

double measureWork() {
  Samples samples;
  for (int piece = 0; piece < kPieces; ++piece) {
    const double start = nowSeconds();
    std::uint64_t state = 88172645463325252U;
    for (std::uint64_t step = 0; step < kSteps; ++step) {
      state ^= state << 13U;
      state ^= state >> 7U;
      state ^= state << 17U;
    }
    keep(state);
    samples.push_back(nowSeconds() - start);
  }
  return median(std::move(samples));
}

std::string processorName() {
  std::ifstream lines("/proc/cpuinfo");
  for (std::string line; std::getline(lines, line);) {
    if (line.rfind("model name", 0) == 0) return line.substr(std::min(line.find(": ") + 2, line.size()));
  }
  return "unknown";
}

MachineSpeed slowestOf(const std::vector<MachineSpeed>& speeds) {
  MachineSpeed slowest = speeds.front();
  for (const MachineSpeed& speed : speeds) {
    slowest.load = std::max(slowest.load, speed.load);
    slowest.roundTrip = std::max(slowest.roundTrip, speed.roundTrip);
    slowest.work = std::max(slowest.work, speed.work);
  }
  return slowest;
}

}  // namespace

MachineSpeed measureMachine() {
  MachineSpeed speed;
  static_cast<void>(::getloadavg(&speed.load, 1));
  speed.processor = processorName();
  speed.roundTrip = measureTrips();
  speed.work = measureWork();
  return speed;
}

MachineSpeed readSpeed(const std::string& file, std::string& error) {
  std::ifstream input(file);
  const nlohmann::json read = nlohmann::json::parse(input, nullptr, false);
  MachineSpeed speed;
  try {
    speed.processor = read.at("processor").get<std::string>();
    speed.roundTrip = read.at("bare_round_trip_seconds").get<double>();
    speed.work = read.at("work_seconds").get<double>();
  } catch (const nlohmann::json::exception& problem) {
    error = file + ": " + (input.is_open() ? problem.what() : "can't be read");
  }
  return speed;
}

std::string speedJson(const MachineSpeed& speed) {
  return nlohmann::ordered_json{{"processor", speed.processor},
                                {"load", speed.load},
                                {"bare_round_trip_seconds", speed.roundTrip},
                                {"work_seconds", speed.work}}
      .dump();
}

std::string warningOf(const std::vector<MachineSpeed>& now, const MachineSpeed& kept) {
  const MachineSpeed slowest = slowestOf(now);
  const bool isSlow = slowest.roundTrip > kSlow * kept.roundTrip || slowest.work > kSlow * kept.work;
  const bool isBusy = slowest.load > static_cast<double>(std::thread::hardware_concurrency());
  if (!isSlow && !isBusy) return {};
  char load[16];
  std::snprintf(load, sizeof load, "%.1f", slowest.load);
  const bool isAnother = slowest.processor != kept.processor;
  return std::string("the machine is ") + (isSlow ? "slow" : "") + (isSlow && isBusy ? " and " : "") +
         (isBusy ? "busy" : "") + ": a bare round trip takes " + microseconds(slowest.roundTrip).text +
         " (kept: " + microseconds(kept.roundTrip).text + "), a piece of work " + milliseconds(slowest.work).text +
         " (kept: " + milliseconds(kept.work).text + "), the load was " + load +
         (isAnother ? "; the kept ones are another machine's, " + kept.processor : "") + ". Compare ratios, not times.";
}

}  // namespace tarn::bench
