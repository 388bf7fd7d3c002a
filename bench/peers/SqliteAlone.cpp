// SPDX-License-Identifier: Apache-2.0
#include "bench/peers/SqliteAlone.h"

#include "bench/Message.h"
#include "plist/formats/Json.h"

namespace tarn::bench {

namespace {

constexpr std::size_t kRowsACommit = 1000;
constexpr std::size_t kPayloads = 4096;

}  // namespace

double bytesAMessageOf(const std::string& file) {
  sqlite3* database = nullptr;
  sqlite3_stmt* size = nullptr;
  sqlite3_open_v2(file.c_str(), &database, SQLITE_OPEN_READONLY, nullptr);
  constexpr const char* kSize =
      "SELECT 2.0 * page_count * page_size / (SELECT max(id) FROM events) FROM pragma_page_count, pragma_page_size";
  if (sqlite3_prepare_v2(database, kSize, -1, &size, nullptr) != SQLITE_OK || sqlite3_step(size) != SQLITE_ROW) {
    fail("can't read " + file + ": " + sqlite3_errmsg(database));
  }
  const double bytes = sqlite3_column_double(size, 0);
  sqlite3_finalize(size);
  sqlite3_close(database);
  return bytes;
}

SqliteAlone::SqliteAlone(const std::string& directory) : directory_(directory) {
  if (sqlite3_open((directory_.path() + "/alone.sqlite3").c_str(), &database_) != SQLITE_OK) {
    fail("can't make a database in " + directory);
  }
  run("PRAGMA journal_mode=WAL");
  run("PRAGMA synchronous=FULL");
  run("CREATE TABLE events(id INTEGER PRIMARY KEY, time REAL, backend TEXT, name TEXT, payload TEXT, detail TEXT)");
  sqlite3_prepare_v2(database_, "INSERT INTO events VALUES(NULL, 1763632800.5, 'tally', ?1, ?2, '{}')", -1, &insert_,
                     nullptr);
  for (std::size_t i = 0; i < kPayloads; ++i) {
    plist::appendJson(payloads_.emplace_back(), makeLoggedMessage(i, i));
  }
}

SqliteAlone::~SqliteAlone() {
  sqlite3_finalize(insert_);
  sqlite3_close(database_);
}

void SqliteAlone::run(const char* text) {
  if (sqlite3_exec(database_, text, nullptr, nullptr, nullptr) != SQLITE_OK) {
    fail(std::string("SQLite: ") + text + ": " + sqlite3_errmsg(database_));
  }
}

void SqliteAlone::insert(const char* name, const std::string& payload) {
  sqlite3_bind_text(insert_, 1, name, -1, nullptr);
  sqlite3_bind_text(insert_, 2, payload.data(), static_cast<int>(payload.size()), nullptr);
  if (sqlite3_step(insert_) != SQLITE_DONE) {
    fail(std::string("SQLite: ") + sqlite3_errmsg(database_));
  }
  sqlite3_reset(insert_);
}

double SqliteAlone::bytesAMessage() {
  return bytesAMessageOf(directory_.path() + "/alone.sqlite3");
}

void SqliteAlone::write(std::size_t messages) {
  for (std::size_t first = 0; first < messages; first += kRowsACommit / 2) {
    run("BEGIN");
    for (std::size_t i = first; i < messages && i < first + kRowsACommit / 2; ++i) {
      insert("sys.oxbow.tarnkit.Playback.Start", payloads_[i % kPayloads]);
      insert("sys.oxbow.generic.Playback.Start", payloads_[i % kPayloads]);
    }
    run("COMMIT");
  }
}

}  // namespace tarn::bench
