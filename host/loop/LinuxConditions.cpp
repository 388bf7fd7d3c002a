// SPDX-License-Identifier: Apache-2.0
#include "host/loop/LinuxConditions.h"

#include <algorithm>
#include <atomic>
#include <condition_variable>
#include <mutex>

namespace tarn::linux_host {

namespace {

using Seconds = std::chrono::duration<double>;

// Longer than anybody waits and short enough for the system's clock.
constexpr Seconds kLongestWait{86400.0 * 365};

// What is not above zero, not-a-number included, does not wait.
std::chrono::nanoseconds held(Seconds timeout) {
  if (!(timeout > Seconds::zero())) return std::chrono::nanoseconds::zero();
  return std::chrono::duration_cast<std::chrono::nanoseconds>(timeout < kLongestWait ? timeout : kLongestWait);
}

class LinuxCondition final : public platform::Condition {
 public:
  explicit LinuxCondition(MainLoop& loop) : loop_(loop), serverQueue_(loop.queue()) {}

  void lock() override { mutex_.lock(); }
  void unlock() override { mutex_.unlock(); }

  void signal() override {
    ++signals_;
    condition_.notify_one();
    serverQueue_->wake();
  }

  bool waitFor(Seconds timeout) override {
    std::unique_lock lock(mutex_, std::adopt_lock);
    const bool signalled = serverQueue_->isCurrent()
                               ? waitOnServerQueue(lock, held(timeout))
                               : condition_.wait_for(lock, held(timeout)) == std::cv_status::no_timeout;
    lock.release();
    return signalled;
  }

 private:
  bool waitOnServerQueue(std::unique_lock<std::mutex>& lock, std::chrono::nanoseconds timeout) {
    const platform::Clock& clock = loop_.clock();
    const auto begin = clock.monotonic();
    const auto deadline = begin + timeout;
    const auto isSignalled = [this, before = signals_.load()] { return signals_ != before; };
    loop_.progress().beginWait(begin);
    lock.unlock();
    loop_.waitUntil(deadline, isSignalled);
    lock.lock();
    // What is left when the loop serves no more.
    const auto left = std::max(deadline - clock.monotonic(), std::chrono::nanoseconds::zero());
    const bool signalled = condition_.wait_for(lock, left, isSignalled);
    loop_.progress().endWait();
    return signalled;
  }

  MainLoop& loop_;
  const std::shared_ptr<ServerQueue> serverQueue_;  // a back-end may signal after the loop's end
  std::mutex mutex_;
  std::condition_variable condition_;
  std::atomic<std::uint64_t> signals_{0};
};

}  // namespace

std::shared_ptr<platform::Condition> LinuxConditions::makeCondition() {
  return std::make_shared<LinuxCondition>(loop_);
}

std::shared_ptr<void> LinuxConditions::blockOnPurpose() {
  if (!loop_.queue()->isCurrent()) return nullptr;
  loop_.progress().beginWait(loop_.clock().monotonic());
  return {&loop_.progress(), [](QueueProgress* progress) { progress->endWait(); }};
}

}  // namespace tarn::linux_host
