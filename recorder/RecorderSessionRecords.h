// SPDX-License-Identifier: Apache-2.0
// RecorderSessionRecords: keeps the record of the sessions in the recorder's file, in order with the events and as safe
// as they are. What is told waits with the events until the writer comes to it.
//
// Owner: the platform. Threads: the server queue; enter() any.
#pragma once

#include <cstdint>

#include "platform/Clock.h"
#include "platform/SessionRecords.h"
#include "recorder/store/SessionTable.h"

namespace tarn::recorder {

class Recorder;

class RecorderSessionRecords final : public platform::SessionRecords {
 public:
  // Sets for which session the calling thread works, and answers for which it did.
  using Enter = platform::SessionNumber (*)(platform::SessionNumber session) noexcept;

  // The recorder and the clock outlive this.
  RecorderSessionRecords(Recorder& recorder, const platform::Clock& clock, Enter setter) noexcept
      : recorder_(recorder), clock_(clock), enter_(setter) {}

  platform::SessionNumber created(const platform::SessionFacts& facts) override;
  void described(platform::SessionNumber session, const platform::SessionFacts& facts) override;
  void started(platform::SessionNumber session) override;
  void repeated(platform::SessionNumber session, const plist::Dictionary& message) override;
  void stopped(platform::SessionNumber session, std::uint64_t messages, std::uint64_t redundant) override;
  void ended(platform::SessionNumber session, platform::SessionEnd end) override;
  platform::SessionNumber enter(platform::SessionNumber session) noexcept override { return enter_(session); }

 private:
  SessionNote noteOf(SessionNote::What what, platform::SessionNumber session) const;

  Recorder& recorder_;
  const platform::Clock& clock_;
  const Enter enter_;
  // Numbers given so far.
  platform::SessionNumber sessions_ = 0;
  std::int64_t periods_ = 0;
  std::int64_t repeats_ = 0;
};

}  // namespace tarn::recorder
