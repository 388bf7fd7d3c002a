// SPDX-License-Identifier: Apache-2.0
// TarnReportingTraceRecording: one performance trace, from its start to the place of its file, and the waits in
// between.
//
// Each trace has a recording of its own, so that a callback of one that was given up is never taken for one of the
// next. A callback that comes a second time is ignored.
//
// Owner: the trace worker; the facility holds it weakly, as its delegate. Threads: start and stop on the server queue,
// which they block; the callbacks on any thread, also after the last wait or within start and stop.
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>

#include "platform/Condition.h"
#include "platform/PerformanceTraceService.h"
#include "plist/ThreadSafety.h"

namespace tarn {

class TarnReportingTraceRecording final : public platform::PerformanceTraceDelegate,
                                          public std::enable_shared_from_this<TarnReportingTraceRecording> {
 public:
  // What came of a stop.
  enum class End {
    NoTrace,    // it didn't begin, failed, or ended by itself: there is nothing to stop
    TimedOut,   // the facility didn't answer
    Completed,  // the facility is done with it; whether there is a file, finalTraceURL tells
  };

  // The trace isn't begun yet. The condition is the recording's own, and the lock of what its callbacks write.
  TarnReportingTraceRecording(std::shared_ptr<platform::PerformanceTraceSession> traceSession,
                              std::shared_ptr<platform::Condition> traceDispatchSemaphore);
  TarnReportingTraceRecording(const TarnReportingTraceRecording&) = delete;
  TarnReportingTraceRecording& operator=(const TarnReportingTraceRecording&) = delete;

  // Starts the trace and waits up to 15 seconds for the facility's word, be it an error. Whether it came. Once. A trace
  // that doesn't answer in time is asked to stop, when it is still valid, and an error line tells so; it may yet begin
  // and end by itself.
  bool start();
  // Stops the trace and waits up to 180 seconds until it is complete. After a time-out the trace may still complete;
  // its file stays where the facility put it, and no results are made.
  End stop();
  // Where the finished trace lies. Nothing until it is complete, and when it completed with an error.
  std::optional<std::string> finalTraceURL() const;
  // How many events it lacks.
  std::uint64_t eventsLeftOut() const;

  // An error ends the recording: there is nothing to stop then. Either way the wait of the start is over.
  void performanceTraceDidStart(const Status& error) override;
  // Only told in the log, unless it is an error: the stop waits for the completion.
  void performanceTraceDidStop(const Status& error) override;
  // Ends whichever wait there is: a trace may complete by itself while its start is still waited for.
  void performanceTraceDidComplete(const std::string& location, const std::string& token, const Status& error) override;

 private:
  // The session, held by the caller: a callback may clear it meanwhile. Null when it is gone.
  std::shared_ptr<platform::PerformanceTraceSession> traceSession() const;
  // Lets go of the session; the one that it was, so that it ends outside the lock.
  std::shared_ptr<platform::PerformanceTraceSession> clearTraceSession();

  const std::shared_ptr<platform::Condition> condition_;
  // The flags that are waited for: TarnReportingUtilityWait and Signal, which get them, take the lock themselves.
  bool answered_ = false;   // the start: the facility told something, be it the end
  bool completed_ = false;  // the stop
  std::shared_ptr<platform::PerformanceTraceSession> traceSession_ TARN_GUARDED_BY(*condition_);
  std::optional<std::string> finalTraceURL_ TARN_GUARDED_BY(*condition_);
  std::uint64_t eventsLeftOut_ TARN_GUARDED_BY(*condition_) = 0;
  bool startTold_ TARN_GUARDED_BY(*condition_) = false;
  bool stopTold_ TARN_GUARDED_BY(*condition_) = false;
  bool completionTold_ TARN_GUARDED_BY(*condition_) = false;
};

}  // namespace tarn
