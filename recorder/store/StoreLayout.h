// SPDX-License-Identifier: Apache-2.0
// StoreLayout: what the recorder's database must be like before anything is written to it: sound pages, and the tables
// that a recorder makes. Each answers nothing, or what is wrong under SQLite's code for it. Threads: the connection's.
//
// `PRAGMA user_version` is the version of the layout. In version 0 `events` was the table, without sessions; from 1 on
// it is a view, and docs/recorded.md tells what stands where; version 2 tells what machine a run was on. An older file
// is migrated when it is opened (see StoreMigration); it is read as it is by whoever only reads.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>

#include "plist/Result.h"
#include "recorder/store/rows/Connection.h"

namespace tarn::recorder {

constexpr std::int64_t kLayoutVersion = 2;
constexpr std::int64_t kFirstVersionWithSessions = 1;

// What was found when the tables were looked at.
enum class Tables {
  Made,     // there were none
  Current,  // as this recorder makes them
  Older,    // of version 0, and to be migrated
};

// How a file is asked for its events: "SELECT id, time, backend, name, payload, detail, session FROM ...", to be
// followed by WHERE. The event's row is `r` there, and back-end and name are columns of `kind`.
struct EventSelect {
  std::string_view sql;
  std::string_view kind;
  bool isOlder = false;     // `events` is all that there is: a table of version 0, or whatever somebody made of a store
  bool hasSessions = true;  // else the last column is null
};

// How the connection is to work: write-ahead log, every commit synchronised; makes the page layout of a file that is
// empty yet. Fails where no write-ahead log can be used.
[[nodiscard]] Status prepareConnection(Connection& connection);
// Reads the whole file, up to the first damage (SQLITE_CORRUPT). A page that can't be read is no damage: the error is
// then that of the reading.
// With `indexes`, whether they say the same as their tables too; what they say is only of use to readers.
[[nodiscard]] Status checkPages(Connection& connection, bool indexes = false);
// Whether tables, and the recorder's notes where they were ever made, are those that a recorder makes, in one of the
// layouts; SQLITE_MISMATCH for others', SQLITE_CANTOPEN for those of a newer recorder: nothing is wrong with them.
[[nodiscard]] Status checkSchema(Connection& connection);
// The same, and makes the tables where there are none; ids of a fresh file go on after `lastId`. Adds the notes to a
// file of an older recorder, tables that came later to one of this version, and views where they are missing or others.
[[nodiscard]] Status checkTables(Connection& connection, std::int64_t lastId, Tables& found);
// What makes the tables of this version, beside the notes, and what makes its views, given anew where they are there.
std::string currentTables();
std::string currentViews();
// How to ask this file for its events. A file without either table is asked as a current one, and fails.
EventSelect selectEvents(Connection& connection);
// The greatest id that the file has given to an event, also to one that retention removed; 0 for none.
[[nodiscard]] Result<std::int64_t> readLastId(Connection& connection);

}  // namespace tarn::recorder
