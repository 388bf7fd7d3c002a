// SPDX-License-Identifier: Apache-2.0
// PerformanceTraceService: records a trace of the device's performance into a file.
//
// Life of a trace: start, performanceTraceDidStart, ... stop, performanceTraceDidStop, performanceTraceDidComplete with
// the place of the file. The callbacks come on a thread of the facility's own, in this order; after a callback with an
// error no other follows.
#pragma once

#include <cstdint>
#include <memory>
#include <string>

#include "plist/Result.h"

namespace tarn::platform {

// What is recorded, by a number of the service's own, and whether the file is packed at the end. A service may refuse
// either.
struct PerformanceTraceConfiguration {
  // Which kinds of events are recorded, and with what beside them.
  std::int32_t templateNumber = 2;
  // A platform that never packs its files refuses it.
  bool compressWhenFinished = true;
};

// Told what becomes of a trace. Owned by whoever traces; a trace holds it weakly and calls nobody once it is gone.
class PerformanceTraceDelegate {
 public:
  virtual ~PerformanceTraceDelegate() = default;
  // The trace runs; beside an error it never did.
  virtual void performanceTraceDidStart(const Status& error) = 0;
  // It records no more; its file is still to be completed. Beside an error there will be none.
  virtual void performanceTraceDidStop(const Status& error) = 0;
  // The file lies complete at `location`. Beside an error the location is empty. The token is the facility's own name
  // for the trace.
  virtual void performanceTraceDidComplete(const std::string& location, const std::string& token,
                                           const Status& error) = 0;
};

// One trace, owned by whoever asked for it. A second start, and a stop of what isn't running, do nothing.
class PerformanceTraceSession {
 public:
  virtual ~PerformanceTraceSession() = default;
  // Who is told; set before startTrace(). An empty pointer takes it away. Threads: any, also within a callback.
  virtual void setDelegate(std::weak_ptr<PerformanceTraceDelegate> delegate) = 0;
  // Asks for the start and returns at once; the delegate is told of the outcome.
  virtual void startTrace() = 0;
  // Asks for the stop and returns at once; the delegate is told when the trace is complete.
  virtual void stopTrace() = 0;
  // Whether there is a trace that can be stopped.
  virtual bool isValid() const = 0;
  // Events that the finished trace lacks, since there was no room for them. Known from the completion on.
  virtual std::uint64_t eventsLeftOut() const = 0;
};

// Owned by the platform, which may lack it. Threads: any.
class PerformanceTraceService {
 public:
  virtual ~PerformanceTraceService() = default;
  // A new session; a null pointer when the configuration is not supported. Letting go of it ends its trace without more
  // callbacks.
  virtual std::shared_ptr<PerformanceTraceSession> createSession(
      const PerformanceTraceConfiguration& configuration) = 0;
};

}  // namespace tarn::platform
