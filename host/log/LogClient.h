// LogClient: on whose behalf the calling thread works now: the client whose request, or whose connection's beginning or
// end, is being served. Work that such work hands over to the server queue is that client's too.
//
// Set by the connections and the server queue, read by the log. Threads: each has its own.
#pragma once

#include <cstdint>
#include <utility>

namespace tarn::linux_host {

struct LogClient {
  std::uint64_t connection = 0;  // its number; 0: nobody's
  std::int32_t process = 0;
  std::uint32_t user = 0;
};

class LogClientScope {
 public:
  // While it lives the thread works for this client.
  explicit LogClientScope(const LogClient& client) noexcept : previous_(std::exchange(current_, client)) {}
  LogClientScope(const LogClientScope&) = delete;
  LogClientScope& operator=(const LogClientScope&) = delete;
  ~LogClientScope() { current_ = previous_; }

  static const LogClient& current() noexcept { return current_; }

 private:
  static inline thread_local LogClient current_;
  const LogClient previous_;
};

}  // namespace tarn::linux_host
