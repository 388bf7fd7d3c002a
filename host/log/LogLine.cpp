// SPDX-License-Identifier: Apache-2.0
#include "host/log/LogLine.h"

#include <array>
#include <cmath>
#include <cstdint>
#include <cstdio>

#include "plist/CalendarDate.h"
#include "plist/EscapedText.h"

namespace tarn::linux_host {

namespace {

constexpr std::array<std::string_view, 4> kLevelNames{"debug", "info", "default", "error"};
constexpr std::int64_t kMicrosecondsPerSecond = 1'000'000;

}  // namespace

std::string_view logLevelName(platform::LogLevel level) noexcept {
  return kLevelNames[static_cast<std::size_t>(level)];
}

std::optional<platform::LogLevel> logLevelFromName(std::string_view name) noexcept {
  for (std::size_t index = 0; index < kLevelNames.size(); ++index) {
    if (kLevelNames[index] == name) return static_cast<platform::LogLevel>(index);
  }
  return std::nullopt;
}

std::string logTime(double epochSeconds) {
  // Rounded before it is split, so that 0.9999999 becomes the next second and not a million microseconds.
  const auto microseconds = static_cast<std::int64_t>(std::floor(epochSeconds * 1e6 + 0.5));
  std::int64_t fraction = microseconds % kMicrosecondsPerSecond;
  fraction += fraction < 0 ? kMicrosecondsPerSecond : 0;
  std::string text;
  const std::int64_t second = (microseconds - fraction) / kMicrosecondsPerSecond;
  if (const auto calendar = plist::calendarDate(static_cast<double>(second))) {
    plist::appendDateAndTime(text, *calendar, 'T');
  } else {
    text = std::to_string(second);
  }
  std::array<char, 16> decimals{};
  std::snprintf(decimals.data(), decimals.size(), ".%06lldZ", static_cast<long long>(fraction));
  return text + decimals.data();
}

std::string logLine(double epochSeconds, const platform::LogEntry& entry) {
  std::string line = logTime(epochSeconds);
  line.reserve(line.size() + entry.category.code.size() + entry.text.size() + 12);
  line += ' ';
  line += logLevelName(entry.level);
  line += ' ';
  line += entry.category.code;
  line += ' ';
  plist::appendPrintable(line, entry.text, plist::LineEnds::Indented);
  line += '\n';
  return line;
}

}  // namespace tarn::linux_host
