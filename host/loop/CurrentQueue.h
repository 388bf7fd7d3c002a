// CurrentQueue: which serial queue's work the calling thread runs now. Used by the queues alone.
#pragma once

#include <utility>

namespace tarn::linux_host {

class CurrentQueue {
 public:
  // While it lives the thread runs work of the queue that `queue` stands for.
  explicit CurrentQueue(const void* queue) noexcept : previous_(std::exchange(current_, queue)) {}
  CurrentQueue(const CurrentQueue&) = delete;
  CurrentQueue& operator=(const CurrentQueue&) = delete;
  ~CurrentQueue() { current_ = previous_; }

  static bool is(const void* queue) noexcept { return current_ == queue; }

 private:
  static inline thread_local const void* current_ = nullptr;
  const void* previous_;
};

}  // namespace tarn::linux_host
