// SPDX-License-Identifier: Apache-2.0
#include "host/ring/RingReader.h"

#include <algorithm>
#include <utility>

namespace tarn::linux_host {

namespace {

// More at one look than any client could have posted.
constexpr std::uint64_t kMostDropsALook = std::uint64_t{1} << 32;

}  // namespace

RingReader::RingReader(RingMemory memory, UniqueDescriptor wake, std::uint64_t firstSleep, WakeHandler onWake)
    : memory_(std::move(memory)),
      wake_(std::move(wake)),
      consumer_(memory_.header(), memory_.data(), memory_.dataBytes(), firstSleep),
      onWake_(std::move(onWake)),
      // What was dropped while an earlier service read it was told to that one. Nobody read this one yet: all is new.
      dropped_(consumer_.taken() == 0 ? 0 : consumer_.dropped()) {
  marks_.reserve(kMostMarks);
}

void RingReader::handleEvents(std::uint32_t) {
  onWake_(*this);
}

std::uint64_t RingReader::newlyDropped() noexcept {
  const std::uint64_t now = consumer_.dropped();
  const std::uint64_t more = now - std::exchange(dropped_, now);
  return more <= kMostDropsALook ? more : 0;
}

void RingReader::endAtHead() noexcept {
  // No further than a ring can hold, whatever its head says.
  const std::uint64_t published = consumer_.head() - consumer_.taken();
  end_ = consumer_.taken() + std::min<std::uint64_t>(published, memory_.dataBytes());
}

void RingReader::follow(const CommitPoint& point) noexcept {
  if (done_ && point.settled) {
    done_->handedOver = point.handedOver;
    if (marks_.size() == kMostMarks) {
      marks_.back() = *done_;
    } else {
      marks_.push_back(*done_);
    }
    done_.reset();
  }
  const Mark* last = nullptr;
  Mark reached;
  while (!marks_.empty() && marks_.front().handedOver <= point.committed) {
    reached = marks_.front();
    last = &reached;
    marks_.erase(marks_.begin());
  }
  if (last != nullptr) {
    consumer_.publishCommitted(last->position, last->messages);
  }
}

}  // namespace tarn::linux_host
