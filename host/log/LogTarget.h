// SPDX-License-Identifier: Apache-2.0
// openLog: makes the log that a target names. The one place that knows which outputs there are.
//
// Threads: one at a time; called once, by HostSetup.
#pragma once

#include <memory>
#include <string>
#include <string_view>

#include "host/log/JournalOutput.h"
#include "host/log/QueuedLog.h"
#include "plist/Result.h"

namespace tarn::linux_host {

// `target` is "stderr", "journal" or a file's path. Where there is no journal the standard error stream takes its
// place, with a line that says so; a file that can't be opened is an error, with its name ("cannot open log file PATH:
// why"), and there is no log then. The log has been started. The clock outlives the log; `journalSocket` is another one
// for tests; `sessionOf` tells the journal which session an entry is of.
Result<std::unique_ptr<QueuedLog>> openLog(std::string_view target, platform::LogLevel threshold,
                                           const platform::Clock& clock,
                                           const std::string& journalSocket = JournalOutput::kSocket,
                                           JournalOutput::SessionSource sessionOf = nullptr);

}  // namespace tarn::linux_host
