// SPDX-License-Identifier: Apache-2.0
// What the notation of expectations stands for.
#include "tests/scenario/Notation.h"

#include <gtest/gtest.h>

#include <stdexcept>

namespace tarn::scenario {
namespace {

constexpr Playing kPlaying{1000, 1010};

bool matches(const json& expected, const json& found) {
  return differenceOf("x", expected, found, kPlaying).empty();
}

TEST(ScenarioNotation, ValuesMustBeEqual) {
  EXPECT_TRUE(matches({{"a", {1, "b", nullptr}}}, {{"a", {1.0, "b", nullptr}}}));
  EXPECT_EQ(differenceOf("x", {{"a", {{"b", 1}}}}, {{"a", {{"b", true}}}}, kPlaying), "x.a.b is true, not 1");
  EXPECT_EQ(differenceOf("x", {{"a", 1}}, json::object(), kPlaying), "x.a is missing");
  EXPECT_EQ(differenceOf("x", json::object(), {{"a", 1}}, kPlaying), "x.a is extra: 1");
  EXPECT_EQ(differenceOf("x", {1, 2}, {1, 3}, kPlaying), "x[1] is 3, not 2");
  EXPECT_EQ(differenceOf("x", {1, 2}, {1, 2, 3}, kPlaying), "x has 3 items, not 2");
  EXPECT_FALSE(matches({1}, 1));
  EXPECT_FALSE(matches("a", 1));
}

TEST(ScenarioNotation, NowIsTheTimeOfPlaying) {
  for (const double inside : {999.0, 1000.0, 1005.5, 1011.0}) {
    EXPECT_TRUE(matches("<now>", inside)) << inside;
  }
  for (const json& outside : {json(998.9), json(1011.1), json("1005"), json(true)}) {
    EXPECT_FALSE(matches("<now>", outside)) << outside;
  }
}

TEST(ScenarioNotation, KindsOfValues) {
  EXPECT_TRUE(matches("<number>", 0.5));
  EXPECT_FALSE(matches("<number>", -0.5));
  EXPECT_FALSE(matches("<number>", "0.5"));
  EXPECT_TRUE(matches("<whole>", 0));
  EXPECT_FALSE(matches("<whole>", 0.5));
  EXPECT_FALSE(matches("<whole>", -1));
  EXPECT_TRUE(matches("<whole from 2>", 2));
  EXPECT_FALSE(matches("<whole from 2>", 1));
  EXPECT_TRUE(matches("<text>", "a"));
  EXPECT_FALSE(matches("<text>", ""));
  EXPECT_FALSE(matches("<text>", 1));
  EXPECT_TRUE(matches("<any>", {1}));
  EXPECT_TRUE(matches("<session 1>", 17));
  EXPECT_FALSE(matches("<session 1>", "17"));
}

TEST(ScenarioNotation, Alternatives) {
  EXPECT_TRUE(matches("<Nominal|Fair>", "Fair"));
  EXPECT_FALSE(matches("<Nominal|Fair>", "Fai"));
  EXPECT_TRUE(matches("<true|false>", false));
  EXPECT_FALSE(matches("<true|false>", 0));
}

TEST(ScenarioNotation, TextsThatSpellAValue) {
  EXPECT_TRUE(matches("<text of number>", "0.5"));
  EXPECT_FALSE(matches("<text of number>", 0.5));
  EXPECT_FALSE(matches("<text of number>", "half"));
  EXPECT_TRUE(matches("5,<now>,a", "5,1005.25,a"));
  EXPECT_FALSE(matches("5,<now>,a", "5,900,a"));
  EXPECT_FALSE(matches("5,<now>,a", "5,1005"));
  EXPECT_FALSE(matches("5,<now>,a", "6,1005,a"));
}

TEST(ScenarioNotation, WritesDownWhatDiffersFromRunToRun) {
  const json found = {{"tarnreporting_timestamp", 1005.5},
                      {"scripted", 4102444800.0},
                      {"thermal_state", "Nominal"},
                      {"low_power_enabled", false},
                      {"load_avg_1_min", 0.25},
                      {"inner", {{"processIDs", {30, 31}}, {"list", {1, "a,b", 1006}}}},
                      {"name", "a, b"}};
  const json written = {{"tarnreporting_timestamp", "<now>"},
                        {"scripted", 4102444800.0},
                        {"thermal_state", "<Nominal|Fair|Serious|Critical|Unknown>"},
                        {"low_power_enabled", "<true|false>"},
                        {"load_avg_1_min", "<number>"},
                        {"inner", {{"processIDs", {"<whole>", "<whole>"}}, {"list", {1, "a,b", "<now>"}}}},
                        {"name", "a, b"}};
  EXPECT_EQ(asExpectation(found, kPlaying), written);
  EXPECT_TRUE(matches(written, found));
}

TEST(ScenarioNotation, WritesDownTheTextsOfASummaryEvent) {
  const json found = {{"tarnreporting_timestamp", "4102444800,1005.5"},
                      {"low_power_enabled", "0"},
                      {"vmInfo_phys_footprint_MiB", "12"}};
  const json written = {{"tarnreporting_timestamp", "4102444800,<now>"},
                        {"low_power_enabled", "<0|1>"},
                        {"vmInfo_phys_footprint_MiB", "<text of whole>"}};
  EXPECT_EQ(asExpectation(found, kPlaying), written);
  EXPECT_TRUE(matches(written, found));
}

TEST(ScenarioNotation, AnImpossibleFactAboutTheMachineIsWrittenDownAsItIs) {
  EXPECT_EQ(asExpectation({{"thermal_state", "Boiling"}}, kPlaying), (json{{"thermal_state", "Boiling"}}));
  EXPECT_EQ(asExpectation({{"vmInfo_phys_footprint_MiB", -1}}, kPlaying), (json{{"vmInfo_phys_footprint_MiB", -1}}));
}

TEST(ScenarioNotation, ATextThatLooksLikeANotation) {
  const json found = {{"data", "<ff>"}, {"list", "<ff>,<now>"}};
  const json written = asExpectation(found, kPlaying);
  EXPECT_EQ(written, (json{{"data", "<=<ff>>"}, {"list", "<=<ff>>,<=<now>>"}}));
  EXPECT_TRUE(matches(written, found));
  EXPECT_FALSE(matches(written, {{"data", "<fe>"}, {"list", "<ff>,<now>"}}));
  EXPECT_NO_THROW(checkNotation(written));
}

TEST(ScenarioNotation, RefusesWhatMeansNothing) {
  EXPECT_NO_THROW(checkNotation({{"a", {"<now>", "1,<text of whole>", "<session 3>", "Foo<0x12>"}}}));
  for (const char* wrong : {"<nwo>", "1,<nwo>", "<text of nwo>"}) {
    EXPECT_THROW(checkNotation({{"a", {wrong}}}), std::runtime_error) << wrong;
  }
}

}  // namespace
}  // namespace tarn::scenario
