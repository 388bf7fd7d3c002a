// SPDX-License-Identifier: Apache-2.0
#include "recorder/store/SessionTable.h"

#include <sqlite3.h>

#include <algorithm>
#include <new>

#include "recorder/store/rows/EventTable.h"

namespace tarn::recorder {

namespace {

using What = SessionNote::What;

// Ages of sessions are known to the hour: within it after one that is noted, the next isn't.
constexpr double kSecondsBetweenAges = 3600;
constexpr double kSecondsBetweenLooks = 10;
// Rows of runs; those before go when there are more.
constexpr std::int64_t kMostRuns = 1000;

// An upsert that says all that is known, and leaves what the row has of its beginning.
constexpr const char* kDescribe =
    "INSERT INTO sessions(id, run, reporter, connection, pid, uid, process, application, service_type, service_name, "
    "created) VALUES(?1, ?2, ?3, ?4, ?5, ?6, nullif(?7, ''), nullif(?8, ''), ?9, ?10, ?11) ON CONFLICT(id) DO UPDATE "
    "SET reporter = ?3, connection = ?4, pid = ?5, uid = ?6, process = nullif(?7, ''), application = nullif(?8, ''), "
    "service_type = ?9, service_name = ?10";
constexpr const char* kSetEnd =
    "INSERT INTO sessions(id, run, ended, end_reason) VALUES(?1, ?2, ?3, ?4) ON CONFLICT(id) DO UPDATE SET ended = ?3, "
    "end_reason = ?4";
constexpr const char* kStart =
    "INSERT INTO periods(id, session, started) VALUES(?1, ?2, ?3) ON CONFLICT(id) DO UPDATE SET started = ?3";
constexpr const char* kStop =
    "UPDATE periods SET stopped = ?2, messages = ?3, redundant = ?4, first_event = ?5, last_event = ?6 WHERE id = ?1";

// The greatest id that a table ever gave, also to a row that is gone.
constexpr const char* kGreatest =
    "SELECT max(coalesce((SELECT max(id) FROM runs), 0), coalesce((SELECT value FROM recorder_state WHERE name = "
    "'last_run'), 0)), max(coalesce((SELECT max(id) FROM sessions), 0), coalesce((SELECT value FROM recorder_state "
    "WHERE name = 'last_session'), 0)), max(coalesce((SELECT max(id) FROM periods), 0), coalesce((SELECT value FROM "
    "recorder_state WHERE name = 'last_period'), 0)), max(coalesce((SELECT max(id) FROM redundant_messages), 0), "
    "coalesce((SELECT value FROM recorder_state WHERE name = 'last_repeat'), 0))";

// Sessions that nobody closed, with their last event, and the last moment that is known of each.
std::string makeOpen(std::int64_t run) {
  return "CREATE TEMP TABLE open_sessions AS SELECT o.id AS id, (SELECT max(r.id) FROM event_rows AS r WHERE "
         "r.session = o.id AND r.id >= o.first AND r.id < o.first + " +
         std::to_string(EventTable::kReach) +
         ") AS last FROM (SELECT id, (SELECT max(first) FROM session_spans WHERE session = s.id) AS first FROM "
         "sessions AS s WHERE ended IS NULL AND run IS NOT " +
         std::to_string(run) + ") AS o;";
}

constexpr const char* kCloseSession =
    "UPDATE sessions SET end_reason = 'killed', ended = coalesce("
    "(SELECT r.time FROM open_sessions AS o JOIN event_rows AS r ON r.id = o.last WHERE o.id = sessions.id), "
    "(SELECT max(started) FROM periods WHERE session = sessions.id), created) WHERE id = ?1";
constexpr const char* kOpenPeriods =
    "SELECT id FROM periods WHERE stopped IS NULL AND session IN (SELECT id FROM open_sessions)";
constexpr const char* kClosePeriod =
    "UPDATE periods SET stopped = (SELECT ended FROM sessions WHERE id = periods.session), last_event = CASE WHEN "
    "first_event IS NOT NULL THEN (SELECT last FROM open_sessions WHERE id = periods.session) END WHERE id = ?1";
constexpr const char* kCloseRun =
    "UPDATE runs SET end_reason = 'killed', ended = max(started, coalesce((SELECT time FROM event_rows ORDER BY id "
    "DESC "
    "LIMIT 1), started)) WHERE id = ?1";

}  // namespace

int SessionTable::prepare(Connection& connection) {
  connection_ = &connection;
  const struct {
    Statement& statement;
    const char* sql;
  } all[] = {
      {describe_, kDescribe},
      {start_, kStart},
      {setFirst_, "UPDATE periods SET first_event = ?2 WHERE id = ?1"},
      {stop_, kStop},
      {setEnd_, kSetEnd},
      {noteAge_, "INSERT OR REPLACE INTO session_ages VALUES(?1, ?2)"},
      {repeat_, "INSERT OR IGNORE INTO redundant_messages VALUES(?1, ?2, ?3, ?4, ?5, ?6, ?7)"},
  };
  for (const auto& [statement, sql] : all) {
    if (const int code = statement.prepare(connection.handle(), sql, true); code != SQLITE_OK) return code;
  }
  agedAt_ = -1;
  return sums_.prepare(connection);
}

void SessionTable::finalize() noexcept {
  for (Statement* const statement : {&describe_, &start_, &setFirst_, &stop_, &setEnd_, &noteAge_, &repeat_}) {
    statement->finalize();
  }
  sums_.finalize();
  rolledBack();
}

int SessionTable::beginRun(const RunFacts& run) {
  int code = run_ ? SQLITE_OK : findIds();
  if (code != SQLITE_OK) return code;
  Statement add;
  code = add.prepare(
      connection_->handle(),
      "INSERT OR IGNORE INTO runs VALUES(?1, nullif(?2, ''), nullif(?3, ''), ?4, NULL, NULL, nullif(?5, ''))");
  if (code == SQLITE_OK) {
    add.bind(1, *run_)
        .bind(2, std::string_view(run.boot))
        .bind(3, std::string_view(run.version))
        .bind(4, run.started)
        .bind(5, std::string_view(run.machine));
    code = sums_.change(SessionSums::Runs, *run_, add);
  }
  return code == SQLITE_OK ? closeOlder() : code;
}

int SessionTable::findIds() {
  Statement greatest;
  int code = greatest.prepare(connection_->handle(), kGreatest);
  if (code == SQLITE_OK) {
    code = greatest.step();
  }
  if (code != SQLITE_ROW) return code;
  run_ = greatest.integer(0) + 1;
  sessions_ = greatest.integer(1);
  periodsBefore_ = greatest.integer(2);
  repeatsBefore_ = greatest.integer(3);
  return SQLITE_OK;
}

int SessionTable::closeOlder() {
  int code = connection_->run(makeOpen(*run_).c_str());
  code = code == SQLITE_OK ? changeEach(SessionSums::Sessions, "SELECT id FROM open_sessions", kCloseSession) : code;
  code = code == SQLITE_OK ? changeEach(SessionSums::Periods, kOpenPeriods, kClosePeriod) : code;
  if (code == SQLITE_OK) {
    const std::string others = "SELECT id FROM runs WHERE ended IS NULL AND id <> " + std::to_string(*run_);
    code = changeEach(SessionSums::Runs, others, kCloseRun);
  }
  if (code != SQLITE_OK) return code;
  const std::string old = "FROM runs WHERE id <= " + std::to_string(*run_ - kMostRuns) + ";";
  return connection_->run(("DROP TABLE open_sessions;" +
                           SessionSums::removeOf(SessionSums::Runs, "SELECT id " + old.substr(0, old.size() - 1)) +
                           "DELETE " + old)
                              .c_str());
}

int SessionTable::changeEach(SessionSums::Place place, const std::string& ids, const char* change) {
  Statement statement;
  int code = statement.prepare(connection_->handle(), ids);
  std::vector<std::int64_t> all;
  if (code == SQLITE_OK) {
    for (code = statement.step(); code == SQLITE_ROW; code = statement.step()) {
      all.push_back(statement.integer(0));
    }
  }
  if (code != SQLITE_DONE) return code;
  code = statement.prepare(connection_->handle(), change);
  for (std::size_t i = 0; code == SQLITE_OK && i < all.size(); ++i) {
    code = sums_.change(place, all[i], statement.bind(1, all[i]));
  }
  return code;
}

int SessionTable::endRun(double time) {
  if (!run_) return SQLITE_OK;
  Statement end;
  const int code =
      end.prepare(connection_->handle(), "UPDATE runs SET ended = ?2, end_reason = 'stopped' WHERE id = ?1");
  return code == SQLITE_OK ? sums_.change(SessionSums::Runs, *run_, end.bind(1, *run_).bind(2, time)) : code;
}

namespace {

// The columns of a table of another file, and whether a row of it isn't as its checksum says.
std::string readingOf(Connection& from, std::size_t place) {
  const SessionSums::Table& table = SessionSums::kTables.at(place);
  const bool hasSums = from.integer("SELECT count(*) FROM sqlite_schema WHERE name = 'row_hashes'") == 1;
  const std::string isDamaged = hasSums ? SessionSums::hashOfRow(place) +
                                              " <> (SELECT hash FROM row_hashes WHERE row_hashes.id = 4 * t.id + " +
                                              std::to_string(place) + ")"
                                        : std::string("0");
  std::string columns(table.columns);
  const bool knowsMachine = from.integer("SELECT count(*) FROM pragma_table_info('runs') WHERE name = 'machine'") == 1;
  if (place == SessionSums::Runs && !knowsMachine) {
    columns.replace(columns.find("machine"), std::string_view("machine").size(), "NULL");
  }
  return "SELECT " + isDamaged + ", " + columns + " FROM " + std::string(table.name) + " AS t";
}

}  // namespace

// Rows after one that can't be read are looked for from the end. What nothing proves is taken.
int SessionTable::carryTable(Connection& from, Connection& into, const std::string& reading, const std::string& table,
                             std::int64_t& leftBehind) {
  for (const char* const order : {"", " ORDER BY 2 DESC"}) {
    Statement read;
    if (read.prepare(from.handle(), reading + order) != SQLITE_OK) break;
    const int columns = sqlite3_column_count(read.handle()) - 1;
    std::string places = "?1";
    for (int column = 1; column < columns; ++column) {
      places += ", ?" + std::to_string(column + 1);
    }
    Statement write;
    int code = write.prepare(into.handle(), "INSERT OR IGNORE INTO " + table + " VALUES(" + places + ")");
    if (code != SQLITE_OK) return code;
    int found = read.step();
    for (; found == SQLITE_ROW; found = read.step()) {
      if (read.integer(0) != 0) {
        ++leftBehind;
        continue;
      }
      for (int column = 0; column < columns; ++column) {
        sqlite3_bind_value(write.handle(), column + 1, sqlite3_column_value(read.handle(), column + 1));
      }
      if (code = write.run(); code != SQLITE_OK) return code;
    }
    if (found == SQLITE_DONE) break;
  }
  return SQLITE_OK;
}

int SessionTable::carry(Connection& from, Connection& into, std::int64_t& leftBehind) {
  leftBehind = 0;
  if (!from.isOpen()) return SQLITE_OK;
  int code = SessionSums::addFunction(from);
  for (std::size_t place = 0; code == SQLITE_OK && place < SessionSums::kTables.size(); ++place) {
    code = carryTable(from, into, readingOf(from, place), std::string(SessionSums::kTables.at(place).name), leftBehind);
  }
  std::int64_t none = 0;
  code = code == SQLITE_OK ? carryTable(from, into, "SELECT 0, * FROM session_ages", "session_ages", none) : code;
  return code == SQLITE_OK ? into.run(SessionSums::sealAll().c_str()) : code;
}

int SessionTable::write(const SessionNote& note, double seconds) {
  int code = SQLITE_OK;
  switch (note.what) {
    case What::Created:
      code = noteAge(rowOf(note.session), seconds);
      return code == SQLITE_OK ? describe(note) : code;
    case What::Described:
      return describe(note);
    case What::Started:
      return start(note);
    case What::Repeated:
      return repeat(note, 0, 0);
    case What::Stopped:
      code = closePeriod(note);
      return code == SQLITE_OK ? setEnd(rowOf(note.session), &note, platform::SessionEnd::Stopped) : code;
    case What::Ended:
      code = closePeriod(note);
      return code == SQLITE_OK ? setEnd(rowOf(note.session), &note, note.end) : code;
  }
  return code;
}

int SessionTable::describe(const SessionNote& note) {
  const platform::SessionFacts& facts = note.facts;
  describe_.bind(1, rowOf(note.session))
      .bind(2, *run_)
      .bind(3, facts.reporter)
      .bind(4, facts.connection)
      .bind(5, std::int64_t{facts.pid})
      .bind(6, std::int64_t{facts.uid})
      .bind(7, std::string_view(facts.process))
      .bind(8, std::string_view(facts.application))
      .bind(9, facts.serviceType)
      .bind(10, std::string_view(facts.serviceName))
      .bind(11, note.time);
  return sums_.change(SessionSums::Sessions, rowOf(note.session), describe_);
}

int SessionTable::start(const SessionNote& note) {
  const std::int64_t row = periodsBefore_ + note.number;
  Period& period = periods_[note.session];
  if (period.row != row) {
    period = Period{row};
  }
  forgetLast();
  start_.bind(1, row).bind(2, rowOf(note.session)).bind(3, note.time);
  const int code = sums_.change(SessionSums::Periods, row, start_);
  return code == SQLITE_OK ? setEnd(rowOf(note.session), nullptr, {}) : code;
}

int SessionTable::repeat(const SessionNote& note, std::int64_t event, std::int64_t after) {
  const auto period = periods_.find(note.session);
  const plist::ValueView stamp = note.message.get("tarnreporting_timestamp");
  repeat_.bind(1, repeatsBefore_ + note.number).bind(2, rowOf(note.session)).bind(4, note.time).bind(7, after);
  period == periods_.end() ? repeat_.bindNull(3) : repeat_.bind(3, period->second.row);
  stamp.isNumber() || stamp.kind() == plist::Kind::Date ? repeat_.bind(5, stamp.asDouble()) : repeat_.bindNull(5);
  event == 0 ? repeat_.bindNull(6) : repeat_.bind(6, event);
  return sums_.change(SessionSums::Redundant, repeatsBefore_ + note.number, repeat_);
}

int SessionTable::closePeriod(const SessionNote& note) {
  const auto found = periods_.find(note.session);
  if (found == periods_.end()) return SQLITE_OK;
  const Period period = found->second;
  over_.emplace_back(note.session, period);
  periods_.erase(found);
  forgetLast();
  stop_.bind(1, period.row).bind(2, note.time);
  note.what == What::Stopped ? stop_.bind(3, note.messages).bind(4, note.redundant) : stop_.bindNull(3).bindNull(4);
  period.first == 0 ? stop_.bindNull(5).bindNull(6) : stop_.bind(5, period.first).bind(6, period.last);
  return sums_.change(SessionSums::Periods, period.row, stop_);
}

int SessionTable::setEnd(std::int64_t session, const SessionNote* note, platform::SessionEnd end) {
  setEnd_.bind(1, session).bind(2, *run_);
  note == nullptr ? setEnd_.bindNull(3).bindNull(4) : setEnd_.bind(3, note->time).bind(4, platform::nameOf(end));
  return sums_.change(SessionSums::Sessions, session, setEnd_);
}

int SessionTable::addEvent(platform::SessionNumber session, std::int64_t event) {
  if (session != lastSession_) {
    const auto found = periods_.find(session);
    lastSession_ = session;
    lastPeriod_ = found == periods_.end() ? nullptr : &found->second;
    if (lastPeriod_ == nullptr) return SQLITE_OK;
  }
  Period& period = *lastPeriod_;
  period.first = period.first == 0 ? event : std::min(period.first, event);
  period.last = event;
  if (std::exchange(period.firstIsWritten, true)) return SQLITE_OK;
  return sums_.change(SessionSums::Periods, period.row, setFirst_.bind(1, period.row).bind(2, period.first));
}

void SessionTable::forgetLast() noexcept {
  lastSession_ = 0;
  lastPeriod_ = nullptr;
}

// The same notes and events come again, in the same order. A period that there is no memory for isn't closed before the
// next run begins.
void SessionTable::rolledBack() noexcept {
  for (; !over_.empty(); over_.pop_back()) {
    try {
      periods_[over_.back().first] = over_.back().second;
    } catch (const std::bad_alloc&) {
      continue;
    }
  }
  for (auto& [session, period] : periods_) {
    period.firstIsWritten = false;
  }
  agedAt_ = -1;
  forgetLast();
}

int SessionTable::noteAge(std::int64_t session, double seconds) {
  if (agedAt_ >= 0 && seconds - agedAt_ < kSecondsBetweenAges) return SQLITE_OK;
  agedAt_ = seconds;
  return noteAge_.bind(1, session).bind(2, seconds).run();
}

int SessionTable::expire(double seconds, double age, std::int64_t most) {
  if (expiredAt_ >= 0 && seconds - expiredAt_ < kSecondsBetweenLooks) return SQLITE_OK;
  expiredAt_ = seconds;
  Statement before;
  int code = before.prepare(connection_->handle(),
                            "SELECT max(coalesce((SELECT min(first) FROM session_ages WHERE seconds >= ?1), "
                            "(SELECT max(id) + 1 FROM sessions), 0), "
                            "coalesce((SELECT max(id) FROM sessions), 0) - ?2 + 1)");
  if (code == SQLITE_OK) {
    code = before.bind(1, seconds - age - kSecondsBetweenAges).bind(2, most).step();
  }
  if (code != SQLITE_ROW) return code;
  const std::string bound = std::to_string(before.integer(0));
  before.finalize();
  code = connection_->run(
      ("CREATE TEMP TABLE old_sessions AS SELECT id FROM sessions AS s WHERE id > " + std::to_string(expiredUpTo_) +
       " AND id < " + bound +
       " AND ended IS NOT NULL AND NOT EXISTS (SELECT 1 FROM session_spans AS p CROSS JOIN event_rows AS r ON r.id >= "
       "p.first AND r.id < p.first + " +
       std::to_string(EventTable::kReach) + " AND r.session = s.id WHERE p.session = s.id) ORDER BY id LIMIT 256")
          .c_str());
  if (code != SQLITE_OK) return code;
  // More of them wait for the next transaction, and those that stay aren't looked at again before.
  expiredUpTo_ =
      connection_->integer("SELECT CASE count(*) WHEN 256 THEN max(id) ELSE 0 END FROM old_sessions").value_or(0);
  expiredAt_ = expiredUpTo_ > 0 ? -1 : seconds;
  return connection_->run(
      ("INSERT OR REPLACE INTO recorder_state SELECT 'last_session', max(id) FROM sessions "
       "WHERE EXISTS (SELECT 1 FROM old_sessions) HAVING max(id) IS NOT NULL;"
       "INSERT OR REPLACE INTO recorder_state SELECT 'last_period', max(id) FROM periods "
       "WHERE EXISTS (SELECT 1 FROM old_sessions) HAVING max(id) IS NOT NULL;" +
       SessionSums::removeOf(SessionSums::Periods,
                             "SELECT id FROM periods WHERE session IN (SELECT id FROM old_sessions)") +
       SessionSums::removeOf(SessionSums::Sessions, "SELECT id FROM old_sessions") +
       "DELETE FROM periods WHERE session IN (SELECT id FROM old_sessions);"
       "DELETE FROM sessions WHERE id IN (SELECT id FROM old_sessions);"
       "DELETE FROM session_ages WHERE first < (SELECT max(first) FROM session_ages WHERE first <= "
       "(SELECT min(id) FROM sessions));"
       "DROP TABLE old_sessions")
          .c_str());
}

}  // namespace tarn::recorder
