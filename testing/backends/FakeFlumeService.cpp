// SPDX-License-Identifier: Apache-2.0
#include "testing/backends/FakeFlumeService.h"

#include <algorithm>
#include <array>
#include <utility>

namespace tarn::testing {

using platform::FlumeChannel;
using platform::FlumeChannelName;
using platform::FlumeChannelSet;
using platform::FlumeSamples;

namespace {

const FlumeChannel* find(const FlumeSamples& samples, const FlumeChannelName& name) {
  const auto found =
      std::find_if(samples.begin(), samples.end(), [&](const FlumeChannel& each) { return each.name == name; });
  return found == samples.end() ? nullptr : &*found;
}

// A count that fell started again in between.
template <class Count>
Count grown(Count later, Count earlier) {
  return later < earlier ? later : later - earlier;
}

void subtract(FlumeChannel& later, const FlumeChannel& earlier) {
  later.value -= earlier.value;
  for (std::size_t i = 0; i < std::min(later.buckets.size(), earlier.buckets.size()); ++i) {
    later.buckets[i].hits = grown(later.buckets[i].hits, earlier.buckets[i].hits);
  }
  for (auto& state : later.states) {
    const auto before = std::find_if(earlier.states.begin(), earlier.states.end(),
                                     [&](const platform::FlumeState& each) { return each.name == state.name; });
    if (before != earlier.states.end()) {
      state.transitions = grown(state.transitions, before->transitions);
      state.residency = grown(state.residency, before->residency);
    }
  }
}

bool holds(const FlumeChannelSet& set, const FlumeChannelName& name) {
  return std::find(set.begin(), set.end(), name) != set.end();
}

constexpr std::array<const char*, 4> kStepNames{"flume channels", "flume subscribe", "flume samples", "flume delta"};

}  // namespace

class FakeFlumeService::Subscription final : public platform::FlumeSubscription {
 public:
  explicit Subscription(FlumeChannelSet channels) : channels_(std::move(channels)) {}
  const FlumeChannelSet& channels() const noexcept { return channels_; }

 private:
  const FlumeChannelSet channels_;
};

Result<std::shared_ptr<const FlumeChannelSet>> FakeFlumeService::copyChannels(
    const std::optional<std::string>& group, const std::optional<std::string>& subGroup) {
  Result<std::shared_ptr<const FlumeChannelSet>> result;
  if (fails(Step::CopyChannels, result.error)) return result;
  FlumeChannelSet set;
  for (const auto& channel : channels_) {
    if ((!group || channel.name.group == group) && (!subGroup || channel.name.subGroup == subGroup)) {
      set.push_back(channel.name);
    }
  }
  result.value = std::make_shared<const FlumeChannelSet>(std::move(set));
  return result;
}

FakeFlumeService::Subscribed FakeFlumeService::subscribe(const FlumeChannelSet& channels) {
  Subscribed subscribed;
  if (fails(Step::Subscribe, subscribed.error)) return subscribed;
  FlumeChannelSet covered = channels;
  std::erase_if(covered, [this](const FlumeChannelName& name) { return holds(refused_, name); });
  if (!withholdsHandle_) {
    subscribed.subscription = std::make_shared<Subscription>(covered);
  }
  if (!withholdsChannels_) {
    subscribed.channels = std::make_shared<const FlumeChannelSet>(std::move(covered));
  }
  return subscribed;
}

platform::FlumeService::SamplesResult FakeFlumeService::createSamples(platform::FlumeSubscription& subscription,
                                                                      const FlumeChannelSet& subscribedChannels) {
  SamplesResult result;
  if (fails(Step::CreateSamples, result.error)) return result;
  const FlumeChannelSet& covered = static_cast<const Subscription&>(subscription).channels();
  FlumeSamples samples;
  for (const auto& name : subscribedChannels) {
    const auto* channel = find(channels_, name);
    if (channel != nullptr && holds(covered, name)) {
      samples.push_back(*channel);
    }
  }
  result.value = std::make_shared<const FlumeSamples>(std::move(samples));
  return result;
}

platform::FlumeService::SamplesResult FakeFlumeService::createDelta(const std::shared_ptr<const FlumeSamples>& earlier,
                                                                    const std::shared_ptr<const FlumeSamples>& later) {
  SamplesResult result;
  if (fails(Step::CreateDelta, result.error)) return result;
  if (earlier == nullptr || later == nullptr) {
    result.value = later;
    return result;
  }
  FlumeSamples delta = *later;
  for (auto& channel : delta) {
    if (const auto* before = find(*earlier, channel.name)) {
      subtract(channel, *before);
    }
  }
  result.value = std::make_shared<const FlumeSamples>(std::move(delta));
  return result;
}

void FakeFlumeService::setChannel(FlumeChannel channel) {
  const auto found = std::find_if(channels_.begin(), channels_.end(),
                                  [&](const FlumeChannel& each) { return each.name == channel.name; });
  if (found == channels_.end()) {
    channels_.push_back(std::move(channel));
  } else {
    *found = std::move(channel);
  }
}

void FakeFlumeService::removeChannel(const FlumeChannelName& name) {
  std::erase_if(channels_, [&](const FlumeChannel& each) { return each.name == name; });
}

void FakeFlumeService::fail(Step step, std::optional<std::int64_t> errorCode) {
  failures_.insert_or_assign(step, errorCode);
}

std::size_t FakeFlumeService::calls(Step step) const {
  const auto found = calls_.find(step);
  return found == calls_.end() ? 0 : found->second;
}

bool FakeFlumeService::fails(Step step, Status& error) {
  ++calls_[step];
  happened(kStepNames[static_cast<std::size_t>(step)]);
  const auto found = failures_.find(step);
  if (found == failures_.end()) return false;
  if (found->second) {
    error = Error{*found->second, "ordered by the test"};
  }
  return true;
}

}  // namespace tarn::testing
