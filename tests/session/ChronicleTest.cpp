// SPDX-License-Identifier: Apache-2.0
// What the session records are told of one session, and whose work its workers do.
#include "session/TarnReportingSessionChronicle.h"

#include <new>
#include <utility>

#include "platform/Facilities.h"
#include "platform/WorkQueue.h"
#include "tests/session/SessionFixture.h"

namespace tarn {
namespace {

using namespace testing;
using namespace std::chrono_literals;
using Calls = std::vector<std::string>;
using Number = platform::SessionNumber;

// Each thing that was done, and for whom: "start 1".
Calls& done() {
  static Calls entries;
  return entries;
}

void note(const std::string& what) {
  done().push_back(what + " " + std::to_string(RecordingSessionRecords::current()));
}

// Notes whose work all that it is asked for is, and hands some over to a queue of its own.
class HandingWorker : public TarnReportingSessionWorkerProtocol, public TarnReportingSessionWorkerConsumerProtocol {
 public:
  static constexpr std::string_view kClassName = "HandingWorker";
  using TarnReportingSessionWorkerProtocol::TarnReportingSessionWorkerProtocol;
  ~HandingWorker() override { note("release"); }
  static std::unique_ptr<HandingWorker> initWithSession(const std::shared_ptr<TarnReportingSession>& session) {
    note("make");
    return std::make_unique<HandingWorker>(session);
  }
  static bool startOnInit() { return true; }
  static bool handleSingleMessageSession() { return true; }
  bool start() {
    note("start");
    return true;
  }
  void stop() { note("stop"); }
  void handleMessage(const std::shared_ptr<TarnReportingSessionMessage>&) override {
    note("message");
    queue_->async([] { note("queued"); });
    queue_->asyncAfter(1s, [] { note("delayed"); });
  }

 private:
  const std::shared_ptr<platform::WorkQueue> queue_ =
      TarnReportingFacilities().workQueues.makeSerialQueue("handing", platform::QualityOfService::Utility);
};

// Finds no memory to do what it is told to fail at.
struct FailingWorker : TarnReportingSessionWorkerProtocol {
  static constexpr std::string_view kClassName = "FailingWorker";
  using TarnReportingSessionWorkerProtocol::TarnReportingSessionWorkerProtocol;
  static std::string& fails() {
    static std::string what;
    return what;
  }
  static std::unique_ptr<FailingWorker> initWithSession(const std::shared_ptr<TarnReportingSession>& session) {
    if (fails() == "make") throw std::bad_alloc();
    return std::make_unique<FailingWorker>(session);
  }
  static bool startOnInit() { return true; }
  bool start() {
    if (fails() == "start") throw std::bad_alloc();
    return false;
  }
};

class SessionChronicle : public SessionFixture {
 protected:
  SessionChronicle() {
    done().clear();
    FailingWorker::fails().clear();
  }
  void send(TarnReportingSession& session, int value) const {
    session.sendMessage(message({{"value", value}, {"tarnreporting_timestamp", now()}}));
  }
  const Calls& told() const { return platform_.sessionRecords.calls(); }
  void withoutRecords() { platform_.facilities().sessionRecords = nullptr; }
};

TEST_F(SessionChronicle, TellsOfTheMakingAndOfEachPeriodWithItsMessages) {
  const auto session = makeSession();
  send(*session, 1);  // before the period
  session->start();
  send(*session, 1);
  send(*session, 1);
  send(*session, 2);
  session->stop();
  send(*session, 3);
  session->start();
  send(*session, 4);
  session->stop();
  EXPECT_EQ(told(), (Calls{"created 1", "started 1", "repeated 1", "repeated 1", "stopped 1 messages=3 redundant=2",
                           "started 1", "stopped 1 messages=1 redundant=0"}));
}

TEST_F(SessionChronicle, TellsWhatARepeatedMessageSaidWhileTheSessionRuns) {
  const auto session = makeSession();
  send(*session, 1);
  send(*session, 1);  // before the period
  session->start();
  send(*session, 2);
  platform_.advance(1s);
  send(*session, 2);
  session->stop();
  send(*session, 3);
  send(*session, 3);  // after it
  ASSERT_EQ(platform_.sessionRecords.repeatedMessages().size(), 1U);
  const plist::Dictionary& repeated = platform_.sessionRecords.repeatedMessages().front();
  EXPECT_EQ(repeated.get("value").asDouble(), 2);
  EXPECT_EQ(repeated.get("tarnreporting_timestamp").asDouble(), now());
  EXPECT_TRUE(repeated.get("audiotag").isText()) << "as the intake left it";
}

TEST_F(SessionChronicle, ARepeatedMessageThatCannotBeToldIsNotTaken) {
  const auto session = makeSession();
  session->start();
  send(*session, 1);
  platform_.sessionRecords.failAll("repeated");
  EXPECT_THROW(send(*session, 1), std::bad_alloc);
  platform_.sessionRecords.failAll("");
  session->stop();
  EXPECT_EQ(told().back(), "stopped 1 messages=1 redundant=0");
}

TEST_F(SessionChronicle, CountsWhatProducersDeriveAtTheStop) {
  useWorkers<ProducerWorker>();
  const auto session = makeSession();
  session->start();
  send(*session, 1);
  session->stop();
  EXPECT_EQ(told().back(), "stopped 1 messages=2 redundant=0");
}

TEST_F(SessionChronicle, TellsNothingOfStartsAndStopsThatChangeNothing) {
  const auto session = makeSession();
  session->stop();
  session->start();
  session->start();
  session->stop();
  session->stop();
  EXPECT_EQ(told(), (Calls{"created 1", "started 1", "stopped 1 messages=0 redundant=0"}));
}

TEST_F(SessionChronicle, KnowsWhoOpenedTheSession) {
  const auto session =
      TarnReportingSession::initWithID(7, {4711, 12}, TarnReportingSession::Mode::Ordinary, {3, 1001, "player"});
  const platform::SessionFacts facts{7, 3, 4711, 1001, "player", "", 65535, "unknown"};
  EXPECT_EQ(platform_.sessionRecords.facts(1), facts);
  session->setClientProcessName("player");
  EXPECT_EQ(told(), Calls{"created 1"});
}

TEST_F(SessionChronicle, DescribesWhatBecameKnownOrChangedAndNothingElse) {
  const auto session = makeSession();
  const plist::Dictionary other{{"volume", 1}};
  session->updateConfigurationWithContentsOfConfiguration(&other);
  session->setServiceType(AudioServiceType::Unknown);
  EXPECT_EQ(told(), Calls{"created 1"});
  session->setServiceType(AudioServiceType::Telephony);
  const plist::Dictionary application{{"HostApplicationDisplayID", "sys.oxbow.music"}};
  session->updateConfigurationWithContentsOfConfiguration(&application);
  session->setClientProcessName("player");
  EXPECT_EQ(told(), (Calls{"created 1", "described 1", "described 1", "described 1"}));
  const platform::SessionFacts facts{
      7, 0, 4711, 0, "player", "sys.oxbow.music", static_cast<int>(AudioServiceType::Telephony), "telephony"};
  EXPECT_EQ(platform_.sessionRecords.facts(1), facts);
  session->updateConfigurationWithContentsOfConfiguration(&application);
  session->setServiceType(AudioServiceType::Telephony);
  EXPECT_EQ(told().size(), 4U);
}

TEST_F(SessionChronicle, TheFirstEndIsTheEnd) {
  const auto session = makeSession();
  session->start();
  session->chronicle().end(platform::SessionEnd::Replaced);
  session->chronicle().end(platform::SessionEnd::Destroyed);
  session->stop();
  session->start();
  EXPECT_EQ(told(), (Calls{"created 1", "started 1", "stopped 1 messages=0 redundant=0", "ended 1 replaced"}));
}

TEST_F(SessionChronicle, AStopIsAnEndUnlessOneIsToldThatCountsMore) {
  const auto session = makeSession();
  session->start();
  session->stop();
  session->chronicle().endUnlessStopped(platform::SessionEnd::ClientGone);
  EXPECT_EQ(told().back(), "stopped 1 messages=0 redundant=0");
  session->chronicle().end(platform::SessionEnd::Destroyed);
  EXPECT_EQ(told().back(), "ended 1 destroyed");
}

TEST_F(SessionChronicle, ASessionThatIsLetGoOfWithoutAWordIsDestroyedUnlessItWasStopped) {
  const auto stopped = makeSession();
  stopped->start();
  stopped->stop();
  auto running = makeSession();
  running->start();
  makeSession().reset();
  running.reset();
  EXPECT_EQ(platform_.sessionRecords.callsOf(3), (Calls{"created 3", "ended 3 destroyed"}));
  EXPECT_EQ(platform_.sessionRecords.callsOf(2).back(), "ended 2 destroyed");
  EXPECT_EQ(platform_.sessionRecords.callsOf(1).back(), "stopped 1 messages=0 redundant=0");
}

TEST_F(SessionChronicle, AllThatItsWorkersDoIsTheSessionsWork) {
  useWorkers<HandingWorker>();
  const auto other = makeSession();  // number 1
  done().clear();
  auto session = makeSession();
  session->start();
  send(*session, 1);
  session->stop();
  session->start();
  session.reset();
  EXPECT_EQ(done(), (Calls{"make 2", "start 2", "message 2", "stop 2", "start 2", "release 2"}));
  EXPECT_EQ(RecordingSessionRecords::current(), 0);
}

TEST_F(SessionChronicle, WhatIsToldOfASessionIsItsWorkToo) {
  const auto session = makeSession();
  session->setServiceType(AudioServiceType::Telephony);
  const plist::Dictionary application{{"HostApplicationDisplayID", "sys.oxbow.music"}};
  session->updateConfigurationWithContentsOfConfiguration(&application);
  session->start();
  session->stop();
  EXPECT_EQ(platform_.sessionRecords.currents(), (std::vector<Number>{0, 1, 1, 1, 1}));
}

TEST_F(SessionChronicle, WorkWithinAnothersWorkIsItsOwnAndThenTheOthersAgain) {
  useWorkers<HandingWorker>();
  const auto session = makeSession();
  done().clear();
  const RecordingSessionRecords::Scope another(5);
  send(*session, 1);
  note("after");
  EXPECT_EQ(done(), (Calls{"message 1", "after 5"}));
}

TEST_F(SessionChronicle, WhatAWorkerHandsOverIsItsSessionsWhenItRunsThoughTheSessionIsGone) {
  useWorkers<HandingWorker>();
  auto first = makeSession();
  const auto second = makeSession();
  send(*first, 1);
  send(*second, 2);
  first.reset();
  done().clear();
  platform_.advance(1s);
  EXPECT_EQ(done(), (Calls{"queued 1", "queued 2", "delayed 1", "delayed 2"}));
}

TEST_F(SessionChronicle, ASingleMessageSessionHasNoneAndItsWorkIsNobodys) {
  useWorkers<HandingWorker>();
  const auto session = makeSession(1, TarnReportingSession::Mode::SingleMessage);
  session->setServiceType(AudioServiceType::Standalone);
  session->start();
  send(*session, 1);
  session->stop();
  platform_.advance(1s);
  session->chronicle().end(platform::SessionEnd::Destroyed);
  EXPECT_EQ(told(), Calls{});
  EXPECT_EQ(done(), (Calls{"make 0", "start 0", "message 0", "stop 0", "queued 0", "delayed 0"}));
}

TEST_F(SessionChronicle, WithoutRecordsNothingIsToldAndAllIsNobodysWork) {
  withoutRecords();
  useWorkers<HandingWorker>();
  auto session = makeSession();
  session->setServiceType(AudioServiceType::Telephony);
  session->setClientProcessName("player");
  session->start();
  send(*session, 1);
  session->stop();
  session->chronicle().end(platform::SessionEnd::Replaced);
  session.reset();
  EXPECT_EQ(told(), Calls{});
  EXPECT_EQ(done(), (Calls{"make 0", "start 0", "message 0", "stop 0", "release 0"}));
}

TEST_F(SessionChronicle, ASessionThatThereIsNoMemoryToTellOfIsNotMade) {
  useWorkers<HandingWorker>();
  platform_.sessionRecords.failAll("created");
  EXPECT_THROW(makeSession(), std::bad_alloc);
  EXPECT_EQ(done(), Calls{});
  EXPECT_EQ(RecordingSessionRecords::current(), 0);
}

TEST_F(SessionChronicle, ASessionWhoseMakingFailsIsToldToBeOver) {
  useWorkers<FailingWorker>();
  FailingWorker::fails() = "make";
  EXPECT_THROW(makeSession(), std::bad_alloc);
  EXPECT_EQ(told(), (Calls{"created 1", "ended 1 destroyed"}));
  EXPECT_EQ(RecordingSessionRecords::current(), 0);
}

TEST_F(SessionChronicle, AChangeThatThereIsNoMemoryToTellOfIsNotMadeUntilItIsTriedAgain) {
  const auto session = makeSession();
  const plist::Dictionary application{{"HostApplicationDisplayID", "sys.oxbow.music"}};
  platform_.sessionRecords.failAll("described");
  EXPECT_THROW(session->setServiceType(AudioServiceType::Telephony), std::bad_alloc);
  EXPECT_THROW(session->updateConfigurationWithContentsOfConfiguration(&application), std::bad_alloc);
  EXPECT_THROW(session->setClientProcessName("player"), std::bad_alloc);
  EXPECT_EQ(session->serviceType(), AudioServiceType::Unknown);
  EXPECT_TRUE(session->configuration().empty());
  EXPECT_EQ(session->clientProcessName(), "");
  platform_.sessionRecords.failAll("");
  session->setServiceType(AudioServiceType::Telephony);
  session->updateConfigurationWithContentsOfConfiguration(&application);
  session->setClientProcessName("player");
  EXPECT_EQ(told(), (Calls{"created 1", "described 1", "described 1", "described 1"}));
}

TEST_F(SessionChronicle, APeriodThatThereIsNoMemoryToTellOfDoesNotBegin) {
  const auto session = makeSession();
  platform_.sessionRecords.failAll("started");
  EXPECT_THROW(session->start(), std::bad_alloc);
  EXPECT_FALSE(session->started());
  platform_.sessionRecords.failAll("");
  session->start();
  EXPECT_TRUE(session->started());
  EXPECT_EQ(told(), (Calls{"created 1", "started 1"}));
}

TEST_F(SessionChronicle, AStartThatFailsAndIsTriedAgainIsOnePeriod) {
  useWorkers<FailingWorker>();
  const auto session = makeSession();
  FailingWorker::fails() = "start";
  EXPECT_THROW(session->start(), std::bad_alloc);
  EXPECT_FALSE(session->started());
  FailingWorker::fails().clear();
  session->start();
  session->stop();
  EXPECT_EQ(told(), (Calls{"created 1", "started 1", "stopped 1 messages=0 redundant=0"}));
}

TEST_F(SessionChronicle, StopsAndEndsHappenThoughThereIsNoMemoryToTellOfThem) {
  auto session = makeSession();
  session->start();
  platform_.sessionRecords.failAll("stopped");
  session->stop();
  EXPECT_FALSE(session->started());
  platform_.sessionRecords.failAll("ended");
  session->chronicle().end(platform::SessionEnd::Destroyed);
  session.reset();
  EXPECT_EQ(told(), (Calls{"created 1", "started 1"}));
}

}  // namespace
}  // namespace tarn
