// SPDX-License-Identifier: Apache-2.0
#include "recorder/RecorderWattlogService.h"

#include "recorder/Recorder.h"

namespace tarn::recorder {

void RecorderWattlogService::logRegisteredEvent(std::int32_t agentIdentifier, std::string_view eventName,
                                                const plist::Dictionary& payload) {
  recorder_.record("wattlog", eventName, payload, {{"agent", agentIdentifier}}, clock_.epochSeconds());
}

}  // namespace tarn::recorder
