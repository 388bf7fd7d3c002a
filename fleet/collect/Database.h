// SPDX-License-Identifier: Apache-2.0
// Database: one connection to PostgreSQL, by its own library.
//
//   database.open(url) -> run("BEGIN") -> copy("COPY t FROM STDIN BINARY", rows) -> run("COMMIT")
//
// Every error is one line and says in its code what can be done about it. After one with which the connection is gone,
// open() begins anew. Threads: one.
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "plist/Result.h"

struct pg_conn;
struct pg_result;

namespace tarn::fleet {

// The codes of its errors.
inline constexpr std::int64_t kFaultOfPlace = 0;  // the database or the way to it: later, perhaps
inline constexpr std::int64_t kFaultOfData = 1;   // what was to be stored can't be, now or later
inline constexpr std::int64_t kFaultOfTurn = 2;   // others were at it too: at once again

// Rows of an answer, as text.
class Answer {
 public:
  Answer() = default;
  explicit Answer(pg_result* result) : result_(result) {}
  int rows() const;
  // Empty where it is null.
  std::string_view text(int row, int column) const;
  bool isNull(int row, int column) const;
  std::int64_t number(int row, int column) const;
  double real(int row, int column) const;
  // Rows that the statement changed.
  std::int64_t changed() const;

 private:
  struct Clear {
    void operator()(pg_result* result) const;
  };
  std::unique_ptr<pg_result, Clear> result_;
};

class Database {
 public:
  Database() = default;
  // `url`: as PostgreSQL's tools take it, a URL or words with values. Waits a few seconds for an answer. `program` is
  // what the server is told of who asks.
  [[nodiscard]] Status open(const std::string& url, const char* program);
  bool isOpen() const;
  void close() { connection_.reset(); }

  // One statement, or several without values.
  Result<Answer> ask(const std::string& sql);
  // With values as texts, for $1 and on.
  Result<Answer> ask(const std::string& sql, const std::vector<std::string>& values);
  [[nodiscard]] Status run(const std::string& sql);
  // What CopyRows made, by a COPY of the database's binary format.
  [[nodiscard]] Status copy(const std::string& sql, const std::string& rows);
  // Ends what was begun; nothing of it was done.
  void rollBack();

 private:
  struct Finish {
    void operator()(pg_conn* connection) const;
  };
  Error errorOf(const pg_result* result) const;
  Result<Answer> take(pg_result* result);

  std::unique_ptr<pg_conn, Finish> connection_;
};

// What is wrong with a URL, or with words and their values; whether anybody answers there is another question.
[[nodiscard]] Status checkDatabaseUrl(const std::string& url);
// What a statement takes as an array of texts: {"a","b"}.
std::string arrayOf(const std::vector<std::string>& texts);

}  // namespace tarn::fleet
