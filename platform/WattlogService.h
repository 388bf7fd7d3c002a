// WattlogService: the power log of the device. Threads: the server queue.
#pragma once

#include <cstdint>
#include <string_view>

#include "plist/Dictionary.h"

namespace tarn::platform {

class WattlogService {
 public:
  virtual ~WattlogService() = default;
  // Logs an event of a registered agent. The payload is taken as it is now. There is no result.
  virtual void logRegisteredEvent(std::int32_t agentIdentifier, std::string_view eventName,
                                  const plist::Dictionary& payload) = 0;
};

}  // namespace tarn::platform
