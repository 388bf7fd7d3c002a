// WorkerPool: the few threads that run all serial queues but the server queue.
//
// A queue is either idle, or stands once in the pool's line, or is run by one thread: so its work never overlaps and
// keeps its order, whichever thread runs it. A thread runs a handful of pieces of one queue, then the queue goes to the
// end of the line. Delayed work is kept by the pool and handed to its queue at its moment.
//
// Owned by LinuxWorkQueues; queues hold it too, as they may outlive that. Threads: any.
#pragma once

#include <chrono>
#include <condition_variable>
#include <cstddef>
#include <deque>
#include <memory>
#include <mutex>
#include <string>
#include <string_view>
#include <thread>
#include <utility>
#include <vector>

#include "platform/Clock.h"
#include "platform/WorkQueue.h"
#include "platform/linux/DelayedWork.h"

namespace tarn::linux_host {

class WorkerPool {
 public:
  // The state of one queue. Lives as long as the queue or work for it.
  struct Line {
    std::deque<platform::Work> work;
    bool scheduled = false;  // stands in the pool's line or is being run
  };

  // The clock outlives the pool.
  explicit WorkerPool(const platform::Clock& clock) : clock_(clock) {}
  WorkerPool(const WorkerPool&) = delete;
  WorkerPool& operator=(const WorkerPool&) = delete;
  ~WorkerPool() { stop(); }

  // Starts the threads, once; later calls do nothing. A system that has no more threads to give ends the process.
  void start(std::size_t threads);
  // Runs what is ready, then ends the threads. Delayed work whose moment has not come is not run, nor is what comes
  // later.
  void stop();

  void add(const std::shared_ptr<Line>& line, platform::Work work);
  void addAfter(const std::shared_ptr<Line>& line, std::chrono::nanoseconds delay, platform::Work work);
  // Pieces handed over to the line and not yet begun.
  std::size_t waiting(const std::shared_ptr<Line>& line) const;

 private:
  using Delayed = std::pair<std::shared_ptr<Line>, platform::Work>;

  void serve();
  // Under the lock.
  void enqueue(const std::shared_ptr<Line>& line, platform::Work work);
  void takeDue();
  void sleep(std::unique_lock<std::mutex>& lock);
  void runSome(const std::shared_ptr<Line>& line, std::unique_lock<std::mutex>& lock);

  const platform::Clock& clock_;
  mutable std::mutex mutex_;  // guards what follows, the lines included
  std::condition_variable changed_;
  std::deque<std::shared_ptr<Line>> runnable_;
  DelayedWork<Delayed> delayed_;
  std::vector<std::thread> threads_;
  bool stopping_ = false;
};

}  // namespace tarn::linux_host
