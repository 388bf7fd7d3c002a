#include "recorder/Recorder.h"

#include <sys/resource.h>

#include <algorithm>
#include <string>
#include <utility>

#include "service/vocabulary/TarnReportingSignpost.h"

namespace tarn::recorder {

namespace {

using SteadyClock = std::chrono::steady_clock;

constexpr int kAhead = 5;

// What waits for this thread is what a crash costs, so it goes ahead of those that bring more, where that is permitted.
void goAhead() {
  static_cast<void>(::setpriority(PRIO_PROCESS, 0, ::getpriority(PRIO_PROCESS, 0) - kAhead));
}

}  // namespace

Recorder::Recorder(RecorderOptions options, platform::Log& log, const platform::Clock& clock)
    : options_(std::move(options)),
      log_(log),
      writer_(options_, log, clock),
      retry_(options_.firstRetry),
      most_(options_.highWaterEvents) {}

Recorder::~Recorder() {
  shutdown();
}

void Recorder::start() {
  openCounts();  // before anything more is handed over
  if (left_) {
    writer_.expect(left_->lastId);
  }
  thread_ = std::thread([this] { run(); });
}

void Recorder::waitUntilOpened() {
  const MutexLock lock(mutex_);
  done_.wait(mutex_, [this]() TARN_REQUIRES(mutex_) { return opened_; });
}

void Recorder::shutdown() {
  if (!thread_.joinable()) return;
  {
    const MutexLock lock(mutex_);
    stopping_ = true;
    refusing_ = true;  // from here on events are refused, or a hail of them would put the end off for ever
  }
  work_.notifyOne();
  thread_.join();
}

void Recorder::record(std::string_view backend, std::string_view name, plist::Dictionary payload,
                      plist::Dictionary detail, double time) {
  const TarnReportingSignpost signpost(SignpostCategory::BackEnd, "recorder", backend);
  bool wake = false;
  bool refused = false;
  {
    const MutexLock lock(mutex_);
    counts_.handOver(before_.handedOver + ++handedOver_);
    if (refusing_) [[unlikely]] {
      ++failed_;
      keepCounts();
      refused = !std::exchange(refusalLogged_, true);
    } else {
      if (incoming_.empty()) {
        incomingSince_ = SteadyClock::now();
        if (oldestSince_.load(std::memory_order_relaxed) == 0) {
          oldestSince_.store(incomingSince_.time_since_epoch().count(), std::memory_order_relaxed);
        }
      }
      const std::size_t before = incoming_.bytes();
      waitingBytes_ += incoming_.add(backend, name, std::move(payload), std::move(detail), time);
      // While a group is gathered the writer looks by itself; it is called only to begin one, or for a large one.
      wake = std::exchange(asleep_, false) || incoming_.size() == options_.groupEvents ||
             (before < options_.groupBytes && incoming_.bytes() >= options_.groupBytes);
      noteUse();
    }
  }
  if (wake) {
    work_.notifyOne();
  }
  if (refused) {
    log_.error("recorder is not running; the events handed over now are lost");
  }
}

void Recorder::noteUse() noexcept {
  const std::uint64_t waiting = handedOver_ - committed_ - failed_;
  if (waiting < most_ * 3 / 4 && waitingBytes_ < options_.highWaterBytes * 3 / 4) return;
  crowded_.store(true, std::memory_order_relaxed);
  if (waiting >= most_ || waitingBytes_ >= options_.highWaterBytes) {
    full_.store(true, std::memory_order_relaxed);
  }
}

RecorderCounters Recorder::counters() const {
  const MutexLock lock(mutex_);
  return {handedOver_, committed_, handedOver_ - committed_ - failed_, expired_, failed_, lostBefore_};
}

bool Recorder::isFull() noexcept {
  if (full_.load(std::memory_order_relaxed)) return true;
  const TimePoint::rep since = oldestSince_.load(std::memory_order_relaxed);
  if (since == 0) return false;
  const auto age = SteadyClock::now() - TimePoint(TimePoint::duration(since));
  if (age < options_.oldestWaiting) return false;
  // What waits now will be committed, and then the room is told.
  const MutexLock lock(mutex_);
  if (oldestSince_.load(std::memory_order_relaxed) != since) return false;
  full_.store(true, std::memory_order_relaxed);
  return true;
}

bool Recorder::flush(std::chrono::milliseconds timeout) {
  const MutexLock lock(mutex_);
  const std::uint64_t target = handedOver_;
  awaited_ = target;
  work_.notifyOne();
  // Events are committed in their order, so the count alone tells.
  const bool done =
      done_.waitFor(mutex_, timeout, [&]() TARN_REQUIRES(mutex_) { return committed_ + failed_ >= target; });
  return done && failed_ == 0;
}

void Recorder::settle(std::shared_ptr<platform::WorkQueue> queue, platform::Work done) {
  {
    const MutexLock lock(mutex_);
    if (failed_ > 0) return;  // nothing will be whole again
    if (committed_ != handedOver_) {
      awaited_ = handedOver_;
      settling_.push_back({handedOver_, std::move(queue), std::move(done)});
      work_.notifyOne();
      return;
    }
  }
  queue->async(std::move(done));
}

void Recorder::openCounts() {
  const MutexLock lock(mutex_);
  std::filesystem::path file = options_.file;
  file += ".counts";
  const auto opened = counts_.open(file);
  const bool isFirst = !countsOpen_ && committed_ == 0;
  countsOpen_ = !opened.failed();
  if (!countsOpen_) return;
  if (isFirst && opened.value) {
    left_ = before_ = *opened.value;
    lastId_ = before_.lastId;
  }
  keepCounts();
}

void Recorder::keepCounts() {
  counts_.keep({before_.handedOver + handedOver_, before_.committed + committed_, before_.failed + failed_, lastId_});
}

// Ids are given in the order of hand-over, so the file's last one tells how many of the run before are in it.
void Recorder::tellWhatWasLost() {
  const HandOverCounts left = *std::exchange(left_, std::nullopt);
  const MutexLock lock(mutex_);
  const std::int64_t in = writer_.lastId() - left.lastId - static_cast<std::int64_t>(committed_);
  const std::uint64_t known = left.committed + left.failed + static_cast<std::uint64_t>(std::max<std::int64_t>(in, 0));
  lostBefore_ = left.handedOver > known ? left.handedOver - known : 0;
  if (lostBefore_ > 0) {
    log_.error("recorder lost " + std::to_string(lostBefore_) +
               " events that were handed over to the run before and not committed when it ended");
  }
  before_ = {};
  lastId_ = writer_.lastId();
  keepCounts();
}

void Recorder::run() {
  goAhead();
  bool healthy = writer_.open() && writer_.settle();
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
  while (incoming_.empty() && !stopping_) {
    asleep_ = true;
    const bool due = !work_.waitUntil(mutex_, std::min(nextMaintenance_, nextVerification_));
    asleep_ = false;
    if (due && incoming_.empty()) return;
  }
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
  const auto pause = std::exchange(retry_, std::min(retry_ * 2, options_.lastRetry));
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
  const std::size_t events = writer_.write(current_, position_);
  std::size_t bytes = 0;
  for (std::size_t i = 0; i < events; ++i) {
    bytes += current_[position_ + i].bytes;
  }
  position_ += events;
  const bool finished = position_ == current_.size();
  mutex_.lock();
  account(events, bytes);
  mutex_.unlock();
  if (finished) {
    current_.clear();
    position_ = 0;
  }
  const bool healthy = events > 0 && writer_.settle();
  if (writer_.hasMoreToBringIn()) {
    nextMaintenance_ = std::min(nextMaintenance_, SteadyClock::now() + options_.lastRetry);
  }
  mutex_.lock();
  return healthy;
}

// A piece at a time, then a long rest: what it costs stays below a hundredth of the time.
bool Recorder::verify() {
  mutex_.unlock();
  const bool healthy = writer_.verify();
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
  const bool healthy = writer_.maintain() && writer_.settle();
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
void Recorder::account(std::size_t events, std::size_t bytes) {
  committed_ += events;
  waitingBytes_ -= bytes;
  expired_ = writer_.expired();
  if (events > 0) {
    lastId_ = writer_.lastId();
    noteOldest();
    notePace();
    if (!countsOpen_ || counts_.isTorn()) {
      mutex_.unlock();
      openCounts();
      mutex_.lock();
    }
    keepCounts();
  }
  done_.notifyAll();
  answerSettled();
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

// Called locked, and returns so; queues are called without the lock.
void Recorder::answerSettled() {
  while (!settling_.empty() && settling_.front().handedOver <= committed_) {
    Settling settled = std::move(settling_.front());
    settling_.pop_front();
    mutex_.unlock();
    settled.queue->async(std::move(settled.done));
    mutex_.lock();
  }
}

void Recorder::giveUp() {
  std::deque<Settling> unanswered;
  unanswered.swap(settling_);
  const std::uint64_t lost = handedOver_ - committed_ - failed_;
  failed_ += lost;
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
    log_.error("recorder gives up " + std::to_string(lost) + " events that could not be written to " +
               options_.file.string() + ": " + writer_.problem());
  }
  mutex_.lock();
}

}  // namespace tarn::recorder
