#include "tools/report/ReportStore.h"

#include <sqlite3.h>

#include <limits>
#include <utility>

#include "tools/report/Message.h"

namespace tarn::report {

namespace {

constexpr int kBusyMilliseconds = 2000;

constexpr std::string_view kSelectSessions =
    "SELECT id, reporter, pid, uid, process, application, service_name, created, ended, end_reason FROM sessions ";
constexpr std::string_view kSelectPeriods = "SELECT session, started, stopped, messages, redundant FROM periods ";
// The first name after all those that begin so.
constexpr std::string_view kIsMessage =
    "+backend = 'tally' AND +name >= 'sys.oxbow.tarnkit.' AND +name < 'sys.oxbow.tarnkit/'";
// A name that counts by itself, or a word without which nothing is an overload.
constexpr std::string_view kMayCount =
    "(name = 'sys.oxbow.tarnkit.Volume.Summary' OR name GLOB '*.Error' OR name GLOB '*.IssueDetector' "
    "OR name GLOB 'sys.oxbow.tarnkit.Error.*' OR name GLOB 'sys.oxbow.tarnkit.*_Error.*' "
    "OR instr(payload, 'overload') > 0)";

std::optional<double> realOrNothing(const recorder::Statement& row, int column) {
  return row.isNull(column) ? std::nullopt : std::optional<double>(row.real(column));
}

SessionRow sessionRow(const recorder::Statement& row) {
  SessionRow session;
  session.id = row.integer(0);
  session.reporter = row.integer(1);
  session.pid = row.integer(2);
  session.uid = row.integer(3);
  session.process = row.text(4);
  session.application = row.text(5);
  session.serviceName = row.text(6);
  session.created = row.real(7);
  session.ended = realOrNothing(row, 8);
  session.endReason = row.text(9);
  return session;
}

PeriodRow periodRow(const recorder::Statement& row) {
  return {row.integer(0), row.real(1), realOrNothing(row, 2), row.integer(3), row.integer(4)};
}

std::string listOf(const std::vector<std::int64_t>& ids) {
  std::string list = "(";
  for (const std::int64_t id : ids) {
    list += (list.size() > 1 ? "," : "") + std::to_string(id);
  }
  return list + ")";
}

}  // namespace

Error ReportStore::lastError() const {
  return {sqlite3_errcode(connection_.handle()), file_.string() + ": " + connection_.errorText()};
}

Status ReportStore::open() {
  if (connection_.open(file_.string(), SQLITE_OPEN_READONLY) != SQLITE_OK) return lastError();
  sqlite3_busy_timeout(connection_.handle(), kBusyMilliseconds);
  // Nothing that the file's schema says is carried out but its views.
  sqlite3_db_config(connection_.handle(), SQLITE_DBCONFIG_TRUSTED_SCHEMA, 0, nullptr);
  sqlite3_db_config(connection_.handle(), SQLITE_DBCONFIG_ENABLE_TRIGGER, 0, nullptr);
  if (connection_.run("BEGIN") != SQLITE_OK) return lastError();
  const auto tables = connection_.integer(
      "SELECT count(*) FROM sqlite_schema WHERE name IN ('sessions', 'periods', 'events') AND type IN ('table', "
      "'view')");
  if (!tables) return lastError();
  if (*tables == 3) return {};
  return Error{SQLITE_MISMATCH, file_.string() + " holds no sessions: no service that keeps them has written to it"};
}

Status ReportStore::each(const std::string& sql, const TimeRange& range,
                         const std::function<void(const recorder::Statement&)>& take) {
  constexpr double kEver = std::numeric_limits<double>::infinity();
  recorder::Statement rows;
  if (rows.prepare(connection_.handle(), sql) != SQLITE_OK) return lastError();
  rows.bind(1, range.since.value_or(-kEver)).bind(2, range.until.value_or(kEver));
  int code = rows.step();
  for (; code == SQLITE_ROW; code = rows.step()) {
    take(rows);
  }
  if (code != SQLITE_DONE) return lastError();
  return {};
}

Result<std::vector<SessionRow>> ReportStore::sessions(const TimeRange& range) {
  Result<std::vector<SessionRow>> read;
  read.error = each(std::string(kSelectSessions) + "WHERE created < ?2 AND coalesce(ended, ?1) >= ?1 ORDER BY id",
                    range, [&](const recorder::Statement& row) { read.value.push_back(sessionRow(row)); });
  return read;
}

Result<std::vector<SessionRow>> ReportStore::sessionsOf(const std::vector<std::int64_t>& ids) {
  Result<std::vector<SessionRow>> read;
  read.error = each(std::string(kSelectSessions) + "WHERE id IN " + listOf(ids) + " ORDER BY id", {},
                    [&](const recorder::Statement& row) { read.value.push_back(sessionRow(row)); });
  return read;
}

Result<std::vector<PeriodRow>> ReportStore::periods(const TimeRange& range) {
  Result<std::vector<PeriodRow>> read;
  read.error = each(std::string(kSelectPeriods) + "WHERE started < ?2 AND coalesce(stopped, ?1) >= ?1 ORDER BY id",
                    range, [&](const recorder::Statement& row) { read.value.push_back(periodRow(row)); });
  return read;
}

Status ReportStore::countedEvents(const TimeRange& range, const std::function<void(const EventRow&)>& take) {
  EventRow event;
  const std::string sql =
      "SELECT id, session, time, backend, name, payload FROM events WHERE session IS NOT NULL AND "
      "time >= ?1 AND time < ?2 AND " +
      std::string(kIsMessage) + " AND " + std::string(kMayCount);
  return each(sql, range, [&](const recorder::Statement& row) {
    event.id = row.integer(0);
    event.session = row.integer(1);
    event.time = row.real(2);
    event.backend = row.text(3);
    event.name = row.text(4);
    event.payload = row.text(5);
    take(event);
  });
}

Result<std::map<std::int64_t, std::vector<EventRow>>> ReportStore::eventsOf(const std::vector<std::int64_t>& ids) {
  Result<std::map<std::int64_t, std::vector<EventRow>>> read;
  const std::string sql = "SELECT id, session, time, backend, name, CASE WHEN " + std::string(kIsMessage) +
                          " THEN payload END FROM events WHERE session IN " + listOf(ids) + " ORDER BY id";
  read.error = each(sql, {}, [&](const recorder::Statement& row) {
    read.value[row.integer(1)].push_back({row.integer(0), row.integer(1), row.real(2), std::string(row.text(3)),
                                          std::string(row.text(4)), std::string(row.text(5))});
  });
  return read;
}

Result<std::map<std::int64_t, std::vector<PeriodRow>>> ReportStore::periodsOf(const std::vector<std::int64_t>& ids) {
  Result<std::map<std::int64_t, std::vector<PeriodRow>>> read;
  read.error = each(std::string(kSelectPeriods) + "WHERE session IN " + listOf(ids) + " ORDER BY id", {},
                    [&](const recorder::Statement& row) { read.value[row.integer(0)].push_back(periodRow(row)); });
  return read;
}

}  // namespace tarn::report
