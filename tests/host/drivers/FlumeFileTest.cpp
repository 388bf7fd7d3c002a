// SPDX-License-Identifier: Apache-2.0
// The text of a driver's file of report channels.
#include "host/drivers/FlumeFile.h"

#include <gtest/gtest.h>

#include <limits>

namespace tarn::linux_host {
namespace {

using platform::FlumeChannel;
using platform::FlumeFormat;
using platform::FlumeSamples;

// A file of one channel with these members.
Result<FlumeSamples> readChannel(const std::string& members) {
  return parseFlumeFile(R"({"driver": "d", "channels": [{)" + members + "}]}");
}
std::string complaintOf(const std::string& text) {
  const Result<FlumeSamples> reading = parseFlumeFile(text);
  EXPECT_TRUE(reading.value.empty()) << text;
  return reading.error.text();
}
std::string complaintOfChannel(const std::string& members) {
  return complaintOf(R"({"driver": "d", "channels": [{)" + members + "}]}");
}

// A value of each kind that JSON has, none of them good for a number, a text or a list.
const char* const kOddValues[] = {"true", "\"7\"", "[]", "{}", "{\"$date\": 7}", "{\"$data\": \"AAAA\"}", "7.5"};

TEST(FlumeFile, ReadsChannelsOfEveryFormat) {
  const Result<FlumeSamples> reading = parseFlumeFile(
      R"({"driver": "OxbowFoo<0x12>", "group": "Haptics", "subgroup": "Stats", "version": 3, "channels": [
        {"name": "Engine On", "format": "simple", "unit": "times", "value": 12, "more": [1]},
        {"name": "Latency", "format": "histogram", "unit": "us", "min": -1, "max": 90,
         "buckets": [[-50, 50, 3], [50, 100, 1]]},
        {"name": "Engine", "format": "state", "unit": "ms", "states": [
          {"name": "on", "transitions": 3, "residency": 1500, "duty_cycle": 0.25},
          {"name": "off", "transitions": 0, "residency": 18446744073709551615, "duty_cycle": 1}]},
        {"name": "Rates", "format": "simplearray", "value": [1, 2]}]})");
  EXPECT_EQ(reading.error.text(), "");
  ASSERT_EQ(reading.value.size(), 4U);
  for (const FlumeChannel& channel : reading.value) {
    EXPECT_EQ(channel.name.driver, "OxbowFoo<0x12>");
    EXPECT_EQ(channel.name.group, "Haptics");
    EXPECT_EQ(channel.name.subGroup, "Stats");
  }
  EXPECT_EQ(reading.value[0].name.name, "Engine On");
  EXPECT_EQ(reading.value[0].format, FlumeFormat::Simple);
  EXPECT_EQ(reading.value[0].unit, "times");
  EXPECT_EQ(reading.value[0].value, 12);
  const FlumeChannel& histogram = reading.value[1];
  EXPECT_EQ(histogram.format, FlumeFormat::Histogram);
  EXPECT_EQ(histogram.minimum, -1);
  EXPECT_EQ(histogram.maximum, 90);
  ASSERT_EQ(histogram.buckets.size(), 2U);
  EXPECT_EQ(histogram.buckets[0].lower, -50);
  EXPECT_EQ(histogram.buckets[0].upper, 50);
  EXPECT_EQ(histogram.buckets[0].hits, 3);
  EXPECT_EQ(histogram.buckets[1].boundsError, 0);
  const FlumeChannel& state = reading.value[2];
  EXPECT_EQ(state.format, FlumeFormat::State);
  ASSERT_EQ(state.states.size(), 2U);
  EXPECT_EQ(state.states[0].name, "on");
  EXPECT_EQ(state.states[0].transitions, 3U);
  EXPECT_EQ(state.states[0].residency, 1500U);
  EXPECT_EQ(state.states[0].dutyCycle, 0.25);
  EXPECT_EQ(state.states[1].residency, std::numeric_limits<std::uint64_t>::max());
  EXPECT_EQ(state.states[1].dutyCycle, 1);
  EXPECT_EQ(reading.value[3].format, FlumeFormat::SimpleArray);
  EXPECT_FALSE(reading.value[3].unit);
}

TEST(FlumeFile, GroupSubgroupAndUnitMayBeMissing) {
  const Result<FlumeSamples> reading = readChannel(R"("name": "", "format": "simple", "value": -5)");
  ASSERT_EQ(reading.value.size(), 1U);
  EXPECT_FALSE(reading.value[0].name.group);
  EXPECT_FALSE(reading.value[0].name.subGroup);
  EXPECT_EQ(reading.value[0].name.name, "");
  EXPECT_EQ(reading.value[0].value, -5);
}

TEST(FlumeFile, WholeNumbersMayBeWrittenAsDecimals) {
  EXPECT_EQ(readChannel(R"("name": "a", "format": "simple", "value": 5.0)").value.at(0).value, 5);
  EXPECT_EQ(readChannel(R"("name": "a", "format": "simple", "value": -9.223372036854775808e18)").value.at(0).value,
            std::numeric_limits<std::int64_t>::min());
  EXPECT_EQ(complaintOfChannel(R"("name": "a", "format": "simple", "value": 9.223372036854775808e18)"),
            "channel 1 \"a\": \"value\" must be a whole number");
  EXPECT_EQ(complaintOfChannel(R"("name": "a", "format": "simple", "value": 18446744073709551615)"),
            "channel 1 \"a\": \"value\" must be a whole number");
}

TEST(FlumeFile, FileOfAnotherFormHoldsNoChannel) {
  EXPECT_EQ(complaintOf("[]"), "must be an object");
  EXPECT_EQ(complaintOf("{}"), "\"driver\" must be a text");
  EXPECT_EQ(complaintOf(R"({"driver": "d"})"), "\"channels\" must be a list");
  for (const std::string odd : {"true", "7", "[]", "{}", "{\"$date\": 7}"}) {
    EXPECT_EQ(complaintOf(R"({"driver": )" + odd + R"(, "channels": []})"), "\"driver\" must be a text");
    for (const std::string key : {"group", "subgroup"}) {
      EXPECT_EQ(complaintOf(R"({"driver": "d", ")" + key + "\": " + odd + R"(, "channels": []})"),
                "\"group\" and \"subgroup\" must be texts");
    }
  }
  for (const std::string odd : {"true", "7", "\"a\"", "{}", "{\"$data\": \"AAAA\"}"}) {
    EXPECT_EQ(complaintOf(R"({"driver": "d", "channels": )" + odd + "}"), "\"channels\" must be a list");
  }
}

TEST(FlumeFile, HalfWrittenFileHoldsNoChannelAtAnyLength) {
  const std::string whole = R"({"driver": "d", "channels": [{"name": "a", "format": "simple", "value": 1}]})";
  ASSERT_EQ(parseFlumeFile(whole).value.size(), 1U);
  for (std::size_t length = 0; length < whole.size(); ++length) {
    EXPECT_NE(complaintOf(whole.substr(0, length)), "") << length;
    EXPECT_NE(complaintOf(whole.substr(0, length) + std::string(whole.size() - length, '\0')), "") << length;
  }
}

TEST(FlumeFile, WrongChannelIsLeftOutAndTheOthersCount) {
  const Result<FlumeSamples> reading = parseFlumeFile(R"({"driver": "d", "channels": [
    {"name": "a", "format": "simple", "value": 1}, {"name": "b\n", "format": "simple"}, 7,
    {"name": "c", "format": "simple", "value": 2}, {"name": "a", "format": "state", "states": []}]})");
  ASSERT_EQ(reading.value.size(), 2U);
  EXPECT_EQ(reading.value[0].value, 1);
  EXPECT_EQ(reading.value[1].value, 2);
  EXPECT_EQ(reading.error.text(), R"(channel 2 "b\n": "value" must be a whole number (2 more))");
}

TEST(FlumeFile, EachMemberOfAnotherKindMakesTheChannelWrong) {
  for (const std::string odd : kOddValues) {
    SCOPED_TRACE(odd);
    if (odd != "\"7\"") {
      EXPECT_EQ(complaintOfChannel("\"name\": " + odd + R"(, "format": "simple", "value": 1)"),
                "channel 1: \"name\" must be a text");
      EXPECT_EQ(complaintOfChannel(R"("name": "a", "format": "simple", "value": 1, "unit": )" + odd),
                "channel 1 \"a\": \"unit\" must be a text");
    }
    EXPECT_EQ(complaintOfChannel(R"("name": "a", "value": 1, "format": )" + odd),
              "channel 1 \"a\": \"format\" must be simple, histogram, state or simplearray");
    EXPECT_EQ(complaintOfChannel(R"("name": "a", "format": "simple", "value": )" + odd),
              "channel 1 \"a\": \"value\" must be a whole number");
    for (const std::string& numbers : {"\"min\": 1, \"max\": " + odd, "\"max\": 1, \"min\": " + odd}) {
      EXPECT_EQ(complaintOfChannel(R"("name": "a", "format": "histogram", "buckets": [], )" + numbers),
                "channel 1 \"a\": \"min\" and \"max\" must be whole numbers");
    }
    for (const std::string& bucket : {odd, "[" + odd + ", 1, 1]", "[1, " + odd + ", 1]", "[1, 1, " + odd + "]"}) {
      EXPECT_EQ(
          complaintOfChannel(R"("name": "a", "format": "histogram", "min": 0, "max": 1, "buckets": [)" + bucket + "]"),
          "channel 1 \"a\": a bucket must be [lower, upper, hits]");
    }
    EXPECT_EQ(complaintOfChannel(R"("name": "a", "format": "state", "states": [)" + odd + "]"),
              "channel 1 \"a\": a state must have \"name\", \"transitions\", \"residency\" and \"duty_cycle\"");
    for (const std::string key : {"name", "transitions", "residency", "duty_cycle"}) {
      const bool fits = (key == "name" && odd == "\"7\"") || (key == "duty_cycle" && odd == "7.5");
      std::string members;
      for (const std::string each : {"name", "transitions", "residency", "duty_cycle"}) {
        members += (members.empty() ? "\"" : ", \"") + each + "\": " +
                   (each == key      ? odd
                    : each == "name" ? "\"n\""
                                     : "1");
      }
      const Result<FlumeSamples> reading =
          readChannel(R"("name": "a", "format": "state", "states": [{)" + members + "}]");
      EXPECT_EQ(reading.value.size(), fits ? 1U : 0U) << key;
      EXPECT_EQ(reading.ok(), fits) << key;
    }
  }
}

TEST(FlumeFile, CountsBelowZeroMakeTheChannelWrong) {
  EXPECT_NE(complaintOfChannel(R"("name": "a", "format": "histogram", "min": 0, "max": 1, "buckets": [[0, 1, -1]])"),
            "");
  EXPECT_NE(complaintOfChannel(R"("name": "a", "format": "state", "states": [
      {"name": "on", "transitions": -1, "residency": 1, "duty_cycle": 1}]})"),
            "");
  EXPECT_NE(complaintOfChannel(R"("name": "a", "format": "state", "states": [
      {"name": "on", "transitions": 1, "residency": -1, "duty_cycle": 1}])"),
            "");
}

TEST(FlumeFile, StateThatStandsTwiceMakesTheChannelWrong) {
  EXPECT_EQ(complaintOfChannel(R"("name": "a", "format": "state", "states": [
      {"name": "on", "transitions": 1, "residency": 1, "duty_cycle": 1},
      {"name": "on", "transitions": 1, "residency": 1, "duty_cycle": 1}])"),
            "channel 1 \"a\": a state stands twice");
}

TEST(FlumeFile, WhatIsBeyondTheBoundsIsLeftOut) {
  const FlumeFileBounds bounds{2, 1, 1};
  const auto file = [&](const std::string& channels) {
    return parseFlumeFile(R"({"driver": "d", "channels": [)" + channels + "]}", bounds);
  };
  const std::string a = R"({"name": "a", "format": "simple", "value": 1})";
  const std::string b = R"({"name": "b", "format": "simple", "value": 1})";
  const std::string c = R"({"name": "c", "format": "simple", "value": 1})";
  EXPECT_EQ(file(a + "," + b).error.text(), "");
  EXPECT_EQ(file(a + "," + b + "," + c).value.size(), 2U);
  EXPECT_EQ(file(a + "," + b + "," + c).error.text(), "channel 3: a file has at most 2 channels");
  const std::string bucket = "[0, 1, 1]";
  const auto histogram = [&](const std::string& buckets) {
    return file(R"({"name": "a", "format": "histogram", "min": 0, "max": 1, "buckets": [)" + buckets + "]}");
  };
  EXPECT_EQ(histogram(bucket).value.size(), 1U);
  EXPECT_EQ(histogram(bucket + "," + bucket).error.text(),
            "channel 1 \"a\": \"buckets\" must be a list of at most 1 buckets");
  const auto states = [&](const std::string& items) {
    return file(R"({"name": "a", "format": "state", "states": [)" + items + "]}");
  };
  const std::string on = R"({"name": "on", "transitions": 1, "residency": 1, "duty_cycle": 1})";
  EXPECT_EQ(states(on).value.size(), 1U);
  EXPECT_EQ(states(on + "," + on).error.text(), "channel 1 \"a\": \"states\" must be a list of at most 1 states");
}

TEST(FlumeFile, NullIsAsGoodAsNoMember) {
  const Result<FlumeSamples> reading = parseFlumeFile(
      R"({"driver": "d", "group": null, "subgroup": null, "channels": [
          {"name": "a", "format": "simple", "unit": null, "value": 3, "more": null},
          {"name": "b", "format": "simple", "value": null}]})");
  ASSERT_EQ(reading.value.size(), 1U);
  EXPECT_EQ(reading.value[0].name, (platform::FlumeChannelName{"d", {}, {}, "a"}));
  EXPECT_FALSE(reading.value[0].unit);
  EXPECT_EQ(reading.error.text(), "channel 2 \"b\": \"value\" must be a whole number");
  EXPECT_EQ(complaintOf(R"({"driver": null, "channels": []})"), "\"driver\" must be a text");
}

}  // namespace
}  // namespace tarn::linux_host
