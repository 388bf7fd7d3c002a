// SPDX-License-Identifier: Apache-2.0
#include "telemetry/rtc/TarnReportingRtcMirror.h"

#include <chrono>
#include <utility>

#include "platform/Facilities.h"
#include "service/vocabulary/TarnReportingLog.h"
#include "service/vocabulary/TarnReportingPlatform.h"
#include "service/vocabulary/TarnReportingUtility.h"
#include "session/TarnReportingSessionKeys.h"

namespace tarn {

namespace {

using SessionInfo = platform::RtcSessionInfoKeys;
using UserInfo = platform::RtcUserInfoKeys;

constexpr TarnReportingLogger kLog{TarnReportingSessionRTCReportingCategory, "TarnReportingSessionRtcWorker"};
constexpr std::string_view kQueueName = "sys.oxbow.tarnkit.session.rtcreporting";
constexpr std::chrono::seconds kBackendWait{9};

constexpr int kClientType = 19;
constexpr float kVersionNumber = 2.1F;
constexpr std::string_view kClientNameTarnkit = "sys.oxbow.tarnkit";
constexpr std::string_view kSessionID = "TarnReportingSessionID";
constexpr std::string_view kHostApplication = "HostApplicationDisplayID";

plist::Dictionary sessionInfoOf(const TarnReportingRtcMirror::Started& session, const std::string& token) {
  const bool batch = TarnReportingRtcMirror::shouldBatchRTCReportingEventsForServiceType(session.serviceType);
  plist::Dictionary info{{SessionInfo::kClientType, kClientType},       {SessionInfo::kClientVersion, kVersionNumber},
                         {SessionInfo::kSessionID, session.reporterID}, {SessionInfo::kBatchEvent, batch},
                         {SessionInfo::kHierarchyToken, token},         {SessionInfo::kContainsRealtimeEvents, !batch}};
  if (const plist::ValueView application = session.configuration.get(kHostApplication)) {
    info.set(SessionInfo::kClientBundleID, application);
  }
  return info;
}

plist::Dictionary userInfoOf(const TarnReportingRtcMirror::Started& session) {
  plist::Dictionary info{{UserInfo::kClientName, kClientNameTarnkit},
                         {kSessionID, session.reporterID},
                         {UserInfo::kServiceName, session.serviceName}};
  if (session.isSingleMessageSession) {
    info.set(UserInfo::kServiceName, TarnReportingUtilityGenerateServiceNameFromServiceType(session.serviceType));
  }
  info.merge(session.configuration);
  return info;
}

plist::Array arrayOf(const std::vector<std::string>& texts) {
  plist::Array array;
  for (const std::string& text : texts) {
    array.append(text);
  }
  return array;
}

}  // namespace

std::uint16_t TarnReportingRtcMirror::retrieveRTCReportingCategoryFromCategory(AudioEventCategory category) {
  // Asked for, and of no influence: messages of test groups go where all others go.
  static_cast<void>(TarnReportingUtilityIsABTestModeOn(category));
  return static_cast<std::uint16_t>(category);
}

bool TarnReportingRtcMirror::shouldBatchRTCReportingEventsForServiceType(AudioServiceType serviceType) {
  return serviceType != AudioServiceType::APIUsage;
}

const std::shared_ptr<platform::SuspendableQueue>& TarnReportingRtcMirror::rtcReportingQueue() {
  if (!rtcReportingQueue_) {
    rtcReportingQueue_ =
        TarnReportingFacilities().workQueues.makeSuspendableQueue(kQueueName, platform::QualityOfService::Utility);
  }
  return rtcReportingQueue_;
}

void TarnReportingRtcMirror::start(const Started& session) {
  const bool asked = open(session);
  isInert_ = !asked;
  --startsAhead_;
  if (asked) {
    kLog(LogLevel::Default, "waiting to find backends");
    rtcreportingBackendSemaphore_.wait(rtcReportingQueue_, kBackendWait,
                                       [self = shared_from_this()](bool signalled) { self->endWait(signalled); });
  }
}

// Asks for backends; false without a token.
bool TarnReportingRtcMirror::open(const Started& session) {
  constexpr std::string_view kOperation = "start";
  kLog(LogLevel::Debug, "entering rtcreporting %s", kOperation);
  rtcReportingAgentToken_ = service_.newHierarchyToken(std::nullopt);
  if (!rtcReportingAgentToken_) {
    kLog(LogLevel::Error, "newHierarchyTokenFromParentToken returned nil. Will skip rtc for this session. %s",
         kOperation);
    return false;
  }
  rtcReportingSession_ =
      service_.createSession(sessionInfoOf(session, *rtcReportingAgentToken_), userInfoOf(session), std::nullopt);
  if (rtcReportingSession_) {
    rtcReportingSession_->startConfiguration(
        [self = shared_from_this()](const Backends& backends) { self->foundBackends(backends); });
  }
  return true;
}

void TarnReportingRtcMirror::foundBackends(const Backends& backends) {
  if (backends) {
    kLog(LogLevel::Default, "list of backends %@", [&] { return arrayOf(*backends); });
    rtcReportingSessionStarted_ = true;
    started_ = true;
  } else {
    kLog(LogLevel::Error, "no backends found, this session won't get sent to the server");
    rtcReportingSessionStarted_ = false;
  }
  rtcreportingBackendSemaphore_.signal();
}

void TarnReportingRtcMirror::endWait(bool signalled) {
  if (!signalled) {
    kLog(LogLevel::Default, "timed out waiting for backends");
    isInert_ = true;
    release();
  } else if (rtcReportingSessionStarted_) {
    kLog(LogLevel::Default, "continuing with backends!");
  } else {
    kLog(LogLevel::Default, "failed to find backend");
    isInert_ = true;
    release();
  }
}

void TarnReportingRtcMirror::tellNeverStarted(std::string_view operation) {
  kLog(LogLevel::Default, "Session never started. %s", operation);
}

void TarnReportingRtcMirror::handleMessage(const MessagePointer& message) {
  if (!rtcReportingSessionStarted_) {
    tellNeverStarted("handleMessage");
    return;
  }
  _sendMessage(message);
}

void TarnReportingRtcMirror::stop(const Stopped& session) {
  constexpr std::string_view kOperation = "stop";
  if (!rtcReportingSessionStarted_) {
    tellNeverStarted(kOperation);
    return;
  }
  if (session.hadMessages) {
    sendSummary(session);
  }
  kLog(LogLevel::Debug, "entering rtcreporting %s", kOperation);
  if (rtcReportingSession_) {
    rtcReportingSession_->flushMessages();
  }
  release();
  rtcReportingSessionStarted_ = false;
  kLog(LogLevel::Debug, "stopping and setting session to nil");
}

void TarnReportingRtcMirror::sendSummary(const Stopped& session) {
  TarnReportingRtcSummary summary = TarnReportingMakeRtcSummary(session.serviceType, session.messages, longestSummary_);
  if (!summary.complete) {
    kLog(LogLevel::Error, "rtc summary event is cut, the session has too many messages. reporterID=%lli",
         session.reporterID);
  }
  kLog(LogLevel::Default, "sending rtc summary event. reporterID=%lli", session.reporterID);
  for (const plist::Dictionary::Entry& entry : summary.payload) {
    kLog(LogLevel::Debug, "sending rtc summary event. reporterID=%lli %@=\"%@\"", session.reporterID, entry.key.text(),
         entry.value);
  }
  _sendMessage(std::make_shared<TarnReportingSessionMessage>(std::move(summary.payload), AudioEventCategory::Unknown,
                                                             AudioEventType::Unknown));
}

void TarnReportingRtcMirror::release() {
  rtcReportingSession_.reset();
  rtcReportingAgentToken_.reset();
}

// NOLINTNEXTLINE(readability-identifier-naming): its given name
void TarnReportingRtcMirror::_sendMessage(const MessagePointer& message) {
  kLog(LogLevel::Debug, "entering rtcreporting %s", "_sendMessage");
  const std::uint16_t category = retrieveRTCReportingCategoryFromCategory(message->category());
  const auto type = static_cast<std::uint16_t>(message->type());
  if (!TarnReportingUtilityIsInternalBuild()) {
    message->mutableMessage().remove(keys::kTimestamp);
  }
  if (!rtcReportingSession_) {
    return;  // the completion came when the wait for it was over
  }
  const auto result = rtcReportingSession_->sendMessage(category, type, message->message());
  if (result.sent) {
    kLog(
        LogLevel::Debug, "RTCReportingAgent %@ : message %@ : category %i : type %i",
        [&] { return rtcReportingSession_->description(); }, message->message(),
        static_cast<std::int32_t>(message->category()), type);
  } else if (result.error.failed()) {
    kLog(LogLevel::Error, "error sending message %@", result.error->text);
  }
}

}  // namespace tarn
