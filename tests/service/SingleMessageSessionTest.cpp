// SPDX-License-Identifier: Apache-2.0
// The session of the service's own, for messages that come while nothing runs.
#include "tests/service/ServiceFixture.h"

namespace tarn {
namespace {

using namespace testing;
using namespace std::chrono_literals;

// Writes the configuration that it finds when its session starts, and applies to none.
struct ConfigurationTeller : TarnReportingSessionWorkerProtocol {
  static constexpr std::string_view kClassName = "ConfigurationTeller";
  static std::unique_ptr<ConfigurationTeller> initWithSession(const std::shared_ptr<TarnReportingSession>& session) {
    TarnReportingLog(TarnReportingSessionCategory(), LogLevel::Default, kClassName, "found %@",
                     session->configuration());
    return nullptr;
  }
  static bool handleSingleMessageSession() { return true; }
};
constexpr TarnReportingSessionWorkerClass kTellers[] = {TarnReportingSessionWorkerClass::of<ConfigurationTeller>()};

class SingleMessageSession : public ServiceFixture {
 protected:
  // Uses the session and returns it.
  std::shared_ptr<TarnReportingSession> use() {
    const auto sessions = service_->findReportingSessionsForIDs(std::nullopt);
    EXPECT_EQ(sessions.size(), 1U);
    return sessions.at(0);
  }
  std::vector<std::string> workerNames() {
    std::vector<std::string> names;
    for (const auto& member : use()->workers().messageWorkers()) {
      names.emplace_back(member.workerClass->name);
    }
    return names;
  }
  bool lives() const { return service_->sessionCount() == 1; }
};

TEST_F(SingleMessageSession, IsARunningStandaloneSessionOfTheServicesOwnProcess) {
  const auto session = use();
  EXPECT_EQ(session->reporterID(), 1);
  EXPECT_EQ(session->processIdentifiers(), std::vector<std::int32_t>{platform_.processFacts.ownProcessIdentifier()});
  EXPECT_TRUE(session->isSingleMessageSession());
  EXPECT_TRUE(session->started());
  EXPECT_EQ(session->serviceType(), AudioServiceType::Standalone);
  EXPECT_EQ(session->configuration(), (plist::Dictionary{{"HostApplicationDisplayID", "Unknown"}}));
  EXPECT_EQ(session->clientProcessName(), "");
}

TEST_F(SingleMessageSession, IsTypedAndConfiguredBeforeItStarts) {
  use();
  std::vector<std::string> order;
  for (const std::string& message : platform_.log.messages()) {
    if (message.starts_with("setting service type") || message.starts_with("start called")) {
      order.push_back(message);
    }
  }
  EXPECT_EQ(order, (std::vector<std::string>{"setting service type standalone", "start called. reporterID=1"}));
}

TEST_F(SingleMessageSession, IsConfiguredWhenItsWorkersStart) {
  TarnReportingSession::setAllWorkerClasses(kTellers);
  use();
  EXPECT_TRUE(platform_.log.contains("found {HostApplicationDisplayID = Unknown}"));
}

TEST_F(SingleMessageSession, IsInNoClientsListAndFoundUnderNoID) {
  use();
  EXPECT_TRUE(service_->getAllActiveReportingSessions().empty());
  EXPECT_EQ(service_->findReportingSessionForID(1), nullptr);
}

TEST_F(SingleMessageSession, IdleForExactlyTheTimeOutGoesOn) {
  use();
  platform_.advance(1us);
  use();
  platform_.advance(5s);  // the first check
  EXPECT_TRUE(lives());
  EXPECT_EQ(platform_.log.messages().back(),
            "Not stopping singleMessageSession timeSinceLastUsed=5.000000 timeout=5.000000");
}

TEST_F(SingleMessageSession, LaterChecksComeATimeOutApartWithoutTheMicrosecond) {
  use();
  platform_.advance(2us);
  use();
  platform_.advance(5s - 1us);  // the first check, at 5.000001 s
  ASSERT_EQ(platform_.log.count("Not stopping singleMessageSession"), 1U);
  platform_.advance(5s - 1ns);
  EXPECT_TRUE(lives());
  platform_.advance(1ns);  // the second, at 10.000001 s
  EXPECT_FALSE(lives());
}

TEST_F(SingleMessageSession, ChecksGoOnForAsLongAsItIsUsed) {
  use();
  for (int i = 0; i < 10; ++i) {
    platform_.advance(4s);
    use();
  }
  EXPECT_EQ(platform_.log.count("Not stopping singleMessageSession"), 7U);  // one in 5 s
  EXPECT_EQ(platform_.log.count("Creating singleMessageSession"), 1U);
  platform_.advance(10s + 1us);
  EXPECT_FALSE(lives());
  platform_.log.clear();
  platform_.advance(60s);
  EXPECT_EQ(platform_.log.count("singleMessageSession timeSinceLastUsed"), 0U);  // nothing is checked any more
}

TEST_F(SingleMessageSession, IsStoppedAndNotJustDropped) {
  const auto session = use();
  platform_.advance(6s);
  EXPECT_FALSE(session->started());
  EXPECT_NE(use(), session);
}

TEST_F(SingleMessageSession, ItsStopIsTheLastCheck) {
  use();
  platform_.advance(6s);
  EXPECT_EQ(platform_.log.count("Stopping singleMessageSession"), 1U);
  EXPECT_FALSE(platform_.log.contains("Not stopping singleMessageSession"));
}

TEST_F(SingleMessageSession, HoldsOnlyTheWorkersThatAcceptIt) {
  EXPECT_EQ(workerNames(),
            (std::vector<std::string>{"TarnReportingSessionTallyWorker", "TarnReportingSessionWattlogWorker",
                                      "TarnReportingSessionPylonWorker", "TarnReportingSessionRtcWorker"}));
}

TEST_F(SingleMessageSession, HoldsOnlyTheWorkersThatAcceptItOnAnInternalBuildToo) {
  platform_.deviceProperties.set("InternalBuild", true);
  EXPECT_EQ(workerNames(),
            (std::vector<std::string>{"TarnReportingSessionTallyWorker", "TarnReportingSessionWattlogWorker",
                                      "TarnReportingSessionPylonWorker", "TarnReportingSessionSnareWorker",
                                      "TarnReportingSessionRtcWorker"}));
  for (const char* skipped : {"Trace", "Summary", "MemoryLog", "VolumeMessages", "DriverSnapshot", "SystemMonitor",
                              "SummaryJsonFile", "DP", "AudioRegistration", "InputMessages", "LagoonMessages"}) {
    EXPECT_TRUE(platform_.log.contains(
        LogLevel::Debug, "action=skipped worker=TarnReportingSession" + std::string(skipped) + "Worker reporterID=1"))
        << skipped;
  }
}

}  // namespace
}  // namespace tarn
