// SPDX-License-Identifier: Apache-2.0
// What the session records are told of clients' sessions: every road by which one ends; and whose work an event is that
// reaches a back-end, whichever way it took.
#include <algorithm>

#include "platform/Facilities.h"
#include "tests/service/ServiceFixture.h"

namespace tarn {
namespace {

using namespace testing;
using namespace std::chrono_literals;
using Calls = std::vector<std::string>;
using Number = platform::SessionNumber;

constexpr std::uint16_t kTelephony = static_cast<std::uint16_t>(AudioServiceType::Telephony);
// The name under which messages of the category and type of ServiceFixture::send() are handed over.
constexpr std::string_view kMessage = "sys.oxbow.tarnkit.Playback.Start";
constexpr std::string_view kUptime = "sys.oxbow.tarnkit.tarnreportingclientuptime";

// Finds no memory to stop.
struct UnstoppableWorker : TarnReportingSessionWorkerProtocol {
  static constexpr std::string_view kClassName = "UnstoppableWorker";
  using TarnReportingSessionWorkerProtocol::TarnReportingSessionWorkerProtocol;
  static std::unique_ptr<UnstoppableWorker> initWithSession(const std::shared_ptr<TarnReportingSession>& session) {
    return std::make_unique<UnstoppableWorker>(session);
  }
  void stop() { throw std::bad_alloc(); }
};
constexpr TarnReportingSessionWorkerClass kUnstoppable[] = {TarnReportingSessionWorkerClass::of<UnstoppableWorker>()};

class SessionRecordsTest : public ServiceFixture {
 protected:
  Calls callsOf(Number session) const { return platform_.sessionRecords.callsOf(session); }
  std::string lastOf(Number session) const { return callsOf(session).back(); }
  std::size_t sessions() const { return platform_.sessionRecords.sessions(); }
  void send(const Client& client, std::int64_t reporterID, int value) {
    ServiceFixture::send(client, {{"value", value}}, std::vector<std::int64_t>{reporterID});
  }
  void run(const Client& client, std::int64_t reporterID) {
    create(client, reporterID);
    start(client, reporterID, held_);
  }
  // Whose work it was to hand over each event of this name, in order.
  std::vector<Number> ownersOf(std::string_view name) const {
    std::vector<Number> owners;
    for (const auto& event : platform_.tally.events()) {
      if (event.name == name) {
        owners.push_back(event.session);
      }
    }
    return owners;
  }
  // Whose work it was to send each message of one of the telemetry service's sessions.
  std::vector<Number> ownersOfMirror(std::size_t session) const {
    std::vector<Number> owners;
    const auto sessions = platform_.rtcReporting.sessions();
    for (const auto& message : sessions.at(session).messages) {
      owners.push_back(message.session);
    }
    return owners;
  }

  Answer<bool> held_;
};

TEST_F(SessionRecordsTest, KnowWhichProcessOfWhichUserOnWhichConnectionOpenedASession) {
  connect(41, "other");
  const Client client = connect(42, "player");
  create(client, 7);
  const platform::SessionFacts made{7, 2, 42, 1000, "player", "", 65535, "unknown"};
  EXPECT_EQ(platform_.sessionRecords.facts(1), made);
  configure(client, {{"HostApplicationDisplayID", "sys.oxbow.music"}}, 7);
  EXPECT_EQ(platform_.sessionRecords.facts(1).application, "sys.oxbow.music");
  EXPECT_EQ(callsOf(1), (Calls{"created 1", "described 1"}));
}

TEST_F(SessionRecordsTest, ASessionThatIsStoppedHasEndedSoUntilItStartsAgain) {
  const Client client = connect(41);
  run(client, 7);
  send(client, 7, 1);
  stop(client, 7);
  start(client, 7, held_);
  EXPECT_EQ(callsOf(1).size(), 4U);
  EXPECT_EQ(callsOf(1)[2].substr(0, 9), "stopped 1");
  EXPECT_EQ(lastOf(1), "started 1");
}

TEST_F(SessionRecordsTest, ADestroyedSessionHasEndedSoWhetherItRanOrNot) {
  const Client client = connect(41);
  run(client, 1);
  run(client, 2);
  stop(client, 2);
  create(client, 3);
  for (const std::int64_t id : {1, 2, 3, 4}) {
    destroy(client, id);
  }
  const Calls first = callsOf(1);
  ASSERT_EQ(first.size(), 4U);
  EXPECT_EQ(first[2].substr(0, 9), "stopped 1");
  EXPECT_EQ(first[3], "ended 1 destroyed");
  EXPECT_EQ(lastOf(2), "ended 2 destroyed");
  EXPECT_EQ(callsOf(3), (Calls{"created 3", "ended 3 destroyed"}));
  EXPECT_EQ(sessions(), 3U);
}

TEST_F(SessionRecordsTest, ACreateUnderTheSameIDReplacesWithTheCountsOfThePeriodThatRan) {
  const Client client = connect(41);
  run(client, 7);
  send(client, 7, 1);
  send(client, 7, 1);
  create(client, 7);
  EXPECT_EQ(callsOf(1),
            (Calls{"created 1", "started 1", "repeated 1", "stopped 1 messages=2 redundant=1", "ended 1 replaced"}));
  EXPECT_EQ(callsOf(2), Calls{"created 2"});
}

TEST_F(SessionRecordsTest, AnotherClientsSessionUnderTheSameIDStays) {
  const Client first = connect(41);
  const Client second = connect(42);
  run(first, 7);
  create(second, 7);
  EXPECT_EQ(callsOf(1), (Calls{"created 1", "started 1"}));
}

TEST_F(SessionRecordsTest, AChangeOfTypeMakesAnotherSessionOfTheNewTypeWithTheApplication) {
  const Client client = connect(41);
  create(client, 7);
  configure(client, {{"HostApplicationDisplayID", "sys.oxbow.music"}}, 7);
  start(client, 7, held_);
  retype(client, kTelephony, 7);
  EXPECT_EQ(lastOf(1), "ended 1 retyped");
  EXPECT_EQ(platform_.sessionRecords.facts(1).serviceType, 65535);
  EXPECT_EQ(platform_.sessionRecords.facts(2).serviceType, kTelephony);
  EXPECT_EQ(platform_.sessionRecords.facts(2).serviceName, "telephony");
  EXPECT_EQ(platform_.sessionRecords.facts(2).application, "sys.oxbow.music");
  EXPECT_EQ(platform_.sessionRecords.facts(2).process, "player");
  retype(client, kTelephony, 7);
  EXPECT_EQ(sessions(), 2U);
}

TEST_F(SessionRecordsTest, AClientThatGoesEndsWhatRanAndWhatNeverDidAndNotWhatItHadStopped) {
  const Client client = connect(41);
  run(client, 1);
  run(client, 2);
  stop(client, 2);
  create(client, 3);
  const std::string stopped = lastOf(2);
  client.connection->invalidate();
  platform_.runUntilIdle();
  EXPECT_EQ(callsOf(1)[2].substr(0, 9), "stopped 1");
  EXPECT_EQ(lastOf(1), "ended 1 client-gone");
  EXPECT_EQ(lastOf(2), stopped);
  EXPECT_EQ(lastOf(3), "ended 3 client-gone");
}

TEST_F(SessionRecordsTest, AClientThatGoesInSlicesHasTheSameEnds) {
  const Client client = connect(41);
  for (std::int64_t id = 1; id <= 6; ++id) {
    run(client, id);
  }
  create(client, 7);
  platform_.workQueues.find("sys.oxbow.tarnkit.reporting.server")->setTurn(1);
  client.connection->invalidate();
  platform_.runUntilIdle();
  for (Number session = 1; session <= 7; ++session) {
    EXPECT_EQ(lastOf(session), "ended " + std::to_string(session) + " client-gone");
  }
}

TEST_F(SessionRecordsTest, AServiceThatStopsIsTheEndOfWhatRanAndOfWhatNeverDid) {
  const Client client = connect(41);
  run(client, 1);
  create(client, 2);
  service_->announceEnd();
  client.connection->invalidate();
  platform_.runUntilIdle();
  EXPECT_EQ(lastOf(1), "ended 1 service-stopping");
  EXPECT_EQ(lastOf(2), "ended 2 service-stopping");
}

TEST_F(SessionRecordsTest, AKilledServiceLeavesItsSessionsOpen) {
  const Client client = connect(41);
  run(client, 1);
  client.remote().killService();
  platform_.runUntilIdle();
  EXPECT_EQ(callsOf(1), (Calls{"created 1", "started 1"}));
}

TEST_F(SessionRecordsTest, ASessionThatThereIsNoMemoryToStopEndsWithItsClientAllTheSame) {
  TarnReportingSession::setAllWorkerClasses(kUnstoppable);
  const Client client = connect(41);
  run(client, 1);
  client.connection->invalidate();
  platform_.runUntilIdle();
  EXPECT_EQ(callsOf(1), (Calls{"created 1", "started 1", "stopped 1 messages=0 redundant=0", "ended 1 client-gone"}));
}

TEST_F(SessionRecordsTest, TwoEqualApplicationsAreToldApart) {
  const Client first = connect(41);
  const Client second = connect(42);
  for (const Client& client : {first, second}) {
    create(client, 7);
    configure(client, {{"HostApplicationDisplayID", "sys.oxbow.music"}}, 7);
    start(client, 7, held_);
  }
  platform_.tally.clear();
  ServiceFixture::send(first, {{"value", 1}}, std::nullopt);  // to both
  send(first, 7, 2);                                          // to the first that has the ID
  EXPECT_EQ(ownersOf(kMessage), (std::vector<Number>{1, 2, 1}));
  EXPECT_NE(platform_.sessionRecords.facts(1).pid, platform_.sessionRecords.facts(2).pid);
}

TEST_F(SessionRecordsTest, EachSliceOfABroadcastIsTheWorkOfItsSession) {
  const Client client = connect(41);
  std::vector<Number> expected;
  for (std::int64_t id = 1; id <= 10; ++id) {
    run(client, id);
    expected.push_back(id);
  }
  platform_.tally.clear();
  platform_.workQueues.find("sys.oxbow.tarnkit.reporting.server")->setTurn(4);
  ServiceFixture::send(client, {{"value", 1}}, std::nullopt);
  EXPECT_EQ(ownersOf(kMessage), expected);
}

TEST_F(SessionRecordsTest, WhatAProducerDerivesAtTheStopIsItsSessions) {
  const Client client = connect(41);
  run(client, 7);
  run(client, 8);
  send(client, 7, 1);
  platform_.tally.clear();
  stop(client, 7);
  ASSERT_FALSE(platform_.tally.events().empty());
  EXPECT_TRUE(std::all_of(platform_.tally.events().begin(), platform_.tally.events().end(),
                          [](const auto& event) { return event.session == 1; }));
}

TEST_F(SessionRecordsTest, WhatWaitsOnAPrivateQueueIsItsSessionsThoughThatWasReplacedMeanwhile) {
  const Client client = connect(41);
  run(client, 7);
  const auto reply = [](const std::optional<platform::RemoteError>&) {};
  const auto done = [](const std::optional<platform::RemoteError>&, bool) {};
  const auto queue = platform_.workQueues.find("sys.oxbow.tarnkit.reporting.server");
  client.remote().sendMessage({{"value", 1}}, 4, 1, std::vector<std::int64_t>{7}, reply);
  client.remote().createReportingSession(7, done);
  client.remote().startReportingSessionForID(7, done);
  client.remote().sendMessage({{"value", 2}}, 4, 1, std::vector<std::int64_t>{7}, reply);
  queue->runUntilIdle();
  ASSERT_EQ(lastOf(1), "ended 1 replaced");
  platform_.runUntilIdle();
  EXPECT_EQ(ownersOfMirror(0), std::vector<Number>{1});
  EXPECT_EQ(ownersOfMirror(1), std::vector<Number>{2});
}

TEST_F(SessionRecordsTest, WhatWaitsForALateReplyIsItsSessions) {
  platform_.rtcReporting.completions().delayOn(
      platform_.workQueues.makeSerialQueue("backend", platform::QualityOfService::Utility), 2s);
  const Client client = connect(41);
  run(client, 7);
  run(client, 8);
  send(client, 7, 1);
  send(client, 8, 2);
  stop(client, 7);
  stop(client, 8);
  EXPECT_EQ(ownersOfMirror(0), std::vector<Number>{});
  platform_.advance(2s);
  ASSERT_GE(ownersOfMirror(0).size(), 2U);
  EXPECT_EQ(ownersOfMirror(0), std::vector<Number>(ownersOfMirror(0).size(), 1));
  EXPECT_EQ(ownersOfMirror(1), std::vector<Number>(ownersOfMirror(1).size(), 2));
}

TEST_F(SessionRecordsTest, MessagesWithoutASessionAndTheServicesOwnEventsAreNobodys) {
  const Client client = connect(41);
  ServiceFixture::send(client, {{"value", 1}}, std::nullopt);
  EXPECT_EQ(ownersOf(kMessage), std::vector<Number>{0});
  run(client, 7);
  client.connection->invalidate();
  platform_.runUntilIdle();
  EXPECT_EQ(ownersOf(kUptime), std::vector<Number>{0});
  EXPECT_EQ(sessions(), 1U);
}

TEST_F(SessionRecordsTest, WithoutThemSessionsLiveAndEndAsEver) {
  platform_.facilities().sessionRecords = nullptr;
  const Client client = connect(41);
  run(client, 7);
  retype(client, kTelephony, 7);
  start(client, 7, held_);
  platform_.tally.clear();
  send(client, 7, 1);
  create(client, 7);
  destroy(client, 7);
  run(client, 8);
  client.connection->invalidate();
  platform_.runUntilIdle();
  EXPECT_EQ(ownersOf(kMessage), std::vector<Number>{0});
  EXPECT_EQ(service_->sessionCount(), 0U);
  EXPECT_EQ(sessions(), 0U);
}

}  // namespace
}  // namespace tarn
