// SPDX-License-Identifier: Apache-2.0
// JournalOutput: log entries to the system journal, as fields:
//
//   MESSAGE            the text, with its prefix and all its lines
//   PRIORITY           7 debug, 6 info, 5 default, 3 error
//   TARN_CATEGORY      the category's code
//   TARN_SUBSYSTEM     the category's subsystem
//   CODE_FILE, CODE_LINE   the module and its line, when the entry has them
//   SYSLOG_IDENTIFIER  the program
//   MESSAGE_ID         of the condition that the entry tells of, when it is one of host/log/JournalCatalog.h
//   TARN_PID, TARN_UID the client on whose behalf the thread works, when it does so for one
//   TARN_SESSION       the session that it works for, by its id in the recorder's file (LogSessionIds), likewise
//
// One datagram an entry, which the journal takes at once or not at all: its own library waits for a journal that
// stalls. A field is NAME=value and a line end or, when the value has several lines, NAME, a line end, the value's
// length in 64 bits, little-endian, the value and a line end. Threads: as LogOutput says.
//
// MESSAGE, CODE_FILE and CODE_LINE are the journal's own names, TARN_... are this system's; `journalctl
// TARN_CATEGORY=CODE` selects by them. The entry's own time isn't sent: the journal stamps what it takes.
#pragma once

#include <cstdint>
#include <functional>
#include <string>
#include <string_view>

#include "host/log/LogOutput.h"
#include "host/system/UniqueDescriptor.h"
#include "plist/Result.h"

namespace tarn::linux_host {

class JournalOutput final : public LogOutput {
 public:
  // Where systemd's journal listens for entries of this form; another path serves tests.
  static constexpr const char* kSocket = "/run/systemd/journal/socket";

  // The id of the session for which the calling thread works, 0 for none. Called on any thread; it throws nothing.
  using SessionSource = std::function<std::int64_t()>;

  // Opens nothing; the path must fit a socket address (107 bytes), or open() fails.
  explicit JournalOutput(std::string socketPath = kSocket, SessionSource sessionOf = nullptr);
  JournalOutput(const JournalOutput&) = delete;
  JournalOutput& operator=(const JournalOutput&) = delete;

  // Makes the socket and asks, by connecting a second one, whether anybody listens at the path; what keeps it from
  // taking entries, with the path. Called once, before write(). The send buffer is asked for 8 MiB, so that the largest
  // entry fits one datagram; where the system grants less, a larger entry fails with EMSGSIZE and is lost alone.
  [[nodiscard]] Status open();

  // The fields of one entry. Its lines stay lines, as the length of a field says where it ends; other control
  // characters are made visible. The time isn't used.
  std::string formed(double epochSeconds, const platform::LogEntry& entry) const override;
  // Sends one datagram to the path, never waiting: EAGAIN while the journal's queue is full, ECONNREFUSED or ENOENT
  // while none runs. As each goes to the path and not over a connection, a journal that was started again is found
  // again.
  int write(std::string_view bytes) override;

 private:
  // Not connected: see write().
  const std::string path_;
  const SessionSource sessionOf_;
  UniqueDescriptor socket_;
};

}  // namespace tarn::linux_host
