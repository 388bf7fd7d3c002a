// SPDX-License-Identifier: Apache-2.0
// SqliteAlone: the limit of recording: the recorder's rows, their texts formed beforehand, in SQLite with nothing else
// around it, 1000 rows a synchronous commit.
#pragma once

#include <sqlite3.h>

#include <string>
#include <vector>

#include "bench/Processes.h"

namespace tarn::bench {

// What a database takes for a message, whose table or view `events` has two events of each; its log is counted as if it
// were brought in.
double bytesAMessageOf(const std::string& file);

class SqliteAlone {
 public:
  // Makes its file in the directory.
  explicit SqliteAlone(const std::string& directory);
  ~SqliteAlone();
  SqliteAlone(const SqliteAlone&) = delete;
  SqliteAlone& operator=(const SqliteAlone&) = delete;

  // Writes two rows for each of so many messages.
  void write(std::size_t messages);
  // What its file takes for a message, of those written so far.
  double bytesAMessage();

 private:
  void run(const char* text);
  void insert(const char* name, const std::string& payload);

  TemporaryDirectory directory_;
  sqlite3* database_ = nullptr;
  sqlite3_stmt* insert_ = nullptr;
  std::vector<std::string> payloads_;
};

}  // namespace tarn::bench
