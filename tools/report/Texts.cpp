// SPDX-License-Identifier: Apache-2.0
#include "tools/report/Texts.h"

#include <array>
#include <cmath>
#include <cstdio>
#include <optional>

#include "plist/CalendarDate.h"
#include "plist/Characters.h"
#include "plist/ValueView.h"

namespace tarn::report {

namespace {

constexpr double kMostWithDecimals = 1e15;  // beyond it a double has no thousandths

// Two parts of a time: 2 h 5 min
std::string inTwo(std::int64_t first, const char* unit, std::int64_t second, const char* smaller) {
  return std::to_string(first) + unit + std::to_string(second) + smaller;
}

}  // namespace

std::string numberText(double value) {
  std::string text;
  if (!std::isfinite(value) || std::fabs(value) >= kMostWithDecimals) {
    plist::appendNumber(text, value);
    return text;
  }
  std::array<char, 40> digits{};
  std::snprintf(digits.data(), digits.size(), "%.3f", value);
  text = digits.data();
  text.erase(text.find_last_not_of('0') + 1);
  if (text.back() == '.') {
    text.pop_back();
  }
  return text == "-0" ? "0" : text;
}

std::string numberText(std::int64_t value) {
  return std::to_string(value);
}

std::string timeText(double epochSeconds) {
  const std::optional<plist::CalendarDate> date = plist::calendarDate(std::round(epochSeconds));
  if (!date) return numberText(epochSeconds);
  std::string text;
  plist::appendDateAndTime(text, *date, ' ');
  return text;
}

std::string preciseTimeText(double epochSeconds) {
  const double milliseconds = std::round(epochSeconds * 1000);
  const double seconds = std::floor(milliseconds / 1000);
  const std::optional<plist::CalendarDate> date = plist::calendarDate(seconds);
  if (!date) return numberText(epochSeconds);
  std::string text;
  plist::appendDateAndTime(text, *date, ' ');
  std::array<char, 8> fraction{};
  std::snprintf(fraction.data(), fraction.size(), ".%03d", static_cast<int>(milliseconds - seconds * 1000));
  return text + fraction.data();
}

std::string dayText(double epochSeconds) {
  const std::string text = timeText(epochSeconds);
  return text.substr(0, text.find(' '));
}

std::string durationText(double seconds) {
  constexpr std::int64_t kMinute = 60;
  constexpr std::int64_t kHour = 60 * kMinute;
  constexpr std::int64_t kDay = 24 * kHour;
  if (!(seconds < static_cast<double>(kMinute))) {
    if (!(seconds < kMostWithDecimals)) return numberText(seconds) + " s";
    const auto whole = static_cast<std::int64_t>(std::llround(seconds));
    if (whole < kHour) return inTwo(whole / kMinute, " min ", whole % kMinute, " s");
    if (whole < kDay) return inTwo(whole / kHour, " h ", whole % kHour / kMinute, " min");
    return inTwo(whole / kDay, " d ", whole % kDay / kHour, " h");
  }
  return numberText(seconds < 10 ? std::round(seconds * 100) / 100 : std::round(seconds * 10) / 10) + " s";
}

std::string shortened(std::string_view text, std::size_t characters) {
  std::string_view rest = text;
  for (std::size_t count = 0; count < characters; ++count) {
    if (rest.empty()) return std::string(text);
    if (!plist::takeCharacter(rest)) {
      rest.remove_prefix(1);
    }
  }
  if (rest.empty()) return std::string(text);
  return std::string(text.substr(0, text.size() - rest.size())) + "\u2026";
}

}  // namespace tarn::report
