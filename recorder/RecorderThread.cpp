// SPDX-License-Identifier: Apache-2.0
// The thread of Recorder that writes: from the groups that were handed over to what is told of their commits.
#include <sys/resource.h>

#include <algorithm>
#include <new>
#include <string>
#include <utility>

#include "platform/LogCondition.h"
#include "recorder/Recorder.h"

namespace tarn::recorder {

namespace {

using SteadyClock = std::chrono::steady_clock;

constexpr std::chrono::milliseconds kShortagePause{20};
constexpr int kAhead = 5;

// What waits for this thread is what a crash costs, so it goes ahead of those that bring more, where that is permitted.
void goAhead() {
  static_cast<void>(::setpriority(PRIO_PROCESS, 0, ::getpriority(PRIO_PROCESS, 0) - kAhead));
}

}  // namespace

// Ids are given in the order of hand-over, so the file's last one tells how many of the run before are in it.
void Recorder::tellWhatWasLost() {
  const HandOverCounts left = *std::exchange(left_, std::nullopt);
  const MutexLock lock(mutex_);
  const std::int64_t in = writer_.lastId() - left.lastId - static_cast<std::int64_t>(committed_);
  const std::uint64_t known = left.committed + left.failed + static_cast<std::uint64_t>(std::max<std::int64_t>(in, 0));
  lostBefore_ = left.handedOver > known ? left.handedOver - known : 0;
  before_ = {};
  lastId_ = writer_.lastId();
  keepCounts();
  if (lostBefore_ > 0) {
    const platform::LogConditionScope condition(platform::LogCondition::RunKilled);
    tell([&] {
      return "recorder lost " + std::to_string(lostBefore_) +
             " events that were handed over to the run before and not committed when it ended";
    });
  }
}

// A line that is worth no failure: where there is no memory for it, `status` still tells the count.
template <class Text>
void Recorder::tell(Text text) noexcept {
  try {
    log_.error(text());
  } catch (const std::bad_alloc&) {
    log_.error("recorder has no memory to say what it lost");
  }
}

// One step of the writer's. Where memory is missing in it, it is as with a disk that fails: nothing is lost, and it is
// tried again later.
template <class Step>
bool Recorder::tryTo(Step step) noexcept {
  try {
    const bool healthy = step();
    shortage_ = !healthy && writer_.lacksMemory();
    return healthy;
  } catch (const std::bad_alloc&) {
    writer_.closeAfterFault();  // what was in a transaction isn't in, which the next opening finds
    shortage_ = true;
    return false;
  }
}

void Recorder::run() {
  goAhead();
  bool healthy = tryTo([this] { return writer_.open() && writer_.settle(); });
  if (healthy && left_) {
    tellWhatWasLost();
  }
  int triesLeft = options_.shutdownTries;
  {
    const MutexLock lock(mutex_);
    opened_ = true;
    done_.notifyAll();
    for (;;) {
      healthy ? waitForWork() : waitForRetry();
      if (stopping_ && (!hasWaiting() || triesLeft == 0)) break;
      takeRetention();
      if (position_ == current_.size() && !incoming_.empty()) {
        current_.swap(incoming_);
        currentSince_ = incomingSince_;
        busy_ = current_.size() >= options_.busyGroupEvents;
        position_ = 0;
      }
      if (position_ < current_.size()) {
        healthy = writeCurrent();
      } else if (!healthy || SteadyClock::now() >= nextMaintenance_) {
        healthy = maintain();
      }
      if (healthy && left_) {
        mutex_.unlock();
        tellWhatWasLost();
        mutex_.lock();
      }
      if (healthy && SteadyClock::now() >= nextVerification_) {
        healthy = verify();
      }
      healthy = healthy && answerSettled();
      if (stopping_ && !healthy) {
        --triesLeft;
      }
    }
    giveUp();
  }
  writer_.close();
}

void Recorder::waitForWork() {
  retry_ = options_.firstRetry;
  if (position_ < current_.size()) return;
  while (incoming_.empty() && !stopping_ && !retention_ && !owesAnswer_) {
    asleep_ = true;
    const bool due = !work_.waitUntil(mutex_, std::min(nextMaintenance_, nextVerification_));
    asleep_ = false;
    if (due && incoming_.empty()) return;
  }
  if (incoming_.empty()) return;
  gather();
}

// Company for a commit comes cheap, as long as it doesn't keep the first event waiting.
void Recorder::gather() {
  const TimePoint latest = incomingSince_ + (busy_ ? options_.busyGroupTime : options_.groupTime);
  while (!stopping_ && !isAwaited() && incoming_.size() < options_.groupEvents &&
         incoming_.bytes() < options_.groupBytes) {
    const TimePoint now = SteadyClock::now();
    if (now >= latest) return;
    const std::uint64_t seen = handedOver_;
    work_.waitUntil(mutex_, std::min(now + options_.quietTime, latest));
    if (handedOver_ == seen) return;
  }
}

void Recorder::waitForRetry() {
  // Memory comes back sooner than a disk, and clients are held up meanwhile.
  const auto pause = shortage_ ? kShortagePause : std::exchange(retry_, std::min(retry_ * 2, options_.lastRetry));
  // Being called to stop ends a long pause; the last tries then come at their own pace.
  const bool stoppedBefore = stopping_;
  if (stoppedBefore) {
    const TimePoint until = SteadyClock::now() + options_.shutdownRetry;
    while (work_.waitUntil(mutex_, until)) {
    }
  } else {
    work_.waitFor(mutex_, pause, [this]() TARN_REQUIRES(mutex_) { return stopping_; });
  }
}

bool Recorder::writeCurrent() {
  if (writer_.pace().isInLockstep()) {
    full_.store(true, std::memory_order_relaxed);
  }
  mutex_.unlock();
  std::size_t written = 0;
  tryTo([&] {
    written = writer_.write(current_, position_);
    return written > 0;
  });
  std::size_t bytes = 0;
  std::size_t notes = 0;
  for (std::size_t i = 0; i < written; ++i) {
    bytes += current_[position_ + i].bytes;
    notes += current_[position_ + i].isNote() ? 1U : 0U;
  }
  position_ += written;
  const bool finished = position_ == current_.size();
  mutex_.lock();
  account(written - notes, notes, bytes);
  mutex_.unlock();
  if (finished) {
    current_.clear();
    position_ = 0;
  }
  const bool healthy = written > 0 && tryTo([this] { return writer_.settle(); });
  if (writer_.hasMoreToBringIn()) {
    nextMaintenance_ = std::min(nextMaintenance_, SteadyClock::now() + options_.lastRetry);
  }
  mutex_.lock();
  return healthy;
}

void Recorder::takeRetention() {
  if (!retention_) return;
  const RecorderOptions retention = *std::exchange(retention_, std::nullopt);
  mutex_.unlock();
  writer_.setRetention(retention);
  nextMaintenance_ = SteadyClock::now();  // what is too much or too old by now goes at once
  mutex_.lock();
}

// A piece at a time, then a long rest: what it costs stays below a hundredth of the time.
bool Recorder::verify() {
  mutex_.unlock();
  const bool healthy = tryTo([this] { return writer_.verify(); });
  const auto pause = writer_.isVerified() ? options_.verifyRest : options_.verifyInterval;
  nextVerification_ = SteadyClock::now() + pause;
  mutex_.lock();
  return healthy;
}

void Recorder::noteOldest() {
  TimePoint::rep since = 0;
  if (position_ < current_.size()) {
    since = currentSince_.time_since_epoch().count();
  } else if (!incoming_.empty()) {
    since = incomingSince_.time_since_epoch().count();
  }
  oldestSince_.store(since, std::memory_order_relaxed);
}

void Recorder::notePace() {
  most_ = std::min(options_.highWaterEvents, writer_.pace().mostWaiting());
}

bool Recorder::hasRoom() const {
  if (writer_.pace().isInLockstep() && position_ < current_.size()) return false;  // the next transaction begins
  const TimePoint::rep since = oldestSince_.load(std::memory_order_relaxed);
  const auto age =
      since == 0 ? TimePoint::duration::zero() : SteadyClock::now() - TimePoint(TimePoint::duration(since));
  return handedOver_ - committed_ - failed_ <= std::min(options_.lowWaterEvents, most_ / 2) &&
         waitingBytes_ <= options_.lowWaterBytes && age < options_.oldestWaiting;
}

bool Recorder::maintain() {
  mutex_.unlock();
  const bool healthy = tryTo([this] { return writer_.maintain() && writer_.settle(); });
  auto pause = writer_.hasMoreToBringIn() ? options_.lastRetry : options_.maintenanceInterval;
  if (writer_.hasMoreToExpire()) {
    pause = std::chrono::milliseconds(0);
  }
  nextMaintenance_ = SteadyClock::now() + pause;
  mutex_.lock();
  expired_ = writer_.expired();
  return healthy;
}

// Called locked, and returns so; the room handler runs without the lock.
void Recorder::account(std::size_t events, std::size_t notes, std::size_t bytes) {
  committed_ += events;
  notesDone_ += notes;
  waitingBytes_ -= bytes;
  expired_ = writer_.expired();
  if (events + notes > 0) {
    lastId_ = writer_.lastId();
    noteOldest();
    notePace();
    noteRoom();
    if (!countsOpen_ || counts_.isTorn()) {
      mutex_.unlock();
      try {
        openCounts();
      } catch (const std::bad_alloc&) {  // the next commit tries again
      }
      mutex_.lock();
    }
    keepCounts();
  }
  done_.notifyAll();
  static_cast<void>(answerSettled());
  if ((full_.load(std::memory_order_relaxed) || isCrowded()) && hasRoom()) {
    full_.store(false, std::memory_order_relaxed);
    crowded_.store(false, std::memory_order_relaxed);
    if (roomHandler_) {
      mutex_.unlock();
      roomHandler_();
      mutex_.lock();
    }
  }
}

// Called locked, and returns so; queues are called without the lock. False when memory is missing for an answer: it is
// still owed.
bool Recorder::answerSettled() {
  owesAnswer_ = false;  // else it fails here too, and is tried again with the next retry
  while (!settling_.empty() && isCommitted(settling_.front()->target, settling_.front()->notes)) {
    const std::shared_ptr<Settling> settled = settling_.front();
    mutex_.unlock();
    const bool answered = answer(settled);
    mutex_.lock();
    if (!answered) return false;
    settling_.pop_front();
  }
  return true;
}

void Recorder::giveUp() {
  Settlement unanswered;
  unanswered.swap(settling_);
  const std::uint64_t lost = handedOver_ - committed_ - failed_;
  failed_ += lost;
  notesLost_ = notesDone_ != notes_;
  keepCounts();
  waitingBytes_ = 0;
  incoming_.clear();
  opened_ = true;
  oldestSince_.store(0, std::memory_order_relaxed);
  full_.store(false, std::memory_order_relaxed);
  done_.notifyAll();
  mutex_.unlock();
  unanswered.clear();  // each may hold the last of something
  if (lost > 0) {
    tell([&] {
      return "recorder gives up " + std::to_string(lost) + " events that could not be written to " +
             options_.file.string() + ": " + writer_.problem();
    });
  }
  mutex_.lock();
}

}  // namespace tarn::recorder
