// SPDX-License-Identifier: Apache-2.0
#include "telemetry/registration/TarnReportingRegistrationState.h"

#include <utility>

#include "platform/DefaultsStore.h"
#include "platform/Facilities.h"
#include "service/vocabulary/ProcessState.h"
#include "service/vocabulary/TarnReportingLog.h"
#include "service/vocabulary/TarnReportingPlatform.h"

namespace tarn {

namespace {

constexpr TarnReportingLogger kLog{TarnReportingAudioRegistrationCategory, "TarnReportingRegistrationState"};
constexpr std::string_view kSuite = "sys.oxbow.tarnkit";
constexpr std::string_view kNextInvocation = "AudioRegistrationNextInvocationEpoch";
constexpr std::string_view kEnumerationCheck = "AudioRegistrationTSEnumerationCheckEpoch";
constexpr std::string_view kRegistrationInfo = "TSRegistrationInfo";

double load(std::string_view key) {
  return TarnReportingFacilities().defaults.value(kSuite, key).view().asDouble();
}

// What can't be stored is good for this process still.
void store(std::string_view key, const plist::ValueView& value) {
  if (!TarnReportingFacilities().defaults.setValue(kSuite, key, value)) {
    kLog(LogLevel::Error, "failed to store %@", key);
  }
}

}  // namespace

std::shared_ptr<TarnReportingRegistrationState> TarnReportingRegistrationState::shared() {
  return ProcessState::of<TarnReportingRegistrationState>();
}

Status TarnReportingRegistrationState::enumerate() {
  if (!accessoryReader_) {
    accessoryReader_ = std::make_unique<BTAccess>(TarnReportingFacilities().accessories);
  }
  Result<plist::Dictionary> gathered = accessoryReader_->gatherData();
  if (!gathered.failed()) {
    registrationInfo_ = std::move(gathered.value);
  }
  return std::move(gathered.error);
}

void TarnReportingRegistrationState::storeRegistrationInfo() const {
  store(kRegistrationInfo, registrationInfo_.value_or(plist::Dictionary()));
}

double TarnReportingRegistrationState::nextInvocationEpoch() {
  if (nextInvocationEpoch_ == 0) {
    nextInvocationEpoch_ = load(kNextInvocation);
  }
  return nextInvocationEpoch_;
}

double TarnReportingRegistrationState::enumerationCheckEpoch() {
  if (enumerationCheckEpoch_ == 0) {
    enumerationCheckEpoch_ = load(kEnumerationCheck);
  }
  return enumerationCheckEpoch_;
}

void TarnReportingRegistrationState::scheduleNextInvocation(double epochSeconds) {
  nextInvocationEpoch_ = epochSeconds;
  store(kNextInvocation, epochSeconds);
}

void TarnReportingRegistrationState::scheduleEnumerationCheck(double epochSeconds) {
  enumerationCheckEpoch_ = epochSeconds;
  store(kEnumerationCheck, epochSeconds);
}

}  // namespace tarn
