// SPDX-License-Identifier: Apache-2.0
#include "telemetry/rtc/TarnReportingQueueSemaphore.h"

#include <utility>

namespace tarn {

void TarnReportingQueueSemaphore::signal() {
  const MutexLock lock(mutex_);
  ++count_;
  if (waiter_) {
    waiter_->resume();
  }
}

void TarnReportingQueueSemaphore::wait(const std::shared_ptr<platform::SuspendableQueue>& queue,
                                       std::chrono::nanoseconds longest, Then then) {
  {
    const MutexLock lock(mutex_);
    if (count_ == 0) {
      waiter_ = queue;
      // Under the lock: a signal from now on finds the queue suspended.
      queue->suspend(longest, [this, then = std::move(then)]() mutable { then(take()); });
      return;
    }
    --count_;
  }
  then(true);
}

// A signal that came while the time ran out counts as one in time.
bool TarnReportingQueueSemaphore::take() {
  const MutexLock lock(mutex_);
  waiter_.reset();
  if (count_ == 0) return false;
  --count_;
  return true;
}

}  // namespace tarn
