// SPDX-License-Identifier: Apache-2.0
#include "host/traces/analysis/ChromeTrace.h"

#include <gtest/gtest.h>
#include <sys/stat.h>

#include <cerrno>
#include <random>

#include "tests/host/TemporaryFolder.h"
#include "tests/support/Seeds.h"

namespace tarn::trace_analysis {
namespace {

using linux_host::TemporaryFolder;
using Strings = std::vector<std::string>;

std::string traceOf(const std::string& events) {
  return R"({"traceEvents":[)" + events + "]}";
}

// "subsystem name begin+duration" of each interval, in nanoseconds.
Strings described(const Result<ChromeTrace>& read) {
  EXPECT_EQ(read.error.text(), "");
  Strings texts;
  for (const Interval& interval : read.value.intervals) {
    texts.push_back(read.value.texts[interval.subsystem] + " " + read.value.texts[interval.name] + " " +
                    std::to_string(interval.begin) + "+" + std::to_string(interval.duration));
  }
  return texts;
}

Strings intervalsOf(const std::string& events) {
  return described(parseTrace(traceOf(events)));
}

std::string event(const std::string& phase, const std::string& name, int microseconds, int thread = 1) {
  return R"({"ph":")" + phase + R"(","pid":1,"tid":)" + std::to_string(thread) + R"(,"ts":)" +
         std::to_string(microseconds) + (name.empty() ? "" : R"(,"cat":"s,c","name":")" + name + "\"") + "}";
}

TEST(ChromeTrace, CompleteEventsAreIntervals) {
  EXPECT_EQ(intervalsOf(R"({"ph":"X","ts":5.001,"dur":1234.567,"cat":"sys.oxbow.tarnkit,worker","name":"a.b"})"),
            Strings{"sys.oxbow.tarnkit a.b 5001+1234567"});
}

TEST(ChromeTrace, BeginsAndEndsArePairedInnermostFirst) {
  EXPECT_EQ(
      intervalsOf(event("B", "a", 1) + "," + event("B", "b", 2) + "," + event("E", "b", 3) + "," + event("E", "a", 5)),
      (Strings{"s a 1000+4000", "s b 2000+1000"}));
}

TEST(ChromeTrace, AnEndWithoutANameClosesTheInnermost) {
  EXPECT_EQ(intervalsOf(event("B", "a", 1) + "," + event("B", "b", 2) + "," + event("E", "", 3)),
            Strings{"s b 2000+1000"});
}

TEST(ChromeTrace, ABeginWithoutAnEndIsDropped) {
  EXPECT_EQ(intervalsOf(event("B", "a", 1) + "," + event("B", "lost", 2) + "," + event("E", "a", 5)),
            Strings{"s a 1000+4000"});
}

TEST(ChromeTrace, AnEndWithoutABeginIsDropped) {
  EXPECT_EQ(intervalsOf(event("E", "early", 1) + "," + event("B", "a", 2) + "," + event("E", "early", 3) + "," +
                        event("E", "a", 4)),
            Strings{"s a 2000+2000"});
}

TEST(ChromeTrace, ThreadsAndProcessesArePairedByThemselves) {
  EXPECT_EQ(intervalsOf(event("B", "a", 1, 1) + "," + event("B", "a", 2, 2) + "," + event("E", "a", 3, 1) + "," +
                        event("E", "a", 7, 2)),
            (Strings{"s a 1000+2000", "s a 2000+5000"}));
  EXPECT_TRUE(intervalsOf(R"({"ph":"B","pid":1,"tid":1,"ts":1,"name":"a"},{"ph":"E","pid":2,"tid":1,"ts":2})").empty());
}

TEST(ChromeTrace, EventsMayComeInAnyOrder) {
  EXPECT_EQ(intervalsOf(event("E", "a", 9) + "," + event("B", "a", 1)), Strings{"s a 1000+8000"});
}

TEST(ChromeTrace, OuterIntervalsComeBeforeThoseInsideThem) {
  EXPECT_EQ(intervalsOf(R"({"ph":"X","ts":1,"dur":1,"name":"in"},{"ph":"X","ts":1,"dur":3,"name":"out"})"),
            (Strings{" out 1000+3000", " in 1000+1000"}));
}

TEST(ChromeTrace, AnArrayOfEventsIsATraceToo) {
  EXPECT_EQ(described(parseTrace(R"([{"ph":"X","ts":1,"dur":2,"name":"a"}])")), Strings{" a 1000+2000"});
}

TEST(ChromeTrace, WhatIsNoIntervalIsLookedPast) {
  EXPECT_TRUE(intervalsOf(R"(7,null,"x",[{"ph":"X","ts":1,"dur":2,"name":"a"}],{},{"ph":"i","ts":1,"name":"a"},
                     {"ph":"M","name":"thread_name","args":{"name":"x"}},{"ph":"C","ts":1,"name":"c","args":{"n":1}})")
                  .empty());
  EXPECT_EQ(described(parseTrace(R"({"a":{"traceEvents":[1]},"traceEvents":[],"otherData":{"ph":"X"}})")), Strings{});
}

TEST(ChromeTrace, EventsWithAValueOfTheWrongTypeGiveNoInterval) {
  for (const char* wrong : {R"("ph":"X","ts":"1","dur":2,"name":"a")", R"("ph":"X","ts":1,"dur":[2],"name":"a")",
                            R"("ph":"X","ts":1,"dur":-2,"name":"a")", R"("ph":"X","ts":1,"name":"a")",
                            R"("ph":"X","dur":1,"name":"a")", R"("ph":"X","ts":1,"dur":2,"name":7)",
                            R"("ph":7,"ts":1,"dur":2,"name":"a")", R"("ph":"XX","ts":1,"dur":2,"name":"a")",
                            R"("ph":"X","ts":1e300,"dur":2,"name":"a")", R"("ph":"X","ts":1,"dur":1e17,"name":"a")",
                            R"("ph":"X","ts":1,"dur":2,"args":{"name":"a"})", R"("ph":"B","ts":1)"}) {
    EXPECT_TRUE(intervalsOf("{" + std::string(wrong) + "}").empty()) << wrong;
  }
  EXPECT_EQ(intervalsOf(R"({"ph":"X","ts":1,"dur":2,"name":"a","cat":3,"pid":"x","tid":{}})"), Strings{" a 1000+2000"});
}

TEST(ChromeTrace, BrokenTextsAreFailures) {
  EXPECT_EQ(parseTrace("").error.text().substr(0, 24), "it is no whole JSON text");
  EXPECT_EQ(parseTrace("{\"traceEvents\":[{}").error.text(), "it is no whole JSON text: at byte 19");
  EXPECT_FALSE(parseTrace("{\"traceEvents\":[]} x").ok());
  EXPECT_FALSE(parseTrace(traceOf("{\"name\":\"\xff\"}")).ok());
  EXPECT_EQ(parseTrace("{}").error.text(), "it has no array of trace events");
  EXPECT_EQ(parseTrace("7").error.text(), "it has no array of trace events");
  EXPECT_EQ(parseTrace(R"({"traceEvents":7})").error.text(), "it has no array of trace events");
}

TEST(ChromeTrace, EveryPrefixOfATraceIsAFailure) {
  const std::string whole = traceOf(event("B", "a", 1) + "," + event("E", "a", 2));
  for (std::size_t size = 0; size < whole.size(); ++size) {
    EXPECT_FALSE(parseTrace(std::string_view(whole).substr(0, size)).ok()) << size;
  }
}

TEST(ChromeTrace, BoundsAreFailuresBehindThem) {
  TraceLimits limits;
  limits.mostEvents = 2;
  limits.mostDepth = 4;
  const std::string two = event("B", "a", 1) + "," + event("E", "a", 2);
  EXPECT_EQ(parseTrace(traceOf(two), limits).error.text(), "");
  EXPECT_EQ(parseTrace(traceOf(two + "," + event("B", "a", 3)), limits).error.text(), "it has more than 2 events");
  EXPECT_EQ(parseTrace(traceOf(R"({"args":{}})"), limits).error.text(), "");
  EXPECT_EQ(parseTrace(traceOf(R"({"args":{"a":[]}})"), limits).error.text(), "its values nest too deep");
  limits.mostBytes = 10;
  EXPECT_EQ(parseTrace(traceOf(""), limits).error.code(), EFBIG);
}

TEST(ChromeTrace, DeepNestingIsAFailureAndNothingWorse) {
  const std::string deep(1'000'000, '[');
  EXPECT_EQ(parseTrace(deep).error.text(), "its values nest too deep");
}

TEST(ChromeTrace, FilesThatCantBeReadAreFailures) {
  const TemporaryFolder folder;
  EXPECT_EQ(readTrace(folder.path("absent")).error.code(), ENOENT);
  EXPECT_EQ(readTrace(folder.path()).error.code(), ENODEV);
  ASSERT_EQ(::mkfifo(folder.path("pipe").c_str(), 0600), 0);
  EXPECT_EQ(readTrace(folder.path("pipe")).error.code(), ENODEV);
  folder.write("large", std::string(11, ' '));
  TraceLimits limits;
  limits.mostBytes = 10;
  EXPECT_EQ(readTrace(folder.path("large"), limits).error.code(), EFBIG);
  folder.write("good", traceOf(R"({"ph":"X","ts":1,"dur":2,"name":"a"})"));
  EXPECT_EQ(described(readTrace(folder.path("good"))), Strings{" a 1000+2000"});
}

// A slow and obvious pairing: every end looks for its begin from the newest backwards.
TEST(ChromeTrace, PairsAsAStackOfEachThreadDoes) {
  for (const std::uint64_t seed : tarn::testing::testSeeds(1)) {
    SCOPED_TRACE(tarn::testing::seedNote(seed));
    std::mt19937 random(seed);
    for (int round = 0; round < 200; ++round) {
      struct Open {
        std::string name;
        int time;
      };
      std::vector<std::vector<Open>> stacks(3);
      std::vector<std::pair<int, std::string>> expected;
      std::string events;
      for (int time = 1; time <= 60; ++time) {
        const auto thread = random() % stacks.size();
        const std::string name(1, static_cast<char>('a' + random() % 3));
        const bool begins = random() % 2 == 0;
        events += (events.empty() ? "" : ",") + event(begins ? "B" : "E", name, time, static_cast<int>(thread));
        auto& stack = stacks[thread];
        if (begins) {
          stack.push_back({name, time});
          continue;
        }
        for (std::size_t i = stack.size(); i-- > 0;) {
          if (stack[i].name != name) continue;
          expected.emplace_back(stack[i].time, "s " + name + " " + std::to_string(stack[i].time * 1000) + "+" +
                                                   std::to_string((time - stack[i].time) * 1000));
          stack.resize(i);
          break;
        }
      }
      std::sort(expected.begin(), expected.end());
      Strings texts;
      for (const auto& [time, text] : expected) {
        texts.push_back(text);
      }
      ASSERT_EQ(intervalsOf(events), texts) << "round " << round;
    }
  }
}

// None of them looks through all the begins that are open.
TEST(ChromeTrace, ManyEndsWithoutTheirBeginsAreQuick) {
  constexpr int kEach = 200'000;
  std::string text = R"({"traceEvents":[)";
  for (int i = 0; i < kEach; ++i) {
    text += R"({"ph":"B","name":"a","ts":1},)";
  }
  for (int i = 0; i < kEach; ++i) {
    text += R"({"ph":"E","name":"b","ts":2},)";
  }
  const Result<ChromeTrace> read = parseTrace(text + R"({"ph":"E","name":"a","ts":3}]})");
  EXPECT_EQ(read.error.text(), "");
  ASSERT_EQ(read.value.intervals.size(), 1U);
  EXPECT_EQ(read.value.intervals[0].duration, 2000);
}

}  // namespace
}  // namespace tarn::trace_analysis
