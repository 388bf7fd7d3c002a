// SPDX-License-Identifier: Apache-2.0
#include "testing/backends/ReplyFaults.h"

#include <utility>

namespace tarn::testing {

ReplyFaults::~ReplyFaults() {
  joinThreads();
}

void ReplyFaults::deliver(platform::Work reply) {
  std::unique_lock lock(mutex_);
  switch (fault_) {
    case ReplyFault::None:
      lock.unlock();
      reply();
      break;
    case ReplyFault::Drop:
      lock.unlock();
      reply.reset();
      break;
    case ReplyFault::Hold:
      held_.push_back(std::move(reply));
      break;
    case ReplyFault::Delay: {
      const auto queue = delayQueue_;
      const auto delay = delay_;
      lock.unlock();
      queue->asyncAfter(delay, std::move(reply));
      break;
    }
    case ReplyFault::Twice:
      lock.unlock();
      reply();
      reply();
      break;
    case ReplyFault::OtherThread:
      threads_.emplace_back([reply = std::move(reply)]() mutable { reply(); });
      break;
  }
}

void ReplyFaults::set(ReplyFault fault) {
  const std::lock_guard lock(mutex_);
  fault_ = fault;
}

void ReplyFaults::delayOn(std::shared_ptr<platform::WorkQueue> queue, std::chrono::nanoseconds delay) {
  const std::lock_guard lock(mutex_);
  delayQueue_ = std::move(queue);
  delay_ = delay;
  fault_ = ReplyFault::Delay;
}

std::size_t ReplyFaults::deliverHeld() {
  std::deque<platform::Work> replies;
  {
    const std::lock_guard lock(mutex_);
    replies.swap(held_);
  }
  for (auto& reply : replies) {
    reply();
  }
  return replies.size();
}

void ReplyFaults::joinThreads() {
  std::vector<std::thread> threads;
  {
    const std::lock_guard lock(mutex_);
    threads.swap(threads_);
  }
  for (auto& thread : threads) {
    thread.join();
  }
}

void ReplyFaults::dropAll() {
  joinThreads();
  std::deque<platform::Work> replies;  // destroyed after the lock: a handler may have the last of something
  const std::lock_guard lock(mutex_);
  replies.swap(held_);
}

std::size_t ReplyFaults::held() const {
  const std::lock_guard lock(mutex_);
  return held_.size();
}

}  // namespace tarn::testing
