// SPDX-License-Identifier: Apache-2.0
#include "service/vocabulary/TarnReportingLog.h"

#include <gtest/gtest.h>

#include <limits>
#include <string>

#include "plist/Dictionary.h"
#include "testing/FakePlatform.h"

namespace tarn {
namespace {

constexpr TarnReportingLogger kPlainLog{TarnReportingSessionCategory, {}};
constexpr TarnReportingLogger kModuleLog{TarnReportingClientCategory, "TarnReportingClient"};

class TarnReportingLogTest : public ::testing::Test {
 protected:
  // The one line that was logged, without its prefix.
  std::string message() const {
    const auto messages = platform_.log.messages();
    EXPECT_EQ(messages.size(), 1U);
    return messages.empty() ? std::string() : messages.front();
  }
  template <class... Arguments>
  std::string formatted(const LogText& text, const Arguments&... arguments) {
    platform_.log.clear();
    TarnReportingLog(TarnReportingSessionCategory(), LogLevel::Default, "Module", text, arguments...);
    return message();
  }

  testing::FakePlatform platform_;
};

TEST_F(TarnReportingLogTest, PutsModuleAndLineInFrontInTheirColumns) {
  TarnReportingLog(TarnReportingSessionCategory(), LogLevel::Info, "TarnReportingUtility", LogText("continuing", 42));
  EXPECT_EQ(platform_.log.texts().front(), "     TarnReportingUtility:42    continuing");
}

TEST_F(TarnReportingLogTest, LongModuleNamesAndLineNumbersAreNotCut) {
  TarnReportingLog(TarnReportingSessionCategory(), LogLevel::Info, "TarnReportingSessionMessageLog",
                   LogText("text", 123456));
  EXPECT_EQ(platform_.log.texts().front(), "TarnReportingSessionMessageLog:123456 text");
}

TEST_F(TarnReportingLogTest, EntryCarriesCategoryLevelModuleAndTheLineOfTheStatement) {
  const int before = __LINE__;
  TarnReportingLog(TarnReportingClientCategory(), LogLevel::Error, "TarnReportingClient", "text");
  const auto entry = platform_.log.entries().front();
  EXPECT_EQ(entry.subsystem, "sys.oxbow.tarnkit");
  EXPECT_EQ(entry.category, "tarnrc");
  EXPECT_EQ(entry.level, LogLevel::Error);
  EXPECT_EQ(entry.module, "TarnReportingClient");
  EXPECT_EQ(entry.line, before + 1);
}

TEST_F(TarnReportingLogTest, LoggerOfAModuleAddsItsNameItsCategoryAndTheLineOfTheStatement) {
  const int before = __LINE__;
  kModuleLog(LogLevel::Error, "%@ of %i", "one", 2);
  const auto entry = platform_.log.entries().front();
  EXPECT_EQ(entry.category, "tarnrc");
  EXPECT_EQ(entry.level, LogLevel::Error);
  EXPECT_EQ(entry.module, "TarnReportingClient");
  EXPECT_EQ(entry.line, before + 1);
  EXPECT_EQ(message(), "one of 2");
}

TEST_F(TarnReportingLogTest, LoggerOfADisabledLevelWritesNothingAndCallsNoCallable) {
  int calls = 0;
  platform_.log.setThreshold(LogLevel::Error);
  kModuleLog(LogLevel::Default, "%i", [&calls] { return ++calls; });
  EXPECT_EQ(calls, 0);
  EXPECT_TRUE(platform_.log.texts().empty());
}

TEST_F(TarnReportingLogTest, LongLinesAreCutBetweenCharactersAndTellHowMuchIsMissing) {
  const std::size_t limit = 65536;
  kPlainLog(LogLevel::Default, "%@", std::string(limit, 'x'));
  EXPECT_EQ(platform_.log.texts().back(), std::string(limit, 'x'));
  kPlainLog(LogLevel::Default, "%@", std::string(limit + 1, 'x'));
  EXPECT_EQ(platform_.log.texts().back(), std::string(limit, 'x') + " ... (1 more bytes)");
  const std::string accent = "\xC3\xA9";
  kPlainLog(LogLevel::Default, "%@", std::string(limit - 1, 'x') + accent);
  EXPECT_EQ(platform_.log.texts().back(), std::string(limit - 1, 'x') + " ... (2 more bytes)");
}

TEST_F(TarnReportingLogTest, PlainLinesCarryNoPrefix) {
  kPlainLog(LogLevel::Default, "count=%lu", std::size_t{3});
  const auto entry = platform_.log.entries().front();
  EXPECT_EQ(entry.text, "count=3");
  EXPECT_EQ(entry.module, "");
}

TEST_F(TarnReportingLogTest, EveryCategoryHasItsCodeUnderTheOneSubsystem) {
  const std::pair<const platform::LogCategory&, std::string_view> categories[] = {
      {TarnReportingClientCategory(), "tarnrc"},        {TarnReportingServiceDelegateCategory(), "tarnrs"},
      {TarnReportingSessionCategory(), "tarnrr"},       {TarnReportingSessionRTCReportingCategory(), "tarnri"},
      {TarnReportingDriverUtilityCategory(), "tarnrd"}, {TarnReportingTraceCategory(), "tarnrt"},
      {TarnReportingWattlogCategory(), "tarnrp"},       {TarnReportingPylonLogCategory(), "tarnra"},
      {TarnReportingSnareLogCategory(), "tarnrb"},      {TarnReportingSummaryLogCategory(), "tarnru"},
      {TarnReportingDPLogCategory(), "tarnrl"},         {TarnReportingAudioRegistrationCategory(), "tarnrz"},
  };
  for (const auto& [category, code] : categories) {
    EXPECT_EQ(category.subsystem, "sys.oxbow.tarnkit");
    EXPECT_EQ(category.code, code);
  }
}

TEST_F(TarnReportingLogTest, IntegersPrintInDecimalWhateverTheirWidth) {
  EXPECT_EQ(formatted("%i %d %lli %lld %li %ld", -1, 2, std::numeric_limits<std::int64_t>::min(), 4LL, 5L, 6L),
            "-1 2 -9223372036854775808 4 5 6");
  EXPECT_EQ(formatted("%hi %ji %ti %qi %s", 1, 2, 3, 4, 5), "1 2 3 4 5");
  EXPECT_EQ(formatted("%u %lu %llu %zu", 1U, 2UL, std::numeric_limits<std::uint64_t>::max(), std::size_t{4}),
            "1 2 18446744073709551615 4");
}

TEST_F(TarnReportingLogTest, BoolsPrintOneOrZero) {
  EXPECT_EQ(formatted("%d %i %@ %hhu", true, false, true, false), "1 0 1 0");
}

TEST_F(TarnReportingLogTest, HexadecimalPrintsTheBits) {
  EXPECT_EQ(formatted("0x%x 0x%x", 0x2104481CU, -1), "0x2104481c 0xffffffffffffffff");
  EXPECT_EQ(formatted("%x %x", true, false), "1 0");
}

TEST_F(TarnReportingLogTest, DoublesPrintSixDecimalsBehindFAndTheirTextFormElsewhere) {
  EXPECT_EQ(formatted("%f %f %@ %@ %i", 5.0, 0.1F, 5.0, 0.1F, 2.5), "5.000000 0.100000 5 0.1 2.5");
}

TEST_F(TarnReportingLogTest, LongestDoubleFitsBehindF) {
  EXPECT_EQ(formatted("%f", -std::numeric_limits<double>::max()).size(), 1U + 309U + 7U);
}

TEST_F(TarnReportingLogTest, NotANumberHasNoSign) {
  const double nan = std::numeric_limits<double>::quiet_NaN();
  EXPECT_EQ(formatted("%f %f %@ %@", nan, -nan, nan, -nan), "nan nan nan nan");
  EXPECT_EQ(formatted("%f", -std::numeric_limits<double>::infinity()), "-inf");
}

TEST_F(TarnReportingLogTest, ModuleOfJustTheColumnsWidthAndLineOfFiveDigitsHaveNoFurtherBlank) {
  TarnReportingLog(TarnReportingSessionCategory(), LogLevel::Info, "TarnReportingSessionMessa", LogText("text", 12345));
  EXPECT_EQ(platform_.log.texts().back(), "TarnReportingSessionMessa:12345 text");
  TarnReportingLog(TarnReportingSessionCategory(), LogLevel::Info, "TarnReportingSessionMess", LogText("text", 1234));
  EXPECT_EQ(platform_.log.texts().back(), " TarnReportingSessionMess:1234  text");
}

TEST_F(TarnReportingLogTest, ThePrefixCountsTowardsTheLimitOfALine) {
  TarnReportingLog(TarnReportingSessionCategory(), LogLevel::Info, "Module", LogText("%@", 1),
                   std::string(65536 - 32, 'x'));
  EXPECT_EQ(platform_.log.texts().back().size(), 65536U);
  TarnReportingLog(TarnReportingSessionCategory(), LogLevel::Info, "Module", LogText("%@", 1),
                   std::string(65536 - 31, 'x'));
  EXPECT_TRUE(platform_.log.texts().back().ends_with("x ... (1 more bytes)"));
}

TEST_F(TarnReportingLogTest, TextsPrintAsTheyAre) {
  EXPECT_EQ(formatted("%@ %s %@", "one", std::string("two"), std::string_view("100%@")), "one two 100%@");
}

TEST_F(TarnReportingLogTest, PropertyListValuesPrintTheirTextForm) {
  EXPECT_EQ(formatted("%@ %@", plist::Dictionary{{"a", 1}, {"b", "two"}}, plist::Array{1, 2}),
            "{a = 1; b = two} (1, 2)");
}

TEST_F(TarnReportingLogTest, WrongLetterPrintsByTheArgumentsOwnType) {
  EXPECT_EQ(formatted("%s %f %x %i", 7, 8, "text", "more"), "7 8 text more");
}

TEST_F(TarnReportingLogTest, TwoPercentSignsPrintOne) {
  EXPECT_EQ(formatted("100%% of %i%%", 5), "100% of 5%");
}

TEST_F(TarnReportingLogTest, UnknownConversionsAndALonePercentSignStayAsTheyAre) {
  EXPECT_EQ(formatted("%y %@ 5% %", 1), "%y 1 5% %");
}

TEST_F(TarnReportingLogTest, MissingArgumentPrintsAsNothing) {
  EXPECT_EQ(formatted("%@ %i", 1), "1 (null)");
}

TEST_F(TarnReportingLogTest, CallableIsCalledWhenTheLineIsWritten) {
  int calls = 0;
  EXPECT_EQ(formatted("%@", [&calls] { return "call " + std::to_string(++calls); }), "call 1");
}

TEST_F(TarnReportingLogTest, DisabledLevelWritesNothingAndCallsNoCallable) {
  int calls = 0;
  platform_.log.setThreshold(LogLevel::Error);
  TarnReportingLog(TarnReportingSessionCategory(), LogLevel::Default, "Module", "%i", [&calls] { return ++calls; });
  EXPECT_EQ(calls, 0);
  EXPECT_TRUE(platform_.log.texts().empty());
}

TEST_F(TarnReportingLogTest, EveryLevelFromTheThresholdUpIsWritten) {
  platform_.log.setThreshold(LogLevel::Info);
  for (const LogLevel level : {LogLevel::Debug, LogLevel::Info, LogLevel::Default, LogLevel::Error}) {
    TarnReportingLog(TarnReportingSessionCategory(), level, "Module", "text");
  }
  const auto entries = platform_.log.entries();
  ASSERT_EQ(entries.size(), 3U);
  EXPECT_EQ(entries.front().level, LogLevel::Info);
}

TEST(TarnReportingLogWithoutPlatform, LoggingIsLetPass) {
  int calls = 0;
  TarnReportingLog(TarnReportingSessionCategory(), LogLevel::Error, "Module", "%i", [&calls] { return ++calls; });
  EXPECT_EQ(calls, 0);
}

}  // namespace
}  // namespace tarn
