#include "recorder/LateReplies.h"

namespace tarn::recorder {

void LateReplies::close() {
  std::deque<platform::Work> dropped;  // destroyed after the lock: each may hold the last of something
  std::unique_lock lock(line_->mutex);
  line_->closed = true;
  dropped.swap(line_->waiting);
  line_->answered.wait(lock, [this] { return !line_->answering; });
  lock.unlock();
}

// Called under the lock.
void LateReplies::enqueue(platform::Work reply) {
  if (!queue_) queue_ = workQueues_.makeSerialQueue(manner_.queueName, platform::QualityOfService::Utility);
  line_->waiting.push_back(std::move(reply));
  const auto answer = [line = line_] { line->answerNext(); };
  if (manner_.delay == std::chrono::nanoseconds::zero()) {
    queue_->async(answer);
  } else {
    queue_->asyncAfter(manner_.delay, answer);
  }
}

// All are equally late, so the first that waits is the one whose turn it is.
void LateReplies::Line::answerNext() {
  std::unique_lock lock(mutex);
  if (waiting.empty()) return;
  platform::Work reply = std::move(waiting.front());
  waiting.pop_front();
  answering = true;
  lock.unlock();
  reply();
  reply.reset();
  lock.lock();
  answering = false;
  answered.notify_all();
}

}  // namespace tarn::recorder
