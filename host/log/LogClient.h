// SPDX-License-Identifier: Apache-2.0
// LogClient: on whose behalf the calling thread works now: the client whose request, or whose connection's beginning or
// end, is being served. Work that such work hands over to the server queue is that client's too.
//
// Set by the connections and the server queue, read by the log. Threads: each has its own.
//
// Why not an argument: a line is logged many calls below the one that knows the client, also by parts that know no
// clients at all. Costs copies of 16 bytes for each piece of work.
#pragma once

#include <cstdint>
#include <utility>

namespace tarn::linux_host {

// Plain data, copied beside each piece of work that waits on the server queue.
struct LogClient {
  std::uint64_t connection = 0;  // its number; 0: nobody's
  // As the kernel told them when the client connected; the process may have ended since.
  std::int32_t process = 0;
  std::uint32_t user = 0;
};

class LogClientScope {
 public:
  // While it lives the thread works for this client. Scopes nest: at the end the one before holds again. It ends on the
  // thread that made it.
  explicit LogClientScope(const LogClient& client) noexcept : previous_(std::exchange(current_, client)) {}
  LogClientScope(const LogClientScope&) = delete;
  LogClientScope& operator=(const LogClientScope&) = delete;
  ~LogClientScope() { current_ = previous_; }

  // The innermost scope's client; one with connection 0 where there is no scope, as for timers and back-ends.
  static const LogClient& current() noexcept { return current_; }

 private:
  // One a thread, so that the pool's threads, which work for nobody, never see a client of the server queue's.
  static inline thread_local LogClient current_;
  const LogClient previous_;
};

}  // namespace tarn::linux_host
