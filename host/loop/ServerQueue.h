// SPDX-License-Identifier: Apache-2.0
// ServerQueue: the one serial queue on which the whole service runs. MainLoop serves it, on the thread that also waits
// for the sockets.
//
// Which problem: work comes from the loop's own thread (requests), and now and then from others (back-ends, timers), up
// to thousands of pieces a millisecond; waking a sleeping thread costs. How: one list under a lock, taken over whole
// by the serving thread; the descriptor that wakes the loop is written only when the loop has said that it goes to
// sleep.
//
//   async -> [ready, under the lock] -> [batch, serving thread only] -> run
//   asyncAfter -> [delayed, by deadline and sequence] -> ready, once its moment has come
//   async for a client -> [its WorkLane] -> runLane, when it is the client's turn
//
// Shared by whoever hands work over. Threads: the WorkQueue operations any; the serving operations one thread, always
// the same.
#pragma once

#include <atomic>
#include <cstddef>
#include <optional>
#include <vector>

#include "host/log/LogClient.h"
#include "host/loop/DelayedWork.h"
#include "host/loop/QueueProgress.h"
#include "host/loop/WorkLane.h"
#include "host/loop/WorkOwner.h"
#include "host/system/UniqueDescriptor.h"
#include "platform/Clock.h"
#include "platform/WorkQueue.h"
#include "plist/ThreadSafety.h"

namespace tarn::linux_host {

class ServerQueue final : public platform::WorkQueue {
 public:
  // Both outlive the queue.
  // Makes the wake descriptor; wakeDescriptor() tells whether the system had one.
  ServerQueue(const platform::Clock& clock, QueueProgress& progress);
  ServerQueue(const ServerQueue&) = delete;
  ServerQueue& operator=(const ServerQueue&) = delete;

  // Within a lane's scope on the serving thread the work goes to that lane, else to the list, with the client on whose
  // behalf the caller works. Either way it is done for the session that the caller works for. Takes a lock; writes the
  // wake descriptor when the server sleeps.
  void async(platform::Work work) override;
  // From its moment on the piece is like others of the list, and no client's: it has neither lane nor client, even when
  // a client's work asked for it. It is still the session's that did. Without a delay it is async(). Wakes the server
  // only when it would have slept past the moment.
  void asyncAfter(std::chrono::nanoseconds delay, platform::Work work) override;
  // On the serving thread, while it runs pieces or a lane; so also in a handler that a piece which waits on purpose
  // serves, and not in one of an ordinary turn.
  bool isCurrent() const noexcept override;
  // With the lanes and all that is due. Takes the lock and counts what is due, so it is for reports and not for each
  // request.
  std::size_t waiting() const noexcept override;
  // Charges the lane that is served; true when its turn is over, by its credit or because the pause source says so.
  // Without a lane nothing is charged and nobody need give way: what has no client is short.
  bool spend(std::size_t cost) override;
  // Puts the rest ahead of what its lane holds. Without a lane it is async().
  void asyncNext(platform::Work rest) override;
  // Like waiting() but without the lanes and the delayed pieces that are due and were not looked at yet: one load.
  std::size_t ready() const noexcept { return ready_.load(std::memory_order_relaxed); }

  // Makes the server go through one more turn before it sleeps, although no work came: what a hook or a waiting piece
  // looks at has changed. Threads: any. Several calls before that turn are one.
  void wake();

  // Serving. Runs waiting work in its order, at most `limit` pieces; how many it ran. Work that comes meanwhile is
  // taken in when the batch is empty, so it too runs while the limit isn't reached. Lanes aren't served here.
  std::size_t run(std::size_t limit);
  // Hands `work` over for the client of this lane; serving thread only, no lock, no wake: who schedules the lanes
  // serves it.
  void asyncIn(WorkLane& lane, platform::Work work);
  // Runs the lane's work until there is none or its turn is over. The caller has begun that turn, and set on whose
  // behalf it is. Without credit nothing runs.
  void runLane(WorkLane& lane);
  // Asked where long work could give way: true ends the turn early, because what it makes can't be taken in now. Set
  // once, before anything runs; asked with each spend() of a lane's work, so it must be cheap.
  void setPauseSource(platform::UniqueFunction<bool()> shouldPause) { shouldPause_ = std::move(shouldPause); }
  // Announces that the server will sleep: how long it may (nothing: for ever). From then on new work wakes it, until
  // awake() is called. Zero when there is work or wake() was called: then nothing was announced. Lanes don't count; who
  // has one with work asks for a turn with wake().
  std::optional<std::chrono::nanoseconds> prepareToSleep();
  // The sleep is over, for whatever reason; new work writes no wake-up from here on.
  void awake();
  // Announces a sleep in the middle of a piece of work, which the waiting work doesn't prevent; ended with awake(). Of
  // what comes meanwhile only async() and wake() end it, not a delayed piece. False when wake() was called since the
  // last look around: then nothing was announced.
  bool prepareToWait();
  // Becomes readable when a sleeping server must wake; drained with drainWake(). It stays the queue's. Negative when
  // the system had none left.
  int wakeDescriptor() const noexcept { return wake_.get(); }
  void drainWake() noexcept;

 private:
  struct Piece {
    OwnedWork work;
    LogClient client;  // on whose behalf it was handed over
  };

  // Takes over what has come, with what is due behind it, as the next batch; false when there is nothing. One lock for
  // a whole batch.
  bool refill();
  // Whether the caller must write the wake descriptor after letting go of the lock.
  bool mustWake() noexcept TARN_REQUIRES(mutex_);
  // Without the lock, so that the woken thread doesn't run into it.
  void writeWake() noexcept;

  const platform::Clock& clock_;
  QueueProgress& progress_;
  UniqueDescriptor wake_;

  // Pieces in incoming_ and of batch_ from next_ on. Atomic so that whoever bounds the work asks without the lock.
  std::atomic<std::size_t> ready_{0};
  std::atomic<std::size_t> inLanes_{0};  // written by the serving thread only

  // Serving thread only.
  std::vector<Piece> batch_;
  // Of the batch: the first that wasn't run.
  std::size_t next_ = 0;
  platform::UniqueFunction<bool()> shouldPause_;

  mutable Mutex mutex_;
  std::vector<Piece> incoming_ TARN_GUARDED_BY(mutex_);
  DelayedWork<Piece> delayed_ TARN_GUARDED_BY(mutex_);
  // Between prepareToSleep() and the first wake-up: that clears it, so a burst writes the descriptor once.
  bool sleeping_ TARN_GUARDED_BY(mutex_) = false;
  bool woken_ TARN_GUARDED_BY(mutex_) = false;  // wake() was called and no turn has begun since
  // While asleep: a delayed piece whose moment is later needn't wake anybody.
  std::chrono::nanoseconds sleepsUntil_ TARN_GUARDED_BY(mutex_){};
};

}  // namespace tarn::linux_host
