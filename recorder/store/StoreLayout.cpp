// SPDX-License-Identifier: Apache-2.0
#include "recorder/store/StoreLayout.h"

#include <sqlite3.h>

#include <algorithm>
#include <charconv>
#include <iterator>
#include <span>
#include <string>
#include <string_view>
#include <vector>

#include "recorder/store/SessionSums.h"
#include "recorder/store/StoreViews.h"
#include "recorder/store/rows/Statement.h"

namespace tarn::recorder {

namespace {

// The members of the first version's events table in their order, as pragma_table_info tells them.
constexpr std::string_view kEventColumns =
    "id INTEGER 1,time REAL 0,backend TEXT 0,name TEXT 0,payload TEXT 0,detail TEXT 0";
constexpr std::string_view kStateColumns = "name TEXT 1,value INTEGER 0";

constexpr const char* kForeignTables = "its tables are not those of a recorder";

constexpr const char* kReadEventColumns =
    "SELECT group_concat(name || ' ' || type || ' ' || pk) FROM (SELECT * FROM pragma_table_info('events') ORDER BY "
    "cid)";
constexpr const char* kReadStateColumns =
    "SELECT group_concat(name || ' ' || type || ' ' || pk) "
    "FROM (SELECT * FROM pragma_table_info('recorder_state') ORDER BY cid)";

// Beyond this no id may lie: the rest of the range is what a recorder could ever need.
constexpr std::int64_t kLastSaneId = std::int64_t{1} << 62;

// The text is compared with that in the file, so it is part of the layout.
constexpr Made kTables[] = {
    {"event_rows",
     "CREATE TABLE event_rows(id INTEGER PRIMARY KEY, time REAL, kind INTEGER, payload INTEGER, cut INTEGER, "
     "session INTEGER)"},
    {"event_texts", "CREATE TABLE event_texts(id INTEGER PRIMARY KEY, backend TEXT, name TEXT, text TEXT)"},
    {"event_names", "CREATE INDEX event_names ON event_texts(name) WHERE name IS NOT NULL"},
    {"event_times", "CREATE TABLE event_times(block INTEGER PRIMARY KEY, earliest REAL, latest REAL)"},
    {"session_spans",
     "CREATE TABLE session_spans(session INTEGER, first INTEGER, PRIMARY KEY(session, first)) WITHOUT ROWID"},
    {"session_ages", "CREATE TABLE session_ages(first INTEGER PRIMARY KEY, seconds REAL)"},
    {"runs",
     "CREATE TABLE runs(id INTEGER PRIMARY KEY, boot TEXT, version TEXT, started REAL, ended REAL, end_reason TEXT, "
     "machine TEXT)"},
    {"sessions",
     "CREATE TABLE sessions(id INTEGER PRIMARY KEY, run INTEGER, reporter INTEGER, connection INTEGER, pid INTEGER, "
     "uid INTEGER, process TEXT, application TEXT, service_type INTEGER, service_name TEXT, created REAL, ended REAL, "
     "end_reason TEXT)"},
    {"periods",
     "CREATE TABLE periods(id INTEGER PRIMARY KEY, session INTEGER, started REAL, stopped REAL, messages INTEGER, "
     "redundant INTEGER, first_event INTEGER, last_event INTEGER)"},
    {"periods_of_session", "CREATE INDEX periods_of_session ON periods(session)"},
    {"redundant_messages",
     "CREATE TABLE redundant_messages(id INTEGER PRIMARY KEY, session INTEGER, period INTEGER, time REAL, stamp REAL, "
     "event INTEGER, after_event INTEGER)"},
    {"redundant_of_session", "CREATE INDEX redundant_of_session ON redundant_messages(session)"},
    {"row_hashes", "CREATE TABLE row_hashes(id INTEGER PRIMARY KEY, hash INTEGER)"},
};
// How many of them version 1 had not.
constexpr std::size_t kNewInVersion2 = 3;
// What it had in the place of one; SQLite puts a new column at the end of the table's text.
constexpr Made kRunsOfVersion1 = {
    "runs",
    "CREATE TABLE runs(id INTEGER PRIMARY KEY, boot TEXT, version TEXT, started REAL, ended REAL, end_reason TEXT)"};

// The recorder's own notes beside the events, as in the first version. After "holds_after" every id is there, or noted
// as lost; whoever reads along learns from "begun_after" where the ids of a fresh file go on.
constexpr Made kNotes[] = {
    {"recorder_state", "CREATE TABLE recorder_state(name TEXT PRIMARY KEY, value INTEGER) WITHOUT ROWID"},
    {"event_groups", "CREATE TABLE event_groups(first INTEGER PRIMARY KEY, seconds REAL, hashes BLOB)"},
    {"recorder_losses", "CREATE TABLE recorder_losses(first INTEGER PRIMARY KEY, last INTEGER)"},
    {"recorder_times",
     "CREATE TABLE recorder_times(sequence INTEGER PRIMARY KEY, boot TEXT, monotonic REAL, wall REAL, elapsed REAL, "
     "hash INTEGER)"},
};

constexpr std::string_view kSelectOlder =
    "SELECT r.id, r.time, r.backend, r.name, r.payload, r.detail, NULL AS session FROM events AS r";

constexpr std::string_view kSelectWithSessions =
    "SELECT r.id, r.time, r.backend, r.name, r.payload, r.detail, r.session FROM events AS r";

std::string makeAll(std::span<const Made> all) {
  std::string sql;
  for (const Made& made : all) {
    sql.append(made.sql).append(";");
  }
  return sql;
}

Status makeAtOnce(Connection& connection, const std::string& sql) {
  Status error = connection.errorOf(connection.run(("BEGIN IMMEDIATE;" + sql + "COMMIT").c_str()));
  if (error.failed()) {
    connection.rollback();
  }
  return error;
}

Status makeTables(Connection& connection, std::int64_t lastId) {
  const std::string id = std::to_string(lastId);
  return makeAtOnce(connection, makeAll(kNotes) + currentTables() + currentViews() +
                                    "INSERT INTO recorder_state VALUES('begun_after', " + id + "), ('last_id', " + id +
                                    "), ('holds_after', " + id + ");");
}

// Of a recorder that kept fewer notes, or copied over by somebody without any: nothing proves what is there.
Status addNotes(Connection& connection) {
  std::string sql = makeAll(kNotes);
  for (std::size_t at = 0; (at = sql.find("CREATE TABLE ", at)) != std::string::npos; ++at) {
    sql.insert(at + std::string_view("CREATE TABLE ").size(), "IF NOT EXISTS ");
  }
  return makeAtOnce(connection, sql +
                                    "INSERT OR REPLACE INTO recorder_state "
                                    "SELECT 'holds_after', coalesce(max(id), 0) FROM events;");
}

// The columns of the first version, and of its state where it has any: some files have only that of all notes.
Status checkOlderTables(Connection& connection) {
  const Result<std::string> events = connection.readText(kReadEventColumns);
  if (events.failed()) return events.error;
  const Result<std::string> state = connection.readText(kReadStateColumns);
  if (state.failed()) return state.error;
  const Result<std::int64_t> views =
      connection.readInteger("SELECT count(*) FROM sqlite_schema WHERE name = 'events' AND type <> 'table'");
  if (views.failed()) return views.error;
  const bool isOurs = events.value == kEventColumns && (state.value.empty() || state.value == kStateColumns);
  return isOurs && views.value == 0 ? Status() : Error{SQLITE_MISMATCH, kForeignTables};
}

// How many of the notes a file has.
Result<std::int64_t> countNotes(Connection& connection) {
  return connection.readInteger(
      "SELECT count(*) FROM sqlite_schema WHERE type = 'table' AND tbl_name = name AND "
      "name IN ('recorder_state', 'event_groups', 'recorder_losses', 'recorder_times')");
}

// Whether the schema has exactly these, to the letter; what it lacks is added to `missing`, or wrong without that.
Status checkAll(Connection& connection, std::span<const Made> all, std::string* missing = nullptr) {
  Statement made;
  int code = made.prepare(connection.handle(), "SELECT sql FROM sqlite_schema WHERE name = ?1");
  for (const Made& wanted : all) {
    if (code != SQLITE_OK) break;
    code = made.bind(1, wanted.name).step();
    if (code != SQLITE_ROW && code != SQLITE_DONE) break;
    if (code == SQLITE_DONE && missing != nullptr) {
      missing->append(wanted.sql).append(";");
    } else if (code == SQLITE_DONE || made.text(0) != wanted.sql) {
      return Error{SQLITE_MISMATCH, kForeignTables};
    }
    made.reset();
    code = SQLITE_OK;
  }
  return connection.errorOf(code);
}

// Of a version with sessions. `missing`: what makes those that a file of version 1 lacks.
Status checkTablesOf(std::int64_t version, Connection& connection, std::string& missing) {
  std::vector<Made> tables(std::begin(kTables), std::end(kTables));
  std::span<const Made> later;
  if (version == 1) {
    *std::find_if(tables.begin(), tables.end(), [](const Made& made) { return made.name == kRunsOfVersion1.name; }) =
        kRunsOfVersion1;
    later = std::span(kTables).last(kNewInVersion2);
    tables.resize(tables.size() - kNewInVersion2);
  }
  Status error = checkAll(connection, tables);
  error = error.ok() ? checkAll(connection, later, &missing) : error;
  return error.ok() ? checkAll(connection, kNotes) : error;
}

// Spans began with any event once, and could lie across each other. What rows without a checksum say now is all that is
// known of them.
Status bringOverVersion1(Connection& connection, const std::string& missing) {
  return makeAtOnce(connection,
                    "ALTER TABLE runs ADD COLUMN machine TEXT;" + missing + SessionSums::sealAll() +
                        "DELETE FROM session_spans; INSERT INTO session_spans SELECT DISTINCT session, id & -256 FROM "
                        "event_rows WHERE session IS NOT NULL; PRAGMA user_version = 2;");
}

// What is right needs no transaction.
Status keepViews(Connection& connection) {
  const Status error = checkAll(connection, storeViews());
  return error.failed() && error->code == SQLITE_MISMATCH ? makeAtOnce(connection, currentViews()) : error;
}

Result<std::int64_t> readVersion(Connection& connection) {
  Result<std::int64_t> version = connection.readInteger("PRAGMA user_version");
  if (version.ok() && version.value > kLayoutVersion) {
    version.error = Error{SQLITE_CANTOPEN, "its layout is version " + std::to_string(version.value) +
                                               ", of a newer service; this one knows those up to " +
                                               std::to_string(kLayoutVersion)};
  } else if (version.ok() && version.value < 0) {
    version.error = Error{SQLITE_MISMATCH, kForeignTables};
  }
  return version;
}

// Whether the verdict is about a page that could not be read, which it says in the middle of its text.
bool tellsOfReading(std::string_view verdict) {
  if (verdict.find("Failed to read") != std::string_view::npos) return true;
  constexpr std::string_view kCode = "error code=";
  const std::size_t at = verdict.find(kCode);
  if (at == std::string_view::npos) return false;
  int code = 0;
  std::from_chars(verdict.data() + at + kCode.size(), verdict.data() + verdict.size(), code);
  return (code & 0xFF) != SQLITE_CORRUPT && (code & 0xFF) != SQLITE_NOTADB;
}

}  // namespace

Status prepareConnection(Connection& connection) {
  const Result<std::int64_t> pages = connection.readInteger("PRAGMA page_count");
  if (pages.failed()) return pages.error;
  if (pages.value == 0) {
    auto error = connection.errorOf(connection.run("PRAGMA page_size=8192; PRAGMA auto_vacuum=INCREMENTAL"));
    if (error.failed()) return error;
  }
  const int code = connection.run(
      "PRAGMA journal_mode=WAL; PRAGMA synchronous=FULL;"
      "PRAGMA cache_size=-8192; PRAGMA secure_delete=OFF; PRAGMA trusted_schema=OFF");
  if (code != SQLITE_OK) return connection.errorOf(code);
  if (const int added = SessionSums::addFunction(connection); added != SQLITE_OK) return connection.errorOf(added);
  const Result<std::string> mode = connection.readText("PRAGMA journal_mode");
  if (mode.failed()) return mode.error;
  if (mode.value != "wal") {
    return Error{SQLITE_CANTOPEN, "no write-ahead log can be used here (journal mode " + mode.value + ")"};
  }
  return {};
}

Status checkPages(Connection& connection, bool indexes) {
  const Result<std::string> verdict =
      connection.readText(indexes ? "PRAGMA integrity_check(1)" : "PRAGMA quick_check(1)");
  if (verdict.failed()) return verdict.error;
  if (verdict.value == "ok") return {};
  if (tellsOfReading(verdict.value)) return Error{SQLITE_IOERR_READ, "can't be read through: " + verdict.value};
  return Error{SQLITE_CORRUPT, "damaged: " + verdict.value};
}

std::string currentTables() {
  return makeAll(kTables) + "PRAGMA user_version = " + std::to_string(kLayoutVersion) + ";";
}

std::string currentViews() {
  std::string sql;
  for (const Made& view : storeViews()) {
    sql.append("DROP VIEW IF EXISTS ").append(view.name).append(";").append(view.sql).append(";");
  }
  return sql;
}

Status checkSchema(Connection& connection) {
  const Result<std::int64_t> version = readVersion(connection);
  if (version.failed()) return version.error;
  if (version.value >= kFirstVersionWithSessions) {
    std::string missing;
    Status error = checkTablesOf(version.value, connection, missing);
    return error.ok() ? checkAll(connection, storeViews()) : error;
  }
  if (Status error = checkOlderTables(connection); error.failed()) return error;
  const Result<std::int64_t> notes = countNotes(connection);
  if (notes.failed()) return notes.error;
  // A file of an older recorder has its state at the most.
  if (notes.value == 4 || notes.value <= 1) return {};
  return Error{SQLITE_MISMATCH, "one of its tables is missing"};
}

Status checkTables(Connection& connection, std::int64_t lastId, Tables& found) {
  const Result<std::int64_t> version = readVersion(connection);
  if (version.failed()) return version.error;
  if (version.value >= kFirstVersionWithSessions) {
    found = Tables::Current;
    std::string missing;
    Status error = checkTablesOf(version.value, connection, missing);
    error = error.ok() && version.value == 1 ? bringOverVersion1(connection, missing) : error;
    return error.ok() ? keepViews(connection) : error;
  }
  const Result<std::int64_t> ours = connection.readInteger(
      "SELECT count(*) FROM sqlite_schema WHERE name IN ('events', 'recorder_state', 'event_rows')");
  if (ours.failed()) return ours.error;
  if (ours.value == 0) {
    found = Tables::Made;
    return makeTables(connection, lastId);
  }
  found = Tables::Older;
  if (Status error = checkOlderTables(connection); error.failed()) return error;
  const Result<std::int64_t> notes = countNotes(connection);
  if (notes.failed()) return notes.error;
  return notes.value == 4 ? Status() : addNotes(connection);
}

EventSelect selectEvents(Connection& connection) {
  const auto current =
      connection.integer("SELECT count(*) FROM sqlite_schema WHERE name = 'event_rows' AND type = 'table'");
  if (current != 0) return {kSelectEvents, "k"};
  const bool hasSessions =
      connection.integer("SELECT count(*) FROM pragma_table_info('events') WHERE name = 'session'") == 1;
  return {hasSessions ? kSelectWithSessions : kSelectOlder, "r", true, hasSessions};
}

Result<std::int64_t> readLastId(Connection& connection) {
  const char* const rows = selectEvents(connection).isOlder ? "events" : "event_rows";
  Result<std::int64_t> last =
      connection.readInteger((std::string("SELECT max(coalesce((SELECT max(id) FROM ") + rows +
                              "), 0), coalesce((SELECT value FROM recorder_state WHERE name = 'last_id'), 0))")
                                 .c_str());
  if (!last.failed() && last.value > kLastSaneId) {
    last.error = Error{SQLITE_MISMATCH, "its ids leave no room for further ones"};
  }
  return last;
}

}  // namespace tarn::recorder
