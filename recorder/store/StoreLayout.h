// StoreLayout: what the recorder's database must be like before anything is written to it: sound pages, and the tables
// that a recorder makes. Each answers nothing, or what is wrong under SQLite's code for it. Threads: the connection's.
#pragma once

#include <cstdint>

#include "plist/Result.h"
#include "recorder/store/Connection.h"

namespace tarn::recorder {

// How the connection is to work: write-ahead log, every commit synchronised; makes the page layout of a file that is
// empty yet. Fails where no write-ahead log can be used.
[[nodiscard]] Status prepareConnection(Connection& connection);
// Reads the whole file, up to the first damage (SQLITE_CORRUPT). A page that can't be read is no damage: the error is
// then that of the reading.
[[nodiscard]] Status checkPages(Connection& connection);
// Whether the events, and the recorder's state where it has any (`hasState`), have the columns that a recorder makes;
// SQLITE_MISMATCH for others'.
[[nodiscard]] Status checkColumns(Connection& connection, bool& hasState);
// Whether the recorder's notes are there whole, where they were ever made.
[[nodiscard]] Status checkNotes(Connection& connection);
// Makes the tables where there are none, and says so in `made`; ids of a fresh file go on after `lastId`. Adds the
// notes to a file of an older recorder. SQLITE_MISMATCH when the tables are somebody else's.
[[nodiscard]] Status checkTables(Connection& connection, std::int64_t lastId, bool& made);
// The greatest id that the file has given to an event, also to one that retention removed; 0 for none.
[[nodiscard]] Result<std::int64_t> readLastId(Connection& connection);

}  // namespace tarn::recorder
