// SPDX-License-Identifier: Apache-2.0
#include "fleet/ask/FleetReader.h"

#include <map>

#include "fleet/collect/Schema.h"
#include "plist/ValueView.h"
#include "recorder/store/GlobPattern.h"

namespace tarn::fleet {

namespace {

using recorder::globMatches;

constexpr double kMicrosecondsPerSecond = 1e6;

// By which of them a row was put together: the ones that aren't are bits.
constexpr std::int64_t kByApplication = 0b0111;
constexpr std::int64_t kByRoute = 0b1011;
constexpr std::int64_t kByRelease = 0b1101;

// $1 and $2: the span. Of one pass over the hours.
constexpr const char* kPlayed = R"(
SELECT grouping(application, route, release, hour), coalesce(application, route, release,
    extract(epoch FROM hour)::bigint::text), sum(segments)::bigint, sum(play_seconds), sum(overloads)::bigint
  FROM hour_parts WHERE hour >= date_trunc('hour', to_timestamp($1::float8)) AND hour < to_timestamp($2::float8)
  GROUP BY GROUPING SETS ((application), (route), (release), (hour)) ORDER BY 1, hour)";
constexpr const char* kVolumes =
    "SELECT tenth, sum(play_seconds) FROM hour_volume_parts WHERE hour >= date_trunc('hour', to_timestamp($1::float8)) "
    "AND hour < to_timestamp($2::float8) AND tenth BETWEEN 0 AND 9 GROUP BY tenth";
constexpr const char* kIssues =
    "SELECT issue_type, sum(issues)::bigint FROM hour_issue_parts WHERE hour >= date_trunc('hour', "
    "to_timestamp($1::float8)) AND hour < to_timestamp($2::float8) GROUP BY issue_type ORDER BY 2 DESC, 1";

constexpr const char* kWasThere =
    "(s.ended IS NULL OR s.ended >= to_timestamp($1::float8)) AND s.created < to_timestamp($2::float8)";
constexpr const char* kHasRun =
    " AND (s.end_reason IS DISTINCT FROM 'retyped' OR EXISTS (SELECT FROM periods AS p WHERE p.run = s.run AND "
    "p.session = s.id))";
constexpr const char* kSessions = R"(
SELECT d.name, s.run, r.id, r.version, s.id, s.process, s.application, s.service_type, s.service_name,
    extract(epoch FROM s.created)::float8, extract(epoch FROM s.ended)::float8, s.end_reason, s.looked_at
  FROM sessions AS s JOIN runs AS r ON r.key = s.run JOIN devices AS d ON d.id = s.device WHERE )";
constexpr const char* kNewestFirst = " ORDER BY s.created DESC, s.run DESC, s.id DESC";
constexpr const char* kNextSessions = "FETCH 2000 FROM next_sessions";

// $1: keys of runs; $2: ids. Events are looked for within a day of the session's time, since there are no others of it
// unless the device's clock went wrong; without that, all that the device ever sent would have to be looked through.
constexpr const char* kDoings = R"(
SELECT c.n, p.periods, p.active, p.is_running, p.messages, p.redundant, e.overloads
  FROM unnest($1::bigint[], $2::bigint[]) WITH ORDINALITY AS c(run, id, n)
    JOIN sessions AS s ON s.run = c.run AND s.id = c.id,
  LATERAL (
    SELECT count(*) AS periods, coalesce(sum(p.messages), 0)::bigint AS messages,
        coalesce(sum(p.redundant), 0)::bigint AS redundant,
        coalesce(sum(greatest(0, extract(epoch FROM
          coalesce(p.stopped, s.ended, to_timestamp(p.looked_at / 1e6)) - p.started))), 0)::float8 AS active,
        coalesce(bool_or(p.stopped IS NULL AND s.ended IS NULL), false)::integer AS is_running
      FROM periods AS p WHERE p.run = s.run AND p.session = s.id) AS p,
  LATERAL (
    SELECT count(*) AS overloads FROM events AS e
      WHERE e.device = s.device AND e.run = s.run AND e.session = s.id AND e.time >= s.created - interval '1 day' AND
        e.time < coalesce(s.ended, 'infinity') + interval '1 day' AND e.backend = 'tally' AND
        e.name LIKE 'sys.oxbow.tarnkit.%' AND e.payload ->> 'issue_type' = 'overload' AND
        NOT e.payload ? 'overload_count') AS e
  ORDER BY c.n)";

constexpr const char* kAccount = R"(
SELECT count(*), coalesce(sum(made), 0)::bigint, coalesce(sum(records), 0)::bigint, coalesce(sum(gaps), 0)::bigint,
    coalesce(sum(left_out), 0)::bigint, coalesce(sum(missing), 0)::bigint, coalesce(sum(untold), 0)::bigint,
    coalesce(sum(surplus), 0)::bigint, (SELECT count(*) FROM refused) FROM )";
constexpr const char* kByCounts = "account_by_counts";
constexpr const char* kByEvents =
    "(SELECT made, stored AS records, gaps, left_out, missing, untold, greatest(0, records - stored) AS surplus FROM "
    "account) AS a";

std::vector<std::string> valuesOf(const Span& span) {
  return {span.since ? plist::ValueView(*span.since).asText() : "-infinity",
          span.until ? plist::ValueView(*span.until).asText() : "infinity"};
}

// Of numbers, as the database takes it.
template <class Number>
std::string numbersOf(const std::vector<FleetSession>& sessions, Number number) {
  std::string array = "{";
  for (const FleetSession& session : sessions) {
    array += (array.size() > 1 ? "," : "") + std::to_string(session.*number);
  }
  return array + "}";
}

FleetSession sessionOf(const Answer& answer, int row) {
  FleetSession session;
  session.device = answer.text(row, 0);
  session.key = answer.number(row, 1);
  session.run = answer.number(row, 2);
  session.release = answer.text(row, 3);
  session.id = answer.number(row, 4);
  session.process = answer.text(row, 5);
  session.application = answer.text(row, 6);
  session.serviceType = answer.number(row, 7);
  session.serviceName = answer.text(row, 8);
  session.created = answer.real(row, 9);
  if (!answer.isNull(row, 10)) {
    session.ended = answer.real(row, 10);
    session.endReason = answer.text(row, 11);
  }
  session.lookedAt = answer.real(row, 12) / kMicrosecondsPerSecond;
  return session;
}

bool passes(const std::string& glob, const std::string& name) {
  return glob.empty() || globMatches(glob, name);
}

bool isWished(const FleetSession& session, const SessionWish& wish) {
  return passes(wish.deviceGlob, session.device) && passes(wish.applicationGlob, session.application) &&
         passes(wish.releaseGlob, session.release);
}

}  // namespace

Status FleetReader::open(const std::string& address, const char* program) {
  if (Status opened = database_.open(address, program); opened.failed()) return opened;
  if (Status set = database_.run("SET default_transaction_read_only = on"); set.failed()) return set;
  if (Status known = requireLayout(database_); known.failed()) return known;
  return database_.run("BEGIN ISOLATION LEVEL REPEATABLE READ READ ONLY");
}

Result<PlayedParts> FleetReader::played(const Span& span) {
  const Result<Answer> rows = database_.ask(kPlayed, valuesOf(span));
  if (rows.failed()) return {{}, rows.error};
  Result<PlayedParts> parts;
  std::map<std::int64_t, std::vector<Played>*> places{{kByApplication, &parts.value.applications},
                                                      {kByRoute, &parts.value.routes},
                                                      {kByRelease, &parts.value.releases}};
  for (int row = 0; row < rows.value.rows(); ++row) {
    const double seconds = rows.value.real(row, 3);
    const std::int64_t overloads = rows.value.number(row, 4);
    if (const auto place = places.find(rows.value.number(row, 0)); place != places.end()) {
      place->second->push_back({std::string(rows.value.text(row, 1)), rows.value.number(row, 2), seconds, overloads});
    } else {
      parts.value.hours.push_back({rows.value.real(row, 1), seconds, overloads});
    }
  }
  return parts;
}

// Names are compared here, since patterns are this system's own.
Result<std::vector<FleetSession>> FleetReader::newest(const SessionWish& wish) {
  const std::vector<std::string> span = valuesOf(wish.span);
  // A cursor takes no values; these are numbers.
  std::string sql = std::string("DECLARE next_sessions NO SCROLL CURSOR FOR ") + kSessions + kWasThere +
                    (wish.open ? " AND s.ended IS NULL" : "") + (wish.replaced ? "" : kHasRun) + kNewestFirst;
  sql.replace(sql.find("$1"), 2, "'" + span[0] + "'").replace(sql.find("$2"), 2, "'" + span[1] + "'");
  Result<std::vector<FleetSession>> sessions;
  sessions.error = database_.run(sql);
  while (sessions.ok() && sessions.value.size() < wish.limit) {
    const Result<Answer> rows = database_.ask(kNextSessions);
    sessions.error = rows.error;
    if (rows.failed() || rows.value.rows() == 0) break;
    for (int row = 0; row < rows.value.rows() && sessions.value.size() < wish.limit; ++row) {
      if (FleetSession session = sessionOf(rows.value, row); isWished(session, wish)) {
        sessions.value.push_back(std::move(session));
      }
    }
  }
  return sessions;
}

Status FleetReader::addDoings(std::vector<FleetSession>& sessions) {
  const Result<Answer> rows =
      database_.ask(kDoings, {numbersOf(sessions, &FleetSession::key), numbersOf(sessions, &FleetSession::id)});
  if (rows.failed()) return rows.error;
  for (int row = 0; row < rows.value.rows(); ++row) {
    FleetSession& session = sessions.at(static_cast<std::size_t>(rows.value.number(row, 0)) - 1);
    session.periods = rows.value.number(row, 1);
    session.active = rows.value.real(row, 2);
    session.running = rows.value.number(row, 3) != 0;
    session.messages = rows.value.number(row, 4);
    session.redundant = rows.value.number(row, 5);
    session.overloads = rows.value.number(row, 6);
  }
  return {};
}

Result<std::vector<FleetSession>> FleetReader::sessions(const SessionWish& wish) {
  Result<std::vector<FleetSession>> sessions = newest(wish);
  if (sessions.ok() && !sessions.value.empty()) {
    sessions.error = addDoings(sessions.value);
  }
  return sessions;
}

Status FleetReader::readAccount(FleetPicture& picture) {
  const Result<Answer> rows = database_.ask(std::string(kAccount) + (picture.isExact ? kByEvents : kByCounts));
  if (rows.failed()) return rows.error;
  const auto number = [&rows](int column) { return rows.value.number(0, column); };
  picture.account = {number(0), number(1), number(2), number(3), number(4), number(5), number(6), number(7), number(8)};
  return {};
}

Status FleetReader::countSessions(FleetPicture& picture) {
  const Result<Answer> rows = database_.ask(
      std::string("SELECT count(*), count(DISTINCT s.device) FROM sessions AS s WHERE ") + kWasThere + kHasRun,
      valuesOf(picture.span));
  if (rows.failed()) return rows.error;
  picture.sessions = rows.value.number(0, 0);
  picture.sessionDevices = rows.value.number(0, 1);
  return {};
}

Status FleetReader::readVolumes(FleetPicture& picture) {
  const Result<Answer> rows = database_.ask(kVolumes, valuesOf(picture.span));
  if (rows.failed()) return rows.error;
  for (int row = 0; row < rows.value.rows(); ++row) {
    picture.volumes.at(static_cast<std::size_t>(rows.value.number(row, 0))) = rows.value.real(row, 1);
  }
  return {};
}

Status FleetReader::readIssues(FleetPicture& picture) {
  const Result<Answer> rows = database_.ask(kIssues, valuesOf(picture.span));
  if (rows.failed()) return rows.error;
  for (int row = 0; row < rows.value.rows(); ++row) {
    picture.issues.emplace_back(rows.value.text(row, 0), rows.value.number(row, 1));
  }
  return {};
}

Result<FleetPicture> FleetReader::picture(const Span& span, bool isExact) {
  Result<FleetPicture> made;
  FleetPicture& picture = made.value;
  picture.span = span;
  picture.isExact = isExact;
  Result<PlayedParts> parts = played(span);
  picture.played = std::move(parts.value);
  made.error = parts.error;
  for (const auto part :
       {&FleetReader::readAccount, &FleetReader::countSessions, &FleetReader::readVolumes, &FleetReader::readIssues}) {
    if (made.failed()) break;
    made.error = (this->*part)(picture);
  }
  return made;
}

}  // namespace tarn::fleet
