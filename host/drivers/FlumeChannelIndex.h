// FlumeChannelIndex: finds channels by what they are known by. Looks at names that live elsewhere and don't move.
#pragma once

#include <map>
#include <tuple>

#include "platform/FlumeService.h"

namespace tarn::linux_host {

struct FlumeNameOrder {
  bool operator()(const platform::FlumeChannelName* a, const platform::FlumeChannelName* b) const {
    return std::tie(a->driver, a->group, a->subGroup, a->name) < std::tie(b->driver, b->group, b->subGroup, b->name);
  }
};

using FlumeChannelIndex = std::map<const platform::FlumeChannelName*, const platform::FlumeChannel*, FlumeNameOrder>;

// Of channels that are known alike the first is found.
inline void addTo(FlumeChannelIndex& index, const platform::FlumeSamples& samples) {
  for (const platform::FlumeChannel& channel : samples) {
    index.emplace(&channel.name, &channel);
  }
}

inline const platform::FlumeChannel* findIn(const FlumeChannelIndex& index, const platform::FlumeChannelName& name) {
  const auto found = index.find(&name);
  return found == index.end() ? nullptr : found->second;
}

}  // namespace tarn::linux_host
