// EventFile: the recorder's database as the one who writes it sees it: open, transactions of appended events,
// retention, checkpoints, and setting a file aside that can't be used.
//
// Owner: the event writer. Threads: the writer's.
//
// Ids rise in the order of the appends. The last one is kept beside the events, in the transaction that deletes any, so
// that none is given twice even when nothing is left. Only commit() makes anything true: behind a rollback the same
// events get the same ids.
//
// After any answer but Done the transaction is over and rolled back, and problem() says why in words.
#pragma once

#include <chrono>
#include <cstdint>
#include <filesystem>
#include <string>
#include <string_view>

#include "platform/Clock.h"
#include "recorder/store/Connection.h"
#include "recorder/store/Retention.h"
#include "recorder/store/Statement.h"

namespace tarn::recorder {

enum class Outcome : std::uint8_t {
  Done,
  Wait,      // a passing fault (a full disk, a lock): the same again later
  Reopen,    // a fault that a new connection may heal: open again later
  Moved,     // the file at the path isn't the open one any more
  SetAside,  // the file can't be used: damaged, no database, or somebody else's
};

class EventFile {
 public:
  struct Row {
    double time;
    std::string_view backend;
    std::string_view name;
    std::string_view payload;
    std::string_view detail;
  };

  EventFile(std::filesystem::path path, const RetentionLimits& limits, const platform::Clock& clock);

  const std::filesystem::path& path() const noexcept { return path_; }
  const std::string& problem() const noexcept { return problem_; }

  // Opens the file, makes it when there is none, checks it through (once a file). Reads all of it the first time.
  [[nodiscard]] Outcome open();
  bool isOpen() const noexcept { return connection_.isOpen(); }
  // Closes; when all is well the write-ahead log is brought in and removed.
  void close() noexcept;
  void closeAfterFault() noexcept;
  // Closes a file that was moved away, having brought its write-ahead log in, so that it is whole where it went.
  void leave() noexcept;
  // Gives the closed file and what belongs to it another name; the name, or empty with problem() set.
  std::filesystem::path setAside();

  [[nodiscard]] Outcome begin();
  [[nodiscard]] Outcome append(const Row& row);
  // Removes what retention doesn't keep, until `deadline` at the latest.
  [[nodiscard]] Outcome expire(std::chrono::steady_clock::time_point deadline);
  [[nodiscard]] Outcome commit();
  void rollback() noexcept;

  // Whether retention has more to remove than the last expire() got to.
  bool hasMoreToExpire() const noexcept { return retention_.hasMore(); }
  // Events removed by the transactions committed so far.
  std::uint64_t expired() const noexcept { return expired_; }

  // Brings the write-ahead log into the database when it has grown large enough.
  [[nodiscard]] Outcome checkpointIfDue();

 private:
  struct Identity {
    std::uint64_t device = 0;
    std::uint64_t inode = 0;
    friend bool operator==(const Identity&, const Identity&) = default;
  };

  [[nodiscard]] Outcome judge(int code);
  [[nodiscard]] Outcome refuse(Outcome outcome, std::string problem);
  bool readIdentity(Identity& identity) const noexcept;
  [[nodiscard]] Outcome checkPath();
  [[nodiscard]] Outcome openConnection();
  [[nodiscard]] Outcome checkContent();
  [[nodiscard]] Outcome checkTables();
  [[nodiscard]] Outcome makeTables();
  [[nodiscard]] Outcome prepareStatements();
  [[nodiscard]] Outcome readLastId();
  void finalizeStatements() noexcept;

  const std::filesystem::path path_;
  const platform::Clock& clock_;
  Connection connection_;
  Statement begin_;
  Statement insert_;
  Statement keepLastId_;
  Statement commit_;
  Retention retention_;
  Identity opened_;
  Identity checked_;  // the file that was last read through and found good
  std::string problem_;
  std::int64_t lastId_ = 0;  // of the last committed event, in this file or in those before it
  std::int64_t nextId_ = 1;  // inside a transaction
  std::uint64_t expired_ = 0;
  std::uint64_t expiring_ = 0;  // inside a transaction
  int logPages_ = 0;            // in the write-ahead log after the last commit
};

}  // namespace tarn::recorder
