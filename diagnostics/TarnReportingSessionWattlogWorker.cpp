// SPDX-License-Identifier: Apache-2.0
#include "diagnostics/TarnReportingSessionWattlogWorker.h"

#include <optional>
#include <string>

#include "platform/Facilities.h"
#include "platform/WattlogService.h"
#include "service/vocabulary/TarnReportingLog.h"
#include "service/vocabulary/TarnReportingPlatform.h"
#include "service/vocabulary/TarnReportingUtility.h"
#include "session/TarnReportingSession.h"
#include "session/TarnReportingSessionKeys.h"
#include "session/TarnReportingSessionMessage.h"

namespace tarn {

namespace {

constexpr TarnReportingLogger kLog{TarnReportingWattlogCategory, "TarnReportingSessionWattlogWorker"};
constexpr std::int32_t kAgentIdentifier = 28;
// What the application is called when nobody told.
constexpr std::string_view kUnknownApplication = "Unknown";

struct EventKeys {
  plist::Key engineOnTime{"EngineOnTime"};
  plist::Key engineOnDuration{"EngineOnDuration"};
  plist::Key engineState{"EngineState"};
  plist::Key status{"Status"};
  plist::Key applicationName{"ApplicationName"};
  plist::Key timestampEnd{"TimestampEnd"};
  plist::Key activeTime{"Haptic_Active_Hardware_Time_Seconds"};
  plist::Key activeClients{"Active_Clients"};
};

const EventKeys& eventKeys() {
  static const EventKeys kKeys;
  return kKeys;
}

// Nothing while the session is going away.
std::optional<std::string> applicationNameOf(const std::shared_ptr<TarnReportingSession>& session) {
  if (!session) return std::nullopt;
  return TarnReportingUtilityRetrieveAppName(session->configuration());
}

void post(std::string_view eventName, const plist::Dictionary& payload) {
  TarnReportingFacilities().wattlog->logRegisteredEvent(kAgentIdentifier, eventName, payload);
}

}  // namespace

std::unique_ptr<TarnReportingSessionWattlogWorker> TarnReportingSessionWattlogWorker::initWithSession(
    const std::shared_ptr<TarnReportingSession>& session) {
  return TarnReportingFacilities().wattlog != nullptr ? std::make_unique<TarnReportingSessionWattlogWorker>(session)
                                                      : nullptr;
}

void TarnReportingSessionWattlogWorker::handleMessage(const std::shared_ptr<TarnReportingSessionMessage>& message) {
  if (!message || message->type() != AudioEventType::Wattlog) return;
  handleEngineOnDurationMessage(*message);
  handleEngineStateMessage(*message);
  handleLongRunningMessage(*message);
}

void TarnReportingSessionWattlogWorker::handleEngineOnDurationMessage(
    const TarnReportingSessionMessage& message) const {
  const EventKeys& names = eventKeys();
  const plist::ValueView onTime = message.message().get(names.engineOnTime);
  if (!onTime) return;
  plist::Dictionary payload;
  payload.set(names.engineOnDuration, onTime);
  const std::optional<std::string> application = applicationNameOf(session());
  if (application && *application != kUnknownApplication) {
    payload.set(names.applicationName, *application);
  } else {
    kLog(LogLevel::Error, "failed to get app name for wattlog");
  }
  if (const plist::ValueView timestamp = message.message().get(keys::kTimestamp)) {
    payload.set(names.timestampEnd, timestamp);
  } else {
    kLog(LogLevel::Error, "failed to get TarnReporting timestamp for wattlog");
  }
  post("Loom_Haptics_EngineOnDuration", payload);
}

void TarnReportingSessionWattlogWorker::handleEngineStateMessage(const TarnReportingSessionMessage& message) const {
  const EventKeys& names = eventKeys();
  const plist::ValueView state = message.message().get(names.engineState);
  if (!state) return;
  plist::Dictionary payload;
  payload.set(names.status, state == plist::ValueView("EngineOn") ? 1 : 0);
  if (const std::optional<std::string> application = applicationNameOf(session())) {
    payload.set(names.applicationName, *application);
  }
  if (const plist::ValueView timestamp = message.message().get(keys::kTimestamp)) {
    payload.set(names.timestampEnd, timestamp);
  }
  post("Loom_Haptics_ClientStatus", payload);
}

void TarnReportingSessionWattlogWorker::handleLongRunningMessage(const TarnReportingSessionMessage& message) const {
  const EventKeys& names = eventKeys();
  const plist::ValueView activeTime = message.message().get(names.activeTime);
  if (!activeTime) return;
  plist::Dictionary payload;
  payload.set(names.activeTime, activeTime);
  if (const plist::ValueView clients = message.message().get(names.activeClients)) {
    payload.set(names.activeClients, clients);
  }
  post("LeakedHapticsSessionInfo", payload);
}

}  // namespace tarn
