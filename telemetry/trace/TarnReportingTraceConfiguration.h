// SPDX-License-Identifier: Apache-2.0
// What a client's configuration says about the trace of its session.
#pragma once

#include <string_view>

#include "plist/Dictionary.h"

namespace tarn {

// A property-list file that describes the probes; a session without it isn't traced.
inline constexpr std::string_view kProbeDescriptionsKey = "TarnReportingSkeinPlistFilePath";
// "sktrace_profile" asks for the template 3, every other value and none for 2.
inline constexpr std::string_view kTraceTypeKey = "TarnReportingTraceType";
// The result file. Its name and its folder. Without a name it is called by date, application and service; without a
// folder it lies in "Audio/Traces" of the diagnostic logs.
inline constexpr std::string_view kOutputFileNameKey = "TarnReportingSkeinOutputFileName";
inline constexpr std::string_view kOutputFileDirectoryKey = "TarnReportingSkeinOutputFileDirectory";

// The text under the key; empty when there is none. A value that is no text names no file. It ends with the next change
// of the dictionary.
inline std::string_view configuredText(const plist::Dictionary& configuration, std::string_view key) {
  const plist::ValueView value = configuration.get(key);
  return value.isText() ? value.text() : std::string_view();
}

}  // namespace tarn
