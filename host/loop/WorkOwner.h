// SPDX-License-Identifier: Apache-2.0
// WorkOwner: for which session the calling thread works now, so that what it hands over to a back-end is known as that
// session's. Sessions enter themselves; work that they hand over to a queue, or put off, goes on for them: the queues
// note the number with each piece and enter it while the piece runs, so workers and back-ends needn't think of it.
//
// Threads: each has its own. A load or a store; a number beside each piece of work that waits.
#pragma once

#include <utility>

#include "platform/SessionRecords.h"
#include "platform/WorkQueue.h"

namespace tarn::linux_host {

class WorkOwner {
 public:
  // While it lives the thread works for this session; 0: for none. Scopes nest: at the end the one before holds again.
  explicit WorkOwner(platform::SessionNumber session) noexcept : previous_(enter(session)) {}
  WorkOwner(const WorkOwner&) = delete;
  WorkOwner& operator=(const WorkOwner&) = delete;
  ~WorkOwner() { current_ = previous_; }

  // 0 on a thread that works for no session.
  static platform::SessionNumber current() noexcept { return current_; }
  // Until the next call; what held before.
  static platform::SessionNumber enter(platform::SessionNumber session) noexcept {
    return std::exchange(current_, session);
  }

 private:
  static inline thread_local platform::SessionNumber current_ = 0;
  const platform::SessionNumber previous_;
};

// A piece of work that waits, and whose it is.
struct OwnedWork {
  // No work.
  OwnedWork() = default;
  // Work of whoever hands it over.
  explicit OwnedWork(platform::Work&& handedOver) noexcept : work(std::move(handedOver)), owner(WorkOwner::current()) {}

  platform::Work work;
  platform::SessionNumber owner = 0;

  // Only when there is some.
  void operator()() {
    const WorkOwner scope(owner);
    work();
  }
};

}  // namespace tarn::linux_host
