// ProcessFacts: facts about processes and the machine that reports carry. Threads: any.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "plist/Result.h"

namespace tarn::platform {

enum class ThermalState : std::int32_t { Nominal = 0, Fair = 1, Serious = 2, Critical = 3 };

struct LoadAverages {
  double oneMinute = 0;
  double fiveMinutes = 0;
  double fifteenMinutes = 0;
};

class ProcessFacts {
 public:
  virtual ~ProcessFacts() = default;
  // Of this process; greater than 0.
  virtual std::int32_t ownProcessIdentifier() const = 0;
  // The name of a process; nothing when it is gone or hidden.
  virtual std::optional<std::string> processName(std::int32_t processIdentifier) const = 0;
  // Physical memory that this process holds (resident or swapped out), in bytes.
  virtual Result<std::uint64_t> physicalFootprint() const = 0;
  // How warm the device is now.
  virtual ThermalState thermalState() const = 0;
  // Whether the device saves power now.
  virtual bool lowPowerModeEnabled() const = 0;
  // The mean numbers of running and waiting threads over the last 1, 5 and 15 minutes.
  virtual LoadAverages loadAverages() const = 0;
};

}  // namespace tarn::platform
