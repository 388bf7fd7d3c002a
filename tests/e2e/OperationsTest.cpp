// SPDX-License-Identifier: Apache-2.0
// What a client sees and what the recorder gets, operation by operation.
#include <algorithm>

#include "tests/e2e/support/ServiceFixture.h"

namespace tarn::e2e {
namespace {

class Operations : public ServiceFixture {
 protected:
  void SetUp() override { ASSERT_TRUE(startService()); }

  std::vector<Event> eventsOf(const std::string& application, const std::string& nameGlob) {
    std::vector<Event> found = events(nameGlob);
    std::erase_if(found, [&](const Event& event) {
      return event.payload.value("HostApplicationDisplayID", std::string()) != application;
    });
    return found;
  }
};

TEST_F(Operations, AllElevenAnswerAsTheyMust) {
  const auto replies = play(R"({"op":"createReportingSession","reporterID":7}
{"op":"setServiceType","reporterID":7,"serviceType":"haptics"}
{"op":"getServiceNameForReporterID","reporterID":7}
{"op":"setConfiguration","reporterID":7,"configuration":{"HostApplicationDisplayID":"app"}}
{"op":"startReportingSessionForID","reporterID":7}
{"op":"sendMessage","reporterIDs":[7],"category":"Playback","type":"Start","message":{"a":1}}
{"op":"reporterID","reporterID":7}
{"op":"getAllReporters"}
{"op":"stopReportingSessionForID","reporterID":7}
{"op":"destroyReportingSession","reporterID":7}
{"op":"killService"}
)");
  ASSERT_EQ(replies.size(), 10U);  // all but killService
  for (const json& reply : replies) {
    EXPECT_TRUE(reply.at("error").is_null()) << reply;
  }
  for (const std::size_t line : {1U, 2U, 4U, 5U, 9U, 10U}) {
    EXPECT_EQ(replyTo(replies, line).at("result"), true) << line;
  }
  EXPECT_EQ(replyTo(replies, 3).at("result"), 3);
  EXPECT_TRUE(replyTo(replies, 6).at("result").is_null());
  EXPECT_EQ(replyTo(replies, 7).at("result"), (json{{"reporterID", 7}, {"serviceType", 3}}));
  EXPECT_EQ(replyTo(replies, 8).at("result"), json::array({7}));
  EXPECT_EQ(service().wait(), 2);
}

TEST_F(Operations, UnknownSessionsAreAnsweredWithSuccess) {
  const auto replies = play(R"({"op":"getServiceNameForReporterID","reporterID":9}
{"op":"reporterID","reporterID":9}
{"op":"setServiceType","reporterID":9,"serviceType":1}
{"op":"setConfiguration","reporterID":9,"configuration":{}}
{"op":"stopReportingSessionForID","reporterID":9}
{"op":"destroyReportingSession","reporterID":9}
{"op":"startReportingSessionForID","reporterID":9}
{"op":"startReportingSessionForID","reporterID":0}
{"op":"sendMessage","reporterIDs":[9],"category":1,"type":1,"message":{}}
)");
  ASSERT_EQ(replies.size(), 9U);
  EXPECT_EQ(replyTo(replies, 1).at("result"), 65535);
  EXPECT_EQ(replyTo(replies, 2).at("result"), (json{{"reporterID", 0}, {"serviceType", 65535}}));
  for (const std::size_t line : {3U, 4U, 5U, 6U, 7U, 8U}) {
    EXPECT_EQ(replyTo(replies, line).at("result"), true) << line;
  }
  EXPECT_TRUE(replyTo(replies, 9).at("error").is_null());
}

TEST_F(Operations, AMessageWithoutIDsReachesTheSessionsOfBothClients) {
  play(R"({"op":"createReportingSession","client":"a","reporterID":1}
{"op":"setConfiguration","client":"a","reporterID":1,"configuration":{"HostApplicationDisplayID":"first"}}
{"op":"startReportingSessionForID","client":"a","reporterID":1}
{"op":"createReportingSession","client":"b","reporterID":2}
{"op":"setConfiguration","client":"b","reporterID":2,"configuration":{"HostApplicationDisplayID":"second"}}
{"op":"startReportingSessionForID","client":"b","reporterID":2}
{"op":"sendMessage","client":"a","category":"Volume","type":"Generic","message":{"v":1}}
)");
  eventsOnceThereAre(2, "sys.oxbow.tarnkit.Volume.Generic");
  EXPECT_EQ(eventsOf("first", "sys.oxbow.tarnkit.Volume.Generic").size(), 1U);
  EXPECT_EQ(eventsOf("second", "sys.oxbow.tarnkit.Volume.Generic").size(), 1U);
}

TEST_F(Operations, QuestionsFindTheSessionsOfOtherClients) {
  const auto replies = play(R"({"op":"createReportingSession","client":"a","reporterID":1}
{"op":"setServiceType","client":"a","reporterID":1,"serviceType":"alarms"}
{"op":"createReportingSession","client":"b","reporterID":2}
{"op":"getServiceNameForReporterID","client":"b","reporterID":1}
{"op":"reporterID","client":"b","reporterID":1}
{"op":"getAllReporters","client":"b"}
)");
  EXPECT_EQ(replyTo(replies, 4).at("result"), 4);
  EXPECT_EQ(replyTo(replies, 5).at("result"), (json{{"reporterID", 1}, {"serviceType", 4}}));
  EXPECT_EQ(replyTo(replies, 6).at("result"), json::array({1, 2}));
}

TEST_F(Operations, OnlyItsOwnClientConfiguresStopsAndDestroysASession) {
  const auto replies = play(R"({"op":"createReportingSession","client":"a","reporterID":1}
{"op":"startReportingSessionForID","client":"a","reporterID":1}
{"op":"setServiceType","client":"b","reporterID":1,"serviceType":"alarms"}
{"op":"getAllReporters","client":"b"}
{"op":"setConfiguration","client":"b","reporterID":1,"configuration":{"HostApplicationDisplayID":"stolen"}}
{"op":"stopReportingSessionForID","client":"b","reporterID":1}
{"op":"destroyReportingSession","client":"b","reporterID":1}
{"op":"reporterID","client":"b","reporterID":1}
{"op":"sendMessage","client":"b","reporterIDs":[1],"category":"Input","type":"Start","message":{}}
{"op":"stopReportingSessionForID","client":"a","reporterID":1}
)");
  EXPECT_EQ(replyTo(replies, 4).at("result"), json::array({1}));  // retyping made no session of b's own
  EXPECT_EQ(replyTo(replies, 8).at("result"), (json{{"reporterID", 1}, {"serviceType", 65535}}));
  const auto summaries = eventsOnceThereAre(1, "sys.oxbow.tarnkit.Session_Generic.Summary");
  ASSERT_EQ(summaries.size(), 1U);
  EXPECT_EQ(summaries[0].payload.at("num_messages"), 1);
  EXPECT_EQ(eventsOf("Unknown", "sys.oxbow.tarnkit.Input.Start").size(), 1U);
}

TEST_F(Operations, AStartIsAnsweredAtTheStopAndBeforeIt) {
  const auto replies = play(R"({"op":"createReportingSession","reporterID":1}
{"op":"startReportingSessionForID","reporterID":1}
{"op":"getAllReporters"}
{"op":"stopReportingSessionForID","reporterID":1}
)");
  std::vector<int> lines;
  for (const json& reply : replies) {
    lines.push_back(reply.at("line"));
  }
  EXPECT_EQ(lines, (std::vector<int>{1, 3, 2, 4}));
}

TEST_F(Operations, ASecondStartIsNeverAnswered) {
  const auto replies = play(R"({"op":"createReportingSession","reporterID":1}
{"op":"startReportingSessionForID","reporterID":1}
{"op":"startReportingSessionForID","reporterID":1}
{"op":"stopReportingSessionForID","reporterID":1}
)");
  EXPECT_EQ(replyTo(replies, 2).value("result", json()), true);
  EXPECT_TRUE(replyTo(replies, 3).is_null());
  EXPECT_EQ(replyTo(replies, 4).value("result", json()), true);
}

TEST_F(Operations, TheStartOfARetypedSessionIsNeverAnswered) {
  const auto replies = play(R"({"op":"createReportingSession","reporterID":1}
{"op":"startReportingSessionForID","reporterID":1}
{"op":"setServiceType","reporterID":1,"serviceType":"haptics"}
{"op":"stopReportingSessionForID","reporterID":1}
)");
  EXPECT_TRUE(replyTo(replies, 2).is_null());
  EXPECT_EQ(replies.size(), 3U);
  EXPECT_TRUE(events("*Summary").empty());
}

TEST_F(Operations, TheStartOfADestroyedSessionIsNeverAnsweredButItsSummaryIsSent) {
  const auto replies = play(R"({"op":"createReportingSession","reporterID":1}
{"op":"startReportingSessionForID","reporterID":1}
{"op":"destroyReportingSession","reporterID":1}
)");
  EXPECT_TRUE(replyTo(replies, 2).is_null());
  EXPECT_EQ(replies.size(), 2U);
  EXPECT_EQ(eventsOnceThereAre(1, "sys.oxbow.tarnkit.*.Summary").size(), 1U);
}

TEST_F(Operations, TheSummaryHoldsTheSessionsNumbers) {
  play(R"({"op":"createReportingSession","reporterID":1}
{"op":"setServiceType","reporterID":1,"serviceType":"longformaudio"}
{"op":"setConfiguration","reporterID":1,"configuration":{"KvHostApplicationDisplayID":"org.example.music"}}
{"op":"startReportingSessionForID","reporterID":1}
{"op":"sendMessage","reporterIDs":[1],"category":"Playback","type":"Start","message":{"a":1}}
{"op":"sendMessage","reporterIDs":[1],"category":"Playback","type":"Start","message":{"a":1}}
{"op":"sendMessage","reporterIDs":[1],"category":"Playback","type":"Stop","message":{"session_duration":2.5}}
{"op":"sendMessage","reporterIDs":[1],"category":"Playback","type":"Summary","message":{"session_duration":1.0,"issue_type":"overload"}}
{"op":"sendMessage","reporterIDs":[1],"category":"IO","type":"IssueDetector","message":{"issue_type":"overload"}}
{"op":"stopReportingSessionForID","reporterID":1}
)");
  const auto summaries = eventsOnceThereAre(2, "*.Session_Generic.Summary");
  ASSERT_EQ(summaries.size(), 2U);
  EXPECT_EQ(names(summaries), (std::vector<std::string>{"sys.oxbow.tarnkit.Session_Generic.Summary",
                                                        "sys.oxbow.longformaudio.Session_Generic.Summary"}));
  const json& summary = summaries[0].payload;
  EXPECT_EQ(summary, summaries[1].payload);
  EXPECT_EQ(summary.at("total_active_time"), 3.5);
  EXPECT_EQ(summary.at("active_count"), 2);
  EXPECT_EQ(summary.at("average_active_time"), 1.75);
  EXPECT_EQ(summary.at("overload_count"), 1);
  EXPECT_EQ(summary.at("num_messages"), 5);
  EXPECT_EQ(summary.at("num_unique_messages"), 6);
  EXPECT_EQ(summary.at("num_redundant_messages"), -1);
  EXPECT_EQ(summary.at("singleMessageSession"), false);
  EXPECT_EQ(summary.at("summaryServiceName"), "longformaudio");
  EXPECT_EQ(summary.at("HostApplicationDisplayID"), "org.example.music");
  EXPECT_EQ(summary.at("clientProcessName"), "tarnreportingctl");
  EXPECT_EQ(summary.at("audiotag"), "Session_GenericSummary");
  for (const char* key : {"thermal_state", "low_power_enabled", "vmInfo_phys_footprint_MiB", "load_avg_1_min",
                          "load_avg_5_min", "load_avg_15_min", "tarnreporting_timestamp"}) {
    EXPECT_TRUE(summary.contains(key)) << key;
  }
}

TEST_F(Operations, ARepeatedMessageIsRecordedOnceAndAnErrorEachTime) {
  play(R"({"op":"createReportingSession","reporterID":1}
{"op":"startReportingSessionForID","reporterID":1}
{"op":"sendMessage","reporterIDs":[1],"category":"Playback","type":"Start","message":{"a":1,"processuptime_ms":5}}
{"op":"sendMessage","reporterIDs":[1],"category":"Playback","type":"Start","message":{"processuptime_ms":6,"a":1.0}}
{"op":"sendMessage","reporterIDs":[1],"category":"Error","type":"Start","message":{"a":1}}
{"op":"sendMessage","reporterIDs":[1],"category":"Error","type":"Start","message":{"a":1}}
{"op":"stopReportingSessionForID","reporterID":1}
)");
  eventsOnceThereAre(1, "sys.oxbow.tarnkit.Session_Generic.Summary");
  EXPECT_EQ(events("sys.oxbow.tarnkit.Playback.Start").size(), 1U);
  EXPECT_EQ(events("sys.oxbow.tarnkit.Error.Start").size(), 2U);
}

TEST_F(Operations, APayloadArrivesCleanedAndWhole) {
  play(R"({"op":"createReportingSession","reporterID":1}
{"op":"sendMessage","reporterIDs":[1],"category":268435460,"type":"Stop","message":{"key with blanks":"v","at":{"$date":1795158000.5},"bytes":{"$data":"CgsM"},"list":[1,2.0,true],"nested":{"a b":18446744073709551615},"tarnreporting_timestamp":5}}
)");
  const auto found = eventsOnceThereAre(2, "*.DSP_Playback.Stop");
  ASSERT_EQ(found.size(), 2U);
  EXPECT_EQ(found[0].name, "sys.oxbow.tarnkit.DSP_Playback.Stop");
  EXPECT_EQ(found[1].name, "sys.oxbow.unknown.DSP_Playback.Stop");
  json payload = found[0].payload;
  EXPECT_GT(payload.at("tarnreporting_timestamp"), 1.7e9);
  payload.erase("tarnreporting_timestamp");
  EXPECT_EQ(payload, (json{{"key_with_blanks", "v"},
                           {"at", "2026-11-20T07:00:00.5Z"},
                           {"bytes", "CgsM"},
                           {"list", {1, 2.0, true}},
                           {"nested", {{"a b", 18446744073709551615U}}},
                           {"invalid_timestamp", 5},
                           {"audiotag", "DSP_PlaybackStop"},
                           {"HostApplicationDisplayID", "Unknown"}}));
}

TEST_F(Operations, AMessageWithoutAnySessionGoesToTheSingleMessageSession) {
  play(R"({"op":"sendMessage","category":"Generic","type":"Generic","message":{"a":1}}
{"op":"sendMessage","reporterIDs":[],"category":"Generic","type":"Generic","message":{"a":2}}
{"op":"sendMessage","reporterIDs":[0],"category":"Generic","type":"Generic","message":{"a":3}}
)");
  const auto found = eventsOnceThereAre(2, "sys.oxbow.standalone.Generic.Generic");
  ASSERT_EQ(found.size(), 2U);
  EXPECT_EQ(found[0].payload.at("a"), 1);
  EXPECT_EQ(found[1].payload.at("a"), 2);
}

TEST_F(Operations, ASessionCountsOnAfterARestart) {
  play(R"({"op":"createReportingSession","reporterID":1}
{"op":"startReportingSessionForID","reporterID":1}
{"op":"sendMessage","reporterIDs":[1],"category":"IO","type":"Stop","message":{"session_duration":2}}
{"op":"stopReportingSessionForID","reporterID":1}
{"op":"sendMessage","reporterIDs":[1],"category":"IO","type":"Start","message":{}}
{"op":"startReportingSessionForID","reporterID":1}
{"op":"stopReportingSessionForID","reporterID":1}
)");
  const auto summaries = eventsOnceThereAre(2, "sys.oxbow.tarnkit.*.Summary");
  ASSERT_EQ(summaries.size(), 2U);
  EXPECT_EQ(summaries[1].payload.at("total_active_time"), 2.0);
  EXPECT_EQ(summaries[1].payload.at("num_messages"), 1);  // what came between stop and start, which nobody forwards
  EXPECT_TRUE(events("*.IO.Start").empty());
}

TEST_F(Operations, SettleIsAnsweredWhenWhatItsConnectionSentIsOnTheDisk) {
  const auto client = connect();
  ASSERT_TRUE(client->call(client::createReportingSession(7)).ok());
  client->send(client::startReportingSessionForID(7));
  for (int i = 0; i < 50; ++i) {
    client->send(client::sendMessage({{"a", i}}, 4, 1, std::vector<std::int64_t>{7}));
  }
  ASSERT_TRUE(client->call(client::settle()).ok());
  EXPECT_EQ(events("sys.oxbow.tarnkit.Playback.Start").size(), 50U);
}

TEST_F(Operations, EachMessageIsInOneMemberOfTheLedger) {
  const auto client = connect();
  ASSERT_TRUE(client->call(client::createReportingSession(7)).ok());
  client->send(client::startReportingSessionForID(7));
  const auto sendTo = [&client](std::int64_t reporterID, int value) {
    client->send(client::sendMessage({{"a", value}}, 4, 1, std::vector<std::int64_t>{reporterID}));
  };
  sendTo(7, 1);
  sendTo(7, 2);
  sendTo(7, 2);
  sendTo(99, 1);
  ASSERT_TRUE(client->call(client::settle()).ok());
  const json ledger = ledgerAtRest();
  EXPECT_EQ(ledger.at("messages_received"), 4);
  EXPECT_EQ(ledger.at("messages_delivered"), 2);
  EXPECT_EQ(ledger.at("messages_redundant"), 1);
  EXPECT_EQ(ledger.at("messages_without_session"), 1);
  for (const char* empty : {"messages_unwanted", "messages_undeliverable", "messages_refused", "messages_waiting"}) {
    EXPECT_EQ(ledger.at(empty), 0) << empty;
  }
}

}  // namespace
}  // namespace tarn::e2e
