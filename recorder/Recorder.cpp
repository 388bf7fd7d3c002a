// SPDX-License-Identifier: Apache-2.0
#include "recorder/Recorder.h"

#include <new>
#include <utility>

#include "service/vocabulary/TarnReportingSignpost.h"

namespace tarn::recorder {

namespace {

using SteadyClock = std::chrono::steady_clock;

// From so many of `most` on it is crowded.
std::size_t crowdOf(std::size_t most) {
  return most * 3 / 4;
}

}  // namespace

Recorder::Recorder(RecorderOptions options, platform::Log& log, const platform::Clock& clock)
    : options_(std::move(options)),
      countsFile_(options_.file.string() + ".counts"),
      log_(log),
      writer_(options_, log, clock),
      retry_(options_.firstRetry),
      room_(crowdOf(options_.highWaterEvents)),
      most_(options_.highWaterEvents) {}

Recorder::~Recorder() {
  shutdown();
}

void Recorder::start() {
  {
    // What comes until clients are held up is taken without asking for memory.
    const MutexLock lock(mutex_);
    incoming_.reserve(options_.highWaterEvents);
    current_.reserve(options_.highWaterEvents);
  }
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
  const platform::SessionNumber session = options_.sessionOf == nullptr ? 0 : options_.sessionOf();
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
      const std::size_t before = incoming_.bytes();
      try {
        waitingBytes_ += incoming_.add(backend, name, std::move(payload), std::move(detail), time, session);
      } catch (const std::bad_alloc&) {
        ++failed_;
        ++withoutMemory_;
        keepCounts();
        throw;
      }
      wake = noteIncoming(before);
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

void Recorder::note(SessionNote note) {
  bool wake = false;
  {
    const MutexLock lock(mutex_);
    if (refusing_) return;
    const std::size_t before = incoming_.bytes();
    waitingBytes_ += incoming_.add(std::move(note));
    ++notes_;
    wake = noteIncoming(before);
    noteUse();
  }
  if (wake) {
    work_.notifyOne();
  }
}

bool Recorder::noteIncoming(std::size_t bytesBefore) {
  if (incoming_.size() == 1) {
    incomingSince_ = SteadyClock::now();
    if (oldestSince_.load(std::memory_order_relaxed) == 0) {
      oldestSince_.store(incomingSince_.time_since_epoch().count(), std::memory_order_relaxed);
    }
  }
  // While a group is gathered the writer looks by itself; it is called only to begin one, or for a large one.
  return std::exchange(asleep_, false) || incoming_.size() == options_.groupEvents ||
         (bytesBefore < options_.groupBytes && incoming_.bytes() >= options_.groupBytes);
}

void Recorder::noteUse() noexcept {
  noteRoom();
  const std::uint64_t waiting = handedOver_ - committed_ - failed_;
  if (waiting < crowdOf(most_) && waitingBytes_ < crowdOf(options_.highWaterBytes)) return;
  crowded_.store(true, std::memory_order_relaxed);
  if (waiting >= most_ || waitingBytes_ >= options_.highWaterBytes) {
    full_.store(true, std::memory_order_relaxed);
  }
}

void Recorder::noteRoom() noexcept {
  const std::uint64_t waiting = handedOver_ - committed_ - failed_;
  const std::size_t crowd = crowdOf(most_);
  room_.store(waiting < crowd ? crowd - waiting : 0, std::memory_order_relaxed);
}

void Recorder::setRetention(const RecorderOptions& options) {
  {
    const MutexLock lock(mutex_);
    retention_ = options;
  }
  work_.notifyAll();
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
  const std::uint64_t target = accepted();
  const std::uint64_t notes = notes_;
  awaited_ = target;
  awaitedNotes_ = notes;
  work_.notifyOne();
  // Events are committed in their order, so the count alone tells.
  const bool done = done_.waitFor(mutex_, timeout,
                                  [&]() TARN_REQUIRES(mutex_) { return isCommitted(target, notes) || hasGivenUp(); });
  return done && !hasGivenUp();
}

Recorder::Settlement Recorder::settlement(std::shared_ptr<platform::WorkQueue> queue, platform::Work done) {
  return {std::make_shared<Settling>(Settling{0, 0, std::move(queue), std::move(done)})};
}

void Recorder::settle(Settlement settlement) noexcept {
  const std::shared_ptr<Settling> settling = settlement.front();
  {
    const MutexLock lock(mutex_);
    if (hasGivenUp()) return;  // nothing will be whole again
    settling->target = accepted();
    settling->notes = notes_;
    if (!isCommitted(settling->target, settling->notes)) {
      awaited_ = settling->target;
      awaitedNotes_ = settling->notes;
      settling_.splice(settling_.end(), settlement);
      work_.notifyOne();
      return;
    }
  }
  if (!answer(settling)) {
    {
      const MutexLock lock(mutex_);
      settling_.splice(settling_.end(), settlement);
      owesAnswer_ = true;
    }
    work_.notifyOne();  // the writer tries again
  }
}

// Whether there was the memory to hand the answer over.
bool Recorder::answer(const std::shared_ptr<Settling>& settled) noexcept {
  try {
    settled->queue->async([settled] { std::exchange(settled->done, {})(); });
    return true;
  } catch (const std::bad_alloc&) {
    return false;
  }
}

void Recorder::openCounts() {
  const MutexLock lock(mutex_);
  const auto opened = counts_.open(countsFile_);
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

}  // namespace tarn::recorder
