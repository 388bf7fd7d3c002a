// SPDX-License-Identifier: Apache-2.0
// StoreFile: a recorder's file made by SQL, with the tables that readers know. Threads: one.
#pragma once

#include <gtest/gtest.h>
#include <sqlite3.h>

#include <filesystem>
#include <string>

#include "recorder/store/rows/Connection.h"
#include "tests/host/TemporaryFolder.h"

namespace tarn::testing {

class StoreFile {
 public:
  StoreFile() {
    EXPECT_EQ(connection_.open(path(), SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE), SQLITE_OK);
    sql("CREATE TABLE events(id INTEGER PRIMARY KEY, time REAL, backend TEXT, name TEXT, payload TEXT, detail TEXT, "
        "session INTEGER);"
        "CREATE TABLE sessions(id INTEGER PRIMARY KEY, run INTEGER, reporter INTEGER, connection INTEGER, pid INTEGER, "
        "uid INTEGER, process TEXT, application TEXT, service_type INTEGER, service_name TEXT, created REAL, "
        "ended REAL, end_reason TEXT);"
        "CREATE TABLE periods(id INTEGER PRIMARY KEY, session INTEGER, started REAL, stopped REAL, messages INTEGER, "
        "redundant INTEGER, first_event INTEGER, last_event INTEGER);"
        "PRAGMA user_version = 1");
  }
  StoreFile(const StoreFile&) = delete;
  StoreFile& operator=(const StoreFile&) = delete;

  std::string path() const { return folder_.path() + "/recorder.sqlite3"; }
  std::string folder() const { return folder_.path(); }

  void sql(const std::string& statements) {
    EXPECT_EQ(connection_.run(statements.c_str()), SQLITE_OK) << connection_.errorText() << ": " << statements;
  }
  // Times are epoch seconds; `ended` is SQL: "NULL" or a number.
  void session(int id, double created, const std::string& ended) {
    sql("INSERT INTO sessions VALUES(" + std::to_string(id) + ", 1, " + std::to_string(1000 + id) +
        ", 3, 4711, 1000, 'player', 'org.example.player', 7, 'longformaudio', " + std::to_string(created) + ", " +
        ended + ", 'stopped')");
  }
  void period(int session, double started, const std::string& stopped, int messages) {
    sql("INSERT INTO periods(session, started, stopped, messages, redundant) VALUES(" + std::to_string(session) + ", " +
        std::to_string(started) + ", " + stopped + ", " + std::to_string(messages) + ", 0)");
  }
  // `session` is SQL too. The name is without "sys.oxbow.tarnkit.".
  void message(const std::string& session, double time, const std::string& name, const std::string& payload = "{}") {
    event(session, time, "tally", "sys.oxbow.tarnkit." + name, payload);
  }
  void event(const std::string& session, double time, const std::string& backend, const std::string& name,
             const std::string& payload) {
    sql("INSERT INTO events(time, backend, name, payload, detail, session) VALUES(" + std::to_string(time) + ", '" +
        backend + "', '" + name + "', '" + payload + "', '{}', " + session + ")");
  }

 private:
  linux_host::TemporaryFolder folder_;
  recorder::Connection connection_;
};

}  // namespace tarn::testing
