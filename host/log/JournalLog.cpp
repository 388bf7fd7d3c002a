#include "host/log/JournalLog.h"

// The place of an entry is the one that it brings, not this file.
#define SD_JOURNAL_SUPPRESS_LOCATION
#include <sys/stat.h>
#include <systemd/sd-journal.h>

#include <array>
#include <cerrno>
#include <exception>
#include <vector>

#include "host/log/HostLog.h"

namespace tarn::linux_host {

namespace {

constexpr const char* kJournalSocket = "/run/systemd/journal/socket";
constexpr std::array<const char*, 4> kPriorities{"7", "6", "5", "3"};  // by level

}  // namespace

JournalLog::JournalLog(platform::LogLevel threshold, Send send) : send_(send != nullptr ? send : &sd_journal_sendv) {
  setThreshold(threshold);
}

// Asked beforehand because the journal's own call reports success when there is nobody to take the entry.
Status JournalLog::unavailable() {
  struct stat facts {};
  if (::stat(kJournalSocket, &facts) != 0) {
    const int error = errno;
    return Error{error, kJournalSocket + errorSuffix(error)};
  }
  return {};
}

void JournalLog::write(const platform::LogEntry& entry) noexcept {
  try {
    const platform::MutexLock lock(mutex_);
    int error = 0;
    if (lost_ > 0) {
      constexpr std::string_view kModule = "JournalLog";
      constexpr int kLine = __LINE__;
      const std::string text =
          prefixed(kModule, std::to_string(lost_) + " log entries were lost" + errorSuffix(lostError_), kLine);
      error = sendEntry({kHostCategory, platform::LogLevel::Error, kModule, kLine, text});
      lost_ = error == 0 ? 0 : lost_;
    }
    if (error == 0) {
      error = sendEntry(entry);
    }
    if (error != 0) {
      ++lost_;
      lostError_ = error;
    }
  } catch (const std::exception&) {  // no memory for the fields
    const platform::MutexLock lock(mutex_);
    ++lost_;
    lostError_ = ENOMEM;
  }
}

// 0 or an errno value.
int JournalLog::sendEntry(const platform::LogEntry& entry) {
  std::vector<std::string> texts;
  const auto add = [&texts](std::string_view name, std::string_view value) {
    texts.emplace_back(name).append("=").append(value);
  };
  add("MESSAGE", entry.text);
  add("PRIORITY", kPriorities[static_cast<std::size_t>(entry.level)]);
  add("TARN_CATEGORY", entry.category.code);
  add("TARN_SUBSYSTEM", entry.category.subsystem);
  if (!entry.module.empty()) {
    add("CODE_FILE", entry.module);
    add("CODE_LINE", std::to_string(entry.line));
  }
  add("SYSLOG_IDENTIFIER", "tarnreportingd");
  std::vector<iovec> fields;
  fields.reserve(texts.size());
  for (std::string& text : texts) {
    fields.push_back({text.data(), text.size()});
  }
  const int result = send_(fields.data(), static_cast<int>(fields.size()));
  return result < 0 ? -result : 0;
}

}  // namespace tarn::linux_host
