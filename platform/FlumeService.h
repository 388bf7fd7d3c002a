// SPDX-License-Identifier: Apache-2.0
// FlumeService: the report channels in which drivers publish what they count.
//
// Use: copyChannels of a group, subscribe to them once, createSamples as often as wanted, createDelta of two samples.
// Samples are snapshots: nothing changes them afterwards. Each operation may give nothing at all without an error.
//
// Threads: the server queue; samples may be read on any.
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "plist/Result.h"

namespace tarn::platform {

// What a channel holds: one number, states with their times, or counts of how often a value lay in which range. The
// numbers are the service's; a channel may carry others.
enum class FlumeFormat : std::uint8_t { Invalid = 0, Simple = 1, State = 2, Histogram = 3, SimpleArray = 4 };

// What a channel is known by. A part that the driver doesn't tell is missing, which is not the same as an empty one.
struct FlumeChannelName {
  // The driver's own name, with what tells two of a kind apart: "OxbowFoo<0x12>".
  std::optional<std::string> driver;
  // By which channels are asked for.
  std::optional<std::string> group;
  std::optional<std::string> subGroup;
  // The channel's, within its sub-group.
  std::optional<std::string> name;
  // All four parts, missing ones equal to missing ones.
  friend bool operator==(const FlumeChannelName&, const FlumeChannelName&) = default;
};

// A part of a histogram: how often the value lay between the bounds, which are in the channel's unit.
struct FlumeBucket {
  std::int64_t lower = 0;
  std::int64_t upper = 0;
  std::int64_t hits = 0;
  std::int32_t boundsError = 0;  // not 0: the bounds could not be read and mean little
};

// A state of a channel, in the order in which the driver lists them.
struct FlumeState {
  // Tells the state apart within its channel.
  std::string name;
  std::uint64_t transitions = 0;  // into the state
  std::uint64_t residency = 0;    // in the channel's unit
  // The share of time in the state, as the driver tells it.
  double dutyCycle = 0;
};

// One channel as it was sampled. Only the fields of its format mean something; a simple array has none here.
struct FlumeChannel {
  FlumeChannelName name;
  FlumeFormat format = FlumeFormat::Invalid;
  // Of value, minimum, maximum, bounds and residencies, as the driver writes it ("us", "times").
  std::optional<std::string> unit;
  std::int64_t value = 0;  // Simple
  // The range of the histogram as a whole.
  std::int64_t minimum = 0;          // Histogram
  std::int64_t maximum = 0;          // Histogram
  std::vector<FlumeBucket> buckets;  // Histogram
  std::vector<FlumeState> states;    // State
};

// Names of channels, and samples of channels; both in the service's order.
using FlumeChannelSet = std::vector<FlumeChannelName>;
using FlumeSamples = std::vector<FlumeChannel>;

// The service's handle for a subscription: it lasts as long as this does. Owned by whoever subscribed.
class FlumeSubscription {
 public:
  virtual ~FlumeSubscription() = default;
};

// Owned by the platform. Each call may read files or ask drivers, so it is for starts and stops of sessions, not for
// each message. What it gives is shared and never changes, so it may be kept.
class FlumeService {
 public:
  // What came of a subscription.
  struct Subscribed {
    std::shared_ptr<FlumeSubscription> subscription;  // none: it failed
    std::shared_ptr<const FlumeChannelSet> channels;  // those that were subscribed, maybe not all; none: it failed
    Status error;
  };
  // Null without an error: there is nothing to sample.
  using SamplesResult = Result<std::shared_ptr<const FlumeSamples>>;

  virtual ~FlumeService() = default;
  // The channels of a group and sub-group that are there now; a missing name matches any. Maybe an empty set, or none.
  virtual Result<std::shared_ptr<const FlumeChannelSet>> copyChannels(const std::optional<std::string>& group,
                                                                      const std::optional<std::string>& subGroup) = 0;
  // Begins to watch the channels, until the subscription is destroyed.
  virtual Subscribed subscribe(const FlumeChannelSet& channels) = 0;
  // What the subscribed channels hold now. A channel that can't be read, or has gone, is missing from it.
  virtual SamplesResult createSamples(FlumeSubscription& subscription, const FlumeChannelSet& subscribedChannels) = 0;
  // Later minus earlier for values, hits, transitions and residencies, the later sample's own for the rest. Hits,
  // transitions or residencies that fell mean that the driver restarted: the later number counts. Channels are found by
  // their names; one that the earlier sample lacks, or has in another format, is as the later one has it. Against
  // nothing it is the later sample. Differences are held to the range of their type.
  virtual SamplesResult createDelta(const std::shared_ptr<const FlumeSamples>& earlier,
                                    const std::shared_ptr<const FlumeSamples>& later) = 0;
};

}  // namespace tarn::platform
