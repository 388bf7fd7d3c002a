// SPDX-License-Identifier: Apache-2.0
#include "host/loop/ServerQueue.h"

#include <sys/eventfd.h>

#include <algorithm>
#include <cerrno>
#include <cstdint>

#include "host/loop/CurrentQueue.h"
#include "host/system/MemoryReserve.h"

namespace tarn::linux_host {

namespace {

// Room that a burst took is given back when it was for more pieces than this.
constexpr std::size_t kKeptPieces = 16384;
// Room that is made at once, in pieces.
constexpr std::size_t kLeastRoom = 16;

}  // namespace

ServerQueue::ServerQueue(const platform::Clock& clock, QueueProgress& progress)
    : clock_(clock), progress_(progress), wake_(::eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK)) {}

void ServerQueue::async(platform::Work work) {
  if (WorkLane* const lane = WorkLane::currentOf(this)) {
    asyncIn(*lane, std::move(work));
    return;
  }
  bool wakeServer = false;
  {
    const MutexLock lock(mutex_);
    incoming_.push_back({OwnedWork(std::move(work)), LogClientScope::current()});
    ready_.fetch_add(1, std::memory_order_relaxed);
    wakeServer = mustWake();
  }
  if (wakeServer) {
    writeWake();
  }
}

void ServerQueue::asyncAfter(std::chrono::nanoseconds delay, platform::Work work) {
  if (delay <= std::chrono::nanoseconds::zero()) {
    async(std::move(work));
    return;
  }
  const auto deadline = deadlineAfter(clock_.monotonic(), delay);
  bool wakeServer = false;
  {
    const MutexLock lock(mutex_);
    delayed_.add(deadline, {OwnedWork(std::move(work)), {}});
    wakeServer = deadline < sleepsUntil_ && mustWake();
  }
  if (wakeServer) {
    writeWake();
  }
}

bool ServerQueue::isCurrent() const noexcept {
  return CurrentQueue::is(this);
}

std::size_t ServerQueue::waiting() const noexcept {
  const MutexLock lock(mutex_);
  return ready() + inLanes_.load(std::memory_order_relaxed) +
         (delayed_.empty() ? 0 : delayed_.dueCount(clock_.monotonic()));
}

void ServerQueue::wake() {
  bool wakeServer = false;
  {
    const MutexLock lock(mutex_);
    woken_ = true;
    wakeServer = mustWake();
  }
  if (wakeServer) {
    writeWake();
  }
}

std::size_t ServerQueue::run(std::size_t limit) {
  const CurrentQueue current(this);
  std::size_t count = 0;
  while (count < limit && (next_ < batch_.size() || refill())) {
    Piece piece = std::move(batch_[next_++]);
    ready_.fetch_sub(1, std::memory_order_relaxed);
    progress_.step();
    const LogClientScope scope(piece.client);
    MemoryReserve::orGiveUp(MemoryReserve::Loss::Work, piece.work);
    ++count;
  }
  return count;
}

// What fails is the caller's, who knows whose lane it is.
void ServerQueue::asyncIn(WorkLane& lane, platform::Work work) {
  lane.add(std::move(work));
  inLanes_.store(inLanes_.load(std::memory_order_relaxed) + 1, std::memory_order_relaxed);
}

void ServerQueue::asyncNext(platform::Work rest) {
  WorkLane* const lane = WorkLane::currentOf(this);
  if (lane == nullptr) {
    async(std::move(rest));
    return;
  }
  lane->addNext(std::move(rest));
  inLanes_.store(inLanes_.load(std::memory_order_relaxed) + 1, std::memory_order_relaxed);
}

// Work of the queue's own list has no turn that could end.
bool ServerQueue::spend(std::size_t cost) {
  WorkLane* const lane = WorkLane::currentOf(this);
  if (lane == nullptr) return false;
  lane->spend(cost);
  if (shouldPause_ && shouldPause_()) {
    lane->endTurn();
  }
  return !lane->hasTurn();
}

void ServerQueue::runLane(WorkLane& lane) {
  const CurrentQueue current(this);
  const WorkLane::Scope scope(&lane);
  while (!lane.empty() && lane.hasTurn()) {
    OwnedWork work = lane.take();
    inLanes_.store(inLanes_.load(std::memory_order_relaxed) - 1, std::memory_order_relaxed);
    progress_.step();
    work();
  }
}

bool ServerQueue::refill() {
  batch_.clear();
  next_ = 0;
  if (batch_.capacity() > kKeptPieces) {
    batch_ = std::vector<Piece>();
  }
  const MutexLock lock(mutex_);
  if (!delayed_.empty()) {
    const auto now = clock_.monotonic();
    while (delayed_.due(now)) {
      // First the room: what was taken out and can't be put in would be lost.
      if (incoming_.size() == incoming_.capacity()) {
        incoming_.reserve(std::max(kLeastRoom, 2 * incoming_.size()));
      }
      incoming_.push_back(delayed_.take());
      ready_.fetch_add(1, std::memory_order_relaxed);
    }
  }
  batch_.swap(incoming_);
  return !batch_.empty();
}

std::optional<std::chrono::nanoseconds> ServerQueue::prepareToSleep() {
  using std::chrono::nanoseconds;
  if (ready() != 0) return nanoseconds::zero();
  const MutexLock lock(mutex_);
  if (ready() != 0 || std::exchange(woken_, false)) return nanoseconds::zero();
  std::optional<nanoseconds> timeout;
  sleepsUntil_ = nanoseconds::max();
  if (!delayed_.empty()) {
    const auto now = clock_.monotonic();
    if (delayed_.due(now)) return nanoseconds::zero();
    sleepsUntil_ = delayed_.deadline();
    timeout = sleepsUntil_ - now;
  }
  sleeping_ = true;
  return timeout;
}

bool ServerQueue::prepareToWait() {
  const MutexLock lock(mutex_);
  if (std::exchange(woken_, false)) return false;
  sleepsUntil_ = {};  // what is delayed stays so
  sleeping_ = true;
  return true;
}

void ServerQueue::awake() {
  const MutexLock lock(mutex_);
  sleeping_ = false;
}

void ServerQueue::drainWake() noexcept {
  std::uint64_t count = 0;
  [[maybe_unused]] const auto bytes = ::read(wake_.get(), &count, sizeof count);
}

bool ServerQueue::mustWake() noexcept {
  return std::exchange(sleeping_, false);  // one write is enough
}

void ServerQueue::writeWake() noexcept {
  const std::uint64_t one = 1;
  while (::write(wake_.get(), &one, sizeof one) < 0 && errno == EINTR) {
  }
}

}  // namespace tarn::linux_host
