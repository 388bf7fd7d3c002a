// SPDX-License-Identifier: Apache-2.0
// LinuxFlumeService: the driver report channels of all sources as one service.
//
// Every look-up and every sample reads the sources again. A channel is known by driver, group, sub-group and name; of
// two that are known alike the one of the earlier source counts. It never fails: what a source can't read is missing,
// and the source says so in the log.
//
// A difference takes buckets by their position and states by their name. A value is later minus earlier, also below
// zero. A channel that changed its format counts as it is now.
//
// Owner: the platform; the sources outlive it. Threads: those of the sources.
#pragma once

#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "platform/FlumeService.h"

namespace tarn::linux_host {

class FlumeSource;

class LinuxFlumeService final : public platform::FlumeService {
 public:
  // In the order in which they count; none of them null.
  explicit LinuxFlumeService(std::vector<FlumeSource*> sources);

  // The names of all channels there are now in the group and sub-group; a missing one matches any, a given one only
  // itself. Never null, may be empty.
  Result<std::shared_ptr<const platform::FlumeChannelSet>> copyChannels(
      const std::optional<std::string>& group, const std::optional<std::string>& subGroup) override;
  // Always the whole set, also of channels that aren't there yet. The subscription holds nothing: it only has to exist.
  Subscribed subscribe(const platform::FlumeChannelSet& channels) override;
  // In the order of the set, without the channels that can't be read now. Never null.
  SamplesResult createSamples(platform::FlumeSubscription& subscription,
                              const platform::FlumeChannelSet& subscribedChannels) override;
  // A new sample, later minus earlier; `later` itself when there is nothing to take away, null when that is null.
  SamplesResult createDelta(const std::shared_ptr<const platform::FlumeSamples>& earlier,
                            const std::shared_ptr<const platform::FlumeSamples>& later) override;

 private:
  // Not owned.
  const std::vector<FlumeSource*> sources_;
};

}  // namespace tarn::linux_host
