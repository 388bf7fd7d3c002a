// A moment as a calendar date and time of day in UTC (proleptic Gregorian). Stateless. Threads: any.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

namespace tarn::plist {

struct CalendarDate {
  int year;
  int month;
  int day;
  int hour;
  int minute;
  int second;
  int microsecond;
};

// Nothing outside the years 1 to 9999. The fraction is rounded to microseconds.
std::optional<CalendarDate> calendarDate(double epochSeconds) noexcept;

// Appends 2026-11-20<between>10:00:00.
void appendDateAndTime(std::string& out, const CalendarDate& date, char between);
// Appends 20261120-100000, for the names of files.
void appendCompactDateAndTime(std::string& out, const CalendarDate& date);

}  // namespace tarn::plist
