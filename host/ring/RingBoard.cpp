#include "host/ring/RingBoard.h"

#include <algorithm>
#include <utility>

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
  const auto turn = std::exchange(active_, {});
  bool more = false;
  for (const auto& rings : turn) {
    more = rings->serveTurn(now) || more;
  }
  std::vector<std::shared_ptr<ConnectionRings>> still;
  for (const auto& rings : turn) {
    if (rings->isActive()) {
      still.push_back(rings);
    }
  }
  for (auto& rings : active_) {
    if (std::find(still.begin(), still.end(), rings) == still.end()) {
      still.push_back(std::move(rings));
    }
  }
  active_ = std::move(still);
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
  nextLook_ = now + wait;
  loop.queue()->asyncAfter(wait, [weak = std::weak_ptr(self_), moment = nextLook_] {
    const auto board = weak.lock();
    if (board != nullptr && (*board)->nextLook_ == moment) {
      (*board)->nextLook_ = std::chrono::nanoseconds::max();  // the turn's hook looks
    }
  });
}

}  // namespace tarn::linux_host
