// SPDX-License-Identifier: Apache-2.0
// The four fault detectors in whole sessions: what interests them, when they fire, what they ask for and what they log.
#include "tests/diagnostics/snare/SnareFixture.h"

namespace tarn {
namespace {

using namespace testing;
using namespace std::chrono_literals;

// A value of every kind, for keys whose value doesn't matter.
const std::vector<plist::Value>& everyKind() {
  static const std::vector<plist::Value> kValues{plist::Value(true),
                                                 plist::Value(-1),
                                                 plist::Value(18446744073709551615U),
                                                 plist::Value(0.5F),
                                                 plist::Value(1e300),
                                                 plist::Value(plist::Date{5}),
                                                 plist::Value("text"),
                                                 plist::Value(plist::DataView{"bytes"}),
                                                 plist::Value(plist::Array{1, "two"}),
                                                 plist::Value(plist::Dictionary{{"a", 1}})};
  return kValues;
}

plist::Dictionary snapshotPayload() {
  const plist::Array processIDs{4711};
  const plist::Dictionary filter{{"processIDs", processIDs}};
  const plist::Dictionary parameters{{"sys.oxbow.WattlogCore.VetchSysLogFilterProcess", filter}};
  return {{"diagnosticExtensionParameters", parameters}};
}

plist::Dictionary signature(std::string_view type, std::string_view subType, std::string_view context,
                            std::string_view process) {
  return {{"domain", "AudioAnalytics"},
          {"type", type},
          {"subType", subType},
          {"subTypeContext", context},
          {"detectedProcess", process}};
}

class SnareHapticLeaks : public SnareFixture {};

TEST_F(SnareHapticLeaks, StateHasItsThresholds) {
  const Session session = startedSession(AudioServiceType::Haptics);
  const WorkerInstanceState& state = stateOf(session, kHapticLeaks);
  EXPECT_EQ(state.interestThresholdCount, 2U);
  EXPECT_EQ(state.interestThresholdDurationSeconds, 60.0);
  EXPECT_FALSE(state.oncePerSession);
}

TEST_F(SnareHapticLeaks, TwoInTwoSessionsFireOnce) {
  startedSession(AudioServiceType::Haptics, 7)->sendMessage(hapticLeak(1));
  EXPECT_TRUE(calls().empty());
  startedSession(AudioServiceType::Generic, 8)->sendMessage(hapticLeak(2));
  ASSERT_EQ(calls().size(), 1U);
  const auto call = calls().front();
  EXPECT_EQ(call.kind, Kind::RequestSnapshot);
  EXPECT_EQ(call.request.signature, signature("haptics", "Playback", "Wattlog", "Unknown"));
  EXPECT_EQ(call.request.durationSeconds, 0.0);
  EXPECT_EQ(call.request.payload, snapshotPayload());
  EXPECT_TRUE(logged(LogLevel::Info, kHapticLeaks, "Parameters to Snare session accepted."));
  EXPECT_TRUE(logged(LogLevel::Info, kHapticLeaks,
                     "Started Snare session for haptics leaks. sessionId=capture-1 "
                     "response={success = 1; sessionIdentifier = capture-1}"));
}

TEST_F(SnareHapticLeaks, CountsGoOnAcrossTheRestartOfASession) {
  const Session session = startedSession(AudioServiceType::Haptics);
  session->sendMessage(hapticLeak(1));
  session->stop();
  session->start();
  session->sendMessage(hapticLeak(2));
  EXPECT_EQ(calls().size(), 1U);
  EXPECT_EQ(stateOf(session, kHapticLeaks).currentSnareSessionIdentifier->get(), "capture-1");
}

TEST_F(SnareHapticLeaks, ARepeatInAnotherSessionDoesNotCount) {
  const double stamp = now();
  for (const std::int64_t reporterID : {7, 8}) {
    const Message leak = hapticLeak(1);
    leak->mutableMessage().set("tarnreporting_timestamp", stamp);
    startedSession(AudioServiceType::Haptics, reporterID)->sendMessage(leak);
  }
  EXPECT_TRUE(calls().empty());
}

TEST_F(SnareHapticLeaks, StateIsSharedByClassAndFreshInAnotherInstallation) {
  const Session first = startedSession(AudioServiceType::Haptics, 7);
  first->sendMessage(hapticLeak(1));
  const Session second = startedSession(AudioServiceType::Haptics, 8);
  EXPECT_EQ(&stateOf(first, kHapticLeaks), &stateOf(second, kHapticLeaks));
  EXPECT_NE(&stateOf(first, kHapticLeaks), &stateOf(first, kSSSLeaks));
  installAnew();
  const Session third = startedSession(AudioServiceType::Haptics, 9);
  EXPECT_EQ(stateOf(third, kHapticLeaks).interestedCount, 0U);
  EXPECT_EQ(stateOf(first, kHapticLeaks).interestedCount, 1U);
}

TEST_F(SnareHapticLeaks, FireInASingleMessageSessionToo) {
  const Session session = startedSession(AudioServiceType::Standalone, 1, TarnReportingSession::Mode::SingleMessage);
  session->sendMessage(hapticLeak(1));
  session->sendMessage(hapticLeak(2));
  EXPECT_EQ(calls().size(), 1U);
}

TEST_F(SnareHapticLeaks, AnyValueUnderTheKeyCounts) {
  const Session session = startedSession(AudioServiceType::Haptics);
  for (const plist::Value& value : everyKind()) {
    session->sendMessage(
        message({{"Haptic_Active_Hardware_Time_Seconds", value}}, AudioEventCategory::Input, AudioEventType::Wattlog));
  }
  EXPECT_EQ(calls().size(), everyKind().size() / 2);
}

TEST_F(SnareHapticLeaks, OtherTypesAndOtherKeysAreOfNoInterest) {
  const Session session = startedSession(AudioServiceType::Haptics);
  session->sendMessage(message({{"Haptic_Active_Hardware_Time_Seconds", 1}}, AudioEventCategory::Playback,
                               AudioEventType::IssueDetector));
  session->sendMessage(
      message({{"haptic_active_hardware_time_seconds", 1}}, AudioEventCategory::Playback, AudioEventType::Wattlog));
  EXPECT_EQ(stateOf(session, kHapticLeaks).interestedCount, 0U);
}

TEST_F(SnareHapticLeaks, AKeyWithBlanksCountsOnceTheyAreReplaced) {
  const Session session = startedSession(AudioServiceType::Haptics);
  session->sendMessage(
      message({{"Haptic Active Hardware Time Seconds", 1}}, AudioEventCategory::Playback, AudioEventType::Wattlog));
  EXPECT_EQ(stateOf(session, kHapticLeaks).interestedCount, 1U);
}

TEST_F(SnareHapticLeaks, ARequestThatIsNotAcceptedIsLoggedAndNotRepeated) {
  platform_.snare.setAccepts(false);
  const Session session = startedSession(AudioServiceType::Haptics);
  session->sendMessage(hapticLeak(1));
  session->sendMessage(hapticLeak(2));
  EXPECT_EQ(calls().size(), 1U);
  EXPECT_TRUE(logged(LogLevel::Error, kHapticLeaks, "Parameters to Snare session not accepted!"));
  EXPECT_EQ(stateOf(session, kHapticLeaks).firedCount, 1U);
  EXPECT_EQ(stateOf(session, kHapticLeaks).interestedCount, 0U);
  EXPECT_FALSE(stateOf(session, kHapticLeaks).currentSnareSessionIdentifier->get());
}

TEST_F(SnareHapticLeaks, ARefusalIsLoggedWithItsReason) {
  platform_.snare.refuseWith(platform::SnareReason::RandomizedSuppression);
  const Session session = startedSession(AudioServiceType::Haptics);
  session->sendMessage(hapticLeak(1));
  session->sendMessage(hapticLeak(2));
  EXPECT_TRUE(
      logged(LogLevel::Info, kWorker, "Failed starting snare session. reason=kAilmentErrorRandomizedSuppression"));
  EXPECT_TRUE(logged(LogLevel::Info, kHapticLeaks,
                     "Started Snare session for haptics leaks. sessionId=NONE_RETURNED "
                     "response={success = 0; reasonCode = 7}"));
  EXPECT_EQ(stateOf(session, kHapticLeaks).currentSnareSessionIdentifier->get(), "NONE_RETURNED");
}

TEST_F(SnareHapticLeaks, NeverFireInSessionsOfTypeTestButCountForTheOthers) {
  const Session test = startedSession(AudioServiceType::Test, 7);
  test->sendMessage(hapticLeak(1));
  startedSession(AudioServiceType::Haptics, 8)->sendMessage(hapticLeak(2));
  EXPECT_EQ(calls().size(), 1U);
  startedSession(AudioServiceType::Haptics, 9)->sendMessage(hapticLeak(3));
  test->sendMessage(hapticLeak(4));
  EXPECT_EQ(calls().size(), 1U);
  EXPECT_EQ(stateOf(test, kHapticLeaks).firedCount, 2U);
}

class SnareStuckSounds : public SnareFixture {};

TEST_F(SnareStuckSounds, StateHasItsThreshold) {
  const Session session = startedSession(AudioServiceType::SystemSounds);
  const WorkerInstanceState& state = stateOf(session, kSSSLeaks);
  EXPECT_EQ(state.interestThresholdCount, 1U);
  EXPECT_EQ(state.interestThresholdDurationSeconds, 1.7976931348623157e308);
  EXPECT_FALSE(state.oncePerSession);
}

TEST_F(SnareStuckSounds, TheFirstFires) {
  startedSession(AudioServiceType::Generic)->sendMessage(stuckSound(1));
  ASSERT_EQ(calls().size(), 1U);
  const auto call = calls().front();
  EXPECT_EQ(call.kind, Kind::RequestSnapshot);
  EXPECT_EQ(call.request.signature, signature("systemsounds", "Output", "Wattlog", "Unknown"));
  EXPECT_EQ(call.request.durationSeconds, 0.0);
  EXPECT_EQ(call.request.payload, snapshotPayload());
  EXPECT_TRUE(logged(LogLevel::Info, kSSSLeaks, "Parameters to Snare session accepted."));
  EXPECT_TRUE(logged(LogLevel::Info, kSSSLeaks,
                     "Started Snare session for system sound server leaks. sessionId=capture-1 "
                     "response={success = 1; sessionIdentifier = capture-1}"));
}

TEST_F(SnareStuckSounds, WithinFifteenSecondsOfAFireNothingIsAskedFor) {
  const Session session = startedSession(AudioServiceType::SystemSounds);
  session->sendMessage(stuckSound(1));
  platform_.advance(10s);
  session->sendMessage(stuckSound(2));
  EXPECT_EQ(calls().size(), 1U);
  EXPECT_TRUE(logged(LogLevel::Info, kSSSLeaks, "Already fired TarnReportingSnareWorkerInstanceSSSLeaks recently."));
  EXPECT_EQ(stateOf(session, kSSSLeaks).firedCount, 2U);  // it got as far as the limit
}

TEST_F(SnareStuckSounds, TheLimitEndsAtFifteenSeconds) {
  const Session session = startedSession(AudioServiceType::SystemSounds);
  session->sendMessage(stuckSound(1));
  platform_.advance(14999ms);
  session->sendMessage(stuckSound(2));
  EXPECT_EQ(calls().size(), 1U);
  platform_.advance(1ms);
  session->sendMessage(stuckSound(3));
  EXPECT_EQ(calls().size(), 2U);
}

TEST_F(SnareStuckSounds, AnAttemptWithinTheLimitDoesNotProlongIt) {
  const Session session = startedSession(AudioServiceType::SystemSounds);
  session->sendMessage(stuckSound(1));
  platform_.advance(10s);
  session->sendMessage(stuckSound(2));
  platform_.advance(5s);
  session->sendMessage(stuckSound(3));
  EXPECT_EQ(calls().size(), 2U);
}

TEST_F(SnareStuckSounds, TheLimitHoldsForAllSessions) {
  startedSession(AudioServiceType::SystemSounds, 7)->sendMessage(stuckSound(1));
  startedSession(AudioServiceType::Generic, 8)->sendMessage(stuckSound(2));
  EXPECT_EQ(calls().size(), 1U);
}

TEST_F(SnareStuckSounds, AClockSetBackProlongsTheLimit) {
  const Session session = startedSession(AudioServiceType::SystemSounds);
  session->sendMessage(stuckSound(1));
  platform_.clock.setEpochSeconds(now() - 100);
  session->sendMessage(stuckSound(2));
  EXPECT_EQ(calls().size(), 1U);
}

TEST_F(SnareStuckSounds, SessionsOfTypeTestLeaveTheLimitAlone) {
  startedSession(AudioServiceType::Test, 7)->sendMessage(stuckSound(1));
  EXPECT_TRUE(calls().empty());
  startedSession(AudioServiceType::SystemSounds, 8)->sendMessage(stuckSound(2));
  EXPECT_EQ(calls().size(), 1U);
}

TEST_F(SnareStuckSounds, ARequestThatIsNotAcceptedCountsForTheLimit) {
  platform_.snare.setAccepts(false);
  const Session session = startedSession(AudioServiceType::SystemSounds);
  session->sendMessage(stuckSound(1));
  session->sendMessage(stuckSound(2));
  EXPECT_EQ(calls().size(), 1U);
  EXPECT_TRUE(logged(LogLevel::Error, kSSSLeaks, "Parameters to Snare session not accepted!"));
}

TEST_F(SnareStuckSounds, AnyValueUnderTheKeyCounts) {
  const Session session = startedSession(AudioServiceType::SystemSounds);
  for (const plist::Value& value : everyKind()) {
    session->sendMessage(
        message({{"System_Sound_Stuck_Time_Seconds", value}}, AudioEventCategory::Input, AudioEventType::Wattlog));
    platform_.advance(15s);
  }
  EXPECT_EQ(calls().size(), everyKind().size());
}

TEST_F(SnareStuckSounds, OtherTypesAreOfNoInterest) {
  startedSession(AudioServiceType::SystemSounds)
      ->sendMessage(
          message({{"System_Sound_Stuck_Time_Seconds", 1}}, AudioEventCategory::Error, AudioEventType::IssueDetector));
  EXPECT_TRUE(calls().empty());
}

class SnareAlarms : public SnareFixture {};

TEST_F(SnareAlarms, StateHasItsThresholdsAndIsOfTheInstance) {
  const Session first = startedSession(AudioServiceType::Alarms, 7);
  const Session second = startedSession(AudioServiceType::Alarms, 8);
  const WorkerInstanceState& state = stateOf(first, kAlarmLowRMS);
  EXPECT_EQ(state.interestThresholdCount, 3U);
  EXPECT_EQ(state.interestThresholdDurationSeconds, 15.0);
  EXPECT_TRUE(state.oncePerSession);
  EXPECT_NE(&state, &stateOf(second, kAlarmLowRMS));
  sendLowRms(first, 2);
  EXPECT_EQ(stateOf(second, kAlarmLowRMS).interestedCount, 0U);
}

TEST_F(SnareAlarms, TheThirdStartsACaptureOfAMinute) {
  const Session session = startedSession(AudioServiceType::Alarms);
  sendLowRms(session, 2);
  EXPECT_TRUE(calls().empty());
  session->sendMessage(lowRms(2));
  ASSERT_EQ(calls().size(), 1U);
  const auto call = calls().front();
  EXPECT_EQ(call.kind, Kind::StartSession);
  EXPECT_EQ(call.request.signature, signature("alarms", "Error", "IssueDetector", "player"));
  EXPECT_EQ(call.request.durationSeconds, 60.0);
  EXPECT_FALSE(call.request.payload);
  EXPECT_TRUE(logged(LogLevel::Info, kAlarmLowRMS,
                     "Parameters to Snare session for alarm Low RMS accepted. Will fire if not cancelled. "
                     "timeout=60.000000."));
  EXPECT_TRUE(logged(LogLevel::Info, kAlarmLowRMS,
                     "Started Snare session for alarm Low RMS. sessionId=capture-1 timeout=60.000000 "
                     "response={success = 1; sessionIdentifier = capture-1}"));
}

TEST_F(SnareAlarms, StopCancelsTheCapture) {
  const Session session = startedSession(AudioServiceType::Alarms);
  sendLowRms(session, 3);
  session->stop();
  ASSERT_EQ(calls().size(), 2U);
  EXPECT_EQ(calls()[1].kind, Kind::CancelSession);
  EXPECT_EQ(calls()[1].cancelledIdentifier, "capture-1");
  EXPECT_EQ(calls()[1].reporter, calls()[0].reporter);
  EXPECT_TRUE(logged(LogLevel::Info, kAlarmLowRMS,
                     "Stop called. Cancelling Snare session for alarm Low RMS. sessionId=capture-1 "
                     "timeout=60.000000"));
}

TEST_F(SnareAlarms, ASecondStopCancelsItAgain) {
  const Session session = startedSession(AudioServiceType::Alarms);
  sendLowRms(session, 3);
  session->stop();
  session->start();
  session->stop();
  ASSERT_EQ(calls().size(), 3U);
  EXPECT_EQ(calls()[2].cancelledIdentifier, "capture-1");
}

TEST_F(SnareAlarms, AFourthNeverFiresAgain) {
  const Session session = startedSession(AudioServiceType::Alarms);
  sendLowRms(session, 20);
  session->stop();
  session->start();
  sendLowRms(session, 20);
  std::size_t started = 0;
  for (const auto& call : calls()) {
    started += call.kind == Kind::StartSession ? 1U : 0U;
  }
  EXPECT_EQ(started, 1U);
}

TEST_F(SnareAlarms, WithoutACaptureStopCancelsNothing) {
  const Session session = startedSession(AudioServiceType::Alarms);
  sendLowRms(session, 2);
  session->stop();
  EXPECT_TRUE(calls().empty());
  EXPECT_FALSE(platform_.log.contains("Stop called. Cancelling"));
}

TEST_F(SnareAlarms, WhatStandsForNoIdentifierIsCancelledLikeAnyOther) {
  platform_.snare.refuseWith(platform::SnareReason::ServiceNotReady);
  const Session session = startedSession(AudioServiceType::Alarms);
  sendLowRms(session, 3);
  session->stop();
  ASSERT_EQ(calls().size(), 2U);
  EXPECT_EQ(calls()[1].cancelledIdentifier, "NONE_RETURNED");
}

TEST_F(SnareAlarms, ARequestThatIsNotAcceptedIsLogged) {
  platform_.snare.setAccepts(false);
  const Session session = startedSession(AudioServiceType::Alarms);
  sendLowRms(session, 3);
  EXPECT_TRUE(logged(LogLevel::Error, kAlarmLowRMS, "Snare session for alarm Low RMS failed to start."));
  session->stop();
  EXPECT_EQ(calls().size(), 1U);
}

TEST_F(SnareAlarms, AProcessWithoutANameIsLeftOutOfTheSignature) {
  const Session session = startedSession(AudioServiceType::Alarms);
  session->setClientProcessName("");
  sendLowRms(session, 3);
  ASSERT_EQ(calls().size(), 1U);
  EXPECT_FALSE(calls()[0].request.signature.contains("detectedProcess"));
}

TEST_F(SnareAlarms, OnlySessionsOfAlarmsAndTestAreOfInterest) {
  for (const std::uint16_t type : std::vector<std::uint16_t>{0, 3, 4, 10, 11, 13, 65535}) {
    const Session session = startedSession(static_cast<AudioServiceType>(type));
    sendLowRms(session, 2);
    EXPECT_EQ(stateOf(session, kAlarmLowRMS).interestedCount, type == 4 || type == 11 ? 2U : 0U) << type;
  }
}

TEST_F(SnareAlarms, InASessionOfTypeTestNothingIsAskedForOrCancelled) {
  const Session session = startedSession(AudioServiceType::Test);
  sendLowRms(session, 3);
  session->stop();
  EXPECT_TRUE(calls().empty());
  EXPECT_EQ(stateOf(session, kAlarmLowRMS).firedCount, 1U);
}

TEST_F(SnareAlarms, OtherIssuesCategoriesAndTypesAreOfNoInterest) {
  const Session session = startedSession(AudioServiceType::Alarms);
  const auto send = [&](const plist::ValueView& issue, std::uint32_t category, AudioEventType type) {
    session->sendMessage(message({{"issue_type", issue}}, static_cast<AudioEventCategory>(category), type));
  };
  send("lowrms", 11, AudioEventType::IssueDetector);
  send("LowRMS ", 11, AudioEventType::IssueDetector);
  send("LowRMS", 11, AudioEventType::Error);
  send("LowRMS", 4, AudioEventType::IssueDetector);
  send("LowRMS", 0x2000000B, AudioEventType::IssueDetector);  // an error of a domain
  for (const plist::Value& value : everyKind()) {
    send(value, 11, AudioEventType::IssueDetector);
  }
  send(plist::Array{"LowRMS"}, 11, AudioEventType::IssueDetector);
  send(plist::DataView{"LowRMS"}, 11, AudioEventType::IssueDetector);
  session->sendMessage(message({}, AudioEventCategory::Error, AudioEventType::IssueDetector));
  EXPECT_EQ(stateOf(session, kAlarmLowRMS).interestedCount, 0U);
  EXPECT_TRUE(calls().empty());  // nor did they add up to a capture
}

class SnareRecordQueues : public SnareFixture {};

TEST_F(SnareRecordQueues, AreNeverOfInterest) {
  const Session session = startedSession(AudioServiceType::Alarms);
  const Worker::Member& murmur = workerOf(session)->instances().at(2);
  ASSERT_EQ(murmur.instanceClass.name, kMurmur);
  for (const Message& any : {hapticLeak(1), stuckSound(1), lowRms(1), message({})}) {
    EXPECT_FALSE(murmur.instance->interestedInMessage(*any));
  }
  EXPECT_EQ(murmur.instanceClass.fire, nullptr);
  ASSERT_TRUE(murmur.instanceClass.handleMessage != nullptr);
  murmur.instanceClass.handleMessage(*murmur.instance, *message({}));
  EXPECT_EQ(murmur.instance->workerState().interestedCount, 0U);
  EXPECT_EQ(murmur.instance->workerState().interestThresholdCount, 18446744073709551615U);
}

TEST_F(SnareRecordQueues, EachSessionHasAStateOfItsOwn) {
  const Session first = startedSession(AudioServiceType::Generic, 7);
  const Session second = startedSession(AudioServiceType::Generic, 8);
  EXPECT_NE(&stateOf(first, kMurmur), &stateOf(second, kMurmur));
}

}  // namespace
}  // namespace tarn
