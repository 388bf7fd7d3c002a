// SPDX-License-Identifier: Apache-2.0
#include "tools/ctl/terminal/TimeOption.h"

#include <CLI/CLI.hpp>
#include <algorithm>
#include <array>
#include <charconv>
#include <chrono>
#include <cmath>
#include <cstdio>
#include <ctime>

#include "plist/ValueView.h"
#include "tools/ctl/terminal/Output.h"

namespace tarn::ctl {

namespace {

using plist::CalendarDate;

constexpr std::string_view kAccepted =
    ", expected 2026-11-20 10:00, 2026-11-20, -30m (s, m, h or d), today, yesterday or @SECONDS (since 1970)";
// Up to the year 9999, as dates go.
constexpr double kLastSecond = 253402300799;

// Reads digits of exactly that many places.
bool takeNumber(std::string_view& text, std::size_t places, int& number) {
  if (text.size() < places) return false;
  const auto [end, error] = std::from_chars(text.data(), text.data() + places, number);
  if (error != std::errc() || end != text.data() + places || number < 0) return false;
  text.remove_prefix(places);
  return true;
}

bool takeOneOf(std::string_view& text, std::string_view characters) {
  if (text.empty() || characters.find(text.front()) == std::string_view::npos) return false;
  text.remove_prefix(1);
  return true;
}

// HH:MM or HH:MM:SS, to the end of the text.
bool takeTimeOfDay(std::string_view text, CalendarDate& date) {
  if (!takeNumber(text, 2, date.hour) || !takeOneOf(text, ":") || !takeNumber(text, 2, date.minute)) return false;
  if (takeOneOf(text, ":") && !takeNumber(text, 2, date.second)) return false;
  return text.empty() && date.hour < 24 && date.minute < 60 && date.second < 60;
}

std::optional<CalendarDate> parseDate(std::string_view text) {
  CalendarDate date{};
  if (!takeNumber(text, 4, date.year) || !takeOneOf(text, "-") || !takeNumber(text, 2, date.month) ||
      !takeOneOf(text, "-") || !takeNumber(text, 2, date.day)) {
    return std::nullopt;
  }
  if (!text.empty() && !(takeOneOf(text, " T") && takeTimeOfDay(text, date))) return std::nullopt;
  return date;
}

// Seconds of "30m", without its sign.
std::optional<double> parseSpan(std::string_view text) {
  double number = 0;
  const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), number, std::chars_format::fixed);
  if (error != std::errc() || end + 1 != text.data() + text.size()) return std::nullopt;
  if (!std::isfinite(number) || text.front() == '-') return std::nullopt;
  switch (*end) {
    case 's':
      return number;
    case 'm':
      return number * 60;
    case 'h':
      return number * 3600;
    case 'd':
      return number * 86400;
    default:
      return std::nullopt;
  }
}

std::optional<double> parseEpoch(std::string_view text) {
  double seconds = 0;
  const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), seconds, std::chars_format::fixed);
  if (error != std::errc() || end != text.data() + text.size() || !(std::abs(seconds) <= kLastSecond)) {
    return std::nullopt;
  }
  return seconds;
}

std::optional<double> beginningOfDay(double now, int daysBack, const TimeZone& zone) {
  CalendarDate date = zone.dateAt(now);
  if (daysBack > 0) {
    // By way of noon, which is on the right day whatever the clocks do at night.
    date.hour = 12;
    const auto noon = zone.epochOf(date);
    if (!noon) return std::nullopt;
    date = zone.dateAt(*noon - daysBack * 86400.0);
  }
  return zone.epochOf({date.year, date.month, date.day, 0, 0, 0, 0});
}

std::optional<double> readTime(std::string_view text, double now, const TimeZone& zone) {
  if (text == "today") return beginningOfDay(now, 0, zone);
  if (text == "yesterday") return beginningOfDay(now, 1, zone);
  if (text.starts_with('@')) return parseEpoch(text.substr(1));
  if (text.size() > 2 && text.starts_with('-')) {
    const auto span = parseSpan(text.substr(1));
    return span ? std::optional(now - *span) : std::nullopt;
  }
  const auto date = parseDate(text);
  return date ? zone.epochOf(*date) : std::nullopt;
}

// Complains in the name of the option.
bool readOption(const char* option, const std::string& text, std::optional<double>& moment) {
  if (text.empty()) return true;
  const Result<double> parsed = parseTime(text, currentTime(), userTimeZone());
  if (parsed.failed()) {
    complain(std::string(option) + ": " + parsed.error->text);
    return false;
  }
  moment = parsed.value;
  return true;
}

std::optional<double> epochInThisZone(const CalendarDate& date) {
  std::tm fields{};
  fields.tm_year = date.year - 1900;
  fields.tm_mon = date.month - 1;
  fields.tm_mday = date.day;
  fields.tm_hour = date.hour;
  fields.tm_min = date.minute;
  fields.tm_sec = date.second;
  fields.tm_isdst = -1;
  const std::time_t seconds = ::mktime(&fields);
  // What the calendar doesn't have comes out as another day.
  if (fields.tm_mday != date.day || fields.tm_mon != date.month - 1) return std::nullopt;
  return static_cast<double>(seconds);
}

CalendarDate dateInThisZone(double epochSeconds) {
  const auto seconds = static_cast<std::time_t>(std::floor(epochSeconds));
  std::tm fields{};
  ::localtime_r(&seconds, &fields);
  return {fields.tm_year + 1900, fields.tm_mon + 1, fields.tm_mday, fields.tm_hour, fields.tm_min, fields.tm_sec, 0};
}

}  // namespace

TimeZone userTimeZone() {
  return {epochInThisZone, dateInThisZone};
}

Result<double> parseTime(std::string_view text, double now, const TimeZone& zone) {
  if (const auto moment = readTime(text, now, zone)) return {*moment, {}};
  return {0, Error{0, "\"" + std::string(text) + "\" is no time" + std::string(kAccepted)}};
}

std::string localTimeText(double epochSeconds, const TimeZone& zone) {
  if (!(std::abs(epochSeconds) <= kLastSecond)) return "beyond the years";
  std::string text;
  plist::appendDateAndTime(text, zone.dateAt(epochSeconds), ' ');
  return text;
}

std::string durationText(double seconds) {
  std::array<char, 48> text{};
  const auto whole = static_cast<long long>(std::clamp(std::round(seconds), 0.0, 1e15));
  if (seconds < 59.95) {
    std::snprintf(text.data(), text.size(), "%.1f s", std::max(0.0, seconds));
  } else if (whole < 3600) {
    std::snprintf(text.data(), text.size(), "%lld min %02lld s", whole / 60, whole % 60);
  } else {
    std::snprintf(text.data(), text.size(), "%lld h %02lld min", whole / 3600, whole % 3600 / 60);
  }
  return text.data();
}

void TimeRange::addTo(CLI::App& command, const std::string& what) {
  command.add_option("--since", sinceText, what + " from then on (2026-11-20 10:00, -1h, today, @SECONDS)")
      ->type_name("TIME");
  command.add_option("--until", untilText, what + " before then")->type_name("TIME");
}

bool TimeRange::read() {
  if (!readOption("--since", sinceText, since) || !readOption("--until", untilText, until)) return false;
  if (since && until && *until <= *since) {
    complain("--until " + untilText + " is not after --since " + sinceText);
    return false;
  }
  return true;
}

std::string checkSeconds(const std::string& text, double least, double most) {
  double seconds = 0;
  const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), seconds);
  const bool isNumber = error == std::errc() && end == text.data() + text.size();
  if (isNumber && seconds >= least && seconds <= most) return {};
  return "\"" + text + "\" is no number of seconds from " + plist::ValueView(least).asText() + " to " +
         plist::ValueView(most).asText();
}

double currentTime() {
  return std::chrono::duration<double>(std::chrono::system_clock::now().time_since_epoch()).count();
}

}  // namespace tarn::ctl
