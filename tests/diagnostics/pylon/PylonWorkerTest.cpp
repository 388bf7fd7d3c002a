// SPDX-License-Identifier: Apache-2.0
#include <cmath>
#include <limits>

#include "diagnostics/pylon/TarnReportingSessionPylonWorker.h"
#include "plist/formats/Json.h"
#include "tests/session/SessionFixture.h"

namespace tarn {
namespace {

using namespace testing;
using namespace std::string_literals;
using Strings = std::vector<std::string>;

constexpr std::uint32_t kMetricIdentifier = 5963779;

class PylonWorker : public SessionFixture {
 protected:
  PylonWorker() { useWorkers<TarnReportingSessionPylonWorker>(); }

  static std::shared_ptr<TarnReportingSessionMessage> issue(plist::Dictionary payload) {
    return message(std::move(payload), AudioEventCategory::Playback, AudioEventType::IssueDetector);
  }
  // The metric that a message with this value under this key makes.
  FakePylonService::Metric metricOf(const char* key, const plist::ValueView& value) {
    platform_.pylon.clear();
    makeSession()->sendMessage(issue({{key, value}}));
    return platform_.pylon.metrics().at(0);
  }
  std::string textUnder(const char* key, const char* field, const plist::ValueView& value) {
    return metricOf(key, value).fields[field].asText();
  }
  std::int64_t durationOf(const plist::ValueView& value) {
    return metricOf("any_channel_silence_seconds", value).fields["duration"].asInt64();
  }
  // What the worker logged: text and nothing else.
  Strings errors() const {
    Strings texts;
    for (const auto& entry : platform_.log.entries(platform::LogLevel::Error)) {
      EXPECT_EQ(entry.category, "tarnra");
      EXPECT_EQ(entry.module, "TarnReportingSessionPylonWorker");
      texts.push_back(entry.message());
    }
    return texts;
  }
};

TEST_F(PylonWorker, PostsOneRecordForAnIssue) {
  makeSession()->sendMessage(issue(
      {{"issue_type", "Silence"}, {"rtaid_client", "music"}, {"node", "Out"}, {"any_channel_silence_seconds", 4}}));
  ASSERT_EQ(platform_.pylon.metrics().size(), 1U);
  const auto& metric = platform_.pylon.metrics()[0];
  EXPECT_EQ(metric.identifier, kMetricIdentifier);
  EXPECT_EQ(metric.identifier, 0x5B0003U);
  EXPECT_EQ(metric.bytes, "\x10\x04\x1a\x07Silence\x22\x03Out\x2a\x05music"s);
  std::string json;
  plist::appendJson(json, metric.fields);
  EXPECT_EQ(json, R"({"duration":4,"issuetype":"Silence","node":"Out","rtaidclient":"music"})");
  EXPECT_TRUE(errors().empty());
}

TEST_F(PylonWorker, MessagesOfEveryOtherTypePostNothing) {
  const auto session = makeSession();
  for (unsigned type = 0; type <= 20; ++type) {
    if (type != 7) {
      session->sendMessage(message({{"issue_type", "x"}}, AudioEventCategory::Playback, AudioEventType(type)));
    }
  }
  session->sendMessage(message({{"issue_type", "x"}}, AudioEventCategory::Error, AudioEventType::Unknown));
  EXPECT_TRUE(platform_.pylon.metrics().empty());
  EXPECT_TRUE(errors().empty());
}

TEST_F(PylonWorker, IssueWithoutKeysLogsEachAndPostsAnEmptyRecord) {
  TarnReportingSessionPylonWorker::initWithSession(makeSession())->handleMessage(issue({}));
  EXPECT_EQ(errors(),
            (Strings{"Failed to get issue_type for AudioIssueDetected",
                     "Failed to get rtaid_client for AudioIssueDetected", "Failed to get node for AudioIssueDetected",
                     "Failed to get any_channel_silence_seconds for AudioIssueDetected"}));
  ASSERT_EQ(platform_.pylon.metrics().size(), 1U);
  EXPECT_EQ(platform_.pylon.metrics()[0].bytes, "\x10\x00\x1a\x00\x22\x00\x2a\x00"s);
}

TEST_F(PylonWorker, OneMissingKeyIsLoggedAlone) {
  makeSession()->sendMessage(issue({{"issue_type", ""}, {"node", 0}, {"any_channel_silence_seconds", false}}));
  EXPECT_EQ(errors(), (Strings{"Failed to get rtaid_client for AudioIssueDetected"}));
  EXPECT_EQ(platform_.pylon.metrics().size(), 1U);
}

TEST_F(PylonWorker, KeysAreMatchedToTheLetter) {
  makeSession()->sendMessage(issue({{"Issue_Type", "x"}, {"issuetype", "x"}, {"NODE", "x"}, {"duration", 3}}));
  EXPECT_EQ(errors().size(), 4U);
  EXPECT_EQ(platform_.pylon.metrics().at(0).bytes, "\x10\x00\x1a\x00\x22\x00\x2a\x00"s);
}

TEST_F(PylonWorker, NumericNodeIsStoredAsText) {
  EXPECT_EQ(textUnder("node", "node", 3), "3");
  EXPECT_EQ(metricOf("node", 3).fields["node"].kind(), plist::Kind::Text);
}

TEST_F(PylonWorker, ValuesOfEveryKindAreStoredAsTheirText) {
  constexpr const char* kKeys[][2] = {{"issue_type", "issuetype"}, {"rtaid_client", "rtaidclient"}, {"node", "node"}};
  for (const auto& [key, field] : kKeys) {
    SCOPED_TRACE(key);
    EXPECT_EQ(textUnder(key, field, "d\xc3\xa9j\xc3\xa0 vu"), "d\xc3\xa9j\xc3\xa0 vu");
    EXPECT_EQ(textUnder(key, field, ""), "");
    EXPECT_EQ(textUnder(key, field, true), "1");
    EXPECT_EQ(textUnder(key, field, false), "0");
    EXPECT_EQ(textUnder(key, field, std::numeric_limits<std::int64_t>::min()), "-9223372036854775808");
    EXPECT_EQ(textUnder(key, field, std::numeric_limits<std::uint64_t>::max()), "18446744073709551615");
    EXPECT_EQ(textUnder(key, field, 0.1F), "0.1");
    EXPECT_EQ(textUnder(key, field, 10.0), "10");
    EXPECT_EQ(textUnder(key, field, std::nan("")), "nan");
    EXPECT_EQ(textUnder(key, field, plist::Date{1763632800}), "2025-11-20 10:00:00 +0000");
    EXPECT_EQ(textUnder(key, field, plist::DataView{"\x0a\x1b"}), "<0a1b>");
    EXPECT_EQ(textUnder(key, field, plist::Array{1, "two"}), "(1, two)");
    EXPECT_EQ(textUnder(key, field, plist::Dictionary{{"a", 1}, {"b", plist::Array()}}), "{a = 1; b = ()}");
  }
}

TEST_F(PylonWorker, TextEndsAtItsFirstNul) {
  EXPECT_EQ(textUnder("issue_type", "issuetype", "glitch\0more"s), "glitch");
  EXPECT_EQ(textUnder("issue_type", "issuetype", "\0more"s), "");
}

TEST_F(PylonWorker, LongTextIsStoredWhole) {
  const std::string text(100'000, 'x');
  EXPECT_EQ(textUnder("node", "node", text), text);
}

TEST_F(PylonWorker, SilenceIsCutTowardZero) {
  EXPECT_EQ(durationOf(2.9), 2);
  EXPECT_EQ(durationOf(-2.9), -2);
  EXPECT_EQ(durationOf(2.9F), 2);
}

TEST_F(PylonWorker, SilenceKeepsItsLowThirtyTwoBits) {
  EXPECT_EQ(durationOf(std::int64_t{1} << 32U | 5), 5);
  EXPECT_EQ(durationOf(0x80000000), std::numeric_limits<std::int32_t>::min());
  EXPECT_EQ(durationOf(-1), -1);
  EXPECT_EQ(durationOf(1e10), 1410065408);
  EXPECT_EQ(durationOf(std::numeric_limits<std::int64_t>::min()), 0);
  EXPECT_EQ(durationOf(std::numeric_limits<std::uint64_t>::max()), -1);
  EXPECT_EQ(durationOf(1e300), -1);  // held to the largest integer first
}

TEST_F(PylonWorker, SilenceOfEveryOtherKindIsReadAsANumber) {
  EXPECT_EQ(durationOf("12 seconds"), 12);
  EXPECT_EQ(durationOf("a while"), 0);
  EXPECT_EQ(durationOf(""), 0);
  EXPECT_EQ(durationOf(true), 1);
  EXPECT_EQ(durationOf(std::nan("")), 0);
  EXPECT_EQ(durationOf(plist::Date{7.5}), 7);
  EXPECT_EQ(durationOf(plist::DataView{"12"}), 0);
  EXPECT_EQ(durationOf(plist::Array{12}), 0);
  EXPECT_EQ(durationOf(plist::Dictionary{{"a", 12}}), 0);
}

TEST_F(PylonWorker, TimestampIsNeverSet) {
  EXPECT_FALSE(metricOf("node", "n").fields.contains("timestamp"));
  EXPECT_EQ(metricOf("node", "n").bytes.front(), '\x10');
}

TEST_F(PylonWorker, TwoIdenticalMessagesPostTwoRecords) {
  const auto worker = TarnReportingSessionPylonWorker::initWithSession(makeSession());
  const auto record = issue({{"node", "n"}});
  worker->handleMessage(record);
  worker->handleMessage(record);
  ASSERT_EQ(platform_.pylon.metrics().size(), 2U);
  EXPECT_EQ(platform_.pylon.metrics()[0].bytes, platform_.pylon.metrics()[1].bytes);
}

TEST_F(PylonWorker, NoMessageIsNoIssue) {
  TarnReportingSessionPylonWorker::initWithSession(makeSession())->handleMessage(nullptr);
  EXPECT_TRUE(platform_.pylon.metrics().empty());
}

TEST_F(PylonWorker, RunsBeforeTheStartAndAddsNothingAtTheStop) {
  const auto session = makeSession();
  EXPECT_EQ(session->workerInstanceCount(), 1U);
  session->sendMessage(issue({{"node", 1}}));
  session->start();
  session->sendMessage(issue({{"node", 2}}));
  session->stop();
  EXPECT_EQ(platform_.pylon.metrics().size(), 2U);
}

TEST_F(PylonWorker, RunsInSingleMessageSessions) {
  makeSession(1, TarnReportingSession::Mode::SingleMessage)->sendMessage(issue({{"node", 1}}));
  EXPECT_EQ(platform_.pylon.metrics().size(), 1U);
}

TEST_F(PylonWorker, MessageIsNotChanged) {
  const auto record = issue({{"node", 3}});
  const plist::Dictionary before = record->message();
  TarnReportingSessionPylonWorker::initWithSession(makeSession())->handleMessage(record);
  EXPECT_TRUE(record->message().sharesStorageWith(before));
}

TEST_F(PylonWorker, WithoutAMetricServiceThereIsNoWorker) {
  platform_.facilities().pylon = nullptr;
  const auto session = makeSession();
  EXPECT_EQ(session->workerInstanceCount(), 0U);
  session->sendMessage(issue({}));
  EXPECT_TRUE(errors().empty());
}

TEST_F(PylonWorker, WhatIsMissingIsToldBeforeThePost) {
  const auto worker = TarnReportingSessionPylonWorker::initWithSession(makeSession());
  platform_.order.start();
  worker->handleMessage(issue({{"issue_type", "x"}, {"rtaid_client", "y"}, {"node", "z"}}));
  EXPECT_EQ(platform_.order.entries(),
            (Strings{"log Failed to get any_channel_silence_seconds for AudioIssueDetected", "metric"}));
}

}  // namespace
}  // namespace tarn
