// SPDX-License-Identifier: Apache-2.0
#include "recorder/store/reading/SessionReader.h"

#include <sqlite3.h>

#include <algorithm>
#include <string_view>
#include <utility>

#include "recorder/store/StoreViews.h"
#include "recorder/store/rows/EventTable.h"

namespace tarn::recorder {

namespace {

constexpr const char* kSessionColumns =
    "SELECT id, run, reporter, connection, pid, uid, process, application, service_type, service_name, created, ended,"
    " end_reason FROM sessions";

// The last event of session ?1 with name ?2 between the ids ?3 and ?4: span by span from the last one, and from the end
// of each. The view `events` would be asked span by span from the front.
constexpr std::string_view kNewestId =
    "SELECT e.id FROM session_spans AS s CROSS JOIN event_rows AS e CROSS JOIN event_texts AS n"
    " WHERE s.session = ?1 AND s.first > ?3 - 256 AND s.first <= ?4"
    " AND e.id >= max(s.first, ?3) AND e.id <= min(s.first + 255, ?4) AND e.session = ?1"
    " AND n.id = 2 * (e.id - e.kind) + 1 AND n.name = ?2 ORDER BY s.first DESC, e.id DESC LIMIT 1";
static_assert(EventTable::kReach == 256);

std::optional<double> realOf(const Statement& row, int column) {
  return row.isNull(column) ? std::nullopt : std::optional(row.real(column));
}

std::optional<std::int64_t> integerOf(const Statement& row, int column) {
  return row.isNull(column) ? std::nullopt : std::optional(row.integer(column));
}

SessionRow sessionOf(const Statement& row) {
  return {row.integer(0), row.integer(1),           row.integer(2),           row.integer(3), row.integer(4),
          row.integer(5), std::string(row.text(6)), std::string(row.text(7)), row.integer(8), std::string(row.text(9)),
          row.real(10),   realOf(row, 11),          std::string(row.text(12))};
}

PeriodRow periodOf(const Statement& row) {
  return {row.integer(0), row.integer(1), row.real(2),       realOf(row, 3),
          row.integer(4), row.integer(5), integerOf(row, 6), integerOf(row, 7)};
}

}  // namespace

Status SessionReader::open() {
  switch (presenceOf(file_)) {
    case Presence::Refused:
      return refusalOf(file_);
    case Presence::Missing:
      return Error{0, file_.string() + " is not there"};
    case Presence::There:
      break;
  }
  bounds_.begin(file_);
  bool asItLies = false;
  if (Status opened = openToRead(connection_, file_, bounds_, asItLies); opened.failed()) return about(*opened);
  if (connection_.run("BEGIN") != SQLITE_OK) return about(bounds_.lastError(connection_));
  // The first reading access of the transaction is what fixes the moment.
  return requireSessions(connection_, file_);
}

Status SessionReader::answer(const std::string& sql, const std::function<void(Statement&)>& bind,
                             const std::function<bool(const Statement&)>& take) {
  bounds_.begin(file_);
  const auto [found, isNew] = statements_.try_emplace(sql);
  Statement& statement = found->second;
  int code = isNew ? statement.prepare(connection_.handle(), sql, true) : SQLITE_OK;
  if (code == SQLITE_OK) {
    bind(statement);
    do {
      code = statement.step();
    } while (code == SQLITE_ROW && take(statement));
  }
  const bool isAnswered = code == SQLITE_DONE || code == SQLITE_ROW;
  Status status = isAnswered ? Status() : about(bounds_.lastError(connection_));
  statement.reset();
  if (!isAnswered) {
    statements_.erase(found);
  }
  return status;
}

Result<std::vector<SessionRow>> SessionReader::sessions(const SessionQuery& query) {
  std::string sql = kSessionColumns;
  sql.append(" WHERE 1");
  sql.append(query.since ? " AND (ended IS NULL OR ended >= ?1)" : "").append(query.until ? " AND created < ?2" : "");
  sql.append(query.applicationGlob ? " AND matches_glob(?3, application)" : "");
  sql.append(query.open ? " AND ended IS NULL" : "");
  sql.append(query.used ? " AND " : "").append(query.used ? kIsUsed : "").append(" ORDER BY id DESC");
  sql.append(query.limit ? " LIMIT ?4" : "");
  Result<std::vector<SessionRow>> found;
  const std::string glob = query.applicationGlob.value_or("");
  found.error = answer(
      sql,
      [&](Statement& statement) {
        statement.bind(1, query.since.value_or(0)).bind(2, query.until.value_or(0)).bind(3, std::string_view(glob));
        statement.bind(4, static_cast<std::int64_t>(query.limit.value_or(0)));
      },
      [&](const Statement& row) {
        found.value.push_back(sessionOf(row));
        return true;
      });
  std::reverse(found.value.begin(), found.value.end());
  return found;
}

Result<std::optional<SessionRow>> SessionReader::session(std::int64_t id) {
  Result<std::optional<SessionRow>> found;
  found.error = answer(
      std::string(kSessionColumns) + " WHERE id = ?1", [id](Statement& statement) { statement.bind(1, id); },
      [&](const Statement& row) {
        found.value = sessionOf(row);
        return false;
      });
  return found;
}

Result<std::optional<RunRow>> SessionReader::run(std::int64_t id) {
  bool hasMachine = false;  // not in version 1
  Result<std::optional<RunRow>> found;
  found.error = answer(
      "SELECT 1 FROM pragma_table_info('runs') WHERE name = 'machine'", [](Statement&) {},
      [&](const Statement&) {
        hasMachine = true;
        return false;
      });
  if (found.failed()) return found;
  found.error = answer(
      std::string("SELECT id, boot, version, started, ended, end_reason, ") + (hasMachine ? "machine" : "NULL") +
          " FROM runs WHERE id = ?1",
      [id](Statement& statement) { statement.bind(1, id); },
      [&](const Statement& row) {
        found.value = RunRow{row.integer(0), std::string(row.text(1)), std::string(row.text(2)), row.real(3),
                             realOf(row, 4), std::string(row.text(5)), std::string(row.text(6))};
        return false;
      });
  return found;
}

Result<std::vector<PeriodRow>> SessionReader::periods(std::int64_t first, std::int64_t last) {
  Result<std::vector<PeriodRow>> found;
  found.error = answer(
      "SELECT id, session, started, stopped, messages, redundant, first_event, last_event FROM periods"
      " WHERE session >= ?1 AND session <= ?2 ORDER BY session, id",
      [=](Statement& statement) { statement.bind(1, first).bind(2, last); },
      [&](const Statement& row) {
        found.value.push_back(periodOf(row));
        return true;
      });
  return found;
}

Result<std::vector<RepeatedRow>> SessionReader::repeated(std::int64_t session) {
  Result<std::vector<RepeatedRow>> found;
  const auto tables = connection_.integer("SELECT count(*) FROM sqlite_schema WHERE name = 'redundant_messages'");
  if (tables == 0) return found;
  found.error = answer(
      "SELECT id, period, time, stamp, event, after_event FROM redundant_messages WHERE session = ?1 ORDER BY id",
      [=](Statement& statement) { statement.bind(1, session); },
      [&](const Statement& row) {
        found.value.push_back(
            {row.integer(0), integerOf(row, 1), row.real(2), realOf(row, 3), integerOf(row, 4), row.integer(5)});
        return true;
      });
  return found;
}

Result<std::optional<EventRow>> SessionReader::newest(std::int64_t session, const std::string& name, std::int64_t first,
                                                      std::int64_t last) {
  static const std::string sql = std::string(kSelectEvents).append(" WHERE r.id = (").append(kNewestId).append(")");
  Result<std::optional<EventRow>> found;
  found.error = answer(
      sql,
      [&](Statement& statement) {
        statement.bind(1, session).bind(2, std::string_view(name)).bind(3, first).bind(4, last);
      },
      [&](const Statement& row) {
        found.value = EventRow{row.integer(0),
                               row.real(1),
                               std::string(row.text(2)),
                               std::string(row.text(3)),
                               std::string(row.text(4)),
                               std::string(row.text(5)),
                               row.integer(6)};
        return false;
      });
  return found;
}

}  // namespace tarn::recorder
