#include "host/loop/Deadline.h"

#include <utility>

namespace tarn::linux_host {

void Deadline::start(std::chrono::milliseconds after, platform::UniqueFunction<void()> isOver) {
  thread_ = std::thread([this, after, isOver = std::move(isOver)]() mutable {
    bool cancelled = false;
    {
      const MutexLock lock(mutex_);
      cancelled = changed_.waitFor(mutex_, after, [this]() TARN_REQUIRES(mutex_) { return cancelled_; });
    }
    if (!cancelled) {
      isOver();
    }
  });
}

void Deadline::cancel() {
  {
    const MutexLock lock(mutex_);
    cancelled_ = true;
  }
  changed_.notifyAll();
  if (thread_.joinable()) {
    thread_.join();
  }
}

}  // namespace tarn::linux_host
