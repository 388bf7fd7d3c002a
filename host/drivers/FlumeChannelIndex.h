// SPDX-License-Identifier: Apache-2.0
// FlumeChannelIndex: finds channels by what they are known by. Looks at names that live elsewhere and don't move: the
// samples outlive the index and stay as they are, so no name is copied for a look-up.
//
// Used within one reading or one difference. Threads: one at a time.
#pragma once

#include <map>
#include <tuple>

#include "platform/FlumeService.h"

namespace tarn::linux_host {

// By driver, group, sub-group and name, byte by byte; a missing part stands before every text, so it isn't the same as
// an empty one.
struct FlumeNameOrder {
  bool operator()(const platform::FlumeChannelName* a, const platform::FlumeChannelName* b) const {
    return std::tie(a->driver, a->group, a->subGroup, a->name) < std::tie(b->driver, b->group, b->subGroup, b->name);
  }
};

// Names to channels, both of the samples that were added.
using FlumeChannelIndex = std::map<const platform::FlumeChannelName*, const platform::FlumeChannel*, FlumeNameOrder>;

// Adds all channels of a sample. Of channels that are known alike the first is found, also over several calls.
inline void addTo(FlumeChannelIndex& index, const platform::FlumeSamples& samples) {
  for (const platform::FlumeChannel& channel : samples) {
    index.emplace(&channel.name, &channel);
  }
}

// The channel of this name, or null. A logarithm of comparisons.
inline const platform::FlumeChannel* findIn(const FlumeChannelIndex& index, const platform::FlumeChannelName& name) {
  const auto found = index.find(&name);
  return found == index.end() ? nullptr : found->second;
}

}  // namespace tarn::linux_host
