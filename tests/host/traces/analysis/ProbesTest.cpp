// SPDX-License-Identifier: Apache-2.0
#include "host/traces/analysis/Probes.h"
#include "tests/support/Seeds.h"

#include <gtest/gtest.h>

#include <random>

namespace tarn::trace_analysis {
namespace {

class ProbeDescriptions : public ::testing::Test {
 protected:
  // Texts by number: intervals of two subsystems and two names.
  const ChromeTrace trace_{{"sys.oxbow.tarnkit", "Tally.start", "other", "Tally.stop"},
                           {{0, 10, 1, 0}, {20, 10, 3, 0}, {40, 10, 1, 2}}};

  std::vector<Probe> probes(const std::string& descriptions) const {
    const Result<std::vector<Probe>> read = probesFor("[" + descriptions + "]", trace_);
    EXPECT_EQ(read.error.text(), "");
    return read.value;
  }
};

TEST_F(ProbeDescriptions, ASignpostPatternMeasuresTheIntervalsOfThoseNames) {
  const auto found = probes(R"({"name": "Tally", "signpost": "*.start"})");
  ASSERT_EQ(found.size(), 1U);
  EXPECT_EQ(found[0].name, "Tally");
  EXPECT_TRUE(found[0].measuresIntervals);
  EXPECT_EQ(found[0].events, (std::vector<std::uint32_t>{0, 2}));
}

TEST_F(ProbeDescriptions, ASubsystemPatternNarrowsThem) {
  const auto found = probes(R"({"name": "Tally", "signpost": "Tally.*", "subsystem": "sys.oxbow.*"})");
  EXPECT_EQ(found.at(0).events, (std::vector<std::uint32_t>{0, 1}));
}

TEST_F(ProbeDescriptions, TheTypeMayBeGiven) {
  const auto all = probes(R"({"name": "All", "type": "SkeinSignpostIntervalProbe"})");
  EXPECT_EQ(all.at(0).events.size(), 3U);
  const auto group = probes(R"({"name": "Group", "type": "SkeinProbe", "signpost": "*"})");
  EXPECT_FALSE(group.at(0).measuresIntervals);
  EXPECT_TRUE(group.at(0).events.empty());
}

TEST_F(ProbeDescriptions, ProbesNest) {
  const auto found =
      probes(R"({"name": "Group", "children": [{"name": "A", "signpost": "*"}, {"name": "B", "children": []}]})");
  ASSERT_EQ(found.at(0).children.size(), 2U);
  EXPECT_FALSE(found[0].measuresIntervals);
  EXPECT_EQ(found[0].children[0].events.size(), 3U);
  EXPECT_EQ(found[0].children[1].name, "B");
}

TEST_F(ProbeDescriptions, DescriptionsThatAskForNoProbeAreSkipped) {
  EXPECT_TRUE(probes(R"({}, {"signpost": "*"}, {"name": ""}, {"name": 7}, 7, null, "x", [],
                        {"name": "a", "type": "Other"}, {"name": "a", "type": 1}, {"name": "a", "signpost": 1},
                        {"name": "a", "subsystem": []}, {"name": "a", "children": {}})")
                  .empty());
  EXPECT_EQ(probes(R"({"name": 1, "children": [{"name": "lost"}]}, {"name": "kept"})").size(), 1U);
}

TEST_F(ProbeDescriptions, WhatIsNoArrayIsAFailure) {
  EXPECT_EQ(probesFor("{}", trace_).error.text(), "the descriptions are no JSON array");
  EXPECT_EQ(probesFor("[", trace_).error.text(), "the descriptions are no JSON array");
  EXPECT_EQ(probesFor(std::string((std::size_t{4} << 20U) + 1, ' '), trace_).error.text(),
            "the descriptions are too large");
}

TEST_F(ProbeDescriptions, BoundsAreFailuresBehindThem) {
  const std::string nested = R"([{"name": "a", "children": [{"name": "b", "signpost": "*"}]}])";
  EXPECT_EQ(probesFor(nested, trace_, {2, 2, 3}).error.text(), "");
  EXPECT_EQ(probesFor(nested, trace_, {1, 2, 3}).error.text(), "there are more than 1 probes");
  EXPECT_EQ(probesFor(nested, trace_, {2, 1, 3}).error.text(), "probes nest more than 1 deep");
  const Result<std::vector<Probe>> read = probesFor(nested, trace_, {2, 2, 2});
  EXPECT_EQ(read.error.text(), "the probes have more than 2 events");
  EXPECT_TRUE(read.value.empty());
}

TEST(ProbePattern, StarsMatchAnyRunAndQuestionMarksAnyCharacter) {
  EXPECT_TRUE(matchesPattern("", ""));
  EXPECT_TRUE(matchesPattern("*", ""));
  EXPECT_TRUE(matchesPattern("a*c*", "abcabc"));
  EXPECT_TRUE(matchesPattern("a?c", "abc"));
  EXPECT_TRUE(matchesPattern("*ab", "aab"));
  EXPECT_FALSE(matchesPattern("", "a"));
  EXPECT_FALSE(matchesPattern("?", ""));
  EXPECT_FALSE(matchesPattern("a", "ab"));
  EXPECT_FALSE(matchesPattern("a*b", "abc"));
  EXPECT_FALSE(matchesPattern("[a]", "a"));
}

TEST(ProbePattern, AnEvilPatternIsQuick) {
  std::string pattern;
  for (int i = 0; i < 2000; ++i) {
    pattern += "*a";
  }
  EXPECT_FALSE(matchesPattern(pattern + "b", std::string(5000, 'a')));
}

// Against the rule written down plainly.
bool obviously(std::string_view pattern, std::string_view text) {
  if (pattern.empty()) return text.empty();
  if (pattern[0] == '*') {
    return obviously(pattern.substr(1), text) || (!text.empty() && obviously(pattern, text.substr(1)));
  }
  return !text.empty() && (pattern[0] == '?' || pattern[0] == text[0]) && obviously(pattern.substr(1), text.substr(1));
}

TEST(ProbePattern, MatchesAsTheRuleSays) {
  for (const std::uint64_t seed : tarn::testing::testSeeds(1)) {
    SCOPED_TRACE(tarn::testing::seedNote(seed));
    std::mt19937 random(seed);
    const auto made = [&](std::string_view letters, std::size_t most) {
      std::string text;
      for (std::size_t left = random() % most; left > 0; --left) {
        text += letters[random() % letters.size()];
      }
      return text;
    };
    for (int round = 0; round < 20000; ++round) {
      const std::string pattern = made("ab*?", 8);
      const std::string text = made("ab", 10);
      ASSERT_EQ(matchesPattern(pattern, text), obviously(pattern, text)) << pattern << " and " << text;
    }
  }
}

}  // namespace
}  // namespace tarn::trace_analysis
