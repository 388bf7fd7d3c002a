#include "recorder/Recorder.h"

#include <algorithm>
#include <string>
#include <utility>

#include "service/vocabulary/TarnReportingSignpost.h"

namespace tarn::recorder {

namespace {

using SteadyClock = std::chrono::steady_clock;

}  // namespace

Recorder::Recorder(RecorderOptions options, platform::Log& log, const platform::Clock& clock)
    : options_(std::move(options)), log_(log), writer_(options_, log, clock), retry_(options_.firstRetry) {}

Recorder::~Recorder() {
  shutdown();
}

void Recorder::start() {
  thread_ = std::thread([this] { run(); });
}

void Recorder::waitUntilOpened() {
  const platform::MutexLock lock(mutex_);
  done_.wait(mutex_, [this]() TARN_REQUIRES(mutex_) { return opened_; });
}

void Recorder::shutdown() {
  if (!thread_.joinable()) return;
  {
    const platform::MutexLock lock(mutex_);
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
    const platform::MutexLock lock(mutex_);
    ++handedOver_;
    if (refusing_) [[unlikely]] {
      ++failed_;
      refused = !std::exchange(refusalLogged_, true);
    } else {
      if (incoming_.empty()) {
        incomingSince_ = SteadyClock::now();
      }
      const std::size_t before = incoming_.bytes();
      waitingBytes_ += incoming_.add(backend, name, std::move(payload), std::move(detail), time);
      // While a group is gathered the writer looks by itself; it is called only to begin one, or for a large one.
      wake = std::exchange(asleep_, false) || incoming_.size() == options_.groupEvents ||
             (before < options_.groupBytes && incoming_.bytes() >= options_.groupBytes);
      if (handedOver_ - committed_ - failed_ >= options_.highWaterEvents || waitingBytes_ >= options_.highWaterBytes) {
        full_.store(true, std::memory_order_relaxed);
      }
    }
  }
  if (wake) {
    work_.notifyOne();
  }
  if (refused) {
    log_.error("recorder is not running; the events handed over now are lost");
  }
}

RecorderCounters Recorder::counters() const {
  const platform::MutexLock lock(mutex_);
  return {handedOver_, committed_, handedOver_ - committed_ - failed_, expired_, failed_};
}

bool Recorder::flush(std::chrono::milliseconds timeout) {
  const platform::MutexLock lock(mutex_);
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
    const platform::MutexLock lock(mutex_);
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

void Recorder::run() {
  bool healthy = writer_.open() && writer_.settle();
  int triesLeft = options_.shutdownTries;
  {
    const platform::MutexLock lock(mutex_);
    opened_ = true;
    done_.notifyAll();
    for (;;) {
      healthy ? waitForWork() : waitForRetry();
      if (stopping_ && (!hasWaiting() || triesLeft == 0)) break;
      if (position_ == current_.size() && !incoming_.empty()) {
        current_.swap(incoming_);
        position_ = 0;
      }
      healthy = position_ < current_.size() ? writeCurrent() : maintain();
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
    const bool due = !work_.waitUntil(mutex_, nextMaintenance_);
    asleep_ = false;
    if (due && incoming_.empty()) return;
  }
  gather();
}

// Company for a commit comes cheap, as long as it doesn't keep the first event waiting.
void Recorder::gather() {
  const TimePoint latest = incomingSince_ + options_.groupTime;
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
  mutex_.lock();
  return healthy;
}

bool Recorder::maintain() {
  mutex_.unlock();
  const bool healthy = writer_.maintain() && writer_.settle();
  const auto pause = writer_.hasMoreToExpire() ? std::chrono::milliseconds(0) : options_.maintenanceInterval;
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
  done_.notifyAll();
  answerSettled();
  const bool hasRoom = full_.load(std::memory_order_relaxed) &&
                       handedOver_ - committed_ - failed_ <= options_.lowWaterEvents &&
                       waitingBytes_ <= options_.lowWaterBytes;
  if (hasRoom) {
    full_.store(false, std::memory_order_relaxed);
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
  waitingBytes_ = 0;
  incoming_.clear();
  opened_ = true;
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
