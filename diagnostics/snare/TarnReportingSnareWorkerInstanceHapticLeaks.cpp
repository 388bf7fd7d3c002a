// SPDX-License-Identifier: Apache-2.0
#include "diagnostics/snare/TarnReportingSnareWorkerInstanceHapticLeaks.h"

#include "diagnostics/snare/TarnReportingSnareOperations.h"
#include "diagnostics/snare/TarnReportingSnareProcessState.h"
#include "diagnostics/snare/WorkerInstanceState.h"
#include "service/vocabulary/TarnReportingLog.h"
#include "session/TarnReportingSession.h"
#include "session/TarnReportingSessionMessage.h"

namespace tarn {

namespace {

constexpr TarnReportingLogger kLog{TarnReportingSnareLogCategory, "TarnReportingSnareWorkerInstanceHapticLeaks"};
constexpr double kSnapshotSeconds = 0;

std::shared_ptr<WorkerInstanceState> makeState() {
  auto state = std::make_shared<WorkerInstanceState>();
  state->interestThresholdCount = 2;
  state->interestThresholdDurationSeconds = 60.0;
  return state;
}

}  // namespace

std::unique_ptr<TarnReportingSnareWorkerInstanceHapticLeaks>
TarnReportingSnareWorkerInstanceHapticLeaks::initWithSession(const std::shared_ptr<TarnReportingSession>& session) {
  return std::make_unique<TarnReportingSnareWorkerInstanceHapticLeaks>(
      session, TarnReportingSnareProcessState::shared()->stateFor(kClassName, makeState));
}

bool TarnReportingSnareWorkerInstanceHapticLeaks::interestedInMessage(
    const TarnReportingSessionMessage& message) const {
  static const plist::Key kActiveTime("Haptic_Active_Hardware_Time_Seconds");
  return message.type() == AudioEventType::Wattlog && message.message().contains(kActiveTime);
}

void TarnReportingSnareWorkerInstanceHapticLeaks::fire(const TarnReportingSessionMessage& message) {
  using Operations = TarnReportingSnareOperations;
  const std::shared_ptr<TarnReportingSession> owner = session();
  const std::shared_ptr<platform::SnareReporter> reporter = workerState().symptomReporter;
  if (!owner) return;
  const bool accepted = reporter->requestSnapshot(
      {Operations::signatureFromMessage(message, AudioServiceType::Haptics, *reporter, "Unknown"), kSnapshotSeconds,
       Operations::diagnosticPayload(*owner)},
      [identifier = workerState().currentSnareSessionIdentifier](const std::optional<plist::Dictionary>& reply) {
        const std::string sessionId = Operations::getSessionIdentifierFromResponse(reply);
        identifier->set(sessionId);
        kLog(LogLevel::Info, "Started Snare session for haptics leaks. sessionId=%@ response=%@", sessionId,
             reply ? plist::ValueView(*reply) : plist::ValueView());
      });
  if (accepted) {
    kLog(LogLevel::Info, "Parameters to Snare session accepted.");
  } else {
    kLog(LogLevel::Error, "Parameters to Snare session not accepted!");
  }
}

}  // namespace tarn
