// SPDX-License-Identifier: Apache-2.0
#include "session/TarnReportingSession.h"

#include "tests/session/SessionFixture.h"

namespace tarn {
namespace {

using namespace testing;

// Writes down, at stop, the names that the log then holds.
class Observer : public TrailWorker<Observer>, public TarnReportingSessionWorkerProducerProtocol {
 public:
  static constexpr std::string_view kClassName = "Observer";
  using TrailWorker::TrailWorker;
  void stop() {
    for (const auto& record : session()->messages()) {
      trail().emplace_back(record->message()["name"].asText());
    }
  }
};

// Writes down at each call how many trace points there were by then.
class PointCounter : public TarnReportingSessionWorkerProtocol, public TarnReportingSessionWorkerConsumerProtocol {
 public:
  static constexpr std::string_view kClassName = "PointCounter";
  using TarnReportingSessionWorkerProtocol::TarnReportingSessionWorkerProtocol;
  static std::unique_ptr<PointCounter> initWithSession(const std::shared_ptr<TarnReportingSession>& session) {
    note("init");
    return std::make_unique<PointCounter>(session);
  }
  static bool startOnInit() { return true; }
  static bool start() {
    note("start");
    return true;
  }
  static void stop() { note("stop"); }
  void handleMessage(const std::shared_ptr<TarnReportingSessionMessage>&) override { note("handle"); }
  static inline FakeTracePoints* points = nullptr;

 private:
  static void note(const std::string& verb) {
    trail().push_back(verb + " " + std::to_string(points->emitted().size()));
  }
};

// Keeps the last record of the log at stop, and sends what the test wants then.
class StopWitness : public TarnReportingSessionWorkerProtocol, public TarnReportingSessionWorkerProducerProtocol {
 public:
  static constexpr std::string_view kClassName = "StopWitness";
  using TarnReportingSessionWorkerProtocol::TarnReportingSessionWorkerProtocol;
  static std::unique_ptr<StopWitness> initWithSession(const std::shared_ptr<TarnReportingSession>& session) {
    return std::make_unique<StopWitness>(session);
  }
  void stop() {
    last = session()->messages().back();
    total = session()->totalMessageCount();
    if (derived) {
      session()->sendMessage(derived);
    }
  }
  static inline std::shared_ptr<TarnReportingSessionMessage> last;
  static inline std::shared_ptr<TarnReportingSessionMessage> derived;
  static inline std::int64_t total = 0;
};

class TarnReportingSessionTest : public SessionFixture {
 protected:
  using Lines = std::vector<std::string>;

  ~TarnReportingSessionTest() override {
    StopWitness::last.reset();
    StopWitness::derived.reset();
  }
  // The session's lines since the last call, "level text", those of its workers left out.
  Lines takeLines() {
    static constexpr const char* kLevels[] = {"debug ", "info ", "default ", "error "};
    Lines lines;
    for (const auto& entry : platform_.log.entries()) {
      if (entry.message().find("TarnReportingSessionWorker") == std::string::npos) {
        EXPECT_EQ(entry.category, "tarnrr");
        EXPECT_EQ(entry.module, "TarnReportingSession");
        lines.push_back(kLevels[static_cast<std::size_t>(entry.level)] + entry.message());
      }
    }
    platform_.log.clear();
    return lines;
  }
  static const plist::Dictionary& logged(const std::shared_ptr<TarnReportingSession>& session, std::size_t index) {
    return session->messages().at(index)->message();
  }
};

TEST_F(TarnReportingSessionTest, IsCreatedWithItsInitialValues) {
  const auto session = makeSession(-5);
  EXPECT_EQ(session->reporterID(), -5);
  EXPECT_FALSE(session->started());
  EXPECT_FALSE(session->isSingleMessageSession());
  EXPECT_EQ(session->serviceType(), AudioServiceType::Unknown);
  EXPECT_EQ(session->serviceName(), "unknown");
  EXPECT_TRUE(session->configuration().empty());
  EXPECT_EQ(session->totalMessageCount(), 0);
  EXPECT_EQ(session->processIdentifiers(), std::vector<std::int32_t>{4711});
  EXPECT_TRUE(platform_.log.contains(LogLevel::Info, "created reporting session for ID: -5"));
}

TEST_F(TarnReportingSessionTest, StartAppendsItsMarkerToTheLogAlone) {
  useWorkers<EarlyWorker>();
  const auto session = makeSession();
  session->start();
  ASSERT_EQ(session->messages().size(), 1U);
  const auto& marker = *session->messages()[0];
  EXPECT_EQ(marker.category(), AudioEventCategory::Setup);
  EXPECT_EQ(marker.type(), AudioEventType::Start);
  EXPECT_EQ(marker.message(), (plist::Dictionary{{"method", "start"},
                                                 {"messages_at_start", 0},
                                                 {"unique_messages_at_start", 0},
                                                 {"reporterid", 7},
                                                 {"running_at_start", "NO"},
                                                 {"invalid_timestamp", "nil"},
                                                 {"tarnreporting_timestamp", now()},
                                                 {"audiotag", "SetupStart"}}));
  EXPECT_EQ(trail(), (std::vector<std::string>{"EarlyWorker init"}));
}

TEST_F(TarnReportingSessionTest, CallingStartTwiceAppendsAMarkerAndStartsNothingNew) {
  useWorkers<ConsumerWorker>();
  const auto session = makeSession();
  session->start();
  trail().clear();
  session->start();
  ASSERT_EQ(session->messages().size(), 2U);
  EXPECT_EQ(logged(session, 1)["running_at_start"].text(), "YES");
  EXPECT_EQ(logged(session, 1)["messages_at_start"].asInt64(), 1);
  EXPECT_TRUE(trail().empty());
  EXPECT_TRUE(platform_.log.contains(LogLevel::Info, "7 is already started"));
}

TEST_F(TarnReportingSessionTest, CallingStopTwiceLeavesASecondMarkerUntilTheNextStopAfterAStart) {
  const auto session = makeSession();
  session->start();
  session->stop();
  EXPECT_TRUE(session->messages().empty());
  session->stop();
  ASSERT_EQ(session->messages().size(), 1U);
  EXPECT_EQ(logged(session, 0)["method"].text(), "stop");
  EXPECT_EQ(logged(session, 0)["running_at_stop"].text(), "NO");
  EXPECT_EQ(logged(session, 0)["audiotag"].text(), "SetupStop");
  session->start();
  EXPECT_EQ(logged(session, 1)["messages_at_start"].asInt64(), 1);
  session->stop();
  EXPECT_TRUE(session->messages().empty());
}

TEST_F(TarnReportingSessionTest, StopEmptiesTheLogAndKeepsValuesConfigurationAndWorkers) {
  useWorkers<ConsumerWorker>();
  const auto session = makeSession();
  const plist::Dictionary configuration{{"key", "value"}};
  session->updateConfigurationWithContentsOfConfiguration(&configuration);
  session->start();
  session->sendMessage(message({{"volume", 0.5}}));
  session->stop();
  EXPECT_FALSE(session->started());
  EXPECT_TRUE(session->messages().empty());
  EXPECT_EQ(session->totalMessageCount(), 0);
  EXPECT_EQ(session->previousValues().get("volume").asDouble(), 0.5);
  EXPECT_EQ(session->configuration()["key"].text(), "value");
  EXPECT_EQ(session->workerInstanceCount(), 1U);
}

TEST_F(TarnReportingSessionTest, ProducersSeeTheLogInTimeOrder) {
  useWorkers<Observer>();
  const auto session = makeSession();
  session->start();
  platform_.advance(std::chrono::seconds(100));
  trail().clear();
  session->sendMessage(message({{"name", "later"}, {"tarnreporting_timestamp", now() - 10}}));
  session->sendMessage(message({{"name", "earlier"}, {"tarnreporting_timestamp", now() - 20}}));
  session->stop();
  EXPECT_EQ(trail(), (std::vector<std::string>{"(null)", "earlier", "later", "(null)"}));
}

TEST_F(TarnReportingSessionTest, ServiceTypeAfterStartChangesNoWorkersUntilTheNextStart) {
  useWorkers<LateWorker>();
  script().lateDeclines = true;
  const auto session = makeSession();
  session->start();
  script().lateDeclines = false;
  session->setServiceType(AudioServiceType::Haptics);
  EXPECT_EQ(session->workerInstanceCount(), 0U);
  EXPECT_EQ(session->serviceName(), "haptics");
  session->stop();
  session->start();
  EXPECT_EQ(session->workerInstanceCount(), 1U);
  EXPECT_TRUE(platform_.log.contains(LogLevel::Info, "setting service type haptics"));
}

TEST_F(TarnReportingSessionTest, ConfigurationMergesAndMirrorsTheHostApplication) {
  const auto session = makeSession();
  const plist::Dictionary first{{"a", 1}, {"KvHostApplicationDisplayID", "com.example.player"}};
  session->updateConfigurationWithContentsOfConfiguration(&first);
  EXPECT_EQ(session->configuration()["HostApplicationDisplayID"].text(), "com.example.player");
  const plist::Dictionary second{{"a", 2}, {"KvHostApplicationDisplayID", "x"}, {"HostApplicationDisplayID", "y"}};
  session->updateConfigurationWithContentsOfConfiguration(&second);
  EXPECT_EQ(session->configuration()["HostApplicationDisplayID"].text(), "y");
  EXPECT_EQ(session->configuration()["a"].asInt64(), 2);
  session->updateConfigurationWithContentsOfConfiguration(nullptr);
  EXPECT_EQ(session->configuration().size(), 3U);
}

TEST_F(TarnReportingSessionTest, DescriptionWithoutConfigurationShowsTheApplicationAsUnknown) {
  const auto session = makeSession();
  EXPECT_EQ(session->description(),
            "reporterID=7,serviceName=unknown,ownerPid=4711,clientProcessName=(null),HostApplicationDisplayID=Unknown,"
            "started=0,singleMessageSession=0");
  session->setClientProcessName("player");
  session->start();
  EXPECT_EQ(session->description(),
            "reporterID=7,serviceName=unknown,ownerPid=4711,clientProcessName=player,HostApplicationDisplayID=Unknown,"
            "started=1,singleMessageSession=0");
}

TEST_F(TarnReportingSessionTest, LogsItsLifeAtTheLevelsOfEach) {
  {
    const auto session = makeSession();
    session->start();
    session->stop();
  }
  EXPECT_TRUE(platform_.log.contains(LogLevel::Info, "start called. reporterID=7"));
  EXPECT_TRUE(platform_.log.contains(LogLevel::Debug, "self.started==false. starting. reporterID=7"));
  EXPECT_TRUE(platform_.log.contains(LogLevel::Debug, "stop called. reporterID=7"));
  EXPECT_TRUE(platform_.log.contains(LogLevel::Debug, "ending session. reporterID=7"));
  EXPECT_TRUE(platform_.log.contains(LogLevel::Info, "deallocing this session 7"));
}

TEST_F(TarnReportingSessionTest, WritesTheseLinesAndNoOthers) {
  auto session = makeSession();
  EXPECT_EQ(takeLines(), (Lines{"info created reporting session for ID: 7"}));
  session->setServiceType(AudioServiceType::Wisp);
  EXPECT_EQ(takeLines(), (Lines{"info setting service type wisp"}));
  session->stop();
  EXPECT_EQ(takeLines(), (Lines{"debug stop called. reporterID=7"}));
  session->start();
  EXPECT_EQ(takeLines(),
            (Lines{"info start called. reporterID=7", "debug self.started==false. starting. reporterID=7"}));
  session->start();
  EXPECT_EQ(takeLines(), (Lines{"info start called. reporterID=7", "info 7 is already started"}));
  session->stop();
  EXPECT_EQ(takeLines(), (Lines{"debug stop called. reporterID=7", "debug ending session. reporterID=7"}));
  session.reset();
  EXPECT_EQ(takeLines(), (Lines{"info deallocing this session 7"}));
}

TEST_F(TarnReportingSessionTest, LineOfTheCreationFollowsThoseOfTheEarlyWorkers) {
  useWorkers<EarlyWorker>();
  makeSession();
  EXPECT_EQ(platform_.log.messages().at(0),
            "Initializing TarnReportingSessionWorker. action=init worker=EarlyWorker reporterID=7");
  EXPECT_EQ(platform_.log.messages().at(1), "TarnReportingSessionWorker action=added worker=EarlyWorker reporterID=7");
  EXPECT_EQ(platform_.log.messages().at(2), "created reporting session for ID: 7");
}

TEST_F(TarnReportingSessionTest, LifeIsMarkedByTracePointsOfTheReporter) {
  using Points = std::vector<FakeTracePoints::Point>;
  auto session = makeSession(-9);
  session->start();
  session->start();
  session->sendMessage(message({{"a", 1}}));
  session->stop();
  session->stop();
  session.reset();
  EXPECT_EQ(platform_.tracePoints.emitted(),
            (Points{{0x21044828, -9}, {0x2104482C, -9}, {0x21044838, -9}, {0x21044830, -9}, {0x21044834, -9}}));
}

TEST_F(TarnReportingSessionTest, TracePointsStandAtTheirMoments) {
  PointCounter::points = &platform_.tracePoints;
  useWorkers<PointCounter, ConsumerWorker, ProducerWorker>();
  auto session = makeSession();  // the point of the creation comes last
  session->start();              // that of the start before its workers
  session->sendMessage(message({{"a", 1}}));
  session->stop();  // that of the stop before its workers; the producer's message is one of its own
  EXPECT_EQ(trail(), (std::vector<std::string>{"init 0", "start 0", "ConsumerWorker init", "ProducerWorker init",
                                               "ConsumerWorker start", "ProducerWorker start", "handle 3",
                                               "ConsumerWorker handle", "ProducerWorker stop", "handle 5",
                                               "ConsumerWorker handle", "stop 5", "ConsumerWorker stop"}));
}

TEST_F(TarnReportingSessionTest, StartIsMarkedBeforeItsWorkersAreMade) {
  PointCounter::points = &platform_.tracePoints;
  auto row = TarnReportingSessionWorkerClass::of<PointCounter>();
  row.startOnInit = [] { return false; };
  useWorkers({row});
  const auto session = makeSession();
  EXPECT_EQ(session->workerInstanceCount(), 0U);  // a class that says no isn't made on creation
  session->start();
  EXPECT_EQ(trail(), (std::vector<std::string>{"init 2", "start 2"}));
}

TEST_F(TarnReportingSessionTest, StopAppendsItsMarkerBeforeTheWorkersStop) {
  useWorkers<StopWitness>();
  const auto session = makeSession();
  session->start();
  platform_.advance(std::chrono::seconds(1));
  session->sendMessage(message({{"a", 1}}));
  session->sendMessage(message({{"a", 1}}));
  session->stop();
  ASSERT_TRUE(StopWitness::last != nullptr);
  EXPECT_EQ(StopWitness::last->category(), AudioEventCategory::Setup);
  EXPECT_EQ(StopWitness::last->type(), AudioEventType::Stop);
  EXPECT_EQ(StopWitness::last->message(), (plist::Dictionary{{"method", "stop"},
                                                             {"messages_at_stop", 2},
                                                             {"unique_messages_at_stop", 2},
                                                             {"reporterid", 7},
                                                             {"running_at_stop", "YES"},
                                                             {"invalid_timestamp", "nil"},
                                                             {"tarnreporting_timestamp", now()},
                                                             {"audiotag", "SetupStop"}}));
  EXPECT_EQ(StopWitness::total, 2);  // markers don't count, and the count goes only after the workers
}

TEST_F(TarnReportingSessionTest, DerivedMessageIsComparedWithTheLatestByTime) {
  useWorkers<StopWitness>();
  const auto session = makeSession();
  session->start();
  session->sendMessage(message({{"a", "later"}, {"tarnreporting_timestamp", now() - 10}}));
  session->sendMessage(message({{"a", "earlier"}, {"tarnreporting_timestamp", now() - 20}}));
  StopWitness::derived = message({{"a", "later"}, {"tarnreporting_timestamp", now()}});
  session->stop();
  EXPECT_TRUE(StopWitness::derived->isRedundant());
}

TEST_F(TarnReportingSessionTest, ConfigurationWithoutAHostApplicationKeepsTheOneThatIsThere) {
  const auto session = makeSession();
  const plist::Dictionary first{{"HostApplicationDisplayID", "com.example.player"}};
  session->updateConfigurationWithContentsOfConfiguration(&first);
  const plist::Dictionary second{{"b", 2}};
  session->updateConfigurationWithContentsOfConfiguration(&second);
  EXPECT_EQ(session->configuration(),
            (plist::Dictionary{{"HostApplicationDisplayID", "com.example.player"}, {"b", 2}}));
}

TEST_F(TarnReportingSessionTest, DescriptionNamesTheFirstProcessAndTheConfiguredApplication) {
  const auto session = TarnReportingSession::initWithID(-1, {5, 6}, TarnReportingSession::Mode::SingleMessage);
  session->setServiceType(AudioServiceType::Haptics);
  const plist::Dictionary configuration{{"HostApplicationDisplayID", "com.example.player"}};
  session->updateConfigurationWithContentsOfConfiguration(&configuration);
  EXPECT_EQ(session->description(),
            "reporterID=-1,serviceName=haptics,ownerPid=5,clientProcessName=(null),"
            "HostApplicationDisplayID=com.example.player,started=0,singleMessageSession=1");
  EXPECT_NE(TarnReportingSession::initWithID(1, {})->description().find("ownerPid=0,"), std::string::npos);
}

TEST_F(TarnReportingSessionTest, DestructionReleasesWorkersWithoutStoppingThem) {
  useWorkers<ConsumerWorker>();
  makeSession()->start();
  EXPECT_EQ(trail(), (std::vector<std::string>{"ConsumerWorker init", "ConsumerWorker start"}));
}

}  // namespace
}  // namespace tarn
