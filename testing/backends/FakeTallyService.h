// SPDX-License-Identifier: Apache-2.0
// FakeTallyService: an analytics-event service that keeps what it is given. Every name is in use until a test says
// otherwise; payload callbacks are called at once, later or never, and only for names in use.
//
// Threads: one at a time.
#pragma once

#include <cstddef>
#include <deque>
#include <optional>
#include <set>
#include <string>
#include <string_view>
#include <vector>

#include "platform/SessionRecords.h"
#include "platform/TallyService.h"

namespace tarn::testing {

class FakeTallyService final : public platform::TallyService {
 public:
  enum class PayloadCalls {
    AtOnce,  // inside sendEventLazy
    Later,   // by callPending()
    Never,   // the callback is destroyed uncalled
  };
  struct Event {
    std::string name;
    plist::Dictionary payload;
    platform::SessionNumber session = 0;  // whose work it was to hand it over
  };

  // The interface.
  bool eventIsInUse(std::string_view name) override;
  void sendEventLazy(std::string_view name, PayloadCallback payload) override;

  // Controls.
  void useAll();
  void useOnly(std::set<std::string, std::less<>> names);
  void setPayloadCalls(PayloadCalls calls) { calls_ = calls; }
  // Calls the callbacks that wait, in order; how many there were.
  std::size_t callPending();
  void clear();

  // Observations.
  // What was recorded, in order.
  const std::vector<Event>& events() const noexcept { return events_; }
  std::vector<plist::Dictionary> payloads(std::string_view name) const;
  // Every name handed to sendEventLazy, and every name asked about.
  const std::vector<std::string>& sentNames() const noexcept { return sentNames_; }
  const std::vector<std::string>& askedNames() const noexcept { return askedNames_; }
  std::size_t pending() const noexcept { return pending_.size(); }

 private:
  struct Pending {
    std::string name;
    PayloadCallback payload;
    platform::SessionNumber session;
  };

  bool isInUse(std::string_view name) const { return !inUse_.has_value() || inUse_->contains(name); }

  std::optional<std::set<std::string, std::less<>>> inUse_;  // nothing: all
  PayloadCalls calls_ = PayloadCalls::AtOnce;
  std::deque<Pending> pending_;
  std::vector<Event> events_;
  std::vector<std::string> sentNames_;
  std::vector<std::string> askedNames_;
};

}  // namespace tarn::testing
