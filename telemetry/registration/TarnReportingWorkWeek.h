// SPDX-License-Identifier: Apache-2.0
// The work week of a day: its week of the year on the Gregorian calendar, with weeks from Sunday to Saturday and the
// week of the first of January as week 1. The last days of December are in week 1 when the first of January falls in
// their week.
//
// Threads: any.
#pragma once

#include "platform/LocalCalendar.h"

namespace tarn {

// 1 to 53. Of the day, the year, the day of the year and the day of the week are looked at.
int TarnReportingWorkWeek(const platform::LocalTime& day) noexcept;

}  // namespace tarn
