// SPDX-License-Identifier: Apache-2.0
#include "telemetry/registration/TarnReportingWorkWeek.h"

#include <cstdint>

namespace tarn {

namespace {

constexpr int kDaysOfWeek = 7;

bool isLeapYear(std::int64_t year) noexcept {
  return year % 4 == 0 && (year % 100 != 0 || year % 400 == 0);
}

}  // namespace

int TarnReportingWorkWeek(const platform::LocalTime& day) noexcept {
  const int daysOfYear = isLeapYear(day.year) ? 366 : 365;
  const int saturday = day.dayOfYear + (kDaysOfWeek - 1 - day.dayOfWeek);  // of this week, as a day of this year
  if (saturday >= daysOfYear) return 1;
  // Saturday closes its week, so the week's number is that of the Saturdays up to it.
  return saturday / kDaysOfWeek + 1;
}

}  // namespace tarn
