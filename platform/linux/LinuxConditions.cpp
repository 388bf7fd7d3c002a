#include "platform/linux/LinuxConditions.h"

#include <condition_variable>
#include <mutex>

namespace tarn::linux_host {

namespace {

using Seconds = std::chrono::duration<double>;

// Longer than anybody waits and short enough for the system's clock.
constexpr Seconds kLongestWait{86400.0 * 365};

// What is not above zero, not-a-number included, does not wait.
std::chrono::nanoseconds held(Seconds timeout) {
  if (!(timeout > Seconds::zero())) {
    return std::chrono::nanoseconds::zero();
  }
  return std::chrono::duration_cast<std::chrono::nanoseconds>(timeout < kLongestWait ? timeout : kLongestWait);
}

class LinuxCondition final : public platform::Condition {
 public:
  LinuxCondition(const platform::Clock& clock, std::shared_ptr<platform::WorkQueue> serverQueue,
                 QueueProgress& progress)
      : clock_(clock), serverQueue_(std::move(serverQueue)), progress_(progress) {}

  void lock() override { mutex_.lock(); }
  void unlock() override { mutex_.unlock(); }
  void signal() override { condition_.notify_one(); }

  bool waitFor(Seconds timeout) override {
    const bool watched = serverQueue_->isCurrent();
    if (watched) {
      progress_.beginWait(clock_.monotonic());
    }
    std::unique_lock lock(mutex_, std::adopt_lock);
    const bool signalled = condition_.wait_for(lock, held(timeout)) == std::cv_status::no_timeout;
    lock.release();
    if (watched) {
      progress_.endWait();
    }
    return signalled;
  }

 private:
  const platform::Clock& clock_;
  std::shared_ptr<platform::WorkQueue> serverQueue_;
  QueueProgress& progress_;
  std::mutex mutex_;
  std::condition_variable condition_;
};

}  // namespace

LinuxConditions::LinuxConditions(const platform::Clock& clock, std::shared_ptr<platform::WorkQueue> serverQueue,
                                 QueueProgress& progress)
    : clock_(clock), serverQueue_(std::move(serverQueue)), progress_(progress) {}

std::shared_ptr<platform::Condition> LinuxConditions::makeCondition() {
  return std::make_shared<LinuxCondition>(clock_, serverQueue_, progress_);
}

std::shared_ptr<void> LinuxConditions::blockOnPurpose() {
  if (!serverQueue_->isCurrent()) {
    return nullptr;
  }
  progress_.beginWait(clock_.monotonic());
  return {&progress_, [](QueueProgress* progress) { progress->endWait(); }};
}

}  // namespace tarn::linux_host
