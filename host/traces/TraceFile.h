// TraceFile: a performance trace on the disk, in the trace-event format that Chrome's and Perfetto's viewers open: one
// JSON object with the events under "traceEvents", each on a line of its own, and what is known of the whole under
// "otherData".
//
// While it is written it bears another name (".NAME.partial"), and it gets its own by finish(), whole and on the disk;
// a trace that is let go of before leaves nothing. Its size is bounded: at the bound an event "tarnkit.traceFull" is
// written and the rest is left out and counted.
//
// Owner: the trace. Threads: one at a time.
#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <unordered_set>

#include "host/system/FileReplacement.h"
#include "host/traces/SignpostBuffer.h"
#include "plist/Result.h"

namespace tarn::linux_host {

class TraceFile {
 public:
  struct Facts {
    std::string directory;
    std::string name;
    std::string token;             // the trace's own name
    std::int32_t templateNumber;   // as it was asked for
    bool writesArguments = false;  // whether the events carry their arguments
    std::size_t mostBytes;
    double began;  // epoch seconds
  };

  explicit TraceFile(Facts facts);
  TraceFile(const TraceFile&) = delete;
  TraceFile& operator=(const TraceFile&) = delete;

  // Makes the file. To be called first; nothing else works when it fails.
  [[nodiscard]] Status open();
  // Each adds events. They reach the disk in blocks; what fails there is told by the next flush() or finish().
  void write(const SignpostRecord& record);
  void writeCounter(std::string_view name, std::string_view unit, std::int64_t value, std::chrono::nanoseconds at);
  // An event that tells that so many were lost before this moment.
  void writeLost(std::uint64_t count, std::chrono::nanoseconds at);
  [[nodiscard]] Status flush();
  // Completes the file and gives it its name: its path.
  Result<std::string> finish();

  bool isFull() const noexcept { return full_; }
  // Events that are not in the file: lost before, or beyond its bound.
  std::uint64_t leftOut() const noexcept { return leftOut_; }

 private:
  void beginEvent(std::string_view phase, std::chrono::nanoseconds at, std::int32_t thread);
  void appendNames(const platform::Signpost& signpost);
  void nameThread(std::int32_t thread, std::chrono::nanoseconds at);
  bool endEvent(std::chrono::nanoseconds at);
  void put(std::string_view text);
  void writeOut();

  const Facts facts_;
  const std::int32_t process_;
  FileReplacement file_;
  std::string event_;  // the one that is being formed
  std::string heldBack_;
  std::size_t bytes_ = 0;
  std::uint64_t events_ = 0;
  std::uint64_t leftOut_ = 0;
  bool full_ = false;
  std::unordered_set<std::int32_t> namedThreads_;
};

}  // namespace tarn::linux_host
