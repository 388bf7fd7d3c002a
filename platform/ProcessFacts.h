// SPDX-License-Identifier: Apache-2.0
// ProcessFacts: facts about processes and the machine that reports carry. Threads: any.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "plist/Result.h"

namespace tarn::platform {

// From cool to so hot that the device is about to turn itself off. The numbers are reported.
enum class ThermalState : std::int32_t { Nominal = 0, Fair = 1, Serious = 2, Critical = 3 };

// All 0 where the system doesn't tell.
struct LoadAverages {
  // Threads, as a mean over the time.
  double oneMinute = 0;
  double fiveMinutes = 0;
  double fifteenMinutes = 0;
};

// Owned by the platform. Nearly all of it is read from the system at each call: for starts, stops and summaries, not
// for each message.
class ProcessFacts {
 public:
  virtual ~ProcessFacts() = default;
  // Of this process; greater than 0.
  virtual std::int32_t ownProcessIdentifier() const = 0;
  // The name of a process, UTF-8, whatever bytes it calls itself; nothing when it is gone or hidden, and for 0 and
  // below.
  virtual std::optional<std::string> processName(std::int32_t processIdentifier) const = 0;
  // Physical memory that this process holds (resident or swapped out), in bytes; what it shares with files isn't
  // counted.
  virtual Result<std::uint64_t> physicalFootprint() const = 0;
  // How warm the device is now, by its warmest part; Nominal where nothing tells.
  virtual ThermalState thermalState() const = 0;
  // Whether the device saves power now; false where nothing tells.
  virtual bool lowPowerModeEnabled() const = 0;
  // The mean numbers of running and waiting threads over the last 1, 5 and 15 minutes.
  virtual LoadAverages loadAverages() const = 0;
};

}  // namespace tarn::platform
