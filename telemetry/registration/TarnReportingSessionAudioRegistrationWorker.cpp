// SPDX-License-Identifier: Apache-2.0
#include "telemetry/registration/TarnReportingSessionAudioRegistrationWorker.h"

#include <cstdint>
#include <utility>

#include "platform/Clock.h"
#include "platform/Facilities.h"
#include "platform/LocalCalendar.h"
#include "platform/RandomSource.h"
#include "platform/RtcReportingService.h"
#include "service/vocabulary/TarnReportingLog.h"
#include "service/vocabulary/TarnReportingPlatform.h"
#include "session/TarnReportingSession.h"
#include "session/TarnReportingSessionMessage.h"
#include "telemetry/registration/TarnReportingRegistrationKeys.h"
#include "telemetry/registration/TarnReportingRegistrationPublication.h"
#include "telemetry/registration/TarnReportingRegistrationState.h"
#include "telemetry/registration/TarnReportingWorkWeek.h"

namespace tarn {

namespace {

constexpr TarnReportingLogger kLog{TarnReportingAudioRegistrationCategory,
                                   TarnReportingSessionAudioRegistrationWorker::kClassName};
constexpr std::string_view kDeviceSignature = "kbdQ ( 0f3e ) ( 7305 )";
constexpr double kMinuteSeconds = 60;
constexpr double kDaySeconds = 86400;
constexpr std::uint32_t kWeekSeconds = 604800;
constexpr double kLookBackSeconds = 691200;  // eight days

double currentEpoch() {
  return TarnReportingFacilities().clock.epochSeconds();
}

std::uint32_t wholeEpoch(const plist::ValueView& epoch) {
  return static_cast<std::uint32_t>(epoch.asInt64());
}

}  // namespace

std::unique_ptr<TarnReportingSessionAudioRegistrationWorker>
TarnReportingSessionAudioRegistrationWorker::initWithSession(const std::shared_ptr<TarnReportingSession>&) {
  kLog(LogLevel::Debug, "TarnReportingSessionAudioRegistrationWorker unsupported");
  return nullptr;
}

TarnReportingSessionAudioRegistrationWorker::TarnReportingSessionAudioRegistrationWorker(
    std::weak_ptr<TarnReportingSession> session, std::shared_ptr<TarnReportingRegistrationState> state)
    : TarnReportingSessionWorkerProtocol(std::move(session)), state_(std::move(state)) {}

TarnReportingSessionAudioRegistrationWorker::~TarnReportingSessionAudioRegistrationWorker() = default;

bool TarnReportingSessionAudioRegistrationWorker::start() {
  kLog(LogLevel::Debug, "Starting TarnReportingSessionAudioRegistrationWorker");
  setStarted(true);
  return true;
}

void TarnReportingSessionAudioRegistrationWorker::handleMessage(
    const std::shared_ptr<TarnReportingSessionMessage>& message) {
  static const plist::Key kActiveDevices("active_devices");
  const plist::ValueView devices = message->message().get(kActiveDevices);
  if (devices.asText().find(kDeviceSignature) == std::string::npos) return;
  const double now = currentEpoch();
  if (state_->enumerationCheckEpoch() == 0) {
    state_->setEnumerationCheckEpoch(now);
  }
  const double wait = state_->enumerationCheckEpoch() - now;
  kLog(LogLevel::Debug, "Time to next BT Enumeration: %f seconds / %f days", wait, wait / kDaySeconds);
  if (wait <= 0) {
    enumerate();
  }
}

void TarnReportingSessionAudioRegistrationWorker::enumerate() {
  if (const Status error = state_->enumerate(); error.failed()) {
    kLog(LogLevel::Debug, "Exception in BT gatherData : %@", error->text);
    state_->scheduleEnumerationCheck(currentEpoch() + kDaySeconds);
    return;
  }
  state_->scheduleEnumerationCheck(currentEpoch() + kMinuteSeconds);
  state_->storeRegistrationInfo();
}

void TarnReportingSessionAudioRegistrationWorker::stop() {
  kLog(LogLevel::Debug, "Stopping TarnReportingSessionAudioRegistrationWorker");
  if (!state_->registrationInfo() || !state_->registrationInfo()->contains(registration::kSplunk)) {
    kLog(LogLevel::Debug, "There have been no BT enumerations. Skip further processing");
    return;
  }
  const double next = state_->nextInvocationEpoch();
  const double now = currentEpoch();
  if (next == 0) {
    const double first = now + static_cast<double>(TarnReportingFacilities().randomSource.below(kWeekSeconds));
    state_->scheduleNextInvocation(first);
    kLog(LogLevel::Debug, "Current Epoch: %f; nextInvocationEpoch is %f", now, first);
    return;
  }
  kLog(LogLevel::Default, "Time to next Invocation: %f seconds / %f days", next - now, (next - now) / kDaySeconds);
  if (now > next) {
    publish(now);
  }
}

void TarnReportingSessionAudioRegistrationWorker::publish(double now) {
  kLog(LogLevel::Debug, "We could publish");
  state_->scheduleNextInvocation(now + kDaySeconds);
  std::vector<plist::Dictionary> records = recentRecords(now);
  if (records.empty()) {
    kLog(LogLevel::Debug,
         "No active Bud connections detected since last publish. Skip publishing anything; check again after "
         "SamplingPeriod");
    state_->scheduleNextInvocation(now + kWeekSeconds);
    return;
  }
  kLog(LogLevel::Debug, "At least one active Bud connection detected since last publish. Let's publish to RTC!");
  setupRTCReporterInterface(std::move(records));
}

// The records of the accessories that were connected within the last days, as they are published.
std::vector<plist::Dictionary> TarnReportingSessionAudioRegistrationWorker::recentRecords(double now) const {
  std::vector<plist::Dictionary> records;
  const plist::ValueView splunk = state_->registrationInfo()->get(registration::kSplunk);
  if (splunk.kind() != plist::Kind::Array) return records;
  for (const plist::ValueView entry : splunk.array()) {
    if (entry.kind() != plist::Kind::Dictionary) continue;
    plist::Dictionary record = entry.dictionary();
    const plist::Value epoch = record.get(registration::kLastConnectedEpoch);
    record.remove(registration::kLastConnectedEpoch);
    record.set(registration::kLastConnectedWorkWeek, _convertEpochToWorkWeek(epoch.view()));
    if (now - kLookBackSeconds <= wholeEpoch(epoch.view())) {
      records.push_back(std::move(record));
    }
  }
  return records;
}

void TarnReportingSessionAudioRegistrationWorker::setupRTCReporterInterface(std::vector<plist::Dictionary> records) {
  constexpr std::string_view kOperation = "setupRTCReporterInterface";
  const std::shared_ptr<TarnReportingSession> owner = session();
  if (!owner) return;
  kLog(LogLevel::Debug, "entering rtcreporting %s", kOperation);
  platform::RtcReportingService* const service = TarnReportingFacilities().rtcReporting;
  const std::optional<std::string> token = service == nullptr ? std::nullopt : service->newHierarchyToken(std::nullopt);
  if (!token) {
    kLog(LogLevel::Error, "newHierarchyTokenFromParentToken returned nil. Will skip rtc for this session. %s",
         kOperation);
    return;
  }
  publication_ = std::make_shared<TarnReportingRegistrationPublication>(state_, std::move(records));
  publication_->begin(*owner, *token);
}

bool TarnReportingSessionAudioRegistrationWorker::rtcReportingSessionStarted() const noexcept {
  return publication_ && publication_->started();
}

std::uint16_t TarnReportingSessionAudioRegistrationWorker::retrieveRTCReportingCategoryFromCategory(
    AudioEventCategory category) {
  return TarnReportingRegistrationPublication::retrieveRTCReportingCategoryFromCategory(category);
}

// Their given names: NOLINTBEGIN(readability-identifier-naming)
void TarnReportingSessionAudioRegistrationWorker::_sendMessage(const TarnReportingSessionMessage& message) {
  if (publication_) {
    publication_->_sendMessage(message);
  }
}

int TarnReportingSessionAudioRegistrationWorker::_convertEpochToWorkWeek(const plist::ValueView& epoch) {
  return TarnReportingWorkWeek(TarnReportingFacilities().localCalendar.localTime(wholeEpoch(epoch)));
}
// NOLINTEND(readability-identifier-naming)

}  // namespace tarn
