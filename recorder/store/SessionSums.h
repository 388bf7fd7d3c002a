// SPDX-License-Identifier: Apache-2.0
// SessionSums: checksums of the rows of runs, sessions, periods and repeated messages, in a table beside them:
//
//   row_hashes(id, hash)     id: 4 times the row's, and which table it is in
//
// Which problem: SQLite doesn't see a flipped bit inside a row, and unlike an event such a row is changed again and
// again. How: with each change the row is hashed as it stands then, in the same transaction. A row that wasn't as its
// checksum said before the change keeps the old one, so damage isn't sealed by the next change.
//
// Owner: the session table. Threads: the connection's. What fails answers SQLite's code.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>

#include "recorder/store/rows/Connection.h"
#include "recorder/store/rows/Statement.h"

namespace tarn::recorder {

class SessionSums {
 public:
  // A table whose rows have checksums; the order is part of the layout.
  struct Table {
    std::string_view name;
    std::string_view columns;  // the first is the id
  };
  enum Place : std::size_t { Runs, Sessions, Periods, Redundant };
  static constexpr std::array<Table, 4> kTables{{
      {"runs", "id, boot, version, started, ended, end_reason, machine"},
      {"sessions",
       "id, run, reporter, connection, pid, uid, process, application, service_type, service_name, created, ended, "
       "end_reason"},
      {"periods", "id, session, started, stopped, messages, redundant, first_event, last_event"},
      {"redundant_messages", "id, session, period, time, stamp, event, after_event"},
  }};

  SessionSums() = default;
  SessionSums(const SessionSums&) = delete;
  SessionSums& operator=(const SessionSums&) = delete;

  // Gives the connection the function row_hash(table, column, ...), which the texts here need.
  [[nodiscard]] static int addFunction(Connection& connection);
  // "row_hash(1, id, ...)", the checksum of a row of that table.
  static std::string hashOfRow(std::size_t place);
  // Statements that give each row of all tables the checksum that it has now, and those that take the ones away of the
  // rows of a table whose ids a SELECT tells.
  static std::string sealAll();
  static std::string removeOf(std::size_t place, std::string_view ids);

  // Gets ready for a connection, which outlives it until finalize().
  [[nodiscard]] int prepare(Connection& connection);
  void finalize() noexcept;
  // Runs a statement that makes or changes this row and no other. In a transaction.
  [[nodiscard]] int change(Place place, std::int64_t row, Statement& statement);

 private:
  // For each table: whether a row is as its checksum says, or neither is there; and its checksum anew.
  std::array<Statement, kTables.size()> look_;
  std::array<Statement, kTables.size()> seal_;
};

}  // namespace tarn::recorder
