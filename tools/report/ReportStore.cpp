// SPDX-License-Identifier: Apache-2.0
#include "tools/report/ReportStore.h"

#include <algorithm>
#include <limits>
#include <utility>

#include "tools/report/Message.h"

namespace tarn::report {

namespace {

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

// Ids are asked about in so many parts at the most, so that it can be told how far that is, and of so many at the
// least.
constexpr std::uint64_t kMostParts = 64;
constexpr std::uint64_t kIdsAtOnce = 16384;

// A file that isn't ours may hold any ids, so they are counted without a sign.
std::uint64_t distance(std::int64_t from, std::int64_t to) {
  return static_cast<std::uint64_t>(to) - static_cast<std::uint64_t>(from);
}

// Calls `ask(first, last)` for each part of the ids, until it fails.
template <class Ask>
Status inParts(std::int64_t first, std::int64_t last, Ask ask, const std::function<void(double)>& progress) {
  const std::uint64_t step = std::max(kIdsAtOnce, distance(first, last) / kMostParts + 1);
  for (std::int64_t from = first;;) {
    const bool isLast = distance(from, last) < step;
    const std::int64_t to = isLast ? last : from + static_cast<std::int64_t>(step) - 1;
    if (Status error = ask(from, to); error.failed()) return error;
    if (progress) {
      progress(static_cast<double>(distance(first, to) + 1) / static_cast<double>(distance(first, last) + 1));
    }
    if (isLast) return {};
    from = to + 1;
  }
}

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
  PeriodRow period;
  period.session = row.integer(0);
  period.started = row.real(1);
  period.stopped = realOrNothing(row, 2);
  period.messages = row.integer(3);
  period.redundant = row.integer(4);
  return period;
}

recorder::Statement& bindRange(recorder::Statement& rows, const TimeRange& range) {
  constexpr double kEver = std::numeric_limits<double>::infinity();
  return rows.bind(1, range.since.value_or(-kEver)).bind(2, range.until.value_or(kEver));
}

std::string listOf(const std::vector<std::int64_t>& ids) {
  std::string list = "(";
  for (const std::int64_t id : ids) {
    list += (list.size() > 1 ? "," : "") + std::to_string(id);
  }
  return list + ")";
}

}  // namespace

Status ReportStore::each(const std::string& sql, const TimeRange& range, const StoreMoment::Take& take) {
  const auto bind = [&](recorder::Statement& rows) { bindRange(rows, range); };
  return moment_.each(sql, bind, take);
}

Result<std::int64_t> ReportStore::numberOf(const std::string& sql) {
  Result<std::int64_t> found;
  found.error = each(sql, {}, [&](const recorder::Statement& row) { found.value = row.integer(0); });
  return found;
}

Result<std::vector<SessionRow>> ReportStore::sessions(const TimeRange& range) {
  Result<std::vector<SessionRow>> read;
  const std::string sql = std::string(kSelectSessions) + "WHERE created < ?2 AND coalesce(ended, ?1) >= ?1 AND " +
                          std::string(recorder::kIsUsed) + " ORDER BY id";
  read.error = each(sql, range, [&](const recorder::Statement& row) { read.value.push_back(sessionRow(row)); });
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

Status ReportStore::countedEvents(const TimeRange& range, const std::function<void(const EventRow&)>& take,
                                  const std::function<void(double)>& progress) {
  EventRow event;
  const auto takeRow = [&](const recorder::Statement& row) {
    event.id = row.integer(0);
    event.session = row.integer(1);
    event.time = row.real(2);
    event.backend = row.text(3);
    event.name = row.text(4);
    event.payload = row.text(5);
    take(event);
  };
  const std::string sql =
      "SELECT id, session, time, backend, name, payload FROM events WHERE id >= ?3 AND id <= ?4 AND "
      "session IS NOT NULL AND time >= ?1 AND time < ?2 AND " +
      std::string(kIsMessage) + " AND " + std::string(kMayCount);
  const auto askAbout = [&](std::int64_t first, std::int64_t last) {
    const auto bind = [&](recorder::Statement& rows) { bindRange(rows, range).bind(3, first).bind(4, last); };
    return moment_.each(sql, bind, takeRow);
  };
  // One by one: for both at once SQLite would go through the whole view.
  const Result<std::int64_t> first = numberOf("SELECT min(id) FROM events");
  const Result<std::int64_t> last = numberOf("SELECT max(id) FROM events");
  if (first.failed()) return first.error;
  if (last.failed()) return last.error;
  return inParts(first.value, last.value, askAbout, progress);
}

Result<std::map<std::int64_t, std::vector<EventRow>>> ReportStore::eventsOf(const std::vector<std::int64_t>& ids) {
  Result<std::map<std::int64_t, std::vector<EventRow>>> read;
  if (ids.empty()) return read;
  std::string wanted;
  for (const std::int64_t id : ids) {
    wanted += (wanted.empty() ? "(" : ", (") + std::to_string(id) + ")";
  }
  // One session after the other, each of which is quick; a list of them would be looked for among all events.
  const std::string sql = "SELECT id, session, time, backend, name, CASE WHEN " + std::string(kIsMessage) +
                          " THEN payload END FROM (VALUES " + wanted +
                          ") AS w JOIN events ON session = w.column1 ORDER BY id";
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
