// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <cmath>

#include "plist/Dictionary.h"
#include "plist/formats/Json.h"

namespace tarn::plist {
namespace {

std::string pretty(const ValueView& value, std::size_t level = 0) {
  std::string out;
  const auto complaint = appendPrettyJson(out, value, level);
  return complaint.value_or(out);
}

TEST(PrettyJson, MembersAreSortedAndIndentedByTwo) {
  EXPECT_EQ(pretty(Dictionary{{"b", 1}, {"a", Dictionary{{"y", Array{1, "x"}}, {"x", true}}}, {"B", 2.0}}),
            R"({
  "B": 2.0,
  "a": {
    "x": true,
    "y": [
      1,
      "x"
    ]
  },
  "b": 1
})");
}

TEST(PrettyJson, OrderOfTheKeysDoesNotShow) {
  EXPECT_EQ(pretty(Dictionary{{"a", 1}, {"b", 2}}), pretty(Dictionary{{"b", 2}, {"a", 1}}));
}

TEST(PrettyJson, EmptyContainersStayOnTheirLine) {
  EXPECT_EQ(pretty(Dictionary()), "{}");
  EXPECT_EQ(pretty(Array()), "[]");
  EXPECT_EQ(pretty(Dictionary{{"a", Array()}, {"b", Dictionary()}}), "{\n  \"a\": [],\n  \"b\": {}\n}");
}

TEST(PrettyJson, ScalarsAreWrittenAsInCompactJson) {
  for (const ValueView& value : {ValueView(true), ValueView(-5), ValueView(UINT64_MAX), ValueView(0.1F),
                                 ValueView(10.0), ValueView(1e300), ValueView("a\"\\\n\x01\xc3\xa9/")}) {
    std::string compact;
    appendJson(compact, value);
    EXPECT_EQ(pretty(value), compact);
  }
}

TEST(PrettyJson, KeysAreEscaped) {
  EXPECT_EQ(pretty(Dictionary{{"a\"\n", 1}}), "{\n  \"a\\\"\\n\": 1\n}");
}

TEST(PrettyJson, LevelIndentsTheLinesAfterTheFirst) {
  EXPECT_EQ(pretty(Dictionary{{"a", Array{1}}}, 1), "{\n    \"a\": [\n      1\n    ]\n  }");
}

TEST(PrettyJson, AppendsBehindWhatIsThere) {
  std::string out = "x";
  EXPECT_EQ(appendPrettyJson(out, 1), std::nullopt);
  EXPECT_EQ(out, "x1");
}

TEST(PrettyJson, WhatJsonCannotHoldIsRefused) {
  EXPECT_EQ(pretty(Date{0}), "JSON can't hold a date");
  EXPECT_EQ(pretty(DataView{""}), "JSON can't hold data");
  EXPECT_EQ(pretty(ValueView()), "JSON can't hold an absent value");
  for (const ValueView& value : {ValueView(std::nan("")), ValueView(HUGE_VAL), ValueView(-HUGE_VAL),
                                 ValueView(HUGE_VALF), ValueView(-HUGE_VALF)}) {
    EXPECT_EQ(pretty(value), "JSON can't hold a number that is not finite");
  }
}

TEST(PrettyJson, ComplaintNamesThePlaceAtAnyDepth) {
  EXPECT_EQ(pretty(Dictionary{{"a", 1}, {"list", Array{0, Dictionary{{"wh\"en", Date{7}}}}}}),
            R"(JSON can't hold a date at ["list"][1]["wh\"en"])");
}

TEST(PrettyJson, RefusalLeavesTheTextAsItWas) {
  std::string out = "before";
  EXPECT_TRUE(appendPrettyJson(out, Array{1, 2, Array{DataView{"x"}}}).has_value());
  EXPECT_EQ(out, "before");
}

}  // namespace
}  // namespace tarn::plist
