#include "platform/linux/WorkerPool.h"

#include <cstdio>
#include <cstdlib>
#include <system_error>

#include "platform/linux/CurrentQueue.h"

namespace tarn::linux_host {

namespace {

// Pieces of one queue that a thread runs before the next queue has its turn.
constexpr int kPiecesPerTurn = 64;
// The longest sleep: a bound that keeps the arithmetic of the system's timed waits in range.
constexpr std::chrono::nanoseconds kLongestSleep = std::chrono::hours(1);

// Work that is handed over must run; without a thread for it the process is of no use.
[[noreturn]] void endForWantOfThreads() {
  static_cast<void>(std::fputs("thread constructor failed\n", stderr));
  std::abort();
}

}  // namespace

void WorkerPool::start(std::size_t threads) {
  const std::lock_guard lock(mutex_);
  if (!threads_.empty() || stopping_) {
    return;
  }
  try {
    for (std::size_t i = 0; i < threads; ++i) {
      threads_.emplace_back([this] { serve(); });
    }
  } catch (const std::system_error&) {
    endForWantOfThreads();
  }
}

void WorkerPool::stop() {
  std::vector<std::thread> threads;
  {
    const std::lock_guard lock(mutex_);
    stopping_ = true;
    threads.swap(threads_);
  }
  changed_.notify_all();
  for (std::thread& thread : threads) {
    thread.join();
  }
}

void WorkerPool::add(const std::shared_ptr<Line>& line, platform::Work work) {
  const std::lock_guard lock(mutex_);
  enqueue(line, std::move(work));
}

void WorkerPool::addAfter(const std::shared_ptr<Line>& line, std::chrono::nanoseconds delay, platform::Work work) {
  const std::lock_guard lock(mutex_);
  if (delay <= std::chrono::nanoseconds::zero()) {
    enqueue(line, std::move(work));
    return;
  }
  const auto deadline = deadlineAfter(clock_.monotonic(), delay);
  const bool earliest = delayed_.empty() || deadline < delayed_.deadline();
  delayed_.add(deadline, Delayed(line, std::move(work)));
  if (earliest) {
    changed_.notify_all();  // whoever sleeps until the deadline that was the earliest must sleep anew
  }
}

std::size_t WorkerPool::waiting(const std::shared_ptr<Line>& line) const {
  const std::lock_guard lock(mutex_);
  return line->work.size();
}

void WorkerPool::enqueue(const std::shared_ptr<Line>& line, platform::Work work) {
  line->work.push_back(std::move(work));
  if (!line->scheduled) {
    line->scheduled = true;
    runnable_.push_back(line);
    changed_.notify_one();
  }
}

void WorkerPool::takeDue() {
  if (delayed_.empty()) {
    return;
  }
  const auto now = clock_.monotonic();
  while (delayed_.due(now)) {
    auto [line, work] = delayed_.take();
    enqueue(line, std::move(work));
  }
}

void WorkerPool::serve() {
  std::unique_lock lock(mutex_);
  for (;;) {
    takeDue();
    if (!runnable_.empty()) {
      const auto line = std::move(runnable_.front());
      runnable_.pop_front();
      runSome(line, lock);
    } else if (stopping_) {
      return;
    } else {
      sleep(lock);
    }
  }
}

void WorkerPool::sleep(std::unique_lock<std::mutex>& lock) {
  if (delayed_.empty()) {
    changed_.wait(lock);
  } else {
    changed_.wait_for(lock, std::min(delayed_.deadline() - clock_.monotonic(), kLongestSleep));
  }
}

void WorkerPool::runSome(const std::shared_ptr<Line>& line, std::unique_lock<std::mutex>& lock) {
  const CurrentQueue current(line.get());
  for (int count = 0; count < kPiecesPerTurn && !line->work.empty(); ++count) {
    platform::Work work = std::move(line->work.front());
    line->work.pop_front();
    lock.unlock();
    work();
    work.reset();
    lock.lock();
  }
  line->scheduled = !line->work.empty();
  if (line->scheduled) {
    runnable_.push_back(line);
    changed_.notify_one();
  }
}

}  // namespace tarn::linux_host
