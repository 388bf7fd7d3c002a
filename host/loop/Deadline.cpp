// SPDX-License-Identifier: Apache-2.0
#include "host/loop/Deadline.h"

#include <utility>

namespace tarn::linux_host {

void Deadline::prepare(platform::UniqueFunction<void()> isOver) {
  isOver_ = std::move(isOver);
  thread_ = std::thread([this] { run(); });
}

void Deadline::start(std::chrono::milliseconds after) {
  const MutexLock lock(mutex_);
  after_ = after;
  started_ = true;
  changed_.notifyAll();
}

void Deadline::run() {
  {
    const MutexLock lock(mutex_);
    changed_.wait(mutex_, [this]() TARN_REQUIRES(mutex_) { return started_ || cancelled_; });
    if (changed_.waitFor(mutex_, after_, [this]() TARN_REQUIRES(mutex_) { return cancelled_; })) return;
  }
  isOver_();
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
