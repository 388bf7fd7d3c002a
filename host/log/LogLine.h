// LogLine: how a log entry looks as text: `TIME LEVEL CATEGORY text`, the time in UTC with microseconds. Threads: any.
#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "platform/Log.h"

namespace tarn::linux_host {

// "debug", "info", "default" or "error"
std::string_view logLevelName(platform::LogLevel level) noexcept;
// The level of this name; nothing when there is none.
std::optional<platform::LogLevel> logLevelFromName(std::string_view name) noexcept;

// "2026-11-20T10:00:00.123456Z"
std::string logTime(double epochSeconds);

// The whole entry with its line end. Further lines of its text follow, each after a tab; other control characters of it
// are written out, so that no text can look like an entry of its own.
std::string logLine(double epochSeconds, const platform::LogEntry& entry);

}  // namespace tarn::linux_host
