// EventFile: the recorder's database as the one who writes it sees it: open, transactions of appended events,
// retention, checkpoints, and setting a file aside that can't be used.
//
// Owner: the event writer. Threads: the writer's.
//
// Ids rise in the order of the appends. The last one is kept beside the events, in the transaction that deletes any, so
// that none is given twice even when nothing is left. Only commit() makes anything true: after a rollback the same
// events get the same ids.
//
// What fails answers SQLite's code with its reason, and remedyFor() tells what helps; the transaction is then over and
// rolled back. A commit that fails for more than room or a lock is in doubt, as SQLite may find it whole when it opens
// the file again: it closes the file, and after the next open() takeRowsInDoubt() tells how many of the appended rows
// are in.
#pragma once

#include <algorithm>
#include <chrono>
#include <cstdint>
#include <filesystem>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "platform/Clock.h"
#include "plist/Result.h"
#include "recorder/store/Checkpointer.h"
#include "recorder/store/Connection.h"
#include "recorder/store/EventGroup.h"
#include "recorder/store/RecorderTime.h"
#include "recorder/store/Retention.h"
#include "recorder/store/Statement.h"
#include "recorder/store/StoreCheck.h"
#include "recorder/store/files/StoreFiles.h"

namespace tarn::recorder {

class EventFile {
 public:
  // `boot` tells this boot of the system from others.
  EventFile(std::filesystem::path path, const RetentionLimits& limits, const platform::Clock& clock, std::string boot);

  const std::filesystem::path& path() const noexcept { return files_.path(); }

  // What an earlier run is known to have committed. Before the first open().
  void expect(std::int64_t lastId) noexcept { lastId_ = expected_ = lastId; }
  // Opens the file, makes it when there is none, checks it through (once a file). Reads all of it the first time.
  [[nodiscard]] Status open();
  bool isOpen() const noexcept { return connection_.isOpen(); }
  // Closes; when all is well the write-ahead log is brought in and removed.
  void close() noexcept;
  void closeAfterFault() noexcept;
  // The same, and the next open() reads the file through again.
  void closeForAnotherLook() noexcept;
  // Closes a file that was moved away, having brought its write-ahead log in, so that it is whole where it went.
  void leave() noexcept;
  // Gives the closed file and what belongs to it another name, which is the value.
  [[nodiscard]] Result<std::filesystem::path> setAside();

  [[nodiscard]] Status begin();
  [[nodiscard]] Status append(const StoredEvent& event);
  // The same for an event that another file held, with its id and the time of its group. Ids rise; none is above that
  // of an event of ours.
  [[nodiscard]] Status carry(std::int64_t id, double seconds, const StoredEvent& event);
  // Notes ids that were committed once and are in no file now.
  [[nodiscard]] Status noteLoss(const IdRange& lost);
  // What was carried begins with this id, and whoever reads along goes on after the last one.
  [[nodiscard]] Status noteCarried(std::int64_t first);
  // Removes what retention doesn't keep, until `deadline` at the latest.
  [[nodiscard]] Status expire(std::chrono::steady_clock::time_point deadline);
  [[nodiscard]] Status commit();
  // Of the rows of a commit that failed, how many the file holds now that it is open again; told once.
  std::int64_t takeRowsInDoubt() noexcept;
  // Whether a commit failed and the file could not be asked yet.
  bool isInDoubt() const noexcept { return inDoubt_ > 0; }

  // Now, on the recorder's own time.
  double seconds() const noexcept { return time_.seconds(); }
  // The id of the last committed event, in this file or in those before it.
  std::int64_t lastId() const noexcept { return lastId_; }
  // Never two events with one id: the ids of a file that was set aside count too.
  void skipTo(std::int64_t lastId) noexcept { lastId_ = std::max(lastId_, lastId); }
  // Ids that were committed and weren't in the file when it was opened: its log was cut or taken away.
  std::optional<IdRange> takeMissing() noexcept { return std::exchange(missing_, std::nullopt); }
  // The last id of events that were expected in a file that holds nothing; 0 for none. Told once.
  std::int64_t takeGoneUpTo() noexcept { return std::exchange(goneUpTo_, 0); }
  // What was put out of the way to open the file, by its new name.
  std::vector<std::string> takePutAside() noexcept { return files_.takePutAside(); }

  // Compares rows with their checksums, from where it stopped until the deadline. Nothing when all is well so far;
  // damage as an error. A reading error too; then the check starts again.
  [[nodiscard]] Status verify(std::chrono::steady_clock::time_point deadline);
  bool isVerified() const noexcept { return check_.isDone(); }

  // Whether retention has more to remove than the last expire() got to.
  bool hasMoreToExpire() const noexcept { return retention_.hasMore(); }
  // Events removed by the transactions committed so far.
  std::uint64_t expired() const noexcept { return expired_; }

  // What the database may take, and how large its log grows before it is brought in while commits go on. At twice the
  // size they wait for it.
  void setMaxBytes(std::int64_t maxBytes) noexcept { retention_.setMaxBytes(maxBytes); }
  void setLogLimit(std::int64_t bytes) noexcept { logLimit_ = bytes; }
  // Of the log, which a reader that holds on to an old state keeps from starting again.
  std::int64_t logBytes() const noexcept { return logBytes_; }
  // Brings the write-ahead log into the database when it has grown large enough.
  [[nodiscard]] Status checkpointIfDue();
  // Whether that isn't over yet: another look will help.
  bool hasMoreToBringIn() const noexcept { return logPages_ * pageBytes_ >= logLimit_; }

 private:
  [[nodiscard]] Status checkLog();
  [[nodiscard]] Status insertAs(std::int64_t id, const StoredEvent& event, Statement& statement);
  [[nodiscard]] int writeGroup();
  [[nodiscard]] Status openConnection();
  [[nodiscard]] Status checkContent();
  [[nodiscard]] Status settleDoubt();
  [[nodiscard]] Status prepareStatements();
  void finalizeStatements() noexcept;

  StoreFiles files_;
  Connection connection_;
  Checkpointer checkpointer_;
  Statement begin_;
  Statement insert_;
  Statement carry_;
  Statement keepLastId_;
  Statement commit_;
  Statement insertGroup_;
  Retention retention_;
  StoreCheck check_{connection_};
  RecorderTime time_;
  EventGroup group_;          // of the events since the last one that was full
  std::string groupHashes_;   // while it is written
  std::int64_t lastId_ = 0;   // of the last committed event, in this file or in those before it
  std::int64_t nextId_ = 1;   // inside a transaction
  std::int64_t inDoubt_ = 0;  // rows of a commit that failed, which would follow lastId_
  std::int64_t doubtIn_ = 0;  // of these, found in the file
  std::uint64_t expired_ = 0;
  std::uint64_t expiring_ = 0;  // inside a transaction
  std::int64_t expected_ = 0;   // that the file holds, before it was opened
  std::int64_t goneUpTo_ = 0;
  std::optional<IdRange> missing_;
  std::int64_t pageBytes_ = 8192;
  std::int64_t logLimit_ = std::int64_t{8} << 20;
  std::int64_t logBytes_ = 0;
  int logPages_ = 0;  // in the write-ahead log after the last commit
};

}  // namespace tarn::recorder
