// SPDX-License-Identifier: Apache-2.0
#include "host/log/QueuedLog.h"

#include <algorithm>
#include <cerrno>
#include <exception>
#include <new>
#include <utility>

#include "host/log/PrefixedLog.h"
#include "platform/LogCondition.h"

namespace tarn::linux_host {

namespace {

constexpr std::string_view kModule = "QueuedLog";
// Between two tries of an output that takes nothing.
constexpr std::chrono::milliseconds kFirstPause{5};
constexpr std::chrono::milliseconds kLongestPause{500};
// For what waits at the end.
constexpr std::chrono::milliseconds kLastWhile{200};

}  // namespace

QueuedLog::QueuedLog(std::unique_ptr<LogOutput> output, const platform::Clock& clock, platform::LogLevel threshold,
                     std::size_t mostBytes)
    : output_(std::move(output)), clock_(clock), mostBytes_(mostBytes) {
  setThreshold(threshold);
}

QueuedLog::~QueuedLog() {
  if (!thread_.joinable()) return;
  settle(kLastWhile);
  {
    const MutexLock lock(mutex_);
    stopping_ = true;
  }
  work_.notifyAll();
  thread_.join();
}

void QueuedLog::start() {
  thread_ = std::thread([this] { run(); });
}

void QueuedLog::write(const platform::LogEntry& entry) noexcept {
  bool wake = false;
  try {
    std::string text = output_->formed(clock_.epochSeconds(), entry);
    const MutexLock lock(mutex_);
    // Once lines are lost, all are until what waited is written: what is told then has one place in the log.
    if (lost_ != 0 || (bytes_ != 0 && bytes_ + text.size() > mostBytes_)) {
      lose();
    } else {
      const std::size_t size = text.size();
      waiting_.push_back(std::move(text));
      bytes_ += size;
      wake = std::exchange(asleep_, false);
    }
  } catch (const std::exception&) {  // no memory for a line
    const MutexLock lock(mutex_);
    lose();
    lostError_ = ENOMEM;
    wake = std::exchange(asleep_, false);
  }
  if (wake) {
    work_.notifyOne();
  }
}

bool QueuedLog::settle(std::chrono::milliseconds longest) {
  const MutexLock lock(mutex_);
  return done_.waitFor(mutex_, longest, [this]() TARN_REQUIRES(mutex_) { return allIsWritten(); });
}

void QueuedLog::run() {
  mutex_.lock();
  while (!stopping_) {
    if (!waiting_.empty()) {
      const Texts taken = std::exchange(waiting_, {});
      mutex_.unlock();
      writeAll(taken);
      mutex_.lock();
    } else if (lost_ != 0) {
      Texts told;
      try {
        told.push_back(lostLine(lost_, lostError_));
      } catch (const std::bad_alloc&) {  // told once there is the memory for it
        work_.waitFor(mutex_, kFirstPause, [this]() TARN_REQUIRES(mutex_) { return stopping_; });
        continue;
      }
      lost_ = 0;
      lostError_ = 0;
      bytes_ += told.front().size();
      mutex_.unlock();
      writeAll(told);
      mutex_.lock();
    } else {
      done_.notifyAll();
      asleep_ = true;
      work_.wait(mutex_, [this]() TARN_REQUIRES(mutex_) { return !asleep_ || stopping_; });
    }
  }
  mutex_.unlock();
}

void QueuedLog::writeAll(const Texts& texts) {
  for (const std::string& text : texts) {
    if (!writeOne(text)) return;
    const MutexLock lock(mutex_);
    bytes_ -= text.size();
    error_ = 0;
  }
}

bool QueuedLog::writeOne(const std::string& text) {
  auto pause = kFirstPause;
  for (;;) {
    const int error = output_->write(text);
    if (error == 0) return true;
    const MutexLock lock(mutex_);
    error_ = error;
    lostError_ = lost_ == 0 ? lostError_ : error;
    if (error == EMSGSIZE) {  // it will never be taken
      lose();
      return true;
    }
    // Those who wait for the end learn nothing new from an output that fails.
    if (work_.waitFor(mutex_, pause, [this]() TARN_REQUIRES(mutex_) { return stopping_; })) return false;
    pause = std::min(2 * pause, kLongestPause);
  }
}

void QueuedLog::lose() {
  ++lost_;
  lostError_ = error_ == 0 ? lostError_ : error_;
}

std::string QueuedLog::lostLine(std::uint64_t lost, int error) const {
  constexpr int kLine = __LINE__;
  const std::string why = error == 0 ? ": more came than could be written" : errorSuffix(error);
  const platform::LogConditionScope condition(platform::LogCondition::LogUnavailable);
  const std::string text = prefixed(kModule, std::to_string(lost) + " log lines were lost" + why, kLine);
  return output_->formed(clock_.epochSeconds(), {kHostCategory, platform::LogLevel::Error, kModule, kLine, text});
}

}  // namespace tarn::linux_host
