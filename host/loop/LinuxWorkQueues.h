// SPDX-License-Identifier: Apache-2.0
// LinuxWorkQueues: makes the serial queues of the process. The reporting server queue is the main loop's own; all
// others share a small pool of threads, which are all alike: the quality of service that is asked for isn't used.
//
// What waits on the pool's queues is bounded by whoever takes work in from outside: it stops while isFull() is true and
// goes on when the room handler is called.
//
// Owned by the platform; the queues that it made may outlive it, but then run nothing more. Threads: any.
#pragma once

#include <memory>

#include "host/loop/WorkerPool.h"
#include "platform/Clock.h"
#include "platform/WorkQueue.h"

namespace tarn::linux_host {

class LinuxWorkQueues final : public platform::WorkQueues {
 public:
  // Enough for the few queues that block now and then (two tools at once) not to hold up the others. A queue that waits
  // for a back-end is suspended and holds none.
  static constexpr std::size_t kThreads = 4;
  // Who asks for a queue of this name gets the server queue, each time the same one; every other name makes a new
  // queue.
  static constexpr std::string_view kServerQueueName = "sys.oxbow.tarnkit.reporting.server";

  // The clock outlives the pool, and with it the queues. Makes no thread.
  LinuxWorkQueues(const platform::Clock& clock, std::shared_ptr<platform::WorkQueue> serverQueue,
                  WorkerPool::Marks marks = {});
  LinuxWorkQueues(const LinuxWorkQueues&) = delete;
  LinuxWorkQueues& operator=(const LinuxWorkQueues&) = delete;
  // Runs what is ready on the pool's queues, then ends the threads.
  ~LinuxWorkQueues() override;

  // Starts the threads before the first queue needs them. False when the system has none to give.
  [[nodiscard]] bool start() { return pool_->start(kThreads); }

  // Without start() the threads are started with the first queue that needs them.
  std::shared_ptr<platform::WorkQueue> makeSerialQueue(std::string_view name,
                                                       platform::QualityOfService quality) override;
  std::shared_ptr<platform::SuspendableQueue> makeSuspendableQueue(std::string_view name,
                                                                   platform::QualityOfService quality) override;

  // Of the pool's queues; see WorkerPool. The server queue's own work isn't in these.
  void setRoomHandler(WorkerPool::RoomHandler handler) { pool_->setRoomHandler(std::move(handler)); }
  bool isFull() const noexcept { return pool_->isFull(); }
  bool isCrowded(std::size_t most) noexcept { return pool_->isCrowded(most); }
  std::size_t unfinished() const { return pool_->unfinished(); }
  void afterWhatIsUnfinished(platform::Work done) { pool_->afterWhatIsUnfinished(std::move(done)); }
  [[nodiscard]] bool settle(std::chrono::nanoseconds longest) { return pool_->settle(longest); }

 private:
  // Handed out by name; made and served by the main loop.
  std::shared_ptr<platform::WorkQueue> serverQueue_;
  // Shared with the queues, which may outlive this.
  std::shared_ptr<WorkerPool> pool_;
};

}  // namespace tarn::linux_host
