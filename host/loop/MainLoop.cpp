// SPDX-License-Identifier: Apache-2.0
#include "host/loop/MainLoop.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <utility>

#include "host/system/MemoryReserve.h"
#include "host/system/SystemError.h"

namespace tarn::linux_host {

namespace {

// Pieces of work that run before the sockets are looked at again.
constexpr std::size_t kPiecesPerTurn = 1024;

std::uint64_t tokenOf(int descriptor, std::uint32_t generation) {
  return (std::uint64_t{generation} << 32) | static_cast<std::uint32_t>(descriptor);
}

// In whole milliseconds, rounded up so that nothing comes early; -1 stands for ever.
int milliseconds(std::optional<std::chrono::nanoseconds> timeout) {
  constexpr std::chrono::nanoseconds kLongest = std::chrono::hours(1);
  if (!timeout) return -1;
  return static_cast<int>(std::chrono::ceil<std::chrono::milliseconds>(std::min(*timeout, kLongest)).count());
}

}  // namespace

MainLoop::MainLoop(const platform::Clock& clock)
    : clock_(clock), queue_(std::make_shared<ServerQueue>(clock, progress_)), epoll_(::epoll_create1(EPOLL_CLOEXEC)) {
  epoll_event event{};
  event.events = EPOLLIN;
  event.data.u64 = tokenOf(queue_->wakeDescriptor(), 0);
  if (!epoll_ || ::epoll_ctl(epoll_.get(), EPOLL_CTL_ADD, queue_->wakeDescriptor(), &event) != 0) {
    setUp_ = errorOf("can't set up the main loop", errno);
  }
}

MainLoop::~MainLoop() = default;

Status MainLoop::watch(int descriptor, std::uint32_t events, std::shared_ptr<EventHandler> handler) {
  const auto index = static_cast<std::size_t>(descriptor);
  if (index >= slots_.size()) {
    flushes_.reserve(index + 1);
    flushing_.reserve(index + 1);
    slots_.resize(index + 1);
  }
  Slot& slot = slots_[index];
  epoll_event event{};
  event.events = events;
  event.data.u64 = tokenOf(descriptor, ++slot.generation);
  if (::epoll_ctl(epoll_.get(), EPOLL_CTL_ADD, descriptor, &event) != 0) return lastSystemError();
  slot.handler = std::move(handler);
  return {};
}

void MainLoop::change(int descriptor, std::uint32_t events) {
  epoll_event event{};
  event.events = events;
  event.data.u64 = tokenOf(descriptor, slots_[static_cast<std::size_t>(descriptor)].generation);
  ::epoll_ctl(epoll_.get(), EPOLL_CTL_MOD, descriptor, &event);
}

void MainLoop::unwatch(int descriptor) {
  ::epoll_ctl(epoll_.get(), EPOLL_CTL_DEL, descriptor, nullptr);
  // Moved out first: the handler's end may come back here.
  const auto handler = std::move(slots_[static_cast<std::size_t>(descriptor)].handler);
}

void MainLoop::run() {
  while (!stopping_.load(std::memory_order_relaxed)) {
    bool whole = MemoryReserve::orGiveUp(MemoryReserve::Loss::Work, [this] { queue_->run(kPiecesPerTurn); });
    for (TurnHook& hook : hooks_) {
      whole = MemoryReserve::orGiveUp(MemoryReserve::Loss::Work, hook) && whole;
    }
    if (!whole) {
      queue_->wake();  // what was left undone is looked at in the next turn, which nothing else may bring
    }
    flushAll();
    waitForEvents();
  }
  flushAll();
}

void MainLoop::stop() {
  stopping_.store(true, std::memory_order_relaxed);
  queue_->wake();
}

void MainLoop::flushAll() {
  flushing_.swap(flushes_);
  for (const auto& handler : flushing_) {
    MemoryReserve::orGiveUp(MemoryReserve::Loss::Work, [&] { handler->flush(); });
  }
  flushing_.clear();
}

void MainLoop::waitForEvents() {
  const auto timeout = flushes_.empty() ? queue_->prepareToSleep() : std::chrono::nanoseconds::zero();
  Events events;
  progress_.setIdle(true);
  const std::size_t count = sleep(events, timeout);
  progress_.setIdle(false);
  progress_.turn();
  dispatchAll({events.data(), count});
}

void MainLoop::waitUntil(std::chrono::nanoseconds deadline, platform::UniqueFunction<bool()> isOver) {
  if (std::exchange(waits_, true)) return;
  // What comes meanwhile isn't the work of whoever waits.
  const WorkLane::Scope noLane(nullptr);
  const WorkOwner noSession(0);
  bool wasWoken = false;
  while (!isOver() && !stopping_.load(std::memory_order_relaxed)) {
    flushAll();
    const auto left = deadline - clock_.monotonic();
    if (left <= std::chrono::nanoseconds::zero()) break;
    if (!queue_->prepareToWait()) {
      wasWoken = true;
      continue;
    }
    Events events;
    const std::size_t count = sleep(events, left);
    dispatchAll({events.data(), count});
  }
  waits_ = false;
  if (wasWoken) {
    queue_->wake();  // that may have been meant for the turn's hooks
  }
}

// Waits for events as it was announced to the queue; how many there are.
std::size_t MainLoop::sleep(Events& events, std::optional<std::chrono::nanoseconds> timeout) {
  const int count = ::epoll_wait(epoll_.get(), events.data(), kEventsPerTurn, milliseconds(timeout));
  queue_->awake();
  return static_cast<std::size_t>(std::max(count, 0));
}

void MainLoop::dispatchAll(std::span<const epoll_event> events) {
  for (const epoll_event& event : events) {
    dispatch(event.data.u64, event.events);
  }
}

void MainLoop::dispatch(std::uint64_t token, std::uint32_t events) {
  const auto descriptor = static_cast<std::uint32_t>(token);
  if (descriptor == static_cast<std::uint32_t>(queue_->wakeDescriptor())) {
    queue_->drainWake();
    return;
  }
  const Slot& slot = slots_[descriptor];
  if (slot.generation != static_cast<std::uint32_t>(token >> 32)) {
    return;  // closed earlier in this turn, and the number is another's by now
  }
  if (const std::shared_ptr<EventHandler> handler = slot.handler) {
    MemoryReserve::orGiveUp(MemoryReserve::Loss::Work, [&] { handler->handleEvents(events); });
  }
}

}  // namespace tarn::linux_host
