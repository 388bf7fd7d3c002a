// SPDX-License-Identifier: Apache-2.0
// AudioRegistration: a session with an audio-registration worker on accessories that the test lays out.
#pragma once

#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "telemetry/registration/TarnReportingRegistrationState.h"
#include "telemetry/registration/TarnReportingSessionAudioRegistrationWorker.h"
#include "tests/session/SessionFixture.h"

namespace tarn::testing {

// Earbuds, with their case or without.
inline FakeAccessoryQueries::Accessory buds(double lastConnected, bool withCase = false) {
  FakeAccessoryQueries::Accessory accessory{
      {platform::AccessoryPart::Left, {{"lastConnectedEpoch", lastConnected}, {"serial", "L"}}},
      {platform::AccessoryPart::Right, {{"lastConnectedEpoch", lastConnected}, {"serial", "R"}}}};
  if (withCase) {
    accessory[platform::AccessoryPart::Case] = {{"lastConnectedEpoch", lastConnected}, {"charge", 80}};
  }
  return accessory;
}

class AudioRegistration : public SessionFixture {
 protected:
  static constexpr const char* kSuite = "sys.oxbow.tarnkit";
  static constexpr const char* kNextKey = "AudioRegistrationNextInvocationEpoch";
  static constexpr const char* kCheckKey = "AudioRegistrationTSEnumerationCheckEpoch";
  static constexpr const char* kInfoKey = "TSRegistrationInfo";
  static constexpr const char* kBuds = "speaker, kbdQ ( 0f3e ) ( 7305 ), other";
  static constexpr double kDay = 86400;
  static constexpr double kWeek = 604800;

  AudioRegistration() { makeWorker(); }

  // One for the session, on the state that all workers of a test share.
  void makeWorker() { worker_ = std::make_unique<TarnReportingSessionAudioRegistrationWorker>(session_, state_); }
  // As after a restart.
  void forgetState() {
    state_ = std::make_shared<TarnReportingRegistrationState>();
    makeWorker();
  }
  void handle(const plist::ValueView& activeDevices) {
    worker_->handleMessage(message({{"active_devices", activeDevices}}));
  }
  // Lays the accessories out and has the worker see them.
  void enumerate(std::vector<FakeAccessoryQueries::Accessory> accessories) {
    for (auto& accessory : accessories) {
      platform_.accessories.add(std::move(accessory));
    }
    handle(kBuds);
    platform_.log.clear();
  }
  // A state in which a publication has been due for a second.
  void makeDue() { platform_.defaults.set(kSuite, kNextKey, now() - 1); }
  double stored(const char* key) const { return platform_.defaults.value(kSuite, key).view().asDouble(); }
  std::vector<std::string> messages() const { return platform_.log.messages(); }
  std::vector<FakeRtcReportingService::Session> backendSessions() const { return platform_.rtcReporting.sessions(); }

  std::shared_ptr<TarnReportingSession> session_ = makeSession(4711);
  std::shared_ptr<TarnReportingRegistrationState> state_ = std::make_shared<TarnReportingRegistrationState>();
  std::unique_ptr<TarnReportingSessionAudioRegistrationWorker> worker_;
};

}  // namespace tarn::testing
