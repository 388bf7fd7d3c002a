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
#include "host/system/UniqueDescriptor.h"
#include "platform/Clock.h"
#include "platform/WorkQueue.h"
#include "plist/ThreadSafety.h"

namespace tarn::linux_host {

class ServerQueue final : public platform::WorkQueue {
 public:
  // Both outlive the queue.
  ServerQueue(const platform::Clock& clock, QueueProgress& progress);
  ServerQueue(const ServerQueue&) = delete;
  ServerQueue& operator=(const ServerQueue&) = delete;

  void async(platform::Work work) override;
  void asyncAfter(std::chrono::nanoseconds delay, platform::Work work) override;
  bool isCurrent() const noexcept override;
  std::size_t waiting() const noexcept override;
  bool spend(std::size_t cost) override;
  void asyncNext(platform::Work rest) override;
  // Like waiting() but without the lanes and the delayed pieces that are due and were not looked at yet: one load.
  std::size_t ready() const noexcept { return ready_.load(std::memory_order_relaxed); }

  // Makes the server go through one more turn before it sleeps, although no work came. Threads: any.
  void wake();

  // Serving. Runs waiting work, at most `limit` pieces; how many it ran.
  std::size_t run(std::size_t limit);
  // Hands `work` over for the client of this lane. Runs the lane's work until there is none or its turn is over.
  void asyncIn(WorkLane& lane, platform::Work work);
  void runLane(WorkLane& lane);
  // Asked where long work could give way: true ends the turn early, because what it makes can't be taken in now.
  void setPauseSource(platform::UniqueFunction<bool()> shouldPause) { shouldPause_ = std::move(shouldPause); }
  // Announces that the server will sleep: how long it may (nothing: for ever). From then on new work wakes it, until
  // awake() is called. Zero when there is work: then nothing was announced.
  std::optional<std::chrono::nanoseconds> prepareToSleep();
  void awake();
  // Announces a sleep in the middle of a piece of work, which the waiting work doesn't prevent; ended with awake().
  // False when wake() was called since the last look around: then nothing was announced.
  bool prepareToWait();
  // Becomes readable when a sleeping server must wake; drained with drainWake(). Negative when the system had none
  // left.
  int wakeDescriptor() const noexcept { return wake_.get(); }
  void drainWake() noexcept;

 private:
  struct Piece {
    platform::Work work;
    LogClient client;  // on whose behalf it was handed over
  };

  bool refill();
  // Whether the caller must write the wake descriptor after letting go of the lock.
  bool mustWake() noexcept TARN_REQUIRES(mutex_);
  void writeWake() noexcept;

  const platform::Clock& clock_;
  QueueProgress& progress_;
  UniqueDescriptor wake_;

  std::atomic<std::size_t> ready_{0};
  std::atomic<std::size_t> inLanes_{0};  // written by the serving thread only

  // Serving thread only.
  std::vector<Piece> batch_;
  std::size_t next_ = 0;
  platform::UniqueFunction<bool()> shouldPause_;

  mutable Mutex mutex_;
  std::vector<Piece> incoming_ TARN_GUARDED_BY(mutex_);
  DelayedWork<Piece> delayed_ TARN_GUARDED_BY(mutex_);
  bool sleeping_ TARN_GUARDED_BY(mutex_) = false;
  bool woken_ TARN_GUARDED_BY(mutex_) = false;  // wake() was called and no turn has begun since
  std::chrono::nanoseconds sleepsUntil_ TARN_GUARDED_BY(mutex_){};
};

}  // namespace tarn::linux_host
