// The descriptions of a trace's probes, as a property-list file gives them: one dictionary, or an array of them.
//
// Threads: the server queue.
#pragma once

#include <optional>
#include <string_view>
#include <vector>

#include "plist/Dictionary.h"

namespace tarn {

// Nothing when the file describes no probe; what is wrong with it is logged.
std::optional<std::vector<plist::Dictionary>> readProbeDescriptions(std::string_view path);

}  // namespace tarn
