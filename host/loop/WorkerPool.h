// SPDX-License-Identifier: Apache-2.0
// WorkerPool: the few threads that run all serial queues but the server queue.
//
// A queue is either idle, or stands once in the pool's line, or is run by one thread, or is suspended: so its work
// never overlaps and keeps its order, whichever thread runs it. A thread takes over what a queue holds, runs a handful
// of pieces without the pool's lock, then the queue goes to the end of the line. Delayed work and the ends of
// suspensions are kept by the pool and handed to their queues at their moments.
//
// Which problem: the server queue hands over a piece for every message, and waking a thread costs more than it.
// How: a thread that runs out of work looks again by itself after half a millisecond before it goes to sleep; while one
// is about to look, nobody is woken. Whoever finds more than it can do alone wakes another. Work that is urgent ends
// the look at once.
//
// Scheduling takes no memory: a line's place in the pool's lists is made with the line. Without memory nothing is
// handed over; a piece that runs out of it is given up, and the next one runs.
//
// Owned by LinuxWorkQueues; queues hold it too, as they may outlive that. Threads: any.
#pragma once

#include <atomic>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <list>
#include <map>
#include <memory>
#include <optional>
#include <thread>
#include <utility>
#include <vector>

#include "host/loop/DelayedWork.h"
#include "host/loop/WorkOwner.h"
#include "platform/Clock.h"
#include "platform/WorkQueue.h"
#include "plist/ThreadSafety.h"

namespace tarn::linux_host {

class WorkerPool {
 public:
  // Pieces of work that are not finished, of all queues: from the high mark on isFull() is true, until the low mark is
  // reached. A piece and the message that it holds take some hundred bytes.
  struct Marks {
    std::size_t high = 131'072;
    std::size_t low = 65'536;
    bool operator==(const Marks&) const = default;
  };
  // Called without the pool's lock, often on a pool's thread: it only tells another thread to go on.
  using RoomHandler = platform::UniqueFunction<void()>;

  struct Line;

  // The clock outlives the pool. `marks.low` lies below `marks.high`, so that those who stopped don't stop again at
  // once. Makes no thread.
  WorkerPool(const platform::Clock& clock, Marks marks) : clock_(clock), marks_(marks) {}
  WorkerPool(const WorkerPool&) = delete;
  WorkerPool& operator=(const WorkerPool&) = delete;
  ~WorkerPool() { stop(); }

  // Called each time isFull() or isCrowded() has become false again, on a thread of the pool or on that of whoever
  // helps. Set before start().
  void setRoomHandler(RoomHandler handler) { roomHandler_ = std::move(handler); }
  // Starts the threads, once. Fewer will do when the system has no more to give; false when there is none, and then
  // what is handed over waits until a later call gets one.
  [[nodiscard]] bool start(std::size_t threads);
  // Runs what is ready, then ends the threads. What is delayed, what is suspended and what comes later is destroyed
  // uncalled.
  void stop();

  // Gathered: while a thread is about to look again by itself, which is within half a millisecond, nobody is woken.
  // AtOnce: that look happens now.
  enum class Urgency { Gathered, AtOnce };
  // Runs `work` as that of this line, after what the line was given before, for the session that the caller works for.
  // So it is with all that is handed over.
  void add(const std::shared_ptr<Line>& line, platform::Work&& work, Urgency urgency = Urgency::Gathered);
  // Hands it over once `delay` has passed, not before; at once without one. It counts as unfinished from its moment on.
  void addAfter(const std::shared_ptr<Line>& line, std::chrono::nanoseconds delay, platform::Work work);
  // By work of the line, as its last step: no piece of it begins until resume() or until `longest` has passed; then
  // `next` runs first. It is one unfinished piece all the while.
  void suspend(const std::shared_ptr<Line>& line, std::chrono::nanoseconds longest, platform::Work next);
  // From any thread, also while the piece that suspended still runs, and when the time was up already: then nothing
  // happens.
  void resume(const std::shared_ptr<Line>& line);
  // For a thread that would else wait for the line: waits, at most so long, until no thread of the pool runs it; then,
  // if it stands in the pool's line, takes its next turn (at most 64 pieces) on the caller's thread. Does nothing for
  // work of the line itself.
  void help(const std::shared_ptr<Line>& line, std::chrono::nanoseconds longest);

  // Pieces handed over and not yet finished, of all queues; what is suspended counts, what is delayed does not.
  std::size_t unfinished() const;
  // One load, for each request.
  bool isFull() const noexcept { return full_.load(std::memory_order_relaxed); }
  // Whether more than `most` pieces wait for a thread; from then on it is true until half as many do. What is suspended
  // waits for something else and doesn't count. A load or two, mostly.
  bool isCrowded(std::size_t most) noexcept;
  // Calls `done` once all that is unfinished now is finished, on a thread of the pool or at once on the caller's. It is
  // destroyed uncalled with work that is.
  void afterWhatIsUnfinished(platform::Work done);
  // Blocks until nothing is unfinished; false when `longest` (an hour at most) passed first. Not for work of the pool.
  [[nodiscard]] bool settle(std::chrono::nanoseconds longest);

 private:
  using Delayed = std::pair<std::shared_ptr<Line>, OwnedWork>;
  using Lines = std::list<std::shared_ptr<Line>>;
  // By deadline, equal ones in the order of the calls.
  using Suspensions = std::map<std::pair<std::chrono::nanoseconds, std::uint64_t>, std::shared_ptr<Line>>;

  // A thread's whole life: due moments, a line's turn, a look, a sleep, in this order of preference.
  void serve();
  // After the threads: breaks the circles of queues and their work.
  void destroyWhatIsLeft();
  // Without the lock: `next` and pieces that the line has taken, until it is suspended or had its handful. How many
  // ran.
  static std::size_t runTurn(Line& line, OwnedWork next);
  // Puts work into the line and the line, unless it is there, is run or is suspended, at the end of the pool's.
  void enqueue(const std::shared_ptr<Line>& line, OwnedWork&& work) TARN_REQUIRES(mutex_);
  void schedule(const std::shared_ptr<Line>& line) TARN_REQUIRES(mutex_);
  // The line may stand in the pool's line again; its `next` counts as waiting from here on.
  void endSuspension(Suspensions::iterator suspension) TARN_REQUIRES(mutex_);
  // Moves everything whose moment has come to its line. One look at the clock, none when nothing is delayed.
  void takeDue() TARN_REQUIRES(mutex_);
  // False without the memory for it; what wasn't taken is still there.
  bool takeDuePieces(std::chrono::nanoseconds now) TARN_REQUIRES(mutex_);
  std::optional<std::chrono::nanoseconds> nextMoment() const TARN_REQUIRES(mutex_);
  // One more; at the high mark the pool is full.
  void countUnfinished() TARN_REQUIRES(mutex_);
  // After each change of what is unfinished or held.
  void noteReady() noexcept TARN_REQUIRES(mutex_) { ready_.store(unfinished_ - held_, std::memory_order_relaxed); }
  // If anybody sleeps.
  void wakeOne() TARN_REQUIRES(mutex_);
  // Sees that somebody wakes by the earliest moment, when it has just become earlier.
  void watchNextMoment() TARN_REQUIRES(mutex_);
  // A short wait, out of which a thread comes by itself. At most one thread is in it.
  void look() TARN_REQUIRES(mutex_);
  // Until somebody wakes it or the earliest moment comes.
  void sleep() TARN_REQUIRES(mutex_);
  // A turn of the line that stands there in the pool's line, and its place in the lists after it.
  void runSome(Lines::iterator place) TARN_REQUIRES(mutex_);
  void account(std::size_t finished) TARN_REQUIRES(mutex_);

  const platform::Clock& clock_;
  const Marks marks_;
  RoomHandler roomHandler_;
  std::atomic<bool> full_{false};
  std::atomic<bool> crowded_{false};
  std::atomic<std::size_t> ready_{0};  // unfinished and not held; written under the lock
  mutable Mutex mutex_;                // guards of the lines, too, what they say
  ConditionVariable changed_;          // for the sleepers
  ConditionVariable ended_;            // for the one that is about to look
  ConditionVariable settled_;
  ConditionVariable turnEnded_;  // for those who help
  std::size_t helpers_ TARN_GUARDED_BY(mutex_) = 0;
  Lines runnable_ TARN_GUARDED_BY(mutex_);
  Lines running_ TARN_GUARDED_BY(mutex_);
  DelayedWork<Delayed> delayed_ TARN_GUARDED_BY(mutex_);
  Suspensions suspensions_ TARN_GUARDED_BY(mutex_);
  std::uint64_t nextSuspension_ TARN_GUARDED_BY(mutex_) = 0;
  std::size_t unfinished_ TARN_GUARDED_BY(mutex_) = 0;
  std::size_t held_ TARN_GUARDED_BY(mutex_) = 0;       // of these, pieces of lines that are suspended
  std::size_t crowdEnds_ TARN_GUARDED_BY(mutex_) = 0;  // when so few are ready
  std::vector<std::thread> threads_ TARN_GUARDED_BY(mutex_);
  // Of the sleepers: when each wakes at the latest. There is room for one of each thread.
  std::vector<std::chrono::nanoseconds> wakeUps_ TARN_GUARDED_BY(mutex_);
  bool looking_ TARN_GUARDED_BY(mutex_) = false;
  bool stopping_ TARN_GUARDED_BY(mutex_) = false;
  bool over_ TARN_GUARDED_BY(mutex_) = false;  // the threads are gone
};

// The state of one queue. Lives as long as the queue or work for it: a queue that its last owner dropped still runs
// what it holds.
struct WorkerPool::Line {
  // Under the pool's lock.
  Lines place{nullptr};  // what stands for it in the pool's lists; it is here while it is in none
  std::vector<OwnedWork> incoming;
  OwnedWork next;  // what runs first when a suspension is over
  std::optional<Suspensions::iterator> suspension;
  std::size_t held = 0;    // pieces while suspended, `next` among them
  bool scheduled = false;  // stands in the pool's line or is being run
  bool running = false;
  // Of the thread that runs the line.
  std::vector<OwnedWork> taken;
  std::size_t position = 0;
  bool interrupted = false;  // suspended by the piece that runs
  // Pieces handed over and not yet begun.
  std::atomic<std::size_t> waiting{0};
};

}  // namespace tarn::linux_host
