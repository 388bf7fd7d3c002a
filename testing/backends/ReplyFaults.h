// SPDX-License-Identifier: Apache-2.0
// ReplyFaults: how a fake back-end delivers its replies. The one place where replies go wrong on purpose.
//
// A fake hands each reply to deliver(), which calls it as the switch says. Held replies are destroyed with this object;
// threads are joined first.
//
// Threads: any.
#pragma once

#include <chrono>
#include <cstddef>
#include <deque>
#include <memory>
#include <mutex>
#include <thread>
#include <vector>

#include "platform/WorkQueue.h"

namespace tarn::testing {

enum class ReplyFault {
  None,         // at once, on the caller's thread, inside the request
  Drop,         // never; the handler is destroyed
  Hold,         // when the test calls deliverHeld(), be it after the asker's deadline or its end
  Delay,        // on the queue and after the time of delayOn()
  Twice,        // two times, one after the other
  OtherThread,  // on a new thread, while the caller goes on
};

class ReplyFaults {
 public:
  ReplyFaults() = default;
  ~ReplyFaults();
  ReplyFaults(const ReplyFaults&) = delete;
  ReplyFaults& operator=(const ReplyFaults&) = delete;

  // For the fakes.
  void deliver(platform::Work reply);

  // Controls.
  void set(ReplyFault fault);
  // Sets ReplyFault::Delay with the queue and the time.
  void delayOn(std::shared_ptr<platform::WorkQueue> queue, std::chrono::nanoseconds delay);
  // Calls the held replies on this thread, in order; how many there were.
  std::size_t deliverHeld();
  // Waits for the threads of ReplyFault::OtherThread. Not to be called by a reply.
  void joinThreads();
  // Waits for the threads, and destroys the held replies uncalled.
  void dropAll();

  // Observations.
  std::size_t held() const;

 private:
  mutable std::mutex mutex_;
  ReplyFault fault_ = ReplyFault::None;
  std::shared_ptr<platform::WorkQueue> delayQueue_;
  std::chrono::nanoseconds delay_{};
  std::deque<platform::Work> held_;
  std::vector<std::thread> threads_;
};

}  // namespace tarn::testing
