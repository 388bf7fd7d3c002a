// SPDX-License-Identifier: Apache-2.0
#include "host/log/LogTarget.h"

#include <unistd.h>

#include <utility>

#include "host/log/FileOutput.h"
#include "host/log/LineOutput.h"
#include "host/log/PrefixedLog.h"
#include "platform/LogCondition.h"

namespace tarn::linux_host {

namespace {

constexpr std::string_view kModule = "LogTarget";

}  // namespace

Result<std::unique_ptr<QueuedLog>> openLog(std::string_view target, platform::LogLevel threshold,
                                           const platform::Clock& clock, const std::string& journalSocket,
                                           JournalOutput::SessionSource sessionOf) {
  std::unique_ptr<LogOutput> output;
  std::string fallback;
  if (target == "journal") {
    auto journal = std::make_unique<JournalOutput>(journalSocket, std::move(sessionOf));
    if (const auto error = journal->open(); error.failed()) {
      fallback = "no journal on this machine, the log goes to the standard error stream" + errorSuffix(*error);
    } else {
      output = std::move(journal);
    }
  } else if (target != "stderr") {
    const std::string path(target);
    auto file = std::make_unique<FileOutput>(path);
    if (const Status opened = file->open(); opened.failed()) {
      return {nullptr, Error{opened.code(), "cannot open log file " + path + errorSuffix(*opened)}};
    }
    output = std::move(file);
  }
  if (!output) {
    output = std::make_unique<StreamOutput>(STDERR_FILENO);
  }
  auto log = std::make_unique<QueuedLog>(std::move(output), clock, threshold);
  log->start();
  if (!fallback.empty()) {
    const platform::LogConditionScope condition(platform::LogCondition::LogUnavailable);
    logPrefixed(*log, kHostCategory, platform::LogLevel::Error, kModule, fallback);
  }
  return {std::move(log), {}};
}

}  // namespace tarn::linux_host
