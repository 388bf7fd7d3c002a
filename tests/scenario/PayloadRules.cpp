#include "tests/scenario/PayloadRules.h"

#include <algorithm>
#include <array>

namespace tarn::scenario {

namespace {

constexpr const char* kStamp = "tarnreporting_timestamp";

}  // namespace

std::string PayloadRules::differenceOf(const ExpectedEvent& expected, json payload) const {
  if (expected.hasFreshStamp && !takeFreshStamp(payload)) {
    return "a stamp outside the time of playing";
  }
  if (expected.isSummary) {
    std::string fault = takeMachineFacts(payload);
    if (!fault.empty()) {
      return fault;
    }
  }
  for (const auto& [key, value] : expected.payload.items()) {
    if (!payload.contains(key)) {
      return key + " is missing";
    }
    if (payload.at(key) != value) {
      return key + " is " + payload.at(key).dump() + ", not " + value.dump();
    }
  }
  for (const auto& [key, value] : payload.items()) {
    if (!expected.payload.contains(key)) {
      return key + " is extra";
    }
  }
  return {};
}

bool PayloadRules::takeFreshStamp(json& payload) const {
  const auto stamp = payload.find(kStamp);
  if (stamp == payload.end() || !stamp->is_number()) {
    return false;
  }
  const auto seconds = stamp->get<double>();
  payload.erase(stamp);
  return seconds >= circumstances_.startedAt - kClockSlackSeconds &&
         seconds <= circumstances_.endedAt + kClockSlackSeconds;
}

// What a summary says about the machine and the client: of the right kind and possible; then it is taken out.
std::string PayloadRules::takeMachineFacts(json& payload) const {
  const auto take = [&payload](const char* key) {
    json value = payload.value(key, json());
    payload.erase(key);
    return value;
  };
  const json thermal = take("thermal_state");
  constexpr std::array kThermalStates = {"Nominal", "Fair", "Serious", "Critical", "Unknown"};
  if (std::find(kThermalStates.begin(), kThermalStates.end(), thermal) == kThermalStates.end()) {
    return "thermal_state is " + thermal.dump();
  }
  if (const json low = take("low_power_enabled"); !low.is_boolean()) {
    return "low_power_enabled is " + low.dump();
  }
  if (const json size = take("vmInfo_phys_footprint_MiB"); !size.is_number_integer() || size < 0 || size > 100000) {
    return "vmInfo_phys_footprint_MiB is " + size.dump();
  }
  for (const char* key : {"load_avg_1_min", "load_avg_5_min", "load_avg_15_min"}) {
    if (const json load = take(key); !load.is_number() || load < 0) {
      return std::string(key) + " is " + load.dump();
    }
  }
  if (const json name = take("clientProcessName"); !isClientName(name)) {
    return "clientProcessName is " + name.dump();
  }
  return {};
}

// The kernel keeps 15 bytes of a process's name, which is one less than this program's.
bool PayloadRules::isClientName(const json& name) const {
  constexpr std::size_t kKernelNameBytes = 15;
  const std::string& full = circumstances_.clientProcessName;
  return name == full || name == full.substr(0, kKernelNameBytes);
}

}  // namespace tarn::scenario
