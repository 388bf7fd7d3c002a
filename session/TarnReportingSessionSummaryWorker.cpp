// SPDX-License-Identifier: Apache-2.0
#include "session/TarnReportingSessionSummaryWorker.h"

#include "platform/Facilities.h"
#include "platform/ProcessFacts.h"
#include "service/vocabulary/TarnReportingLog.h"
#include "service/vocabulary/TarnReportingPlatform.h"
#include "service/vocabulary/TarnReportingUtility.h"
#include "session/TarnReportingSession.h"
#include "session/TarnReportingSessionKeys.h"

namespace tarn {

namespace {

constexpr TarnReportingLogger kLog{TarnReportingSummaryLogCategory, "TarnReportingSessionSummaryWorker"};

const plist::Key kSessionDuration("session_duration");
const plist::Key kIssueType("issue_type");

std::string_view thermalStateName(platform::ThermalState state) {
  switch (state) {
    case platform::ThermalState::Nominal:
      return "Nominal";
    case platform::ThermalState::Fair:
      return "Fair";
    case platform::ThermalState::Serious:
      return "Serious";
    case platform::ThermalState::Critical:
      return "Critical";
  }
  return "Unknown";
}

void addMachineFacts(plist::Dictionary& summary) {
  const platform::ProcessFacts& facts = TarnReportingFacilities().processFacts;
  summary.set("thermal_state", thermalStateName(facts.thermalState()));
  summary.set("low_power_enabled", facts.lowPowerModeEnabled());
  const Result<std::uint64_t> footprint = facts.physicalFootprint();
  if (footprint.ok()) {
    summary.set("vmInfo_phys_footprint_MiB", footprint.value >> 20U);
  } else {
    kLog(LogLevel::Error, "Error with task_info(): %s", footprint.error->text);
  }
  const platform::LoadAverages load = facts.loadAverages();
  summary.set("load_avg_1_min", load.oneMinute);
  summary.set("load_avg_5_min", load.fiveMinutes);
  summary.set("load_avg_15_min", load.fifteenMinutes);
}

}  // namespace

std::unique_ptr<TarnReportingSessionSummaryWorker> TarnReportingSessionSummaryWorker::initWithSession(
    const std::shared_ptr<TarnReportingSession>& session) {
  return std::make_unique<TarnReportingSessionSummaryWorker>(session);
}

bool TarnReportingSessionSummaryWorker::start() {
  setStarted(true);
  return true;
}

void TarnReportingSessionSummaryWorker::handleMessage(const std::shared_ptr<TarnReportingSessionMessage>& message) {
  const plist::Dictionary& payload = message->message();
  if (payload.hasKeys(keysWithout_)) return;
  if (const plist::ValueView duration = payload.get(kSessionDuration)) {
    totalActiveTime_ += duration.asDouble();
    ++activeCount_;
  } else if (const plist::ValueView issue = payload.get(kIssueType)) {
    overloadCount_ += issue == plist::ValueView("overload") ? 1U : 0U;
  } else {
    keysWithout_ = payload.keys();
  }
}

void TarnReportingSessionSummaryWorker::stop() {
  const std::shared_ptr<TarnReportingSession> owner = session();
  if (!owner) return;
  owner->sendMessage(std::make_shared<TarnReportingSessionMessage>(summary(*owner), AudioEventCategory::SessionGeneric,
                                                                   AudioEventType::Summary));
}

plist::Dictionary TarnReportingSessionSummaryWorker::summary(const TarnReportingSession& session) const {
  const std::size_t unique = session.messages().size();
  plist::Dictionary summary{{"total_active_time", totalActiveTime_},
                            {"active_count", activeCount_},
                            {"overload_count", overloadCount_},
                            {"average_active_time", activeCount_ == 0 ? 0.0 : totalActiveTime_ / activeCount_},
                            {"num_messages", session.totalMessageCount()},
                            {"num_unique_messages", unique},
                            {"num_redundant_messages", session.totalMessageCount() - static_cast<std::int64_t>(unique)},
                            {"singleMessageSession", session.isSingleMessageSession()},
                            {"summaryServiceName", session.serviceName()},
                            {"HostApplicationDisplayID", TarnReportingUtilityRetrieveAppName(session.configuration())}};
  if (!session.clientProcessName().empty()) {
    summary.set("clientProcessName", session.clientProcessName());
  }
  addMachineFacts(summary);
  return summary;
}

}  // namespace tarn
