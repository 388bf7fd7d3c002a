// SPDX-License-Identifier: Apache-2.0
#include "telemetry/trace/TarnReportingSessionTraceWorker.h"

#include <cstdint>
#include <utility>

#include "platform/Condition.h"
#include "platform/Facilities.h"
#include "platform/FileSystem.h"
#include "platform/PerformanceTraceService.h"
#include "service/vocabulary/TarnReportingLog.h"
#include "service/vocabulary/TarnReportingPlatform.h"
#include "service/vocabulary/TarnReportingUtility.h"
#include "session/TarnReportingSession.h"
#include "telemetry/trace/TarnReportingTraceConfiguration.h"
#include "telemetry/trace/TarnReportingTraceRecording.h"
#include "telemetry/trace/TarnReportingTraceResults.h"

namespace tarn {

namespace {

constexpr TarnReportingLogger kLog{TarnReportingTraceCategory, "TarnReportingSessionTraceWorker"};
constexpr std::string_view kDefaultPerfDataName = "TarnReporting";
constexpr std::int32_t kDefaultTemplate = 2;
constexpr std::int32_t kProfileTemplate = 3;

bool isTraced(const TarnReportingSession& session) {
  return session.serviceType() == AudioServiceType::Test && TarnReportingUtilityIsInternalBuild();
}

// Null when the facility has no such trace.
std::shared_ptr<TarnReportingTraceRecording> makeRecording(const plist::Dictionary& configuration) {
  const platform::Facilities& facilities = TarnReportingFacilities();
  platform::PerformanceTraceConfiguration traceConfig;
  traceConfig.templateNumber =
      configuration.get(kTraceTypeKey) == plist::ValueView("sktrace_profile") ? kProfileTemplate : kDefaultTemplate;
  traceConfig.compressWhenFinished = false;
  auto traceSession = facilities.performanceTrace->createSession(traceConfig);
  if (!traceSession) {
    kLog(LogLevel::Error, "Could not start PerformanceTrace. There is no trace of template %d",
         traceConfig.templateNumber);
    return nullptr;
  }
  return std::make_shared<TarnReportingTraceRecording>(std::move(traceSession), facilities.conditions.makeCondition());
}

}  // namespace

std::unique_ptr<TarnReportingSessionTraceWorker> TarnReportingSessionTraceWorker::initWithSession(
    const std::shared_ptr<TarnReportingSession>& session) {
  const platform::Facilities& facilities = TarnReportingFacilities();
  if (facilities.performanceTrace == nullptr || facilities.traceAnalysis == nullptr ||
      facilities.perfDataWriters == nullptr) {
    return nullptr;
  }
  const std::string_view outputFileName = configuredText(session->configuration(), kOutputFileNameKey);
  return std::make_unique<TarnReportingSessionTraceWorker>(
      session, std::string(outputFileName.empty() ? kDefaultPerfDataName : outputFileName));
}

TarnReportingSessionTraceWorker::TarnReportingSessionTraceWorker(std::weak_ptr<TarnReportingSession> session,
                                                                 std::string perfDataName)
    : TarnReportingSessionWorkerProtocol(std::move(session)), mPerfDataName_(std::move(perfDataName)) {}

TarnReportingSessionTraceWorker::~TarnReportingSessionTraceWorker() = default;

bool TarnReportingSessionTraceWorker::start() {
  const std::shared_ptr<TarnReportingSession> owner = session();
  if (startedTracing_ || !owner || !isTraced(*owner)) return started();
  const plist::Dictionary configuration = owner->configuration();
  const std::string_view descriptions = configuredText(configuration, kProbeDescriptionsKey);
  if (!TarnReportingFacilities().fileSystem.exists(descriptions)) {
    kLog(LogLevel::Error, "Could not start PerformanceTrace. TarnReportingSkeinPlistFilePath: %@ is not a valid path",
         configuration.get(kProbeDescriptionsKey));
    return started();
  }
  recording_ = makeRecording(configuration);
  if (!recording_) return started();
  startedTracing_ = true;
  setStarted(recording_->start());
  return started();
}

void TarnReportingSessionTraceWorker::stop() {
  const std::shared_ptr<TarnReportingSession> owner = session();
  if (!startedTracing_ || !owner || !isTraced(*owner)) return;
  startedTracing_ = false;
  if (recording_->stop() != TarnReportingTraceRecording::End::Completed) return;
  // The queue stands still meanwhile, and is known to.
  const auto block = TarnReportingFacilities().conditions.blockOnPurpose();
  TarnReportingTraceResults results(*owner, mPerfDataName_, recording_->eventsLeftOut());
  results.processTraceSkein(recording_->finalTraceURL());
}

}  // namespace tarn
