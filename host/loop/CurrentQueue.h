// SPDX-License-Identifier: Apache-2.0
// CurrentQueue: which serial queue's work the calling thread runs now: what `isCurrent()` of a queue answers, and with
// it the check that bound operations are called on their queue. Used by the queues alone.
//
// Threads: each has its own; it costs a store on the way in and out of a queue's turn.
#pragma once

#include <utility>

namespace tarn::linux_host {

class CurrentQueue {
 public:
  // While it lives the thread runs work of the queue that `queue` stands for: any address that the queue calls its own,
  // never looked into. Scopes nest, as a thread that waits on one queue may help another; the one before holds again at
  // the end.
  explicit CurrentQueue(const void* queue) noexcept : previous_(std::exchange(current_, queue)) {}
  CurrentQueue(const CurrentQueue&) = delete;
  CurrentQueue& operator=(const CurrentQueue&) = delete;
  ~CurrentQueue() { current_ = previous_; }

  // False on a thread that runs no queue's work.
  static bool is(const void* queue) noexcept { return current_ == queue; }

 private:
  // Null while the thread runs no queue's work.
  static inline thread_local const void* current_ = nullptr;
  const void* previous_;
};

}  // namespace tarn::linux_host
