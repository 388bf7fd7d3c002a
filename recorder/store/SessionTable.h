// SPDX-License-Identifier: Apache-2.0
// SessionTable: runs, sessions and their periods as rows of the recorder's file, written within the transactions of the
// events, in order with them.
//
//   runs(id, boot, version, started, ended, end_reason, machine)         one row a run of the service
//   sessions(id, run, ..., created, ended, end_reason)                   id: what the file gave before + the number
//   periods(id, session, started, stopped, messages, redundant, first_event, last_event)
//   redundant_messages(id, session, period, time, stamp, event, after_event)
//
// What a note says may be written twice, as after a commit that failed and was in all the same: it says the same then.
// A row that isn't there, since the file is another one, is made with what the note says. Owner: the event file.
// Threads: the writer's. What fails answers SQLite's code.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <unordered_map>
#include <utility>
#include <vector>

#include "platform/SessionRecords.h"
#include "recorder/store/SessionSums.h"
#include "recorder/store/rows/Connection.h"
#include "recorder/store/rows/Statement.h"

namespace tarn::recorder {

// Something that happened to a session, as the clients' thread leaves it for the writer.
struct SessionNote {
  enum class What { Created, Described, Started, Repeated, Stopped, Ended };
  What what = What::Created;
  platform::SessionNumber session = 0;
  double time = 0;               // epoch seconds
  platform::SessionFacts facts;  // Created, Described
  std::int64_t number = 0;       // Started, Repeated: of the period or the repeat in this run, from 1
  plist::Dictionary message;     // Repeated
  std::int64_t messages = 0;     // Stopped
  std::int64_t redundant = 0;    // Stopped
  platform::SessionEnd end{};    // Ended
};

// What the row of a run says.
struct RunFacts {
  std::string boot;
  std::string version;
  double started = 0;   // epoch seconds
  std::string machine;  // a JSON object
};

class SessionTable {
 public:
  SessionTable() = default;
  SessionTable(const SessionTable&) = delete;
  SessionTable& operator=(const SessionTable&) = delete;

  // Gets ready for a connection, which outlives it until finalize().
  [[nodiscard]] int prepare(Connection& connection);
  void finalize() noexcept;

  // Adds the row of this run, once a file, and closes what runs before it left open: a session ends with its last event
  // then, by the reason "killed". The ids of this run's rows go on after all that the first file ever gave, also where
  // rows were carried into it before this call. In a transaction.
  [[nodiscard]] int beginRun(const RunFacts& run);
  // This run ended well. In a transaction.
  [[nodiscard]] int endRun(double time);
  // `seconds` is now, on the recorder's own time. In a transaction, after the events that came before the note.
  [[nodiscard]] int write(const SessionNote& note, double seconds);
  // A message repeated that of an event (0: it isn't known), and came after another one. In a transaction.
  [[nodiscard]] int repeat(const SessionNote& note, std::int64_t event, std::int64_t after);
  // The greatest id that the runs before gave. After beginRun(), as the next.
  std::int64_t lastBefore() const noexcept { return sessions_; }
  // The session's row, 0 for nobody's.
  std::int64_t rowOf(platform::SessionNumber session) const noexcept { return session == 0 ? 0 : sessions_ + session; }
  // An event was handed over for it: the first and the last one of a period are kept. In a transaction.
  [[nodiscard]] int noteEvent(platform::SessionNumber session, std::int64_t event) {
    const bool hasNoPeriod = session == 0 || (session == lastSession_ && lastPeriod_ == nullptr);
    return hasNoPeriod ? 0 /* SQLITE_OK */ : addEvent(session, event);
  }
  // Copies what can be read of another file's rows, but for those that aren't as their checksums say, which are
  // counted. In a transaction of `into`, before beginRun().
  [[nodiscard]] static int carry(Connection& from, Connection& into, std::int64_t& leftBehind);
  // What was written since the last of these two is safe, or isn't there.
  void committed() noexcept { over_.clear(); }
  void rolledBack() noexcept;

  // Rows of ended sessions go when they have no events left and are older than `age`, or when there are more than
  // `most`; 256 at once, and not more often than every ten seconds (on the recorder's own time, which is `seconds`),
  // but for further ones that a look has found. In a transaction.
  [[nodiscard]] int expire(double seconds, double age, std::int64_t most);

 private:
  // One that is open.
  struct Period {
    std::int64_t row = 0;
    std::int64_t first = 0;  // events; 0: none yet
    std::int64_t last = 0;
    bool firstIsWritten = false;
  };

  [[nodiscard]] int addEvent(platform::SessionNumber session, std::int64_t event);
  [[nodiscard]] int findIds();
  [[nodiscard]] int closeOlder();
  // Changes each row of the table whose id (?1) a SELECT tells.
  [[nodiscard]] int changeEach(SessionSums::Place place, const std::string& ids, const char* change);
  [[nodiscard]] static int carryTable(Connection& from, Connection& into, const std::string& reading,
                                      const std::string& table, std::int64_t& leftBehind);
  [[nodiscard]] int describe(const SessionNote& note);
  [[nodiscard]] int start(const SessionNote& note);
  [[nodiscard]] int closePeriod(const SessionNote& note);
  // Null: it has none.
  [[nodiscard]] int setEnd(std::int64_t session, const SessionNote* note, platform::SessionEnd end);
  [[nodiscard]] int noteAge(std::int64_t session, double seconds);
  void forgetLast() noexcept;

  Connection* connection_ = nullptr;
  Statement describe_;
  Statement start_;
  Statement setFirst_;
  Statement stop_;
  Statement setEnd_;
  Statement noteAge_;
  Statement repeat_;
  SessionSums sums_;                 // through which every change of a row goes
  std::optional<std::int64_t> run_;  // once it is known
  // What was given before this run.
  std::int64_t sessions_ = 0;
  std::int64_t periodsBefore_ = 0;
  std::int64_t repeatsBefore_ = 0;
  std::unordered_map<platform::SessionNumber, Period> periods_;
  // Closed by what isn't committed yet: open again after a rollback.
  std::vector<std::pair<platform::SessionNumber, Period>> over_;
  // Of the event before, as most come in a row; no period: it has none that is open.
  platform::SessionNumber lastSession_ = 0;
  Period* lastPeriod_ = nullptr;
  double agedAt_ = -1;            // when the last age was noted
  double expiredAt_ = -1;         // when expire() looked last
  std::int64_t expiredUpTo_ = 0;  // where its next look begins
};

}  // namespace tarn::recorder
