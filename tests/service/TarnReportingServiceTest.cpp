// SPDX-License-Identifier: Apache-2.0
#include "service/TarnReportingService.h"

#include "derived/TarnReportingSystemMonitor.h"
#include "platform/WorkQueue.h"
#include "tests/service/ServiceFixture.h"

namespace tarn {
namespace {

using namespace testing;
using namespace std::chrono_literals;

class TarnReportingServiceTest : public ServiceFixture {
 protected:
  static constexpr const char* kPlaybackStart = "sys.oxbow.tarnkit.Playback.Start";
  static constexpr const char* kUptime = "sys.oxbow.tarnkit.tarnreportingclientuptime";
  static constexpr const char* kOutside = "tarnkit: code of the server queue was called outside it";

  // As work of a queue that isn't the server's.
  void runElsewhere(platform::Work work) {
    platform_.workQueues.makeSerialQueue("elsewhere", platform::QualityOfService::Utility)->async(std::move(work));
    platform_.runUntilIdle();
  }
};

TEST_F(TarnReportingServiceTest, StartsTheSystemMonitor) {
  EXPECT_TRUE(TarnReportingSystemMonitor::getSystemMonitorDictionary() != nullptr);
  EXPECT_EQ(TarnReportingSystemMonitor::getSystemMonitorKeys().size(), 3U);
}

TEST_F(TarnReportingServiceTest, AcceptsAConnectionAndListsItsClient) {
  platform_.processFacts.setProcessName(41, "player");
  const auto connection = platform_.listener.connect(41);
  ASSERT_TRUE(connection != nullptr);
  EXPECT_TRUE(connection->resumed());
  EXPECT_TRUE(connection->wasWholeAtResume());
  EXPECT_TRUE(service_->getAllClients().empty());  // the client is listed by work on the queue
  platform_.runUntilIdle();
  ASSERT_EQ(service_->getAllClients().size(), 1U);
  const auto& client = *service_->getAllClients()[0];
  EXPECT_EQ(client.processIdentifier(), 41);
  EXPECT_EQ(client.clientProcessName(), "player");
  EXPECT_EQ(client.clientStartDate(), platform_.clock.epochSeconds());
  EXPECT_TRUE(platform_.log.contains(LogLevel::Default, "newConnection: "));
  EXPECT_TRUE(platform_.log.contains(LogLevel::Debug, "new client with pid 41"));
}

TEST_F(TarnReportingServiceTest, ClientThatEndsWithTheServiceStopsItsSessionsForThatReason) {
  const Client client = connect(41);
  Answer<bool> held;
  create(client, 10);
  start(client, 10, held);
  const auto session = sessionOf(0, 10);
  EXPECT_EQ(service_->clientEnd(), TarnReportingClientEnd::ClientGone);
  service_->announceEnd();
  EXPECT_EQ(service_->clientEnd(), TarnReportingClientEnd::ServiceStopping);
  client.connection->invalidate();
  platform_.runUntilIdle();
  EXPECT_FALSE(session->started());
  EXPECT_TRUE(service_->getAllClients().empty());
  EXPECT_TRUE(platform_.log.contains(LogLevel::Default, "ending client 41. reason=service-stopping"));
}

TEST_F(TarnReportingServiceTest, ClientThatGoesGivesNoReason) {
  const Client client = connect(41);
  client.connection->invalidate();
  platform_.runUntilIdle();
  EXPECT_EQ(platform_.log.count("reason="), 0U);
  EXPECT_EQ(TarnReportingClientEndName(TarnReportingClientEnd::ClientGone), "client-gone");
}

TEST_F(TarnReportingServiceTest, SingleMessageSessionEndsWithTheServiceAndItsLaterCheckFindsNothing) {
  const Client client = connect(41);
  EXPECT_FALSE(send(client, {{"a", 1}}, std::nullopt));
  EXPECT_EQ(service_->sessionCount(), 1U);
  service_->endSingleMessageSession();
  EXPECT_EQ(service_->sessionCount(), 0U);
  service_->endSingleMessageSession();
  platform_.workQueues.advance(10s);
  EXPECT_EQ(platform_.log.count("Stopping singleMessageSession"), 0U);
}

TEST_F(TarnReportingServiceTest, MessageWithoutIDsReachesTheRunningSessionsOfAllClients) {
  const Client one = connect(41);
  const Client other = connect(42);
  Answer<bool> held;
  create(one, 10);
  create(other, 20);
  create(other, 21);
  start(one, 10, held);
  start(other, 20, held);
  EXPECT_FALSE(send(one, {{"a", 1}}, std::nullopt));
  EXPECT_EQ(sessionOf(0, 10)->totalMessageCount(), 1);
  EXPECT_EQ(sessionOf(1, 20)->totalMessageCount(), 1);
  EXPECT_EQ(sessionOf(1, 21)->totalMessageCount(), 0);
  EXPECT_EQ(service_->sessionCount(), 3U);  // no single-message session was made
}

TEST_F(TarnReportingServiceTest, MessageWithoutIDsWhileNothingRunsUsesOneSingleMessageSession) {
  const Client client = connect(41);
  send(client, {{"a", 1}}, std::nullopt);
  EXPECT_EQ(platform_.log.count("Creating singleMessageSession"), 1U);
  EXPECT_EQ(events("sys.oxbow.standalone.Playback.Start"), 1U);
  EXPECT_EQ(platform_.tally.payloads(kPlaybackStart).at(0)["HostApplicationDisplayID"].text(), "Unknown");
  platform_.advance(4s);
  send(client, {{"a", 2}}, platform::ReporterIDs(std::in_place));
  EXPECT_EQ(platform_.log.count("Creating singleMessageSession"), 1U);
  EXPECT_EQ(service_->sessionCount(), 1U);
}

TEST_F(TarnReportingServiceTest, SingleMessageSessionStopsAtTheFirstCheckMoreThanFiveSecondsAfterItsLastUse) {
  const Client client = connect(41);
  send(client, {{"a", 1}}, std::nullopt);
  platform_.advance(4s);
  send(client, {{"a", 2}}, std::nullopt);
  platform_.advance(2s);  // the check at 5.000001 s finds it used 1 s ago
  EXPECT_EQ(service_->sessionCount(), 1U);
  EXPECT_TRUE(platform_.log.contains(LogLevel::Debug,
                                     "Not stopping singleMessageSession timeSinceLastUsed=1.000001 timeout=5.000000"));
  platform_.advance(3s);  // at 9 s
  EXPECT_EQ(service_->sessionCount(), 1U);
  platform_.advance(2s);  // the next check came at 10.000001 s
  EXPECT_EQ(service_->sessionCount(), 0U);
  EXPECT_TRUE(platform_.log.contains(LogLevel::Default, "Stopping singleMessageSession timeout=5.000000"));
  send(client, {{"a", 3}}, std::nullopt);
  EXPECT_EQ(platform_.log.count("Creating singleMessageSession"), 2U);
  EXPECT_EQ(platform_.log.count("created reporting session for ID: 1"), 2U);
}

TEST_F(TarnReportingServiceTest, SingleMessageSessionUsedOnceStopsAtItsFirstCheck) {
  send(connect(41), {{"a", 1}}, std::nullopt);
  platform_.advance(5s);
  EXPECT_EQ(service_->sessionCount(), 1U);
  platform_.advance(1us);
  EXPECT_EQ(service_->sessionCount(), 0U);
}

TEST_F(TarnReportingServiceTest, SingleMessageSessionHoldsNoSummaryWorker) {
  send(connect(41), {{"a", 1}}, std::nullopt);
  platform_.advance(11s);
  EXPECT_EQ(events("sys.oxbow.tarnkit.Session_Generic.Summary"), 0U);
}

TEST_F(TarnReportingServiceTest, SessionThatStartsWhileTheSingleMessageSessionLivesTakesTheNextMessage) {
  const Client client = connect(41);
  send(client, {{"a", 1}}, std::nullopt);
  Answer<bool> held;
  create(client, 10);
  start(client, 10, held);
  send(client, {{"a", 2}}, std::nullopt);
  EXPECT_EQ(sessionOf(0, 10)->totalMessageCount(), 1);
}

TEST_F(TarnReportingServiceTest, MessageWhoseListHoldsOnlyZeroIsDropped) {
  const Client client = connect(41);
  EXPECT_FALSE(send(client, {{"a", 1}}, std::vector<std::int64_t>{0}));
  EXPECT_EQ(events(kPlaybackStart), 0U);
  EXPECT_EQ(service_->sessionCount(), 0U);
  EXPECT_FALSE(platform_.log.contains("failed to find reporting session"));
}

TEST_F(TarnReportingServiceTest, MessageGoesToEveryKnownSessionOfItsListOfWhicheverClient) {
  const Client one = connect(41);
  const Client other = connect(42);
  create(one, 10);
  create(other, 20);
  send(one, {{"a", 1}}, std::vector<std::int64_t>{20, 0, 99, 10});
  EXPECT_EQ(sessionOf(0, 10)->totalMessageCount(), 1);
  EXPECT_EQ(sessionOf(1, 20)->totalMessageCount(), 1);
  EXPECT_TRUE(platform_.log.contains(LogLevel::Info, "found reporting session 20 for client 42"));
  EXPECT_TRUE(platform_.log.contains(LogLevel::Error, "failed to find reporting session 99"));
}

TEST_F(TarnReportingServiceTest, SessionsOfOneMessageNeverShareARecord) {
  const Client client = connect(41);
  create(client, 10);
  create(client, 11);
  send(client, {{"a", 1}}, std::vector<std::int64_t>{10, 11});
  const auto& first = sessionOf(0, 10)->messages().at(0);
  const auto& second = sessionOf(0, 11)->messages().at(0);
  ASSERT_NE(first, second);
  first->mutableMessage().set("a", 2);
  EXPECT_EQ(second->message()["a"].asInt64(), 1);
}

TEST_F(TarnReportingServiceTest, SessionNamedTwiceGetsTheWholeMessageTwice) {
  const Client client = connect(41);
  create(client, 10);
  send(client, {{"a", 1}}, std::vector<std::int64_t>{10, 10});
  EXPECT_EQ(sessionOf(0, 10)->totalMessageCount(), 2);
  ASSERT_EQ(sessionOf(0, 10)->messages().size(), 1U);  // the second says the same, so it is redundant
  EXPECT_EQ(sessionOf(0, 10)->messages().at(0)->message()["a"].asInt64(), 1);
}

TEST_F(TarnReportingServiceTest, FirstClientInOrderOfConnectionWinsAnID) {
  const Client one = connect(41);
  const Client other = connect(42);
  create(other, 10);
  create(one, 10);
  EXPECT_EQ(service_->findReportingSessionForID(10), sessionOf(0, 10));
}

TEST_F(TarnReportingServiceTest, WithReportingDisabledEveryLookupFindsNothing) {
  const Client client = connect(41);
  create(client, 10);
  service_->setReportingEnabled(false);
  EXPECT_EQ(service_->findReportingSessionForID(10), nullptr);
  EXPECT_TRUE(service_->findReportingSessionsForIDs(std::vector<std::int64_t>{10}).empty());
}

TEST_F(TarnReportingServiceTest, LogsTheActiveSessionsOfEachClient) {
  const Client client = connect(41);
  Answer<bool> held;
  create(client, 10);
  start(client, 10, held);
  EXPECT_TRUE(platform_.log.contains(LogLevel::Default,
                                     "sessions for client 41 : (reporterID=10,serviceName=unknown,"
                                     "ownerPid=41,clientProcessName=player,"));
  EXPECT_TRUE(platform_.log.contains(LogLevel::Default, "1 active reporting session(s) (reporterID=10,"));
}

TEST_F(TarnReportingServiceTest, ListsOfManyActiveSessionsEndInACount) {
  const Client client = connect(41);
  std::vector<Answer<bool>> held(33);
  for (std::int64_t id = 100; id < 132; ++id) {
    create(client, id);
    start(client, id, held[static_cast<std::size_t>(id - 100)]);
  }
  EXPECT_TRUE(platform_.log.contains(LogLevel::Default, "reporterID=131,"));
  platform_.log.clear();
  create(client, 132);
  start(client, 132, held[32]);
  EXPECT_TRUE(platform_.log.contains(LogLevel::Default, "33 active reporting session(s) (reporterID=100,"));
  EXPECT_TRUE(platform_.log.contains(LogLevel::Default, "singleMessageSession=0, and 2 more)"));
  EXPECT_FALSE(platform_.log.contains(LogLevel::Default, "reporterID=131,"));
  EXPECT_EQ(service_->getAllActiveReportingSessions().size(), 33U);
}

TEST_F(TarnReportingServiceTest, InvalidationReportsTheUptimeOfTheClient) {
  const Client client = connect(41);
  platform_.advance(12s + 900ms);
  client.connection->invalidate();
  ASSERT_EQ(events(kUptime), 1U);
  EXPECT_EQ(platform_.tally.payloads(kUptime)[0], (plist::Dictionary{{"processName", "player"}, {"seconds", 12}}));
  EXPECT_TRUE(
      platform_.log.contains(LogLevel::Default, "invalidationHandler: connection exited process=player uptime_sec=12"));
  platform_.runUntilIdle();
  EXPECT_TRUE(service_->getAllClients().empty());
}

TEST_F(TarnReportingServiceTest, UptimeThatNobodyWantsIsNotHandedOver) {
  const Client client = connect(41);
  platform_.tally.useOnly({"other"});
  client.connection->invalidate();
  EXPECT_EQ(platform_.tally.askedNames(), std::vector<std::string>{kUptime});
  EXPECT_TRUE(platform_.tally.sentNames().empty());
}

TEST_F(TarnReportingServiceTest, UptimeIsNeverNegative) {
  const Client client = connect(41);
  platform_.clock.setEpochSeconds(platform_.clock.epochSeconds() - 30);
  client.connection->invalidate();
  EXPECT_EQ(platform_.tally.payloads(kUptime).at(0)["seconds"].asInt64(), 30);
  EXPECT_TRUE(platform_.log.contains("clientStartDate is in the past. clientpid=41 clientprocessname=player"));
}

TEST_F(TarnReportingServiceTest, UptimeOfAClientThatWasNeverListedIsMinusOne) {
  const auto connection = platform_.listener.connect(41);
  connection->invalidate();  // before the work that sets the start date and the name
  EXPECT_TRUE(platform_.log.contains("clientStartDate is nil. clientpid=41 clientprocessname=(null)"));
  EXPECT_TRUE(platform_.log.contains("invalidationHandler: connection exited process=(null) uptime_sec=-1"));
  EXPECT_TRUE(platform_.log.contains("clientProcessName is nil. clientpid=41"));
  EXPECT_EQ(events(kUptime), 0U);
  platform_.runUntilIdle();
  EXPECT_TRUE(service_->getAllClients().empty());
}

TEST_F(TarnReportingServiceTest, InvalidationAfterTheEndOfTheClientTellsNothing) {
  const Client client = connect(41);
  client.connection->interrupt();
  platform_.runUntilIdle();
  client.connection->setExportedObject(nullptr);  // its last owner
  platform_.log.clear();
  client.connection->invalidate();
  platform_.runUntilIdle();
  EXPECT_TRUE(platform_.log.messages().empty());
  EXPECT_EQ(events(kUptime), 0U);
}

TEST_F(TarnReportingServiceTest, ListOfActiveSessionsIsForTheServerQueueAlone) {
  EXPECT_DEATH(runElsewhere([this] { service_->getAllActiveReportingSessions(); }), kOutside);
}

TEST_F(TarnReportingServiceTest, SessionsOfAClientAreForTheServerQueueAlone) {
  connect(41);
  const auto client = service_->getAllClients().at(0);
  EXPECT_DEATH(runElsewhere([&] { client->findReportingSessionForID(10, false); }), kOutside);
}

TEST_F(TarnReportingServiceTest, InterruptionAndInvalidationEndTheClientOnce) {
  const Client client = connect(41);
  Answer<bool> held;
  create(client, 10);
  start(client, 10, held);
  client.connection->interrupt();
  client.connection->invalidate();
  platform_.runUntilIdle();
  EXPECT_TRUE(platform_.log.contains("interruptionHandler: connection exited"));
  EXPECT_EQ(platform_.log.count("removing 41 from the server client list"), 1U);
  EXPECT_EQ(events("sys.oxbow.tarnkit.Session_Generic.Summary"), 1U);
}

TEST_F(TarnReportingServiceTest, ConnectionLossStopsTheClientsSessionsAndNoOthers) {
  const Client lost = connect(41);
  const Client other = connect(42);
  Answer<bool> held;
  create(lost, 10);
  create(other, 20);
  start(lost, 10, held);
  start(other, 20, held);
  lost.connection->invalidate();
  platform_.runUntilIdle();
  ASSERT_EQ(service_->getAllClients().size(), 1U);
  EXPECT_TRUE(sessionOf(0, 20)->started());
  EXPECT_EQ(service_->findReportingSessionForID(10), nullptr);
  EXPECT_EQ(events("sys.oxbow.tarnkit.Session_Generic.Summary"), 1U);
}

TEST_F(TarnReportingServiceTest, WorkerTableHasItsOrderAndCapabilities) {
  struct Row {
    const char* name;
    bool consumer, producer, startOnInit, singleMessage;
  };
  const std::vector<Row> expected{{"TarnReportingSessionTraceWorker", false, false, false, false},
                                  {"TarnReportingSessionVolumeMessagesWorker", false, true, false, false},
                                  {"TarnReportingSessionLagoonMessagesWorker", false, true, false, false},
                                  {"TarnReportingSessionSummaryWorker", true, true, false, false},
                                  {"TarnReportingSessionInputMessagesWorker", false, true, false, false},
                                  {"TarnReportingSessionTallyWorker", true, false, true, true},
                                  {"TarnReportingSessionWattlogWorker", true, false, true, true},
                                  {"TarnReportingSessionMemoryLogWorker", true, false, true, false},
                                  {"TarnReportingSessionPylonWorker", true, false, true, true},
                                  {"TarnReportingSessionDriverSnapshotWorker", false, true, false, false},
                                  {"TarnReportingSessionSystemMonitorWorker", false, true, false, false},
                                  {"TarnReportingSessionSnareWorker", true, false, false, true},
                                  {"TarnReportingSessionDPWorker", true, false, false, false},
                                  {"TarnReportingSessionSummaryJsonFileWorker", false, false, false, false},
                                  {"TarnReportingSessionAudioRegistrationWorker", true, false, false, false},
                                  {"TarnReportingSessionRtcWorker", true, false, false, true},
                                  {"TarnReportingSessionTattleWorker", true, false, false, true}};
  const auto table = TarnReportingSession::getAllWorkerClasses();
  ASSERT_EQ(table.size(), expected.size());
  for (std::size_t i = 0; i < expected.size(); ++i) {
    SCOPED_TRACE(expected[i].name);
    EXPECT_EQ(table[i].name, expected[i].name);
    EXPECT_TRUE(table[i].initWithSession != nullptr);
    EXPECT_EQ(table[i].asConsumer != nullptr, expected[i].consumer);
    EXPECT_EQ(table[i].isProducer, expected[i].producer);
    EXPECT_EQ(table[i].startOnInit != nullptr && table[i].startOnInit(), expected[i].startOnInit);
    EXPECT_EQ(table[i].handleSingleMessageSession != nullptr && table[i].handleSingleMessageSession(),
              expected[i].singleMessage);
  }
}

}  // namespace
}  // namespace tarn
