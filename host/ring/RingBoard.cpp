// SPDX-License-Identifier: Apache-2.0
#include "host/ring/RingBoard.h"

#include <algorithm>
#include <utility>

#include "host/system/MemoryReserve.h"

namespace tarn::linux_host {

namespace {

// How much rarer one looks who waits for the recorder alone.
constexpr int kPatience = 25;

}  // namespace

RingBoard::RingBoard(MainLoop& mainLoop, platform::Log& logSink, const RingLimits& ringLimits)
    : loop(mainLoop), log(logSink), limits(ringLimits) {
  loop.addTurnHook([this] { look(); });
}

RingBoard::~RingBoard() = default;

std::shared_ptr<ConnectionRings> RingBoard::connect(std::weak_ptr<RingOwner> owner) {
  std::erase_if(all_, [](const auto& rings) { return rings.expired(); });
  auto rings = std::make_shared<ConnectionRings>(*this, std::move(owner));
  all_.push_back(rings);
  // Room for all of them, so that none is ever left out of a turn.
  active_.reserve(all_.size());
  turn_.reserve(all_.size());
  return rings;
}

bool RingBoard::isOpen(const RingIdentity& identity) const noexcept {
  return std::any_of(all_.begin(), all_.end(), [&](const auto& weak) {
    const auto rings = weak.lock();
    return rings != nullptr && rings->has(identity);
  });
}

void RingBoard::activate(std::shared_ptr<ConnectionRings> rings) {
  if (std::find(active_.begin(), active_.end(), rings) == active_.end()) {
    active_.push_back(std::move(rings));
  }
  loop.queue()->wake();
}

void RingBoard::look() {
  if (active_.empty()) return;
  const std::chrono::nanoseconds now = loop.clock().monotonic();
  // What is activated meanwhile comes with the next turn.
  turn_.swap(active_);
  bool more = false;
  for (const auto& rings : turn_) {
    MemoryReserve::orGiveUp(MemoryReserve::Loss::Work, [&] { more = rings->serveTurn(now) || more; });
  }
  std::erase_if(turn_, [](const auto& rings) { return !rings->isActive(); });
  for (auto& rings : active_) {
    if (std::find(turn_.begin(), turn_.end(), rings) == turn_.end()) {
      turn_.push_back(std::move(rings));
    }
  }
  active_.swap(turn_);
  turn_.clear();
  if (more) {
    loop.queue()->wake();
  } else {
    armTimer(now);
  }
}

void RingBoard::armTimer(std::chrono::nanoseconds now) {
  const bool awake = std::any_of(active_.begin(), active_.end(), [](const auto& rings) { return rings->isAwake(); });
  const std::chrono::nanoseconds wait = awake ? limits.lookEvery : kPatience * limits.lookEvery;
  if (active_.empty() || nextLook_ <= now + wait) return;
  const bool armed = MemoryReserve::orGiveUp(MemoryReserve::Loss::Work, [&] {
    loop.queue()->asyncAfter(wait, [weak = std::weak_ptr(self_), moment = now + wait] {
      const auto board = weak.lock();
      if (board != nullptr && (*board)->nextLook_ == moment) {
        (*board)->nextLook_ = std::chrono::nanoseconds::max();  // the turn's hook looks
      }
    });
  });
  if (armed) {
    nextLook_ = now + wait;
  } else {
    loop.queue()->wake();  // the next turn looks
  }
}

}  // namespace tarn::linux_host
