// SPDX-License-Identifier: Apache-2.0
#include "host/loop/LinuxWorkQueues.h"

#include "host/loop/CurrentQueue.h"

namespace tarn::linux_host {

namespace {

// What a holder of a queue holds: the way into the queue's line. The line itself lives on while it has work.
class PooledQueue final : public platform::SuspendableQueue {
 public:
  explicit PooledQueue(std::shared_ptr<WorkerPool> pool) : pool_(std::move(pool)) {}
  void async(platform::Work work) override { pool_->add(line_, std::move(work)); }
  void asyncAtOnce(platform::Work work) override { pool_->add(line_, std::move(work), WorkerPool::Urgency::AtOnce); }
  void asyncAfter(std::chrono::nanoseconds delay, platform::Work work) override {
    pool_->addAfter(line_, delay, std::move(work));
  }
  bool isCurrent() const noexcept override { return CurrentQueue::is(line_.get()); }
  std::size_t waiting() const noexcept override { return line_->waiting.load(std::memory_order_relaxed); }
  void suspend(std::chrono::nanoseconds longest, platform::Work next) override {
    pool_->suspend(line_, longest, std::move(next));
  }
  void resume() override { pool_->resume(line_); }
  void help(std::chrono::nanoseconds longest) override { pool_->help(line_, longest); }

 private:
  std::shared_ptr<WorkerPool> pool_;
  std::shared_ptr<WorkerPool::Line> line_ = std::make_shared<WorkerPool::Line>();
};

}  // namespace

LinuxWorkQueues::LinuxWorkQueues(const platform::Clock& clock, std::shared_ptr<platform::WorkQueue> serverQueue,
                                 WorkerPool::Marks marks)
    : serverQueue_(std::move(serverQueue)), pool_(std::make_shared<WorkerPool>(clock, marks)) {}

LinuxWorkQueues::~LinuxWorkQueues() {
  pool_->stop();
}

std::shared_ptr<platform::WorkQueue> LinuxWorkQueues::makeSerialQueue(std::string_view name,
                                                                      platform::QualityOfService quality) {
  // By name alone: a worker's own queue must never be the one that the worker blocks.
  if (name == kServerQueueName) return serverQueue_;
  return makeSuspendableQueue(name, quality);
}

std::shared_ptr<platform::SuspendableQueue> LinuxWorkQueues::makeSuspendableQueue(std::string_view,
                                                                                  platform::QualityOfService) {
  static_cast<void>(pool_->start(kThreads));
  return std::make_shared<PooledQueue>(pool_);
}

}  // namespace tarn::linux_host
