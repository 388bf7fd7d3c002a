// SPDX-License-Identifier: Apache-2.0
#include "diagnostics/snare/TarnReportingSessionSnareWorker.h"

#include "diagnostics/snare/TarnReportingSnareWorkerInstanceAlarmLowRMS.h"
#include "diagnostics/snare/TarnReportingSnareWorkerInstanceHapticLeaks.h"
#include "diagnostics/snare/TarnReportingSnareWorkerInstanceMurmurDestroyRecordQueue.h"
#include "diagnostics/snare/TarnReportingSnareWorkerInstanceSSSLeaks.h"
#include "diagnostics/snare/WorkerInstanceState.h"
#include "platform/Clock.h"
#include "platform/DeviceProperties.h"
#include "platform/Facilities.h"
#include "platform/SnareService.h"
#include "service/vocabulary/TarnReportingLog.h"
#include "service/vocabulary/TarnReportingPlatform.h"
#include "service/vocabulary/TarnReportingUtility.h"
#include "session/TarnReportingSession.h"
#include "session/TarnReportingSessionMessage.h"

namespace tarn {

namespace {

constexpr TarnReportingLogger kLog{TarnReportingSnareLogCategory, "TarnReportingSessionSnareWorker"};
constexpr std::string_view kHapticsCapability = "haptics";

}  // namespace

std::unique_ptr<TarnReportingSessionSnareWorker> TarnReportingSessionSnareWorker::initWithSession(
    const std::shared_ptr<TarnReportingSession>& session) {
  const platform::Facilities& facilities = TarnReportingFacilities();
  if (!TarnReportingUtilityIsInternalBuild() || facilities.snare == nullptr) return nullptr;
  auto worker = std::make_unique<TarnReportingSessionSnareWorker>(session);
  if (facilities.deviceProperties.boolean(kHapticsCapability).value_or(false)) {
    worker->addInstance(InstanceClass::of<TarnReportingSnareWorkerInstanceHapticLeaks>());
  }
  worker->addInstance(InstanceClass::of<TarnReportingSnareWorkerInstanceAlarmLowRMS>());
  worker->addInstance(InstanceClass::of<TarnReportingSnareWorkerInstanceMurmurDestroyRecordQueue>());
  worker->addInstance(InstanceClass::of<TarnReportingSnareWorkerInstanceSSSLeaks>());
  return worker;
}

void TarnReportingSessionSnareWorker::addInstance(const InstanceClass& instanceClass) {
  const std::shared_ptr<TarnReportingSession> owner = session();
  if (!owner) return;
  if (owner->isSingleMessageSession() &&
      (instanceClass.handleSingleMessageSession == nullptr || !instanceClass.handleSingleMessageSession())) {
    return;
  }
  if (auto instance = instanceClass.initWithSession(owner)) {
    instances_.push_back({instanceClass, std::move(instance)});
  }
}

bool TarnReportingSessionSnareWorker::start() {
  setStarted(true);
  for (const Member& member : instances_) {
    if (member.instanceClass.start != nullptr) {
      member.instanceClass.start(*member.instance);
    }
  }
  return started();
}

void TarnReportingSessionSnareWorker::handleMessage(const std::shared_ptr<TarnReportingSessionMessage>& message) {
  if (!message) return;
  for (const Member& member : instances_) {
    // Interest first: it changes nothing and mostly ends at a number, while a comparison walks two payloads.
    if (member.instance->interestedInMessage(*message) &&
        !member.instance->workerState().repeatsLastMessage(message->message())) {
      handleInterest(member, *message);
    }
  }
}

void TarnReportingSessionSnareWorker::handleInterest(const Member& member, const TarnReportingSessionMessage& message) {
  const std::shared_ptr<TarnReportingSession> owner = session();
  if (!owner) return;
  kLog(LogLevel::Debug, "Interested in message. instance=%@, %@", member.instanceClass.name,
       [&message] { return message.description(); });
  WorkerInstanceState& state = member.instance->workerState();
  const double now = TarnReportingFacilities().clock.epochSeconds();
  state.count(now);
  if (member.instanceClass.handleMessage != nullptr) {
    member.instanceClass.handleMessage(*member.instance, message);
  }
  state.lastMessage = message.copyWithZone();  // producers may change the record that the session has
  if (member.instanceClass.fire != nullptr && state.verdict(now) == TarnReportingSnareVerdict::Fire) {
    fire(member, *owner, message);
    state.reset();
  }
}

void TarnReportingSessionSnareWorker::fire(const Member& member, const TarnReportingSession& session,
                                           const TarnReportingSessionMessage& message) {
  WorkerInstanceState& state = member.instance->workerState();
  state.symptomReporter = TarnReportingFacilities().snare->createReporter();
  ++state.firedCount;
  if (session.serviceType() == AudioServiceType::Test) {
    kLog(LogLevel::Info, "Skipping actual fire, as we are running in test mode.");
  } else {
    member.instanceClass.fire(*member.instance, message);
  }
}

void TarnReportingSessionSnareWorker::stop() {
  for (const Member& member : instances_) {
    if (member.instanceClass.stop != nullptr) {
      member.instanceClass.stop(*member.instance);
    }
  }
  setStarted(false);
}

}  // namespace tarn
