#include "recorder/RecorderLog.h"

#include <cstdio>
#include <string>

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
  if (level < log_.threshold()) {
    return;
  }
  char prefix[48];
  const int size = std::snprintf(prefix, sizeof prefix, "%25s:%-5d ", kModule.data(), line);
  std::string whole(prefix, static_cast<std::size_t>(size));
  whole.append(text);
  log_.write(platform::LogEntry{kCategory, level, kModule, line, whole});
}

}  // namespace tarn::recorder
