// SPDX-License-Identifier: Apache-2.0
// LateReplies: the replies of a stand-in that come after the call that asked for them: one by one, in the order of the
// calls, as work of a queue of their own, each once its delay has passed.
//
// What waits is bounded: whoever adds is told when there is no room. At the end of the process what is due still comes,
// as does all work of such queues; when this object ends earlier, what waits comes all the same, unless close() was
// called.
//
// Owned by a stand-in. Threads: any; replies on the queue, which is made by the first reply.
//
// A reply that is destroyed uncalled means to who waits for it that none will come. Costs one piece of work and one
// place in a line each; the queue and its thread aren't there before the first.
#pragma once

#include <chrono>
#include <cstddef>
#include <list>
#include <memory>
#include <string_view>
#include <utility>

#include "platform/WorkQueue.h"
#include "plist/ThreadSafety.h"

namespace tarn::recorder {

class LateReplies {
 public:
  // How one stand-in answers.
  struct Manner {
    std::string_view queueName;  // a text that lives for ever
    std::size_t most = 1024;     // replies that may wait at once
    std::chrono::nanoseconds delay{0};
  };

  // The work queues outlive this. Makes no queue yet.
  LateReplies(platform::WorkQueues& workQueues, const Manner& manner) : workQueues_(workQueues), manner_(manner) {}
  LateReplies(const LateReplies&) = delete;
  LateReplies& operator=(const LateReplies&) = delete;
  ~LateReplies() = default;

  // Whether the reply will come; one that won't, because it is closed or too many wait, is still the caller's, who may
  // answer at once. Nothing waits here.
  [[nodiscard]] bool add(platform::Work&& reply) {
    return add(std::move(reply), [] {});
  }
  // The same; `taken` is called when the reply will come, and before it comes: for what must be recorded first. It runs
  // under the lock, so it mustn't come back here.
  template <class Action>
  [[nodiscard]] bool add(platform::Work&& reply, Action taken) {
    const MutexLock lock(line_->mutex);
    if (line_->closed || line_->waiting.size() >= manner_.most) return false;
    enqueue(std::move(reply));
    // It comes after this, as it takes the lock.
    try {
      taken();
    } catch (...) {
      line_->waiting.pop_back();
      throw;
    }
    return true;
  }
  // Calls `action` unless it is closed; close() waits for that.
  template <class Action>
  void ifOpen(Action action) {
    const MutexLock lock(line_->mutex);
    if (!line_->closed) {
      action();
    }
  }
  // Takes no more, destroys what waits and waits for the reply that is under way. Not to be called by a reply. Safe a
  // second time.
  void close();

 private:
  // Shared with the work on the queue, which may run after this object's end.
  struct Line {
    // The queue's work: calls the reply that has waited longest, if close() has left any.
    void answerNext();

    // Held while a reply is taken out, not while it runs.
    Mutex mutex;
    ConditionVariable answered;
    std::list<platform::Work> waiting TARN_GUARDED_BY(mutex);
    bool answering TARN_GUARDED_BY(mutex) = false;
    bool closed TARN_GUARDED_BY(mutex) = false;
  };

  // Without the memory for it nothing has changed.
  void enqueue(platform::Work reply) TARN_REQUIRES(line_->mutex);

  platform::WorkQueues& workQueues_;
  const Manner manner_;
  // The replies that wait; what is on the queue holds it, so it may outlive this.
  const std::shared_ptr<Line> line_ = std::make_shared<Line>();
  // Serial, so replies come one by one.
  std::shared_ptr<platform::WorkQueue> queue_ TARN_GUARDED_BY(line_->mutex);
};

}  // namespace tarn::recorder
