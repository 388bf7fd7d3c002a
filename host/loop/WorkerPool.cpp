// SPDX-License-Identifier: Apache-2.0
#include "host/loop/WorkerPool.h"

#include <algorithm>
#include <iterator>
#include <set>
#include <system_error>

#include "host/loop/CurrentQueue.h"
#include "host/system/MemoryReserve.h"
#include "host/system/ThreadRank.h"

namespace tarn::linux_host {

namespace {

using std::chrono::nanoseconds;

// Pieces of one queue that a thread runs before the next queue has its turn.
constexpr std::size_t kPiecesPerTurn = 64;
// How soon a thread without work looks again by itself, once.
constexpr nanoseconds kLookAgain = std::chrono::microseconds(500);
// The longest sleep: a bound that keeps the arithmetic of the system's timed waits in range.
constexpr nanoseconds kLongestSleep = std::chrono::hours(1);
// Room that a burst took is given back when it was for more pieces than this.
constexpr std::size_t kKeptPieces = 16;
// How long nobody takes up what is due when there is no memory for it.
constexpr nanoseconds kShortagePause = std::chrono::milliseconds(1);

void runOne(WorkerPool::Line& line, OwnedWork work) {
  line.waiting.fetch_sub(1, std::memory_order_relaxed);
  MemoryReserve::orGiveUp(MemoryReserve::Loss::Work, work);
}

}  // namespace

bool WorkerPool::start(std::size_t threads) {
  const MutexLock lock(mutex_);
  if (!threads_.empty() || stopping_) return true;
  try {
    threads_.reserve(threads);
    wakeUps_.reserve(threads);
    for (std::size_t i = 0; i < threads; ++i) {
      threads_.emplace_back([this] { serve(); });
    }
  } catch (const std::system_error&) {  // the system has no more threads
  } catch (const std::bad_alloc&) {
  }
  return !threads_.empty();
}

void WorkerPool::stop() {
  std::vector<std::thread> threads;
  {
    const MutexLock lock(mutex_);
    stopping_ = true;
    threads.swap(threads_);
  }
  changed_.notifyAll();
  ended_.notifyAll();
  for (std::thread& thread : threads) {
    thread.join();
  }
  destroyWhatIsLeft();
}

// Work holds its queue as a rule, and the queue holds its work: nobody else would ever let go of either.
void WorkerPool::destroyWhatIsLeft() {
  // Destroyed after the lock: its end may come back here.
  std::vector<OwnedWork> left;
  DelayedWork<Delayed> delayed;
  const MutexLock lock(mutex_);
  over_ = true;
  std::swap(delayed, delayed_);
  for (auto& [moment, line] : suspensions_) {
    left.push_back(std::move(line->next));
    for (auto* pieces : {&line->taken, &line->incoming}) {
      std::move(pieces->begin(), pieces->end(), std::back_inserter(left));
      pieces->clear();
    }
    line->position = 0;
    line->suspension.reset();
  }
  suspensions_.clear();
}

void WorkerPool::add(const std::shared_ptr<Line>& line, platform::Work&& work, Urgency urgency) {
  const MutexLock lock(mutex_);
  if (over_) return;
  enqueue(line, OwnedWork(std::move(work)));
  if (urgency == Urgency::AtOnce && looking_) {
    ended_.notifyOne();
  }
}

void WorkerPool::addAfter(const std::shared_ptr<Line>& line, nanoseconds delay, platform::Work work) {
  const MutexLock lock(mutex_);
  if (over_) return;
  if (delay <= nanoseconds::zero()) {
    enqueue(line, OwnedWork(std::move(work)));
    return;
  }
  delayed_.add(deadlineAfter(clock_.monotonic(), delay), Delayed(line, OwnedWork(std::move(work))));
  watchNextMoment();
}

void WorkerPool::suspend(const std::shared_ptr<Line>& line, nanoseconds longest, platform::Work next) {
  const MutexLock lock(mutex_);
  const auto moment = deadlineAfter(clock_.monotonic(), std::max(longest, nanoseconds::zero()));
  line->suspension = suspensions_.emplace(std::pair(moment, nextSuspension_++), line).first;
  line->interrupted = true;
  line->next = OwnedWork(std::move(next));
  line->held = line->taken.size() - line->position + line->incoming.size() + 1;
  held_ += line->held;
  countUnfinished();
  watchNextMoment();
}

void WorkerPool::resume(const std::shared_ptr<Line>& line) {
  const MutexLock lock(mutex_);
  if (line->suspension) {
    endSuspension(*line->suspension);
  }
}

void WorkerPool::help(const std::shared_ptr<Line>& line, nanoseconds longest) {
  if (CurrentQueue::is(line.get())) return;
  const MutexLock lock(mutex_);
  ++helpers_;
  turnEnded_.waitFor(mutex_, longest, [&line] { return !line->running; });
  --helpers_;
  const auto place = std::find(runnable_.begin(), runnable_.end(), line);
  if (place != runnable_.end()) {
    runSome(place);
  }
}

// A line with unfinished work stands in the pool's line, is run or is suspended. Each gets a piece after what it has.
void WorkerPool::afterWhatIsUnfinished(platform::Work done) {
  struct Barrier {
    std::atomic<std::size_t> left;
    platform::Work done;
    void pass() {
      if (left.fetch_sub(1) == 1) {
        done();
      }
    }
  };
  const auto barrier = std::make_shared<Barrier>();
  barrier->done = std::move(done);
  barrier->left = 1;
  {
    const MutexLock lock(mutex_);
    std::set<std::shared_ptr<Line>> busy(runnable_.begin(), runnable_.end());
    busy.insert(running_.begin(), running_.end());
    for (const auto& [moment, line] : suspensions_) {
      busy.insert(line);
    }
    barrier->left += busy.size();
    for (const std::shared_ptr<Line>& line : busy) {
      enqueue(line, OwnedWork([barrier] { barrier->pass(); }));
    }
  }
  barrier->pass();
}

std::size_t WorkerPool::unfinished() const {
  const MutexLock lock(mutex_);
  return unfinished_;
}

bool WorkerPool::settle(nanoseconds longest) {
  const MutexLock lock(mutex_);
  return settled_.waitFor(mutex_, std::min(longest, kLongestSleep),
                          [this]() TARN_REQUIRES(mutex_) { return unfinished_ == 0; });
}

void WorkerPool::enqueue(const std::shared_ptr<Line>& line, OwnedWork&& work) {
  line->incoming.push_back(std::move(work));
  line->waiting.fetch_add(1, std::memory_order_relaxed);
  if (line->suspension) {
    ++line->held;
    ++held_;
  }
  countUnfinished();
  if (!line->scheduled && !line->suspension) {
    schedule(line);
  }
}

void WorkerPool::countUnfinished() {
  if (++unfinished_ >= marks_.high) {
    full_.store(true, std::memory_order_relaxed);
  }
  noteReady();
}

bool WorkerPool::isCrowded(std::size_t most) noexcept {
  if (crowded_.load(std::memory_order_relaxed)) return true;
  if (ready_.load(std::memory_order_relaxed) <= most) return false;
  const MutexLock lock(mutex_);
  if (unfinished_ - held_ <= most) return false;
  crowdEnds_ = most / 2;
  crowded_.store(true, std::memory_order_relaxed);
  return true;
}

void WorkerPool::schedule(const std::shared_ptr<Line>& line) {
  line->scheduled = true;
  line->place.front() = line;
  runnable_.splice(runnable_.end(), line->place);
  if (!looking_) {
    wakeOne();
  }
}

void WorkerPool::endSuspension(Suspensions::iterator suspension) {
  const auto line = std::move(suspension->second);
  suspensions_.erase(suspension);
  line->suspension.reset();
  held_ -= std::exchange(line->held, 0);
  noteReady();
  line->waiting.fetch_add(1, std::memory_order_relaxed);
  if (!line->scheduled) {  // else the piece that suspended it still runs
    schedule(line);
  }
}

void WorkerPool::takeDue() {
  if (delayed_.empty() && suspensions_.empty()) return;
  const auto now = clock_.monotonic();
  while (!takeDuePieces(now)) {
    changed_.waitFor(mutex_, kShortagePause);
  }
  while (!suspensions_.empty() && suspensions_.begin()->first.first <= now) {
    endSuspension(suspensions_.begin());
  }
}

// False without the memory for it; what wasn't taken is still there.
bool WorkerPool::takeDuePieces(nanoseconds now) {
  try {
    while (delayed_.due(now)) {
      std::vector<OwnedWork>& incoming = delayed_.earliest().first->incoming;
      if (incoming.size() == incoming.capacity()) {
        incoming.reserve(2 * incoming.size() + 1);
      }
      auto [line, work] = delayed_.take();
      enqueue(line, std::move(work));
    }
    return true;
  } catch (const std::bad_alloc&) {
    return false;
  }
}

std::optional<nanoseconds> WorkerPool::nextMoment() const {
  std::optional<nanoseconds> moment;
  if (!delayed_.empty()) {
    moment = delayed_.deadline();
  }
  if (!suspensions_.empty()) {
    moment = std::min(moment.value_or(nanoseconds::max()), suspensions_.begin()->first.first);
  }
  return moment;
}

void WorkerPool::wakeOne() {
  if (!wakeUps_.empty()) {
    changed_.notifyOne();
  }
}

// While a thread sleeps, one must wake by the earliest moment. Whoever is about to look goes to sleep knowing it.
void WorkerPool::watchNextMoment() {
  const auto moment = nextMoment();
  if (moment && !looking_ &&
      std::none_of(wakeUps_.begin(), wakeUps_.end(), [&](nanoseconds wakeUp) { return wakeUp <= *moment; })) {
    wakeOne();
  }
}

void WorkerPool::serve() {
  standBack();  // what it works off comes from the server queue, which others wait for
  const MutexLock lock(mutex_);
  bool worked = false;
  for (;;) {
    takeDue();
    if (!runnable_.empty()) {
      const auto place = runnable_.begin();
      // Another for what this thread leaves: more work, or a moment that nobody would wait for.
      if (std::next(place) != runnable_.end()) {
        wakeOne();
      } else {
        watchNextMoment();
      }
      worked = true;
      runSome(place);
    } else if (stopping_) {
      return;
    } else if (std::exchange(worked, false) && !looking_) {
      look();
    } else {
      sleep();
    }
  }
}

void WorkerPool::look() {
  looking_ = true;
  auto longest = kLookAgain;
  if (const auto moment = nextMoment()) {
    longest = std::min(longest, *moment - clock_.monotonic());
  }
  ended_.waitFor(mutex_, longest);
  looking_ = false;
}

void WorkerPool::sleep() {
  const auto moment = nextMoment();
  const nanoseconds wakeUp = moment.value_or(nanoseconds::max());
  wakeUps_.push_back(wakeUp);
  if (moment) {
    changed_.waitFor(mutex_, std::min(*moment - clock_.monotonic(), kLongestSleep));
  } else {
    changed_.wait(mutex_);
  }
  wakeUps_.erase(std::find(wakeUps_.begin(), wakeUps_.end(), wakeUp));
}

// Of the line that stands there in the pool's line.
void WorkerPool::runSome(Lines::iterator place) {
  running_.splice(running_.end(), runnable_, place);
  const std::shared_ptr<Line> line = *place;
  line->running = true;
  OwnedWork next = std::move(line->next);
  if (line->position == line->taken.size()) {
    line->taken.clear();
    line->position = 0;
    line->taken.swap(line->incoming);
  }
  mutex_.unlock();
  const std::size_t finished = runTurn(*line, std::move(next));
  mutex_.lock();
  line->running = false;
  if (helpers_ > 0) {
    turnEnded_.notifyAll();
  }
  const bool more = line->next.work || line->position < line->taken.size() || !line->incoming.empty();
  line->scheduled = more && !line->suspension;
  if (line->scheduled) {
    runnable_.splice(runnable_.end(), running_, place);
  } else {
    line->place.splice(line->place.end(), running_, place);
    line->place.front() = nullptr;
  }
  account(finished);
}

std::size_t WorkerPool::runTurn(Line& line, OwnedWork next) {
  const CurrentQueue current(&line);
  std::size_t finished = 0;
  if (next.work) {
    runOne(line, std::move(next));
    ++finished;
  }
  while (!line.interrupted && finished < kPiecesPerTurn && line.position < line.taken.size()) {
    runOne(line, std::move(line.taken[line.position++]));
    ++finished;
  }
  line.interrupted = false;
  if (line.position == line.taken.size() && line.taken.capacity() > kKeptPieces) {
    line.taken = std::vector<OwnedWork>();
    line.position = 0;
  }
  return finished;
}

void WorkerPool::account(std::size_t finished) {
  unfinished_ -= finished;
  noteReady();
  if (unfinished_ == 0) {
    settled_.notifyAll();
  }
  const bool hasRoom = unfinished_ <= marks_.low && full_.exchange(false, std::memory_order_relaxed);
  const bool thinsOut = unfinished_ - held_ <= crowdEnds_ && crowded_.exchange(false, std::memory_order_relaxed);
  if ((hasRoom || thinsOut) && roomHandler_) {
    mutex_.unlock();
    roomHandler_();
    mutex_.lock();
  }
}

}  // namespace tarn::linux_host
