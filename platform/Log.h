// Log: where log entries go. The one logging helper of the system forms the entries; a sink writes them.
//
// Threads: any.
#pragma once

#include <atomic>
#include <cstdint>
#include <string_view>

namespace tarn::platform {

enum class LogLevel : std::uint8_t { Debug, Info, Default, Error };

struct LogCategory {
  std::string_view subsystem;
  std::string_view code;
};

struct LogEntry {
  const LogCategory& category;
  LogLevel level;
  std::string_view module;  // empty when the entry carries no module prefix
  int line;
  std::string_view text;  // with its "%25s:%-5d " prefix, when it has one; may hold several lines
};

class Log {
 public:
  virtual ~Log() = default;
  // Entries below this level are neither formed nor written.
  LogLevel threshold() const noexcept { return threshold_.load(std::memory_order_relaxed); }
  // Writes one entry. Never throws; an entry that can't be written is counted by the sink.
  virtual void write(const LogEntry& entry) noexcept = 0;

 protected:
  void setThreshold(LogLevel level) noexcept { threshold_.store(level, std::memory_order_relaxed); }

 private:
  std::atomic<LogLevel> threshold_{LogLevel::Default};
};

}  // namespace tarn::platform
