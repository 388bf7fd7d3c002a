// RecorderLog: the recorder's log lines. The recorder works below the logging helper of the service and writes to the
// sink that it is given; the lines look the same. Threads: any.
#pragma once

#include <string_view>

#include "platform/Log.h"

namespace tarn::recorder {

class RecorderLog {
 public:
  explicit RecorderLog(platform::Log& log) : log_(log) {}

  void error(std::string_view text, int line = __builtin_LINE()) noexcept;
  void notice(std::string_view text, int line = __builtin_LINE()) noexcept;

 private:
  void write(platform::LogLevel level, std::string_view text, int line) noexcept;

  platform::Log& log_;
};

}  // namespace tarn::recorder
