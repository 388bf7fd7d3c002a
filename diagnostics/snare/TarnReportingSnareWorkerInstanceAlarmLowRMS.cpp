// SPDX-License-Identifier: Apache-2.0
#include "diagnostics/snare/TarnReportingSnareWorkerInstanceAlarmLowRMS.h"

#include "diagnostics/snare/TarnReportingSnareOperations.h"
#include "diagnostics/snare/WorkerInstanceState.h"
#include "service/vocabulary/TarnReportingLog.h"
#include "session/TarnReportingSession.h"
#include "session/TarnReportingSessionMessage.h"

namespace tarn {

namespace {

constexpr TarnReportingLogger kLog{TarnReportingSnareLogCategory, "TarnReportingSnareWorkerInstanceAlarmLowRMS"};

std::optional<std::string> clientProcessNameOf(const TarnReportingSession& session) {
  return session.clientProcessName().empty() ? std::nullopt : std::optional(session.clientProcessName());
}

}  // namespace

std::unique_ptr<TarnReportingSnareWorkerInstanceAlarmLowRMS>
TarnReportingSnareWorkerInstanceAlarmLowRMS::initWithSession(const std::shared_ptr<TarnReportingSession>& session) {
  if (session->isSingleMessageSession()) return nullptr;
  auto state = std::make_shared<WorkerInstanceState>();
  state->interestThresholdDurationSeconds = 15.0;
  state->interestThresholdCount = 3;
  state->oncePerSession = true;
  return std::make_unique<TarnReportingSnareWorkerInstanceAlarmLowRMS>(session, std::move(state));
}

bool TarnReportingSnareWorkerInstanceAlarmLowRMS::interestedInMessage(
    const TarnReportingSessionMessage& message) const {
  static const plist::Key kIssueType("issue_type");
  if (message.category() != AudioEventCategory::Error || message.type() != AudioEventType::IssueDetector) return false;
  const std::shared_ptr<TarnReportingSession> owner = session();
  return owner &&
         (owner->serviceType() == AudioServiceType::Alarms || owner->serviceType() == AudioServiceType::Test) &&
         message.message().get(kIssueType) == plist::ValueView("LowRMS");
}

void TarnReportingSnareWorkerInstanceAlarmLowRMS::fire(const TarnReportingSessionMessage& message) {
  using Operations = TarnReportingSnareOperations;
  const std::shared_ptr<TarnReportingSession> owner = session();
  const std::shared_ptr<platform::SnareReporter> reporter = workerState().symptomReporter;
  if (!owner) return;
  const bool accepted = reporter->startSession(
      {Operations::signatureFromMessage(message, owner->serviceType(), *reporter, clientProcessNameOf(*owner)),
       snareAlarmLowRmsDuration_, std::nullopt},
      [identifier = workerState().currentSnareSessionIdentifier,
       timeout = snareAlarmLowRmsDuration_](const std::optional<plist::Dictionary>& reply) {
        const std::string sessionId = Operations::getSessionIdentifierFromResponse(reply);
        identifier->set(sessionId);
        kLog(LogLevel::Info, "Started Snare session for alarm Low RMS. sessionId=%@ timeout=%f response=%@", sessionId,
             timeout, reply ? plist::ValueView(*reply) : plist::ValueView());
      });
  if (accepted) {
    kLog(LogLevel::Info,
         "Parameters to Snare session for alarm Low RMS accepted. Will fire if not cancelled. timeout=%f.",
         snareAlarmLowRmsDuration_);
  } else {
    kLog(LogLevel::Error, "Snare session for alarm Low RMS failed to start.");
  }
}

void TarnReportingSnareWorkerInstanceAlarmLowRMS::stop() {
  const std::optional<std::string> sessionId = workerState().currentSnareSessionIdentifier->get();
  if (!sessionId) return;
  kLog(LogLevel::Info, "Stop called. Cancelling Snare session for alarm Low RMS. sessionId=%@ timeout=%f", *sessionId,
       snareAlarmLowRmsDuration_);
  workerState().symptomReporter->cancelSession(*sessionId);
}

}  // namespace tarn
