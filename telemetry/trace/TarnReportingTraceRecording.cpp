#include "telemetry/trace/TarnReportingTraceRecording.h"

#include <mutex>
#include <string_view>
#include <utility>

#include "platform/Clock.h"
#include "platform/Facilities.h"
#include "service/vocabulary/TarnReportingLog.h"
#include "service/vocabulary/TarnReportingPlatform.h"

namespace tarn {

namespace {

constexpr std::string_view kModule = "TarnReportingSessionTraceWorker";  // whose delegate this is
constexpr std::chrono::seconds kStartWait{15};
constexpr std::chrono::seconds kStopWait{180};

template <class... Arguments>
void log(LogLevel level, const LogText& text, const Arguments&... arguments) {
  TarnReportingLog(TarnReportingTraceCategory(), level, kModule, text, arguments...);
}

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
  if (waitForSignal(kStartWait)) {
    return true;
  }
  log(LogLevel::Error, "timed out waiting for performance trace to start");
  if (const auto late = traceSession(); late && late->isValid()) {
    late->stopTrace();
  }
  return false;
}

TarnReportingTraceRecording::End TarnReportingTraceRecording::stop() {
  const auto stopping = traceSession();
  if (!stopping) {
    return End::NoTrace;
  }
  stopping->stopTrace();
  if (!waitForSignal(kStopWait)) {
    log(LogLevel::Error, "timed out waiting for performance trace to stop.  No pdj file wil be generated. ");
    return End::TimedOut;
  }
  return End::Completed;
}

std::optional<std::string> TarnReportingTraceRecording::finalTraceURL() const {
  const std::lock_guard lock(*condition_);
  return finalTraceURL_;
}

std::uint64_t TarnReportingTraceRecording::eventsLeftOut() const {
  const std::lock_guard lock(*condition_);
  return eventsLeftOut_;
}

void TarnReportingTraceRecording::performanceTraceDidStart(const platform::MaybeError& error) {
  if (!isFirst(startTold_)) {
    return;
  }
  if (error) {
    clearTraceSession();
    log(LogLevel::Error, "performanceTraceDidStart %@", error->text);
  } else {
    log(LogLevel::Info, "Performance Trace Started");
  }
  signal();
}

void TarnReportingTraceRecording::performanceTraceDidStop(const platform::MaybeError& error) {
  if (!isFirst(stopTold_)) {
    return;
  }
  if (error) {
    clearTraceSession();
    log(LogLevel::Error, "performanceTraceDidStop %@", error->text);
  } else {
    log(LogLevel::Info, "Performance Trace Stopped");
  }
}

void TarnReportingTraceRecording::performanceTraceDidComplete(const std::string& location, const std::string&,
                                                              const platform::MaybeError& error) {
  if (!isFirst(completionTold_)) {
    return;
  }
  if (const auto completed = clearTraceSession()) {
    completed->setDelegate({});
    const std::uint64_t leftOut = completed->eventsLeftOut();
    const std::lock_guard lock(*condition_);
    eventsLeftOut_ = leftOut;
  }
  if (error) {
    log(LogLevel::Error, "performanceTraceDidComplete %@", error->text);
  } else {
    {
      const std::lock_guard lock(*condition_);
      finalTraceURL_ = location;
    }
    log(LogLevel::Info, "Performance Trace Completed: %@", location);
  }
  signal();
}

std::shared_ptr<platform::PerformanceTraceSession> TarnReportingTraceRecording::traceSession() const {
  const std::lock_guard lock(*condition_);
  return traceSession_;
}

std::shared_ptr<platform::PerformanceTraceSession> TarnReportingTraceRecording::clearTraceSession() {
  const std::lock_guard lock(*condition_);
  return std::exchange(traceSession_, nullptr);
}

bool TarnReportingTraceRecording::isFirst(bool& told) {
  const std::lock_guard lock(*condition_);
  return !std::exchange(told, true);
}

void TarnReportingTraceRecording::signal() {
  const std::lock_guard lock(*condition_);
  ++signals_;
  condition_->signal();
}

bool TarnReportingTraceRecording::waitForSignal(std::chrono::nanoseconds timeout) {
  const platform::Clock& clock = TarnReportingFacilities().clock;
  const auto deadline = clock.monotonic() + timeout;
  const std::lock_guard lock(*condition_);
  while (signals_ == 0) {
    // A wake-up without a signal doesn't prolong the wait.
    const auto left = deadline - clock.monotonic();
    if (left.count() <= 0 || (!condition_->waitFor(left) && signals_ == 0)) {
      return false;
    }
  }
  --signals_;
  return true;
}

}  // namespace tarn
