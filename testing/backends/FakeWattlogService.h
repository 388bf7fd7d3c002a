// SPDX-License-Identifier: Apache-2.0
// FakeWattlogService: a power log that keeps what it is given. Threads: one at a time.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "platform/WattlogService.h"
#include "testing/backends/OrderRecord.h"

namespace tarn::testing {

class FakeWattlogService final : public platform::WattlogService, public Recorded {
 public:
  struct Event {
    std::int32_t agentIdentifier = 0;
    std::string name;
    plist::Dictionary payload;
  };

  // The interface.
  void logRegisteredEvent(std::int32_t agentIdentifier, std::string_view eventName,
                          const plist::Dictionary& payload) override {
    happened("power", eventName);
    events_.push_back({agentIdentifier, std::string(eventName), payload});
  }

  // Controls.
  void clear() { events_.clear(); }

  // Observations.
  const std::vector<Event>& events() const noexcept { return events_; }

 private:
  std::vector<Event> events_;
};

}  // namespace tarn::testing
