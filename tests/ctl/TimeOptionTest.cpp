// SPDX-License-Identifier: Apache-2.0
#include "tools/ctl/terminal/TimeOption.h"

#include <gtest/gtest.h>

#include <cmath>
#include <cstdlib>
#include <ctime>

namespace tarn::ctl {
namespace {

constexpr double kHour = 3600;
constexpr double kDay = 86400;
// 2026-11-20 10:30:15 in a zone one hour ahead.
constexpr double kNow = 1795167015;
constexpr double kMidnight = 1795129200;  // 2026-11-20 00:00 there

// Always an hour ahead, by the calendar of plist.
TimeZone anHourAhead() {
  const auto dateAt = [](double seconds) { return *plist::calendarDate(seconds + kHour); };
  const auto epochOf = [dateAt](const plist::CalendarDate& date) -> std::optional<double> {
    // By the days around, as the calendar says which they are.
    for (double day = kMidnight - 800 * kDay; day < kMidnight + 800 * kDay; day += kDay) {
      const plist::CalendarDate at = dateAt(day);
      if (at.year == date.year && at.month == date.month && at.day == date.day) {
        return day + date.hour * kHour + date.minute * 60.0 + date.second;
      }
    }
    return std::nullopt;
  };
  return {epochOf, dateAt};
}

struct Case {
  const char* text;
  double seconds;
};

TEST(TimeOption, ReadsEachFormInTheZoneOfTheUser) {
  const Case kCases[] = {
      {"2026-11-20 10:00", kMidnight + 10 * kHour},
      {"2026-11-20T10:00", kMidnight + 10 * kHour},
      {"2026-11-20 10:00:30", kMidnight + 10 * kHour + 30},
      {"2026-11-20 23:59:59", kMidnight + kDay - 1},
      {"2026-11-20", kMidnight},
      {"2026-11-19", kMidnight - kDay},
      {"2026-03-01", kMidnight - 264 * kDay},
      {"-1h", kNow - kHour},
      {"-30m", kNow - 1800},
      {"-90s", kNow - 90},
      {"-2d", kNow - 2 * kDay},
      {"-1.5h", kNow - 1.5 * kHour},
      {"-0h", kNow},
      {"today", kMidnight},
      {"yesterday", kMidnight - kDay},
      {"@1795158000", 1795158000},
      {"@1795158000.5", 1795158000.5},
      {"@0", 0},
      {"@-5", -5},
  };
  for (const Case& each : kCases) {
    const Result<double> parsed = parseTime(each.text, kNow, anHourAhead());
    EXPECT_TRUE(parsed.ok()) << each.text << ": " << parsed.error.text();
    EXPECT_EQ(parsed.value, each.seconds) << each.text;
  }
}

TEST(TimeOption, RefusesEverythingElse) {
  for (const char* text : {"",
                           "now",
                           "1h",
                           "-h",
                           "-1",
                           "-1w",
                           "--1h",
                           "-1h30m",
                           "- 1h",
                           "-infs",
                           "-nand",
                           "@",
                           "@x",
                           "@1e400",
                           "@ 5",
                           "@9e15",
                           "2026-11-31",
                           "2026-02-29",
                           "2026-13-01",
                           "2026-00-10",
                           "2026-11-00",
                           "2026-1-20",
                           "26-11-20",
                           "2026-11-20 ",
                           " 2026-11-20",
                           "2026-11-20 1:00",
                           "2026-11-20 24:00",
                           "2026-11-20 10:60",
                           "2026-11-20 10:00:60",
                           "2026-11-20 10:00Z",
                           "2026-11-20 10:00:00.5",
                           "2026/11/20",
                           "+026-11-20",
                           "Today"}) {
    EXPECT_TRUE(parseTime(text, kNow, anHourAhead()).failed()) << text;
  }
}

TEST(TimeOption, TheErrorSaysWhatIsAccepted) {
  EXPECT_EQ(parseTime("noon", kNow, anHourAhead()).error.text(),
            "\"noon\" is no time, expected 2026-11-20 10:00, 2026-11-20, -30m (s, m, h or d), today, yesterday or "
            "@SECONDS (since 1970)");
}

// In the process's own zone, which a test sets.
class UserTimeZone : public ::testing::Test {
 protected:
  UserTimeZone() { use("CET-1CEST,M3.5.0,M10.5.0/3"); }
  ~UserTimeZone() override { use("UTC0"); }
  static void use(const char* zone) {
    ::setenv("TZ", zone, 1);
    ::tzset();
  }
  static double parsed(const char* text, double now = kNow) {
    const Result<double> result = parseTime(text, now, userTimeZone());
    EXPECT_TRUE(result.ok()) << text;
    return result.value;
  }
};

TEST_F(UserTimeZone, KnowsWinterAndSummer) {
  EXPECT_EQ(parsed("2026-11-20 10:00"), kMidnight + 10 * kHour);
  EXPECT_EQ(parsed("2026-07-01 10:00"), 1782892800);  // two hours ahead
  EXPECT_EQ(localTimeText(1782892800, userTimeZone()), "2026-07-01 10:00:00");
  EXPECT_EQ(localTimeText(kMidnight - 0.5, userTimeZone()), "2026-11-19 23:59:59");
}

TEST_F(UserTimeZone, YesterdayBeginsAtItsMidnightWhenTheClocksChangeBetween) {
  // 2026-10-25 has 25 hours.
  const double midnight = 1792879200;  // 2026-10-25 00:00, in summer
  EXPECT_EQ(parsed("yesterday", midnight + 25 * kHour + 600), midnight);
  EXPECT_EQ(parsed("today", midnight + 24.5 * kHour), midnight);
  EXPECT_EQ(parsed("yesterday", midnight + 24.5 * kHour), midnight - kDay);
}

TEST_F(UserTimeZone, YesterdayIsTheDayBeforeEvenWhenThatWasAShortOne) {
  // 2026-03-29 has 23 hours.
  const double midnight = 1774738800;  // 2026-03-29 00:00, in winter
  EXPECT_EQ(parsed("yesterday", midnight + 23 * kHour + 600), midnight);
}

TEST_F(UserTimeZone, HasNoDaysThatTheCalendarDoesNotHave) {
  EXPECT_TRUE(parseTime("2026-02-30", kNow, userTimeZone()).failed());
  EXPECT_TRUE(parseTime("2026-13-01", kNow, userTimeZone()).failed());
  EXPECT_EQ(parsed("2024-02-29"), 1709161200);
}

TEST(Seconds, AreANumberBetweenTheTwo) {
  EXPECT_EQ(checkSeconds("0.5", 0.5, 60), "");
  EXPECT_EQ(checkSeconds("60", 0.5, 60), "");
  for (const char* const text : {"0.4", "60.5", "nan", "inf", "-1", "", "5s", " 5", "five"}) {
    EXPECT_EQ(checkSeconds(text, 0.5, 60), "\"" + std::string(text) + "\" is no number of seconds from 0.5 to 60");
  }
}

TEST(DurationText, IsAsCoarseAsItIsLong) {
  EXPECT_EQ(durationText(0), "0.0 s");
  EXPECT_EQ(durationText(59.94), "59.9 s");
  EXPECT_EQ(durationText(59.95), "1 min 00 s");
  EXPECT_EQ(durationText(200), "3 min 20 s");
  EXPECT_EQ(durationText(3599.4), "59 min 59 s");
  EXPECT_EQ(durationText(3599.5), "1 h 00 min");
  EXPECT_EQ(durationText(90061), "25 h 01 min");
  EXPECT_EQ(durationText(-1), "0.0 s");
}

}  // namespace
}  // namespace tarn::ctl
