// SPDX-License-Identifier: Apache-2.0
// LogLine: how a log entry looks as text: `TIME LEVEL CATEGORY text`, the time in UTC with microseconds. People and
// programs split lines at the first three blanks, so none of these has one. Threads: any.
#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "platform/Log.h"

namespace tarn::linux_host {

// "debug", "info", "default" or "error"
std::string_view logLevelName(platform::LogLevel level) noexcept;
// The level of this name, as an option gives it; nothing when there is none. Case counts.
std::optional<platform::LogLevel> logLevelFromName(std::string_view name) noexcept;

// "2026-11-20T10:00:00.123456Z", rounded to the nearest microsecond; 27 characters for the years 1 to 9999. A time
// outside the calendar's range is written as its seconds, with the same decimals. The system's time zone and locale
// don't matter.
std::string logTime(double epochSeconds);

// The whole entry with its line end. Further lines of its text follow, each after a tab; other control characters of it
// are written out, so that no text can look like an entry of its own. The category is not made safe: it is the
// program's.
std::string logLine(double epochSeconds, const platform::LogEntry& entry);

}  // namespace tarn::linux_host
