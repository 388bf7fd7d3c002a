// SPDX-License-Identifier: Apache-2.0
// LocalCalendar: moments in the device's time zone, on the Gregorian calendar. Threads: any.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>

namespace tarn::platform {

// What a clock on the wall shows, and how far that is from UTC.
struct LocalTime {
  // 1 to 9999.
  std::int64_t year = 1970;
  int month = 1;             // 1 to 12
  int day = 1;               // 1 to 31
  int hour = 0;              // 0 to 23
  int minute = 0;            // 0 to 59
  int second = 0;            // 0 to 59
  int dayOfWeek = 4;         // 0 is Sunday
  int dayOfYear = 0;         // 0 is the first of January
  int secondsEastOfUtc = 0;  // at that moment, summer time included
};

// Owned by the platform. Knows the device's zone alone, as the system tells it.
class LocalCalendar {
 public:
  virtual ~LocalCalendar() = default;
  // The moment (seconds since 1970 UTC) as the device's clocks showed it, by the rules of summer time that held then;
  // fractions of a second are cut off toward the past. Moments beyond the years 1 to 9999 count as the nearest of
  // these, and what is no number as 1970.
  virtual LocalTime localTime(double epochSeconds) const = 0;
  // The moment written by a pattern: yyyy, MM, dd, HH, mm, ss (digits with leading zeros) and Z (the offset from UTC as
  // +0100); every other character stands for itself. "yyyyMMdd-HHmmssZ" gives 20240131-142501+0100.
  virtual std::string format(double epochSeconds, std::string_view pattern) const = 0;
};

}  // namespace tarn::platform
