// TallyService: the analytics-event service of the device. Threads: the server queue.
#pragma once

#include <string_view>

#include "platform/UniqueFunction.h"
#include "plist/Dictionary.h"

namespace tarn::platform {

class TallyService {
 public:
  using PayloadCallback = UniqueFunction<plist::Dictionary()>;

  virtual ~TallyService() = default;
  // Whether anybody wants events of this name. Cheap: asked for every message.
  virtual bool eventIsInUse(std::string_view name) = 0;
  // Hands an event over whose name is in use: the caller has asked. The callback is called only when the event is
  // recorded, here or later on another thread.
  virtual void sendEventLazy(std::string_view name, PayloadCallback payload) = 0;
};

}  // namespace tarn::platform
