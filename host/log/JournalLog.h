// JournalLog: the log sink that hands entries to the system journal, as fields:
//
//   MESSAGE            the text, with its prefix and all its lines
//   PRIORITY           7 debug, 6 info, 5 default, 3 error
//   TARN_CATEGORY      the category's code
//   TARN_SUBSYSTEM     the category's subsystem
//   CODE_FILE, CODE_LINE   the module and its line, when the entry has them
//   SYSLOG_IDENTIFIER  the program
//
// An entry that the journal refuses is counted as lost; the next one that it takes is led by one that says so. Threads:
// any.
#pragma once

#include <sys/uio.h>

#include <cstdint>
#include <string>

#include "platform/Log.h"
#include "platform/ThreadSafety.h"
#include "plist/Result.h"

namespace tarn::linux_host {

class JournalLog final : public platform::Log {
 public:
  // Takes the fields of one entry; 0 or a negative errno value.
  using Send = int (*)(const struct iovec* fields, int count);

  // Hands entries to `send`, by default the journal's own call.
  explicit JournalLog(platform::LogLevel threshold, Send send = nullptr);
  JournalLog(const JournalLog&) = delete;
  JournalLog& operator=(const JournalLog&) = delete;

  // What keeps the journal from taking entries on this machine; nothing when it is there.
  static Status unavailable();

  void write(const platform::LogEntry& entry) noexcept override;

 private:
  int sendEntry(const platform::LogEntry& entry);

  const Send send_;
  platform::Mutex mutex_;
  std::uint64_t lost_ TARN_GUARDED_BY(mutex_) = 0;
  int lostError_ TARN_GUARDED_BY(mutex_) = 0;
};

}  // namespace tarn::linux_host
