// SPDX-License-Identifier: Apache-2.0
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
  // What is known before the first event.
  struct Facts {
    // Must be there; the file's name in it, with ".json".
    std::string directory;
    std::string name;
    std::string token;             // the trace's own name
    std::int32_t templateNumber;   // as it was asked for
    bool writesArguments = false;  // whether the events carry their arguments
    // Of the whole file. 4 KiB of it are kept for what completes it.
    std::size_t mostBytes;
    double began;  // epoch seconds
  };

  explicit TraceFile(Facts facts);
  TraceFile(const TraceFile&) = delete;
  TraceFile& operator=(const TraceFile&) = delete;

  // Makes the file, under its other name, and writes its first lines. Fails when there is such a file (EEXIST), when
  // the folder isn't there or the disk takes nothing. To be called first; nothing else works when it fails.
  [[nodiscard]] Status open();
  // Each adds events. They reach the disk in blocks of 64 KiB; what fails there is told by the next flush() or
  // finish(). The first event of a thread is preceded by one that names it, for at most 1024 threads.
  void write(const SignpostRecord& record);
  // A value that is drawn as a curve; it isn't counted as an event, and is dropped when the file is full.
  void writeCounter(std::string_view name, std::string_view unit, std::int64_t value, std::chrono::nanoseconds at);
  // An event that tells that so many were lost before this moment; they count as left out.
  void writeLost(std::uint64_t count, std::chrono::nanoseconds at);
  // Brings what is held back to the disk's cache. The result is that of the first write that failed, also later: such a
  // file is given up.
  [[nodiscard]] Status flush();
  // Completes the file, brings it to the disk and gives it its name: its path. After an error there is no file. The
  // last call.
  Result<std::string> finish();

  bool isFull() const noexcept { return full_; }
  // Events that are not in the file: lost before, or beyond its bound.
  std::uint64_t leftOut() const noexcept { return leftOut_; }

 private:
  // Into event_, up to the place where the members of the kind of event stand. Times are microseconds with three
  // decimals.
  void beginEvent(std::string_view phase, std::chrono::nanoseconds at, std::int32_t thread);
  // Category and "subject.verb": texts of the program, which need no escapes.
  void appendNames(const platform::Signpost& signpost);
  // Writes the event that names a thread, once for each.
  void nameThread(std::int32_t thread, std::chrono::nanoseconds at);
  // Writes the event out unless the file is full; whether it did. The one that finds too little room makes the file
  // full and has its place taken by the event that says so.
  bool endEvent(std::chrono::nanoseconds at);
  // Counts and holds back; a full block is written.
  void put(std::string_view text);
  // Hands what is held back to the file; an error stays with that.
  void writeOut();

  const Facts facts_;
  const std::int32_t process_;
  FileReplacement file_;
  std::string event_;  // the one that is being formed
  // What isn't written yet, at most a block and an event.
  std::string heldBack_;
  // Of the whole file so far, held back ones too.
  std::size_t bytes_ = 0;
  // In the file, and not in it.
  std::uint64_t events_ = 0;
  std::uint64_t leftOut_ = 0;
  bool full_ = false;
  // So that each thread is named once.
  std::unordered_set<std::int32_t> namedThreads_;
};

}  // namespace tarn::linux_host
