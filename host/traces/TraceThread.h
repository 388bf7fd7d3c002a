// TraceThread: does the work of all traces: carries out what sessions ask for, in their order, and empties the buffers
// of those that record.
//
// Owner: the service of the traces, shared with its sessions. The thread exists from run() until end(). Threads: any.
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
  enum class Verb { Start, Stop, Release };

  explicit TraceThread(const PerformanceTraceLimits& limits) : limits_(limits) {}
  ~TraceThread() { end(); }
  TraceThread(const TraceThread&) = delete;
  TraceThread& operator=(const TraceThread&) = delete;

  // Whether the thread runs; starts it when it doesn't yet.
  [[nodiscard]] bool run();
  // Has something done; nothing any more after end().
  void post(Verb verb, std::shared_ptr<TraceRecording> recording);
  // Ends all traces without callbacks, and the thread.
  void end();

 private:
  struct Command {
    Verb verb;
    std::shared_ptr<TraceRecording> recording;
  };

  void work();
  void waitForWork() TARN_REQUIRES(mutex_);
  void carryOut(const Command& command);
  void wake();

  const PerformanceTraceLimits limits_;
  std::vector<std::shared_ptr<TraceRecording>> open_;  // the thread's own

  Mutex mutex_;
  ConditionVariable changed_;
  std::thread thread_ TARN_GUARDED_BY(mutex_);
  std::vector<Command> commands_ TARN_GUARDED_BY(mutex_);
  bool mustDrain_ TARN_GUARDED_BY(mutex_) = false;
  bool ended_ TARN_GUARDED_BY(mutex_) = false;
};

}  // namespace tarn::linux_host
