// SPDX-License-Identifier: Apache-2.0
// Statement: one prepared SQLite statement. Owner: whoever owns the connection, which must outlive it. Threads: those
// of the connection.
//
//   prepare -> bind -> step (a row) ... step (done) -> reset -> bind -> ...      or, without rows: bind -> run
//
// Operations that can fail answer SQLite's result code; the text of a failure is the connection's.
#pragma once

#include <cstdint>
#include <string_view>

struct sqlite3;
struct sqlite3_stmt;

namespace tarn::recorder {

class Statement {
 public:
  Statement() = default;
  ~Statement() { finalize(); }
  Statement(const Statement&) = delete;
  Statement& operator=(const Statement&) = delete;

  // Prepares the text, in place of an earlier one; `kept` for one that is used on and on. SQLite's result code.
  [[nodiscard]] int prepare(sqlite3* database, std::string_view sql, bool kept = false);
  // Lets go of it; needed before the connection closes. Safe without any.
  void finalize() noexcept;

  // Places count from 1 and keep their value over reset(). A text is not copied: it must live until the statement is
  // reset. A binding that fails shows in the next step.
  Statement& bind(int place, std::int64_t value) noexcept;
  Statement& bind(int place, double value) noexcept;
  Statement& bind(int place, std::string_view text) noexcept;
  Statement& bindNull(int place) noexcept;
  Statement& bindBytes(int place, std::string_view bytes) noexcept;

  // One step: SQLITE_ROW, SQLITE_DONE or what went wrong. After a row the next step goes on; after anything else it
  // begins anew. May wait for a lock as long as the connection does.
  [[nodiscard]] int step() noexcept;
  // Back to its beginning, giving up its locks; rows' texts are gone.
  void reset() noexcept;
  // Runs to the end and resets: SQLITE_OK or what went wrong. Rows are passed over. For statements that change
  // something.
  [[nodiscard]] int run() noexcept;

  // For calls that have no operation here. It stays this object's.
  sqlite3_stmt* handle() const noexcept { return statement_; }

  // Of the row of the last step. Columns count from 0. A text lives until the next step.
  bool isNull(int column) const noexcept;
  bool isReal(int column) const noexcept;
  bool isText(int column) const noexcept;
  // Another kind of value is converted as SQLite does; NULL is 0 or an empty text.
  std::int64_t integer(int column) const noexcept;
  double real(int column) const noexcept;
  std::string_view text(int column) const noexcept;

 private:
  sqlite3_stmt* statement_ = nullptr;
};

}  // namespace tarn::recorder
