// SPDX-License-Identifier: Apache-2.0
// The audio-registration worker and the reporting service: which records it sends, and what fails.
#include "tests/telemetry/registration/AudioRegistrationFixture.h"

namespace tarn {
namespace {

using namespace testing;
using platform::AccessoryPart;

TEST_F(AudioRegistration, PublicationIsNotRepeatedAtTheNextStop) {
  platform_.rtcReporting.setBackends(std::nullopt);
  makeDue();
  enumerate({buds(now())});
  worker_->stop();
  platform_.log.clear();
  worker_->stop();
  EXPECT_EQ(messages().back(), "Time to next Invocation: 86400.000000 seconds / 1.000000 days");
  EXPECT_EQ(backendSessions().size(), 1U);
}

TEST_F(AudioRegistration, WeekCountsFromTheMomentOfTheSending) {
  platform_.rtcReporting.completions().set(ReplyFault::Hold);
  makeDue();
  enumerate({buds(now())});
  worker_->stop();
  platform_.advance(std::chrono::hours(3));
  platform_.rtcReporting.completions().deliverHeld();
  EXPECT_EQ(stored(kNextKey), now() + kWeek);
}

TEST_F(AudioRegistration, TimestampOfARecordIsSent) {
  worker_->setupRTCReporterInterface({plist::Dictionary{{"tarnreporting_timestamp", 5}, {"n", 1}}});
  ASSERT_EQ(backendSessions().size(), 1U);
  ASSERT_EQ(backendSessions()[0].messages.size(), 1U);
  EXPECT_EQ(backendSessions()[0].messages[0].payload, (plist::Dictionary{{"tarnreporting_timestamp", 5}, {"n", 1}}));
}

TEST_F(AudioRegistration, CategoryIsCutToItsLowHalf) {
  const auto category = TarnReportingSessionAudioRegistrationWorker::retrieveRTCReportingCategoryFromCategory;
  EXPECT_EQ(category(AudioEventCategory{0x10000005}), 5);
  EXPECT_EQ(category(AudioEventCategory{0xFFFFFFFF}), 0xFFFF);
  worker_->setupRTCReporterInterface({});
  worker_->_sendMessage(*message({{"n", 1}}, AudioEventCategory{0x10000005}, AudioEventType{65535}));
  ASSERT_EQ(backendSessions().size(), 1U);
  ASSERT_EQ(backendSessions()[0].messages.size(), 1U);
  EXPECT_EQ(backendSessions()[0].messages[0].category, 5);
  EXPECT_EQ(backendSessions()[0].messages[0].type, 65535);
  EXPECT_TRUE(platform_.log.contains(platform::LogLevel::Default, "} : category 268435461 : type 65535"));
}

TEST_F(AudioRegistration, NothingIsSentWithoutABackendSession) {
  worker_->_sendMessage(*message({{"n", 1}}));
  platform_.rtcReporting.setMakesSessions(false);
  worker_->setupRTCReporterInterface({});
  worker_->_sendMessage(*message({{"n", 1}}));
  EXPECT_TRUE(backendSessions().empty());
  EXPECT_TRUE(platform_.defaults.writes().empty());
}

TEST_F(AudioRegistration, PublishesARecordForEachRecentAccessory) {
  platform_.localCalendar.setSecondsEastOfUtc(3600);
  session_->updateConfigurationWithContentsOfConfiguration(nullptr);
  const plist::Dictionary configuration{
      {"HostApplicationDisplayID", "org.example.player"}, {"serviceName", "mine"}, {"extra", 5}};
  session_->updateConfigurationWithContentsOfConfiguration(&configuration);
  makeDue();
  enumerate({buds(now() - 60), buds(now() - 9 * kDay), buds(now() - kDay)});
  worker_->stop();

  ASSERT_EQ(backendSessions().size(), 1U);
  const auto backend = backendSessions()[0];
  EXPECT_EQ(backend.sessionInfo, (plist::Dictionary{{"clientType", 52},
                                                    {"clientVersion", 2.1F},
                                                    {"sessionID", 4711},
                                                    {"batchEvent", false},
                                                    {"hierarchyToken", "token-1"},
                                                    {"clientBundleID", "org.example.player"}}));
  EXPECT_EQ(backend.userInfo, (plist::Dictionary{{"clientName", "Tessels_Telemetry"},
                                                 {"serviceName", "mine"},
                                                 {"HostApplicationDisplayID", "org.example.player"},
                                                 {"extra", 5}}));
  EXPECT_FALSE(backend.frameworksToCheck);
  ASSERT_EQ(backend.messages.size(), 2U);
  EXPECT_EQ(backend.messages[0].category, 17);
  EXPECT_EQ(backend.messages[0].type, 11);
  // 2025-06-15, a Sunday, is the 166th day of a year that began on a Wednesday.
  EXPECT_EQ(backend.messages[0].payload, (plist::Dictionary{{"Left", plist::Dictionary{{"serial", "L"}}},
                                                            {"Right", plist::Dictionary{{"serial", "R"}}},
                                                            {"lastConnectedWW", 25}}));
  EXPECT_EQ(backend.flushes, 0U);
  EXPECT_FALSE(backend.released);
  EXPECT_TRUE(worker_->rtcReportingSessionStarted());
  EXPECT_EQ(stored(kNextKey), now() + kWeek);
  EXPECT_EQ(platform_.log.count("Let's publish to RTC!"), 1U);
  EXPECT_EQ(platform_.log.count("entering rtcreporting setupRTCReporterInterface"), 1U);
  EXPECT_TRUE(platform_.log.contains(platform::LogLevel::Default, "RTCReportingAgent fake session 1 : message {"));
  EXPECT_TRUE(platform_.log.contains(platform::LogLevel::Default, "} : category 17 : type 11"));
  EXPECT_EQ(messages().back(), "Message Sent->");
}

TEST_F(AudioRegistration, SessionWithoutConfigurationAnnouncesTheWorkersOwnNames) {
  makeDue();
  enumerate({buds(now())});
  worker_->stop();
  ASSERT_EQ(backendSessions().size(), 1U);
  EXPECT_FALSE(backendSessions()[0].sessionInfo.contains("clientBundleID"));
  EXPECT_EQ(backendSessions()[0].userInfo,
            (plist::Dictionary{{"clientName", "Tessels_Telemetry"}, {"serviceName", "Tessels_Registration"}}));
}

TEST_F(AudioRegistration, RecordOfExactlyEightDaysAgoIsKeptAndOneSecondOlderIsDropped) {
  makeDue();
  enumerate({buds(now() - 8 * kDay - 1), buds(now() - 8 * kDay), buds(now() - 8 * kDay + 1)});
  worker_->stop();
  ASSERT_EQ(backendSessions().size(), 1U);
  EXPECT_EQ(backendSessions()[0].messages.size(), 2U);
}

TEST_F(AudioRegistration, WithoutARecentAccessoryTheNextCheckIsInAWeek) {
  makeDue();
  enumerate({buds(now() - 30 * kDay)});
  worker_->stop();
  EXPECT_EQ(messages().back(),
            "No active Bud connections detected since last publish. Skip publishing anything; check again after "
            "SamplingPeriod");
  EXPECT_EQ(stored(kNextKey), now() + kWeek);
  EXPECT_TRUE(backendSessions().empty());
}

TEST_F(AudioRegistration, WrongKindsInTheInfoAreReadAsTheyCan) {
  makeDue();
  enumerate({{{AccessoryPart::Left, {{"lastConnectedEpoch", std::to_string(static_cast<std::int64_t>(now()))}}}},
             {{AccessoryPart::Left, {{"serial", "no time"}}}},
             {{AccessoryPart::Left, {{"lastConnectedEpoch", plist::Array{1}}}}},
             // Read as 32 bits without a sign, this is now.
             {{AccessoryPart::Left, {{"lastConnectedEpoch", static_cast<std::int64_t>(now()) + (1LL << 32)}}}}});
  worker_->stop();
  ASSERT_EQ(backendSessions().size(), 1U);
  EXPECT_EQ(backendSessions()[0].messages.size(), 2U);
}

TEST_F(AudioRegistration, WithoutATokenTheCheckRepeatsTheNextDay) {
  platform_.rtcReporting.setHandsOutTokens(false);
  makeDue();
  enumerate({buds(now())});
  worker_->stop();
  const auto errors = platform_.log.entries(platform::LogLevel::Error);
  ASSERT_EQ(errors.size(), 1U);
  EXPECT_EQ(errors[0].message(),
            "newHierarchyTokenFromParentToken returned nil. Will skip rtc for this session. setupRTCReporterInterface");
  EXPECT_EQ(stored(kNextKey), now() + kDay);
  EXPECT_TRUE(backendSessions().empty());
}

TEST_F(AudioRegistration, PlatformWithoutTheBackendCountsAsWithoutAToken) {
  platform_.facilities().rtcReporting = nullptr;
  makeDue();
  enumerate({buds(now())});
  worker_->stop();
  EXPECT_EQ(platform_.log.count("newHierarchyTokenFromParentToken returned nil"), 1U);
}

TEST_F(AudioRegistration, SessionThatCannotBeMadeIsNoHarm) {
  platform_.rtcReporting.setMakesSessions(false);
  makeDue();
  enumerate({buds(now())});
  worker_->stop();
  EXPECT_FALSE(worker_->rtcReportingSessionStarted());
  EXPECT_EQ(stored(kNextKey), now() + kDay);
}

TEST_F(AudioRegistration, WithoutBackendsNothingIsSent) {
  platform_.rtcReporting.setBackends(std::nullopt);
  makeDue();
  enumerate({buds(now())});
  worker_->stop();
  EXPECT_TRUE(backendSessions()[0].messages.empty());
  EXPECT_FALSE(worker_->rtcReportingSessionStarted());
  EXPECT_TRUE(platform_.log.contains(platform::LogLevel::Error,
                                     "no backends found, this session won't get sent to the server"));
  EXPECT_EQ(platform_.log.count("Message Sent->"), 0U);
  EXPECT_EQ(stored(kNextKey), now() + kDay);
}

TEST_F(AudioRegistration, AnEmptyListOfBackendsIsOneAllTheSame) {
  platform_.rtcReporting.setBackends(std::vector<std::string>{});
  makeDue();
  enumerate({buds(now())});
  worker_->stop();
  EXPECT_EQ(backendSessions()[0].messages.size(), 1U);
}

TEST_F(AudioRegistration, RefusedMessageIsLoggedAndNotRepeated) {
  platform_.rtcReporting.refuseMessages(platform::RtcReportingSession::SendResult{false, Error{3, "too large"}});
  makeDue();
  enumerate({buds(now()), buds(now())});
  worker_->stop();
  EXPECT_EQ(backendSessions()[0].attempts, 2U);
  EXPECT_EQ(platform_.log.count("error sending message too large"), 2U);
  EXPECT_EQ(stored(kNextKey), now() + kDay);
}

TEST_F(AudioRegistration, MessageThatFailsWithoutAnErrorFailsSilently) {
  platform_.rtcReporting.refuseMessages(platform::RtcReportingSession::SendResult{false, {}});
  makeDue();
  enumerate({buds(now())});
  platform_.log.clear();
  worker_->stop();
  EXPECT_EQ(platform_.log.count("error sending message"), 0U);
  EXPECT_EQ(platform_.log.count("RTCReportingAgent"), 0U);
}

TEST_F(AudioRegistration, CompletionThatOutlivesTheWorkerStillSends) {
  platform_.rtcReporting.completions().set(ReplyFault::Hold);
  makeDue();
  enumerate({buds(now())});
  worker_->stop();
  worker_.reset();
  session_.reset();
  platform_.rtcReporting.completions().deliverHeld();
  EXPECT_EQ(backendSessions()[0].messages.size(), 1U);
}

TEST_F(AudioRegistration, CompletionThatNeverComesLeavesTheCheckToTheNextDay) {
  platform_.rtcReporting.completions().set(ReplyFault::Drop);
  makeDue();
  enumerate({buds(now())});
  worker_->stop();
  EXPECT_EQ(stored(kNextKey), now() + kDay);
  worker_.reset();
  EXPECT_TRUE(backendSessions()[0].released);
}

TEST_F(AudioRegistration, CompletionThatComesTwiceSendsTwice) {
  platform_.rtcReporting.completions().set(ReplyFault::Twice);
  makeDue();
  enumerate({buds(now())});
  worker_->stop();
  EXPECT_EQ(backendSessions()[0].messages.size(), 2U);
}

TEST_F(AudioRegistration, CompletionOnAnotherThreadMeetsTheWorkersEnd) {
  platform_.rtcReporting.completions().set(ReplyFault::OtherThread);
  for (int i = 0; i < 50; ++i) {
    platform_.defaults.set(kSuite, kNextKey, now() - 1);
    state_ = std::make_shared<TarnReportingRegistrationState>();
    makeWorker();
    platform_.defaults.set(kSuite, kCheckKey, 0);
    if (i == 0) {
      platform_.accessories.add(buds(now()));
    }
    handle(kBuds);
    worker_->stop();
    worker_.reset();
    platform_.rtcReporting.completions().joinThreads();  // before the next round sets what it stores
  }
  for (const auto& backend : backendSessions()) {
    EXPECT_EQ(backend.messages.size(), 1U);
  }
  EXPECT_EQ(backendSessions().size(), 50U);
}

TEST_F(AudioRegistration, WorkerWithoutASessionPublishesNothing) {
  makeDue();
  enumerate({buds(now())});
  session_.reset();
  worker_->stop();
  EXPECT_TRUE(backendSessions().empty());
}

TEST_F(AudioRegistration, WorkWeekOfTheEpochIsOneEastOfGreenwichAndOne) {
  EXPECT_EQ(TarnReportingSessionAudioRegistrationWorker::_convertEpochToWorkWeek(0), 1);
  platform_.localCalendar.setSecondsEastOfUtc(14 * 3600);
  EXPECT_EQ(TarnReportingSessionAudioRegistrationWorker::_convertEpochToWorkWeek(0), 1);
}

TEST_F(AudioRegistration, WorkWeekWrapsAtThirtyTwoBits) {
  using Worker = TarnReportingSessionAudioRegistrationWorker;
  EXPECT_EQ(Worker::_convertEpochToWorkWeek((1LL << 32) + 8 * 86400), Worker::_convertEpochToWorkWeek(8 * 86400));
  EXPECT_EQ(Worker::_convertEpochToWorkWeek(-1), Worker::_convertEpochToWorkWeek((1LL << 32) - 1));
  EXPECT_EQ(Worker::_convertEpochToWorkWeek("691200 or so"), 2);
}

}  // namespace
}  // namespace tarn
