// SPDX-License-Identifier: Apache-2.0
// SessionCheck: compares the rows of runs, sessions, periods and repeated messages with their checksums (SessionSums),
// in steps as long as one likes. Finalized before its connection closes. Threads: the connection's.
#pragma once

#include <array>
#include <chrono>
#include <cstdint>
#include <string>
#include <vector>

#include "plist/Result.h"
#include "recorder/store/SessionSums.h"
#include "recorder/store/StoreCheck.h"
#include "recorder/store/rows/Connection.h"
#include "recorder/store/rows/Statement.h"

namespace tarn::recorder {

// By table (SessionSums::kTables): ids of rows that aren't as they were written, or that are gone.
using DamagedRows = std::array<std::vector<IdRange>, SessionSums::kTables.size()>;
std::int64_t countOf(const DamagedRows& damaged);
// "sessions 3, 5-9; periods 2", or nothing.
std::string textOf(const DamagedRows& damaged);

class SessionCheck {
 public:
  // The connection outlives it. As new, it counts as done.
  explicit SessionCheck(Connection& connection) : connection_(connection) {}
  SessionCheck(const SessionCheck&) = delete;
  SessionCheck& operator=(const SessionCheck&) = delete;

  // Starts again. A file without such checksums is done at once.
  [[nodiscard]] Status begin();
  // Goes on until the deadline; at least some rows are looked at. Between two calls rows may come, change and go. An
  // error is one of reading, and the next call goes on with the table after that.
  [[nodiscard]] Status goOn(std::chrono::steady_clock::time_point deadline);
  bool isDone() const noexcept { return done_; }
  void finalize() noexcept;
  // What was found so far; rows that are gone only when it is done.
  const DamagedRows& damaged() const noexcept { return damaged_; }

 private:
  // The next rows of a table, or after the last table the next checksums.
  [[nodiscard]] Status lookAtSome();
  [[nodiscard]] Status prepare();
  void goToNextTable();

  Connection& connection_;
  Statement rows_;
  std::size_t place_ = 0;  // of the table
  std::int64_t next_ = 0;  // the id to go on with
  bool done_ = true;
  DamagedRows damaged_;
  DamagedRows gone_;
};

// The next piece of both checks, begun anew when both are done; at least some rows are looked at. Damage is an error,
// as is a read that fails; both are over then.
[[nodiscard]] Status verifySome(StoreCheck& events, SessionCheck& sessions,
                                std::chrono::steady_clock::time_point deadline);

}  // namespace tarn::recorder
