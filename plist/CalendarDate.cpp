// SPDX-License-Identifier: Apache-2.0
#include "plist/CalendarDate.h"

#include <chrono>
#include <cmath>

namespace tarn::plist {

namespace {

constexpr double kYear1 = -62135596800.0;      // 0001-01-01 00:00:00
constexpr double kYear10000 = 253402300800.0;  // 10000-01-01 00:00:00

void appendPadded(std::string& out, int value, int width) {
  const std::string digits = std::to_string(value);
  out.append(static_cast<std::size_t>(width) - std::min(digits.size(), static_cast<std::size_t>(width)), '0');
  out += digits;
}

}  // namespace

std::optional<CalendarDate> calendarDate(double epochSeconds) noexcept {
  if (!(epochSeconds >= kYear1 && epochSeconds < kYear10000)) return std::nullopt;
  double whole = std::floor(epochSeconds);
  auto micros = static_cast<std::int64_t>(std::llround((epochSeconds - whole) * 1e6));
  if (micros == 1000000) {
    micros = 0;
    whole += 1;
    if (whole >= kYear10000) return std::nullopt;
  }
  using namespace std::chrono;
  const sys_seconds moment{seconds(static_cast<std::int64_t>(whole))};
  const sys_days day = floor<days>(moment);
  const year_month_day date(day);
  const hh_mm_ss time(moment - day);
  return CalendarDate{static_cast<int>(date.year()),
                      static_cast<int>(static_cast<unsigned>(date.month())),
                      static_cast<int>(static_cast<unsigned>(date.day())),
                      static_cast<int>(time.hours().count()),
                      static_cast<int>(time.minutes().count()),
                      static_cast<int>(time.seconds().count()),
                      static_cast<int>(micros)};
}

void appendDateAndTime(std::string& out, const CalendarDate& date, char between) {
  appendPadded(out, date.year, 4);
  out += '-';
  appendPadded(out, date.month, 2);
  out += '-';
  appendPadded(out, date.day, 2);
  out += between;
  appendPadded(out, date.hour, 2);
  out += ':';
  appendPadded(out, date.minute, 2);
  out += ':';
  appendPadded(out, date.second, 2);
}

void appendCompactDateAndTime(std::string& out, const CalendarDate& date) {
  appendPadded(out, date.year, 4);
  appendPadded(out, date.month, 2);
  appendPadded(out, date.day, 2);
  out += '-';
  appendPadded(out, date.hour, 2);
  appendPadded(out, date.minute, 2);
  appendPadded(out, date.second, 2);
}

}  // namespace tarn::plist
