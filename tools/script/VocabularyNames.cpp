// SPDX-License-Identifier: Apache-2.0
#include "tools/script/VocabularyNames.h"

#include "service/vocabulary/TarnReportingVocabulary.h"

namespace tarn::script {

std::optional<std::uint64_t> NameTable::numberOf(std::string_view name) const {
  const std::uint64_t number = parser_(name);
  if (number == parser_(fallbackName_) && name != fallbackName_) return std::nullopt;
  return number;
}

std::string NameTable::listed() const {
  constexpr std::uint64_t kBeyondAllNames = 32;
  std::string list;
  bool holdsFallback = false;
  for (std::uint64_t number = 0; number < kBeyondAllNames; ++number) {
    const std::string name = printer_(number);
    if (numberOf(name) == number) {
      list += list.empty() ? name : ", " + name;
      holdsFallback = holdsFallback || name == fallbackName_;
    }
  }
  return holdsFallback ? list : list + ", " + std::string(fallbackName_);
}

const NameTable& categoryNames() {
  static constexpr NameTable kTable(
      [](std::string_view name) { return static_cast<std::uint64_t>(TarnReportingUtilityCategoryFromString(name)); },
      [](std::uint64_t number) { return TarnReportingUtilityCategoryString(static_cast<AudioEventCategory>(number)); },
      "Unknown");
  return kTable;
}

const NameTable& typeNames() {
  static constexpr NameTable kTable(
      [](std::string_view name) { return static_cast<std::uint64_t>(TarnReportingUtilityTypeFromString(name)); },
      [](std::uint64_t number) {
        return std::string(TarnReportingUtilityTypeString(static_cast<AudioEventType>(number)));
      },
      "Generic");
  return kTable;
}

const NameTable& serviceTypeNames() {
  static constexpr NameTable kTable(
      [](std::string_view name) {
        return static_cast<std::uint64_t>(TarnReportingUtilityGenerateServiceTypeFromServiceName(name));
      },
      [](std::uint64_t number) {
        return std::string(
            TarnReportingUtilityGenerateServiceNameFromServiceType(static_cast<AudioServiceType>(number)));
      },
      "unknown");
  return kTable;
}

}  // namespace tarn::script
