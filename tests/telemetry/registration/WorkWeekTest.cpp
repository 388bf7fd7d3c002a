// SPDX-License-Identifier: Apache-2.0
#include "telemetry/registration/TarnReportingWorkWeek.h"

#include <gtest/gtest.h>

#include <ctime>
#include <string>

#include "host/machine/LinuxLocalCalendar.h"
#include "tests/host/machine/TimeZoneGuard.h"

namespace tarn {
namespace {

using linux_host::LinuxLocalCalendar;

constexpr std::int64_t kDaySeconds = 86400;

std::tm localTime(std::time_t seconds) {
  std::tm parts{};
  ::localtime_r(&seconds, &parts);
  return parts;
}

// Counts weeks the long way: from the first of January on, day by day, a new week at each Sunday.
int countedWeek(const std::tm& day) {
  int weekday = (day.tm_wday - day.tm_yday % 7 + 7) % 7;  // of the first of January
  int week = 1;
  for (int i = 0; i < day.tm_yday; ++i) {
    weekday = (weekday + 1) % 7;
    week += weekday == 0 ? 1 : 0;
  }
  return week;
}

// Whether the first of January of the next year falls into the day's week.
bool sharesAWeekWithNewYear(std::time_t seconds, const std::tm& day) {
  for (int i = 1; i <= 6 - day.tm_wday; ++i) {
    // At noon, so that no change of summer time moves the date.
    if (localTime(seconds + i * kDaySeconds).tm_year != day.tm_year) return true;
  }
  return false;
}

class WorkWeekOverTwoCenturies : public testing::TestWithParam<const char*> {};

TEST_P(WorkWeekOverTwoCenturies, AgreesWithTheCalendarOfTheCLibraryOnEachDay) {
  const linux_host::TimeZoneGuard zone(GetParam());
  const LinuxLocalCalendar calendar;
  constexpr std::time_t kFirstNoon = -2208945600;  // 1900-01-01 12:00 UTC
  constexpr int kDays = 200 * 365 + 48;
  for (int i = 0; i < kDays; ++i) {
    const std::time_t noon = kFirstNoon + i * kDaySeconds;
    const std::tm day = localTime(noon);
    const int expected = sharesAWeekWithNewYear(noon, day) ? 1 : countedWeek(day);
    ASSERT_EQ(TarnReportingWorkWeek(calendar.localTime(static_cast<double>(noon))), expected)
        << day.tm_year + 1900 << "-" << day.tm_mon + 1 << "-" << day.tm_mday;
  }
}

INSTANTIATE_TEST_SUITE_P(Zones, WorkWeekOverTwoCenturies,
                         testing::Values("UTC0", "CET-1CEST,M3.5.0,M10.5.0/3", "NST3:30NDT,M3.2.0,M11.1.0", "<+14>-14",
                                         "<-11>11"));

TEST(WorkWeek, FirstOfJanuaryIsInWeekOneWhateverItsDay) {
  for (int dayOfWeek = 0; dayOfWeek < 7; ++dayOfWeek) {
    platform::LocalTime day;
    day.year = 2023;
    day.dayOfYear = 0;
    day.dayOfWeek = dayOfWeek;
    EXPECT_EQ(TarnReportingWorkWeek(day), 1) << dayOfWeek;
  }
}

TEST(WorkWeek, LastDaysOfDecemberBelongToTheNextYearsFirstWeek) {
  platform::LocalTime sunday;  // 2023-12-31, a Sunday; the Monday after it is the first of January
  sunday.year = 2023;
  sunday.month = 12;
  sunday.day = 31;
  sunday.dayOfYear = 364;
  sunday.dayOfWeek = 0;
  EXPECT_EQ(TarnReportingWorkWeek(sunday), 1);

  platform::LocalTime saturday = sunday;  // the day before closes the year's last full week
  saturday.day = 30;
  saturday.dayOfYear = 363;
  saturday.dayOfWeek = 6;
  EXPECT_EQ(TarnReportingWorkWeek(saturday), 52);
}

TEST(WorkWeek, CenturyIsNoLeapYear) {
  platform::LocalTime day;  // 2100-12-31, a Friday: its Saturday is the first of January
  day.year = 2100;
  day.month = 12;
  day.day = 31;
  day.dayOfYear = 364;
  day.dayOfWeek = 5;
  EXPECT_EQ(TarnReportingWorkWeek(day), 1);
}

TEST(WorkWeek, LeapYearThatBeginsOnASaturdayHasFiftyThreeWeeks) {
  platform::LocalTime day;  // 2000-12-30, a Saturday
  day.year = 2000;
  day.month = 12;
  day.day = 30;
  day.dayOfYear = 364;
  day.dayOfWeek = 6;
  EXPECT_EQ(TarnReportingWorkWeek(day), 53);
  day.day = 31;
  day.dayOfYear = 365;
  day.dayOfWeek = 0;
  EXPECT_EQ(TarnReportingWorkWeek(day), 1);
}

}  // namespace
}  // namespace tarn
