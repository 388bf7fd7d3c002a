// SPDX-License-Identifier: Apache-2.0
// FakeProcessFacts: facts that a test sets. Threads: set before use.
#pragma once

#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <utility>

#include "platform/ProcessFacts.h"

namespace tarn::testing {

class FakeProcessFacts final : public platform::ProcessFacts {
 public:
  static constexpr std::int32_t kOwnProcessIdentifier = 4242;

  // The interface.
  std::int32_t ownProcessIdentifier() const override { return kOwnProcessIdentifier; }
  std::optional<std::string> processName(std::int32_t processIdentifier) const override {
    const auto found = names_.find(processIdentifier);
    return found == names_.end() ? std::nullopt : std::optional(found->second);
  }
  Result<std::uint64_t> physicalFootprint() const override { return footprint_; }
  platform::ThermalState thermalState() const override { return thermalState_; }
  bool lowPowerModeEnabled() const override { return lowPowerMode_; }
  platform::LoadAverages loadAverages() const override { return loadAverages_; }

  // Controls.
  void setProcessName(std::int32_t processIdentifier, std::string name) {
    names_.insert_or_assign(processIdentifier, std::move(name));
  }
  void removeProcess(std::int32_t processIdentifier) { names_.erase(processIdentifier); }
  void setPhysicalFootprint(std::uint64_t bytes) { footprint_ = {bytes, {}}; }
  void failPhysicalFootprint(std::string error) { footprint_ = {0, Error{5, std::move(error)}}; }
  void setThermalState(platform::ThermalState state) { thermalState_ = state; }
  void setLowPowerModeEnabled(bool enabled) { lowPowerMode_ = enabled; }
  void setLoadAverages(platform::LoadAverages averages) { loadAverages_ = averages; }

 private:
  std::map<std::int32_t, std::string> names_{{kOwnProcessIdentifier, "tarnreportingd"}};
  Result<std::uint64_t> footprint_{std::uint64_t{8} << 20, {}};
  platform::ThermalState thermalState_ = platform::ThermalState::Nominal;
  bool lowPowerMode_ = false;
  platform::LoadAverages loadAverages_;
};

}  // namespace tarn::testing
