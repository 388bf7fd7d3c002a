// openLog: makes the log that a target names. Threads: one at a time.
#pragma once

#include <memory>
#include <string>
#include <string_view>

#include "host/log/JournalOutput.h"
#include "host/log/QueuedLog.h"
#include "plist/Result.h"

namespace tarn::linux_host {

// `target` is "stderr", "journal" or a file's path. Where there is no journal the standard error stream takes its
// place, with a line that says so; a file that can't be opened is an error, with its name. The clock outlives the log.
Result<std::unique_ptr<QueuedLog>> openLog(std::string_view target, platform::LogLevel threshold,
                                           const platform::Clock& clock,
                                           const std::string& journalSocket = JournalOutput::kSocket);

}  // namespace tarn::linux_host
