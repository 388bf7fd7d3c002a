// SPDX-License-Identifier: Apache-2.0
// New expectations from what arrived.
#include "tests/scenario/Update.h"

#include "tests/scenario/Comparison.h"
#include "tests/scenario/ScenarioFixture.h"

namespace tarn::scenario {
namespace {

class ScenarioUpdate : public ScenarioFixture {
 protected:
  void arrives(const std::string& backend, const std::string& name, json payload, json detail = json::object()) {
    ScenarioFixture::arrives(backend, name, std::move(payload), std::move(detail));
    events_.back().script = "a.jsonl";
  }
};

TEST_F(ScenarioUpdate, WhatIsWrittenIsWhatArrived) {
  arrives("wattlog", "On", {{"Status", 1}, {"TimestampEnd", 1005.5}}, {{"agent", 28}});
  arrives("rtc", "createSession", json::object(), {{"session", 17}});
  arrives("rtc", "createSession", json::object(), {{"session", 18}});
  arrives("rtc", "flush", json::object(), {{"session", 17}});
  writeExpectations(script("a"), updated({}, events_, playing_));
  const auto lines = readExpectations(script("a"));
  EXPECT_EQ(lines.size(), 4U);
  Comparison comparison(lines, playing_);
  comparison.compare(events_);
  EXPECT_EQ(comparison.differences(), Differences{});
}

TEST_F(ScenarioUpdate, KeepsALineThatStillHolds) {
  const auto old = beside("a", R"({"backend":"client","name":"1 all","payload":{"result":"<any>"}}
{"backend":"client","name":"2 x","payload":{"result":1}}
)");
  arrives(kReplies, "1 all", {{"result", {1, 2}}});
  arrives(kReplies, "2 x", {{"result", 2}});
  const auto lines = updated(old, events_, playing_);
  ASSERT_EQ(lines.size(), 2U);
  EXPECT_EQ(lines[0].payload, (json{{"result", "<any>"}}));
  EXPECT_EQ(lines[1].payload, (json{{"result", 2}}));
}

TEST_F(ScenarioUpdate, LeavesOutWhatDidNotArrive) {
  const auto old = beside("a", R"({"backend":"wattlog","name":["On","Off"],"payload":{}})");
  arrives("wattlog", "Off", json::object());
  const auto lines = updated(old, events_, playing_);
  ASSERT_EQ(lines.size(), 1U);
  EXPECT_EQ(lines[0].name, "Off");
}

TEST_F(ScenarioUpdate, ANewEventOfAKnownSessionJoinsIt) {
  const auto old =
      beside("a", R"({"backend":"rtc","name":"createSession","payload":{},"detail":{"session":"<session 4>"}})");
  arrives("rtc", "createSession", json::object(), {{"session", 9}});
  arrives("rtc", "flush", json::object(), {{"session", 9}});
  arrives("rtc", "createSession", {{"n", 1}}, {{"session", 10}});
  const auto lines = updated(old, events_, playing_);
  ASSERT_EQ(lines.size(), 3U);
  EXPECT_EQ(lines[0].detail.at("session"), "<session 4>");
  EXPECT_EQ(lines[1].detail.at("session"), "<session 4>");
  EXPECT_EQ(lines[2].detail.at("session"), "<session 1>");
}

}  // namespace
}  // namespace tarn::scenario
