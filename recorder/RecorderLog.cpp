// SPDX-License-Identifier: Apache-2.0
#include "recorder/RecorderLog.h"

#include <new>
#include <string>

#include "platform/LogPrefix.h"

namespace tarn::recorder {

namespace {

constexpr platform::LogCategory kCategory{"sys.oxbow.tarnkit", "tarnrs"};
constexpr std::string_view kModule = "Recorder";

}  // namespace

void RecorderLog::error(std::string_view text, int line) noexcept {
  write(platform::LogLevel::Error, text, line);
}

void RecorderLog::notice(std::string_view text, int line) noexcept {
  write(platform::LogLevel::Default, text, line);
}

void RecorderLog::write(platform::LogLevel level, std::string_view text, int line) noexcept {
  if (level < log_.threshold()) return;
  try {
    std::string whole;
    platform::appendLogPrefix(whole, kModule, line);
    whole.append(text);
    log_.write(platform::LogEntry{kCategory, level, kModule, line, whole});
  } catch (const std::bad_alloc&) {
    log_.write(platform::LogEntry{kCategory, level, kModule, line, platform::kNoMemoryForLine});
  }
}

}  // namespace tarn::recorder
