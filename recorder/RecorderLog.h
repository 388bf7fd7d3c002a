// SPDX-License-Identifier: Apache-2.0
// RecorderLog: the recorder's log lines. The recorder works below the logging helper of the service and writes to the
// sink that it is given; the lines look the same: category "tarnrs", the prefix with the module "Recorder" and the
// caller's line.
//
// Owned by each part that logs. Threads: any; it waits for nothing but the sink, which doesn't wait either.
#pragma once

#include <string_view>

#include "platform/Log.h"
#include "platform/LogCondition.h"

namespace tarn::recorder {

class RecorderLog {
 public:
  // The log outlives this.
  explicit RecorderLog(platform::Log& log) : log_(log) {}

  // What costs events, or would without a remedy; at the level error.
  void error(std::string_view text, int line = __builtin_LINE()) noexcept;
  // The same of what a person acts on.
  void error(platform::LogCondition condition, std::string_view text, int line = __builtin_LINE()) noexcept {
    const platform::LogConditionScope scope(condition);
    error(text, line);
  }
  // What somebody may want to know, as that a fault is over; at the level default.
  void notice(std::string_view text, int line = __builtin_LINE()) noexcept;

 private:
  // Nothing below the log's threshold, which costs one load.
  void write(platform::LogLevel level, std::string_view text, int line) noexcept;

  platform::Log& log_;
};

}  // namespace tarn::recorder
