// SPDX-License-Identifier: Apache-2.0
// LogOutput: where the lines of a queued log go: a descriptor, a file, the journal. It knows a form and a system call;
// waiting, retries and what is lost are the log's.
//
// Owned by the QueuedLog. Threads: formed() any, also several at once; write() the log's own.
#pragma once

#include <string>
#include <string_view>

#include "platform/Log.h"

namespace tarn::linux_host {

class LogOutput {
 public:
  virtual ~LogOutput() = default;
  // The entry as bytes for write(), its text made safe: no client can forge an entry or steer a terminal. Called by
  // whoever logs, outside any lock; may throw for want of memory.
  virtual std::string formed(double epochSeconds, const platform::LogEntry& entry) const = 0;
  // Hands the bytes over; 0, or an errno value. After an error the same bytes come again later, and what of them was
  // taken before isn't written twice. EMSGSIZE alone means that they will never be taken: they don't come again. May
  // take a moment where a reader is slow (100 ms at most), not longer.
  virtual int write(std::string_view bytes) = 0;
};

}  // namespace tarn::linux_host
