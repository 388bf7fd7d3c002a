// The text forms that everything else is put together from: bytes in hexadecimal, moments in UTC.
#include <gtest/gtest.h>

#include "plist/CalendarDate.h"
#include "plist/Hex.h"

namespace tarn::plist {
namespace {

std::string dateAndTime(double epochSeconds) {
  const auto date = calendarDate(epochSeconds);
  std::string text;
  if (date) {
    appendDateAndTime(text, *date, 'T');
  }
  return text;
}

TEST(Hex, AByteIsTwoSmallDigits) {
  std::string text = "x";
  appendHex(text, std::string_view("\x00\x0A\x9F\xFF", 4));
  appendHex(text, '\x7E');
  EXPECT_EQ(text, "x000a9fff7e");
}

TEST(CalendarDate, MomentsOfTheYears1To9999HaveOne) {
  EXPECT_EQ(dateAndTime(1763632800), "2025-11-20T10:00:00");
  EXPECT_EQ(dateAndTime(951782399), "2000-02-28T23:59:59");
  EXPECT_EQ(dateAndTime(951782400), "2000-02-29T00:00:00");
  EXPECT_EQ(dateAndTime(-1), "1969-12-31T23:59:59");
  EXPECT_EQ(dateAndTime(-62135596800.0), "0001-01-01T00:00:00");
  EXPECT_EQ(dateAndTime(253402300799.0), "9999-12-31T23:59:59");
  EXPECT_EQ(dateAndTime(-62135596801.0), "");
  EXPECT_EQ(dateAndTime(253402300800.0), "");
}

TEST(CalendarDate, FractionIsRoundedToMicrosecondsIntoTheNextSecond) {
  EXPECT_EQ(calendarDate(0.125)->microsecond, 125000);
  EXPECT_EQ(calendarDate(0.9999999)->microsecond, 0);
  EXPECT_EQ(dateAndTime(0.9999999), "1970-01-01T00:00:01");
}

TEST(CalendarDate, CompactFormIsThatOfFileNames) {
  std::string text;
  appendCompactDateAndTime(text, *calendarDate(1763632805));
  EXPECT_EQ(text, "20251120-100005");
}

}  // namespace
}  // namespace tarn::plist
