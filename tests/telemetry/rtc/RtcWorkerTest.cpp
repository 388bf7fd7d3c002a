// SPDX-License-Identifier: Apache-2.0
// The Rtc worker on a service that answers as it should: what it is told, in which order, and what is logged.
#include <algorithm>

#include "telemetry/rtc/TarnReportingRtcMirror.h"
#include "tests/telemetry/rtc/RtcFixture.h"

namespace tarn {
namespace {

using namespace testing;
using Mode = TarnReportingSession::Mode;

class RtcWorker : public RtcFixture {
 protected:
  static Texts keysOf(const plist::Dictionary& dictionary) {
    Texts keys;
    for (const auto& entry : dictionary) {
      keys.emplace_back(entry.key.text());
    }
    return keys;
  }
  // The names of the queues that were made, but for the one on which everything runs.
  Texts ownQueues() const {
    Texts names = platform_.workQueues.names();
    std::erase(names, "sys.oxbow.tarnkit.reporting.server");
    return names;
  }
  // A session that is started with this configuration.
  RtcSession sessionWith(const plist::Dictionary& configuration, AudioServiceType type = AudioServiceType::Haptics,
                         Mode mode = Mode::Ordinary) {
    const auto session = makeTyped(type, mode);
    session->updateConfigurationWithContentsOfConfiguration(&configuration);
    session->start();
    platform_.runUntilIdle();
    return onlySession();
  }
};

TEST_F(RtcWorker, IsAConsumerForSingleMessageSessionsThatStartsWithTheSessionAndWantsNothingRedundant) {
  constexpr auto kRow = TarnReportingSessionWorkerClass::of<TarnReportingSessionRtcWorker>();
  EXPECT_EQ(kRow.name, "TarnReportingSessionRtcWorker");
  EXPECT_NE(kRow.asConsumer, nullptr);
  EXPECT_FALSE(kRow.isProducer);
  EXPECT_EQ(kRow.startOnInit, nullptr);
  EXPECT_EQ(kRow.handleRedundantMessages, nullptr);
  ASSERT_NE(kRow.handleSingleMessageSession, nullptr);
  EXPECT_TRUE(kRow.handleSingleMessageSession());
}

TEST_F(RtcWorker, DeclinesATestSession) {
  const auto session = startSession(AudioServiceType::Test);
  EXPECT_EQ(session->workerInstanceCount(), 0U);
  EXPECT_TRUE(ownQueues().empty());
}

TEST_F(RtcWorker, StartOnATestSessionReturnsFalseAndDoesNothing) {
  const auto session = makeTyped(AudioServiceType::Haptics);
  const auto worker = TarnReportingSessionRtcWorker::initWithSession(session);
  ASSERT_NE(worker, nullptr);
  session->setServiceType(AudioServiceType::Test);
  EXPECT_FALSE(worker->start());
  EXPECT_TRUE(ownQueues().empty());
}

TEST_F(RtcWorker, DeclinesWhereThereIsNoSuchService) {
  platform_.facilities().rtcReporting = nullptr;
  EXPECT_EQ(startSession()->workerInstanceCount(), 0U);
}

TEST_F(RtcWorker, WorkerThatLostItsSessionDoesNothing) {
  auto session = makeTyped(AudioServiceType::Haptics);
  const auto worker = TarnReportingSessionRtcWorker::initWithSession(session);
  session.reset();
  EXPECT_FALSE(worker->start());
  worker->stop();
  EXPECT_TRUE(ownQueues().empty());
}

TEST_F(RtcWorker, BeginsNotStartedAndWithoutAQueue) {
  const auto worker = TarnReportingSessionRtcWorker::initWithSession(makeTyped(AudioServiceType::Haptics));
  EXPECT_FALSE(worker->started());
  EXPECT_FALSE(worker->getRTCReportingStartedState());
  EXPECT_TRUE(ownQueues().empty());
}

TEST_F(RtcWorker, HasOneSerialQueueOfItsOwnMadeOnFirstUse) {
  const auto first = makeTyped(AudioServiceType::Haptics);
  first->start();
  const auto second = makeTyped(AudioServiceType::Haptics);
  second->start();
  first->sendMessage(message({{"n", 1}}));
  first->stop();
  EXPECT_EQ(ownQueues(), Texts(2, "sys.oxbow.tarnkit.session.rtcreporting"));
  const auto queue = platform_.workQueues.find("sys.oxbow.tarnkit.session.rtcreporting");
  EXPECT_EQ(queue->quality(), platform::QualityOfService::Utility);
  EXPECT_EQ(workerOf(*first).rtcReportingQueue(), queue);
  EXPECT_NE(workerOf(*second).rtcReportingQueue(), queue);
}

TEST_F(RtcWorker, StartReturnsBeforeTheServicesSessionExists) {
  const auto session = makeTyped(AudioServiceType::Haptics);
  session->start();
  EXPECT_TRUE(workerOf(*session).started());
  EXPECT_FALSE(workerOf(*session).getRTCReportingStartedState());
  EXPECT_TRUE(platform_.rtcReporting.sessions().empty());
  EXPECT_TRUE(lines().empty());
  platform_.runUntilIdle();
  EXPECT_TRUE(workerOf(*session).getRTCReportingStartedState());
  EXPECT_EQ(onlySession().starts, 1U);
}

TEST_F(RtcWorker, SessionInfoHasItsFieldsInOrder) {
  const RtcSession made = sessionWith({});
  EXPECT_EQ(keysOf(made.sessionInfo), (Texts{"clientType", "clientVersion", "sessionID", "batchEvent", "hierarchyToken",
                                             "containsRealtimeEvents"}));
  EXPECT_EQ(made.sessionInfo, (plist::Dictionary{{"clientType", 19},
                                                 {"clientVersion", 2.1F},
                                                 {"sessionID", 7},
                                                 {"batchEvent", true},
                                                 {"hierarchyToken", "token-1"},
                                                 {"containsRealtimeEvents", false}}));
  EXPECT_EQ(made.sessionInfo["clientVersion"].kind(), plist::Kind::Float);
  EXPECT_EQ(made.sessionInfo["sessionID"].kind(), plist::Kind::Signed);
  EXPECT_EQ(made.sessionInfo["batchEvent"].kind(), plist::Kind::Bool);
  EXPECT_FALSE(made.frameworksToCheck);
}

TEST_F(RtcWorker, UserInfoHasItsFieldsInOrder) {
  const RtcSession made = sessionWith({});
  EXPECT_EQ(keysOf(made.userInfo), (Texts{"clientName", "TarnReportingSessionID", "serviceName"}));
  EXPECT_EQ(made.userInfo, (plist::Dictionary{{"clientName", "sys.oxbow.tarnkit"},
                                              {"TarnReportingSessionID", 7},
                                              {"serviceName", "haptics_session"}}));
}

TEST_F(RtcWorker, UserInfoIsTheSameOnAnInternalBuild) {
  platform_.deviceProperties.set("InternalBuild", true);
  EXPECT_EQ(keysOf(sessionWith({}).userInfo), (Texts{"clientName", "TarnReportingSessionID", "serviceName"}));
}

TEST_F(RtcWorker, ReporterIDIsASigned64BitNumber) {
  const auto session = makeSession(INT64_MIN);
  session->start();
  platform_.runUntilIdle();
  EXPECT_EQ(onlySession().sessionInfo["sessionID"].signedValue(), INT64_MIN);
  EXPECT_EQ(onlySession().userInfo["TarnReportingSessionID"].signedValue(), INT64_MIN);
}

TEST_F(RtcWorker, ApiUsageSessionSendsInRealTimeAndEveryOtherInBatches) {
  for (std::uint16_t type = 0; type < 16; ++type) {
    const bool batch =
        TarnReportingSessionRtcWorker::shouldBatchRTCReportingEventsForServiceType(AudioServiceType{type});
    EXPECT_EQ(batch, type != 12) << type;
  }
  const RtcSession made = sessionWith({}, AudioServiceType::APIUsage);
  EXPECT_EQ(made.sessionInfo["batchEvent"], plist::ValueView(false));
  EXPECT_EQ(made.sessionInfo["containsRealtimeEvents"], plist::ValueView(true));
}

TEST_F(RtcWorker, SingleMessageSessionAnnouncesThePlainServiceName) {
  EXPECT_EQ(sessionWith({}, AudioServiceType::Haptics, Mode::SingleMessage).userInfo["serviceName"].text(), "haptics");
}

TEST_F(RtcWorker, ConfigurationOverwritesTheNameOfASingleMessageSessionToo) {
  const RtcSession made = sessionWith({{"serviceName", "mine"}}, AudioServiceType::Haptics, Mode::SingleMessage);
  EXPECT_EQ(made.userInfo["serviceName"].text(), "mine");
}

TEST_F(RtcWorker, ConfigurationIsAddedToTheUserInfoAndOverwritesIt) {
  const RtcSession made = sessionWith({{"extra", 5}, {"serviceName", "mine"}, {"TarnReportingSessionID", "none"}});
  EXPECT_EQ(made.userInfo, (plist::Dictionary{{"clientName", "sys.oxbow.tarnkit"},
                                              {"TarnReportingSessionID", "none"},
                                              {"serviceName", "mine"},
                                              {"extra", 5}}));
  EXPECT_EQ(made.sessionInfo["sessionID"], plist::ValueView(7));
}

TEST_F(RtcWorker, HostApplicationBecomesTheClientBundleID) {
  const RtcSession made = sessionWith({{"HostApplicationDisplayID", "org.example.music"}});
  EXPECT_EQ(made.sessionInfo["clientBundleID"].text(), "org.example.music");
  EXPECT_EQ(keysOf(made.sessionInfo).back(), "clientBundleID");
  EXPECT_EQ(made.userInfo["HostApplicationDisplayID"].text(), "org.example.music");
}

TEST_F(RtcWorker, HostApplicationOfAnyKindIsPassedOnAsItIs) {
  const plist::Dictionary nested{{"a", 1}};
  const RtcSession made = sessionWith({{"HostApplicationDisplayID", nested}});
  EXPECT_EQ(made.sessionInfo["clientBundleID"], plist::ValueView(nested));
}

TEST_F(RtcWorker, ConfigurationAndTypeAreThoseAtTheStart) {
  const auto session = makeTyped(AudioServiceType::Haptics);
  session->start();
  const plist::Dictionary later{{"extra", 5}};
  session->updateConfigurationWithContentsOfConfiguration(&later);
  session->setServiceType(AudioServiceType::APIUsage);
  platform_.runUntilIdle();
  EXPECT_FALSE(onlySession().userInfo.contains("extra"));
  EXPECT_EQ(onlySession().userInfo["serviceName"].text(), "haptics_session");
  EXPECT_EQ(onlySession().sessionInfo["batchEvent"], plist::ValueView(true));
}

TEST_F(RtcWorker, MessagesReachTheServiceInTheirOrder) {
  const auto session = startSession();
  for (int i = 0; i < 5; ++i) {
    session->sendMessage(message({{"n", i}}, AudioEventCategory::Volume, AudioEventType::Simple));
  }
  EXPECT_TRUE(onlySession().messages.empty());  // only handed over so far
  platform_.runUntilIdle();
  const RtcSession made = onlySession();
  ASSERT_EQ(made.messages.size(), 5U);
  for (int i = 0; i < 5; ++i) {
    const RtcMessage& sent = made.messages[static_cast<std::size_t>(i)];
    EXPECT_EQ(sent.category, 14);
    EXPECT_EQ(sent.type, 16);
    EXPECT_EQ(sent.payload["n"].asInt64(), i);
    EXPECT_EQ(sent.payload["audiotag"].text(), "VolumeSimple");
  }
}

TEST_F(RtcWorker, CategoryIsCutToItsLowHalf) {
  const auto category = TarnReportingSessionRtcWorker::retrieveRTCReportingCategoryFromCategory;
  EXPECT_EQ(category(AudioEventCategory{0x10000005}), 5);
  EXPECT_EQ(category(AudioEventCategory{5}), 5);
  EXPECT_EQ(category(AudioEventCategory{0xFFFFFFFF}), 0xFFFF);
  EXPECT_EQ(category(AudioEventCategory{0x00010000}), 0);
  const auto session = startSession();
  session->sendMessage(message({{"n", 1}}, AudioEventCategory{0x10000005}, AudioEventType{65535}));
  platform_.runUntilIdle();
  ASSERT_EQ(onlySession().messages.size(), 1U);
  EXPECT_EQ(onlySession().messages[0].category, 5);
  EXPECT_EQ(onlySession().messages[0].type, 65535);
}

TEST_F(RtcWorker, RedundantMessageIsNotMirrored) {
  const auto session = startSession();
  session->sendMessage(message({{"n", 1}, {"tarnreporting_timestamp", now()}}));
  session->sendMessage(message({{"n", 1}, {"tarnreporting_timestamp", now() + 1}}));
  platform_.runUntilIdle();
  EXPECT_EQ(onlySession().messages.size(), 1U);
}

TEST_F(RtcWorker, TimestampIsGoneFromWhatIsSentAndStaysInTheSessionsRecord) {
  const auto session = startSession();
  const auto sent = message({{"tarnreporting_timestamp", now()}, {"n", 1}});
  session->sendMessage(sent);
  platform_.runUntilIdle();
  EXPECT_FALSE(onlySession().messages.at(0).payload.contains("tarnreporting_timestamp"));
  EXPECT_TRUE(onlySession().messages.at(0).payload.contains("n"));
  EXPECT_TRUE(sent->message().contains("tarnreporting_timestamp"));
}

TEST_F(RtcWorker, TimestampIsGoneForEveryHolderOfTheRecordThatIsSent) {
  const auto session = startSession();
  const auto record = message({{"tarnreporting_timestamp", 5}, {"n", 1}});
  const auto holder = record;
  workerOf(*session).rtcReportingQueue()->async([&] { workerOf(*session)._sendMessage(record); });
  platform_.runUntilIdle();
  EXPECT_EQ(holder->message(), (plist::Dictionary{{"n", 1}}));
}

TEST_F(RtcWorker, TimestampGoesToTheServiceOnAnInternalBuild) {
  platform_.deviceProperties.set("InternalBuild", true);
  const auto session = startSession();
  session->sendMessage(message({{"tarnreporting_timestamp", now()}}));
  platform_.runUntilIdle();
  EXPECT_EQ(onlySession().messages.at(0).payload["tarnreporting_timestamp"].asDouble(), now());
}

TEST_F(RtcWorker, TimestampIsGoneEvenWhenThereIsNoSessionToSendThrough) {
  const auto worker = TarnReportingSessionRtcWorker::initWithSession(makeTyped(AudioServiceType::Haptics));
  const auto record = message({{"tarnreporting_timestamp", 5}, {"n", 1}});
  worker->_sendMessage(record);
  EXPECT_EQ(record->message(), (plist::Dictionary{{"n", 1}}));
  EXPECT_EQ(lines(), (Texts{"debug entering rtcreporting _sendMessage"}));
}

TEST_F(RtcWorker, TimestampOfAnyKindIsRemoved) {
  const auto session = startSession();
  for (const plist::Value& stamp : {plist::Value("soon"), plist::Value(true), plist::Value(plist::Dictionary{})}) {
    const auto record = message({{"tarnreporting_timestamp", stamp}});
    workerOf(*session)._sendMessage(record);
    EXPECT_TRUE(record->message().empty());
  }
}

TEST_F(RtcWorker, ChangeBehindTheHandOverDoesNotReachTheService) {
  const auto session = startSession();
  const auto sent = message({{"n", 1}});
  session->sendMessage(sent);
  sent->mutableMessage().set("n", 2);
  platform_.runUntilIdle();
  EXPECT_EQ(onlySession().messages.at(0).payload["n"].asInt64(), 1);
}

TEST_F(RtcWorker, StopFlushesBehindTheMessagesAndLetsTheSessionGo) {
  const auto session = startSession();
  session->sendMessage(message({{"n", 1}}));
  session->stop();
  EXPECT_EQ(onlySession().flushes, 0U);
  platform_.runUntilIdle();
  const RtcSession made = onlySession();
  EXPECT_EQ(made.flushes, 1U);
  EXPECT_EQ(made.messagesAtLastFlush, 2U);  // the message and the summary event
  EXPECT_TRUE(made.released);
  EXPECT_FALSE(workerOf(*session).getRTCReportingStartedState());
  EXPECT_FALSE(workerOf(*session).started());
}

TEST_F(RtcWorker, SessionThatIsStartedAgainGetsASessionOfItsOwn) {
  const auto session = startSession();
  session->sendMessage(message({{"n", 1}}));
  session->stop();
  session->start();
  session->sendMessage(message({{"n", 2}}));
  session->stop();
  platform_.runUntilIdle();
  const auto made = platform_.rtcReporting.sessions();
  ASSERT_EQ(made.size(), 2U);
  for (int i = 0; i < 2; ++i) {
    const RtcSession& each = made[static_cast<std::size_t>(i)];
    ASSERT_EQ(each.messages.size(), 2U);
    EXPECT_EQ(each.messages[0].payload["n"].asInt64(), i + 1);
    EXPECT_EQ(each.messages[1].payload["n"].text(), std::to_string(i + 1));
    EXPECT_EQ(each.flushes, 1U);
  }
  EXPECT_EQ(made[1].sessionInfo["hierarchyToken"].text(), "token-2");
}

TEST_F(RtcWorker, TokenIsHeldWhileTheServicesSessionIs) {
  const auto session = makeTyped(AudioServiceType::Haptics);
  const auto mirror = std::make_shared<TarnReportingRtcMirror>(platform_.rtcReporting);
  TarnReportingSessionRtcWorker worker(session, mirror);
  EXPECT_EQ(mirror->rtcReportingAgentToken(), std::nullopt);
  worker.start();
  platform_.runUntilIdle();
  EXPECT_EQ(mirror->rtcReportingAgentToken(), "token-1");
  worker.stop();
  platform_.runUntilIdle();
  EXPECT_EQ(mirror->rtcReportingAgentToken(), std::nullopt);
}

TEST_F(RtcWorker, WorkerThatWasNeverStartedLogsSoAtItsStop) {
  const auto session = makeTyped(AudioServiceType::Haptics);
  const auto worker = TarnReportingSessionRtcWorker::initWithSession(session);
  worker->stop();
  platform_.runUntilIdle();
  EXPECT_EQ(lines(), (Texts{"default Session never started. stop"}));
  EXPECT_TRUE(platform_.rtcReporting.sessions().empty());
}

TEST_F(RtcWorker, LogsTheWholeWayOfASession) {
  const auto session = startSession();
  session->sendMessage(message({{"n", 1}, {"tarnreporting_timestamp", now()}}, AudioEventCategory{0x80000004}));
  platform_.runUntilIdle();
  platform_.rtcReporting.refuseMessages(platform::RtcReportingSession::SendResult{});
  session->stop();
  platform_.runUntilIdle();
  EXPECT_EQ(
      lines(),
      (Texts{"debug entering rtcreporting start", "default list of backends (fake)", "default waiting to find backends",
             "default continuing with backends!", "debug entering rtcreporting _sendMessage",
             "debug RTCReportingAgent fake session 1 : message {n = 1; audiotag = Toolbox_PlaybackStart; "
             "HostApplicationDisplayID = Unknown} : category -2147483644 : type 1",
             "default sending rtc summary event. reporterID=7",
             "debug sending rtc summary event. reporterID=7 Tarn_Session_Summary_Event=\"3\"",
             "debug sending rtc summary event. reporterID=7 n=\"1\"",
             "debug sending rtc summary event. reporterID=7 tarnreporting_timestamp=\"1750000000\"",
             "debug sending rtc summary event. reporterID=7 audiotag=\"Toolbox_PlaybackStart\"",
             "debug sending rtc summary event. reporterID=7 HostApplicationDisplayID=\"Unknown\"",
             "debug entering rtcreporting _sendMessage", "debug entering rtcreporting stop",
             "debug stopping and setting session to nil"}));
}

TEST_F(RtcWorker, RefusalWithAnErrorIsLoggedOnceAndNotRetried) {
  const auto session = startSession();
  platform_.rtcReporting.refuseMessages(platform::RtcReportingSession::SendResult{false, {{5, "no room"}}});
  session->sendMessage(message({{"n", 1}}));
  platform_.runUntilIdle();
  EXPECT_EQ(count("error error sending message no room"), 1U);
  EXPECT_EQ(onlySession().attempts, 1U);
  platform_.rtcReporting.refuseMessages({});
  session->sendMessage(message({{"n", 2}}));
  platform_.runUntilIdle();
  EXPECT_EQ(onlySession().messages.size(), 1U);
  EXPECT_EQ(onlySession().messages.at(0).payload["n"].asInt64(), 2);
}

TEST_F(RtcWorker, RefusalWithoutAnErrorIsNotLogged) {
  const auto session = startSession();
  platform_.rtcReporting.refuseMessages(platform::RtcReportingSession::SendResult{});
  const std::size_t before = lines().size();
  session->sendMessage(message({{"n", 1}}));
  platform_.runUntilIdle();
  EXPECT_EQ(lines().size(), before + 1);
  EXPECT_EQ(lines().back(), "debug entering rtcreporting _sendMessage");
}

}  // namespace
}  // namespace tarn
