// SPDX-License-Identifier: Apache-2.0
// Issue and haptics messages on their way through the real service into the metric service's and the power log's rows.
#include <algorithm>

#include "tests/e2e/support/ServiceFixture.h"

namespace tarn::e2e {
namespace {

class Metrics : public ServiceFixture {
 protected:
  // The rows of one back-end, in the order of their hand-over, once everything was committed.
  std::vector<Event> rowsOf(const std::string& backend) {
    ledgerAtRest();
    std::vector<Event> rows;
    for (Event& event : events()) {
      if (event.backend == backend) {
        rows.push_back(std::move(event));
      }
    }
    return rows;
  }
  std::size_t errorLines(const std::string& category, const std::string& text) const {
    const std::string log = serviceLog();
    std::size_t count = 0;
    for (std::size_t at = 0; at < log.size();) {
      const std::size_t end = std::min(log.find('\n', at), log.size());
      const std::string line = log.substr(at, end - at);
      count += line.find(" error " + category) != std::string::npos && line.ends_with(text) ? 1U : 0U;
      at = end + 1;
    }
    return count;
  }
};

TEST_F(Metrics, AnIssueMessageBecomesOneMetricWithItsBytes) {
  ASSERT_TRUE(startService());
  play(R"({"op":"createReportingSession","reporterID":11}
{"op":"sendMessage","reporterIDs":[11],"category":"Playback","type":"IssueDetector","message":{"issue_type":"Silence","node":3,"rtaid_client":"org.example.music","any_channel_silence_seconds":2.9}}
{"op":"sendMessage","reporterIDs":[11],"category":"Playback","type":"Start","message":{"issue_type":"Silence"}}
)");
  const auto rows = rowsOf("pylon");
  ASSERT_EQ(rows.size(), 1U) << serviceLog();
  EXPECT_EQ(rows[0].name, "5963779");
  EXPECT_EQ(rows[0].payload, json::parse(R"({"duration":2,"issuetype":"Silence","node":"3",
                                             "rtaidclient":"org.example.music"})"));
  EXPECT_EQ(rows[0].detail,
            json::parse(R"({"wire":"10021a0753696c656e63652201332a116f72672e6578616d706c652e6d75736963"})"));
  EXPECT_FALSE(logSays("for AudioIssueDetected"));
}

TEST_F(Metrics, AnIssueMessageThatSaysNothingBecomesAnEmptyMetricAndFourErrorLines) {
  ASSERT_TRUE(startService());
  play("{\"op\":\"sendMessage\",\"category\":\"Error\",\"type\":\"IssueDetector\",\"message\":{}}\n");  // no session
  const auto rows = rowsOf("pylon");
  ASSERT_EQ(rows.size(), 1U) << serviceLog();
  EXPECT_EQ(rows[0].payload, json::parse(R"({"duration":0,"issuetype":"","node":"","rtaidclient":""})"));
  EXPECT_EQ(rows[0].detail, json::parse(R"({"wire":"10001a0022002a00"})"));
  for (const char* key : {"issue_type", "rtaid_client", "node", "any_channel_silence_seconds"}) {
    EXPECT_EQ(errorLines("tarnra", std::string(" Failed to get ") + key + " for AudioIssueDetected"), 1U) << key;
  }
}

TEST_F(Metrics, IssueValuesOfEveryKindAreTaken) {
  ASSERT_TRUE(startService());
  play(
      R"({"op":"sendMessage","category":1,"type":7,"message":{"issue_type":{"a":[1]},"node":{"$date":0},"rtaid_client":{"$data":"Chs="},"any_channel_silence_seconds":"5 s"}}
{"op":"sendMessage","category":1,"type":7,"message":{"issue_type":true,"node":[1,"x"],"rtaid_client":2.5,"any_channel_silence_seconds":{"a":1}}}
)");
  const auto rows = rowsOf("pylon");
  ASSERT_EQ(rows.size(), 2U) << serviceLog();
  EXPECT_EQ(rows[0].payload, json::parse(R"({"duration":5,"issuetype":"{a = (1)}","node":"1970-01-01 00:00:00 +0000",
                                             "rtaidclient":"<0a1b>"})"));
  EXPECT_EQ(rows[1].payload, json::parse(R"_({"duration":0,"issuetype":"1","node":"(1, x)","rtaidclient":"2.5"
})_"));
}

TEST_F(Metrics, HapticsMessagesBecomePowerLogEvents) {
  ASSERT_TRUE(startService());
  play(R"({"op":"createReportingSession","reporterID":12}
{"op":"setServiceType","reporterID":12,"serviceType":"haptics"}
{"op":"setConfiguration","reporterID":12,"configuration":{"KvHostApplicationDisplayID":"org.example.game"}}
{"op":"startReportingSessionForID","reporterID":12}
{"op":"sendMessage","reporterIDs":[12],"category":"Generic","type":"Wattlog","message":{"EngineState":"EngineOn"}}
{"op":"sendMessage","reporterIDs":[12],"category":"Generic","type":"Wattlog","message":{"EngineState":"EngineOff","EngineOnTime":0.25,"Haptic_Active_Hardware_Time_Seconds":61,"Active_Clients":["one"]}}
{"op":"sendMessage","reporterIDs":[12],"category":"Generic","type":"Generic","message":{"EngineState":"EngineOn"}}
{"op":"stopReportingSessionForID","reporterID":12}
)");
  const auto rows = rowsOf("wattlog");
  ASSERT_EQ(names(rows), (std::vector<std::string>{"Loom_Haptics_ClientStatus", "Loom_Haptics_EngineOnDuration",
                                                   "Loom_Haptics_ClientStatus", "LeakedHapticsSessionInfo"}));
  for (const Event& row : rows) {
    EXPECT_EQ(row.detail, json::parse(R"({"agent":28})"));
  }
  EXPECT_EQ(rows[0].payload.at("Status"), 1);
  EXPECT_EQ(rows[0].payload.at("ApplicationName"), "org.example.game");
  EXPECT_EQ(rows[1].payload.at("EngineOnDuration"), 0.25);
  EXPECT_EQ(rows[1].payload.at("ApplicationName"), "org.example.game");
  EXPECT_GT(rows[1].payload.at("TimestampEnd"), 1.7e9);
  EXPECT_EQ(rows[2].payload.at("Status"), 0);
  EXPECT_EQ(rows[2].payload.at("TimestampEnd"), rows[1].payload.at("TimestampEnd"));
  EXPECT_EQ(rows[3].payload, json::parse(R"({"Haptic_Active_Hardware_Time_Seconds":61,"Active_Clients":["one"]})"));
}

TEST_F(Metrics, HapticsOfNobodyInParticularKeepTheAsymmetry) {
  ASSERT_TRUE(startService());
  play(
      R"({"op":"sendMessage","category":"Generic","type":"Wattlog","message":{"EngineOnTime":1,"EngineState":"engineon"}}
)");
  const auto rows = rowsOf("wattlog");
  ASSERT_EQ(rows.size(), 2U) << serviceLog();
  EXPECT_FALSE(rows[0].payload.contains("ApplicationName"));
  EXPECT_EQ(rows[1].payload.at("ApplicationName"), "Unknown");
  EXPECT_EQ(rows[1].payload.at("Status"), 0);
  EXPECT_EQ(errorLines("tarnrp", " failed to get app name for wattlog"), 1U);
}

TEST_F(Metrics, AnInternalBuildReportsTheSame) {
  writeFile(directory_ / "device.json", R"({"InternalBuild": true, "haptics": true})");
  ASSERT_TRUE(startService({"--device-properties", directory_ / "device.json"}));
  play(R"({"op":"sendMessage","category":"Generic","type":"Wattlog","message":{"EngineState":"EngineOn"}}
{"op":"sendMessage","category":"Generic","type":"IssueDetector","message":{"node":"n"}}
)");
  EXPECT_EQ(rowsOf("wattlog").size(), 1U);
  EXPECT_EQ(rowsOf("pylon").size(), 1U);
}

}  // namespace
}  // namespace tarn::e2e
