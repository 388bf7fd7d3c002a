// The scenario's own check: it has to find what is missing, extra, different or out of place.
#include <gtest/gtest.h>
#include <unistd.h>

#include <algorithm>
#include <cstdlib>
#include <filesystem>
#include <fstream>

#include "tests/scenario/Comparison.h"
#include "tests/scenario/Model.h"

namespace tarn::scenario {
namespace {

constexpr double kNow = 4102444800;  // any time: the stamps below are made to fit
constexpr const char* kScript = R"(
{"op":"createReportingSession","reporterID":5}
{"op":"setServiceType","reporterID":5,"serviceType":"haptics"}
{"op":"setConfiguration","reporterID":5,"configuration":{"HostApplicationDisplayID":"app"}}
{"op":"startReportingSessionForID","reporterID":5}
{"op":"sendMessage","reporterIDs":[5],"category":"Playback","type":"Start","message":{"track id":1}}
{"op":"sendMessage","reporterIDs":[5],"category":"Playback","type":"Start","message":{"track id":1}}
{"op":"sendMessage","reporterIDs":[5],"category":"Playback","type":"Stop","message":{"session_duration":1.5}}
{"op":"sendMessage","reporterIDs":[5],"category":268435460,"type":6,"message":{"issue_type":"overload"}}
{"op":"stopReportingSessionForID","reporterID":5}
)";

class Scenario : public ::testing::Test {
 public:
  ~Scenario() override {
    std::error_code ignored;
    std::filesystem::remove_all(directory_, ignored);
  }

 protected:
  Scenario() {
    std::string name = (std::filesystem::temp_directory_path() / "tarnscenario.XXXXXX").string();
    if (::mkdtemp(name.data()) != nullptr) {
      directory_ = name;
    }
    expectations_.push_back(expectation(kScript));
  }
  Expectation expectation(const std::string& script, bool alone = false) {
    const std::string path = directory_ + "/script.jsonl";
    std::ofstream(path) << script;
    return expectationOf(path, {alone, false});
  }
  void derived(const std::string& lines) const { std::ofstream(directory_ + "/script.derived.jsonl") << lines; }

  // What a service that keeps every rule would have recorded.
  std::vector<RecordedEvent> recorded() const {
    std::vector<RecordedEvent> events;
    for (const auto& [application, expected] : expectations_.front().events) {
      for (const ExpectedEvent& event : expected) {
        RecordedEvent made{
            static_cast<std::int64_t>(events.size()) + 1, kNow, "tally", event.name, event.payload, json::object()};
        if (event.hasFreshStamp) {
          made.payload["tarnreporting_timestamp"] = kNow;
        }
        if (event.isSummary) {
          made.payload.update({{"thermal_state", "Nominal"},
                               {"low_power_enabled", false},
                               {"vmInfo_phys_footprint_MiB", 3},
                               {"load_avg_1_min", 0.5},
                               {"load_avg_5_min", 0.5},
                               {"load_avg_15_min", 0.5},
                               {"clientProcessName", "player"}});
        }
        events.push_back(made);
      }
    }
    events.push_back({99,
                      kNow,
                      "tally",
                      "sys.oxbow.tarnkit.tarnreportingclientuptime",
                      {{"processName", "player"}, {"seconds", 0}},
                      json::object()});
    return events;
  }

  std::vector<std::string> differences(const std::vector<RecordedEvent>& events) const {
    Comparison comparison(expectations_, {kNow - 1, kNow + 1, "player"});
    comparison.compareEvents(events);
    return comparison.differences();
  }

  std::string directory_;
  std::vector<Expectation> expectations_;
};

bool anyContains(const std::vector<std::string>& texts, std::string_view part) {
  return std::any_of(texts.begin(), texts.end(),
                     [part](const std::string& text) { return text.find(part) != std::string::npos; });
}

TEST_F(Scenario, ExpectsBothEventsOfEachNewMessageAndOfTheSummary) {
  std::vector<std::string> names;
  for (const ExpectedEvent& event : expectations_.front().events.at("app")) {
    names.push_back(event.name);
  }
  EXPECT_EQ(names, (std::vector<std::string>{
                       "sys.oxbow.tarnkit.Playback.Start", "sys.oxbow.haptics.Playback.Start",
                       "sys.oxbow.tarnkit.Playback.Stop", "sys.oxbow.haptics.Playback.Stop",
                       "sys.oxbow.tarnkit.DSP_Playback.Error", "sys.oxbow.haptics.DSP_Playback.Error",
                       "sys.oxbow.tarnkit.Session_Generic.Summary", "sys.oxbow.haptics.Session_Generic.Summary"}));
}

TEST_F(Scenario, ExpectsTheSummarysNumbers) {
  const json& summary = expectations_.front().events.at("app").back().payload;
  EXPECT_EQ(summary.at("num_messages"), 4);
  EXPECT_EQ(summary.at("num_unique_messages"), 5);  // three messages and two markers
  EXPECT_EQ(summary.at("num_redundant_messages"), -1);
  EXPECT_EQ(summary.at("total_active_time"), 1.5);
  EXPECT_EQ(summary.at("overload_count"), 1);
}

TEST_F(Scenario, ExpectsKeysWithoutBlanks) {
  EXPECT_EQ(expectations_.front().events.at("app").front().payload.at("track_id"), 1);
}

TEST_F(Scenario, FindsNothingWhereAllIsAsItMustBe) {
  EXPECT_EQ(differences(recorded()), std::vector<std::string>{});
}

TEST_F(Scenario, FindsEachMissingEvent) {
  const std::size_t count = recorded().size();
  for (std::size_t index = 0; index < count; ++index) {
    auto events = recorded();
    events.erase(events.begin() + static_cast<std::ptrdiff_t>(index));
    const auto found = differences(events);
    ASSERT_EQ(found.size(), 1U) << index;
    EXPECT_TRUE(anyContains(found, index + 1 == count ? "0 uptimes arrived" : "missing: ")) << found.front();
  }
}

TEST_F(Scenario, FindsAnExtraEvent) {
  auto events = recorded();
  events.insert(events.begin() + 2, events[1]);
  EXPECT_TRUE(anyContains(differences(events), "extra: tally event 2 sys.oxbow.haptics.Playback.Start"));
}

TEST_F(Scenario, LeavesOtherBackEndsToTheirOwnComparison) {
  auto events = recorded();
  events.push_back({100, kNow, "wattlog", "x", json::object(), json::object()});
  EXPECT_EQ(differences(events), std::vector<std::string>{});
}

TEST_F(Scenario, FindsTwoEventsInEachOthersPlaces) {
  auto events = recorded();
  std::swap(events[0], events[2]);
  EXPECT_FALSE(differences(events).empty());
}

TEST_F(Scenario, FindsAChangedValue) {
  auto events = recorded();
  events[2].payload["session_duration"] = 1.25;
  EXPECT_TRUE(anyContains(differences(events), "session_duration is 1.25, not 1.5"));
}

TEST_F(Scenario, FindsAStampThatIsNotOfTheTimeOfPlaying) {
  auto events = recorded();
  events[2].payload["tarnreporting_timestamp"] = kNow - 3600;
  EXPECT_TRUE(anyContains(differences(events), "a stamp outside the time of playing"));
}

TEST_F(Scenario, FindsASummaryWithoutAFactAboutTheMachine) {
  auto events = recorded();
  events[6].payload.erase("thermal_state");
  EXPECT_TRUE(anyContains(differences(events), "thermal_state is null"));
}

TEST_F(Scenario, FindsAnUptimeThatIsTooShort) {
  expectations_.front().connections.front() = 3.5;
  EXPECT_TRUE(anyContains(differences(recorded()), "expected from 3"));
}

TEST_F(Scenario, FindsAMissingAWrongAndAnImpossibleReply) {
  Comparison comparison(expectations_, {kNow, kNow, "player"});
  std::vector<json> replies;
  for (const ExpectedReply& reply : expectations_.front().replies) {
    replies.push_back({{"line", reply.line}, {"error", nullptr}, {"result", reply.result.value_or(json())}});
  }
  comparison.compareReplies(expectations_.front(), replies);
  EXPECT_EQ(comparison.differences(), std::vector<std::string>{});
  replies[0]["result"] = false;
  replies[1]["line"] = 1000;
  comparison.compareReplies(expectations_.front(), replies);
  EXPECT_TRUE(anyContains(comparison.differences(), "script.jsonl:2: the reply"));
  EXPECT_TRUE(anyContains(comparison.differences(), "script.jsonl:3: no reply"));
  EXPECT_TRUE(anyContains(comparison.differences(), "script.jsonl:1000: a reply that can't be"));
}

TEST_F(Scenario, FindsALedgerThatDoesNotAddUp) {
  json ledger = {{"messages_received", 4},
                 {"recorder_handed_over", 9},
                 {"recorder_committed", 9},
                 {"recorder_waiting", 0},
                 {"recorder_failed", 0},
                 {"queued", 0},
                 {"requests_refused", {{"bad_arguments", 0}}},
                 {"connections_cut", json::object()}};
  Comparison good(expectations_, {kNow, kNow, "player"});
  good.compareLedger(ledger, 9);
  EXPECT_EQ(good.differences(), std::vector<std::string>{});
  ledger["recorder_committed"] = 8;
  ledger["requests_refused"]["bad_arguments"] = 1;
  Comparison bad(expectations_, {kNow, kNow, "player"});
  bad.compareLedger(ledger, 9);
  EXPECT_EQ(bad.differences().size(), 2U);
}

TEST_F(Scenario, ExpectsTheHeldReplyAtTheStopAndNoneAfterADestroy) {
  const Expectation stopped = expectation(
      "{\"op\":\"createReportingSession\",\"reporterID\":5}\n{\"op\":\"startReportingSessionForID\",\"reporterID\":5}\n"
      "{\"op\":\"stopReportingSessionForID\",\"reporterID\":5}\n");
  EXPECT_EQ(stopped.replies.size(), 3U);
  const Expectation destroyed = expectation(
      "{\"op\":\"createReportingSession\",\"reporterID\":5}\n{\"op\":\"startReportingSessionForID\",\"reporterID\":5}\n"
      "{\"op\":\"destroyReportingSession\",\"reporterID\":5}\n");
  EXPECT_EQ(destroyed.replies.size(), 2U);
}

TEST_F(Scenario, PutsWhatIsDerivedAroundTheSummaryThatCountsIt) {
  derived(R"({"reporterID":5,"category":"Input","type":"Summary","message":{"msgidx":1}}
{"reporterID":5,"category":"Volume","type":"Summary","message":{"msgidx":1}}
{"reporterID":5,"category":"Lagoon","type":"Summary","message":{"msgidx":1}}
)");
  expectations_.front() = expectation(kScript);
  const auto& events = expectations_.front().events.at("app");
  std::vector<std::string> names;
  for (std::size_t index = 6; index < events.size(); index += 2) {
    names.push_back(events[index].name);
  }
  EXPECT_EQ(names,
            (std::vector<std::string>{"sys.oxbow.tarnkit.Volume.Summary", "sys.oxbow.tarnkit.Lagoon.Summary",
                                      "sys.oxbow.tarnkit.Session_Generic.Summary", "sys.oxbow.tarnkit.Input.Summary"}));
  const json& volume = events[6].payload;
  EXPECT_EQ(volume, (json{{"msgidx", 1},
                          {"invalid_timestamp", "nil"},
                          {"audiotag", "VolumeSummary"},
                          {"HostApplicationDisplayID", "app"}}));
  EXPECT_EQ(events[10].payload.at("num_messages"), 6);
  EXPECT_EQ(events[10].payload.at("num_unique_messages"), 7);
  EXPECT_EQ(expectations_.front().derived, 3U);
  EXPECT_EQ(differences(recorded()), std::vector<std::string>{});
}

TEST_F(Scenario, FindsADerivedMessageThatDiffersOrThatNobodyExpects) {
  derived(R"({"reporterID":5,"period":1,"category":"Volume","type":"Summary","message":{"play_seconds":2.5}})");
  expectations_.front() = expectation(kScript);
  auto events = recorded();
  events[6].payload["play_seconds"] = 2.25;
  EXPECT_TRUE(anyContains(differences(events), "play_seconds is 2.25, not 2.5"));
  events = recorded();
  events.insert(events.begin() + 8, events[6]);
  EXPECT_TRUE(anyContains(differences(events), "extra: "));
}

TEST_F(Scenario, RefusesDerivedMessagesOfAStopThatTheScriptDoesNotHave) {
  derived(R"({"reporterID":5,"period":2,"category":"Volume","type":"Summary","message":{}})");
  EXPECT_THROW(expectation(kScript), std::runtime_error);
  derived(R"({"reporterID":5,"perod":1,"category":"Volume","type":"Summary","message":{}})");
  EXPECT_THROW(expectation(kScript), std::runtime_error);
  derived("[]\n");
  EXPECT_THROW(expectation(kScript), std::runtime_error);
}

TEST_F(Scenario, ExpectsFilesOfTestSessionsAndOfAllOnAnInternalBuild) {
  EXPECT_TRUE(expectations_.front().files.empty());
  const std::string path = directory_ + "/script.jsonl";
  std::ofstream(path) << kScript;
  const auto files = expectationOf(path, {false, true}).files;
  ASSERT_EQ(files.size(), 1U);
  EXPECT_EQ(files[0].reporterID, 5);
  EXPECT_EQ(files[0].service, "haptics");
  EXPECT_EQ(files[0].received, 3U);
  EXPECT_EQ(files[0].made, 1U);
}

TEST_F(Scenario, RefusesAMessageForAllSessionsAmongOtherScripts) {
  const std::string script = "{\"op\":\"sendMessage\",\"category\":1,\"type\":0,\"message\":{}}\n";
  EXPECT_THROW(expectation(script), std::runtime_error);
  EXPECT_EQ(expectation(script, true).events.at("Unknown").size(), 2U);
}

}  // namespace
}  // namespace tarn::scenario
