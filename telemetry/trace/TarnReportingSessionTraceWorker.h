// SPDX-License-Identifier: Apache-2.0
// TarnReportingSessionTraceWorker: measures what happens during a test session. On internal builds a performance trace
// is recorded from the session's start to its stop; then the trace is analysed and the times of its signpost intervals
// are written into a perf-data file.
//
// start and stop block the server queue until the trace facility answers, up to 15 and 180 seconds. Whatever fails is
// logged, and the session ends as usual.
//
// The kind of the trace and the names of the files come from the session's configuration
// (TarnReportingTraceConfiguration.h).
//
// Owner: the session. Threads: the server queue.
#pragma once

#include <memory>
#include <string>
#include <string_view>

#include "session/TarnReportingSessionWorker.h"

namespace tarn {

class TarnReportingTraceRecording;

// Neither consumer nor producer: it starts after those and stops after them, so that their stop is in the trace.
class TarnReportingSessionTraceWorker : public TarnReportingSessionWorkerProtocol {
 public:
  static constexpr std::string_view kClassName = "TarnReportingSessionTraceWorker";

  // For every session, where the platform can trace, analyse and write results; in a session that isn't a test on an
  // internal build it does nothing.
  static std::unique_ptr<TarnReportingSessionTraceWorker> initWithSession(
      const std::shared_ptr<TarnReportingSession>& session);
  // For whoever lists workers; the session doesn't ask.
  static bool internalOnly() { return true; }

  // `perfDataName`: what the result file calls its measurements; the configured name of the file, or "TarnReporting".
  TarnReportingSessionTraceWorker(std::weak_ptr<TarnReportingSession> session, std::string perfDataName);
  // A trace that still runs ends with its session.
  ~TarnReportingSessionTraceWorker() override;

  // Whether a trace runs, or was asked for and the facility said something about it, be it an error. Without the file
  // of probe descriptions no trace is begun, and an error line tells so.
  bool start();
  // Nothing without a trace. The results are made on the queue too, as an announced block: the watchdog bears it, and
  // the main loop stands still until the file is written.
  void stop();

 private:
  const std::string mPerfDataName_;
  bool startedTracing_ = false;  // stays so when the facility never answered: then this session isn't traced again
  std::shared_ptr<TarnReportingTraceRecording> recording_;  // the newest; null before the first
};

}  // namespace tarn
