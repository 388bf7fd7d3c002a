#include "recorder/store/StoreLayout.h"

#include <sqlite3.h>

#include <charconv>
#include <string>
#include <string_view>

#include "recorder/store/Statement.h"

namespace tarn::recorder {

namespace {

// The members of the events table in their order, as pragma_table_info tells them.
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

constexpr const char* kMakeState = "CREATE TABLE recorder_state(name TEXT PRIMARY KEY, value INTEGER) WITHOUT ROWID";

// Beyond this no id may lie: the rest of the range is what a recorder could ever need.
constexpr std::int64_t kLastSaneId = std::int64_t{1} << 62;

// The recorder's own notes beside the events. After "holds_after" every id is there, or noted as lost; whoever reads
// along learns from "begun_after" where the ids of a fresh file go on.
constexpr const char* kMakeNotes =
    "CREATE TABLE IF NOT EXISTS event_groups(first INTEGER PRIMARY KEY, seconds REAL, hashes BLOB);"
    "CREATE TABLE IF NOT EXISTS recorder_losses(first INTEGER PRIMARY KEY, last INTEGER);"
    "CREATE TABLE IF NOT EXISTS recorder_times("
    "sequence INTEGER PRIMARY KEY, boot TEXT, monotonic REAL, wall REAL, elapsed REAL, hash INTEGER);";

Status makeAtOnce(Connection& connection, const std::string& sql) {
  Status error = connection.errorOf(connection.run(("BEGIN IMMEDIATE;" + sql + "COMMIT").c_str()));
  if (error.failed()) {
    connection.rollback();
  }
  return error;
}

Status makeTables(Connection& connection, std::int64_t lastId) {
  const std::string id = std::to_string(lastId);
  return makeAtOnce(
      connection,
      std::string("CREATE TABLE events(id INTEGER PRIMARY KEY, time REAL, backend TEXT, name TEXT, payload TEXT, "
                  "detail TEXT);") +
          kMakeState + ";" + kMakeNotes + "INSERT INTO recorder_state VALUES('begun_after', " + id + "), ('last_id', " +
          id + "), ('holds_after', " + id + ");");
}

// Of a recorder that kept fewer notes, or copied over by somebody without any: nothing proves what is there.
Status addNotes(Connection& connection, bool hasState) {
  return makeAtOnce(connection, std::string(hasState ? "" : kMakeState) + ";" + kMakeNotes +
                                    "INSERT OR REPLACE INTO recorder_state "
                                    "SELECT 'holds_after', coalesce(max(id), 0) FROM events;");
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
  const Result<std::string> mode = connection.readText("PRAGMA journal_mode");
  if (mode.failed()) return mode.error;
  if (mode.value != "wal") {
    return Error{SQLITE_CANTOPEN, "no write-ahead log can be used here (journal mode " + mode.value + ")"};
  }
  return {};
}

Status checkPages(Connection& connection) {
  const Result<std::string> verdict = connection.readText("PRAGMA quick_check(1)");
  if (verdict.failed()) return verdict.error;
  if (verdict.value == "ok") return {};
  if (tellsOfReading(verdict.value)) return Error{SQLITE_IOERR_READ, "can't be read through: " + verdict.value};
  return Error{SQLITE_CORRUPT, "damaged: " + verdict.value};
}

Status checkColumns(Connection& connection, bool& hasState) {
  const Result<std::string> events = connection.readText(kReadEventColumns);
  if (events.failed()) return events.error;
  const Result<std::string> state = connection.readText(kReadStateColumns);
  if (state.failed()) return state.error;
  hasState = !state.value.empty();
  if (events.value == kEventColumns && (!hasState || state.value == kStateColumns)) return {};
  return Error{SQLITE_MISMATCH, kForeignTables};
}

Status checkNotes(Connection& connection) {
  const Result<std::int64_t> notes = connection.readInteger(
      "SELECT count(*) FROM sqlite_schema WHERE type = 'table' AND tbl_name = name AND "
      "name IN ('recorder_state', 'event_groups', 'recorder_losses', 'recorder_times')");
  if (notes.failed()) return notes.error;
  // A file of an older recorder has its state at the most.
  if (notes.value == 4 || notes.value <= 1) return {};
  return Error{SQLITE_MISMATCH, "one of its tables is missing"};
}

Status checkTables(Connection& connection, std::int64_t lastId, bool& made) {
  Statement kinds;
  int code = kinds.prepare(connection.handle(),
                           "SELECT count(*), count(nullif(type, 'table')) FROM sqlite_schema "
                           "WHERE name IN ('events', 'recorder_state') AND type IN ('table', 'view')");
  if (code == SQLITE_OK) {
    code = kinds.step();
  }
  if (code != SQLITE_ROW) return connection.errorOf(code);
  const bool hasAny = kinds.integer(0) != 0;
  const bool hasViews = kinds.integer(1) != 0;
  kinds.finalize();
  made = !hasAny;
  if (made) return makeTables(connection, lastId);

  if (hasViews) return Error{SQLITE_MISMATCH, kForeignTables};
  bool hasState = false;
  if (Status columns = checkColumns(connection, hasState); columns.failed()) return columns;
  const Result<std::int64_t> notes = connection.readInteger(
      "SELECT count(*) FROM sqlite_schema "
      "WHERE name IN ('event_groups', 'recorder_losses', 'recorder_times') AND type = 'table'");
  if (notes.failed()) return notes.error;
  return hasState && notes.value == 3 ? Status() : addNotes(connection, hasState);
}

Result<std::int64_t> readLastId(Connection& connection) {
  Result<std::int64_t> last = connection.readInteger(
      "SELECT max(coalesce((SELECT max(id) FROM events), 0),"
      " coalesce((SELECT value FROM recorder_state WHERE name = 'last_id'), 0))");
  if (!last.failed() && last.value > kLastSaneId) {
    last.error = Error{SQLITE_MISMATCH, "its ids leave no room for further ones"};
  }
  return last;
}

}  // namespace tarn::recorder
