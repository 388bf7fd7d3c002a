// SPDX-License-Identifier: Apache-2.0
// A moment as a calendar date and time of day in UTC (proleptic Gregorian). For every text form of a date, and for the
// names of files; local time is the platform's (LocalCalendar). Stateless. Threads: any.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

namespace tarn::plist {

// A day and a time of it. Without a zone: it is UTC as calendarDate() makes it.
struct CalendarDate {
  // 1 to 9999.
  int year;
  // Months and days from 1; the time of day from 0, without leap seconds.
  int month;
  int day;
  int hour;
  int minute;
  int second;
  // Below a million.
  int microsecond;
};

// The moment's date; nothing outside the years 1 to 9999, which no-number is too. The fraction of a second is rounded
// to microseconds, which may lead into the next second; a moment before 1970 counts from the second before it.
std::optional<CalendarDate> calendarDate(double epochSeconds) noexcept;

// Appends 2026-11-20<between>10:00:00, the year with at least four digits. Microseconds are left to the caller, since
// every text form writes them in its own way.
void appendDateAndTime(std::string& out, const CalendarDate& date, char between);
// Appends 20261120-100000, for the names of files.
void appendCompactDateAndTime(std::string& out, const CalendarDate& date);

}  // namespace tarn::plist
