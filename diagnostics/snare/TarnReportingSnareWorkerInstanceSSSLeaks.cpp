// SPDX-License-Identifier: Apache-2.0
#include "diagnostics/snare/TarnReportingSnareWorkerInstanceSSSLeaks.h"

#include <optional>
#include <utility>

#include "diagnostics/snare/TarnReportingSnareOperations.h"
#include "diagnostics/snare/WorkerInstanceState.h"
#include "platform/Clock.h"
#include "platform/Facilities.h"
#include "service/vocabulary/TarnReportingLog.h"
#include "service/vocabulary/TarnReportingPlatform.h"
#include "session/TarnReportingSession.h"
#include "session/TarnReportingSessionMessage.h"

namespace tarn {

namespace {

constexpr TarnReportingLogger kLog{TarnReportingSnareLogCategory, "TarnReportingSnareWorkerInstanceSSSLeaks"};
constexpr double kSnapshotSeconds = 0;
constexpr double kSecondsBetweenFires = 15.0;

std::shared_ptr<WorkerInstanceState> makeState() {
  auto state = std::make_shared<WorkerInstanceState>();
  state->interestThresholdCount = 1;
  return state;
}

// A clock that was set back counts as recently, too: better late than too often.
bool firedRecently(const std::optional<double>& lastFire, double now) {
  return lastFire && now - *lastFire < kSecondsBetweenFires;
}

}  // namespace

std::unique_ptr<TarnReportingSnareWorkerInstanceSSSLeaks> TarnReportingSnareWorkerInstanceSSSLeaks::initWithSession(
    const std::shared_ptr<TarnReportingSession>& session) {
  auto processState = TarnReportingSnareProcessState::shared();
  auto workerState = processState->stateFor(kClassName, makeState);
  return std::make_unique<TarnReportingSnareWorkerInstanceSSSLeaks>(session, std::move(workerState),
                                                                    std::move(processState));
}

TarnReportingSnareWorkerInstanceSSSLeaks::TarnReportingSnareWorkerInstanceSSSLeaks(
    std::weak_ptr<TarnReportingSession> session, std::shared_ptr<WorkerInstanceState> workerState,
    std::shared_ptr<TarnReportingSnareProcessState> processState)
    : TarnReportingSnareWorkerInstance(std::move(session), std::move(workerState)),
      processState_(std::move(processState)) {}

bool TarnReportingSnareWorkerInstanceSSSLeaks::interestedInMessage(const TarnReportingSessionMessage& message) const {
  static const plist::Key kStuckTime("System_Sound_Stuck_Time_Seconds");
  return message.type() == AudioEventType::Wattlog && message.message().contains(kStuckTime);
}

void TarnReportingSnareWorkerInstanceSSSLeaks::fire(const TarnReportingSessionMessage& message) {
  const std::shared_ptr<TarnReportingSession> owner = session();
  if (!owner) return;
  TarnReportingSnareProcessState::RateLimit& limit = processState_->systemSoundRateLimit();
  const MutexLock guard(limit.lock);
  const double now = TarnReportingFacilities().clock.epochSeconds();
  if (firedRecently(limit.lastFire, now)) {
    kLog(LogLevel::Info, "Already fired TarnReportingSnareWorkerInstanceSSSLeaks recently.");
    return;
  }
  limit.lastFire = now;
  requestSnapshot(*owner, message);
}

void TarnReportingSnareWorkerInstanceSSSLeaks::requestSnapshot(const TarnReportingSession& session,
                                                               const TarnReportingSessionMessage& message) {
  using Operations = TarnReportingSnareOperations;
  const std::shared_ptr<platform::SnareReporter> reporter = workerState().symptomReporter;
  const bool accepted = reporter->requestSnapshot(
      {Operations::signatureFromMessage(message, AudioServiceType::SystemSounds, *reporter, "Unknown"),
       kSnapshotSeconds, Operations::diagnosticPayload(session)},
      [identifier = workerState().currentSnareSessionIdentifier](const std::optional<plist::Dictionary>& reply) {
        const std::string sessionId = Operations::getSessionIdentifierFromResponse(reply);
        identifier->set(sessionId);
        kLog(LogLevel::Info, "Started Snare session for system sound server leaks. sessionId=%@ response=%@", sessionId,
             reply ? plist::ValueView(*reply) : plist::ValueView());
      });
  if (accepted) {
    kLog(LogLevel::Info, "Parameters to Snare session accepted.");
  } else {
    kLog(LogLevel::Error, "Parameters to Snare session not accepted!");
  }
}

}  // namespace tarn
