// SPDX-License-Identifier: Apache-2.0
// Log: where log entries go. The one logging helper of the system forms the entries; a sink writes them.
//
// Threads: any.
#pragma once

#include <atomic>
#include <cstdint>
#include <string_view>

namespace tarn::platform {

// From what only developers read to what is wrong; compared by number.
enum class LogLevel : std::uint8_t { Debug, Info, Default, Error };

// Where an entry belongs, in two static texts: the subsystem, as "sys.oxbow.tarnkit", and a word for the part of it.
struct LogCategory {
  // Who tells: journals and people filter by both.
  std::string_view subsystem;
  std::string_view code;
};

// One entry, as long as the call of write() takes: all of it looks into the caller's.
struct LogEntry {
  const LogCategory& category;
  LogLevel level;
  std::string_view module;  // empty when the entry carries no module prefix
  // Of the source that logs.
  int line;
  std::string_view text;  // with its "%25s:%-5d " prefix, when it has one; may hold several lines
};

// Owned by the platform. Whoever logs isn't held up: a sink that can't keep up loses entries and counts them, it
// doesn't wait.
class Log {
 public:
  virtual ~Log() = default;
  // Entries below this level are neither formed nor written. Costs a load, so that a debug line on a hot path costs
  // nothing else; it may change while the process runs.
  LogLevel threshold() const noexcept { return threshold_.load(std::memory_order_relaxed); }
  // Writes one entry. Never throws; an entry that can't be written is counted by the sink.
  virtual void write(const LogEntry& entry) noexcept = 0;

 protected:
  // By the sink, from any thread.
  void setThreshold(LogLevel level) noexcept { threshold_.store(level, std::memory_order_relaxed); }

 private:
  // Outside of the virtual part, so that asking is no call.
  std::atomic<LogLevel> threshold_{LogLevel::Default};
};

}  // namespace tarn::platform
