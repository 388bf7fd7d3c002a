// LogOutput: where the lines of a queued log go: a descriptor, a file, the journal.
//
// Owned by the QueuedLog. Threads: formed() any; write() the log's own.
#pragma once

#include <string>
#include <string_view>

#include "platform/Log.h"

namespace tarn::linux_host {

class LogOutput {
 public:
  virtual ~LogOutput() = default;
  // The entry as bytes for write(), its text made safe: no client can forge an entry or steer a terminal.
  virtual std::string formed(double epochSeconds, const platform::LogEntry& entry) const = 0;
  // Hands the bytes over; 0, or an errno value. After an error the same bytes come again later, and what of them was
  // taken before isn't written twice. May take a moment where a reader is slow, not longer.
  virtual int write(std::string_view bytes) = 0;
};

}  // namespace tarn::linux_host
