// The defaults suite that switches the diagnostic workers on and tunes them.
#pragma once

#include <string_view>

namespace tarn {

inline constexpr std::string_view kTarnReportingDiagnosticSuite = "sys.oxbow.tarnkit.tarnreporting";

}  // namespace tarn
