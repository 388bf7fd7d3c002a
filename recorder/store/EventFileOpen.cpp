// The opening side of EventFile: what a file must be like before anything is written to it.
#include <sqlite3.h>
#include <sys/stat.h>

#include <algorithm>
#include <string>
#include <system_error>
#include <utility>

#include "recorder/store/EventFile.h"

namespace tarn::recorder {

namespace {

// The members of the events table in their order, as pragma_table_info tells them.
constexpr std::string_view kEventColumns =
    "id INTEGER 1,time REAL 0,backend TEXT 0,name TEXT 0,payload TEXT 0,detail TEXT 0";
constexpr std::string_view kStateColumns = "name TEXT 1,value INTEGER 0";

constexpr const char* kReadEventColumns =
    "SELECT group_concat(name || ' ' || type || ' ' || pk) FROM (SELECT * FROM pragma_table_info('events') ORDER BY "
    "cid)";
constexpr const char* kReadStateColumns =
    "SELECT group_concat(name || ' ' || type || ' ' || pk) "
    "FROM (SELECT * FROM pragma_table_info('recorder_state') ORDER BY cid)";

constexpr const char* kMakeState = "CREATE TABLE recorder_state(name TEXT PRIMARY KEY, value INTEGER) WITHOUT ROWID";

// Beyond this no id may lie: the rest of the range is what a recorder could ever need.
constexpr std::int64_t kLastSaneId = std::int64_t{1} << 62;

}  // namespace

bool EventFile::readIdentity(Identity& identity) const noexcept {
  struct stat status {};
  if (::stat(path_.c_str(), &status) != 0) return false;
  identity = {static_cast<std::uint64_t>(status.st_dev), static_cast<std::uint64_t>(status.st_ino)};
  return true;
}

Outcome EventFile::open() {
  Outcome outcome = checkPath();
  if (outcome == Outcome::Done) {
    outcome = openConnection();
  }
  if (outcome == Outcome::Done) {
    outcome = checkContent();
  }
  if (outcome == Outcome::Done) {
    outcome = checkTables();
  }
  if (outcome == Outcome::Done) {
    outcome = readLastId();
  }
  if (outcome == Outcome::Done) {
    outcome = prepareStatements();
  }
  if (outcome == Outcome::Done) {
    checked_ = opened_;
  } else {
    closeAfterFault();
  }
  return outcome;
}

Outcome EventFile::checkPath() {
  struct stat status {};
  // A directory, a pipe or a device can be opened, or hang in it; none can be a database.
  if (::stat(path_.c_str(), &status) == 0 && !S_ISREG(status.st_mode)) {
    return refuse(Outcome::SetAside, "not a regular file");
  }
  std::error_code ignored;  // when this fails, so does the opening, with a better text
  if (path_.has_parent_path()) {
    std::filesystem::create_directories(path_.parent_path(), ignored);
  }
  return Outcome::Done;
}

Outcome EventFile::openConnection() {
  const int code = connection_.open(path_.string(), SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE);
  if (code != SQLITE_OK) return judge(code);
  if (!readIdentity(opened_)) return refuse(Outcome::Reopen, "the file went away while it was opened");
  // Without the right to write SQLite falls back to reading.
  if (sqlite3_db_readonly(connection_.handle(), "main") == 1) {
    return refuse(Outcome::Reopen, "the file can't be written to (read-only)");
  }
  sqlite3_busy_timeout(connection_.handle(), 50);
  sqlite3_wal_hook(
      connection_.handle(),
      [](void* logPages, sqlite3*, const char*, int pages) {
        *static_cast<int*>(logPages) = pages;
        return SQLITE_OK;
      },
      &logPages_);
  logPages_ = 0;
  if (connection_.integer("PRAGMA page_count") == 0) {
    const int made = connection_.run("PRAGMA page_size=8192; PRAGMA auto_vacuum=INCREMENTAL");
    if (made != SQLITE_OK) return judge(made);
  }
  return judge(
      connection_.run("PRAGMA journal_mode=WAL; PRAGMA synchronous=FULL; PRAGMA journal_size_limit=16777216;"
                      "PRAGMA cache_size=-8192; PRAGMA secure_delete=OFF; PRAGMA trusted_schema=OFF"));
}

Outcome EventFile::checkContent() {
  const std::string mode = connection_.text("PRAGMA journal_mode").value_or("");
  if (mode != "wal") return refuse(Outcome::Reopen, "no write-ahead log can be used here (journal mode " + mode + ")");
  if (checked_ == opened_) return Outcome::Done;
  Statement check;
  int code = check.prepare(connection_.handle(), "PRAGMA quick_check(1)");
  if (code == SQLITE_OK) {
    code = check.step();
  }
  if (code != SQLITE_ROW) return judge(code == SQLITE_DONE ? SQLITE_CORRUPT : code);
  const std::string_view verdict = check.text(0);
  if (verdict != "ok") return refuse(Outcome::SetAside, "damaged: " + std::string(verdict));
  return Outcome::Done;
}

Outcome EventFile::checkTables() {
  Statement kinds;
  int code = kinds.prepare(connection_.handle(),
                           "SELECT count(*), count(nullif(type, 'table')) FROM sqlite_schema "
                           "WHERE name IN ('events', 'recorder_state') AND type IN ('table', 'view')");
  if (code == SQLITE_OK) {
    code = kinds.step();
  }
  if (code != SQLITE_ROW) return judge(code);
  const bool hasAny = kinds.integer(0) != 0;
  const bool hasViews = kinds.integer(1) != 0;
  kinds.finalize();
  if (!hasAny) return makeTables();

  const bool fits = !hasViews && connection_.text(kReadEventColumns) == kEventColumns;
  const std::string state = connection_.text(kReadStateColumns).value_or("");
  if (!fits || (!state.empty() && state != kStateColumns)) {
    return refuse(Outcome::SetAside, "its tables are not those of a recorder");
  }
  // Events that somebody copied over without the recorder's own notes.
  return state.empty() ? judge(connection_.run(kMakeState)) : Outcome::Done;
}

Outcome EventFile::makeTables() {
  // Whoever reads along learns from "begun_after" where the ids of a fresh file go on.
  const std::string sql =
      std::string("BEGIN IMMEDIATE;") +
      "CREATE TABLE events(id INTEGER PRIMARY KEY, time REAL, backend TEXT, name TEXT, payload TEXT, detail TEXT);" +
      std::string(kMakeState) +
      ";"
      "INSERT INTO recorder_state VALUES('begun_after', " +
      std::to_string(lastId_) + "), ('last_id', " + std::to_string(lastId_) + "); COMMIT";
  const int code = connection_.run(sql.c_str());
  const Outcome outcome = judge(code);
  if (outcome != Outcome::Done) {
    rollback();
  }
  return outcome;
}

Outcome EventFile::readLastId() {
  Statement statement;
  int code = statement.prepare(connection_.handle(),
                               "SELECT max(coalesce((SELECT max(id) FROM events), 0),"
                               " coalesce((SELECT value FROM recorder_state WHERE name = 'last_id'), 0))");
  if (code == SQLITE_OK) {
    code = statement.step();
  }
  if (code != SQLITE_ROW) return judge(code);
  const std::int64_t last = statement.integer(0);
  if (last > kLastSaneId) return refuse(Outcome::SetAside, "its ids leave no room for further ones");
  lastId_ = std::max(lastId_, last);
  return Outcome::Done;
}

Outcome EventFile::prepareStatements() {
  sqlite3* const database = connection_.handle();
  int code = begin_.prepare(database, "BEGIN IMMEDIATE", true);
  if (code == SQLITE_OK) {
    code = insert_.prepare(database, "INSERT INTO events VALUES(?1, ?2, ?3, ?4, ?5, ?6)", true);
  }
  if (code == SQLITE_OK) {
    code = keepLastId_.prepare(database, "INSERT OR REPLACE INTO recorder_state VALUES('last_id', ?1)", true);
  }
  if (code == SQLITE_OK) {
    code = commit_.prepare(database, "COMMIT", true);
  }
  if (code == SQLITE_OK) {
    code = retention_.prepare(connection_);
  }
  return judge(code);
}

std::filesystem::path EventFile::setAside() {
  const std::string base =
      path_.string() + ".damaged-" + std::to_string(static_cast<std::int64_t>(clock_.epochSeconds()));
  std::filesystem::path aside = base;
  std::error_code error;
  for (int n = 2; std::filesystem::exists(std::filesystem::symlink_status(aside, error)); ++n) {
    aside = base + "-" + std::to_string(n);
  }
  std::filesystem::rename(path_, aside, error);
  if (error) {
    problem_ += "; it can't be set aside: " + error.message();
    return {};
  }
  // The log and its index go along: what they hold belongs to the old file, and a fresh one must not find them.
  for (const char* const suffix : {"-wal", "-shm"}) {
    std::filesystem::rename(path_.string() + suffix, aside.string() + suffix, error);
    if (error && error != std::errc::no_such_file_or_directory) {
      std::filesystem::remove(path_.string() + suffix, error);
    }
  }
  return aside;
}

}  // namespace tarn::recorder
