// openLog: makes the log sink that a target names. Threads: one at a time.
#pragma once

#include <memory>
#include <string>
#include <string_view>

#include "platform/Log.h"

namespace tarn::platform {
class Clock;
}

namespace tarn::linux_host {

struct OpenedLog {
  std::unique_ptr<platform::Log> log;  // null when it can't be made
  std::string error;                   // why not, with the target's name
};

// `target` is "stderr", "journal" or a file's path. The clock must outlive the sink.
OpenedLog openLog(std::string_view target, platform::LogLevel threshold, const platform::Clock& clock);

}  // namespace tarn::linux_host
