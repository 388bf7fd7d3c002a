// NoTallyService: the analytics-event service of a machine that has none: nobody wants an event.
//
// Owned by the platform. Threads: any.
#pragma once

#include "platform/TallyService.h"

namespace tarn::linux_host {

class NoTallyService final : public platform::TallyService {
 public:
  bool eventIsInUse(std::string_view) override { return false; }
  void sendEventLazy(std::string_view, PayloadCallback) override {}
};

}  // namespace tarn::linux_host
