// SPDX-License-Identifier: Apache-2.0
// What becomes of a client's sessions when its connection ends, and of everybody else's.
#include <csignal>

#include "tests/e2e/support/ServiceFixture.h"

namespace tarn::e2e {
namespace {

constexpr const char* kSummary = "sys.oxbow.tarnkit.Session_Generic.Summary";
constexpr const char* kUptime = "sys.oxbow.tarnkit.tarnreportingclientuptime";

class Connections : public ServiceFixture {
 protected:
  void SetUp() override { ASSERT_TRUE(startService()); }
};

TEST_F(Connections, TheEndOfAConnectionStopsItsSessions) {
  play(R"({"op":"createReportingSession","reporterID":1}
{"op":"startReportingSessionForID","reporterID":1}
{"op":"createReportingSession","reporterID":2}
{"op":"startReportingSessionForID","reporterID":2}
{"op":"createReportingSession","reporterID":3}
)");
  EXPECT_EQ(eventsOnceThereAre(2, kSummary).size(), 2U);  // the third was never started
  EXPECT_EQ(ctl({"reporters"}).output, "");
}

TEST_F(Connections, AKilledClientsSessionsAreStoppedToo) {
  const auto client = startCtl({"run"}, R"({"op":"createReportingSession","reporterID":1}
{"op":"startReportingSessionForID","reporterID":1}
{"op":"sendMessage","reporterIDs":[1],"category":"IO","type":"Stop","message":{"session_duration":4}}
{"op":"sleep","seconds":60}
)");
  ASSERT_TRUE(eventually([&] { return jsonLines(client->output()).size() == 2; }));
  client->signal(SIGKILL);
  const auto summaries = eventsOnceThereAre(1, kSummary);
  ASSERT_EQ(summaries.size(), 1U);
  EXPECT_EQ(summaries[0].payload.at("total_active_time"), 4.0);
}

TEST_F(Connections, OtherClientsSessionsLiveOn) {
  const auto other = connect();
  ASSERT_TRUE(other->call(client::createReportingSession(2)).ok());
  ASSERT_EQ(other->send(client::startReportingSessionForID(2)), client::SendStatus::Sent);
  play(
      "{\"op\":\"createReportingSession\",\"reporterID\":1}\n{\"op\":\"startReportingSessionForID\",\"reporterID\":1}"
      "\n");
  EXPECT_EQ(eventsOnceThereAre(1, kSummary).size(), 1U);
  ASSERT_TRUE(other->call(client::sendMessage({{"a", 1}}, 4, 1, std::vector<std::int64_t>{2})).ok());
  EXPECT_EQ(eventsOnceThereAre(1, "sys.oxbow.tarnkit.Playback.Start").size(), 1U);
}

TEST_F(Connections, TheClientsUptimeIsRecorded) {
  play("{\"op\":\"getAllReporters\"}\n{\"op\":\"sleep\",\"seconds\":1.05}\n");
  std::vector<Event> found;
  ASSERT_TRUE(eventually([&] {
    found = events(kUptime);
    std::erase_if(found, [](const Event& event) { return event.payload.at("processName") != "tarnreportingctl"; });
    return !found.empty();
  }));
  EXPECT_EQ(found.size(), 1U);
  EXPECT_GE(found[0].payload.at("seconds"), 1);
  EXPECT_LE(found[0].payload.at("seconds"), 8);
  EXPECT_EQ(found[0].payload.size(), 2U);
}

TEST_F(Connections, ADisconnectEndsOneConnectionOfAScriptOnly) {
  const auto replies = play(R"({"op":"createReportingSession","client":"a","reporterID":1}
{"op":"createReportingSession","client":"b","reporterID":2}
{"op":"disconnect","client":"a"}
{"op":"sleep","seconds":0.2}
{"op":"getAllReporters","client":"b"}
{"op":"getAllReporters","client":"a"}
)");
  EXPECT_EQ(replyTo(replies, 5).at("result"), json::array({2}));
  EXPECT_EQ(replyTo(replies, 6).at("result"), json::array({2}));
}

TEST_F(Connections, HundredsOfConnectionsCostNobodyTheirTurn) {
  std::vector<std::unique_ptr<client::ClientConnection>> crowd;
  for (int index = 0; index < 500; ++index) {
    crowd.push_back(connect());
    ASSERT_TRUE(crowd.back());
  }
  const auto replies = play("{\"op\":\"createReportingSession\",\"reporterID\":1}\n{\"op\":\"getAllReporters\"}\n");
  EXPECT_EQ(replyTo(replies, 2).at("result"), json::array({1}));
  EXPECT_TRUE(eventually([&] { return status().at("connections_open") >= 501; }));
  crowd.clear();
  EXPECT_TRUE(eventually([&] { return status().at("connections_open") == 1; }));
}

}  // namespace
}  // namespace tarn::e2e
