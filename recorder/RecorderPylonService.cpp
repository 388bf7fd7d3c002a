// SPDX-License-Identifier: Apache-2.0
#include "recorder/RecorderPylonService.h"

#include <string>

#include "plist/Hex.h"
#include "recorder/Recorder.h"

namespace tarn::recorder {

void RecorderPylonService::post(std::uint32_t metricIdentifier, const platform::MetricRecord& record) {
  std::string wire;
  plist::appendHex(wire, record.serialized());
  recorder_.record("pylon", std::to_string(metricIdentifier), record.textFields(), {{"wire", wire}},
                   clock_.epochSeconds());
}

}  // namespace tarn::recorder
