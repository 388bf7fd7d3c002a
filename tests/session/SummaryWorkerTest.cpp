// SPDX-License-Identifier: Apache-2.0
#include "session/TarnReportingSessionSummaryWorker.h"

#include "tests/session/SessionFixture.h"

namespace tarn {
namespace {

using namespace testing;

class SummaryWorker : public SessionFixture {
 protected:
  SummaryWorker() { useWorkers<TarnReportingSessionSummaryWorker, ConsumerWorker>(); }

  // Stops the session and returns its summary.
  static plist::Dictionary summaryOf(const std::shared_ptr<TarnReportingSession>& session) {
    session->stop();
    return script().received.back()->message();
  }
};

TEST_F(SummaryWorker, SessionWithoutDurationsReportsZeroAverageAndCount) {
  const auto session = makeSession();
  session->start();
  const plist::Dictionary summary = summaryOf(session);
  EXPECT_EQ(summary["average_active_time"].kind(), plist::Kind::Double);
  EXPECT_EQ(summary["average_active_time"].doubleValue(), 0.0);
  EXPECT_EQ(summary["active_count"].asInt64(), 0);
  EXPECT_EQ(script().received.back()->category(), AudioEventCategory::SessionGeneric);
  EXPECT_EQ(script().received.back()->type(), AudioEventType::Summary);
  EXPECT_EQ(summary["audiotag"].text(), "Session_GenericSummary");
}

TEST_F(SummaryWorker, StartingItMakesItAStartedOne) {
  const auto worker = TarnReportingSessionSummaryWorker::initWithSession(makeSession());
  EXPECT_FALSE(worker->started());
  EXPECT_TRUE(worker->start());
  EXPECT_TRUE(worker->started());
}

TEST_F(SummaryWorker, EmptySessionHasANegativeRedundantCount) {
  const auto session = makeSession();
  session->start();
  const plist::Dictionary summary = summaryOf(session);
  EXPECT_EQ(summary["num_messages"].asInt64(), 0);
  EXPECT_EQ(summary["num_unique_messages"].asInt64(), 2);  // the two markers
  EXPECT_EQ(summary["num_redundant_messages"].asInt64(), -2);
}

TEST_F(SummaryWorker, MessageWithDurationAndOverloadCountsTowardsTheActiveTimeOnly) {
  const auto session = makeSession();
  session->start();
  session->sendMessage(message({{"session_duration", 2.5}, {"issue_type", "overload"}}));
  session->sendMessage(message({{"session_duration", "1.5 s"}}));
  session->sendMessage(message({{"issue_type", "overload"}}));
  session->sendMessage(message({{"issue_type", "underrun"}}));
  const plist::Dictionary summary = summaryOf(session);
  EXPECT_EQ(summary["total_active_time"].doubleValue(), 4.0);
  EXPECT_EQ(summary["active_count"].asInt64(), 2);
  EXPECT_EQ(summary["average_active_time"].doubleValue(), 2.0);
  EXPECT_EQ(summary["overload_count"].asInt64(), 1);
}

TEST_F(SummaryWorker, RedundantMessagesAreNotCountedAsActivity) {
  const auto session = makeSession();
  session->start();
  for (int i = 0; i < 3; ++i) {
    session->sendMessage(message({{"session_duration", 1.0}, {"tarnreporting_timestamp", now()}}));
  }
  const plist::Dictionary summary = summaryOf(session);
  EXPECT_EQ(summary["active_count"].asInt64(), 1);
  EXPECT_EQ(summary["num_messages"].asInt64(), 3);
  EXPECT_EQ(summary["num_unique_messages"].asInt64(), 3);
  EXPECT_EQ(summary["num_redundant_messages"].asInt64(), 0);
}

TEST_F(SummaryWorker, SummaryOfARestartedSessionIncludesTheFirstPeriod) {
  const auto session = makeSession();
  session->start();
  session->sendMessage(message({{"session_duration", 2.0}}));
  session->stop();
  session->start();
  session->sendMessage(message({{"session_duration", 3.0}}));
  const plist::Dictionary summary = summaryOf(session);
  EXPECT_EQ(summary["total_active_time"].doubleValue(), 5.0);
  EXPECT_EQ(summary["active_count"].asInt64(), 2);
  EXPECT_EQ(summary["num_messages"].asInt64(), 1);
}

TEST_F(SummaryWorker, KeysComeInTheirOrder) {
  const auto session = makeSession();
  session->setClientProcessName("player");
  session->start();
  std::string order;
  for (const auto& entry : summaryOf(session)) {
    order += std::string(entry.key.text()) + " ";
  }
  EXPECT_EQ(order,
            "total_active_time active_count overload_count average_active_time num_messages num_unique_messages "
            "num_redundant_messages singleMessageSession summaryServiceName HostApplicationDisplayID "
            "clientProcessName thermal_state low_power_enabled vmInfo_phys_footprint_MiB load_avg_1_min "
            "load_avg_5_min load_avg_15_min invalid_timestamp tarnreporting_timestamp audiotag ");
}

TEST_F(SummaryWorker, SummaryIsThisDictionary) {
  platform_.processFacts.setThermalState(platform::ThermalState::Fair);
  platform_.processFacts.setPhysicalFootprint(std::uint64_t{7} << 20U);
  platform_.processFacts.setLoadAverages({0.5, 1.5, 2.5});
  const auto session = makeSession();
  session->setServiceType(AudioServiceType::Haptics);
  session->setClientProcessName("player");
  const plist::Dictionary configuration{{"HostApplicationDisplayID", "com.example.player"}};
  session->updateConfigurationWithContentsOfConfiguration(&configuration);
  session->start();
  session->sendMessage(message({{"session_duration", 3}}));
  session->sendMessage(message({{"session_duration", 2}}));
  const plist::Dictionary summary = summaryOf(session);
  EXPECT_EQ(summary, (plist::Dictionary{{"total_active_time", 5.0},
                                        {"active_count", 2},
                                        {"overload_count", 0},
                                        {"average_active_time", 2.5},
                                        {"num_messages", 2},
                                        {"num_unique_messages", 4},
                                        {"num_redundant_messages", -2},
                                        {"singleMessageSession", false},
                                        {"summaryServiceName", "haptics"},
                                        {"HostApplicationDisplayID", "com.example.player"},
                                        {"clientProcessName", "player"},
                                        {"thermal_state", "Fair"},
                                        {"low_power_enabled", false},
                                        {"vmInfo_phys_footprint_MiB", 7},
                                        {"load_avg_1_min", 0.5},
                                        {"load_avg_5_min", 1.5},
                                        {"load_avg_15_min", 2.5},
                                        {"invalid_timestamp", "nil"},
                                        {"tarnreporting_timestamp", now()},
                                        {"audiotag", "Session_GenericSummary"}}));
  EXPECT_EQ(summary["singleMessageSession"].kind(), plist::Kind::Bool);
  EXPECT_EQ(summary["total_active_time"].kind(), plist::Kind::Double);
}

TEST_F(SummaryWorker, MachineFactsComeFromThePlatform) {
  platform_.processFacts.setThermalState(platform::ThermalState::Serious);
  platform_.processFacts.setLowPowerModeEnabled(true);
  platform_.processFacts.setPhysicalFootprint((std::uint64_t{5} << 20U) + 1048575);
  platform_.processFacts.setLoadAverages({0.5, 1.5, 2.5});
  const auto session = makeSession();
  session->start();
  const plist::Dictionary summary = summaryOf(session);
  EXPECT_EQ(summary["thermal_state"].text(), "Serious");
  EXPECT_EQ(summary["low_power_enabled"].kind(), plist::Kind::Bool);
  EXPECT_TRUE(summary["low_power_enabled"].asBool());
  EXPECT_EQ(summary["vmInfo_phys_footprint_MiB"].asInt64(), 5);
  EXPECT_EQ(summary["load_avg_15_min"].doubleValue(), 2.5);
  EXPECT_FALSE(summary.contains("clientProcessName"));
}

TEST_F(SummaryWorker, ThermalStatesHaveTheirNamesAndAnythingElseIsUnknown) {
  const auto session = makeSession();
  for (const auto& [state, name] :
       {std::pair{0, "Nominal"}, {1, "Fair"}, {2, "Serious"}, {3, "Critical"}, {4, "Unknown"}, {-1, "Unknown"}}) {
    platform_.processFacts.setThermalState(static_cast<platform::ThermalState>(state));
    session->start();
    EXPECT_EQ(summaryOf(session)["thermal_state"].text(), name);
  }
}

TEST_F(SummaryWorker, StopSendsNothingOnceItsSessionIsGone) {
  TarnReportingSessionSummaryWorker worker{std::weak_ptr<TarnReportingSession>()};
  worker.stop();
  EXPECT_TRUE(platform_.log.entries().empty());
}

TEST_F(SummaryWorker, FailedFootprintQueryIsLoggedAndLeftOut) {
  platform_.processFacts.failPhysicalFootprint("no such task");
  const auto session = makeSession();
  session->start();
  EXPECT_FALSE(summaryOf(session).contains("vmInfo_phys_footprint_MiB"));
  ASSERT_TRUE(platform_.log.contains(LogLevel::Error, "Error with task_info(): no such task"));
  EXPECT_EQ(platform_.log.entries(LogLevel::Error)[0].category, "tarnru");
}

}  // namespace
}  // namespace tarn
