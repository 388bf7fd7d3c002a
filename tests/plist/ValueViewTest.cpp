// SPDX-License-Identifier: Apache-2.0
#include "plist/ValueView.h"

#include <gtest/gtest.h>

#include <cmath>
#include <limits>

#include "plist/Dictionary.h"

namespace tarn::plist {
namespace {

TEST(ValueView, NumbersCompareByValueAcrossKinds) {
  EXPECT_EQ(ValueView(1), ValueView(1.0));
  EXPECT_EQ(ValueView(1), ValueView(true));
  EXPECT_EQ(ValueView(1U), ValueView(1.0F));
  EXPECT_EQ(ValueView(0.0), ValueView(-0.0));
  EXPECT_FALSE(ValueView(0.1F) == ValueView(0.1));
  EXPECT_FALSE(ValueView(-1) == ValueView(UINT64_MAX));
  EXPECT_FALSE(ValueView(INT64_MAX) == ValueView(9223372036854775808.0));
  EXPECT_EQ(ValueView(std::uint64_t{1} << 63U), ValueView(9223372036854775808.0));
  EXPECT_FALSE(ValueView((std::int64_t{1} << 53U) + 1) == ValueView(9007199254740992.0));
  EXPECT_EQ(ValueView(std::nan("")), ValueView(std::nanf("")));
}

TEST(ValueView, ValuesOfOtherKindsDiffer) {
  EXPECT_FALSE(ValueView(1) == ValueView("1"));
  EXPECT_FALSE(ValueView(1.0) == ValueView(Date{1.0}));
  EXPECT_FALSE(ValueView("a") == ValueView(DataView{"a"}));
  EXPECT_FALSE(ValueView() == ValueView(0));
  EXPECT_EQ(ValueView(), ValueView());
}

TEST(ValueView, NumbersPrintAsAPersonExpects) {
  EXPECT_EQ(description(10.0), "10");
  EXPECT_EQ(description(0.1), "0.1");
  EXPECT_EQ(description(0.1F), "0.1");
  EXPECT_EQ(description(2.5), "2.5");
  EXPECT_EQ(description(1e20), "1e+20");
  EXPECT_EQ(description(-1.25e-7), "-1.25e-07");
  EXPECT_EQ(description(100000.0), "100000");
  EXPECT_EQ(description(0.001), "0.001");
  EXPECT_EQ(description(1700000000.25), "1700000000.25");
  EXPECT_EQ(description(16777216.0F), "16777216");
  EXPECT_EQ(description(-0.0), "-0");
  EXPECT_EQ(description(std::numeric_limits<double>::infinity()), "inf");
  EXPECT_EQ(description(std::nan("")), "nan");
  EXPECT_EQ(description(true), "1");
  EXPECT_EQ(description(false), "0");
  EXPECT_EQ(description(INT64_MIN), "-9223372036854775808");
  EXPECT_EQ(description(UINT64_MAX), "18446744073709551615");
}

TEST(ValueView, OtherKindsHaveTheirTextForms) {
  EXPECT_EQ(description(Date{1795168800.0}), "2026-11-20 10:00:00 +0000");
  EXPECT_EQ(description(Date{-0.5}), "1969-12-31 23:59:59 +0000");
  EXPECT_EQ(description(Date{1e300}), "1e+300");
  EXPECT_EQ(description(DataView{"\x0a\x1b"}), "<0a1b>");
  EXPECT_EQ(description(Array{1, 2}), "(1, 2)");
  EXPECT_EQ(description(Dictionary{{"a", 1}, {"b", 2}}), "{a = 1; b = 2}");
  EXPECT_EQ(description(Array{}), "()");
  EXPECT_EQ(description(Dictionary{}), "{}");
  EXPECT_EQ(description(ValueView()), "(null)");
}

TEST(ValueView, ControlCharactersAreEscapedInsideContainersAlone) {
  EXPECT_EQ(description("a\nb"), "a\nb");
  EXPECT_EQ(description(Array{"a\nb\x01", "q\"\\"}), "(a\\nb\\u0001, q\"\\)");
  EXPECT_EQ(description(Dictionary{{"k\t", "v\r"}}), "{k\\t = v\\r}");
}

TEST(ValueView, TextCountsByItsLeadingNumber) {
  EXPECT_EQ(ValueView("12.5 dB").asDouble(), 12.5);
  EXPECT_EQ(ValueView("  -3e2x").asDouble(), -300);
  EXPECT_EQ(ValueView("+7").asDouble(), 7);
  EXPECT_EQ(ValueView("abc").asDouble(), 0);
  EXPECT_EQ(ValueView("").asDouble(), 0);
  EXPECT_EQ(ValueView("inf").asDouble(), 0);
  EXPECT_EQ(ValueView("nan").asDouble(), 0);
  EXPECT_EQ(ValueView("+-1").asDouble(), 0);
  EXPECT_EQ(ValueView("1e999").asDouble(), HUGE_VAL);
  EXPECT_EQ(ValueView("-1e999").asDouble(), -HUGE_VAL);
  EXPECT_EQ(ValueView("1e-999").asDouble(), 0);
  EXPECT_EQ(ValueView("9223372036854775807").asInt64(), INT64_MAX);
  EXPECT_EQ(ValueView("12.9").asInt64(), 12);
  EXPECT_EQ(ValueView("2e3").asInt64(), 2000);
  EXPECT_EQ(ValueView("99999999999999999999").asInt64(), INT64_MAX);
}

TEST(ValueView, DoublesAreCutTowardZeroAndHeldToTheRange) {
  EXPECT_EQ(ValueView(2.9).asInt64(), 2);
  EXPECT_EQ(ValueView(-2.9).asInt64(), -2);
  EXPECT_EQ(ValueView(1e300).asInt64(), INT64_MAX);
  EXPECT_EQ(ValueView(-1e300).asInt64(), INT64_MIN);
  EXPECT_EQ(ValueView(std::nan("")).asInt64(), 0);
  EXPECT_EQ(ValueView(UINT64_MAX).asInt64(), INT64_MAX);
  EXPECT_EQ(ValueView(-1).asUInt64(), 0U);
  EXPECT_EQ(ValueView(1e300).asUInt64(), UINT64_MAX);
  EXPECT_EQ(ValueView(-0.5).asUInt64(), 0U);
}

TEST(ValueView, WhatIsNoNumberReadsZero) {
  EXPECT_EQ(ValueView(true).asDouble(), 1);
  EXPECT_EQ(ValueView(Date{5.5}).asDouble(), 5.5);
  EXPECT_EQ(ValueView(DataView{"12"}).asDouble(), 0);
  EXPECT_EQ(ValueView(Array{12}).asInt64(), 0);
  EXPECT_EQ(ValueView(Dictionary{{"a", 1}}).asInt64(), 0);
  EXPECT_EQ(ValueView().asDouble(), 0);
  EXPECT_TRUE(ValueView("0.5").asBool());
  EXPECT_FALSE(ValueView("no").asBool());
}

TEST(ValueView, EveryKindReadsAsANumberWithoutASign) {
  EXPECT_EQ(ValueView(true).asUInt64(), 1U);
  EXPECT_EQ(ValueView(-1).asUInt64(), 0U);
  EXPECT_EQ(ValueView(UINT64_MAX).asUInt64(), UINT64_MAX);
  EXPECT_EQ(ValueView(1e30).asUInt64(), UINT64_MAX);
  EXPECT_EQ(ValueView("12").asUInt64(), 12U);
  EXPECT_EQ(ValueView("-12").asUInt64(), 0U);
  EXPECT_EQ(ValueView("9223372036854775806").asUInt64(), 9223372036854775806U);
  EXPECT_EQ(ValueView("18446744073709551615").asUInt64(), UINT64_MAX);
  EXPECT_EQ(ValueView(Array{1}).asUInt64(), 0U);
}

TEST(ValueView, WhatIsNoContainerReadsAsAnEmptyOne) {
  EXPECT_TRUE(ValueView(Dictionary{{"a", 1}}).array().empty());
  EXPECT_TRUE(ValueView(Array{1}).dictionary().empty());
  EXPECT_TRUE(ValueView().array().empty());
}

}  // namespace
}  // namespace tarn::plist
