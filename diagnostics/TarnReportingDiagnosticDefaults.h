// SPDX-License-Identifier: Apache-2.0
// TarnReportingDiagnosticDefaults: the defaults suite that switches the diagnostic workers on and tunes them.
//
// It reads and writes the platform's store at once and keeps nothing. Threads: any.
#pragma once

#include <string_view>

#include "platform/DefaultsStore.h"
#include "platform/Facilities.h"
#include "service/vocabulary/TarnReportingPlatform.h"

namespace tarn {

// Stateless: one may be made wherever it is needed.
class TarnReportingDiagnosticDefaults {
 public:
  // Another suite than that of the service's own settings.
  static constexpr std::string_view kSuite = "sys.oxbow.tarnkit.tarnreporting";

  // Absent when there is none.
  plist::Value value(std::string_view key) const { return TarnReportingFacilities().defaults.value(kSuite, key); }
  // Whether it is now stored. A value that can't be stored is logged by the platform.
  [[nodiscard]] bool setValue(std::string_view key, const plist::ValueView& value) const {
    return TarnReportingFacilities().defaults.setValue(kSuite, key, value);
  }
};

}  // namespace tarn
