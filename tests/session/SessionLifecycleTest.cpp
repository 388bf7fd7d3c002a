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

class TarnReportingSessionTest : public SessionFixture {
 protected:
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

TEST_F(TarnReportingSessionTest, DestructionReleasesWorkersWithoutStoppingThem) {
  useWorkers<ConsumerWorker>();
  makeSession()->start();
  EXPECT_EQ(trail(), (std::vector<std::string>{"ConsumerWorker init", "ConsumerWorker start"}));
}

}  // namespace
}  // namespace tarn
