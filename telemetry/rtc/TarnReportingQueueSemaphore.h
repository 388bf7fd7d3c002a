// SPDX-License-Identifier: Apache-2.0
// TarnReportingQueueSemaphore: a counting semaphore on which a queue waits instead of a thread.
//
// What the waiter would do after its wait it hands over as `then`; its queue is suspended until a signal comes or the
// time is up. A signal that nobody waits for is kept for the next wait.
//
// Owner: whoever waits; it lives until `then` was called. Threads: signal() any, wait() the queue's.
#pragma once

#include <chrono>
#include <cstddef>
#include <memory>

#include "platform/UniqueFunction.h"
#include "platform/WorkQueue.h"
#include "plist/ThreadSafety.h"

namespace tarn {

// For one waiter at a time.
class TarnReportingQueueSemaphore {
 public:
  // Whether a signal came in time.
  using Then = platform::UniqueFunction<void(bool signalled)>;

  TarnReportingQueueSemaphore() = default;
  TarnReportingQueueSemaphore(const TarnReportingQueueSemaphore&) = delete;
  TarnReportingQueueSemaphore& operator=(const TarnReportingQueueSemaphore&) = delete;

  // Counts: two signals serve two waits.
  void signal();
  // By work of `queue`, as the last thing it does. `then` runs on the queue, ahead of all that waits there: at once
  // when there is a signal, else when one comes or `longest` has passed. A signal that comes while the time runs out
  // counts as one in time.
  void wait(const std::shared_ptr<platform::SuspendableQueue>& queue, std::chrono::nanoseconds longest, Then then);

 private:
  // Ends the waiting, and takes a signal if there is one.
  bool take();

  Mutex mutex_;
  std::size_t count_ TARN_GUARDED_BY(mutex_) = 0;
  std::shared_ptr<platform::SuspendableQueue> waiter_ TARN_GUARDED_BY(mutex_);
};

}  // namespace tarn
