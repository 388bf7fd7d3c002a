// SPDX-License-Identifier: Apache-2.0
#include "diagnostics/snare/WorkerInstanceState.h"

#include "platform/SnareService.h"
#include "session/TarnReportingSessionMessage.h"

namespace tarn {

WorkerInstanceState::WorkerInstanceState() = default;
WorkerInstanceState::~WorkerInstanceState() = default;

bool WorkerInstanceState::repeatsLastMessage(const plist::Dictionary& payload) const noexcept {
  return lastMessage != nullptr && payload == lastMessage->message();
}

void WorkerInstanceState::count(double now) {
  ++interestedCount;
  if (!interestFirstSeen.get()) {
    interestFirstSeen.set(now);
  }
}

TarnReportingSnareVerdict WorkerInstanceState::verdict(double now) const {
  if (interestedCount < interestThresholdCount) return TarnReportingSnareVerdict::TooFew;
  if (interestThresholdCount == 0) {
    // A clock that was set back makes the time negative, and the wait longer: better late than too often.
    const double elapsed = now - interestFirstSeen.get().value_or(now);
    if (!(elapsed > interestThresholdDurationSeconds)) return TarnReportingSnareVerdict::TooSoon;
  }
  return firedCount != 0 && oncePerSession ? TarnReportingSnareVerdict::FiredBefore : TarnReportingSnareVerdict::Fire;
}

void WorkerInstanceState::reset() {
  lastMessage.reset();
  interestFirstSeen.set(std::nullopt);
  interestedCount = 0;
}

}  // namespace tarn
