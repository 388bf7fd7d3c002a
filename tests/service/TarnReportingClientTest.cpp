// SPDX-License-Identifier: Apache-2.0
// The operations of the remote interface, as a client sees them.
#include "tests/service/ServiceFixture.h"

namespace tarn {
namespace {

using namespace testing;

class RemoteOperations : public ServiceFixture {
 protected:
  RemoteOperations() : client_(connect(41)) {}

  const Client client_;
  Answer<bool> held_;
};

TEST_F(RemoteOperations, CreateMakesASessionOfTheClientsProcess) {
  create(client_, -7);
  const auto session = sessionOf(0, -7);
  ASSERT_TRUE(session != nullptr);
  EXPECT_EQ(session->processIdentifiers(), std::vector<std::int32_t>{41});
  EXPECT_EQ(session->clientProcessName(), "player");
  EXPECT_TRUE(platform_.log.contains("creating session for reporter -7"));
  EXPECT_TRUE(platform_.log.contains("session created for reporter -7"));
}

TEST_F(RemoteOperations, CreatingTwiceUnderOneIDReplacesTheFirstWithoutStoppingIt) {
  create(client_, 10);
  start(client_, 10, held_);
  create(client_, 10);
  EXPECT_FALSE(sessionOf(0, 10)->started());
  EXPECT_EQ(service_->sessionCount(), 1U);
  EXPECT_EQ(events("sys.oxbow.tarnkit.Session_Generic.Summary"), 0U);
  EXPECT_EQ(held_.count, 0);
}

TEST_F(RemoteOperations, StartReplyIsHeldUntilTheStop) {
  create(client_, 10);
  start(client_, 10, held_);
  EXPECT_EQ(held_.count, 0);
  EXPECT_TRUE(sessionOf(0, 10)->started());
  stop(client_, 10);
  EXPECT_EQ(held_.count, 1);
  EXPECT_TRUE(held_.result);
  EXPECT_FALSE(sessionOf(0, 10)->started());
}

TEST_F(RemoteOperations, StartOfAStartedSessionIsLostAndTheStopSendsTheFirstReply) {
  create(client_, 10);
  start(client_, 10, held_);
  Answer<bool> second;
  start(client_, 10, second);
  EXPECT_EQ(sessionOf(0, 10)->messages().size(), 1U);  // not even a marker
  stop(client_, 10);
  EXPECT_EQ(held_.count, 1);
  EXPECT_EQ(second.count, 0);
}

TEST_F(RemoteOperations, StartOfAnUnknownSessionIsAnsweredAtOnce) {
  start(client_, 0, held_);
  EXPECT_EQ(held_.count, 1);
  start(client_, 99, held_);
  EXPECT_EQ(held_.count, 2);
  EXPECT_TRUE(held_.result);
}

TEST_F(RemoteOperations, StartAndStopReachOnlyTheClientsOwnSessions) {
  const Client other = connect(42);
  create(client_, 10);
  start(other, 10, held_);
  EXPECT_EQ(held_.count, 1);
  EXPECT_FALSE(sessionOf(0, 10)->started());
  start(client_, 10, held_);
  stop(other, 10);
  EXPECT_TRUE(sessionOf(0, 10)->started());
}

TEST_F(RemoteOperations, StopOfAnIdleOrUnknownSessionIsLoggedAndAnswered) {
  create(client_, 10);
  stop(client_, 10);
  EXPECT_TRUE(platform_.log.contains(LogLevel::Error,
                                     "Stop called, but session==nil or session.started==false. reporterID=10 "
                                     "session=reporterID=10,serviceName=unknown,"));
  stop(client_, 99);
  EXPECT_TRUE(platform_.log.contains(
      LogLevel::Error,
      "Stop called, but session==nil or session.started==false. reporterID=99 session=(null) session.started=0"));
  stop(client_, 0);
  EXPECT_FALSE(platform_.log.contains("reporterID=0"));
}

TEST_F(RemoteOperations, ChangingTheTypeOfAStartedSessionReplacesItByAnUnstartedOne) {
  create(client_, 10);
  configure(client_, {{"HostApplicationDisplayID", "com.example.player"}}, 10);
  start(client_, 10, held_);
  send(client_, {{"volume", 0.5}}, std::vector<std::int64_t>{10});
  const auto before = sessionOf(0, 10);
  retype(client_, 3, 10);
  const auto after = sessionOf(0, 10);
  ASSERT_NE(before, after);
  EXPECT_FALSE(after->started());
  EXPECT_EQ(after->serviceType(), AudioServiceType::Haptics);
  EXPECT_EQ(after->configuration()["HostApplicationDisplayID"].text(), "com.example.player");
  EXPECT_EQ(after->previousValues().get("volume").asDouble(), 0.5);
  EXPECT_EQ(after->clientProcessName(), "player");
  stop(client_, 10);
  EXPECT_TRUE(platform_.log.contains(LogLevel::Error, "Stop called, but session==nil or session.started==false."));
  EXPECT_EQ(held_.count, 0);
}

TEST_F(RemoteOperations, SettingTheSameTypeKeepsTheSession) {
  create(client_, 10);
  retype(client_, 1, 10);
  const auto session = sessionOf(0, 10);
  retype(client_, 1, 10);
  EXPECT_EQ(sessionOf(0, 10), session);
  EXPECT_TRUE(platform_.log.contains("setting service type 1 for reporter 10"));
  EXPECT_TRUE(platform_.log.contains("service type 1 set for reporter  10"));
}

TEST_F(RemoteOperations, TypeOfAnUnknownSessionAndOfIDZeroIsAnsweredWithSuccess) {
  retype(client_, 1, 0);
  retype(client_, 1, 99);
  EXPECT_EQ(service_->sessionCount(), 0U);
}

TEST_F(RemoteOperations, TypeOfAnotherClientsSessionIsNotChanged) {
  const Client other = connect(42);
  create(client_, 10);
  const auto session = sessionOf(0, 10);
  retype(other, 4, 10);
  EXPECT_EQ(sessionOf(0, 10), session);
  EXPECT_EQ(session->serviceType(), AudioServiceType::Unknown);
  EXPECT_EQ(sessionOf(1, 10), nullptr);  // nor is one of the caller's own made
  EXPECT_EQ(serviceType(other, 10), 65535);
}

TEST_F(RemoteOperations, TypeThatIsEqualLeavesAStartedSessionRunning) {
  create(client_, 10);
  retype(client_, 1, 10);
  start(client_, 10, held_);
  retype(client_, 1, 10);
  EXPECT_TRUE(sessionOf(0, 10)->started());
  stop(client_, 10);
  EXPECT_EQ(held_.count, 1);
}

TEST_F(RemoteOperations, DestroyReachesOnlyTheClientsOwnSessions) {
  const Client other = connect(42);
  create(client_, 10);
  start(client_, 10, held_);
  destroy(other, 10);
  EXPECT_TRUE(sessionOf(0, 10)->started());
}

TEST_F(RemoteOperations, SessionUnderIDZeroIsConfiguredAndNeverTypedStartedOrTold) {
  create(client_, 0);
  configure(client_, {{"a", 1}}, 0);
  EXPECT_EQ(sessionOf(0, 0)->configuration(), (plist::Dictionary{{"a", 1}}));
  retype(client_, 4, 0);
  EXPECT_EQ(sessionOf(0, 0)->serviceType(), AudioServiceType::Unknown);
  start(client_, 0, held_);
  EXPECT_EQ(held_.count, 1);
  EXPECT_FALSE(sessionOf(0, 0)->started());
  send(client_, {{"a", 1}}, std::vector<std::int64_t>{0});
  EXPECT_EQ(sessionOf(0, 0)->totalMessageCount(), 0);
  EXPECT_EQ(service_->findReportingSessionForID(0), nullptr);
  sessionOf(0, 0)->setServiceType(AudioServiceType::Alarms);
  EXPECT_EQ(serviceType(client_, 0), 65535);
  sessionOf(0, 0)->start();
  stop(client_, 0);
  EXPECT_TRUE(sessionOf(0, 0)->started());
  destroy(client_, 0);
  EXPECT_EQ(service_->sessionCount(), 0U);
}

TEST_F(RemoteOperations, LowestReporterIDIsOneLikeEveryOther) {
  constexpr std::int64_t kLowest = INT64_MIN;
  create(client_, kLowest);
  retype(client_, 2, kLowest);
  start(client_, kLowest, held_);
  EXPECT_FALSE(send(client_, {{"a", 1}}, std::vector<std::int64_t>{kLowest}));
  EXPECT_EQ(sessionOf(0, kLowest)->totalMessageCount(), 1);
  Answer<plist::Dictionary> answer;
  client_.remote().reporterID(kLowest, answer.reply());
  platform_.runUntilIdle();
  EXPECT_EQ(answer.result, (plist::Dictionary{{"reporterID", kLowest}, {"serviceType", 2}}));
  stop(client_, kLowest);
  EXPECT_EQ(held_.count, 1);
  EXPECT_TRUE(platform_.log.contains("stopping session for reporter -9223372036854775808"));
  destroy(client_, kLowest);
  EXPECT_EQ(service_->sessionCount(), 0U);
}

TEST_F(RemoteOperations, StartReplyIsSentOnce) {
  create(client_, 10);
  start(client_, 10, held_);
  stop(client_, 10);
  stop(client_, 10);
  EXPECT_EQ(held_.count, 1);
  Answer<bool> second;
  start(client_, 10, second);
  EXPECT_EQ(second.count, 0);
  stop(client_, 10);
  EXPECT_EQ(held_.count, 1);
  EXPECT_EQ(second.count, 1);
  EXPECT_TRUE(second.result);
}

TEST_F(RemoteOperations, StartSendsTheReplyThatAnEarlierStartLeft) {
  create(client_, 10);
  start(client_, 10, held_);
  sessionOf(0, 10)->stop();  // not by its client
  EXPECT_EQ(held_.count, 0);
  Answer<bool> second;
  start(client_, 10, second);
  EXPECT_EQ(held_.count, 1);
  EXPECT_TRUE(held_.result);
  EXPECT_FALSE(held_.error);
  EXPECT_EQ(second.count, 0);
}

TEST_F(RemoteOperations, StartOfATestSessionIsHeldOutsideInternalBuilds) {
  create(client_, 10);
  retype(client_, 11, 10);
  start(client_, 10, held_);
  EXPECT_EQ(held_.count, 0);
}

TEST_F(RemoteOperations, MessageKeepsItsCategoryAndTypeInEverySession) {
  create(client_, 10);
  create(client_, 11);
  client_.remote().sendMessage({{"a", 1}}, 0x20000003, 65535, std::vector<std::int64_t>{10, 11},
                               [](const std::optional<platform::RemoteError>&) {});
  platform_.runUntilIdle();
  for (const std::int64_t id : {10, 11}) {
    const auto& record = *sessionOf(0, id)->messages().at(0);
    EXPECT_EQ(static_cast<std::uint32_t>(record.category()), 0x20000003U);
    EXPECT_EQ(record.type(), AudioEventType::Unknown);
    EXPECT_EQ(record.message()["a"].asInt64(), 1);
  }
}

TEST_F(RemoteOperations, SessionThatIsReplacedKeepsItsPlaceInTheListOfReporters) {
  create(client_, 10);
  create(client_, 3);
  create(client_, 10);
  Answer<std::vector<std::int64_t>> answer;
  client_.remote().getAllReporters(answer.reply());
  platform_.runUntilIdle();
  EXPECT_EQ(answer.result, (std::vector<std::int64_t>{10, 3}));
  destroy(client_, 10);
  create(client_, 10);
  client_.remote().getAllReporters(answer.reply());
  platform_.runUntilIdle();
  EXPECT_EQ(answer.result, (std::vector<std::int64_t>{3, 10}));
}

TEST_F(RemoteOperations, LossStopsTheSessionsThatRunAndLetsGoOfAll) {
  create(client_, 10);
  create(client_, 11);
  start(client_, 10, held_);
  const auto instance = service_->getAllClients().at(0);
  const auto running = sessionOf(0, 10);
  client_.connection->invalidate();
  platform_.runUntilIdle();
  EXPECT_FALSE(running->started());
  EXPECT_TRUE(platform_.log.contains("ending session. reporterID=10"));
  EXPECT_FALSE(platform_.log.contains("stop called. reporterID=11"));
  EXPECT_EQ(instance->clientReportingSessionMap().size(), 0U);
  EXPECT_EQ(instance->clientReportingSessionMap().find(10), nullptr);
  EXPECT_EQ(held_.count, 0);
}

TEST_F(RemoteOperations, OperationsThatComeAfterTheServicesEndAreAnsweredWithoutIt) {
  create(client_, 10);
  service_.reset();
  EXPECT_EQ(serviceType(client_, 99), 65535);
  Answer<std::vector<std::int64_t>> all;
  client_.remote().getAllReporters(all.reply());
  platform_.runUntilIdle();
  EXPECT_EQ(all.count, 1);
  EXPECT_TRUE(all.result.empty());
  const auto error = send(client_, {{"a", 1}}, std::vector<std::int64_t>{10});
  ASSERT_TRUE(error);
  EXPECT_EQ(error->code, 1);
  start(client_, 10, held_);
  stop(client_, 10);
  EXPECT_EQ(held_.count, 1);
}

TEST_F(RemoteOperations, TypeOfASessionIsToldAcrossClients) {
  const Client other = connect(42);
  create(client_, 10);
  retype(client_, 4, 10);
  EXPECT_EQ(serviceType(other, 10), 4);
  EXPECT_EQ(serviceType(client_, 10), 4);
}

TEST_F(RemoteOperations, TypeOfAnUnknownIDIs65535) {
  EXPECT_EQ(serviceType(client_, 99), 65535);
  EXPECT_EQ(serviceType(client_, 0), 65535);
}

TEST_F(RemoteOperations, ConfigurationGoesToTheClientsOwnSession) {
  const Client other = connect(42);
  create(client_, 10);
  configure(other, {{"a", 1}}, 10);
  EXPECT_TRUE(sessionOf(0, 10)->configuration().empty());
  configure(client_, {{"KvHostApplicationDisplayID", "com.example.player"}}, 10);
  EXPECT_EQ(sessionOf(0, 10)->configuration()["HostApplicationDisplayID"].text(), "com.example.player");
}

TEST_F(RemoteOperations, DestroyStopsAStartedSessionAndLosesItsHeldReply) {
  create(client_, 10);
  start(client_, 10, held_);
  destroy(client_, 10);
  EXPECT_EQ(sessionOf(0, 10), nullptr);
  EXPECT_EQ(events("sys.oxbow.tarnkit.Session_Generic.Summary"), 1U);
  EXPECT_EQ(held_.count, 0);
  destroy(client_, 10);
  EXPECT_EQ(platform_.log.count("destroying session for reporter 10"), 2U);
}

TEST_F(RemoteOperations, ReporterIDTellsIDAndTypeOfAnyClientsSession) {
  const Client other = connect(42);
  create(client_, 10);
  retype(client_, 2, 10);
  Answer<plist::Dictionary> answer;
  other.remote().reporterID(10, answer.reply());
  platform_.runUntilIdle();
  EXPECT_EQ(answer.result, (plist::Dictionary{{"reporterID", 10}, {"serviceType", 2}}));
  other.remote().reporterID(99, answer.reply());
  platform_.runUntilIdle();
  EXPECT_EQ(answer.result, (plist::Dictionary{{"reporterID", 0}, {"serviceType", 65535}}));
}

TEST_F(RemoteOperations, AllReportersAreListedClientByClient) {
  const Client other = connect(42);
  create(other, 5);
  create(client_, 10);
  create(client_, 3);
  Answer<std::vector<std::int64_t>> answer;
  other.remote().getAllReporters(answer.reply());
  platform_.runUntilIdle();
  EXPECT_EQ(answer.result, (std::vector<std::int64_t>{10, 3, 5}));
}

TEST_F(RemoteOperations, MessageWhileReportingIsDisabledIsRefusedWithTheOneError) {
  create(client_, 10);
  service_->setReportingEnabled(false);
  const auto error = send(client_, {{"a", 1}}, std::vector<std::int64_t>{10});
  ASSERT_TRUE(error);
  EXPECT_EQ(error->domain, "sys.oxbow.audio.reporting");
  EXPECT_EQ(error->code, 1);
  EXPECT_EQ(error->text, "reporting is disabled");
  EXPECT_EQ(sessionOf(0, 10)->totalMessageCount(), 0);
}

TEST_F(RemoteOperations, MessageWithUnknownIDsIsDroppedBehindASuccess) {
  EXPECT_FALSE(send(client_, {{"a", 1}}, std::vector<std::int64_t>{99}));
  EXPECT_EQ(service_->sessionCount(), 0U);
}

TEST_F(RemoteOperations, MessageWithoutASessionIsMarkedOnInternalBuildsOnly) {
  send(client_, {{"a", 1}}, std::nullopt);
  EXPECT_FALSE(platform_.tally.events().at(0).payload.contains("sendSingleMessage"));
}

TEST_F(RemoteOperations, LogsTheListOfReportersOfAMessage) {
  create(client_, 10);
  send(client_, {{"a", 1}}, std::vector<std::int64_t>{10, 11});
  EXPECT_TRUE(platform_.log.contains(LogLevel::Debug, "sending message for reporter (10, 11)"));
  send(client_, {{"a", 1}}, std::nullopt);
  EXPECT_TRUE(platform_.log.contains(LogLevel::Debug, "sending message for reporter (null)"));
}

TEST_F(RemoteOperations, KillServiceEndsTheProcessWithStatusTwo) {
  client_.remote().killService();
  platform_.runUntilIdle();
  EXPECT_EQ(platform_.processControl.exitStatuses(), std::vector<int>{2});
  EXPECT_TRUE(platform_.log.contains("DESTROYING SERVICE"));
}

TEST_F(RemoteOperations, KillServiceSaysSoBeforeTheProcessEnds) {
  std::vector<std::string> told;
  platform_.processControl.onExit([&] { told = platform_.log.messages(); });
  client_.remote().killService();
  platform_.runUntilIdle();
  ASSERT_FALSE(told.empty());
  EXPECT_EQ(told.back(), "DESTROYING SERVICE");
}

TEST_F(RemoteOperations, HeldReplyIsSentBeforeTheSessionsThatRunAreListed) {
  create(client_, 10);
  int count = 0;
  std::size_t listed = 0;
  client_.remote().startReportingSessionForID(10, [&](const std::optional<platform::RemoteError>&, bool) {
    ++count;
    listed = platform_.log.count("active reporting session(s)");
  });
  platform_.runUntilIdle();
  platform_.log.clear();
  stop(client_, 10);
  EXPECT_EQ(count, 1);
  EXPECT_EQ(listed, 0U);
  EXPECT_EQ(platform_.log.count("active reporting session(s)"), 1U);
}

TEST_F(RemoteOperations, LossAfterTheServicesEndStopsNothing) {
  create(client_, 10);
  start(client_, 10, held_);
  const auto session = sessionOf(0, 10);
  service_.reset();
  client_.connection->interrupt();
  platform_.runUntilIdle();
  EXPECT_TRUE(session->started());
  EXPECT_FALSE(platform_.log.contains("removing 41 from the server client list"));
}

TEST_F(RemoteOperations, RequestsAreServedInTheOrderOfArrival) {
  Answer<bool> created;
  Answer<std::uint16_t> type;
  client_.remote().createReportingSession(10, created.reply());
  client_.remote().setServiceType(3, 10, created.reply());
  client_.remote().getServiceNameForReporterID(10, type.reply());
  platform_.runUntilIdle();
  EXPECT_EQ(type.result, 3);
}

// The same front on an internal build of the device.
class InternalBuildOperations : public ServiceFixture {
 protected:
  InternalBuildOperations() { platform_.deviceProperties.set("InternalBuild", true); }
};

TEST_F(InternalBuildOperations, MessageWithoutASessionIsMarked) {
  const Client client = connect(41);
  send(client, {{"a", 1}}, std::nullopt);
  EXPECT_TRUE(platform_.tally.events().at(0).payload["sendSingleMessage"].asBool());
  create(client, 10);
  send(client, {{"a", 1}}, std::vector<std::int64_t>{10});
  EXPECT_FALSE(platform_.tally.events().back().payload.contains("sendSingleMessage"));
}

TEST_F(InternalBuildOperations, MessageWithAnEmptyListIsMarkedAsOneWithoutAList) {
  send(connect(41), {{"a", 1}}, platform::ReporterIDs(std::in_place));
  const plist::Dictionary payload = platform_.tally.events().at(0).payload;
  EXPECT_EQ(payload["sendSingleMessage"].kind(), plist::Kind::Bool);
  EXPECT_TRUE(payload["sendSingleMessage"].asBool());
}

TEST_F(InternalBuildOperations, MessageThatCameWhileReportingWasDisabledIsNotMarked) {
  const Client client = connect(41);
  service_->setReportingEnabled(false);
  client.remote().sendMessage({{"a", 1}}, 4, 1, std::nullopt, [](const std::optional<platform::RemoteError>&) {});
  service_->setReportingEnabled(true);
  platform_.runUntilIdle();
  ASSERT_FALSE(platform_.tally.events().empty());
  EXPECT_FALSE(platform_.tally.events().at(0).payload.contains("sendSingleMessage"));
}

TEST_F(InternalBuildOperations, StartOfATestSessionIsAnsweredAtOnceAndAtTheStop) {
  const Client client = connect(41);
  Answer<bool> held;
  create(client, 10);
  retype(client, 11, 10);
  start(client, 10, held);
  EXPECT_EQ(held.count, 1);
  EXPECT_TRUE(held.result);
  stop(client, 10);
  EXPECT_EQ(held.count, 2);  // the connection drops the second
}

TEST_F(InternalBuildOperations, StartOfAnyOtherSessionIsHeld) {
  const Client client = connect(41);
  Answer<bool> held;
  create(client, 10);
  start(client, 10, held);
  EXPECT_EQ(held.count, 0);
}

}  // namespace
}  // namespace tarn
