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

// The numbers are the service's; a channel may carry others.
enum class FlumeFormat : std::uint8_t { Invalid = 0, Simple = 1, State = 2, Histogram = 3, SimpleArray = 4 };

// What a channel is known by.
struct FlumeChannelName {
  std::optional<std::string> driver;
  std::optional<std::string> group;
  std::optional<std::string> subGroup;
  std::optional<std::string> name;
  friend bool operator==(const FlumeChannelName&, const FlumeChannelName&) = default;
};

struct FlumeBucket {
  std::int64_t lower = 0;
  std::int64_t upper = 0;
  std::int64_t hits = 0;
  std::int32_t boundsError = 0;  // not 0: the bounds could not be read and mean little
};

struct FlumeState {
  std::string name;
  std::uint64_t transitions = 0;  // into the state
  std::uint64_t residency = 0;    // in the channel's unit
  double dutyCycle = 0;
};

// One channel as it was sampled. Only the fields of its format mean something.
struct FlumeChannel {
  FlumeChannelName name;
  FlumeFormat format = FlumeFormat::Invalid;
  std::optional<std::string> unit;
  std::int64_t value = 0;            // Simple
  std::int64_t minimum = 0;          // Histogram
  std::int64_t maximum = 0;          // Histogram
  std::vector<FlumeBucket> buckets;  // Histogram
  std::vector<FlumeState> states;    // State
};

using FlumeChannelSet = std::vector<FlumeChannelName>;
using FlumeSamples = std::vector<FlumeChannel>;

// The service's handle for a subscription.
class FlumeSubscription {
 public:
  virtual ~FlumeSubscription() = default;
};

class FlumeService {
 public:
  struct Subscribed {
    std::shared_ptr<FlumeSubscription> subscription;  // none: it failed
    std::shared_ptr<const FlumeChannelSet> channels;  // those that were subscribed, maybe not all; none: it failed
    Status error;
  };
  using SamplesResult = Result<std::shared_ptr<const FlumeSamples>>;

  virtual ~FlumeService() = default;
  // The channels of a group and sub-group; a missing name matches any.
  virtual Result<std::shared_ptr<const FlumeChannelSet>> copyChannels(const std::optional<std::string>& group,
                                                                      const std::optional<std::string>& subGroup) = 0;
  // Begins to watch the channels, until the subscription is destroyed.
  virtual Subscribed subscribe(const FlumeChannelSet& channels) = 0;
  // What the subscribed channels hold now. A channel that can't be read is missing from it.
  virtual SamplesResult createSamples(FlumeSubscription& subscription, const FlumeChannelSet& subscribedChannels) = 0;
  // Later minus earlier for values, hits, transitions and residencies, the later sample's own for the rest. Hits,
  // transitions or residencies that fell mean that the driver restarted: the later number counts. Against nothing it
  // is the later sample.
  virtual SamplesResult createDelta(const std::shared_ptr<const FlumeSamples>& earlier,
                                    const std::shared_ptr<const FlumeSamples>& later) = 0;
};

}  // namespace tarn::platform
