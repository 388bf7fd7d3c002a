// SqliteAlone: the limit of recording: the recorder's rows, their texts formed beforehand, in SQLite with nothing else
// around it, 1000 rows a synchronous commit.
#pragma once

#include <sqlite3.h>

#include <string>
#include <vector>

#include "bench/Processes.h"

namespace tarn::bench {

class SqliteAlone {
 public:
  // Makes its file in the directory.
  explicit SqliteAlone(const std::string& directory);
  ~SqliteAlone();
  SqliteAlone(const SqliteAlone&) = delete;
  SqliteAlone& operator=(const SqliteAlone&) = delete;

  // Writes two rows for each of so many messages.
  void write(std::size_t messages);

 private:
  void run(const char* text);
  void insert(const char* name, const std::string& payload);

  TemporaryDirectory directory_;
  sqlite3* database_ = nullptr;
  sqlite3_stmt* insert_ = nullptr;
  std::vector<std::string> payloads_;
};

}  // namespace tarn::bench
