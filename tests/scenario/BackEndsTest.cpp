// What other back-ends must receive, and how the check tells what is missing, extra, different or out of place.
#include "tests/scenario/BackEnds.h"

#include <gtest/gtest.h>
#include <unistd.h>

#include <algorithm>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <stdexcept>

namespace tarn::scenario {
namespace {

class BackEnds : public ::testing::Test {
 public:
  ~BackEnds() override {
    std::error_code ignored;
    std::filesystem::remove_all(directory_, ignored);
  }

 protected:
  BackEnds() {
    std::string name = (std::filesystem::temp_directory_path() / "tarnscenario.XXXXXX").string();
    if (::mkdtemp(name.data()) != nullptr) {
      directory_ = name;
    }
  }
  // Adds what stands beside a script of this name.
  void beside(const std::string& script, const std::string& lines) {
    std::ofstream(directory_ + "/" + script + ".backends.jsonl") << lines;
    const auto read = backEndLines(directory_ + "/" + script + ".jsonl");
    lines_.insert(lines_.end(), read.begin(), read.end());
  }
  void arrives(const std::string& backend, const std::string& name, json payload = json::object(),
               json detail = json::object()) {
    events_.push_back(
        {static_cast<std::int64_t>(events_.size()) + 1, 0, backend, name, std::move(payload), std::move(detail)});
  }
  std::vector<std::string> differences() {
    BackEndComparison comparison(lines_);
    comparison.compare(events_);
    matched_ = comparison.matched();
    return comparison.differences();
  }
  void expectDifference(const std::string& part) {
    const auto found = differences();
    EXPECT_TRUE(std::any_of(found.begin(), found.end(), [&](const std::string& text) {
      return text.find(part) != std::string::npos;
    })) << json(found).dump(1);
  }

  std::string directory_;
  std::vector<BackEndLine> lines_;
  std::vector<RecordedEvent> events_;
  std::size_t matched_ = 0;
};

using Differences = std::vector<std::string>;

constexpr const char* kTwoLines = R"({"backend":"wattlog","name":"On","payload":{"Status":1}}
{"backend":"wattlog","name":"On","payload":{"Status":0},"detail":{"agent":28}}
)";

TEST_F(BackEnds, WithoutDataNothingMayArriveExceptAnalyticsEvents) {
  arrives("tally", "sys.oxbow.tarnkit.Playback.Start");
  EXPECT_EQ(differences(), Differences{});
  arrives("wattlog", "On");
  EXPECT_EQ(differences(), (Differences{"extra: wattlog event 2 On {} {}"}));
}

TEST_F(BackEnds, MembersThatAreNotListedAreFree) {
  beside("a", kTwoLines);
  arrives("wattlog", "On", {{"Status", 1}, {"TimestampEnd", 5.5}}, {{"agent", 28}});
  arrives("wattlog", "On", {{"Status", 0}}, {{"agent", 28}});
  EXPECT_EQ(differences(), Differences{});
  EXPECT_EQ(matched_, 2U);
}

TEST_F(BackEnds, MembersOfInnerObjectsMayBeLeftOutToo) {
  beside("a", R"({"backend":"snare","name":"requestSnapshot","detail":{"signature":{"type":"x"}}})");
  arrives("snare", "requestSnapshot", json::object(),
          {{"signature", {{"type", "x"}, {"domain", "y"}}}, {"duration", 0}});
  EXPECT_EQ(differences(), Differences{});
  events_[0].detail["signature"]["type"] = "z";
  expectDifference("a.backends.jsonl:1: detail.signature.type is \"z\", not \"x\"");
}

TEST_F(BackEnds, AnExactLineAllowsNoOtherMembers) {
  beside("a", R"({"backend":"wattlog","name":"On","payload":{"Status":1},"detail":{"agent":28},"exact":true})");
  arrives("wattlog", "On", {{"Status", 1}}, {{"agent", 28}});
  EXPECT_EQ(differences(), Differences{});
  events_[0].payload["TimestampEnd"] = 5.5;
  expectDifference("members beyond those listed are there");
  events_[0].payload.erase("TimestampEnd");
  events_[0].detail["more"] = 1;
  expectDifference("members beyond those listed are there");
}

TEST_F(BackEnds, FindsAMissingEvent) {
  beside("a", kTwoLines);
  arrives("wattlog", "On", {{"Status", 1}}, {{"agent", 28}});
  EXPECT_EQ(differences(), (Differences{"a.backends.jsonl:2: missing: wattlog On {\"Status\":0} {\"agent\":28}"}));
}

TEST_F(BackEnds, FindsAMissingEventBeforeOneThatArrived) {
  beside("a", kTwoLines);
  arrives("wattlog", "On", {{"Status", 0}}, {{"agent", 28}});
  EXPECT_EQ(differences(), (Differences{"a.backends.jsonl:1: missing: wattlog On {\"Status\":1} {}"}));
}

TEST_F(BackEnds, FindsAChangedAndAMissingMember) {
  beside("a", kTwoLines);
  arrives("wattlog", "On", {{"Status", 2}}, {{"agent", 28}});
  arrives("wattlog", "On", {{"TimestampEnd", 2}}, {{"agent", 28}});
  expectDifference("payload.Status is 2, not 1");
  expectDifference("payload.Status is missing");
}

TEST_F(BackEnds, FindsTwoEventsInEachOthersPlaces) {
  beside("a", kTwoLines);
  arrives("wattlog", "On", {{"Status", 0}}, {{"agent", 28}});
  arrives("wattlog", "On", {{"Status", 1}}, {{"agent", 28}});
  expectDifference("a.backends.jsonl:1: missing");
  expectDifference("extra: wattlog event 2");
}

TEST_F(BackEnds, ScriptsInterleaveAndEachKeepsItsOrder) {
  beside("a", R"({"backend":"wattlog","name":"A1"}
{"backend":"wattlog","name":"A2"}
)");
  beside("b", R"({"backend":"wattlog","name":"B1"}
{"backend":"wattlog","name":"B2"}
)");
  for (const char* name : {"B1", "A1", "B2", "A2"}) {
    arrives("wattlog", name);
  }
  EXPECT_EQ(differences(), Differences{});
  std::swap(events_[0], events_[2]);
  EXPECT_NE(differences(), Differences{});
}

TEST_F(BackEnds, TheLineThatSaysMostGetsAnEventThatTwoScriptsWaitFor) {
  beside("a", R"({"backend":"wattlog","name":"On"})");
  beside("b", R"({"backend":"wattlog","name":"On","payload":{"ApplicationName":"b"}})");
  arrives("wattlog", "On", {{"ApplicationName", "b"}});
  arrives("wattlog", "On", {{"ApplicationName", "a"}});
  EXPECT_EQ(differences(), Differences{});
}

TEST_F(BackEnds, LanesOfOneScriptKeepNoOrderAmongEachOther) {
  beside("a", R"({"backend":"snare","lane":"left","name":"createSession"}
{"backend":"snare","lane":"left","name":"flush"}
{"backend":"snare","lane":"right","name":"createSession"}
{"backend":"snare","lane":"right","name":"flush"}
)");
  for (const char* name : {"createSession", "createSession", "flush", "flush"}) {
    arrives("snare", name);
  }
  EXPECT_EQ(differences(), Differences{});
}

TEST_F(BackEnds, ASessionThatTheDetailTellsStaysInItsLane) {
  for (const char* script : {"a", "b"}) {
    beside(script, std::string(R"({"backend":"snare","name":"createSession","payload":{"userInfo":{"app":")") + script +
                       R"("}}}
{"backend":"snare","name":"sendMessage","payload":{"n":1}}
{"backend":"snare","name":"flush"}
)");
  }
  arrives("snare", "createSession", {{"userInfo", {{"app", "b"}}}}, {{"session", 1}});
  arrives("snare", "createSession", {{"userInfo", {{"app", "a"}}}}, {{"session", 2}});
  arrives("snare", "sendMessage", {{"n", 1}}, {{"session", 1}});
  arrives("snare", "flush", json::object(), {{"session", 1}});
  arrives("snare", "sendMessage", {{"n", 1}}, {{"session", 2}});
  arrives("snare", "flush", json::object(), {{"session", 2}});
  EXPECT_EQ(differences(), Differences{});
  events_[2].detail["session"] = 2;
  EXPECT_NE(differences(), Differences{});
}

TEST_F(BackEnds, ALineStandsForSoManyEventsAsItSays) {
  beside("a", R"({"backend":"snare","name":"sendMessage","times":3}
{"backend":"snare","name":"flush"}
)");
  EXPECT_EQ(BackEndComparison(lines_).expected(), 4U);
  for (const char* name : {"sendMessage", "sendMessage", "sendMessage", "flush"}) {
    arrives("snare", name);
  }
  EXPECT_EQ(differences(), Differences{});
  events_.erase(events_.begin(), events_.begin() + 2);
  EXPECT_EQ(differences(), (Differences{"a.backends.jsonl:1: missing: snare sendMessage {} {}, 2 times"}));
}

TEST_F(BackEnds, RefusesLinesThatItCannotRead) {
  for (const char* line : {"{}", "[1]", "{", R"({"backend":"snare"})", R"({"name":"x"})", R"({"backend":1,"name":"x"})",
                           R"({"backend":"snare","name":"x","times":"often"})",
                           R"({"backend":"snare","name":"x","paylod":{}})", R"({"backend":"tally","name":"x"})"}) {
    EXPECT_THROW(beside("a", line), std::runtime_error) << line;
  }
}

}  // namespace
}  // namespace tarn::scenario
