// SPDX-License-Identifier: Apache-2.0
// The descriptions of a trace's probes, as a property-list file gives them: one dictionary, or an array of them.
//
// Threads: the server queue.
#pragma once

#include <optional>
#include <string_view>
#include <vector>

#include "plist/Dictionary.h"

namespace tarn {

// Nothing when the file describes no probe; what is wrong with it is logged. Entries of an array that are no
// dictionaries are left out with an error line each; when all of them are, the list is empty, and the results are those
// of the signposts alone. A file that can't be read, is no property list or exceeds the bounds of one is nothing.
std::optional<std::vector<plist::Dictionary>> readProbeDescriptions(std::string_view path);

}  // namespace tarn
