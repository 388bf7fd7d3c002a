// SPDX-License-Identifier: Apache-2.0
#include "telemetry/registration/TarnReportingRegistrationPublication.h"

#include <cstdint>
#include <optional>
#include <string_view>
#include <utility>

#include "platform/Clock.h"
#include "platform/Facilities.h"
#include "platform/RtcReportingService.h"
#include "service/vocabulary/TarnReportingLog.h"
#include "service/vocabulary/TarnReportingPlatform.h"
#include "session/TarnReportingSession.h"
#include "session/TarnReportingSessionKeys.h"
#include "session/TarnReportingSessionMessage.h"
#include "telemetry/registration/TarnReportingRegistrationState.h"

namespace tarn {

namespace {

constexpr TarnReportingLogger kLog{TarnReportingAudioRegistrationCategory, "TarnReportingRegistrationPublication"};
constexpr int kClientType = 52;
constexpr float kClientVersion = 2.1F;
constexpr double kWeekSeconds = 604800;

using InfoKeys = platform::RtcSessionInfoKeys;
using UserKeys = platform::RtcUserInfoKeys;

plist::Dictionary sessionInfoOf(const TarnReportingSession& session, const std::string& hierarchyToken) {
  plist::Dictionary info{{InfoKeys::kClientType, kClientType},
                         {InfoKeys::kClientVersion, kClientVersion},
                         {InfoKeys::kSessionID, session.reporterID()},
                         {InfoKeys::kBatchEvent, false},
                         {InfoKeys::kHierarchyToken, hierarchyToken}};
  if (const plist::ValueView application = session.configuration().get(keys::kHostApplicationDisplayID)) {
    info.set(InfoKeys::kClientBundleID, application);
  }
  return info;
}

plist::Dictionary userInfoOf(const TarnReportingSession& session) {
  plist::Dictionary info{{UserKeys::kClientName, "Tessels_Telemetry"},
                         {UserKeys::kServiceName, "Tessels_Registration"}};
  info.merge(session.configuration());
  return info;
}

}  // namespace

TarnReportingRegistrationPublication::TarnReportingRegistrationPublication(
    std::shared_ptr<TarnReportingRegistrationState> state, std::vector<plist::Dictionary> records)
    : state_(std::move(state)), records_(std::move(records)) {}

TarnReportingRegistrationPublication::~TarnReportingRegistrationPublication() = default;

void TarnReportingRegistrationPublication::begin(const TarnReportingSession& session,
                                                 const std::string& hierarchyToken) {
  rtcReportingSession_ = TarnReportingFacilities().rtcReporting->createSession(sessionInfoOf(session, hierarchyToken),
                                                                               userInfoOf(session), std::nullopt);
  if (!rtcReportingSession_) return;
  rtcReportingSession_->startConfiguration(
      [self = shared_from_this()](const std::optional<std::vector<std::string>>& backends) {
        self->started_ = backends.has_value();
        if (backends) {
          self->sendRecords();
        } else {
          kLog(LogLevel::Error, "no backends found, this session won't get sent to the server");
        }
      });
}

void TarnReportingRegistrationPublication::sendRecords() {
  for (const plist::Dictionary& record : records_) {
    _sendMessage(TarnReportingSessionMessage(record, AudioEventCategory::Tessels, AudioEventType::Summary));
  }
  kLog(LogLevel::Debug, "Message Sent->");
}

// NOLINTNEXTLINE(readability-identifier-naming): its given name
void TarnReportingRegistrationPublication::_sendMessage(const TarnReportingSessionMessage& message) {
  if (!rtcReportingSession_) return;
  const platform::RtcReportingSession::SendResult result =
      rtcReportingSession_->sendMessage(retrieveRTCReportingCategoryFromCategory(message.category()),
                                        static_cast<std::uint16_t>(message.type()), message.message());
  if (!result.sent) {
    if (result.error.failed()) {
      kLog(LogLevel::Error, "error sending message %@", result.error->text);
    }
    return;
  }
  kLog(LogLevel::Default, "RTCReportingAgent %@ : message %@ : category %i : type %i",
       rtcReportingSession_->description(), message.message(), static_cast<std::uint32_t>(message.category()),
       static_cast<std::uint16_t>(message.type()));
  state_->scheduleNextInvocation(TarnReportingFacilities().clock.epochSeconds() + kWeekSeconds);
}

}  // namespace tarn
