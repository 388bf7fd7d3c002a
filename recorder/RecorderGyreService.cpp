// SPDX-License-Identifier: Apache-2.0
#include "recorder/RecorderGyreService.h"

#include "recorder/Recorder.h"

namespace tarn::recorder {

void RecorderGyreService::requestGyre(const platform::GyreRequest& request) {
  plist::Array options;
  for (const std::int32_t option : request.options) {
    options.append(option);
  }
  const plist::Dictionary detail{{"subsystem", request.subsystem},
                                 {"reason", request.reason},
                                 {"application", request.applicationIdentifier},
                                 {"options", options}};
  recorder_.record("gyre", "requestGyre", request.payload, detail, clock_.epochSeconds());
}

}  // namespace tarn::recorder
