// SPDX-License-Identifier: Apache-2.0
#include "host/machine/LinuxLocalCalendar.h"

#include <gtest/gtest.h>

#include <limits>

#include "tests/host/machine/TimeZoneGuard.h"

namespace tarn::linux_host {
namespace {

// Puts the process into a time zone that is written out, so that no zone files are needed.
class LinuxLocalCalendarTest : public testing::Test {
 protected:
  static LinuxLocalCalendar calendarIn(const char* zone) {
    TimeZoneGuard::set(zone);
    return {};
  }

 private:
  const TimeZoneGuard before_;
};

constexpr const char* kBerlin = "CET-1CEST,M3.5.0,M10.5.0/3";
constexpr const char* kPattern = "yyyyMMdd-HHmmssZ";

TEST_F(LinuxLocalCalendarTest, FormatsTheNameOfASummaryFile) {
  EXPECT_EQ(calendarIn(kBerlin).format(1706707501.9, kPattern), "20240131-142501+0100");
}

TEST_F(LinuxLocalCalendarTest, FollowsSummerTime) {
  const auto calendar = calendarIn(kBerlin);

  EXPECT_EQ(calendar.format(1711846799, kPattern), "20240331-015959+0100");
  EXPECT_EQ(calendar.format(1711846800, kPattern), "20240331-030000+0200");
  EXPECT_EQ(calendar.localTime(1711846800).secondsEastOfUtc, 7200);
}

TEST_F(LinuxLocalCalendarTest, FormatsOffsetsWestOfUtcAndOfHalfHours) {
  EXPECT_EQ(calendarIn("NST3:30").format(0, kPattern), "19691231-203000-0330");
  EXPECT_EQ(calendarIn("IST-5:30").format(0, kPattern), "19700101-053000+0530");
}

TEST_F(LinuxLocalCalendarTest, OtherCharactersOfAPatternStandForThemselves) {
  EXPECT_EQ(calendarIn("UTC0").format(0, "dd.MM.yyyy at HH:mm, y%d"), "01.01.1970 at 00:00, y%d");
}

TEST_F(LinuxLocalCalendarTest, GivesTheFieldsOfALeapDay) {
  const auto time = calendarIn("UTC0").localTime(1709210096);  // 2024-02-29 12:34:56

  EXPECT_EQ(time.year, 2024);
  EXPECT_EQ(time.month, 2);
  EXPECT_EQ(time.day, 29);
  EXPECT_EQ(time.hour, 12);
  EXPECT_EQ(time.minute, 34);
  EXPECT_EQ(time.second, 56);
  EXPECT_EQ(time.dayOfWeek, 4);
  EXPECT_EQ(time.dayOfYear, 59);
  EXPECT_EQ(time.secondsEastOfUtc, 0);
}

TEST_F(LinuxLocalCalendarTest, CutsFractionsTowardThePast) {
  const auto calendar = calendarIn("UTC0");

  EXPECT_EQ(calendar.localTime(59.999).second, 59);
  EXPECT_EQ(calendar.format(-0.25, kPattern), "19691231-235959+0000");
}

TEST_F(LinuxLocalCalendarTest, HoldsAbsurdMomentsToTheYearsOneToNineThousand) {
  const auto calendar = calendarIn("UTC0");

  EXPECT_EQ(calendar.localTime(1e300).year, 9999);
  EXPECT_EQ(calendar.localTime(std::numeric_limits<double>::infinity()).year, 9999);
  EXPECT_EQ(calendar.localTime(-1e300).year, 1);
  EXPECT_EQ(calendar.format(-1e300, "yyyy"), "0001");
  EXPECT_EQ(calendar.localTime(std::numeric_limits<double>::quiet_NaN()).year, 1970);
}

}  // namespace
}  // namespace tarn::linux_host
