// SPDX-License-Identifier: Apache-2.0
// Watchdog: tells the service manager, when it asks for that, that the server queue is alive. A queue that hangs, or
// that works on and on and lets nobody else have a turn, gets no ping, and the manager restarts the service.
//
// Owned by the platform. start() makes a thread of its own, so that a busy queue can be told from a hung one.
//
// The thread does nothing but sleep, look and send one datagram. That a wait and a sleep count as alive is the point:
// what the service waits for isn't its own hang.
#pragma once

#include <chrono>
#include <thread>

#include "host/loop/QueueProgress.h"
#include "host/loop/ServiceManager.h"
#include "platform/Clock.h"
#include "plist/ThreadSafety.h"

namespace tarn::linux_host {

// The longest that work may block the queue on purpose, and what its end may take to be seen.
inline constexpr std::chrono::nanoseconds kLongestDeliberateWait = std::chrono::seconds(180 + 5);

// The longest that work may go on without a turn of the main loop, in which all others are looked at. The costliest
// single request is a matter of seconds and gives way as it goes on, so this is work that runs away.
inline constexpr std::chrono::nanoseconds kLongestTurn = std::chrono::seconds(60);

// Whether the queue is alive: it did something since the sample before, has nothing to do, or waits on purpose and not
// yet too long.
bool queueIsAlive(const QueueProgress::Sample& before, const QueueProgress::Sample& now,
                  std::chrono::nanoseconds monotonicNow) noexcept;
// Whether the queue lets others have their turn: there was one, nothing to do, or a deliberate wait (which serves the
// sockets) not longer ago than the longest turn.
bool othersHaveTurns(std::chrono::nanoseconds lastTurn, std::chrono::nanoseconds monotonicNow) noexcept;

class Watchdog {
 public:
  // All outlive the watchdog. No thread is made before start().
  Watchdog(const platform::Clock& clock, const QueueProgress& progress, ServiceManager& manager);
  Watchdog(const Watchdog&) = delete;
  Watchdog& operator=(const Watchdog&) = delete;
  ~Watchdog() { stop(); }

  // Pings at half the manager's interval while the queue is alive, so that one late look costs no restart. Does nothing
  // when the manager didn't ask, or when it runs already.
  void start();
  // Ends the thread and waits for it; the look that it is in is finished first. It doesn't start again.
  void stop();
  // One look at the queue, with a ping when it is alive. Whether it was. The thread's own step; tests call it without
  // the thread. The first look has nothing to compare with: it takes a queue that has made a step since its making for
  // alive.
  bool check();

 private:
  // The thread: a look each `period`, until stop().
  void serve(std::chrono::microseconds period);

  const platform::Clock& clock_;
  const QueueProgress& progress_;
  ServiceManager& manager_;
  // Of the thread alone from start() on, so without the lock.
  QueueProgress::Sample before_;                      // of the last look
  std::optional<std::chrono::nanoseconds> lastTurn_;  // by what the looks saw
  // For stopping_ alone; not held during a look.
  Mutex mutex_;
  ConditionVariable changed_;
  bool stopping_ TARN_GUARDED_BY(mutex_) = false;
  // Only when the manager asked.
  std::thread thread_;
};

}  // namespace tarn::linux_host
