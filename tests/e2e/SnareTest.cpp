// SPDX-License-Identifier: Apache-2.0
// Bug captures that a running service asks for, on internal builds and on others.
#include <csignal>
#include <regex>

#include "tests/e2e/support/ServiceFixture.h"

namespace tarn::e2e {
namespace {

class Snare : public ServiceFixture {
 protected:
  bool startOn(const std::string& deviceProperties, std::vector<std::string> options = {}) {
    writeFile(directory_ / "device.json", deviceProperties);
    options.insert(options.end(), {"--device-properties", directory_ / "device.json", "--log-level", "info"});
    return startService(options);
  }
  // A client with a session that runs.
  void startSession(std::int64_t reporterID, std::uint16_t type) {
    if (!client_) {
      client_ = connect();
    }
    ASSERT_TRUE(client_->call(client::createReportingSession(reporterID)).ok());
    ASSERT_TRUE(client_->call(client::setServiceType(type, reporterID)).ok());
    ASSERT_EQ(client_->send(client::startReportingSessionForID(reporterID)), client::SendStatus::Sent);
  }
  void send(std::int64_t reporterID, std::uint32_t category, std::uint16_t type, const plist::Dictionary& message) {
    ASSERT_TRUE(
        client_->call(client::sendMessage(message, category, type, std::vector<std::int64_t>{reporterID})).ok());
  }
  void sendHapticLeak(std::int64_t reporterID, int n) {
    send(reporterID, kPlayback, kWattlog, {{"Haptic_Active_Hardware_Time_Seconds", 90}, {"n", n}});
  }
  void sendStuckSound(std::int64_t reporterID, int n) {
    send(reporterID, kPlayback, kWattlog, {{"System_Sound_Stuck_Time_Seconds", 30}, {"n", n}});
  }
  void sendLowRms(std::int64_t reporterID, int count) {
    for (int n = 0; n < count; ++n) {
      send(reporterID, kError, kIssueDetector, {{"issue_type", "LowRMS"}, {"n", n}});
    }
  }
  // What the capture service got, once nothing is under way any more.
  std::vector<Event> captures() {
    ledgerAtRest();
    std::vector<Event> found;
    for (Event& event : events()) {
      if (event.backend == "snare") {
        found.push_back(std::move(event));
      }
    }
    return found;
  }
  json expectedSignature(const std::string& type, const std::string& subType, const std::string& context,
                         const std::string& process) {
    return {{"domain", "AudioAnalytics"},
            {"type", type},
            {"subType", subType},
            {"subTypeContext", context},
            {"detectedProcess", process}};
  }
  json processes() const {
    return {{"diagnosticExtensionParameters",
             {{"sys.oxbow.WattlogCore.VetchSysLogFilterProcess", {{"processIDs", json::array({::getpid()})}}}}}};
  }

  static constexpr std::uint32_t kPlayback = 4;
  static constexpr std::uint32_t kError = 11;
  static constexpr std::uint16_t kWattlog = 8;
  static constexpr std::uint16_t kIssueDetector = 7;
  static constexpr std::uint16_t kHaptics = 3;
  static constexpr std::uint16_t kAlarms = 4;
  static constexpr std::uint16_t kTest = 11;
  static constexpr std::uint16_t kSystemSounds = 13;
  static constexpr const char* kInternal = R"({"InternalBuild": true, "haptics": true})";

  std::unique_ptr<client::ClientConnection> client_;
};

TEST_F(Snare, LeakedHapticsOfTwoSessionsMakeASnapshot) {
  ASSERT_TRUE(startOn(kInternal));
  startSession(1, kHaptics);
  startSession(2, kHaptics);
  sendHapticLeak(1, 1);
  sendHapticLeak(2, 2);
  const auto found = captures();
  ASSERT_EQ(found.size(), 1U);
  EXPECT_EQ(found[0].name, "requestSnapshot");
  EXPECT_EQ(found[0].payload, processes());
  EXPECT_EQ(found[0].detail,
            (json{{"signature", expectedSignature("haptics", "Playback", "Wattlog", "Unknown")}, {"duration", 0.0}}));
  EXPECT_TRUE(logWillSay("Parameters to Snare session accepted."));
  EXPECT_TRUE(logWillSay("Started Snare session for haptics leaks. sessionId="));
}

TEST_F(Snare, StuckSystemSoundsMakeOneSnapshotInFifteenSeconds) {
  ASSERT_TRUE(startOn(R"({"InternalBuild": true})"));
  startSession(1, kSystemSounds);
  sendStuckSound(1, 1);
  sendStuckSound(1, 2);
  const auto found = captures();
  ASSERT_EQ(found.size(), 1U);
  EXPECT_EQ(found[0].name, "requestSnapshot");
  EXPECT_EQ(found[0].payload, processes());
  EXPECT_EQ(found[0].detail, (json{{"signature", expectedSignature("systemsounds", "Playback", "Wattlog", "Unknown")},
                                   {"duration", 0.0}}));
  EXPECT_TRUE(logWillSay("Already fired TarnReportingSnareWorkerInstanceSSSLeaks recently."));
}

TEST_F(Snare, AMessageWithoutASessionIsWatchedToo) {
  ASSERT_TRUE(startOn(R"({"InternalBuild": true})"));
  client_ = connect();
  ASSERT_TRUE(
      client_->call(client::sendMessage({{"System_Sound_Stuck_Time_Seconds", 30}}, kPlayback, kWattlog, std::nullopt))
          .ok());
  EXPECT_EQ(captures().size(), 1U);
}

TEST_F(Snare, TheCaptureOfAQuietAlarmIsCancelledAtItsStop) {
  ASSERT_TRUE(startOn(kInternal));
  startSession(1, kAlarms);
  sendLowRms(1, 4);
  const std::string started = "Started Snare session for alarm Low RMS. sessionId=";
  ASSERT_TRUE(logWillSay(started));
  const std::string log = serviceLog();
  std::smatch identifier;
  ASSERT_TRUE(std::regex_search(log, identifier, std::regex(started + "([0-9A-F-]+) timeout=60.000000 response=")));
  ASSERT_TRUE(client_->call(client::stopReportingSessionForID(1)).ok());
  const auto found = captures();
  ASSERT_EQ(found.size(), 2U);
  EXPECT_EQ(found[0].name, "startSession");
  EXPECT_EQ(found[0].payload, json::object());
  json signature = found[0].detail.at("signature");
  EXPECT_TRUE(signature.at("detectedProcess").is_string());
  EXPECT_EQ(signature, expectedSignature("alarms", "Error", "IssueDetector", signature.at("detectedProcess")));
  EXPECT_EQ(found[0].detail.at("duration"), 60.0);
  EXPECT_EQ(found[1].name, "cancelSession");
  EXPECT_EQ(found[1].payload, json::object());
  EXPECT_EQ(found[1].detail, (json{{"session", identifier[1].str()}}));
  EXPECT_TRUE(logWillSay("Stop called. Cancelling Snare session for alarm Low RMS. sessionId=" + identifier[1].str()));
}

TEST_F(Snare, ATestSessionOnlyCounts) {
  ASSERT_TRUE(startOn(kInternal));
  startSession(1, kTest);
  sendLowRms(1, 3);
  sendStuckSound(1, 1);
  EXPECT_TRUE(captures().empty());
  EXPECT_TRUE(logWillSay("Skipping actual fire, as we are running in test mode."));
}

TEST_F(Snare, WithoutHapticsNobodyLooksForLeakedOnes) {
  ASSERT_TRUE(startOn(R"({"InternalBuild": true, "haptics": false})"));
  startSession(1, kHaptics);
  sendHapticLeak(1, 1);
  sendHapticLeak(1, 2);
  EXPECT_TRUE(captures().empty());
}

TEST_F(Snare, OtherBuildsAskForNothing) {
  ASSERT_TRUE(startOn(R"({"InternalBuild": false, "haptics": true})"));
  startSession(1, kAlarms);
  sendHapticLeak(1, 1);
  sendHapticLeak(1, 2);
  sendStuckSound(1, 1);
  sendLowRms(1, 3);
  ASSERT_TRUE(client_->call(client::stopReportingSessionForID(1)).ok());
  EXPECT_TRUE(captures().empty());
  EXPECT_FALSE(logSays(" tarnrb "));
}

TEST_F(Snare, RefusesWithTheConfiguredReason) {
  writeFile(directory_ / "config.toml", "[snare]\nrefuse = \"DailyLimitExceeded\"\n");
  ASSERT_TRUE(startOn(kInternal, {"--config", directory_ / "config.toml"}));
  startSession(1, kAlarms);
  sendLowRms(1, 3);
  ASSERT_TRUE(
      logWillSay("Started Snare session for alarm Low RMS. sessionId=NONE_RETURNED timeout=60.000000 "
                 "response={success = 0; reasonCode = 6}"));
  EXPECT_TRUE(logWillSay("Failed starting snare session. reason=kAilmentErrorDailyLimitExceeded"));
  ASSERT_TRUE(client_->call(client::stopReportingSessionForID(1)).ok());
  const auto found = captures();
  ASSERT_EQ(found.size(), 2U);
  EXPECT_EQ(found[0].name, "startSession");
  EXPECT_EQ(found[1].detail, (json{{"session", "NONE_RETURNED"}}));
}

TEST_F(Snare, AReasonThatIsNoneIsAnErrorOfTheConfiguration) {
  writeFile(directory_ / "config.toml", "[snare]\nrefuse = \"TooTired\"\n");
  const Finished run = runService({"--socket", socket(), "--config", directory_ / "config.toml"});
  EXPECT_EQ(run.status, 78);
  EXPECT_EQ(run.complaints, "tarnreportingd: " + directory_ / "config.toml" +
                                ":2: \"snare.refuse\" must be the name of a reason code, or empty\n");
}

TEST_F(Snare, TheServiceEndsAsEverWhileACaptureRuns) {
  ASSERT_TRUE(startOn(kInternal));
  startSession(1, kAlarms);
  sendLowRms(1, 3);
  EXPECT_EQ(stopService(SIGTERM), 0);
  EXPECT_EQ(events("startSession").size(), 1U);
}

}  // namespace
}  // namespace tarn::e2e
