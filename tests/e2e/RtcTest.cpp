// SPDX-License-Identifier: Apache-2.0
// The mirror of sessions in the real-time-communication reporting service, with the service's real queues and the
// recorder in its place.
#include <csignal>

#include <algorithm>

#include "tests/e2e/support/ServiceFixture.h"

namespace tarn::e2e {
namespace {

class Rtc : public ServiceFixture {
 protected:
  bool startConfigured(const std::string& toml) {
    writeFile(directory_ / "service.toml", toml);
    return startService({"--config", directory_ / "service.toml", "--log-level", "debug"});
  }
  std::vector<Event> rtcEvents() {
    std::vector<Event> found = events();
    found.erase(std::remove_if(found.begin(), found.end(), [](const Event& event) { return event.backend != "rtc"; }),
                found.end());
    return found;
  }
  std::vector<Event> rtcEventsOnceThereAre(std::size_t count) {
    std::vector<Event> found;
    eventually([&] {
      found = rtcEvents();
      return found.size() >= count;
    });
    return found;
  }
  // A session of two messages.
  void playSession(const std::string& serviceType, const std::string& reporterID = "4711") {
    play(R"({"op":"createReportingSession","reporterID":)" + reporterID + R"(}
{"op":"setServiceType","reporterID":)" +
         reporterID + R"(,"serviceType":")" + serviceType + R"("}
{"op":"setConfiguration","reporterID":)" +
         reporterID + R"(,"configuration":{"HostApplicationDisplayID":"org.example","extra":5}}
{"op":"startReportingSessionForID","reporterID":)" +
         reporterID + R"(}
{"op":"sendMessage","reporterIDs":[)" +
         reporterID + R"(],"category":268435460,"type":1,"message":{"route":"a","n":1}}
{"op":"sendMessage","reporterIDs":[)" +
         reporterID + R"(],"category":268435460,"type":1,"message":{"n":2}}
{"op":"stopReportingSessionForID","reporterID":)" +
         reporterID + "}\n");
  }
};

TEST_F(Rtc, ASessionIsMirroredFromItsStartToItsFlush) {
  ASSERT_TRUE(startConfigured(""));
  playSession("haptics");
  ledgerAtRest();
  const auto found = rtcEvents();
  ASSERT_GE(found.size(), 5U) << serviceLog();
  EXPECT_EQ(found.front().name, "createSession");
  const json& info = found.front().payload.at("sessionInfo");
  const std::string token = info.at("hierarchyToken");
  EXPECT_FALSE(token.empty());
  EXPECT_EQ(info, (json{{"clientType", 19},
                        {"clientVersion", 2.1},
                        {"sessionID", 4711},
                        {"batchEvent", true},
                        {"hierarchyToken", token},
                        {"containsRealtimeEvents", false},
                        {"clientBundleID", "org.example"}}));
  EXPECT_EQ(found.front().payload.at("userInfo"), (json{{"clientName", "sys.oxbow.tarnkit"},
                                                        {"TarnReportingSessionID", 4711},
                                                        {"serviceName", "haptics_session"},
                                                        {"HostApplicationDisplayID", "org.example"},
                                                        {"extra", 5}}));
  EXPECT_EQ(found.front().detail, (json{{"session", 1}}));
  EXPECT_EQ(found[1].detail, (json{{"session", 1}, {"category", 4}, {"type", 1}}));
  EXPECT_EQ(found[1].payload.at("n"), 1);
  EXPECT_EQ(found[1].payload.at("audiotag"), "DSP_PlaybackStart");
  EXPECT_FALSE(found[1].payload.contains("tarnreporting_timestamp"));
  EXPECT_EQ(found[2].payload.at("n"), 2);
  const Event& summary = found[found.size() - 2];
  EXPECT_EQ(summary.detail, (json{{"session", 1}, {"category", 65535}, {"type", 65535}}));
  EXPECT_EQ(summary.payload.at("Tarn_Session_Summary_Event"), "3");
  EXPECT_EQ(summary.payload.at("n"), "1,2");
  EXPECT_EQ(summary.payload.at("route"), "a");
  EXPECT_EQ(found.back().name, "flush");
  EXPECT_EQ(found.back().payload, json::object());
  EXPECT_EQ(found.back().detail, (json{{"session", 1}}));
  EXPECT_TRUE(logWillSay("tarnri TarnReportingSessionRtcWorker:"));
}

TEST_F(Rtc, EachSessionHasItsNumberAndARunCountsFromOne) {
  for (int run = 0; run < 2; ++run) {
    ASSERT_TRUE(startConfigured(""));
    playSession("haptics");
    playSession("generic", "4712");
    ASSERT_EQ(stopService(SIGTERM), 0);
  }
  std::vector<json> numbers;
  for (const Event& event : rtcEvents()) {
    if (event.name == "createSession") {
      numbers.push_back(event.detail.at("session"));
    }
  }
  EXPECT_EQ(numbers, (std::vector<json>{1, 2, 1, 2}));
}

TEST_F(Rtc, AnApiUsageSessionIsInRealTime) {
  ASSERT_TRUE(startConfigured(""));
  playSession("apiusage");
  const auto found = rtcEventsOnceThereAre(1);
  ASSERT_FALSE(found.empty());
  EXPECT_EQ(found[0].payload.at("sessionInfo").at("batchEvent"), false);
  EXPECT_EQ(found[0].payload.at("sessionInfo").at("containsRealtimeEvents"), true);
}

TEST_F(Rtc, ATestSessionIsNotMirrored) {
  ASSERT_TRUE(startConfigured(""));
  playSession("test");
  ledgerAtRest();
  EXPECT_TRUE(rtcEvents().empty());
}

TEST_F(Rtc, AMessageWithoutAReporterGoesToTheSingleMessageSession) {
  ASSERT_TRUE(startConfigured(""));
  play("{\"op\":\"sendMessage\",\"category\":4,\"type\":1,\"message\":{\"n\":1}}\n");
  const auto found = rtcEventsOnceThereAre(2);
  ASSERT_EQ(found.size(), 2U);
  EXPECT_EQ(found[0].payload.at("userInfo").at("serviceName"), "standalone");
  EXPECT_EQ(found[0].payload.at("sessionInfo").at("clientBundleID"), "Unknown");
  EXPECT_EQ(found[0].payload.at("sessionInfo").at("sessionID"), 1);
  EXPECT_EQ(found[1].payload.at("n"), 1);
}

TEST_F(Rtc, WithoutATokenNothingIsMirrored) {
  ASSERT_TRUE(startConfigured("[rtc]\navailable = false\n"));
  playSession("haptics");
  ledgerAtRest();
  EXPECT_TRUE(rtcEvents().empty());
  EXPECT_TRUE(logWillSay("newHierarchyTokenFromParentToken returned nil. Will skip rtc for this session. "));
}

TEST_F(Rtc, WithoutAListTheSessionIsMadeAndNothingSent) {
  ASSERT_TRUE(startConfigured("[rtc]\nno_backends = true\n"));
  playSession("haptics");
  ledgerAtRest();
  EXPECT_EQ(names(rtcEvents()), (std::vector<std::string>{"createSession"}));
  EXPECT_TRUE(logWillSay("no backends found, this session won't get sent to the server"));
  EXPECT_TRUE(logWillSay("failed to find backend"));
  EXPECT_TRUE(logWillSay("Session never started. "));
}

TEST_F(Rtc, AnEmptyListWillDo) {
  ASSERT_TRUE(startConfigured("[rtc]\nbackends = []\n"));
  playSession("haptics");
  ledgerAtRest();
  EXPECT_TRUE(logWillSay("list of backends ()"));
  EXPECT_EQ(rtcEvents().back().name, "flush");
}

TEST_F(Rtc, ALateCompletionKeepsEverythingInItsOrder) {
  ASSERT_TRUE(startConfigured("[rtc]\nstart_delay_ms = 700\n"));
  playSession("haptics");
  playSession("generic", "4712");
  for (const std::string& name : names(rtcEvents())) {
    EXPECT_EQ(name, "createSession");  // both still wait
  }
  ledgerAtRest();
  const auto found = rtcEvents();
  for (int session = 1; session <= 2; ++session) {
    std::vector<json> values;
    for (const Event& event : found) {
      if (event.detail.at("session") == session && event.payload.contains("n")) {
        values.push_back(event.payload.at("n"));
      }
    }
    EXPECT_EQ(values, (std::vector<json>{1, 2, "1,2"}));
  }
  EXPECT_EQ(found.back().name, "flush");
}

TEST_F(Rtc, ACompletionBehindNineSecondsIsTooLate) {
  ASSERT_TRUE(startConfigured("[rtc]\nstart_delay_ms = 60000\n"));
  playSession("haptics");
  ASSERT_TRUE(eventually([this] { return logSays("timed out waiting for backends"); }, std::chrono::seconds(15)));
  ledgerAtRest();
  EXPECT_EQ(names(rtcEvents()), (std::vector<std::string>{"createSession"}));
  EXPECT_TRUE(logWillSay("Session never started. stop"));
  EXPECT_EQ(stopService(SIGTERM), 0);
}

// A completion that comes after the stop keeps the mirror out of the next period; it is to be rare.
TEST_F(Rtc, PeriodsThatFollowEachOtherAtOnceAreMirroredEach) {
  constexpr std::size_t kPeriods = 1000;
  ASSERT_TRUE(startService({"--log-level", "error"}));
  const auto client = connect();
  ASSERT_TRUE(client->call(client::createReportingSession(1)).ok());
  for (std::size_t period = 0; period < kPeriods; ++period) {
    ASSERT_EQ(client->send(client::startReportingSessionForID(1)), client::SendStatus::Sent);
    ASSERT_TRUE(client->call(client::sendMessage({{"number", period}}, 4, 1, std::vector<std::int64_t>{1})).ok());
    ASSERT_TRUE(client->call(client::stopReportingSessionForID(1)).ok());
  }
  ledgerAtRest();
  const auto found = rtcEvents();
  const auto count = [&](std::string_view name) {
    return static_cast<std::size_t>(
        std::count_if(found.begin(), found.end(), [&](const Event& event) { return event.name == name; }));
  };
  EXPECT_GE(count("createSession"), kPeriods - 1);
  EXPECT_LE(count("createSession"), kPeriods);
  // A period that is mirrored is so whole: its message, the session's summary and that of the mirror, its flush.
  EXPECT_EQ(count("sendMessage"), 3 * count("createSession"));
  EXPECT_EQ(count("flush"), count("createSession"));
}

TEST_F(Rtc, TheEndCommitsWhatTheWorkersQueuesHold) {
  ASSERT_TRUE(startConfigured(""));
  const auto client = connect();
  ASSERT_TRUE(client->call(client::createReportingSession(1)).ok());
  ASSERT_EQ(client->send(client::startReportingSessionForID(1)), client::SendStatus::Sent);
  for (int index = 0; index < 2000; ++index) {
    ASSERT_EQ(client->send(client::sendMessage({{"number", index}}, 4, 1, std::vector<std::int64_t>{1})),
              client::SendStatus::Sent);
  }
  ASSERT_TRUE(client->call(client::getAllReporters()).ok());
  EXPECT_EQ(stopService(SIGTERM), 0);
  // The session's creation and messages, then, since the end stops it: its summary, the mirror's, its flush.
  EXPECT_EQ(rtcEvents().size(), 2001U + 3U);
  EXPECT_FALSE(logSays("are left undone"));
}

TEST_F(Rtc, TheEndDoesNotWaitForASlowService) {
  ASSERT_TRUE(startConfigured("[rtc]\nstart_delay_ms = 60000\n"));
  playSession("haptics");
  const auto begin = std::chrono::steady_clock::now();
  EXPECT_EQ(stopService(SIGTERM), 0);
  EXPECT_LT(std::chrono::steady_clock::now() - begin, std::chrono::seconds(4));
  EXPECT_TRUE(logWillSay("pieces of work of the workers' queues are left undone")) << serviceLog();
}

}  // namespace
}  // namespace tarn::e2e
