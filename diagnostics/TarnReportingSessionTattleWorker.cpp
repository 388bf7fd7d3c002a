// SPDX-License-Identifier: Apache-2.0
#include "diagnostics/TarnReportingSessionTattleWorker.h"

#include <cstdint>
#include <optional>
#include <string>
#include <utility>

#include "diagnostics/TarnReportingDiagnosticDefaults.h"
#include "platform/Clock.h"
#include "platform/Facilities.h"
#include "plist/Value.h"
#include "service/vocabulary/TarnReportingLog.h"
#include "service/vocabulary/TarnReportingPlatform.h"
#include "service/vocabulary/TarnReportingUtility.h"
#include "session/TarnReportingSession.h"
#include "session/TarnReportingSessionMessage.h"
#include "session/TarnReportingSessionWorkerUtility.h"

namespace tarn {

namespace {

constexpr TarnReportingLogger kLog{TarnReportingSessionCategory, "TarnReportingSessionTattleWorker"};
constexpr std::string_view kBackOffKey = "ParleyInvalidXyBackOffSeconds";
constexpr std::string_view kLastRunKey = "ParleyInvalidXyTatlastRun";
constexpr std::string_view kDisplayReason = "a Parley spatial positioning error occurred";
constexpr double kSecondsIgnored = 5.0;

// On the prompt service's thread, at any time: the worker may be gone.
void logCompletion(const Status& error) {
  if (error.failed()) {
    kLog(LogLevel::Error, "Error creating draft - %@", error->text);
  } else {
    kLog(LogLevel::Info, "Successfully created draft");
  }
}

}  // namespace

std::unique_ptr<TarnReportingSessionTattleWorker> TarnReportingSessionTattleWorker::initWithSession(
    const std::shared_ptr<TarnReportingSession>& session) {
  const platform::Facilities& facilities = TarnReportingFacilities();
  if (facilities.tattle == nullptr || !TarnReportingUtilityIsInternalBuild()) return nullptr;
  const plist::Value backOff = TarnReportingDiagnosticDefaults().value(kBackOffKey);
  if (!backOff.present()) {
    kLog(LogLevel::Debug, "%@ default not set. Skipping worker. reporterID=%lli", kBackOffKey, session->reporterID());
    return nullptr;
  }
  return std::make_unique<TarnReportingSessionTattleWorker>(session, backOff.view().asDouble());
}

TarnReportingSessionTattleWorker::TarnReportingSessionTattleWorker(std::weak_ptr<TarnReportingSession> session,
                                                                   double backOffTime)
    : TarnReportingSessionWorkerProtocol(std::move(session)), backOffTime_(backOffTime) {}

bool TarnReportingSessionTattleWorker::hasRunInTimeframe(double backOffSeconds, std::string_view defaultsKey) {
  const TarnReportingDiagnosticDefaults defaults;
  const double now = TarnReportingFacilities().clock.epochSeconds();
  const plist::Value lastRun = defaults.value(defaultsKey);
  if (lastRun.present() && lastRun.view().asDouble() > now - backOffSeconds) {
    kLog(LogLevel::Debug, "Tattle has run. key=%@ lastRun=%@", defaultsKey, lastRun);
    return true;
  }
  kLog(LogLevel::Debug, "Tattle has not run. key=%@ backoffSeconds=%f", defaultsKey, backOffSeconds);
  // The store logs when it can't write. The prompt is shown all the same, as one in a run is the most there will be.
  static_cast<void>(defaults.setValue(defaultsKey, now));
  return false;
}

platform::TattleDraft TarnReportingSessionTattleWorker::docketDraftForParleyXYerror() {
  platform::TattleDraft draft;
  draft.title = "Invalid x/y coordinates during a Parley call (Tat)";
  draft.description =
      "Invalid coordinates were provided to the audio layer during a Parley call, making it impossible to render "
      "spatial audio correctly. Filing this docket will help determine what went wrong.";
  draft.component = {"Parley Core - Dialworks", "All", 1084682};
  draft.reproducibility = 6;
  draft.classification = 7;
  draft.diagnosticExtensions = {"sys.oxbow.Vetch.audio"};
  return draft;
}

bool TarnReportingSessionTattleWorker::interestedInMessage(const TarnReportingSessionMessage& message) {
  const double time = TarnReportingSession::getEpochTimeFromTarnReportingStateMessage(message);
  if (minimumMessageTime_ <= 0) {
    minimumMessageTime_ = time + kSecondsIgnored;
    return false;
  }
  return time > minimumMessageTime_ && TarnReportingSessionWorkerUtility::isParleyXYerrorMessage(message) &&
         !hasRunInTimeframe(backOffTime_, kLastRunKey);
}

void TarnReportingSessionTattleWorker::handleMessage(const std::shared_ptr<TarnReportingSessionMessage>& message) {
  if (!interestedInMessage(*message)) return;
  const std::shared_ptr<TarnReportingSession> owner = session();
  platform::TattleService* const tattle = TarnReportingFacilities().tattle;
  if (!owner || tattle == nullptr) return;
  if (hasRun_) {
    kLog(LogLevel::Debug, "Tattle has already run for ParleyXYerrorMessage reporterID=%lli", owner->reporterID());
    return;
  }
  hasRun_ = true;
  kLog(LogLevel::Default, "Starting tattle for ParleyXYerrorMessage reporterID=%lli", owner->reporterID());
  const std::string& name = owner->clientProcessName();
  tattle->createDraft(docketDraftForParleyXYerror(), name.empty() ? std::nullopt : std::optional(name), kDisplayReason,
                      &logCompletion);
}

void TarnReportingSessionTattleWorker::stop() {
  const std::shared_ptr<TarnReportingSession> owner = session();
  kLog(LogLevel::Debug, "Resetting hasRun to false. reporterID=%lli", owner ? owner->reporterID() : 0);
  hasRun_ = false;
}

}  // namespace tarn
