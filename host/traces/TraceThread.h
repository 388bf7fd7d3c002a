// SPDX-License-Identifier: Apache-2.0
// TraceThread: does the work of all traces: carries out what sessions ask for, in their order, and empties the buffers
// of those that record.
//
// Owner: the service of the traces, shared with its sessions. The thread exists from run() until end(). Threads: any.
//
// One thread for all traces, so callbacks of two traces never overlap; a callback that takes long holds up the writing,
// and then buffers fill and events are left out.
#pragma once

#include <chrono>
#include <cstddef>
#include <memory>
#include <thread>
#include <vector>

#include "host/traces/TraceRecording.h"
#include "plist/ThreadSafety.h"

namespace tarn::linux_host {

class TraceThread {
 public:
  // Start: begin to record. Stop: complete the file. Release: the session is gone, and with it the trace.
  enum class Verb { Start, Stop, Release };

  // Makes no thread.
  explicit TraceThread(const PerformanceTraceLimits& limits) : limits_(limits) {}
  ~TraceThread() { end(); }
  TraceThread(const TraceThread&) = delete;
  TraceThread& operator=(const TraceThread&) = delete;

  // Whether the thread runs; starts it when it doesn't yet. False after end() and when the machine has no thread left.
  [[nodiscard]] bool run();
  // Has something done, in the order of the calls; nothing any more after end(). Never waits for the work.
  void post(Verb verb, std::shared_ptr<TraceRecording> recording);
  // Ends all traces without callbacks, removing their unfinished files, and the thread, which is waited for. Not to be
  // called within a callback. Again does nothing.
  void end();

 private:
  // What was posted, in the order of the calls.
  struct Command {
    Verb verb;
    std::shared_ptr<TraceRecording> recording;
  };

  // The thread: waits, carries out what was posted, drains the open traces.
  void work();
  // For a command, a buffer that is half full, or, while traces are open, the drain interval.
  void waitForWork() TARN_REQUIRES(mutex_);
  // One command; recordings that begin join the open ones, and leave them at their end.
  void carryOut(const Command& command);
  // From the thread that fills a buffer: empties all of them soon.
  void wake();

  const PerformanceTraceLimits limits_;
  std::vector<std::shared_ptr<TraceRecording>> open_;  // the thread's own

  Mutex mutex_;
  ConditionVariable changed_;
  std::thread thread_ TARN_GUARDED_BY(mutex_);
  std::vector<Command> commands_ TARN_GUARDED_BY(mutex_);
  // A buffer is half full, and nobody has looked since.
  bool mustDrain_ TARN_GUARDED_BY(mutex_) = false;
  bool ended_ TARN_GUARDED_BY(mutex_) = false;
};

}  // namespace tarn::linux_host
