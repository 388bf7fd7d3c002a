// SPDX-License-Identifier: Apache-2.0
#include "fleet/collect/GroupWriter.h"

#include <map>
#include <string>
#include <utility>

namespace tarn::fleet {

namespace {

// Others that were at it too leave it free soon.
constexpr int kMostTurns = 5;

// Of the connection alone, and empty after each transaction.
constexpr const char* kSides = R"(
SET temp_buffers = '64MB';
SET work_mem = '64MB';
CREATE TEMPORARY TABLE IF NOT EXISTS side_runs(number integer, device integer, id bigint, boot text, version text,
  started timestamptz, ended timestamptz, end_reason text, machine jsonb, looked_at bigint) ON COMMIT DELETE ROWS;
CREATE TEMPORARY TABLE IF NOT EXISTS side_events(device integer, run bigint, id bigint, time timestamptz,
  session bigint, backend text, name text, payload jsonb, detail jsonb, application text, release text) ON COMMIT DELETE ROWS;
CREATE TEMPORARY TABLE IF NOT EXISTS side_sessions(run bigint, id bigint, device integer, process text,
  application text, service_type bigint, service_name text, created timestamptz, ended timestamptz, end_reason text,
  looked_at bigint) ON COMMIT DELETE ROWS;
CREATE TEMPORARY TABLE IF NOT EXISTS side_periods(run bigint, id bigint, session bigint, device integer,
  started timestamptz, stopped timestamptz, messages bigint, redundant bigint, looked_at bigint)
  ON COMMIT DELETE ROWS;
CREATE TEMPORARY TABLE IF NOT EXISTS side_gaps(device integer, first bigint, last bigint) ON COMMIT DELETE ROWS;
CREATE TEMPORARY TABLE IF NOT EXISTS side_told(device integer, first bigint, last bigint, left_out text)
  ON COMMIT DELETE ROWS;
CREATE TEMPORARY TABLE IF NOT EXISTS side_places(device integer, made bigint) ON COMMIT DELETE ROWS)";

// The first number that no other connection has; the last one is shared by all that come later.
constexpr const char* kKeeper =
    "SELECT n FROM generate_series(0, 62) AS n WHERE pg_try_advisory_lock(7496302, n) LIMIT 1";
constexpr const char* kSharedKeeper = "63";

constexpr const char* kAddDevices =
    "INSERT INTO devices(name) SELECT n FROM unnest($1::text[]) AS n WHERE NOT EXISTS (SELECT FROM devices WHERE name "
    "= n) ORDER BY n ON CONFLICT DO NOTHING";
constexpr const char* kDevices = "SELECT name, id FROM devices WHERE name = ANY($1::text[])";

constexpr const char* kAddRuns = R"(
INSERT INTO runs(device, id, boot, version, started, ended, end_reason, machine, looked_at)
SELECT DISTINCT ON (s.device, s.id, s.boot, s.started) s.device, s.id, s.boot, s.version, s.started, s.ended,
    s.end_reason, s.machine, s.looked_at FROM side_runs AS s
  WHERE NOT EXISTS (SELECT FROM runs AS r WHERE r.device = s.device AND r.id = s.id AND r.boot = s.boot AND
    r.started = s.started)
  ORDER BY s.device, s.id, s.boot, s.started, s.looked_at DESC
ON CONFLICT DO NOTHING)";
constexpr const char* kRuns =
    "SELECT r.key FROM side_runs AS s JOIN runs AS r ON r.device = s.device AND r.id = s.id AND r.boot = s.boot AND "
    "r.started = s.started ORDER BY s.number";

// What is known is told before it is done, so that the day of an event that was dropped isn't counted again.
constexpr const char* kIsExpired = "SELECT EXISTS (SELECT FROM expired WHERE day = ANY($1::date[]))::integer";

// $1: the keeper. An event is measured once, when it is new here.
constexpr const char* kAddEventsHead = R"(
WITH added AS (
  INSERT INTO events(device, run, id, time, session, backend, name, payload, detail)
  SELECT device, run, id, time, session, backend, name, payload, detail FROM side_events AS s)";
constexpr const char* kUnlessExpired = R"(
    WHERE NOT EXISTS (SELECT FROM expired AS x WHERE x.day = s.time::date AND x.device = s.device AND x.run = s.run AND
      x.ids @> s.id))";
constexpr const char* kAddEventsTail = R"(
  ON CONFLICT DO NOTHING RETURNING device, run, id, time),
measured AS (
  SELECT DISTINCT ON (s.device, s.id, s.run, s.time) date_trunc('hour', s.time) AS hour,
      left(coalesce(s.payload ->> 'HostApplicationDisplayID', s.application), 200) AS application,
      left(coalesce(s.payload ->> 'active_devices', ''), 200) AS route, left(s.release, 200) AS release,
      CASE WHEN s.name = 'sys.oxbow.tarnkit.Volume.Summary' THEN number_of(s.payload -> 'play_seconds') END AS played,
      number_of(s.payload -> 'KvSessionVolume') AS volume,
      (s.payload ->> 'issue_type' = 'overload' AND NOT s.payload ? 'overload_count')::integer AS overloads,
      left(s.payload ->> 'issue_type', 200) AS issue_type
    FROM side_events AS s JOIN added AS a USING (device, run, id, time) WHERE s.release IS NOT NULL),
hour AS (
  INSERT INTO hour_parts AS h
  SELECT hour, application, route, release, $1::smallint, count(played), coalesce(sum(played), 0),
      coalesce(sum(overloads), 0)
    FROM measured WHERE played IS NOT NULL OR overloads > 0 GROUP BY 1, 2, 3, 4 ORDER BY 1, 2, 3, 4
  ON CONFLICT (hour, application, route, release, keeper) DO UPDATE SET segments = h.segments + excluded.segments,
    play_seconds = h.play_seconds + excluded.play_seconds, overloads = h.overloads + excluded.overloads),
volume AS (
  INSERT INTO hour_volume_parts AS h
  SELECT hour, application, route, release, greatest(0, least(9, floor(volume * 10)))::smallint, $1::smallint,
      sum(played)
    FROM measured WHERE played IS NOT NULL AND volume IS NOT NULL GROUP BY 1, 2, 3, 4, 5 ORDER BY 1, 2, 3, 4, 5
  ON CONFLICT (hour, application, route, release, tenth, keeper) DO UPDATE
    SET play_seconds = h.play_seconds + excluded.play_seconds),
issue AS (
  INSERT INTO hour_issue_parts AS h
  SELECT hour, issue_type, $1::smallint, count(*) FROM measured WHERE issue_type IS NOT NULL GROUP BY 1, 2 ORDER BY 1, 2
  ON CONFLICT (hour, issue_type, keeper) DO UPDATE SET issues = h.issues + excluded.issues),
stored AS (
  INSERT INTO stored_parts AS p SELECT device, $1::smallint, count(*) FROM added GROUP BY 1 ORDER BY 1
  ON CONFLICT (device, keeper) DO UPDATE SET records = p.records + excluded.records)
SELECT count(*) FROM added)";

constexpr const char* kAddTold = R"(
INSERT INTO gaps SELECT DISTINCT device, first, last FROM side_gaps ORDER BY 1, 2, 3 ON CONFLICT DO NOTHING;
INSERT INTO told AS t SELECT device, first, last, coalesce(range_agg(r) FILTER (WHERE r IS NOT NULL), '{}') FROM (
    SELECT device, first, last, left_out::int8multirange AS out FROM side_told) AS s LEFT JOIN unnest(s.out) AS r ON true
  GROUP BY device, first, last ORDER BY 1, 2, 3
ON CONFLICT (device, first, last) DO UPDATE SET left_out = t.left_out + excluded.left_out
  WHERE t.left_out <> excluded.left_out)";

// In the devices' order, as others do it too.
constexpr const char* kAddPlaces = R"(
UPDATE devices AS d SET made = p.made FROM (
    SELECT id, max(s.made) AS made FROM devices JOIN side_places AS s ON s.device = id WHERE devices.made < s.made
    GROUP BY id ORDER BY id) AS p
  WHERE d.id = p.id AND d.made < p.made)";

constexpr const char* kAddStates = R"(
INSERT INTO periods AS p SELECT DISTINCT ON (run, id) run, id, session, device, started, stopped, messages, redundant,
    looked_at FROM side_periods ORDER BY run, id, looked_at DESC
ON CONFLICT (run, id) DO UPDATE SET stopped = excluded.stopped, messages = excluded.messages,
  redundant = excluded.redundant, looked_at = excluded.looked_at WHERE p.looked_at < excluded.looked_at;
INSERT INTO sessions AS s SELECT DISTINCT ON (run, id) * FROM side_sessions ORDER BY run, id, looked_at DESC
ON CONFLICT (run, id) DO UPDATE SET process = excluded.process, application = excluded.application,
  service_type = excluded.service_type, service_name = excluded.service_name, ended = excluded.ended,
  end_reason = excluded.end_reason, looked_at = excluded.looked_at WHERE s.looked_at < excluded.looked_at;
INSERT INTO runs AS r(device, id, boot, version, started, ended, end_reason, machine, looked_at)
SELECT DISTINCT ON (s.device, s.id, s.boot, s.started) s.device, s.id, s.boot, s.version, s.started, s.ended,
    s.end_reason, s.machine, s.looked_at FROM side_runs AS s
  ORDER BY s.device, s.id, s.boot, s.started, s.looked_at DESC
ON CONFLICT (device, id, boot, started) DO UPDATE SET version = excluded.version, ended = excluded.ended,
  end_reason = excluded.end_reason, machine = excluded.machine, looked_at = excluded.looked_at
  WHERE r.looked_at < excluded.looked_at)";

}  // namespace

Status GroupWriter::begin() {
  if (Status made = database_.run(kSides); made.failed()) return made;
  const Result<Answer> keeper = database_.ask(kKeeper);
  if (keeper.failed()) return keeper.error;
  keeper_ = keeper.value.rows() == 0 ? kSharedKeeper : keeper.value.text(0, 0);
  return {};
}

Status GroupWriter::learnDevices(GroupRows& rows) {
  const std::string names = arrayOf(rows.deviceNames());
  if (Status added = database_.ask(kAddDevices, {names}).error; added.failed()) return added;
  const Result<Answer> known = database_.ask(kDevices, {names});
  if (known.failed()) return known.error;
  std::map<std::string, std::int32_t> numbers;
  for (int row = 0; row < known.value.rows(); ++row) {
    numbers[std::string(known.value.text(row, 0))] = static_cast<std::int32_t>(known.value.number(row, 1));
  }
  rows.setDevices(std::move(numbers));
  return {};
}

// In a transaction of its own: others who know the run too don't wait for the group.
Status GroupWriter::learnRuns(GroupRows& rows) {
  if (Status begun = database_.run("BEGIN"); begun.failed()) return begun;
  if (Status filled = fill("side_runs", rows.runs()); filled.failed()) return filled;
  if (Status added = database_.run(kAddRuns); added.failed()) return added;
  const Result<Answer> known = database_.ask(kRuns);
  if (known.failed()) return known.error;
  std::vector<std::int64_t> keys;
  for (int row = 0; row < known.value.rows(); ++row) {
    keys.push_back(known.value.number(row, 0));
  }
  rows.setRuns(std::move(keys));
  return database_.run("COMMIT");
}

Status GroupWriter::makeDays(const std::vector<std::string>& days) {
  const Result<Answer> missing = database_.ask(
      "SELECT d FROM unnest($1::date[]) AS d WHERE to_regclass('events_' || to_char(d, 'YYYYMMDD')) IS NULL",
      {arrayOf(days)});
  if (missing.failed()) return missing.error;
  for (int row = 0; row < missing.value.rows(); ++row) {
    const std::string day(missing.value.text(row, 0));
    if (Status made = database_.ask("SELECT make_day($1::date)", {day}).error; made.failed()) return made;
  }
  return {};
}

Status GroupWriter::fill(const char* table, CopyRows rows) {
  if (rows.rows() == 0) return {};
  return database_.copy(std::string("COPY ") + table + " FROM STDIN BINARY", rows.finish());
}

Status GroupWriter::fillAll(const GroupRows& rows) {
  if (Status filled = fill("side_runs", rows.runs()); filled.failed()) return filled;
  if (Status filled = fill("side_sessions", rows.sessions()); filled.failed()) return filled;
  if (Status filled = fill("side_periods", rows.periods()); filled.failed()) return filled;
  if (Status filled = fill("side_gaps", rows.gaps()); filled.failed()) return filled;
  if (Status filled = fill("side_told", rows.told()); filled.failed()) return filled;
  if (Status filled = fill("side_places", rows.places()); filled.failed()) return filled;
  return fill("side_events", rows.events());
}

Result<std::int64_t> GroupWriter::addEvents(const std::vector<std::string>& days) {
  // Shared: days are dropped by who has it alone.
  if (Status held = database_.run("SELECT pg_advisory_xact_lock_shared(7496301, 3)"); held.failed()) {
    return {0, std::move(held)};
  }
  const Result<Answer> expired = database_.ask(kIsExpired, {arrayOf(days)});
  if (expired.failed()) return {0, expired.error};
  const bool isExpired = expired.value.number(0, 0) != 0;
  const std::string sql = std::string(kAddEventsHead) + (isExpired ? kUnlessExpired : "") + kAddEventsTail;
  const Result<Answer> added = database_.ask(sql, {keeper_});
  if (added.failed()) return {0, added.error};
  return {added.value.number(0, 0), {}};
}

Result<WrittenGroup> GroupWriter::writeOnce(GroupRows& rows) {
  const std::vector<std::string> days = rows.days();
  Result<WrittenGroup> written;
  const auto failed = [&written](Status status) {
    written.error = std::move(status);
    return written.failed();
  };
  if (failed(learnDevices(rows)) || failed(learnRuns(rows)) || failed(makeDays(days))) return written;
  if (failed(database_.run("BEGIN")) || failed(fillAll(rows))) return written;
  const Result<std::int64_t> events = addEvents(days);
  if (failed(events.error) || failed(database_.run(kAddTold)) || failed(database_.run(kAddPlaces)) ||
      failed(database_.run(kAddStates))) {
    return written;
  }
  written.value.events = events.value;
  written.value.devices = rows.devices();
  failed(database_.run("COMMIT"));
  return written;
}

Result<WrittenGroup> GroupWriter::write(const std::vector<const v1::Batch*>& batches) {
  GroupRows rows(batches);
  for (int turn = 1;; ++turn) {
    Result<WrittenGroup> written = writeOnce(rows);
    if (written.ok()) {
      for (const v1::Batch* const batch : batches) {
        written.value.records += batch->events_size();
      }
      return written;
    }
    database_.rollBack();
    if (written.error.code() != kFaultOfTurn || turn == kMostTurns) return written;
  }
}

Result<int> GroupWriter::forgetBefore(const std::string& day) {
  for (int dropped = 0;; ++dropped) {
    // Whoever reads for long may go on; the day goes another time.
    const Result<Answer> one = [&] {
      if (const Status set = database_.run("SET lock_timeout = '2s'"); set.failed()) return Result<Answer>{{}, set};
      return database_.ask("SELECT forget_a_day_before($1::date)", {day});
    }();
    const Status reset = database_.run("RESET lock_timeout");
    if (one.failed()) return {dropped, one.error};
    if (reset.failed()) return {dropped, reset};
    if (one.value.text(0, 0).empty()) return {dropped, {}};
  }
}

}  // namespace tarn::fleet
