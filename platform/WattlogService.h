// SPDX-License-Identifier: Apache-2.0
// WattlogService: the power log of the device. Threads: the server queue.
#pragma once

#include <cstdint>
#include <string_view>

#include "plist/Dictionary.h"

namespace tarn::platform {

// Owned by the platform, which may lack it.
class WattlogService {
 public:
  virtual ~WattlogService() = default;
  // Logs an event under the number of an agent that the power log knows: who uses power, and for what. The payload is
  // taken as it is now; its keys are the event's own. There is no result.
  virtual void logRegisteredEvent(std::int32_t agentIdentifier, std::string_view eventName,
                                  const plist::Dictionary& payload) = 0;
};

}  // namespace tarn::platform
