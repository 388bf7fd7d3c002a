// SPDX-License-Identifier: Apache-2.0
#include "recorder/RecorderSessionRecords.h"

#include <utility>

#include "recorder/Recorder.h"

namespace tarn::recorder {

using What = SessionNote::What;

SessionNote RecorderSessionRecords::noteOf(What what, platform::SessionNumber session) const {
  SessionNote note;
  note.what = what;
  note.session = session;
  note.time = clock_.epochSeconds();
  return note;
}

platform::SessionNumber RecorderSessionRecords::created(const platform::SessionFacts& facts) {
  SessionNote note = noteOf(What::Created, sessions_ + 1);
  note.facts = facts;
  recorder_.note(std::move(note));
  return ++sessions_;
}

void RecorderSessionRecords::described(platform::SessionNumber session, const platform::SessionFacts& facts) {
  SessionNote note = noteOf(What::Described, session);
  note.facts = facts;
  recorder_.note(std::move(note));
}

void RecorderSessionRecords::started(platform::SessionNumber session) {
  SessionNote note = noteOf(What::Started, session);
  note.number = periods_ + 1;
  recorder_.note(std::move(note));
  ++periods_;
}

void RecorderSessionRecords::repeated(platform::SessionNumber session, const plist::Dictionary& message) {
  if (!recorder_.marksRedundant()) return;
  SessionNote note = noteOf(What::Repeated, session);
  note.number = repeats_ + 1;
  note.message = message;
  recorder_.note(std::move(note));
  ++repeats_;
}

void RecorderSessionRecords::stopped(platform::SessionNumber session, std::uint64_t messages, std::uint64_t redundant) {
  SessionNote note = noteOf(What::Stopped, session);
  note.messages = static_cast<std::int64_t>(messages);
  note.redundant = static_cast<std::int64_t>(redundant);
  recorder_.note(std::move(note));
}

void RecorderSessionRecords::ended(platform::SessionNumber session, platform::SessionEnd end) {
  SessionNote note = noteOf(What::Ended, session);
  note.end = end;
  recorder_.note(std::move(note));
}

}  // namespace tarn::recorder
