// SPDX-License-Identifier: Apache-2.0
// How what is missing, extra, different or out of place is told.
#include "tests/scenario/Comparison.h"

#include "tests/scenario/ScenarioFixture.h"

namespace tarn::scenario {
namespace {

class ScenarioComparison : public ScenarioFixture {
 protected:
  void expects(const std::string& name, const std::string& lines) {
    for (const ExpectedEvent& line : beside(name, lines)) {
      lines_.push_back(line);
    }
  }
  Differences differences() {
    Comparison comparison(lines_, playing_);
    comparison.compare(events_);
    return comparison.differences();
  }
  void expectDifference(const std::string& part) { expectOneOf(differences(), part); }

  std::vector<ExpectedEvent> lines_;
};

constexpr const char* kTwoLines = R"({"backend":"wattlog","name":"On","payload":{"Status":1}}
{"backend":"wattlog","name":"On","payload":{"Status":0},"detail":{"agent":28}}
)";

TEST_F(ScenarioComparison, FindsNothingWhereAllIsAsItMustBe) {
  expects("a", kTwoLines);
  arrives("wattlog", "On", {{"Status", 1}});
  arrives("wattlog", "On", {{"Status", 0}}, {{"agent", 28}});
  EXPECT_EQ(differences(), Differences{});
}

TEST_F(ScenarioComparison, WithoutExpectationsNothingMayArrive) {
  arrives("wattlog", "On");
  EXPECT_EQ(differences(), (Differences{"extra: wattlog On {}"}));
}

TEST_F(ScenarioComparison, FindsAMissingEvent) {
  expects("a", kTwoLines);
  arrives("wattlog", "On", {{"Status", 1}});
  EXPECT_EQ(differences(), (Differences{"a.expected.jsonl:2: missing: wattlog On {\"Status\":0} {\"agent\":28}"}));
}

TEST_F(ScenarioComparison, FindsAMissingEventBeforeOneThatArrived) {
  expects("a", kTwoLines);
  arrives("wattlog", "On", {{"Status", 0}}, {{"agent", 28}});
  EXPECT_EQ(differences(), (Differences{"a.expected.jsonl:1: missing: wattlog On {\"Status\":1}"}));
}

TEST_F(ScenarioComparison, FindsAnEventThatCameTwice) {
  expects("a", kTwoLines);
  arrives("wattlog", "On", {{"Status", 1}});
  arrives("wattlog", "On", {{"Status", 1}});
  arrives("wattlog", "On", {{"Status", 0}}, {{"agent", 28}});
  EXPECT_EQ(differences(),
            (Differences{"extra: wattlog On {\"Status\":1} (a.expected.jsonl:2: payload.Status is 1, not 0)"}));
}

TEST_F(ScenarioComparison, FindsAChangedAMissingAndAnExtraMember) {
  expects("a", kTwoLines);
  arrives("wattlog", "On", {{"Status", 2}});
  arrives("wattlog", "On", {{"More", 2}});
  arrives("wattlog", "On", {{"Status", 1}, {"More", 2}});
  expectDifference("payload.Status is 2, not 1");
  expectDifference("payload.Status is missing");
  expectDifference("payload.More is extra: 2");
  expectDifference("a.expected.jsonl:1: missing");
}

TEST_F(ScenarioComparison, FindsAnotherNameAndAnotherDetail) {
  expects("a", R"({"backend":"wattlog","name":"On","detail":{"agent":28}})");
  arrives("wattlog", "On", json::object(), {{"agent", 27}});
  arrives("wattlog", "Off", json::object(), {{"agent", 28}});
  expectDifference("detail.agent is 27, not 28");
  expectDifference("extra: wattlog Off");
}

TEST_F(ScenarioComparison, FindsTwoEventsInEachOthersPlaces) {
  expects("a", kTwoLines);
  arrives("wattlog", "On", {{"Status", 0}}, {{"agent", 28}});
  arrives("wattlog", "On", {{"Status", 1}});
  expectDifference("a.expected.jsonl:1: missing");
  expectDifference("extra: wattlog On {\"Status\":1}");
}

TEST_F(ScenarioComparison, FindsAStampThatIsNotOfTheTimeOfPlaying) {
  expects("a", R"({"backend":"wattlog","name":"On","payload":{"TimestampEnd":"<now>"}})");
  arrives("wattlog", "On", {{"TimestampEnd", 1005.5}});
  EXPECT_EQ(differences(), Differences{});
  events_[0].payload["TimestampEnd"] = 900;
  expectDifference("payload.TimestampEnd is 900, not \"<now>\"");
}

TEST_F(ScenarioComparison, ScriptsMixAndEachKeepsItsOrder) {
  expects("a", R"({"backend":"wattlog","name":["A1","A2"],"payload":{}})");
  expects("b", R"({"backend":"wattlog","name":["B1","B2"],"payload":{}})");
  for (const char* name : {"B1", "A1", "B2", "A2"}) {
    arrives("wattlog", name);
  }
  EXPECT_EQ(differences(), Differences{});
  std::swap(events_[0], events_[2]);
  EXPECT_NE(differences(), Differences{});
}

TEST_F(ScenarioComparison, ApplicationsKeepNoOrderAmongEachOther) {
  expects("a", R"({"backend":"tally","name":["1","2"],"payload":{"HostApplicationDisplayID":"left"}}
{"backend":"tally","name":["3","4"],"payload":{"HostApplicationDisplayID":"right"}}
)");
  for (const char* name : {"3", "1", "2", "4"}) {
    arrives("tally", name, {{"HostApplicationDisplayID", *name < '3' ? "left" : "right"}});
  }
  EXPECT_EQ(differences(), Differences{});
  std::swap(events_[0], events_[3]);
  EXPECT_NE(differences(), Differences{});
}

TEST_F(ScenarioComparison, AMirroredSessionStaysWhereItBegan) {
  for (const char* name : {"a", "b"}) {
    expects(name, std::string(R"({"backend":"rtc","name":"createSession","payload":{"app":")") + name +
                      R"("},"detail":{"session":"<session 1>"}}
{"backend":"rtc","name":["sendMessage","flush"],"payload":{"n":1},"detail":{"session":"<session 1>"}}
)");
  }
  arrives("rtc", "createSession", {{"app", "b"}}, {{"session", 1}});
  arrives("rtc", "createSession", {{"app", "a"}}, {{"session", 2}});
  arrives("rtc", "sendMessage", {{"n", 1}}, {{"session", 1}});
  arrives("rtc", "flush", {{"n", 1}}, {{"session", 1}});
  arrives("rtc", "sendMessage", {{"n", 1}}, {{"session", 2}});
  arrives("rtc", "flush", {{"n", 1}}, {{"session", 2}});
  EXPECT_EQ(differences(), Differences{});
  events_[2].detail["session"] = 2;
  EXPECT_NE(differences(), Differences{});
}

TEST_F(ScenarioComparison, FindsAMirroredSessionThatNobodyExpects) {
  expects("a", R"({"backend":"rtc","name":"createSession","payload":{},"detail":{"session":"<session 1>"}})");
  arrives("rtc", "createSession", json::object(), {{"session", 1}});
  EXPECT_EQ(differences(), Differences{});
  arrives("rtc", "createSession", json::object(), {{"session", 2}});
  EXPECT_EQ(differences(), (Differences{"extra: rtc createSession {} {\"session\":2}"}));
}

TEST_F(ScenarioComparison, ScriptsWithoutDifferenceMayEndInAnyOrder) {
  for (const char* name : {"a", "b"}) {
    expects(name, R"({"backend":"tally","name":["uptime"],"payload":{"seconds":0}})");
  }
  arrives("tally", "uptime", {{"seconds", 0}});
  EXPECT_EQ(differences().size(), 1U);
  arrives("tally", "uptime", {{"seconds", 0}});
  EXPECT_EQ(differences(), Differences{});
}

TEST_F(ScenarioComparison, AReplyGoesToItsScript) {
  expects("a", R"({"backend":"client","name":"1 op","payload":{"result":true}})");
  expects("b", R"({"backend":"client","name":"1 op","payload":{"result":false}})");
  events_.push_back({0, kReplies, "1 op", {{"result", false}}, json::object(), "a.jsonl"});
  events_.push_back({0, kReplies, "1 op", {{"result", false}}, json::object(), "b.jsonl"});
  EXPECT_EQ(differences(), (Differences{"extra: client 1 op {\"result\":false} (a.expected.jsonl:1: payload.result is "
                                        "false, not true)",
                                        "a.expected.jsonl:1: missing: client 1 op {\"result\":true}"}));
}

TEST_F(ScenarioComparison, FindsASummaryFileThatIsMissingExtraOrSaysSomethingElse) {
  expects("a", R"({"backend":"file","name":"7-app-test","payload":{"lines":9,"content":[{"Setup_Start_1":{"n":1}}]}})");
  expectDifference("a.expected.jsonl:1: missing: file 7-app-test");
  arrives(kSummaryFiles, "7-app-test", {{"lines", 9}, {"content", {{{"Setup_Start_1", {{"n", 1}}}}}}});
  EXPECT_EQ(differences(), Differences{});
  arrives(kSummaryFiles, "8-app-test", events_[0].payload);
  expectDifference("extra: file 8-app-test");
  events_[0].payload["content"][0]["Setup_Start_1"]["n"] = 2;
  expectDifference("payload.content[0].Setup_Start_1.n is 2, not 1");
  events_[0].payload = {{"lines", 1}, {"content", {{{"Setup_Start_1", {{"n", 1}}}}}}};
  expectDifference("payload.lines is 1, not 9");
}

TEST_F(ScenarioComparison, TellsWhichLineEachEventMatched) {
  expects("a", kTwoLines);
  arrives("wattlog", "On", {{"Status", 1}});
  arrives("wattlog", "On", {{"Status", 5}});
  Comparison comparison(lines_, playing_);
  comparison.compare(events_);
  EXPECT_EQ(comparison.matches(), (std::vector<const ExpectedEvent*>{lines_.data(), nullptr}));
}

TEST_F(ScenarioComparison, FindsALedgerThatDoesNotAddUp) {
  json ledger = {{"messages_received", 4},
                 {"recorder_handed_over", 9},
                 {"recorder_committed", 9},
                 {"recorder_waiting", 0},
                 {"recorder_failed", 0},
                 {"queued", 0},
                 {"requests_refused", {{"bad_arguments", 0}}},
                 {"connections_cut", json::object()}};
  Comparison good(lines_, playing_);
  good.compareLedger(ledger, 4, 9);
  EXPECT_EQ(good.differences(), Differences{});
  ledger["recorder_committed"] = 8;
  ledger["requests_refused"]["bad_arguments"] = 1;
  Comparison bad(lines_, playing_);
  bad.compareLedger(ledger, 5, 9);
  EXPECT_EQ(bad.differences().size(), 3U);
}

}  // namespace
}  // namespace tarn::scenario
