// SPDX-License-Identifier: Apache-2.0
// Settings: the defaults store, the notifications and the device properties, as a running service sees them.
#include <unistd.h>

#include <csignal>
#include <set>

#include "tests/e2e/support/ServiceFixture.h"

namespace tarn::e2e {
namespace {

class Settings : public ServiceFixture {
 protected:
};

TEST_F(Settings, ReportingIsOffWhenTheDefaultsSaySo) {
  ASSERT_EQ(ctl({"defaults", "write", "sys.oxbow.tarnkit", "disable_reporting", "true"}).status, 0);
  ASSERT_TRUE(startService());
  const auto replies = play(R"({"op":"createReportingSession","reporterID":1}
{"op":"sendMessage","reporterIDs":[1],"category":1,"type":1,"message":{}}
{"op":"reporterID","reporterID":1}
)");
  EXPECT_TRUE(replyTo(replies, 1).at("error").is_null());
  const json error = replyTo(replies, 2).at("error");
  EXPECT_EQ(error.at("domain"), "sys.oxbow.audio.reporting");
  EXPECT_EQ(error.at("code"), 1);
  EXPECT_TRUE(replyTo(replies, 2).at("result").is_null());
}

TEST_F(Settings, WhileReportingIsOffASessionStillSendsItsOwnSummaryAndAConnectionItsUptime) {
  ASSERT_EQ(ctl({"defaults", "write", "sys.oxbow.tarnkit", "disable_reporting", "true"}).status, 0);
  ASSERT_TRUE(startService());
  play(R"({"op":"createReportingSession","reporterID":1}
{"op":"setServiceType","reporterID":1,"serviceType":"longformaudio"}
{"op":"startReportingSessionForID","reporterID":1}
{"op":"sendMessage","reporterIDs":[1],"category":"Playback","type":"Start","message":{"a":1}}
{"op":"sendMessage","category":"Playback","type":"Start","message":{"a":2}}
{"op":"stopReportingSessionForID","reporterID":1}
)");
  ASSERT_EQ(stopService(SIGTERM), 0);
  std::set<std::string> kinds;
  for (const Event& event : events()) {
    kinds.insert(event.backend + " " + event.name);
  }
  EXPECT_EQ(kinds, (std::set<std::string>{"rtc createSession", "rtc flush", "rtc sendMessage",
                                          "tally sys.oxbow.longformaudio.Session_Generic.Summary",
                                          "tally sys.oxbow.tarnkit.Session_Generic.Summary",
                                          "tally sys.oxbow.tarnkit.tarnreportingclientuptime"}));
}

TEST_F(Settings, WithoutTheRecorderAllIsServedAndNothingIsWritten) {
  writeFile(directory_ / "service.toml", "[recorder]\nenabled = false\n");
  ASSERT_TRUE(startService({"--config", directory_ / "service.toml"}));
  const auto replies = play(R"({"op":"createReportingSession","reporterID":1}
{"op":"setServiceType","reporterID":1,"serviceType":"longformaudio"}
{"op":"startReportingSessionForID","reporterID":1}
{"op":"sendMessage","reporterIDs":[1],"category":"Playback","type":"Start","message":{"a":1}}
{"op":"stopReportingSessionForID","reporterID":1}
)");
  for (const json& reply : replies) {
    EXPECT_TRUE(reply.at("error").is_null()) << reply;
  }
  EXPECT_EQ(status().at("recorder_handed_over"), 0);
  EXPECT_EQ(stopService(SIGTERM), 0);
  EXPECT_NE(::access((state() + "/recorder.sqlite3").c_str(), F_OK), 0);
  const Finished listed = ctl({"events"});
  EXPECT_EQ(listed.status, 1);
}

TEST_F(Settings, AChangeOfADefaultReachesTheRunningServiceWithItsNotification) {
  ASSERT_TRUE(startService({"--log-level", "debug"}));
  ASSERT_EQ(ctl({"defaults", "write", "sys.oxbow.tarnkit", "device_name", "\"kitchen\""}).status, 0);
  ASSERT_EQ(ctl({"notify", "sys.oxbow.tarnkit.reporting"}).status, 0);
  EXPECT_TRUE(logWillSay("Updating value featureName=device_name"));
}

TEST_F(Settings, WhoCanConnectFindsTheNotificationsHeard) {
  // The recorder takes a while to open its file; a post of that time must not be missed.
  for (int round = 0; round < 10; ++round) {
    ASSERT_TRUE(startService({"--log-level", "debug"}));
    ASSERT_EQ(ctl({"notify", "sys.oxbow.homeshell.ringerstate", "--state", "1"}).status, 0);
    ASSERT_TRUE(logWillSay("Updating value featureName=ringerstate"));
    ASSERT_EQ(stopService(SIGTERM), 0);
  }
}

TEST_F(Settings, AStateWordReachesTheRunningService) {
  ASSERT_TRUE(startService({"--log-level", "debug"}));
  ASSERT_EQ(ctl({"notify", "sys.oxbow.homeshell.ringerstate", "--state", "1"}).status, 0);
  EXPECT_TRUE(logWillSay("Updating value featureName=ringerstate"));
}

TEST_F(Settings, ABrokenDefaultsFileIsLoggedReadAsEmptyAndLeftAlone) {
  const std::string path = state() + "/defaults/sys.oxbow.tarnkit.json";
  const std::string broken = "{\n  \"disable_reporting\": true,\n  oops\n";
  writeFile(path, broken);
  ASSERT_TRUE(startService());
  EXPECT_TRUE(logWillSay(path + ":3:")) << serviceLog();
  const auto replies = play(R"({"op":"createReportingSession","reporterID":1}
{"op":"sendMessage","reporterIDs":[1],"category":1,"type":1,"message":{}}
)");
  EXPECT_TRUE(replyTo(replies, 2).at("error").is_null());
  EXPECT_EQ(contentOf(path), broken);
  EXPECT_EQ(ctl({"defaults", "read", "sys.oxbow.tarnkit"}).status, 65);
  EXPECT_EQ(ctl({"defaults", "write", "sys.oxbow.tarnkit", "a", "1"}).status, 65);
  EXPECT_EQ(contentOf(path), broken);
}

TEST_F(Settings, AnInternalBuildAnswersTheStartOfATestSessionAtOnce) {
  writeFile(directory_ / "device.json", "{\"InternalBuild\": true}");
  ASSERT_TRUE(startService({"--device-properties", directory_ / "device.json"}));
  const auto replies = play(R"({"op":"createReportingSession","reporterID":1}
{"op":"setServiceType","reporterID":1,"serviceType":"test"}
{"op":"startReportingSessionForID","reporterID":1}
{"op":"getAllReporters"}
)");
  EXPECT_EQ(replyTo(replies, 3).value("result", json()), true);
}

TEST_F(Settings, DefaultsAreReadWrittenAndDeleted) {
  EXPECT_EQ(ctl({"defaults", "write", "org.example", "list", R"([1, 2.5, {"$date": 7}, {"$data": "CgsM"}])"}).status,
            0);
  const Finished read = ctl({"defaults", "read", "org.example", "list"});
  EXPECT_EQ(read.status, 0);
  EXPECT_EQ(json::parse(read.output), json::parse(R"([1, 2.5, {"$date": 7}, {"$data": "CgsM"}])"));
  EXPECT_EQ(ctl({"defaults", "write", "org.example", "other", "-5"}).status, 0);
  EXPECT_EQ(json::parse(ctl({"defaults", "read", "org.example"}).output).at("other"), -5);
  EXPECT_EQ(ctl({"defaults", "delete", "org.example", "list"}).status, 0);
  const Finished gone = ctl({"defaults", "read", "org.example", "list"});
  EXPECT_EQ(gone.status, 1);
  EXPECT_EQ(gone.output, "");
  EXPECT_NE(gone.complaints.find("list"), std::string::npos);
  EXPECT_EQ(ctl({"defaults", "write", "org.example", "bad", "{\"a\":1,\"a\":2}"}).status, 65);
}

TEST_F(Settings, NotifyKeepsTheStateWordUnlessOneIsGiven) {
  const std::string path = state() + "/notifications/org.example.n";
  const auto word = [&path] { return contentOf(path); };
  EXPECT_EQ(ctl({"notify", "org.example.n"}).status, 0);
  EXPECT_EQ(word(), std::string(8, '\0'));
  EXPECT_EQ(ctl({"notify", "org.example.n", "--state", "258"}).status, 0);
  EXPECT_EQ(word(), std::string("\x02\x01\0\0\0\0\0\0", 8));
  EXPECT_EQ(ctl({"notify", "org.example.n"}).status, 0);
  EXPECT_EQ(word(), std::string("\x02\x01\0\0\0\0\0\0", 8));
  EXPECT_EQ(ctl({"notify", "org.example.n", "--state", "-1"}).status, 64);
  EXPECT_EQ(ctl({"notify", "org.example.n", "--state", "x"}).status, 64);
}

// A session that runs while settings change, and what the recorder has of them.
class SettingsInASession : public ServiceFixture {
 protected:
  void SetUp() override {
    ASSERT_TRUE(startService({"--log-level", "debug"}));
    client_ = connect();
    ASSERT_TRUE(client_->call(client::createReportingSession(1)).ok());
    startSession();
  }
  void startSession() {
    ASSERT_EQ(client_->send(client::startReportingSessionForID(1)), client::SendStatus::Sent);
    ASSERT_TRUE(client_->call(client::getAllReporters()).ok());  // so the session has started
  }
  // What came for settings, once there are so many and nothing is under way any more.
  std::vector<json> settings(std::size_t count) {
    eventsOnceThereAre(count, kSettings);
    ledgerAtRest();
    std::vector<json> payloads;
    for (const Event& event : events(kSettings)) {
      payloads.push_back(event.payload);
    }
    return payloads;
  }

  static constexpr const char* kSettings = "sys.oxbow.tarnkit.Setup.Setup";
  std::unique_ptr<client::ClientConnection> client_;
};

TEST_F(SettingsInASession, AChangedDefaultArrivesAsExactlyOneMessage) {
  ASSERT_EQ(ctl({"defaults", "write", "sys.oxbow.tarnkit", "device_name", "\"kitchen\""}).status, 0);
  ASSERT_EQ(ctl({"notify", "sys.oxbow.tarnkit.reporting"}).status, 0);
  const auto payloads = settings(1);
  ASSERT_EQ(payloads.size(), 1U);
  json payload = payloads[0];
  EXPECT_LE(payload.at("last_updated"), payload.at("tarnreporting_timestamp"));
  EXPECT_GT(payload.at("last_updated"), 1.7e9);
  payload.erase("last_updated");
  payload.erase("tarnreporting_timestamp");
  EXPECT_EQ(payload, (json{{"device_name", "kitchen"},
                           {"invalid_timestamp", "nil"},
                           {"audiotag", "SetupSetup"},
                           {"HostApplicationDisplayID", "Unknown"}}));
}

TEST_F(SettingsInASession, ANotifiedStateArrivesAsExactlyOneMessage) {
  ASSERT_EQ(ctl({"notify", "sys.oxbow.homeshell.ringerstate", "--state", "1"}).status, 0);
  const auto payloads = settings(1);
  ASSERT_EQ(payloads.size(), 1U);
  EXPECT_EQ(payloads[0].at("ringerstate"), true);
  EXPECT_GT(payloads[0].at("last_updated"), 1.7e9);
  EXPECT_FALSE(payloads[0].contains("systemuptime_sec"));
}

TEST_F(SettingsInASession, ANotificationWithoutAChangeBringsNoMessage) {
  for (int round = 0; round < 2; ++round) {
    ASSERT_EQ(ctl({"notify", "sys.oxbow.homeshell.ringerstate", "--state", "1"}).status, 0);
    ASSERT_TRUE(eventually([&] {
      const std::string log = serviceLog();
      const auto first = log.find("feature changes featureName=ringerstate");
      return first != std::string::npos &&
             (round == 0 || log.find("feature changes featureName=ringerstate", first + 1) != std::string::npos);
    }));
  }
  EXPECT_EQ(settings(1).size(), 1U);
}

TEST_F(SettingsInASession, AStoppedSessionHearsOfNoSetting) {
  ASSERT_TRUE(client_->call(client::stopReportingSessionForID(1)).ok());
  ASSERT_EQ(ctl({"notify", "sys.oxbow.homeshell.ringerstate", "--state", "1"}).status, 0);
  ASSERT_TRUE(logWillSay("Updating value featureName=ringerstate"));
  EXPECT_TRUE(settings(0).empty());
}

TEST_F(SettingsInASession, ASecondStartBringsTheSettingsThatAreKnown) {
  ASSERT_TRUE(client_->call(client::stopReportingSessionForID(1)).ok());
  ASSERT_EQ(ctl({"notify", "sys.oxbow.homeshell.ringerstate", "--state", "2"}).status, 0);
  ASSERT_TRUE(logWillSay("Updating value featureName=ringerstate"));
  startSession();
  const auto payloads = settings(1);
  ASSERT_EQ(payloads.size(), 1U);
  EXPECT_EQ(payloads[0].at("ringerstate"), false);
}

}  // namespace
}  // namespace tarn::e2e
