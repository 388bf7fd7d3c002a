// SPDX-License-Identifier: Apache-2.0
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
#include <map>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "platform/Clock.h"
#include "plist/Result.h"
#include "recorder/store/Checkpointer.h"
#include "recorder/store/RecorderTime.h"
#include "recorder/store/Retention.h"
#include "recorder/store/SessionCheck.h"
#include "recorder/store/SessionTable.h"
#include "recorder/store/StoreCheck.h"
#include "recorder/store/files/CleanMark.h"
#include "recorder/store/files/StoreFiles.h"
#include "recorder/store/retention/FileAges.h"
#include "recorder/store/rows/Connection.h"
#include "recorder/store/rows/EventGroup.h"
#include "recorder/store/rows/EventTable.h"
#include "recorder/store/rows/Statement.h"

namespace tarn::recorder {

class EventFile {
 public:
  // `boot` tells this boot of the system from others; the clock outlives this. Nothing is opened.
  EventFile(std::filesystem::path path, const RetentionLimits& limits, const platform::Clock& clock, std::string boot);

  const std::filesystem::path& path() const noexcept { return files_.path(); }

  // The last id that an earlier run is known to have committed, from which open() tells what is missing. Before the
  // first open().
  void expect(std::int64_t lastId) noexcept { lastId_ = expected_ = lastId; }
  // Opens the file, makes it and its folders when there is none, checks it through (once a file, which reads all of
  // it). After an error it is closed.
  [[nodiscard]] Status open();
  // Whether begin() makes sense; it isn't after any fault that closed the file.
  bool isOpen() const noexcept { return connection_.isOpen(); }
  // Closes; when all is well the write-ahead log is brought in and removed, so that a copy of the one file is whole.
  void close() noexcept;
  // Closes as it is: the log stays, for the next one to open the file.
  void closeAfterFault() noexcept;
  // The same, and the next open() reads the file through again: what was found may have been an error of the reading.
  void closeForAnotherLook() noexcept;
  // Closes a file that was moved away, having brought its write-ahead log in, so that it is whole where it went.
  void leave() noexcept;
  // Gives the closed file and what belongs to it another name ("FILE.damaged-SECONDS"), which is the value. Fails with
  // the system's reason when it can't be renamed; then it is where it was.
  [[nodiscard]] Result<std::filesystem::path> setAside();

  // Begins a transaction, once the file at the path and its log are found to be those that were opened. Nobody else can
  // write until it is over; a lock of another's is waited for 50 ms.
  [[nodiscard]] Status begin();
  // Notes that this run began, and closes what earlier ones left open; in a transaction of its own, before the first
  // event or note of each opening and after what is carried into the file.
  [[nodiscard]] Status beginRun(const RunFacts& run);
  bool hasBegunRun() const noexcept { return runBegun_; }
  // The greatest id of a session that was given before this run; once it has begun.
  std::int64_t lastSessionBefore() const noexcept { return sessions_.lastBefore(); }
  // Notes that it ended well, in a transaction of its own.
  [[nodiscard]] Status endRun(double time);
  // What happened to a session, after the events appended so far; in a transaction.
  [[nodiscard]] Status append(const SessionNote& note);
  // The same of a message that repeats the one of an event, 0 where that isn't known.
  [[nodiscard]] Status append(const SessionNote& repeat, std::int64_t repeated);
  // Adds an event under the next id, in a transaction. Texts are looked at during the call only; a time that isn't a
  // number is stored as 0. `repeatsPayload`: its payload is that of the append before. The session is that of `owner`.
  [[nodiscard]] Status append(const StoredEvent& event, bool repeatsPayload, platform::SessionNumber owner);
  // The same for an event that another file held, with its id and the time of its group. Ids rise; none is above that
  // of an event of ours. An id that is there already is replaced by the same.
  [[nodiscard]] Status carry(std::int64_t id, double seconds, const StoredEvent& event, bool repeatsPayload);
  // Notes ids that were committed once and are in no file now, so that nobody looks for them again; in a transaction.
  [[nodiscard]] Status noteLoss(const IdRange& lost);
  // The same for ids that retention had removed from the middle of another file.
  [[nodiscard]] Status noteRemoved(const IdRange& removed);
  // What was carried begins with this id, and whoever reads along goes on after the last one. In a transaction, after
  // the last carry().
  [[nodiscard]] Status noteCarried(std::int64_t first);
  // Takes over the rows of runs, sessions, periods and repeated messages that another file has, as far as they can be
  // read and are as they were written; the others are counted. In a transaction, after the last carry().
  [[nodiscard]] Status carrySessions(Connection& from, std::int64_t& leftBehind);
  // What the file knows of the ages of others, and what it is to know; the second in a transaction.
  [[nodiscard]] Status readAges(FileAges& ages) { return connection_.errorOf(ages.read(connection_)); }
  [[nodiscard]] Status writeAges(const FileAges& ages) { return rollbackAfter(ages.write(connection_)); }
  // Removes what retention doesn't keep, until `deadline` at the latest; in a transaction, after its appends.
  [[nodiscard]] Status expire(std::chrono::steady_clock::time_point deadline);
  // Ends the transaction and synchronises it: what was appended is safe when this succeeds.
  [[nodiscard]] Status commit();
  // Of the rows of a commit that failed, how many the file holds now that it is open again, from the first one on; told
  // once. They are committed: whoever appended them goes on after them.
  std::int64_t takeRowsInDoubt() noexcept;
  // Whether a commit failed and the file could not be asked yet. Then nobody knows which ids after lastId() were given.
  bool isInDoubt() const noexcept { return inDoubt_ > 0; }

  // Now, on the recorder's own time, which goes on from what the file noted; after open().
  double seconds() const noexcept { return time_.seconds(); }
  // The id of the last committed event, in this file or in those before it.
  std::int64_t lastId() const noexcept { return lastId_; }
  // That of the next append(), in a transaction.
  std::int64_t nextId() const noexcept { return nextId_; }
  // Never two events with one id: the ids of a file that was set aside count too. Only forward.
  void skipTo(std::int64_t lastId) noexcept { lastId_ = std::max(lastId_, lastId); }
  // Ids that were committed and weren't in the file when it was opened: its log was cut or taken away. Told once.
  std::optional<IdRange> takeMissing() noexcept { return std::exchange(missing_, std::nullopt); }
  // The last id of events that were expected in a file that holds nothing; 0 for none. Told once. They may be in a file
  // that somebody took away.
  std::int64_t takeGoneUpTo() noexcept { return std::exchange(goneUpTo_, 0); }
  // How many events open() brought over from the layout of an older recorder, where it found one. Told once.
  std::optional<std::int64_t> takeMigrated() noexcept { return std::exchange(migrated_, std::nullopt); }
  // What was put out of the way to open the file, by its new name.
  std::vector<std::string> takePutAside() noexcept { return files_.takePutAside(); }

  // Compares rows with their checksums, from where it stopped until the deadline. Nothing when all is well so far;
  // damage as an error. A reading error too; then the check starts again.
  [[nodiscard]] Status verify(std::chrono::steady_clock::time_point deadline);
  // Whether the check came to the file's end, or none has begun.
  bool isVerified() const noexcept { return check_.isDone() && sessionCheck_.isDone(); }

  // Whether retention has more to remove than the last expire() got to. Another one is due soon then.
  bool hasMoreToExpire() const noexcept { return retention_.hasMore(); }
  // Events removed by the transactions committed so far, since this was made.
  std::uint64_t expired() const noexcept { return expired_; }
  // The same by whose they were. Threads: any.
  std::map<Owner, std::uint64_t> expiredByOwner() const { return retention_.expiredByOwner(); }
  // Of them, those that hadn't left the device. Threads: any.
  Unexported unexported() const { return retention_.unexported(); }

  // What the database may take, and how large its log grows before it is brought in while commits go on. At twice the
  // size they wait for it. Bytes; from the next expire() and checkpointIfDue() on.
  void setMaxBytes(std::int64_t maxBytes) noexcept { retention_.setMaxBytes(maxBytes); }
  void setLimits(const RetentionLimits& limits) noexcept { retention_.setLimits(limits); }
  // Where is said what has left the device; empty: nowhere.
  void setExported(std::filesystem::path file) noexcept { retention_.setExported(std::move(file)); }
  void setLogLimit(std::int64_t bytes) noexcept { logLimit_ = bytes; }
  // Of the log after the last commit, in bytes; a reader that holds on to an old state keeps it from starting again,
  // and so it grows.
  std::int64_t logBytes() const noexcept { return logBytes_; }
  // Brings the write-ahead log into the database when it has grown large enough: aside while commits go on, or here,
  // blocking, when it is twice that large. A reader in the way is no error.
  [[nodiscard]] Status checkpointIfDue();
  // Whether that isn't over yet: another look will help. Also while a reader of an old state is in the way.
  bool hasMoreToBringIn() const noexcept { return logPages_ * pageBytes_ >= logLimit_; }

 private:
  [[nodiscard]] Status checkLog();
  [[nodiscard]] Status insertAs(std::int64_t id, const StoredEvent& event, bool repeatsPayload, bool replacing);
  // The answer to a step of a transaction, which is rolled back where it failed.
  [[nodiscard]] Status rollbackAfter(int code);
  void rollback();
  [[nodiscard]] int writeGroup();
  [[nodiscard]] Status openConnection();
  [[nodiscard]] Status checkContent();
  [[nodiscard]] Status migrateOlder();
  [[nodiscard]] Status openTime() { return time_.open(connection_); }
  // What the file holds of a commit that failed, made safe before it counts.
  [[nodiscard]] Status settleDoubt();
  [[nodiscard]] Status prepareStatements();
  void finalizeStatements() noexcept;

  StoreFiles files_;
  CleanMark cleanMark_;
  bool isAsLeft_ = false;  // by the last one who closed it, when it was opened
  Connection connection_;
  Checkpointer checkpointer_;
  // Prepared once for each opening: these run with every commit, or every event.
  Statement begin_;
  Statement keepLastId_;
  Statement commit_;
  Statement insertGroup_;
  // What runs inside the transactions, on this connection.
  EventTable table_;
  SessionTable sessions_;
  Retention retention_;
  StoreCheck check_{connection_};
  SessionCheck sessionCheck_{connection_};  // after that
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
  std::optional<std::int64_t> migrated_;
  bool runBegun_ = false;  // in the file that is open
  std::int64_t pageBytes_ = 8192;
  std::int64_t logLimit_ = std::int64_t{8} << 20;
  bool bringInFailed_ = false;  // the last time that the log was to be brought in, whatever was opened since
  std::int64_t logBytes_ = 0;
  int logPages_ = 0;  // in the write-ahead log after the last commit
};

}  // namespace tarn::recorder
