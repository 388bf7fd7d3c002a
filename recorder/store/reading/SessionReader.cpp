// SPDX-License-Identifier: Apache-2.0
#include "recorder/store/reading/SessionReader.h"

#include <sqlite3.h>

#include <algorithm>
#include <string_view>
#include <utility>

namespace tarn::recorder {

namespace {

constexpr const char* kSessionColumns =
    "SELECT id, run, reporter, connection, pid, uid, process, application, service_type, service_name, created, ended,"
    " end_reason FROM sessions";

// Ids that newest() looks at first, and how many times more then.
constexpr std::int64_t kFirstReach = 32;
constexpr std::int64_t kReachFactor = 16;

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
  Result<std::optional<EventRow>> found;
  // Further and further back: what is looked for is near the end as a rule, and there is no index of names.
  for (std::int64_t reach = kFirstReach; found.ok() && !found.value && last >= first; reach *= kReachFactor) {
    const std::int64_t from = last - first >= reach ? last - reach + 1 : first;
    found.error = answer(
        "SELECT id, time, backend, name, payload, detail, session FROM events"
        " WHERE id >= ?1 AND id <= ?2 AND session = ?3 AND name = ?4 ORDER BY id DESC LIMIT 1",
        [&](Statement& statement) {
          statement.bind(1, from).bind(2, last).bind(3, session).bind(4, std::string_view(name));
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
    last = from - 1;
  }
  return found;
}

}  // namespace tarn::recorder
