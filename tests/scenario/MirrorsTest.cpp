// The mirrors of sessions: what a script leads to, and how the check tells what is missing, extra or different.
#include "tests/scenario/Mirrors.h"

#include <gtest/gtest.h>
#include <unistd.h>

#include <algorithm>
#include <cstdlib>
#include <filesystem>
#include <fstream>

namespace tarn::scenario {
namespace {

constexpr double kNow = 4102444800;
constexpr const char* kScript = R"(
{"op":"createReportingSession","reporterID":5}
{"op":"setServiceType","reporterID":5,"serviceType":"apiusage"}
{"op":"setConfiguration","reporterID":5,"configuration":{"HostApplicationDisplayID":"app"}}
{"op":"sendMessage","reporterIDs":[5],"category":"Setup","type":"Setup","message":{"early":1}}
{"op":"startReportingSessionForID","reporterID":5}
{"op":"sendMessage","reporterIDs":[5],"category":"Playback","type":"Start","message":{"n":2,"tarnreporting_timestamp":4102444802}}
{"op":"sendMessage","reporterIDs":[5],"category":268435460,"type":1,"message":{"n":1.5,"flags":[true,"a"],"day":{"$date":0},"tarnreporting_timestamp":4102444801}}
)";
constexpr const char* kStop = R"({"op":"stopReportingSessionForID","reporterID":5}
)";

class Mirrors : public ::testing::Test {
 public:
  ~Mirrors() override {
    std::error_code ignored;
    std::filesystem::remove_all(directory_, ignored);
  }

 protected:
  Mirrors() {
    std::string name = (std::filesystem::temp_directory_path() / "tarnscenario.XXXXXX").string();
    if (::mkdtemp(name.data()) != nullptr) {
      directory_ = name;
    }
    expect(std::string(kScript) + kStop);
  }
  void expect(const std::string& script) {
    const std::string path = directory_ + "/script.jsonl";
    std::ofstream(path) << script;
    expectations_ = {expectationOf(path, {false, false})};
  }
  // What arrives of the script's session, but for the facts about the machine in the message of its summary.
  std::vector<RecordedEvent> recorded() const {
    const json session = {{"session", 1}};
    std::vector<RecordedEvent> events;
    const auto arrives = [&](const std::string& name, const json& payload, json detail) {
      detail.update(session);
      events.push_back({static_cast<std::int64_t>(events.size()) + 1, kNow, "rtc", name, payload, detail});
    };
    arrives("createSession",
            {{"sessionInfo",
              {{"clientType", 19},
               {"clientVersion", 2.1},
               {"sessionID", 5},
               {"batchEvent", false},
               {"hierarchyToken", "t"},
               {"containsRealtimeEvents", true},
               {"clientBundleID", "app"}}},
             {"userInfo",
              {{"clientName", "sys.oxbow.tarnkit"},
               {"TarnReportingSessionID", 5},
               {"serviceName", "apiusage_session"},
               {"HostApplicationDisplayID", "app"}}}},
            json::object());
    arrives("sendMessage", {{"n", 2}, {"audiotag", "PlaybackStart"}, {"HostApplicationDisplayID", "app"}},
            {{"category", 4}, {"type", 1}});
    arrives("sendMessage",
            {{"n", 1.5},
             {"flags", {true, "a"}},
             {"day", "1970-01-01T00:00:00Z"},
             {"audiotag", "DSP_PlaybackStart"},
             {"HostApplicationDisplayID", "app"}},
            {{"category", 4}, {"type", 1}});
    return events;
  }
  std::vector<std::string> differences(const std::vector<RecordedEvent>& events) {
    MirrorComparison comparison(expectations_, PayloadRules({kNow - 1, kNow + 1, "player"}), false);
    comparison.compare(events);
    matched_ = comparison.matched();
    return comparison.differences();
  }
  void expectDifference(const std::vector<RecordedEvent>& events, const std::string& part) {
    const auto found = differences(events);
    EXPECT_TRUE(std::any_of(found.begin(), found.end(), [&](const std::string& text) {
      return text.find(part) != std::string::npos;
    })) << json(found).dump(1);
  }
  // With what a stop leads to.
  std::vector<RecordedEvent> recordedToTheEnd() const {
    std::vector<RecordedEvent> events = recorded();
    json summary = expectations_.front().mirrors.front().messages.back().payload;
    summary.update({{"thermal_state", "Nominal"},
                    {"low_power_enabled", false},
                    {"vmInfo_phys_footprint_MiB", 3},
                    {"load_avg_1_min", 0.5},
                    {"load_avg_5_min", 0.5},
                    {"load_avg_15_min", 0.5},
                    {"clientProcessName", "player"}});
    events.push_back({4, kNow, "rtc", "sendMessage", summary, {{"session", 1}, {"category", 1}, {"type", 11}}});
    json texts = {{"Tarn_Session_Summary_Event", "12"},
                  {"n", "1.5,2"},
                  {"flags", "(1, a)"},
                  {"day", "1970-01-01 00:00:00 +0000"},
                  {"audiotag", "DSP_PlaybackStart,PlaybackStart,Session_GenericSummary"},
                  {"HostApplicationDisplayID", "app,app,app"},
                  {"invalid_timestamp", "nil"},
                  {"total_active_time", "0"},
                  {"active_count", "0"},
                  {"overload_count", "0"},
                  {"average_active_time", "0"},
                  {"num_messages", "3"},
                  {"num_unique_messages", "5"},
                  {"num_redundant_messages", "-2"},
                  {"singleMessageSession", "0"},
                  {"summaryServiceName", "apiusage"},
                  {"thermal_state", "Nominal"},
                  {"low_power_enabled", "0"},
                  {"vmInfo_phys_footprint_MiB", "3"},
                  {"load_avg_1_min", "0.5"},
                  {"load_avg_5_min", "0.5"},
                  {"load_avg_15_min", "0.5"},
                  {"clientProcessName", "player"}};
    events.push_back({5, kNow, "rtc", "sendMessage", texts, {{"session", 1}, {"category", 65535}, {"type", 65535}}});
    events.push_back({6, kNow, "rtc", "flush", json::object(), {{"session", 1}}});
    return events;
  }

  std::string directory_;
  std::vector<Expectation> expectations_;
  std::size_t matched_ = 0;
};

TEST_F(Mirrors, ASessionIsMirroredFromItsStartToItsStop) {
  EXPECT_EQ(mirrorEvents(expectations_), 6U);
  EXPECT_EQ(differences(recordedToTheEnd()), std::vector<std::string>{});
  EXPECT_EQ(matched_, 6U);
}

TEST_F(Mirrors, ASessionThatIsReplacedIsNeverEnded) {
  expect(std::string(kScript) + "{\"op\":\"setServiceType\",\"reporterID\":5,\"serviceType\":\"haptics\"}\n");
  EXPECT_EQ(mirrorEvents(expectations_), 3U);
  EXPECT_EQ(differences(recorded()), std::vector<std::string>{});
}

TEST_F(Mirrors, ATestSessionHasNone) {
  std::string script = std::string(kScript) + kStop;
  script.replace(script.find("apiusage"), 8, "test");
  expect(script);
  EXPECT_EQ(mirrorEvents(expectations_), 0U);
  EXPECT_EQ(differences({}), std::vector<std::string>{});
  expectDifference(recorded(), "extra: rtc event 1 createSession");
}

TEST_F(Mirrors, FindsAMissingSessionAndAMissingEvent) {
  expectDifference({}, "script.jsonl, the mirror of 5: missing");
  auto events = recordedToTheEnd();
  events.erase(events.begin() + 1);
  expectDifference(events, "5 events, expected 6");
}

TEST_F(Mirrors, FindsAChangedInfoMessageCategoryAndFlush) {
  auto events = recordedToTheEnd();
  events[0].payload["sessionInfo"]["batchEvent"] = true;
  expectDifference(events, "batchEvent is true, not false");
  events = recordedToTheEnd();
  events[0].payload["userInfo"]["more"] = 1;
  expectDifference(events, "members beyond those expected");
  events = recordedToTheEnd();
  events[0].payload["sessionInfo"].erase("hierarchyToken");
  expectDifference(events, "there is no token");
  events = recordedToTheEnd();
  events[1].payload["tarnreporting_timestamp"] = 4102444802;
  expectDifference(events, "tarnreporting_timestamp is extra");
  events = recordedToTheEnd();
  events[2].detail["category"] = 268435460;
  expectDifference(events, "the message from script.jsonl:8 was expected");
  events = recordedToTheEnd();
  events[5].name = "sendMessage";
  expectDifference(events, "a flush was expected");
}

TEST_F(Mirrors, FindsASummaryEventThatJoinsInAnotherOrderOrLacksAMember) {
  auto events = recordedToTheEnd();
  events[4].payload["n"] = "2,1.5";
  expectDifference(events, "n is \"2,1.5\", not \"1.5,2\"");
  events = recordedToTheEnd();
  events[4].payload.erase("day");
  expectDifference(events, "day is missing");
  events = recordedToTheEnd();
  events[4].payload["early"] = "1";
  expectDifference(events, "members beyond those expected");
}

TEST_F(Mirrors, TextsThatMayHaveBeenCombinedAreLeftOpen) {
  auto& messages = expectations_.front().mirrors.front().messages;
  auto events = recordedToTheEnd();
  for (const std::size_t index : {std::size_t{0}, std::size_t{1}}) {
    messages[index].payload["spatializationEnabled"] = true;
    events[index + 1].payload["spatializationEnabled"] = true;
  }
  events[4].payload["spatializationEnabled"] = "1,1";
  events[4].payload["n"] = "2,2";
  EXPECT_EQ(differences(events), std::vector<std::string>{});
  events[4].payload["num_messages"] = "4";
  expectDifference(events, "num_messages is \"4\", not \"3\"");
}

}  // namespace
}  // namespace tarn::scenario
