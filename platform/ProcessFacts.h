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
  virtual std::int32_t ownProcessIdentifier() const = 0;
  // The name of a process; nothing when it is gone or hidden.
  virtual std::optional<std::string> processName(std::int32_t processIdentifier) const = 0;
  // Physical memory that this process holds (resident or swapped out), in bytes.
  virtual Result<std::uint64_t> physicalFootprint() const = 0;
  virtual ThermalState thermalState() const = 0;
  virtual bool lowPowerModeEnabled() const = 0;
  virtual LoadAverages loadAverages() const = 0;
};

}  // namespace tarn::platform
