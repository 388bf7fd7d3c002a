// SPDX-License-Identifier: Apache-2.0
// Recorder: stands in for the device's back-end services. What they would have received goes into one SQLite database,
// events(id, time, backend, name, payload, detail), readable while it is written.
//
// Owner: the platform. start() makes the writer thread, shutdown() ends it; in between nothing that was handed over
// is lost. Events are committed in groups, at most 200 ms after their hand-over while the disk is well. How many were
// handed over is kept in a mapped file beside the database, so that the run after a kill knows how many it cost.
//
// record() takes a short lock and counts references: no text is formed, no system call is made while a commit is being
// gathered. It never drops an event and never waits for the disk; so that what waits stays bounded, whoever takes
// events in from outside stops doing so while isFull() is true and goes on when the room handler is called.
//
//   record() -> incoming_ --swap--> current_ -> EventWriter -> the file
//               [gathered for some ms]  [the writer thread's own]
//                                                              '-> committed: flush(), settle(), the room handler
//
// Ids are given in the order of hand-over. Nothing is retried by the caller: what the disk refuses stays here until it
// takes it, or until shutdown() gives it up.
#pragma once

#include <atomic>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <list>
#include <map>
#include <memory>
#include <optional>
#include <string_view>
#include <thread>
#include <utility>

#include "platform/Clock.h"
#include "platform/Log.h"
#include "platform/UniqueFunction.h"
#include "platform/WorkQueue.h"
#include "plist/Dictionary.h"
#include "plist/ThreadSafety.h"
#include "recorder/EventWriter.h"
#include "recorder/RecorderOptions.h"
#include "recorder/store/EventBatch.h"
#include "recorder/store/files/HandOverPage.h"

namespace tarn::recorder {

// Events since the start. At any moment handedOver = committed + waiting + failed.
struct RecorderCounters {
  std::uint64_t handedOver = 0;
  std::uint64_t committed = 0;
  std::uint64_t waiting = 0;
  std::uint64_t expired = 0;  // removed by retention
  std::uint64_t failed = 0;   // given up at a shutdown, by a disk that never came back, or no memory to take it
  // Of the run before: handed over and never committed, because it was killed or the machine stopped.
  std::uint64_t lostBefore = 0;
};

class Recorder {
 public:
  // Only tells whoever stopped to go on; it must be short, as the writer waits for it.
  using RoomHandler = platform::UniqueFunction<void()>;

  // Log and clock outlive it. Nothing is opened, and no thread made.
  Recorder(RecorderOptions options, platform::Log& log, const platform::Clock& clock);
  ~Recorder();  // as shutdown()
  Recorder(const Recorder&) = delete;
  Recorder& operator=(const Recorder&) = delete;

  // Called on the writer thread each time isFull() or isCrowded() has become false again. Set before start().
  void setRoomHandler(RoomHandler handler) { roomHandler_ = std::move(handler); }
  // As EventWriter says; called on the writer thread. Set before start().
  void setRunHandler(EventWriter::RunHandler handler) { writer_.setRunHandler(std::move(handler)); }
  // Maps the counts and makes the writer thread, which opens the file. Called once; what was recorded before is written
  // then.
  void start();
  // Blocks, once started, until the first attempt to open the file is over, which takes longest with a large file, as
  // it is read through. Whether it succeeded isn't told: the writer goes on trying.
  void waitUntilOpened();
  // Commits what waits and closes the file, refusing what is handed over from now on; a disk that fails gets a few last
  // tries (RecorderOptions::shutdownTries), then what waits counts as failed and an error line tells how much and why.
  // Blocks for that. Called once, on the thread that called start(); the destructor does it otherwise. Without start()
  // it does nothing.
  void shutdown();

  // Hands an event over, before start() too; `backend` must be a text that lives for ever, `time` is in epoch seconds.
  // After shutdown() the event counts as failed, as does one without memory for it, which throws. Threads: any.
  void record(std::string_view backend, std::string_view name, plist::Dictionary payload, plist::Dictionary detail,
              double time);
  // Whether messages that repeat earlier ones are to be noted. Threads: any.
  bool marksRedundant() const noexcept { return options_.redundant == Redundant::Mark; }
  // What happened to a session, in order with the events and as safe as they are. After shutdown() it isn't kept.
  // Throws where there is no memory for it, and then it isn't kept. Threads: any.
  void note(SessionNote note);
  // Whether events should not be brought in for now: too many wait, or the oldest for too long. A load or two, with a
  // look at the clock while events wait; asked for each request. It stays true until the low marks are reached and the
  // room handler is called. Threads: any.
  bool isFull() noexcept;
  // Whether it will soon be full, if those that bring in most go on: from 3/4 of the high marks on. Threads: any.
  bool isCrowded() const noexcept { return crowded_.load(std::memory_order_relaxed); }
  // How many more events may come until it is. A load. Threads: any.
  std::size_t roomUntilCrowded() const noexcept { return room_.load(std::memory_order_relaxed); }
  // Keeps as much and for as long as these options say from soon on; nothing else of them counts. Threads: any.
  void setRetention(const RecorderOptions& options);
  // All counters of one moment. Threads: any.
  RecorderCounters counters() const;
  // Events that retention removed, as EventWriter has them. Threads: any.
  std::map<Owner, std::uint64_t> expiredByOwner() const { return writer_.expiredByOwner(); }
  Unexported unexported() const { return writer_.unexported(); }
  // Commits what was handed over before the call without waiting for company, blocking for at most `timeout`. Whether
  // all of it is committed; false when the time is up or when any event was given up. Threads: any but the writer's.
  [[nodiscard]] bool flush(std::chrono::milliseconds timeout);
  // The same without waiting here: once all that was handed over before the call is committed, `done` becomes work of
  // the queue (at once when it is committed already), in the order of the calls. Destroyed uncalled when some of it is
  // given up at a shutdown. Threads: any.
  void settle(std::shared_ptr<platform::WorkQueue> queue, platform::Work done) {
    settle(settlement(std::move(queue), std::move(done)));
  }
  // The same in two steps, of which the second needs no memory.
  struct Settling;
  using Settlement = std::list<std::shared_ptr<Settling>>;
  static Settlement settlement(std::shared_ptr<platform::WorkQueue> queue, platform::Work done);
  void settle(Settlement settlement) noexcept;

 private:
  using TimePoint = std::chrono::steady_clock::time_point;

  // The writer thread's whole life.
  void run();
  // Where memory is missing for a step of the writer's, it failed, as with a disk that fails.
  template <class Step>
  bool tryTo(Step step) noexcept;
  // An error line, or a short one where there is no memory for it.
  template <class Text>
  void tell(Text text) noexcept;
  void keepCounts() TARN_REQUIRES(mutex_);
  // Maps that file; without it nothing is counted along, and a kill costs an unknown number.
  void openCounts();
  // Once the file is open: what the run before had handed over less what the file holds.
  void tellWhatWasLost();
  // Sleeps until an event comes or upkeep is due, then gathers.
  void waitForWork() TARN_REQUIRES(mutex_);
  // Waits for company, within the times of RecorderOptions: what a commit costs the disk is its synchronising, however
  // many events it holds.
  void gather() TARN_REQUIRES(mutex_);
  // The pause after a fault, longer each time.
  void waitForRetry() TARN_REQUIRES(mutex_);
  // The next commit of the current group; false for a fault.
  bool writeCurrent() TARN_REQUIRES(mutex_);
  // Hands the writer what setRetention() left for it.
  void takeRetention() TARN_REQUIRES(mutex_);
  // Retention's next step, and when the one after it is due.
  bool maintain() TARN_REQUIRES(mutex_);
  // The next piece of the check, and when the one after it is due.
  bool verify() TARN_REQUIRES(mutex_);
  // Sets what isFull() and isCrowded() tell, after an event came.
  void noteUse() noexcept TARN_REQUIRES(mutex_);
  // Sets what roomUntilCrowded() tells, after any change of what waits or of how much may.
  void noteRoom() noexcept TARN_REQUIRES(mutex_);
  // Since when the oldest event waits, after some were committed.
  void noteOldest() TARN_REQUIRES(mutex_);
  void notePace() TARN_REQUIRES(mutex_);
  bool hasRoom() const TARN_REQUIRES(mutex_);
  // So many are committed: the counts, those who wait, and the room handler where there is room again.
  void account(std::size_t events, std::size_t notes, std::size_t bytes) TARN_REQUIRES(mutex_);
  // One more waits, an event or a note; whether the writer is to be called.
  [[nodiscard]] bool noteIncoming(std::size_t bytesBefore) TARN_REQUIRES(mutex_);
  // False where memory is missing for an answer: it is still owed.
  bool answerSettled() TARN_REQUIRES(mutex_);
  static bool answer(const std::shared_ptr<Settling>& settled) noexcept;
  void giveUp() TARN_REQUIRES(mutex_);
  // Of what was handed over, that which is to be committed.
  std::uint64_t accepted() const noexcept TARN_REQUIRES(mutex_) { return handedOver_ - failed_; }
  // Whether any was given up that had been taken.
  bool hasGivenUp() const noexcept TARN_REQUIRES(mutex_) { return failed_ != withoutMemory_ || notesLost_; }
  bool hasWaiting() const noexcept TARN_REQUIRES(mutex_) {
    return committed_ + failed_ != handedOver_ || notesDone_ != notes_;
  }
  bool isCommitted(std::uint64_t events, std::uint64_t notes) const noexcept TARN_REQUIRES(mutex_) {
    return committed_ >= events && notesDone_ >= notes;
  }
  // Whether somebody waits for a commit: then it isn't put off for company.
  bool isAwaited() const noexcept TARN_REQUIRES(mutex_) { return !isCommitted(awaited_, awaitedNotes_); }

  const RecorderOptions options_;
  const std::filesystem::path countsFile_;
  RecorderLog log_;
  RoomHandler roomHandler_;
  std::thread thread_;

  // The writer thread's own.
  EventWriter writer_;
  // The group that is being written; kept whole until all of it is committed, so a fault in the middle loses nothing.
  EventBatch current_;
  std::size_t position_ = 0;  // in current_: what stands before it is committed
  // After the next fault.
  std::chrono::milliseconds retry_;
  bool shortage_ = false;  // the last step failed for want of memory
  TimePoint nextMaintenance_;
  TimePoint nextVerification_;
  TimePoint currentSince_;              // of the first event in current_
  std::optional<HandOverCounts> left_;  // by the run before, until its loss is told

  // What isFull() and isCrowded() look at without the lock; written under it.
  std::atomic<bool> full_{false};
  std::atomic<bool> crowded_{false};
  std::atomic<std::size_t> room_;
  // Of the oldest event that waits, in the steady clock's ticks; 0 when none does.
  std::atomic<TimePoint::rep> oldestSince_{0};
  mutable Mutex mutex_;
  ConditionVariable work_;                       // for the writer thread
  ConditionVariable done_;                       // for those who wait for it
  EventBatch incoming_ TARN_GUARDED_BY(mutex_);  // since the group that is being written was taken
  TimePoint incomingSince_ TARN_GUARDED_BY(mutex_);
  std::size_t waitingBytes_ TARN_GUARDED_BY(mutex_) = 0;  // of both batches
  std::uint64_t handedOver_ TARN_GUARDED_BY(mutex_) = 0;
  std::uint64_t committed_ TARN_GUARDED_BY(mutex_) = 0;
  std::uint64_t failed_ TARN_GUARDED_BY(mutex_) = 0;
  std::uint64_t withoutMemory_ TARN_GUARDED_BY(mutex_) = 0;  // of these
  std::uint64_t expired_ TARN_GUARDED_BY(mutex_) = 0;
  std::uint64_t lostBefore_ TARN_GUARDED_BY(mutex_) = 0;
  std::uint64_t notes_ TARN_GUARDED_BY(mutex_) = 0;  // which the counters don't count
  std::uint64_t notesDone_ TARN_GUARDED_BY(mutex_) = 0;
  std::uint64_t awaitedNotes_ TARN_GUARDED_BY(mutex_) = 0;
  bool notesLost_ TARN_GUARDED_BY(mutex_) = false;  // at a shutdown
  HandOverPage counts_ TARN_GUARDED_BY(mutex_);
  HandOverCounts before_ TARN_GUARDED_BY(mutex_);    // counted along until the loss of the run before is told
  std::int64_t lastId_ TARN_GUARDED_BY(mutex_) = 0;  // of the last committed event
  bool countsOpen_ TARN_GUARDED_BY(mutex_) = false;
  bool busy_ TARN_GUARDED_BY(mutex_) = false;          // the last group was large
  std::size_t most_ TARN_GUARDED_BY(mutex_);           // events that may wait, at the pace of the last commits
  std::uint64_t awaited_ TARN_GUARDED_BY(mutex_) = 0;  // accepted before the last flush() or settle()
  std::optional<RecorderOptions> retention_ TARN_GUARDED_BY(mutex_);  // another one, until the writer has it
  Settlement settling_ TARN_GUARDED_BY(mutex_);
  bool owesAnswer_ TARN_GUARDED_BY(mutex_) = false;  // for which memory was missing
  bool asleep_ TARN_GUARDED_BY(mutex_) = false;      // the writer waits for the first event of a group
  bool opened_ TARN_GUARDED_BY(mutex_) = false;
  bool stopping_ TARN_GUARDED_BY(mutex_) = false;
  bool refusing_ TARN_GUARDED_BY(mutex_) = false;
  bool refusalLogged_ TARN_GUARDED_BY(mutex_) = false;
};

// One that waits for a commit. Shared with the work that answers it, so that it is still there when no memory was for
// that work.
struct Recorder::Settling {
  std::uint64_t target;  // committed when so many events are,
  std::uint64_t notes;   // and so many notes
  std::shared_ptr<platform::WorkQueue> queue;
  platform::Work done;
};

}  // namespace tarn::recorder
