// SPDX-License-Identifier: Apache-2.0
#include "recorder/LateReplies.h"

namespace tarn::recorder {

void LateReplies::close() {
  std::list<platform::Work> dropped;  // destroyed after the lock: each may hold the last of something
  const MutexLock lock(line_->mutex);
  line_->closed = true;
  dropped.swap(line_->waiting);
  while (line_->answering) {
    line_->answered.wait(line_->mutex);
  }
}

void LateReplies::enqueue(platform::Work reply) {
  if (!queue_) {
    queue_ = workQueues_.makeSerialQueue(manner_.queueName, platform::QualityOfService::Utility);
  }
  line_->waiting.push_back(std::move(reply));
  const auto answer = [line = line_] { line->answerNext(); };
  try {
    if (manner_.delay == std::chrono::nanoseconds::zero()) {
      queue_->async(answer);
    } else {
      queue_->asyncAfter(manner_.delay, answer);
    }
  } catch (...) {
    line_->waiting.pop_back();
    throw;
  }
}

// All are equally late, so the first that waits is the one whose turn it is.
void LateReplies::Line::answerNext() {
  platform::Work reply;
  {
    const MutexLock lock(mutex);
    if (waiting.empty()) return;
    reply = std::move(waiting.front());
    waiting.pop_front();
    answering = true;
  }
  // Whoever closes waits for this one, also when it fails.
  struct Answering {
    Line& line;
    ~Answering() {
      const MutexLock lock(line.mutex);
      line.answering = false;
      line.answered.notifyAll();
    }
  };
  const Answering thisOne{*this};
  platform::Work called = std::move(reply);  // is gone before the wait is over
  called();
}

}  // namespace tarn::recorder
