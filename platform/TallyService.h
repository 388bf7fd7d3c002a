// SPDX-License-Identifier: Apache-2.0
// TallyService: the analytics-event service of the device. Threads: the server queue.
#pragma once

#include <string_view>

#include "platform/UniqueFunction.h"
#include "plist/Dictionary.h"

namespace tarn::platform {

// Owned by the platform. Event names are texts with dots, as "sys.oxbow.tarnkit.tarnreportingclientuptime".
class TallyService {
 public:
  // Makes the event's payload. It may be called later and on another thread, so it owns what it needs.
  using PayloadCallback = UniqueFunction<plist::Dictionary()>;

  virtual ~TallyService() = default;
  // Whether anybody wants events of this name; the answer may change from call to call. Cheap: asked for every message.
  virtual bool eventIsInUse(std::string_view name) = 0;
  // Hands an event over whose name is in use: the caller has asked. The callback is called only when the event is
  // recorded, here or later on another thread.
  virtual void sendEventLazy(std::string_view name, PayloadCallback payload) = 0;
};

}  // namespace tarn::platform
