#include "tests/scenario/Vocabulary.h"

#include <array>
#include <stdexcept>
#include <string_view>

namespace tarn::scenario {

namespace {

constexpr std::array<std::string_view, 18> kCategories = {
    "Undefined", "Generic", "Record",        "Input",       "Playback", "Output", "PlaybackAndRecord",
    "IO",        "Setup",   "ClientRequest", "RouteChange", "Error",    "Flume",  "Performance",
    "Volume",    "Lagoon",  "HearingHealth", "Tessels"};
constexpr std::array<std::string_view, 20> kTypes = {"Generic",
                                                     "Start",
                                                     "Stop",
                                                     "Activate",
                                                     "Deactivate",
                                                     "Setup",
                                                     "Error",
                                                     "IssueDetector",
                                                     "Wattlog",
                                                     "AudioUnitUsage",
                                                     "MIDIDriver",
                                                     "Summary",
                                                     "HeadphoneAudioExposure",
                                                     "AudioExposure",
                                                     "Listeningenhancement",
                                                     "Fennel",
                                                     "Simple",
                                                     "Histogram",
                                                     "State",
                                                     "MemoryLog"};
constexpr std::array<std::string_view, 14> kServices = {
    "generic",         "wisp",          "telephony",        "haptics",          "alarms", "standalone",
    "soundautoconfig", "longformaudio", "nonlongformaudio", "audiodeviceusage", "alerts", "test",
    "apiusage",        "systemsounds"};

template <std::size_t kCount>
std::uint32_t numberOf(const nlohmann::json& value, const std::array<std::string_view, kCount>& names) {
  if (value.is_number_integer()) {
    return value.get<std::uint32_t>();
  }
  for (std::size_t index = 0; index < kCount; ++index) {
    if (value == std::string(names[index])) {
      return static_cast<std::uint32_t>(index);
    }
  }
  throw std::runtime_error("no such name: " + value.dump());
}

}  // namespace

std::uint32_t categoryOf(const nlohmann::json& value) {
  return numberOf(value, kCategories);
}
std::uint16_t typeOf(const nlohmann::json& value) {
  return static_cast<std::uint16_t>(numberOf(value, kTypes));
}
std::uint16_t serviceTypeOf(const nlohmann::json& value) {
  return static_cast<std::uint16_t>(numberOf(value, kServices));
}

std::string categoryText(std::uint32_t category) {
  std::string domain;
  switch (category & 0xFFFF0000U) {
    case 0:
      break;
    case 0x04000000U:
      domain = "MIDI_";
      break;
    case 0x08000000U:
      domain = "Session_";
      break;
    case 0x10000000U:
      domain = "DSP_";
      break;
    case 0x20000000U:
      domain = "HAL_";
      break;
    case 0x40000000U:
      domain = "Routing_";
      break;
    case 0x80000000U:
      domain = "Toolbox_";
      break;
    default:
      domain = category == 0xFFFFFFFFU ? "" : "_";
      break;
  }
  const std::uint32_t low = category & 0xFFFFU;
  return domain + std::string(low < kCategories.size() ? kCategories[low] : "Undefined");
}

std::string typeText(std::uint16_t type) {
  if (type == 0xFFFF) {
    return "Unknown";
  }
  return std::string(type < kTypes.size() ? kTypes[type] : "Generic");
}

std::string serviceText(std::uint16_t serviceType) {
  return std::string(serviceType < kServices.size() ? kServices[serviceType] : "unknown");
}

}  // namespace tarn::scenario
