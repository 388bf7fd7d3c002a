#include "host/log/LogTarget.h"

#include <unistd.h>

#include <utility>

#include "host/log/FileLog.h"
#include "host/log/HostLog.h"
#include "host/log/JournalLog.h"

namespace tarn::linux_host {

OpenedLog openLog(std::string_view target, platform::LogLevel threshold, const platform::Clock& clock) {
  if (target == "stderr") return {std::make_unique<StreamLog>(STDERR_FILENO, clock, threshold), {}};
  if (target == "journal") {
    if (const auto reason = JournalLog::unavailable(); reason.failed()) {
      return {nullptr, "no journal on this machine: " + reason->text};
    }
    return {std::make_unique<JournalLog>(threshold), {}};
  }
  const std::string path(target);
  auto file = std::make_unique<FileLog>(path, clock, threshold);
  if (const auto error = file->open(); error.failed()) {
    return {nullptr, "cannot open log file " + path + errorSuffix(*error)};
  }
  return {std::move(file), {}};
}

}  // namespace tarn::linux_host
