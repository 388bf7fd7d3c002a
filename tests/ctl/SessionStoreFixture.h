// SPDX-License-Identifier: Apache-2.0
// SessionStoreFixture: a recorder's file with sessions in it, made by SQL alone, in a state directory of its own. So
// what reads the file is tested against its tables as they are documented and against nothing that writes them.
//
// The events are a table here, or a view over one that keeps each payload once: readers see no difference.
#pragma once

#include <gtest/gtest.h>
#include <sqlite3.h>

#include <cstdint>
#include <cstdlib>
#include <filesystem>
#include <string>
#include <string_view>

namespace tarn::testing {

class SessionStoreFixture : public ::testing::Test {
 protected:
  // A session of the music player's; tests change what they are about.
  struct Session {
    std::int64_t id = 1;
    std::int64_t run = 1;
    std::int64_t reporter = 4101;
    std::int64_t connection = 3;
    std::int64_t pid = 812;
    std::string process = "player";
    std::string application = "org.example.music";
    std::int64_t serviceType = 7;
    std::string serviceName = "longformaudio";
    double created = 1795158000;  // 2026-11-20 07:00:00 UTC
    double ended = 0;             // 0: it hasn't
    std::string endReason = {};
  };

  SessionStoreFixture() {
    std::string pattern = (std::filesystem::temp_directory_path() / "sessions-XXXXXX").string();
    directory_ = ::mkdtemp(pattern.data());
  }
  ~SessionStoreFixture() override {
    sqlite3_close(database_);
    std::error_code ignored;
    std::filesystem::remove_all(directory_, ignored);
  }

  const std::filesystem::path& directory() const { return directory_; }
  std::filesystem::path file() const { return directory_ / "recorder.sqlite3"; }

  // The tables of the version with sessions.
  void makeStore() {
    sql("PRAGMA user_version = 1;"
        "CREATE TABLE runs(id INTEGER PRIMARY KEY, boot TEXT, version TEXT, started REAL, ended REAL, end_reason TEXT);"
        "CREATE TABLE sessions(id INTEGER PRIMARY KEY, run INTEGER, reporter INTEGER, connection INTEGER, pid INTEGER,"
        " uid INTEGER, process TEXT, application TEXT, service_type INTEGER, service_name TEXT, created REAL,"
        " ended REAL, end_reason TEXT);"
        "CREATE TABLE periods(id INTEGER PRIMARY KEY, session INTEGER, started REAL, stopped REAL, messages INTEGER,"
        " redundant INTEGER, first_event INTEGER, last_event INTEGER);"
        "CREATE TABLE redundant_messages(id INTEGER PRIMARY KEY, session INTEGER, period INTEGER, time REAL, stamp "
        "REAL,"
        " event INTEGER, after_event INTEGER);"
        "CREATE TABLE event_rows(id INTEGER PRIMARY KEY, time REAL, kind INTEGER, payload INTEGER, cut INTEGER,"
        " session INTEGER);"
        "CREATE TABLE event_texts(id INTEGER PRIMARY KEY, backend TEXT, name TEXT, text TEXT);"
        "CREATE TABLE event_times(block INTEGER PRIMARY KEY, earliest REAL, latest REAL);"
        "CREATE TABLE session_spans(session INTEGER, first INTEGER, PRIMARY KEY(session, first)) WITHOUT ROWID;"
        "CREATE VIEW events AS SELECT r.id AS id, r.time AS time, k.backend AS backend, k.name AS name,"
        " p.text AS payload, k.text AS detail, r.session AS session FROM event_rows AS r"
        " CROSS JOIN event_texts AS k ON k.id = 2 * (r.id - r.kind) + 1"
        " LEFT JOIN event_texts AS p ON p.id = 2 * (r.id - r.payload);"
        "CREATE TRIGGER keep INSTEAD OF INSERT ON events BEGIN"
        " INSERT INTO event_texts VALUES(2 * new.id, NULL, NULL, new.payload),"
        "  (2 * new.id + 1, new.backend, new.name, new.detail);"
        " INSERT INTO event_rows VALUES(new.id, new.time, 0, 0, NULL, new.session);"
        " INSERT OR IGNORE INTO session_spans SELECT new.session, new.id & -256 WHERE new.session IS NOT NULL;"
        "END;"
        "INSERT INTO runs VALUES(1, 'boot', '0.1.0', 1795150000, NULL, NULL);");
  }
  // Of the version before there were sessions.
  void makeOldStore() {
    sql("CREATE TABLE events(id INTEGER PRIMARY KEY, time REAL, backend TEXT, name TEXT, payload TEXT, detail TEXT);");
  }

  void addSession(const Session& session) {
    sql("INSERT INTO sessions VALUES(" + std::to_string(session.id) + "," + std::to_string(session.run) + "," +
        std::to_string(session.reporter) + "," + std::to_string(session.connection) + "," +
        std::to_string(session.pid) + ",1000," + quoted(session.process) + "," + quoted(session.application) + "," +
        std::to_string(session.serviceType) + "," + quoted(session.serviceName) + "," + real(session.created) + "," +
        real(session.ended) + "," + quoted(session.endReason) + ");");
  }
  // One that still runs has no stop; 0 stands for that.
  void addPeriod(std::int64_t session, double started, double stopped, std::int64_t firstEvent = 0,
                 std::int64_t lastEvent = 0, std::int64_t messages = 0, std::int64_t redundant = 0) {
    sql("INSERT INTO periods(session, started, stopped, messages, redundant, first_event, last_event) VALUES(" +
        std::to_string(session) + "," + real(started) + "," + real(stopped) + "," + std::to_string(messages) + "," +
        std::to_string(redundant) + ",nullif(" + std::to_string(firstEvent) + ",0),nullif(" +
        std::to_string(lastEvent) + ",0));");
  }
  // `session` 0: nobody's. The event's id.
  std::int64_t addEvent(std::int64_t session, double time, const std::string& backend, const std::string& name,
                        const std::string& payload, const std::string& detail = "{}") {
    sql("INSERT INTO events(id,time,backend,name,payload,detail,session) VALUES(" + std::to_string(++lastEvent_) + "," +
        real(time) + "," + quoted(backend) + "," + quoted(name) + "," + quoted(payload) + "," + quoted(detail) +
        ",nullif(" + std::to_string(session) + ",0));");
    return lastEvent_;
  }
  // A message as it is recorded: two analytics events, and the mirror. The id of the first.
  std::int64_t addMessage(std::int64_t session, double time, const std::string& kind, const std::string& payload,
                          const std::string& service = "longformaudio") {
    const std::int64_t first = addEvent(session, time, "tally", "sys.oxbow.tarnkit." + kind, payload);
    addEvent(session, time, "tally", "sys.oxbow." + service + "." + kind, payload);
    addEvent(session, time, "rtc", "sendMessage", payload, R"({"session":1,"category":4,"type":1})");
    return first;
  }
  std::int64_t lastEvent() const { return lastEvent_; }

  void sql(const std::string& text) {
    if (database_ == nullptr) {
      ASSERT_EQ(sqlite3_open(file().c_str(), &database_), SQLITE_OK);
      sql("PRAGMA synchronous = OFF;");  // nobody pulls the plug here
    }
    ASSERT_EQ(sqlite3_exec(database_, text.c_str(), nullptr, nullptr, nullptr), SQLITE_OK)
        << sqlite3_errmsg(database_) << " in " << text;
  }

 private:
  static std::string quoted(std::string_view text) {
    std::string result = "'";
    for (const char c : text) {
      result.append(c == '\'' ? "''" : std::string(1, c));
    }
    return result + "'";
  }
  // 0 is what hasn't happened.
  static std::string real(double value) {
    char digits[32];
    std::snprintf(digits, sizeof digits, "%.17g", value);
    return value == 0 ? "NULL" : digits;
  }

  std::filesystem::path directory_;
  sqlite3* database_ = nullptr;
  std::int64_t lastEvent_ = 0;
};

}  // namespace tarn::testing
