// SPDX-License-Identifier: Apache-2.0
// WorkerInstanceState: what one fault detector of the Snare worker has counted, when it may fire, and what came of it;
// with the trigger rule as decisions that take the time.
//
// Thresholds: a count other than 0 alone decides; with a count of 0 the time since the first interesting message does.
// As made, the thresholds are so high that nothing ever fires.
//
// Owner: the detector that made it, or the process (TarnReportingSnareProcessState) for those that share one across
// sessions. Threads: the server queue, but for the two synchronised members: a reply of the capture service writes the
// identifier on a thread of that service.
#pragma once

#include <cstdint>
#include <limits>
#include <memory>
#include <optional>
#include <string>
#include <utility>

#include "plist/Dictionary.h"
#include "plist/ThreadSafety.h"

namespace tarn {

class TarnReportingSessionMessage;

namespace platform {
class SnareReporter;
}

// A value that may be missing, whole for whoever reads it while another thread writes it. Threads: any. A copy goes in
// and out, so nobody holds the lock while looking at the value.
template <class T>
class TarnReportingSynchronized {
 public:
  TarnReportingSynchronized() = default;
  TarnReportingSynchronized(const TarnReportingSynchronized&) = delete;
  TarnReportingSynchronized& operator=(const TarnReportingSynchronized&) = delete;

  // A copy; nothing when none was set.
  std::optional<T> get() const {
    const MutexLock guard(mutex_);
    return value_;
  }
  void set(std::optional<T> value) {
    const MutexLock guard(mutex_);
    value_ = std::move(value);
  }

 private:
  mutable Mutex mutex_;
  std::optional<T> value_ TARN_GUARDED_BY(mutex_);
};

// What the trigger rule says about an interesting message that has just been counted. Only Fire does anything; the
// others tell tests and readers why it doesn't.
enum class TarnReportingSnareVerdict {
  Fire,
  TooFew,       // fewer interesting messages than the threshold
  TooSoon,      // no threshold of messages, and the time isn't over
  FiredBefore,  // it fires once, and it did
};

// Plain data with its rule; it calls nothing.
struct WorkerInstanceState {
  // A place of its own: a reply that comes when the session and this state are gone still has where to write.
  using SnareSessionIdentifier = TarnReportingSynchronized<std::string>;

  WorkerInstanceState();
  ~WorkerInstanceState();
  WorkerInstanceState(const WorkerInstanceState&) = delete;
  WorkerInstanceState& operator=(const WorkerInstanceState&) = delete;

  // Whether this payload says what the last interesting message said, time stamps included. Nothing repeats before the
  // first one and after a fire.
  bool repeatsLastMessage(const plist::Dictionary& payload) const noexcept;
  // Counts an interesting message at this time, in epoch seconds. The first one since the last fire sets the time from
  // which a threshold of time counts.
  void count(double now);
  // Whether the message that was counted last fires at this time, in epoch seconds. The time must exceed its threshold.
  // A clock that was set back makes it wait longer: better late than too often.
  TarnReportingSnareVerdict verdict(double now) const;
  // Restarts the count, as after a fire. How often it fired is kept.
  void reset();

  // The capture that the service reported for the latest fire; never null. Nothing until a reply has come; a later
  // fire's reply replaces it.
  const std::shared_ptr<SnareSessionIdentifier> currentSnareSessionIdentifier =
      std::make_shared<SnareSessionIdentifier>();
  std::uint64_t interestedCount = 0;  // since the last fire
  // Interesting messages that it takes to fire; 0 leaves it to the time.
  std::uint64_t interestThresholdCount = std::numeric_limits<std::uint64_t>::max();
  TarnReportingSynchronized<double> interestFirstSeen;  // epoch seconds, of the first since the last fire
  // Seconds since the first interesting message; only looked at when the count is 0.
  double interestThresholdDurationSeconds = std::numeric_limits<double>::max();
  bool oncePerSession = false;  // fires only while firedCount is 0
  std::uint64_t firedCount = 0;
  std::shared_ptr<const TarnReportingSessionMessage> lastMessage;  // a copy of the last interesting one since the fire
  std::shared_ptr<platform::SnareReporter> symptomReporter;        // made for the latest fire
};

}  // namespace tarn
