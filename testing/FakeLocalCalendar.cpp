// SPDX-License-Identifier: Apache-2.0
#include "testing/FakeLocalCalendar.h"

#include <algorithm>
#include <chrono>
#include <cmath>
#include <cstdint>
#include <cstdio>
#include <cstdlib>

namespace tarn::testing {

namespace {

// Whole seconds, held to the years 1 to 9999; what is no number is the epoch.
std::int64_t wholeSeconds(double epochSeconds) {
  constexpr double kFirst = -62135596800.0;
  constexpr double kLast = 253402300799.0;
  return std::isnan(epochSeconds) ? 0 : static_cast<std::int64_t>(std::floor(std::clamp(epochSeconds, kFirst, kLast)));
}

std::string digits(std::int64_t number, int width) {
  char text[24];
  std::snprintf(text, sizeof text, "%0*lld", width, static_cast<long long>(number));
  return text;
}

std::string offsetText(int seconds) {
  const int minutes = std::abs(seconds) / 60;
  return (seconds < 0 ? "-" : "+") + digits(minutes / 60, 2) + digits(minutes % 60, 2);
}

}  // namespace

platform::LocalTime FakeLocalCalendar::localTime(double epochSeconds) const {
  namespace chrono = std::chrono;
  const chrono::sys_seconds shown{chrono::seconds(wholeSeconds(epochSeconds) + secondsEastOfUtc_)};
  const auto midnight = chrono::floor<chrono::days>(shown);
  const chrono::year_month_day date(midnight);
  const chrono::hh_mm_ss clock(shown - midnight);
  const auto newYear = chrono::sys_days(date.year() / chrono::January / 1);
  platform::LocalTime time;
  time.year = static_cast<int>(date.year());
  time.month = static_cast<int>(static_cast<unsigned>(date.month()));
  time.day = static_cast<int>(static_cast<unsigned>(date.day()));
  time.hour = static_cast<int>(clock.hours().count());
  time.minute = static_cast<int>(clock.minutes().count());
  time.second = static_cast<int>(clock.seconds().count());
  time.dayOfWeek = static_cast<int>(chrono::weekday(midnight).c_encoding());
  time.dayOfYear = static_cast<int>((midnight - newYear).count());
  time.secondsEastOfUtc = secondsEastOfUtc_;
  return time;
}

std::string FakeLocalCalendar::format(double epochSeconds, std::string_view pattern) const {
  const auto time = localTime(epochSeconds);
  const std::pair<std::string_view, std::string> fields[] = {{"yyyy", digits(time.year, 4)},
                                                             {"MM", digits(time.month, 2)},
                                                             {"dd", digits(time.day, 2)},
                                                             {"HH", digits(time.hour, 2)},
                                                             {"mm", digits(time.minute, 2)},
                                                             {"ss", digits(time.second, 2)},
                                                             {"Z", offsetText(time.secondsEastOfUtc)}};
  std::string text;
  while (!pattern.empty()) {
    const auto* const field = std::find_if(std::begin(fields), std::end(fields),
                                           [&](const auto& each) { return pattern.starts_with(each.first); });
    if (field != std::end(fields)) {
      text += field->second;
      pattern.remove_prefix(field->first.size());
    } else {
      text += pattern.front();
      pattern.remove_prefix(1);
    }
  }
  return text;
}

}  // namespace tarn::testing
