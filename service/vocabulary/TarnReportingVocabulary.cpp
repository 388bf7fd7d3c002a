// SPDX-License-Identifier: Apache-2.0
#include "service/vocabulary/TarnReportingVocabulary.h"

#include <array>
#include <cstddef>
#include <unordered_map>

namespace tarn {

namespace {

constexpr std::uint32_t kDomainMask = 0xFFFF0000;
constexpr std::uint32_t kCategoryMask = 0x0000FFFF;
constexpr double kVolumeMinimumPlayingSeconds = 0.5;

// By category; category 0 has no name.
constexpr std::array<std::string_view, 18> kCategoryNames{
    "Undefined", "Generic", "Record",        "Input",       "Playback", "Output", "PlaybackAndRecord",
    "IO",        "Setup",   "ClientRequest", "RouteChange", "Error",    "Flume",  "Performance",
    "Volume",    "Lagoon",  "HearingHealth", "Tessels"};

struct DomainName {
  std::uint32_t mask;
  std::string_view name;
};
constexpr std::array<DomainName, 6> kDomainNames{{{0x04000000, "MIDI"},
                                                  {0x08000000, "Session"},
                                                  {0x10000000, "DSP"},
                                                  {0x20000000, "HAL"},
                                                  {0x40000000, "Routing"},
                                                  {0x80000000, "Toolbox"}}};

// By type.
constexpr std::array<std::string_view, 20> kTypeNames{"Generic",
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

// By service type.
constexpr std::array<std::string_view, 14> kServiceNames{
    "generic",         "wisp",          "telephony",        "haptics",          "alarms", "standalone",
    "soundautoconfig", "longformaudio", "nonlongformaudio", "audiodeviceusage", "alerts", "test",
    "apiusage",        "systemsounds"};

// A value is in the range where the high half tells a domain when that half is set and the whole isn't Unknown.
bool hasDomain(AudioEventCategory category) {
  const auto value = static_cast<std::uint32_t>(category);
  return (value & kDomainMask) != 0 && category != AudioEventCategory::Unknown;
}

// The parsers' tables leave out what the printers know on purpose: "Tessels" and "MemoryLog" were never taught to them,
// and what clients rely on stays as it is.
const std::unordered_map<std::string_view, AudioEventCategory>& categoriesByName() {
  static const auto kTable = [] {
    std::unordered_map<std::string_view, AudioEventCategory> categories;
    for (std::size_t value = 1; value <= static_cast<std::size_t>(AudioEventCategory::HearingHealth); ++value) {
      categories.emplace(kCategoryNames[value], static_cast<AudioEventCategory>(value));
    }
    return categories;
  }();
  return kTable;
}

const std::unordered_map<std::string_view, AudioEventType>& typesByName() {
  static const auto kTable = [] {
    std::unordered_map<std::string_view, AudioEventType> types;
    for (std::size_t value = 0; value < static_cast<std::size_t>(AudioEventType::MemoryLog); ++value) {
      types.emplace(kTypeNames[value], static_cast<AudioEventType>(value));
    }
    types.emplace("Unknown", AudioEventType::Unknown);
    return types;
  }();
  return kTable;
}

}  // namespace

std::string TarnReportingUtilityCategoryString(AudioEventCategory category) {
  const auto value = static_cast<std::uint32_t>(category);
  std::string string;
  if (hasDomain(category)) {
    for (const DomainName& domain : kDomainNames) {
      if (domain.mask == (value & kDomainMask)) {
        string.append(domain.name);
      }
    }
    string.push_back('_');
  }
  const std::size_t index = value & kCategoryMask;
  string.append(kCategoryNames[index < kCategoryNames.size() ? index : 0]);
  return string;
}

AudioEventCategory TarnReportingUtilityCategoryFromString(std::string_view string) {
  const auto found = categoriesByName().find(string);
  return found == categoriesByName().end() ? AudioEventCategory::Unknown : found->second;
}

std::string_view TarnReportingUtilityTypeString(AudioEventType type) {
  if (type == AudioEventType::Unknown) return "Unknown";
  const auto index = static_cast<std::size_t>(type);
  return kTypeNames[index < kTypeNames.size() ? index : 0];
}

AudioEventType TarnReportingUtilityTypeFromString(std::string_view string) {
  const auto found = typesByName().find(string);
  return found == typesByName().end() ? AudioEventType::Generic : found->second;
}

std::string_view TarnReportingUtilityGenerateServiceNameFromServiceType(AudioServiceType serviceType) {
  const auto index = static_cast<std::size_t>(serviceType);
  return index < kServiceNames.size() ? kServiceNames[index] : "unknown";
}

AudioServiceType TarnReportingUtilityGenerateServiceTypeFromServiceName(std::string_view name) {
  for (std::size_t index = 0; index < kServiceNames.size(); ++index) {
    if (kServiceNames[index] == name) return static_cast<AudioServiceType>(index);
  }
  return AudioServiceType::Unknown;
}

bool TarnReportingUtilityIsABTestModeOn(AudioEventCategory category) {
  return hasDomain(category);
}

bool TarnReportingUtilityShouldSendMessage() {
  return true;
}

std::int64_t TarnReportingUtilityExtractSessionIDFromReporterID(std::int64_t reporterID) {
  return reporterID;
}

double TarnReportingUtilityVolumeMinimumPlayingTime(AudioServiceType) {
  return kVolumeMinimumPlayingSeconds;
}

}  // namespace tarn
