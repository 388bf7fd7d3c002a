// SPDX-License-Identifier: Apache-2.0
// Builders for what the fleet's tests are about.
#pragma once

#include <map>
#include <string>
#include <utility>

#include "fleet/format/Message.h"
#include "fleet/store/StoredSessions.h"

namespace tarn::testing {

// Of events 11 and 13, with 12 left out and a gap from 14 to 20; then 21.
inline fleet::v1::Batch someBatch() {
  fleet::v1::Batch batch;
  batch.set_device(std::string(fleet::kDeviceBytes, 'd'));
  batch.set_looked_at(1'750'000'000'000'000);
  batch.set_first(11);
  batch.set_last(21);
  batch.set_left_out(1);
  fleet::v1::Gap& gap = *batch.add_gaps();
  gap.set_first(14);
  gap.set_last(20);
  fleet::v1::Run& run = *batch.add_runs();
  run.set_id(1);
  run.set_boot("boot");
  run.set_started(1750000000);
  run.set_machine("{}");
  fleet::v1::Session& session = *batch.add_sessions();
  session.set_id(5);
  session.set_run(0);
  fleet::v1::Kind& kind = *batch.add_kinds();
  kind.set_backend("tally");
  kind.set_name("sys.oxbow.tarnkit.Volume.Summary");
  kind.set_detail("{}");
  for (const std::uint32_t ahead : {0U, 2U, 10U}) {
    fleet::v1::Event& event = *batch.add_events();
    event.set_ahead(ahead);
    event.set_time(1750000000 + ahead);
    event.set_session(ahead == 10 ? 0 : 1);
    event.set_payload(R"({"play_seconds":2.5})");
  }
  return batch;
}

// What a store would tell of sessions, from memory.
class MadeUpSessions final : public fleet::StoredSessions {
 public:
  Result<std::optional<fleet::StoredSession>> find(std::int64_t id) override {
    const auto known = sessions_.find(id);
    if (known == sessions_.end()) return {};
    return {known->second, {}};
  }
  // A session of the first run that has ended, for a test to change.
  fleet::StoredSession& add(std::int64_t id) {
    fleet::StoredSession& made = sessions_[id];
    made.session.id = id;
    made.session.run = 1;
    made.session.process = "player";
    made.session.application = "org.example.music";
    made.session.created = 1750000000;
    made.session.ended = 1750000100;
    made.session.endReason = "stopped";
    made.run.id = 1;
    made.run.boot = "boot";
    made.run.version = "1.2.3";
    made.run.started = 1749999000;
    return made;
  }

 private:
  std::map<std::int64_t, fleet::StoredSession> sessions_;
};

}  // namespace tarn::testing
