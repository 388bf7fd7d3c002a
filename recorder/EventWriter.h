// SPDX-License-Identifier: Apache-2.0
// EventWriter: writes batches of events into the recorder's file and copes with whatever happens to that file.
//
// Owner: the recorder. Threads: all calls on the recorder's writer thread.
//
// A passing fault (a full or read-only disk, an I/O error, a lock) is logged once when it begins and once when all
// works again; nothing is dropped, the caller comes again later. A file that can't be used is looked at twice, through
// two connections; then it is set aside with an error line and a fresh one is begun, into which goes what wasn't
// committed.
//
//   open() -> write(), write() ... -> settle() after each    the writer's usual round
//          -> maintain(), verify()                           when nothing is to be written, or their time has come
//   a fault in any of them -> resolve(): try again at once, or tell it once and come again later
//
// Every call may block for as long as the disk does. Writing and upkeep stop by themselves after tens of milliseconds,
// so that events don't wait for them.
#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <string>

#include "platform/Clock.h"
#include "platform/Log.h"
#include "platform/UniqueFunction.h"
#include "plist/Result.h"
#include "recorder/CommitPace.h"
#include "recorder/NewestMessages.h"
#include "recorder/RecorderLog.h"
#include "recorder/RecorderOptions.h"
#include "recorder/store/CarryOver.h"
#include "recorder/store/EventBatch.h"
#include "recorder/store/EventFile.h"
#include "recorder/store/files/StateUsage.h"

namespace tarn::recorder {

class EventWriter {
 public:
  // Log and clock outlive this. Nothing is opened or made.
  EventWriter(const RecorderOptions& options, platform::Log& log, const platform::Clock& clock);
  EventWriter(const EventWriter&) = delete;
  EventWriter& operator=(const EventWriter&) = delete;

  // Told the greatest session id of the runs before, each time this run is found or noted in the file: an id is that
  // and the session's number. Before open().
  using RunHandler = platform::UniqueFunction<void(std::int64_t)>;
  void setRunHandler(RunHandler handler) { runHandler_ = std::move(handler); }
  // Keeps as much and for as long as these options say, from the next maintain() on; the rest of them isn't looked at.
  void setRetention(const RecorderOptions& options);

  // Opens the file if it isn't open, and carries on what a failure left half done: a loss to be noted, rows to be
  // carried out of a file that was set aside. False: a fault; come again later. The first time it reads the whole file.
  [[nodiscard]] bool open();
  // Writes events and notes from `from` on in one transaction: all of them, or as many as fit into the time (50 ms) and
  // size (a sixteenth of the cap, 64 KiB to 8 MiB) of a commit. Also removes what retention doesn't keep. How many are
  // now committed and synchronised; 0 for a fault, after which the same events come again. An event is never written
  // twice.
  [[nodiscard]] std::size_t write(const EventBatch& batch, std::size_t from);
  // What may wait until the commit is announced: the checkpoint, and the word that a fault is over. False: a fault.
  [[nodiscard]] bool settle();
  // One step of retention in a transaction of its own, and a look at what the files beside the database take. False: a
  // fault.
  [[nodiscard]] bool maintain();
  // Compares a piece of the file with its checksums, for RecorderOptions::verifyTime; damage is resolved, after a
  // second look at all of it. Whether the file is well.
  [[nodiscard]] bool verify();
  // Whether the last piece was the file's last.
  bool isVerified() const noexcept { return file_.isVerified(); }
  // The last id that an earlier run is known to have committed, from which it shows whether the file lost its log.
  // Before open().
  void expect(std::int64_t lastId) noexcept { file_.expect(lastId); }
  // Of the last committed event, in this file or in those before it; 0 for none.
  std::int64_t lastId() const noexcept { return file_.lastId(); }
  // Notes that the run ended well, brings the log in and lets go of the file.
  void close() noexcept;
  // After something else than the file failed in the middle of any of these: the next one opens the file again and
  // finds out what is in it.
  void closeAfterFault() noexcept { file_.closeAfterFault(); }

  // Whether maintain() should come again soon: for retention, or for a log that isn't in the database yet.
  bool hasMoreToExpire() const noexcept { return file_.hasMoreToExpire(); }
  bool hasMoreToBringIn() const noexcept { return file_.isOpen() && file_.hasMoreToBringIn(); }
  // Events removed by retention since the start.
  std::uint64_t expired() const noexcept { return file_.expired(); }
  // The same by whose they were. Threads: any.
  std::map<Owner, std::uint64_t> expiredByOwner() const { return file_.expiredByOwner(); }
  // Of them, those that hadn't left the device. Threads: any.
  Unexported unexported() const { return file_.unexported(); }
  // How fast it goes.
  const CommitPace& pace() const noexcept { return pace_; }
  const std::string& problem() const noexcept { return problem_; }
  // Whether it was for want of memory.
  bool lacksMemory() const noexcept { return lacksMemory_; }

 private:
  // The single tries behind the calls above, without any remedy. Errors are SQLite's.
  [[nodiscard]] Status openOnce();
  [[nodiscard]] Result<std::size_t> writeOnce(const EventBatch& batch, std::size_t from);
  [[nodiscard]] Status maintainOnce();
  // Does what helps against the error and logs it. Whether to try again at once.
  [[nodiscard]] bool resolve(const Error& error);
  [[nodiscard]] bool resolveDamage(const Error& error);
  // Error lines for what the file lost while nobody looked.
  void tellWhatOpeningFound();
  [[nodiscard]] Status noteMissing();
  // One event, or one note; the bytes that it takes are added.
  [[nodiscard]] Status append(const EventBatch& batch, const EventBatch::Event& event, std::size_t& bytes);
  [[nodiscard]] Status append(const SessionNote& note);
  // Goes on with the rows of a file that was set aside, until they are all in this one.
  [[nodiscard]] Status carryOver();
  // Removes what is over its share beside the database, and lets the database have what is left of the cap.
  void tidy();
  void limitDatabase();
  // Once for each time that the log has become so long: a reader that holds on to an old state keeps it from beginning
  // anew.
  void tellLongLog();
  // Events went that hadn't left the device: at once, and then now and then as long as it goes on.
  void tellUnexported();
  // A fault begins: one line, until settle() tells its end.
  void noteFault(const std::string& problem);
  // The payload as JSON; two events in a row that share one form it once.
  const std::string& payloadText(const plist::Dictionary& payload);

  RecorderOptions options_;
  const platform::Clock& clock_;
  RecorderLog log_;
  // What it writes to, and what else lies beside that under the same cap.
  EventFile file_;
  StateUsage usage_;
  FileAges ages_;  // of that
  CommitPace pace_;
  RunHandler runHandler_;
  NewestMessages newest_;          // while repeated ones are marked
  plist::Dictionary lastPayload_;  // whose text payloadText_ is
  std::string payloadText_ = "{}";
  std::string nextPayloadText_;
  // Kept for its room.
  std::string detailText_;
  // Of the fault that lasts, on the monotonic clock.
  std::chrono::nanoseconds faultSince_{0};
  std::unique_ptr<CarryOver> carrying_;  // out of a file that was set aside, while that isn't over
  std::optional<IdRange> missing_;       // to be noted
  const double started_;                 // epoch seconds
  std::string problem_;                  // of the last failure
  bool lacksMemory_ = false;
  bool longLogTold_ = false;
  std::uint64_t unexportedTold_ = 0;
  std::chrono::nanoseconds nextUnexported_{0};  // on the monotonic clock
  bool faulty_ = false;
  bool suspected_ = false;  // the file was found unusable once
};

}  // namespace tarn::recorder
