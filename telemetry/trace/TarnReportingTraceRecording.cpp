// SPDX-License-Identifier: Apache-2.0
#include "telemetry/trace/TarnReportingTraceRecording.h"

#include <string_view>
#include <utility>

#include "service/vocabulary/TarnReportingLog.h"
#include "service/vocabulary/TarnReportingUtility.h"

namespace tarn {

namespace {

constexpr TarnReportingLogger kLog{TarnReportingTraceCategory,
                                   "TarnReportingSessionTraceWorker"};  // whose delegate this is
constexpr std::chrono::seconds kStartWait{15};
constexpr std::chrono::seconds kStopWait{180};

}  // namespace

TarnReportingTraceRecording::TarnReportingTraceRecording(
    std::shared_ptr<platform::PerformanceTraceSession> traceSession,
    std::shared_ptr<platform::Condition> traceDispatchSemaphore)
    : condition_(std::move(traceDispatchSemaphore)), traceSession_(std::move(traceSession)) {}

bool TarnReportingTraceRecording::start() {
  // Held here: an error may clear the session while its start still runs.
  const auto starting = traceSession();
  starting->setDelegate(weak_from_this());
  starting->startTrace();
  if (TarnReportingUtilityWait(*condition_, kStartWait, answered_)) return true;
  kLog(LogLevel::Error, "timed out waiting for performance trace to start");
  if (const auto late = traceSession(); late && late->isValid()) {
    late->stopTrace();
  }
  return false;
}

TarnReportingTraceRecording::End TarnReportingTraceRecording::stop() {
  const auto stopping = traceSession();
  if (!stopping) return End::NoTrace;
  stopping->stopTrace();
  if (!TarnReportingUtilityWait(*condition_, kStopWait, completed_)) {
    kLog(LogLevel::Error, "timed out waiting for performance trace to stop.  No pdj file wil be generated. ");
    return End::TimedOut;
  }
  return End::Completed;
}

std::optional<std::string> TarnReportingTraceRecording::finalTraceURL() const {
  const MutexLock lock(*condition_);
  return finalTraceURL_;
}

std::uint64_t TarnReportingTraceRecording::eventsLeftOut() const {
  const MutexLock lock(*condition_);
  return eventsLeftOut_;
}

void TarnReportingTraceRecording::performanceTraceDidStart(const Status& error) {
  if (const MutexLock lock(*condition_); std::exchange(startTold_, true)) return;
  if (error.failed()) {
    clearTraceSession();
    kLog(LogLevel::Error, "performanceTraceDidStart %@", error->text);
  } else {
    kLog(LogLevel::Info, "Performance Trace Started");
  }
  TarnReportingUtilitySignal(*condition_, answered_);
}

void TarnReportingTraceRecording::performanceTraceDidStop(const Status& error) {
  if (const MutexLock lock(*condition_); std::exchange(stopTold_, true)) return;
  if (error.failed()) {
    clearTraceSession();
    kLog(LogLevel::Error, "performanceTraceDidStop %@", error->text);
  } else {
    kLog(LogLevel::Info, "Performance Trace Stopped");
  }
}

void TarnReportingTraceRecording::performanceTraceDidComplete(const std::string& location, const std::string&,
                                                              const Status& error) {
  if (const MutexLock lock(*condition_); std::exchange(completionTold_, true)) return;
  if (const auto completed = clearTraceSession()) {
    completed->setDelegate({});
    const std::uint64_t leftOut = completed->eventsLeftOut();
    const MutexLock lock(*condition_);
    eventsLeftOut_ = leftOut;
  }
  if (error.failed()) {
    kLog(LogLevel::Error, "performanceTraceDidComplete %@", error->text);
  } else {
    {
      const MutexLock lock(*condition_);
      finalTraceURL_ = location;
    }
    kLog(LogLevel::Info, "Performance Trace Completed: %@", location);
  }
  // Whichever of the two is waited for.
  TarnReportingUtilitySignal(*condition_, answered_);
  TarnReportingUtilitySignal(*condition_, completed_);
}

std::shared_ptr<platform::PerformanceTraceSession> TarnReportingTraceRecording::traceSession() const {
  const MutexLock lock(*condition_);
  return traceSession_;
}

std::shared_ptr<platform::PerformanceTraceSession> TarnReportingTraceRecording::clearTraceSession() {
  const MutexLock lock(*condition_);
  return std::exchange(traceSession_, nullptr);
}

}  // namespace tarn
