// SPDX-License-Identifier: Apache-2.0
// CountedSessions: the keeper of sessions where nothing is recorded. It numbers them, so that log entries tell for
// which of them the service worked, and keeps nothing else.
//
// Owned by the platform. Threads: the server queue; enter() any.
#pragma once

#include "host/loop/WorkOwner.h"
#include "platform/SessionRecords.h"

namespace tarn::linux_host {

class CountedSessions final : public platform::SessionRecords {
 public:
  platform::SessionNumber created(const platform::SessionFacts&) override { return ++sessions_; }
  void described(platform::SessionNumber, const platform::SessionFacts&) override {}
  void started(platform::SessionNumber) override {}
  void repeated(platform::SessionNumber, const plist::Dictionary&) override {}
  void stopped(platform::SessionNumber, std::uint64_t, std::uint64_t) override {}
  void ended(platform::SessionNumber, platform::SessionEnd) override {}
  platform::SessionNumber enter(platform::SessionNumber session) noexcept override { return WorkOwner::enter(session); }

 private:
  platform::SessionNumber sessions_ = 0;
};

}  // namespace tarn::linux_host
