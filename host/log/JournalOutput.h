// JournalOutput: log entries to the system journal, as fields:
//
//   MESSAGE            the text, with its prefix and all its lines
//   PRIORITY           7 debug, 6 info, 5 default, 3 error
//   TARN_CATEGORY      the category's code
//   TARN_SUBSYSTEM     the category's subsystem
//   CODE_FILE, CODE_LINE   the module and its line, when the entry has them
//   SYSLOG_IDENTIFIER  the program
//
// One datagram an entry, which the journal takes at once or not at all: its own library waits for a journal that
// stalls. A field is NAME=value and a line end or, when the value has several lines, NAME, a line end, the value's
// length in 64 bits, little-endian, the value and a line end. Threads: as LogOutput says.
#pragma once

#include <string>
#include <string_view>

#include "host/log/LogOutput.h"
#include "host/system/UniqueDescriptor.h"
#include "plist/Result.h"

namespace tarn::linux_host {

class JournalOutput final : public LogOutput {
 public:
  static constexpr const char* kSocket = "/run/systemd/journal/socket";

  explicit JournalOutput(std::string socketPath = kSocket);
  JournalOutput(const JournalOutput&) = delete;
  JournalOutput& operator=(const JournalOutput&) = delete;

  // Makes the socket and asks whether anybody listens at the path; what keeps it from taking entries, with the path.
  [[nodiscard]] Status open();

  std::string formed(double epochSeconds, const platform::LogEntry& entry) const override;
  // A journal that was started again is found again.
  int write(std::string_view bytes) override;

 private:
  const std::string path_;
  UniqueDescriptor socket_;
};

}  // namespace tarn::linux_host
