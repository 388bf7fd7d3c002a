// Connection: one SQLite connection. Statements of it are finalized before it closes. Threads: one at a time.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

struct sqlite3;

namespace tarn::recorder {

class Connection {
 public:
  Connection() = default;
  ~Connection() { close(); }
  Connection(const Connection&) = delete;
  Connection& operator=(const Connection&) = delete;

  // Opens a file name or a "file:" URI with SQLite's open flags; SQLite's result code.
  [[nodiscard]] int open(const std::string& name, int flags);
  // Closes without a checkpoint: what stands in the write-ahead log stays there.
  void close() noexcept;
  // Closes; the last one to do so brings the write-ahead log into the database and removes it.
  void closeAndTidy() noexcept;
  bool isOpen() const noexcept { return database_ != nullptr; }
  sqlite3* handle() const noexcept { return database_; }

  // Runs statements that answer nothing of interest.
  [[nodiscard]] int run(const char* sql) noexcept;
  // The first column of the first row; nothing when there is no row or when it fails.
  std::optional<std::int64_t> integer(const char* sql);
  std::optional<std::string> text(const char* sql);
  // The text of the last failure.
  std::string errorText() const;

 private:
  sqlite3* database_ = nullptr;
};

}  // namespace tarn::recorder
