// SPDX-License-Identifier: Apache-2.0
// Connection: one SQLite connection. Statements of it are finalized before it closes. Owner: whoever works with the
// file.
//
// SQLite's own lock is off, so it is for one thread at a time. Result codes are the extended ones. Everything may block
// on the disk, and on other connections' locks as long as the owner has set.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "plist/Result.h"

struct sqlite3;

namespace tarn::recorder {

class Connection {
 public:
  Connection() = default;
  ~Connection() { close(); }
  Connection(const Connection&) = delete;
  Connection& operator=(const Connection&) = delete;

  // Opens a file name or a "file:" URI with SQLite's open flags (SQLITE_OPEN_...); SQLite's result code. One that was
  // open before is closed. After an error it is open as far as errorText() needs, and close() is due all the same.
  [[nodiscard]] int open(const std::string& name, int flags);
  // Closes without a checkpoint: what stands in the write-ahead log stays there.
  void close() noexcept;
  // Closes; the last one to do so brings the write-ahead log into the database and removes it.
  void closeAndTidy() noexcept;
  // Whether there is a connection, a failed one too until close().
  bool isOpen() const noexcept { return database_ != nullptr; }
  // For calls that have no operation here. It stays this object's.
  sqlite3* handle() const noexcept { return database_; }

  // Runs statements, separated by ";", that answer nothing of interest. Those before one that fails have been done.
  [[nodiscard]] int run(const char* sql) noexcept;
  // The first column of the first row; nothing when there is no row or when it fails, or for a NULL integer.
  std::optional<std::int64_t> integer(const char* sql);
  std::optional<std::string> text(const char* sql);
  // The same, telling a failure from nothing: no row is a failure too (SQLITE_CORRUPT, since ours always answer), NULL
  // is 0 or an empty text.
  [[nodiscard]] Result<std::int64_t> readInteger(const char* sql);
  [[nodiscard]] Result<std::string> readText(const char* sql);
  // What a result code says, under that code and with the text of the last one; nothing when it is none.
  [[nodiscard]] Status errorOf(int code) const;
  // Ends a transaction that still stands: many faults end it by themselves.
  void rollback() noexcept;
  // The text of the last failure, with the system's reason in brackets for one of the disk; for people, and to be asked
  // before the next call.
  std::string errorText() const;

 private:
  // Null while it isn't open.
  sqlite3* database_ = nullptr;
};

// The file name as a "file:" URI that opens the file as it lies there, without locks, log and index: for a file that
// nobody writes, in a folder that can't be written to.
std::string uriAsItLies(const std::string& path);

}  // namespace tarn::recorder
