// SPDX-License-Identifier: Apache-2.0
#include "host/machine/LinuxLocalCalendar.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdlib>
#include <ctime>
#include <utility>

namespace tarn::linux_host {

namespace {

// 0001-01-02 and 9999-12-30 in UTC, so that the year stays within 1 to 9999 in every zone.
constexpr double kFirstSecond = -62135510400.0;
constexpr double kLastSecond = 253402214399.0;

std::tm brokenDown(double epochSeconds) {
  const double held = std::isnan(epochSeconds) ? 0 : std::clamp(epochSeconds, kFirstSecond, kLastSecond);
  const auto seconds = static_cast<std::time_t>(std::floor(held));
  std::tm parts{};
  ::localtime_r(&seconds, &parts);
  return parts;
}

// The number in decimal with leading zeros.
std::string digits(int number, std::size_t width) {
  std::string text = std::to_string(number);
  return text.size() < width ? text.insert(0, width - text.size(), '0') : text;
}

std::string offset(long secondsEastOfUtc) {
  const auto minutes = static_cast<int>(std::labs(secondsEastOfUtc) / 60);
  return (secondsEastOfUtc < 0 ? "-" : "+") + digits(minutes / 60, 2) + digits(minutes % 60, 2);
}

}  // namespace

LinuxLocalCalendar::LinuxLocalCalendar() {
  ::tzset();
}

platform::LocalTime LinuxLocalCalendar::localTime(double epochSeconds) const {
  const std::tm parts = brokenDown(epochSeconds);
  platform::LocalTime time;
  time.year = parts.tm_year + 1900;
  time.month = parts.tm_mon + 1;
  time.day = parts.tm_mday;
  time.hour = parts.tm_hour;
  time.minute = parts.tm_min;
  time.second = parts.tm_sec;
  time.dayOfWeek = parts.tm_wday;
  time.dayOfYear = parts.tm_yday;
  time.secondsEastOfUtc = static_cast<int>(parts.tm_gmtoff);
  return time;
}

std::string LinuxLocalCalendar::format(double epochSeconds, std::string_view pattern) const {
  const std::tm parts = brokenDown(epochSeconds);
  const std::array<std::pair<std::string_view, std::string>, 7> fields{{{"yyyy", digits(parts.tm_year + 1900, 4)},
                                                                        {"MM", digits(parts.tm_mon + 1, 2)},
                                                                        {"dd", digits(parts.tm_mday, 2)},
                                                                        {"HH", digits(parts.tm_hour, 2)},
                                                                        {"mm", digits(parts.tm_min, 2)},
                                                                        {"ss", digits(parts.tm_sec, 2)},
                                                                        {"Z", offset(parts.tm_gmtoff)}}};
  std::string text;
  while (!pattern.empty()) {
    const auto* const field =
        std::find_if(fields.begin(), fields.end(), [&](const auto& each) { return pattern.starts_with(each.first); });
    if (field != fields.end()) {
      text += field->second;
      pattern.remove_prefix(field->first.size());
    } else {
      text += pattern.front();
      pattern.remove_prefix(1);
    }
  }
  return text;
}

}  // namespace tarn::linux_host
