// SPDX-License-Identifier: Apache-2.0
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

// "connection 3 of process 41, uid 1000, /usr/bin/player". Looks the program up under /proc, so it is for lines that
// are rare.
std::string describe(const LogClient& client);

class LogFloodGuard final : public platform::Log {
 public:
  // Of one kind in a window: enough to see what a client does.
  static constexpr std::uint64_t kMostLines = 100;
  // Also how long a count waits to be told, as long as lines of any client go on coming.
  static constexpr std::chrono::seconds kWindow{10};
  // Places times processes; a client can make processes without end, but no places. Bounds the table at about a
  // megabyte.
  static constexpr std::size_t kMostKinds = 4096;

  // Both outlive the guard. The threshold is the next log's as it is here: entries below it aren't formed by anybody.
  LogFloodGuard(platform::Log& next, const platform::Clock& clock);
  LogFloodGuard(const LogFloodGuard&) = delete;
  LogFloodGuard& operator=(const LogFloodGuard&) = delete;

  // Likewise from now on; the next log's is set beside. Threads: any.
  void setLevel(platform::LogLevel level) noexcept { setThreshold(level); }

  // Passes the entry on or counts it. What is nobody's, or below the level default, goes on without a look at the table
  // and without the lock; so does what there is no memory to remember. A count of an earlier window is told before the
  // entry that began the next.
  void write(const platform::LogEntry& entry) noexcept override;
  // Tells at once what was left out so far and begins new windows; for the end of the process, which would lose the
  // counts.
  void tellCounts() noexcept;

 private:
  // A place in the source, and the process on whose behalf it speaks. The module is compared by its address, as a text
  // of the program has one.
  struct Place {
    const char* module;
    int line;
    std::int32_t process;
    bool operator==(const Place&) const = default;
  };
  struct PlaceHash {
    std::size_t operator()(const Place& place) const noexcept;
  };
  // What was seen of one place's lines. Category, level and module are the first entry's, so that the lines about the
  // flood stand where the flood does.
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

  // Counts the entry; whether it may be written. The line that begins a flood is written from in here.
  bool admit(const platform::LogEntry& entry, const LogClient& client) TARN_REQUIRES(mutex_);
  // The row of the entry's place, made on first sight. When the table is full the process is left out of the key, so
  // that all who come late share a row for each place.
  Kind& kindOf(const platform::LogEntry& entry, const LogClient& client, std::chrono::nanoseconds now)
      TARN_REQUIRES(mutex_);
  // Tells the window's count, if any, and begins the next; the flood goes on when this window had more than the limit.
  void endWindow(Kind& kind, std::chrono::nanoseconds now) TARN_REQUIRES(mutex_);
  // Once a window for all rows, not with every line: this is a walk over the whole table. Rows without a line since are
  // forgotten here, which is what makes room.
  void endWindows(std::chrono::nanoseconds now) TARN_REQUIRES(mutex_);
  // In the name of the kind's own place, with its prefix.
  void tell(const Kind& kind, const std::string& text) TARN_REQUIRES(mutex_);

  platform::Log& next_;
  const platform::Clock& clock_;
  Mutex mutex_;
  std::unordered_map<Place, Kind, PlaceHash> kinds_ TARN_GUARDED_BY(mutex_);
  std::chrono::nanoseconds nextLook_ TARN_GUARDED_BY(mutex_){};  // when all windows are looked at
};

}  // namespace tarn::linux_host
