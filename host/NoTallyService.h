// SPDX-License-Identifier: Apache-2.0
// NoTallyService: the analytics-event service of a machine that has none: nobody wants an event. It stands there
// because every platform has this facility, where others may be lacking: workers ask it before they form an event, and
// so form none.
//
// Owned by the platform. Threads: any.
#pragma once

#include "platform/TallyService.h"

namespace tarn::linux_host {

class NoTallyService final : public platform::TallyService {
 public:
  bool eventIsInUse(std::string_view) override { return false; }
  // The payload is never asked for.
  void sendEventLazy(std::string_view, PayloadCallback) override {}
};

}  // namespace tarn::linux_host
