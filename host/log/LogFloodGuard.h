// LogFloodGuard: keeps one client from filling the log with one kind of line.
//
// Which problem: each request makes lines, and a client can send a hundred thousand a second. How: the lines of one
// source place on behalf of one process are counted in windows of ten seconds. Those beyond the first hundred are left
// out; that it begins is told once, with who it is, and at the end of each window how many there were. A window with
// fewer than a hundred ends the flood.
//
//   lines of one kind:  1 ... 100 |"too many"| ......... left out ......... |"N lines left out"| ... |"..."| 1 ...
//   windows:            [ 10 s                                              ][ 10 s                 ][ 10 s
//
// Only lines of the levels default and error, which nobody asked for; who asks for more detail gets all of it. The
// table is bounded: when it is full, the clients that find no place share one for each kind of line.
//
// Owned by HostSetup, before the log that it guards. Threads: any.
#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <string>
#include <string_view>
#include <unordered_map>

#include "host/log/LogClient.h"
#include "platform/Clock.h"
#include "platform/Log.h"
#include "plist/ThreadSafety.h"

namespace tarn::linux_host {

// "connection 3 of process 41, uid 1000, /usr/bin/player"
std::string describe(const LogClient& client);

class LogFloodGuard final : public platform::Log {
 public:
  static constexpr std::uint64_t kMostLines = 100;
  static constexpr std::chrono::seconds kWindow{10};
  static constexpr std::size_t kMostKinds = 4096;

  // Both outlive the guard.
  LogFloodGuard(platform::Log& next, const platform::Clock& clock);
  LogFloodGuard(const LogFloodGuard&) = delete;
  LogFloodGuard& operator=(const LogFloodGuard&) = delete;

  void write(const platform::LogEntry& entry) noexcept override;
  // Tells at once what was left out so far.
  void tellCounts() noexcept;

 private:
  // A place in the source, and the process on whose behalf it speaks.
  struct Place {
    const char* module;
    int line;
    std::int32_t process;
    bool operator==(const Place&) const = default;
  };
  struct PlaceHash {
    std::size_t operator()(const Place& place) const noexcept;
  };
  struct Kind {
    platform::LogCategory category;
    platform::LogLevel level;
    std::string_view module;  // a text of the program
    int line;
    std::chrono::nanoseconds begin;  // of the window
    std::uint64_t lines = 0;         // in the window
    std::uint64_t leftOut = 0;       // of them
    bool flooding = false;
    std::string who = {};  // of a flood
  };

  bool admit(const platform::LogEntry& entry, const LogClient& client) TARN_REQUIRES(mutex_);
  Kind& kindOf(const platform::LogEntry& entry, const LogClient& client, std::chrono::nanoseconds now)
      TARN_REQUIRES(mutex_);
  void endWindow(Kind& kind, std::chrono::nanoseconds now) TARN_REQUIRES(mutex_);
  void endWindows(std::chrono::nanoseconds now) TARN_REQUIRES(mutex_);
  void tell(const Kind& kind, const std::string& text) TARN_REQUIRES(mutex_);

  platform::Log& next_;
  const platform::Clock& clock_;
  Mutex mutex_;
  std::unordered_map<Place, Kind, PlaceHash> kinds_ TARN_GUARDED_BY(mutex_);
  std::chrono::nanoseconds nextLook_ TARN_GUARDED_BY(mutex_){};  // when all windows are looked at
};

}  // namespace tarn::linux_host
