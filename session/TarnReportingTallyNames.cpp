// SPDX-License-Identifier: Apache-2.0
#include "session/TarnReportingTallyNames.h"

#include <utility>

namespace tarn {

const TarnReportingTallyNames::Names& TarnReportingTallyNames::of(AudioServiceType serviceType,
                                                                  AudioEventCategory category, AudioEventType type) {
  const std::uint64_t key = std::uint64_t{static_cast<std::uint32_t>(category)} << 32U |
                            std::uint64_t{static_cast<std::uint16_t>(type)} << 16U |
                            static_cast<std::uint16_t>(serviceType);
  if (const auto found = names_.find(key); found != names_.end()) return found->second;
  if (names_.size() == kLimit) {
    names_.clear();
  }
  std::string kind = TarnReportingUtilityCategoryString(category) + ".";
  kind += TarnReportingUtilityTypeString(type);
  std::string service(TarnReportingUtilityGenerateServiceNameFromServiceType(serviceType));
  return names_.emplace(key, Names{"sys.oxbow.tarnkit." + kind, "sys.oxbow." + service + "." + kind}).first->second;
}

}  // namespace tarn
