// SPDX-License-Identifier: Apache-2.0
#include "testing/ManualWorkQueues.h"

#include <algorithm>
#include <atomic>
#include <cstdio>
#include <cstdlib>
#include <deque>
#include <iterator>
#include <map>
#include <mutex>
#include <optional>
#include <thread>
#include <utility>

#include "testing/ManualClock.h"
#include "testing/backends/OwnMemory.h"
#include "testing/backends/RecordingSessionRecords.h"

namespace tarn::testing {

namespace detail {

// The work of all queues together. It outlives the queues, because work still waiting when the last owner lets go of
// its queue is run all the same.
class ManualSchedule {
 public:
  using Filter = std::optional<std::size_t>;  // one queue, or all

  explicit ManualSchedule(ManualClock& clock) : clock_(clock) {}

  std::atomic<bool> helps{false};

  std::size_t newQueue() {
    const std::lock_guard lock(mutex_);
    return queues_++;
  }
  void add(std::size_t queue, platform::Work work) {
    const std::lock_guard lock(mutex_);
    promoteDue();
    ready_.push_back(Piece{queue, std::move(work)});
  }
  void addDelayed(std::size_t queue, std::chrono::nanoseconds delay, platform::Work work) {
    const std::lock_guard lock(mutex_);
    const auto due = clock_.monotonic() + std::max(delay, std::chrono::nanoseconds(0));
    delayed_.emplace(due, Piece{queue, std::move(work)});  // a multimap keeps equal moments in the order of the calls
    promoteDue();
  }
  void suspend(std::size_t queue, std::chrono::nanoseconds longest, platform::Work next) {
    const std::lock_guard lock(mutex_);
    suspended_[queue] = {clock_.monotonic() + std::max(longest, std::chrono::nanoseconds(0)),
                         Piece{queue, std::move(next)}};
  }
  void resume(std::size_t queue) {
    const std::lock_guard lock(mutex_);
    promoteDue();
    if (const auto found = suspended_.find(queue); found != suspended_.end()) {
      endSuspension(found);
    }
  }
  bool isCurrent(std::size_t queue, bool isServers) const {
    const std::lock_guard lock(mutex_);
    if (running_.empty()) return isServers && maker_ == std::this_thread::get_id();
    return running_.back() == queue && runner_ == std::this_thread::get_id();
  }
  std::size_t waiting(Filter filter) {
    const std::lock_guard lock(mutex_);
    promoteDue();
    return static_cast<std::size_t>(
        std::count_if(ready_.begin(), ready_.end(), [&](const Piece& piece) { return matches(piece, filter); }));
  }
  std::size_t delayed(Filter filter) {
    const std::lock_guard lock(mutex_);
    promoteDue();
    const auto suspended = std::count_if(suspended_.begin(), suspended_.end(),
                                         [&](const auto& entry) { return !filter || entry.first == *filter; });
    return static_cast<std::size_t>(suspended + std::count_if(delayed_.begin(), delayed_.end(), [&](const auto& entry) {
                                      return matches(entry.second, filter);
                                    }));
  }

  bool runOne(Filter filter) {
    Piece piece = takeNext(filter);
    platform::Work& work = piece.work;
    if (!work) return false;
    // Also when the work throws, whose queue goes on with the next piece then.
    struct Running {
      ManualSchedule& schedule;
      platform::Work& work;
      const RecordingSessionRecords::Scope scope;
      ~Running() {
        work.reset();  // still as work of its queue
        const std::lock_guard lock(schedule.mutex_);
        schedule.running_.pop_back();
      }
    } const running{*this, work, RecordingSessionRecords::Scope(piece.owner)};
    work();
    return true;
  }
  std::size_t runUntilIdle(Filter filter) {
    std::size_t pieces = 0;
    while (runOne(filter)) {
      if (++pieces > ManualWorkQueues::kMostPiecesInOneRun) {
        static_cast<void>(std::fputs("ManualWorkQueues: the queues never become idle\n", stderr));
        std::abort();
      }
    }
    return pieces;
  }
  std::size_t advance(std::chrono::nanoseconds duration) {
    std::size_t pieces = runUntilIdle({});
    const auto target = clock_.monotonic() + duration;
    for (;;) {
      const auto now = clock_.monotonic();
      const auto moment = std::min(nextMoment().value_or(target), target);
      clock_.advance(std::max(moment - now, std::chrono::nanoseconds(0)));
      const std::size_t ran = runUntilIdle({});
      pieces += ran;
      if (ran == 0 && clock_.monotonic() >= target) return pieces;
    }
  }
  void dropAll() {
    for (;;) {
      std::deque<Piece> ready;
      std::multimap<std::chrono::nanoseconds, Piece> delayed;
      Suspensions suspended;
      {
        const std::lock_guard lock(mutex_);
        ready.swap(ready_);
        delayed.swap(delayed_);
        suspended.swap(suspended_);
      }
      if (ready.empty() && delayed.empty() && suspended.empty()) return;
    }
  }

 private:
  struct Piece {
    std::size_t queue = 0;
    platform::Work work;
    platform::SessionNumber owner = RecordingSessionRecords::current();  // of whoever hands it over
  };

  struct Suspension {
    std::chrono::nanoseconds due{};
    Piece next;
  };
  using Suspensions = std::map<std::size_t, Suspension>;

  // The oldest piece of due work that can run, which counts as running from now on; empty when there is none.
  Piece takeNext(Filter filter) {
    const OwnMemory own;
    const std::lock_guard lock(mutex_);
    promoteDue();
    const auto next = std::find_if(ready_.begin(), ready_.end(), [&](const Piece& piece) {
      return matches(piece, filter) && !suspended_.contains(piece.queue) &&
             std::find(running_.begin(), running_.end(), piece.queue) == running_.end();
    });
    if (next == ready_.end()) return {};
    Piece piece = std::move(*next);
    running_.push_back(piece.queue);
    runner_ = std::this_thread::get_id();
    ready_.erase(next);
    return piece;
  }
  static bool matches(const Piece& piece, Filter filter) { return !filter || piece.queue == *filter; }
  Suspensions::iterator endSuspension(Suspensions::iterator at) {
    ready_.push_front(std::move(at->second.next));
    return suspended_.erase(at);
  }
  void promoteDue() {
    const OwnMemory own;
    const auto now = clock_.monotonic();
    for (auto at = suspended_.begin(); at != suspended_.end();) {
      at = at->second.due <= now ? endSuspension(at) : std::next(at);
    }
    while (!delayed_.empty() && delayed_.begin()->first <= now) {
      ready_.push_back(std::move(delayed_.begin()->second));
      delayed_.erase(delayed_.begin());
    }
  }
  std::optional<std::chrono::nanoseconds> nextMoment() const {
    const std::lock_guard lock(mutex_);
    auto moment = delayed_.empty() ? std::nullopt : std::optional(delayed_.begin()->first);
    for (const auto& [queue, suspension] : suspended_) {
      moment = std::min(moment.value_or(suspension.due), suspension.due);
    }
    return moment;
  }

  ManualClock& clock_;
  mutable std::mutex mutex_;  // guards all below
  std::size_t queues_ = 0;
  std::deque<Piece> ready_;
  std::multimap<std::chrono::nanoseconds, Piece> delayed_;
  Suspensions suspended_;             // by queue
  std::vector<std::size_t> running_;  // the queues whose work runs, the innermost last
  std::thread::id runner_;
  const std::thread::id maker_ = std::this_thread::get_id();
};

}  // namespace detail

ManualWorkQueue::ManualWorkQueue(std::shared_ptr<detail::ManualSchedule> schedule, std::size_t identifier,
                                 std::string name, platform::QualityOfService quality)
    : schedule_(std::move(schedule)), identifier_(identifier), name_(std::move(name)), quality_(quality) {}

void ManualWorkQueue::async(platform::Work work) {
  schedule_->add(identifier_, std::move(work));
}

void ManualWorkQueue::asyncAfter(std::chrono::nanoseconds delay, platform::Work work) {
  schedule_->addDelayed(identifier_, delay, std::move(work));
}

bool ManualWorkQueue::isCurrent() const noexcept {
  return schedule_->isCurrent(identifier_, quality_ == platform::QualityOfService::UserInteractive);
}

std::size_t ManualWorkQueue::waiting() const noexcept {
  return schedule_->waiting(identifier_);
}

void ManualWorkQueue::suspend(std::chrono::nanoseconds longest, platform::Work next) {
  schedule_->suspend(identifier_, longest, std::move(next));
}

void ManualWorkQueue::resume() {
  schedule_->resume(identifier_);
}

void ManualWorkQueue::help(std::chrono::nanoseconds) {
  if (schedule_->helps) {
    schedule_->runUntilIdle(identifier_);
  }
}

bool ManualWorkQueue::spend(std::size_t cost) {
  spent_ += cost;
  spentInAll_ += cost;
  return turn_ != 0 && spent_ >= turn_;
}

void ManualWorkQueue::asyncNext(platform::Work rest) {
  spent_ = 0;
  async(std::move(rest));
}

bool ManualWorkQueue::runOne() {
  return schedule_->runOne(identifier_);
}

std::size_t ManualWorkQueue::runUntilIdle() {
  return schedule_->runUntilIdle(identifier_);
}

std::size_t ManualWorkQueue::delayed() const {
  return schedule_->delayed(identifier_);
}

ManualWorkQueues::ManualWorkQueues(ManualClock& clock) : schedule_(std::make_shared<detail::ManualSchedule>(clock)) {}

ManualWorkQueues::~ManualWorkQueues() {
  dropAll();
}

std::shared_ptr<platform::WorkQueue> ManualWorkQueues::makeSerialQueue(std::string_view name,
                                                                       platform::QualityOfService quality) {
  return make(name, quality);
}

std::shared_ptr<platform::SuspendableQueue> ManualWorkQueues::makeSuspendableQueue(std::string_view name,
                                                                                   platform::QualityOfService quality) {
  return make(name, quality);
}

std::shared_ptr<ManualWorkQueue> ManualWorkQueues::make(std::string_view name, platform::QualityOfService quality) {
  auto queue = std::make_shared<ManualWorkQueue>(schedule_, schedule_->newQueue(), std::string(name), quality);
  made_.push_back({std::string(name), queue});
  return queue;
}

bool ManualWorkQueues::runOne() {
  return schedule_->runOne({});
}

std::size_t ManualWorkQueues::runUntilIdle() {
  return schedule_->runUntilIdle({});
}

std::size_t ManualWorkQueues::advance(std::chrono::nanoseconds duration) {
  return schedule_->advance(duration);
}

void ManualWorkQueues::setHelps(bool helps) {
  schedule_->helps = helps;
}

void ManualWorkQueues::dropAll() {
  schedule_->dropAll();
}

std::shared_ptr<ManualWorkQueue> ManualWorkQueues::find(std::string_view name) const {
  for (const Made& made : made_) {
    if (auto queue = made.queue.lock(); queue != nullptr && made.name == name) return queue;
  }
  return nullptr;
}

std::vector<std::string> ManualWorkQueues::names() const {
  std::vector<std::string> names;
  for (const Made& made : made_) {
    names.push_back(made.name);
  }
  return names;
}

std::size_t ManualWorkQueues::waiting() const {
  return schedule_->waiting({});
}

std::size_t ManualWorkQueues::delayed() const {
  return schedule_->delayed({});
}

}  // namespace tarn::testing
