// SPDX-License-Identifier: Apache-2.0
#include "testing/FakeLocalCalendar.h"

#include <gtest/gtest.h>

namespace tarn::testing {
namespace {

TEST(FakeLocalCalendar, FormatsWithItsOffset) {
  FakeLocalCalendar calendar;
  EXPECT_EQ(calendar.format(1706707501.9, "yyyyMMdd-HHmmssZ"), "20240131-132501+0000");

  calendar.setSecondsEastOfUtc(3600);
  EXPECT_EQ(calendar.format(1706707501.9, "yyyyMMdd-HHmmssZ"), "20240131-142501+0100");

  calendar.setSecondsEastOfUtc(-12600);
  EXPECT_EQ(calendar.format(0, "yyyyMMdd-HHmmssZ"), "19691231-203000-0330");
}

TEST(FakeLocalCalendar, GivesTheFieldsOfALeapDay) {
  const auto time = FakeLocalCalendar().localTime(1709210096);  // 2024-02-29 12:34:56

  EXPECT_EQ(time.year, 2024);
  EXPECT_EQ(time.month, 2);
  EXPECT_EQ(time.day, 29);
  EXPECT_EQ(time.hour, 12);
  EXPECT_EQ(time.minute, 34);
  EXPECT_EQ(time.second, 56);
  EXPECT_EQ(time.dayOfWeek, 4);
  EXPECT_EQ(time.dayOfYear, 59);
}

TEST(FakeLocalCalendar, HoldsAbsurdMomentsToTheYearsOneToNineThousand) {
  const FakeLocalCalendar calendar;

  EXPECT_EQ(calendar.localTime(1e300).year, 9999);
  EXPECT_EQ(calendar.localTime(-1e300).year, 1);
}

}  // namespace
}  // namespace tarn::testing
