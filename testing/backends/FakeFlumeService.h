// SPDX-License-Identifier: Apache-2.0
// FakeFlumeService: report channels that a test sets. Groups, subscriptions, samples and deltas follow the service's
// own rules; each step can be made to fail, with an error code or with nothing at all. A subscription may cover fewer
// channels than were asked for; samples of it hold those of its channels that the caller names.
//
// Threads: one at a time.
#pragma once

#include <cstddef>
#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "platform/FlumeService.h"
#include "testing/backends/OrderRecord.h"

namespace tarn::testing {

class FakeFlumeService final : public platform::FlumeService, public Recorded {
 public:
  enum class Step { CopyChannels, Subscribe, CreateSamples, CreateDelta };

  // The interface.
  Result<std::shared_ptr<const platform::FlumeChannelSet>> copyChannels(
      const std::optional<std::string>& group, const std::optional<std::string>& subGroup) override;
  Subscribed subscribe(const platform::FlumeChannelSet& channels) override;
  SamplesResult createSamples(platform::FlumeSubscription& subscription,
                              const platform::FlumeChannelSet& subscribedChannels) override;
  SamplesResult createDelta(const std::shared_ptr<const platform::FlumeSamples>& earlier,
                            const std::shared_ptr<const platform::FlumeSamples>& later) override;

  // Controls.
  // Adds a channel, or replaces the one of the same name.
  void setChannel(platform::FlumeChannel channel);
  void removeChannel(const platform::FlumeChannelName& name);
  // From here on no subscription covers the channel.
  void refuseSubscription(const platform::FlumeChannelName& name) { refused_.push_back(name); }
  // From here on a subscription comes without its handle, or without its channels.
  void withholdHandle() { withholdsHandle_ = true; }
  void withholdChannels() { withholdsChannels_ = true; }
  // From here on the step gives nothing, with this error code or with no error.
  void fail(Step step, std::optional<std::int64_t> errorCode);
  void restore(Step step) { failures_.erase(step); }

  // Observations.
  std::size_t calls(Step step) const;

 private:
  class Subscription;

  // Whether the step fails, with its error in `error`; counts the call.
  bool fails(Step step, Status& error);

  platform::FlumeSamples channels_;
  std::map<Step, std::optional<std::int64_t>> failures_;
  std::map<Step, std::size_t> calls_;
  platform::FlumeChannelSet refused_;
  bool withholdsHandle_ = false;
  bool withholdsChannels_ = false;
};

}  // namespace tarn::testing
