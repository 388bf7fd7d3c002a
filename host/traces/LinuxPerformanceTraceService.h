// SPDX-License-Identifier: Apache-2.0
// LinuxPerformanceTraceService: records the service's own signposts into trace files, "Audio/Traces/*.json" in the
// diagnostic logs (see TraceFile). Several traces may run at once, each into a file of its own.
//
// Template 2 records intervals and marks. Template 3 also writes their arguments, and with each drain of the buffers
// samples of the process's load: processor time and memory. There are no other templates. Files are never compressed,
// so a configuration that asks for it is refused as well; viewers compress and open compressed traces by themselves.
//
// Bounds, and what happens at them: a start beyond `mostTraces` fails; an event that finds the buffer full is left out
// and counted; so are events beyond the file's size. What was left out stands in the file (events "tarnkit.eventsLost"
// and "tarnkit.traceFull", and the sums under "otherData") and in one log line at the end.
//
// A disk that refuses ends the writing at once; the log tells then, and the completion reports it. Only what succeeded
// leaves a file.
//
// A start that follows another, and a stop of what isn't a valid trace, do nothing. A callback that is under way while
// its session is let go of comes to its end; the delegate lives as long as it takes.
//
// Owner: the platform. Threads: any. Files are written and callbacks made on one thread of its own, which exists
// from the first session on.
#pragma once

#include <atomic>
#include <cstdint>
#include <memory>

#include "host/traces/TraceRecording.h"
#include "platform/PerformanceTraceService.h"

namespace tarn::linux_host {

class TraceThread;

class LinuxPerformanceTraceService final : public platform::PerformanceTraceService {
 public:
  // What `parts` refer to outlives this and its traces. No thread is made yet.
  explicit LinuxPerformanceTraceService(const TraceParts& parts, const PerformanceTraceLimits& limits = {});
  // shutdown(), which waits for the write that is under way.
  ~LinuxPerformanceTraceService() override;
  LinuxPerformanceTraceService(const LinuxPerformanceTraceService&) = delete;
  LinuxPerformanceTraceService& operator=(const LinuxPerformanceTraceService&) = delete;

  // Null, with an error line, for a configuration that isn't supported, after shutdown(), and when the machine has no
  // thread left. A session records nothing before its start; letting go of it removes what it has written.
  std::shared_ptr<platform::PerformanceTraceSession> createSession(
      const platform::PerformanceTraceConfiguration& configuration) override;
  // Ends every trace as letting go of it does, and the thread. Sessions that still exist do nothing any more. Not to be
  // called within a callback.
  void shutdown();

 private:
  class Session;

  const TraceParts parts_;
  const PerformanceTraceLimits limits_;
  const std::shared_ptr<TraceThread> thread_;  // shared with the sessions
  std::atomic<std::uint64_t> sessions_{0};
};

}  // namespace tarn::linux_host
