// SPDX-License-Identifier: Apache-2.0
// Where the Snare worker runs and with which instances, and how it reads and writes for the capture service.
#include "tests/diagnostics/snare/SnareFixture.h"

namespace tarn {
namespace {

using namespace testing;
using platform::SnareReplyKeys;

class SnareWorker : public SnareFixture {};

TEST_F(SnareWorker, IsNotMadeOnABuildThatIsNotInternal) {
  platform_.deviceProperties.set("InternalBuild", false);
  EXPECT_EQ(workerOf(startedSession(AudioServiceType::Haptics)), nullptr);
}

TEST_F(SnareWorker, IsNotMadeOnADeviceThatDoesNotTellItsBuild) {
  platform_.deviceProperties.set("InternalBuild", std::nullopt);
  EXPECT_EQ(workerOf(startedSession(AudioServiceType::Haptics)), nullptr);
}

TEST_F(SnareWorker, IsNotMadeWithoutTheCaptureService) {
  platform_.facilities().snare = nullptr;
  EXPECT_EQ(workerOf(startedSession(AudioServiceType::Haptics)), nullptr);
}

TEST_F(SnareWorker, HoldsItsInstancesInOrder) {
  const Session session = startedSession(AudioServiceType::Generic);
  ASSERT_TRUE(workerOf(session) != nullptr);
  EXPECT_EQ(instanceNamesOf(session), (std::vector<std::string>{std::string(kHapticLeaks), std::string(kAlarmLowRMS),
                                                                std::string(kMurmur), std::string(kSSSLeaks)}));
  EXPECT_TRUE(workerOf(session)->started());
}

TEST_F(SnareWorker, LooksForHapticLeaksOnlyWhereThereAreHaptics) {
  for (const auto capability : {std::optional(false), std::optional<bool>()}) {
    platform_.deviceProperties.set("haptics", capability);
    EXPECT_EQ(instanceNamesOf(startedSession(AudioServiceType::Generic)),
              (std::vector<std::string>{std::string(kAlarmLowRMS), std::string(kMurmur), std::string(kSSSLeaks)}));
  }
}

TEST_F(SnareWorker, SingleMessageSessionsHaveTheInstancesOfLeaksAlone) {
  const Session session = startedSession(AudioServiceType::Standalone, 1, TarnReportingSession::Mode::SingleMessage);
  ASSERT_TRUE(workerOf(session) != nullptr);
  EXPECT_EQ(instanceNamesOf(session), (std::vector<std::string>{std::string(kHapticLeaks), std::string(kSSSLeaks)}));
}

TEST_F(SnareWorker, AlarmAndRecordQueueInstancesDeclineSingleMessageSessionsThemselves) {
  const Session single = makeSession(1, TarnReportingSession::Mode::SingleMessage);
  const Session ordinary = startedSession(AudioServiceType::Generic);
  std::size_t declining = 0;
  for (const Worker::Member& member : workerOf(ordinary)->instances()) {
    declining += member.instanceClass.initWithSession(single) == nullptr ? 1U : 0U;
  }
  EXPECT_EQ(declining, 2U);
}

TEST_F(SnareWorker, TakesRedundantMessages) {
  const Session session = startedSession(AudioServiceType::SystemSounds);
  session->sendMessage(message({{"n", 1}}, AudioEventCategory::Output, AudioEventType::Wattlog));
  const Message redundant = message({{"n", 1}}, AudioEventCategory::Output, AudioEventType::Wattlog);
  platform_.log.clear();
  session->sendMessage(redundant);
  EXPECT_TRUE(redundant->isRedundant());
  EXPECT_TRUE(platform_.log.contains(
      "TarnReportingSessionWorker action=handleMessage worker=TarnReportingSessionSnareWorker reporterID=7"));
}

TEST_F(SnareWorker, AStoppedWorkerStartsAgainWithTheSameInstances) {
  const Session session = startedSession(AudioServiceType::Generic);
  const auto* const instance = workerOf(session)->instances().front().instance.get();
  session->stop();
  EXPECT_FALSE(workerOf(session)->started());
  session->start();
  EXPECT_TRUE(workerOf(session)->started());
  EXPECT_EQ(workerOf(session)->instances().front().instance.get(), instance);
}

TEST_F(SnareWorker, SignsWithTheMessagesVocabulary) {
  const auto reporter = platform_.snare.createReporter();
  const Message leak = message({}, static_cast<AudioEventCategory>(0x10000004), AudioEventType::Wattlog);
  EXPECT_EQ(Worker::signatureFromMessage(*leak, AudioServiceType::Haptics, *reporter, "Unknown"),
            (plist::Dictionary{{"domain", "AudioAnalytics"},
                               {"type", "haptics"},
                               {"subType", "DSP_Playback"},
                               {"subTypeContext", "Wattlog"},
                               {"detectedProcess", "Unknown"}}));
  EXPECT_FALSE(Worker::signatureFromMessage(*leak, AudioServiceType::Haptics, *reporter, std::nullopt)
                   .contains("detectedProcess"));
}

// What a reply gives and what is logged about it.
class SnareReply : public SnareWorker {
 protected:
  void expect(const std::optional<plist::Dictionary>& reply, std::string_view identifier, LogLevel level,
              std::string_view text) {
    platform_.log.clear();
    EXPECT_EQ(Worker::getSessionIdentifierFromResponse(reply), identifier) << text;
    EXPECT_TRUE(logged(level, kWorker, text)) << text << "\nlogged: " << platform_.log.texts().at(0);
    EXPECT_EQ(platform_.log.entries().size(), 1U);
  }
  void expectReason(const plist::ValueView& code, LogLevel level, const std::string& text) {
    expect(plist::Dictionary{{SnareReplyKeys::kSuccess, false}, {SnareReplyKeys::kReasonCode, code}}, "NONE_RETURNED",
           level, "Failed starting snare session. reason=" + text);
  }
};

TEST_F(SnareReply, OfSuccessGivesTheIdentifier) {
  expect(plist::Dictionary{{SnareReplyKeys::kSuccess, true}, {SnareReplyKeys::kSessionIdentifier, "abc"}}, "abc",
         LogLevel::Info, "Started Snare session. sessionId=abc");
}

TEST_F(SnareReply, OfSuccessWithoutAnIdentifierGivesNone) {
  expect(plist::Dictionary{{SnareReplyKeys::kSuccess, true}, {SnareReplyKeys::kReasonCode, 3}}, "NONE_RETURNED",
         LogLevel::Error, "Started Snare session, but no sessionId found!");
}

TEST_F(SnareReply, WithoutAReasonFailsForAnUnknownOne) {
  constexpr std::string_view kText = "Failed starting snare session. Unknown reason.";
  expect(std::nullopt, "NONE_RETURNED", LogLevel::Error, kText);
  expect(plist::Dictionary{}, "NONE_RETURNED", LogLevel::Error, kText);
  expect(plist::Dictionary{{SnareReplyKeys::kSuccess, false}, {SnareReplyKeys::kSessionIdentifier, "abc"}},
         "NONE_RETURNED", LogLevel::Error, kText);
}

TEST_F(SnareReply, EveryReasonIsLoggedByItsName) {
  expectReason(0, LogLevel::Error, "kAilmentErrorNone");
  expectReason(1, LogLevel::Info, "kAilmentErrorServiceNotReady");
  expectReason(2, LogLevel::Info, "kAilmentErrorNotSupported");
  expectReason(3, LogLevel::Info, "kAilmentErrorServiceUnavailable");
  expectReason(4, LogLevel::Info, "kAilmentErrorServiceInterrupted");
  expectReason(5, LogLevel::Info, "kAilmentErrorInvalidParameters");
  expectReason(6, LogLevel::Info, "kAilmentErrorDailyLimitExceeded");
  expectReason(7, LogLevel::Info, "kAilmentErrorRandomizedSuppression");
  expectReason(8, LogLevel::Info, "kAilmentErrorSessionNotFound");
  expectReason(9, LogLevel::Info, "kAilmentErrorRequestThrottled");
}

TEST_F(SnareReply, AReasonThatIsNotKnownIsLoggedByItsNumber) {
  expectReason(10, LogLevel::Info, "10");
  expectReason(-1, LogLevel::Info, "-1");
  expectReason(1e300, LogLevel::Info, "9223372036854775807");
}

TEST_F(SnareReply, ValuesOfOtherKindsAreReadAsTheyMayBe) {
  const plist::Dictionary inner{{"a", 1}};
  // What equals true is success; a text never does.
  expect(plist::Dictionary{{SnareReplyKeys::kSuccess, 1.0}, {SnareReplyKeys::kSessionIdentifier, 12}}, "12",
         LogLevel::Info, "Started Snare session. sessionId=12");
  for (const plist::ValueView& flag : {plist::ValueView("true"), plist::ValueView(2), plist::ValueView(inner)}) {
    expect(plist::Dictionary{{SnareReplyKeys::kSuccess, flag}, {SnareReplyKeys::kSessionIdentifier, "abc"}},
           "NONE_RETURNED", LogLevel::Error, "Failed starting snare session. Unknown reason.");
  }
  expect(plist::Dictionary{{SnareReplyKeys::kSuccess, true}, {SnareReplyKeys::kSessionIdentifier, inner}}, "{a = 1}",
         LogLevel::Info, "Started Snare session. sessionId={a = 1}");
  expectReason("6", LogLevel::Info, "kAilmentErrorDailyLimitExceeded");
  expectReason(9.9, LogLevel::Info, "kAilmentErrorRequestThrottled");
  expectReason(inner, LogLevel::Error, "kAilmentErrorNone");
  expectReason(plist::Date{5}, LogLevel::Info, "kAilmentErrorInvalidParameters");
}

}  // namespace
}  // namespace tarn
