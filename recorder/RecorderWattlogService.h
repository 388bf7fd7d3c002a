// SPDX-License-Identifier: Apache-2.0
// RecorderWattlogService: the power log as the recorder stands in for it. An event is recorded under back-end "wattlog"
// by its name, with the agent that logged it as `agent`. Every event is wanted here: unlike analytics events, nobody
// asks beforehand.
//
// Owner: the platform. Threads: the server queue.
#pragma once

#include <cstdint>
#include <string_view>

#include "platform/Clock.h"
#include "platform/WattlogService.h"

namespace tarn::recorder {

class Recorder;

class RecorderWattlogService : public platform::WattlogService {
 public:
  // The recorder and the clock outlive this.
  RecorderWattlogService(Recorder& recorder, const platform::Clock& clock) noexcept
      : recorder_(recorder), clock_(clock) {}

  // Recorded at once with the payload as it is; nothing fails, and there is no reply.
  void logRegisteredEvent(std::int32_t agentIdentifier, std::string_view eventName,
                          const plist::Dictionary& payload) override;

 private:
  Recorder& recorder_;
  const platform::Clock& clock_;
};

}  // namespace tarn::recorder
