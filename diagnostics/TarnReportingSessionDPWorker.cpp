// SPDX-License-Identifier: Apache-2.0
#include "diagnostics/TarnReportingSessionDPWorker.h"

#include <algorithm>
#include <limits>
#include <optional>
#include <utility>

#include "diagnostics/TarnReportingDiagnosticDefaults.h"
#include "platform/Clock.h"
#include "platform/Condition.h"
#include "platform/Facilities.h"
#include "platform/GyreService.h"
#include "platform/NotificationCenter.h"
#include "plist/Value.h"
#include "service/vocabulary/ProcessState.h"
#include "service/vocabulary/TarnReportingLog.h"
#include "service/vocabulary/TarnReportingPlatform.h"
#include "service/vocabulary/TarnReportingUtility.h"
#include "session/TarnReportingSessionKeys.h"
#include "session/TarnReportingSessionMessage.h"

namespace tarn {

namespace {

constexpr TarnReportingLogger kLog{TarnReportingDPLogCategory, "TarnReportingSessionDPWorker"};
constexpr std::string_view kSubsystem = "sys.oxbow.tarnkit";
constexpr std::string_view kReason = "AudioOverloads";
constexpr std::string_view kDroppedNotification = "sys.oxbow.tarnkit.dropped-gyre";
constexpr std::int32_t kUsualBufferFrameSize = 512;
constexpr double kSecondsBetweenRequests = 10.0;

// Of the process. Read and written on the server queue.
struct RunTimeSettings {
  std::int32_t minimumBufferFrameSize = kUsualBufferFrameSize;
  std::int32_t minimumIOCycle = 0;
  double waitMicroseconds = 0;
};

// Held to the range of 32 bits.
std::int32_t asInt32(const plist::ValueView& value) {
  using Limits = std::numeric_limits<std::int32_t>;
  return static_cast<std::int32_t>(std::clamp<std::int64_t>(value.asInt64(), Limits::min(), Limits::max()));
}

std::int32_t bufferFrameSize(const plist::Dictionary& payload) {
  static const plist::Key kKey("smallest_buffer_frame_size");
  return asInt32(payload.get(kKey));
}

std::int32_t ioCycle(const plist::Dictionary& payload) {
  static const plist::Key kKey("io_cycle");
  return asInt32(payload.get(kKey));
}

plist::Value loggedSetting(std::string_view key) {
  plist::Value value = TarnReportingSessionDPWorker::getUserDefaults().value(key);
  if (value.present()) {
    kLog(LogLevel::Debug, "Value of %@ is %@", key, value);
  }
  return value;
}

// What isn't above zero, not-a-number included, is no wait.
std::chrono::nanoseconds heldWait(double microseconds) {
  if (!(microseconds > 0)) return std::chrono::nanoseconds::zero();
  const std::chrono::duration<double, std::micro> wait(microseconds);
  const std::chrono::duration<double, std::micro> longest(TarnReportingSessionDPWorker::kLongestWait);
  return std::chrono::duration_cast<std::chrono::nanoseconds>(std::min(wait, longest));
}

// Blocks the queue. A condition that nobody signals, and not a plain sleep, since the platform takes a wait on it for a
// deliberate one.
void waitFor(std::chrono::nanoseconds time) {
  if (time > std::chrono::nanoseconds::zero()) {
    static_cast<void>(TarnReportingUtilityWait(*TarnReportingFacilities().conditions.makeCondition(), time, false));
  }
}

}  // namespace

std::unique_ptr<TarnReportingSessionDPWorker> TarnReportingSessionDPWorker::initWithSession(
    const std::shared_ptr<TarnReportingSession>& session) {
  const bool enabled = getEnableFlag("enable_gyre");
  if (!enabled || !TarnReportingUtilityIsInternalBuild() || TarnReportingFacilities().gyre == nullptr) return nullptr;
  RunTimeSettings settings;
  if (const std::int32_t size = getRunTimeDefaults("io_buffer_size"); size != 0) {
    settings.minimumBufferFrameSize = size;
  }
  settings.minimumIOCycle = getRunTimeDefaults("io_cycle");
  settings.waitMicroseconds = getDoubleRunTimeDefaults("wait_time");
  *ProcessState::of<RunTimeSettings>() = settings;
  return std::make_unique<TarnReportingSessionDPWorker>(session);
}

const TarnReportingDiagnosticDefaults& TarnReportingSessionDPWorker::getUserDefaults() {
  static const TarnReportingDiagnosticDefaults kDefaults;
  return kDefaults;
}

bool TarnReportingSessionDPWorker::getEnableFlag(std::string_view key) {
  return loggedSetting(key).view().asBool();
}

std::int32_t TarnReportingSessionDPWorker::getRunTimeDefaults(std::string_view key) {
  return asInt32(loggedSetting(key));
}

double TarnReportingSessionDPWorker::getDoubleRunTimeDefaults(std::string_view key) {
  return loggedSetting(key).view().asDouble();
}

bool TarnReportingSessionDPWorker::interestedInMessage(const TarnReportingSessionMessage& message) {
  if (message.type() != AudioEventType::Error || message.category() != AudioEventCategory::IO) return false;
  kLog(LogLevel::Info, "Interested in overload");
  return true;
}

bool TarnReportingSessionDPWorker::meetsConditions(const plist::Dictionary& payload, double now) const {
  const auto settings = ProcessState::of<RunTimeSettings>();
  return bufferFrameSize(payload) >= settings->minimumBufferFrameSize &&
         (lastMessageTime_ == 0.0 || now - lastMessageTime_ > kSecondsBetweenRequests) &&
         ioCycle(payload) >= settings->minimumIOCycle;
}

void TarnReportingSessionDPWorker::dropGyre(const plist::Dictionary& payload) {
  const platform::Facilities& facilities = TarnReportingFacilities();
  waitFor(heldWait(ProcessState::of<RunTimeSettings>()->waitMicroseconds));
  kLog(LogLevel::Info, "Dropping gyre %@", payload);
  if (facilities.gyre != nullptr) {
    facilities.gyre->requestGyre({.subsystem = std::string(kSubsystem),
                                  .reason = std::string(kReason),
                                  .applicationIdentifier = payload.get(keys::kHostApplicationDisplayID).asText(),
                                  .payload = payload,
                                  .options = {1, 1, 0, 0, 0}});
  }
  // The platform logs a post that fails; the trace is asked for already.
  static_cast<void>(facilities.notifications.post(kDroppedNotification, std::nullopt));
  kLog(LogLevel::Info, "Dropped gyre");
}

void TarnReportingSessionDPWorker::handleMessage(const std::shared_ptr<TarnReportingSessionMessage>& message) {
  const platform::Clock& clock = TarnReportingFacilities().clock;
  const plist::Dictionary& payload = message->message();
  std::optional<double> now;
  if (interestedInMessage(*message)) {
    now = clock.epochSeconds();  // the wait doesn't count
    if (meetsConditions(payload, *now)) {
      dropGyre(payload);
      lastMessageTime_ = *now;
      return;
    }
  }
  // Nearly every message comes here, so what the line says is worked out only when it is written.
  kLog(
      LogLevel::Debug, "Did not drop gyre, right conditions not met: buffer size : %d, time diff : %f, io cycle: %d",
      [&payload] { return bufferFrameSize(payload); },
      [&clock, &now, this] { return now.value_or(clock.epochSeconds()) - lastMessageTime_; },
      [&payload] { return ioCycle(payload); });
}

}  // namespace tarn
