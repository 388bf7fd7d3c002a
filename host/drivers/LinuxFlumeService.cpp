// SPDX-License-Identifier: Apache-2.0
#include "host/drivers/LinuxFlumeService.h"

#include <algorithm>
#include <limits>
#include <map>
#include <string_view>
#include <utility>

#include "host/drivers/FlumeChannelIndex.h"
#include "host/drivers/FlumeSource.h"

namespace tarn::linux_host {

using platform::FlumeChannel;
using platform::FlumeChannelSet;
using platform::FlumeSamples;
using platform::FlumeState;

namespace {

// What was read of every source; the index looks into it.
struct Reading {
  explicit Reading(const std::vector<FlumeSource*>& sources) {
    bySource.reserve(sources.size());
    for (FlumeSource* source : sources) {
      bySource.push_back(source->read());
      addTo(index, bySource.back());
    }
  }
  Reading(const Reading&) = delete;
  Reading& operator=(const Reading&) = delete;

  std::vector<FlumeSamples> bySource;
  FlumeChannelIndex index;
};

bool matches(const std::optional<std::string>& asked, const std::optional<std::string>& name) {
  return !asked || asked == name;
}

// Held to the range: the two may lie farther apart than it reaches.
std::int64_t difference(std::int64_t later, std::int64_t earlier) {
  std::int64_t result = 0;
  if (__builtin_sub_overflow(later, earlier, &result)) {
    return later < 0 ? std::numeric_limits<std::int64_t>::min() : std::numeric_limits<std::int64_t>::max();
  }
  return result;
}

// A count that fell started again in between.
template <class Count>
Count grown(Count later, Count earlier) {
  return later < earlier ? later : later - earlier;
}

void subtract(std::vector<FlumeState>& later, const std::vector<FlumeState>& earlier) {
  std::map<std::string_view, const FlumeState*> byName;
  for (const FlumeState& state : earlier) {
    byName.emplace(state.name, &state);
  }
  for (FlumeState& state : later) {
    if (const auto before = byName.find(state.name); before != byName.end()) {
      state.transitions = grown(state.transitions, before->second->transitions);
      state.residency = grown(state.residency, before->second->residency);
    }
  }
}

void subtract(FlumeChannel& later, const FlumeChannel& earlier) {
  if (later.format != earlier.format) return;
  later.value = difference(later.value, earlier.value);
  for (std::size_t i = 0; i < std::min(later.buckets.size(), earlier.buckets.size()); ++i) {
    later.buckets[i].hits = grown(later.buckets[i].hits, earlier.buckets[i].hits);
  }
  subtract(later.states, earlier.states);
}

}  // namespace

LinuxFlumeService::LinuxFlumeService(std::vector<FlumeSource*> sources) : sources_(std::move(sources)) {}

Result<std::shared_ptr<const FlumeChannelSet>> LinuxFlumeService::copyChannels(
    const std::optional<std::string>& group, const std::optional<std::string>& subGroup) {
  const Reading reading(sources_);
  auto set = std::make_shared<FlumeChannelSet>();
  for (const FlumeSamples& samples : reading.bySource) {
    for (const FlumeChannel& channel : samples) {
      const bool isTheOne = findIn(reading.index, channel.name) == &channel;
      if (isTheOne && matches(group, channel.name.group) && matches(subGroup, channel.name.subGroup)) {
        set->push_back(channel.name);
      }
    }
  }
  return {std::move(set), {}};
}

platform::FlumeService::Subscribed LinuxFlumeService::subscribe(const FlumeChannelSet& channels) {
  // Nothing is held open: every sample looks the channels up again.
  return {std::make_shared<platform::FlumeSubscription>(), std::make_shared<const FlumeChannelSet>(channels), {}};
}

platform::FlumeService::SamplesResult LinuxFlumeService::createSamples(platform::FlumeSubscription&,
                                                                       const FlumeChannelSet& subscribedChannels) {
  const Reading reading(sources_);
  auto samples = std::make_shared<FlumeSamples>();
  for (const platform::FlumeChannelName& name : subscribedChannels) {
    if (const FlumeChannel* channel = findIn(reading.index, name)) {
      samples->push_back(*channel);
    }
  }
  return {std::move(samples), {}};
}

platform::FlumeService::SamplesResult LinuxFlumeService::createDelta(const std::shared_ptr<const FlumeSamples>& earlier,
                                                                     const std::shared_ptr<const FlumeSamples>& later) {
  if (earlier == nullptr || later == nullptr) return {later, {}};
  FlumeChannelIndex before;
  addTo(before, *earlier);
  auto delta = std::make_shared<FlumeSamples>(*later);
  for (FlumeChannel& channel : *delta) {
    if (const FlumeChannel* itsEarlier = findIn(before, channel.name)) {
      subtract(channel, *itsEarlier);
    }
  }
  return {std::move(delta), {}};
}

}  // namespace tarn::linux_host
