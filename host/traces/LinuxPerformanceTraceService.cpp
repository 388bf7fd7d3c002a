// SPDX-License-Identifier: Apache-2.0
#include "host/traces/LinuxPerformanceTraceService.h"

#include <utility>

#include "host/log/PrefixedLog.h"
#include "host/system/MemoryReserve.h"
#include "host/traces/TraceThread.h"
#include "plist/Result.h"

namespace tarn::linux_host {

namespace {

constexpr std::string_view kModule = "PerformanceTrace";

// Whether there is such a configuration here.
Status checked(const platform::PerformanceTraceConfiguration& configuration) {
  if (configuration.templateNumber != TraceRecording::kTemplateOfIntervals &&
      configuration.templateNumber != TraceRecording::kTemplateOfProfiles) {
    return Error{0, "there is no performance trace template " + std::to_string(configuration.templateNumber)};
  }
  if (configuration.compressWhenFinished) return Error{0, "performance traces are not compressed here"};
  return {};
}

}  // namespace

class LinuxPerformanceTraceService::Session final : public platform::PerformanceTraceSession {
 public:
  Session(std::shared_ptr<TraceThread> thread, std::shared_ptr<TraceRecording> recording)
      : thread_(std::move(thread)), recording_(std::move(recording)) {}
  ~Session() override {
    recording_->release();
    // Without the memory to say so, what it wrote stays open until the process ends.
    MemoryReserve::orGiveUp(MemoryReserve::Loss::Work,
                            [this] { thread_->post(TraceThread::Verb::Release, recording_); });
  }
  Session(const Session&) = delete;
  Session& operator=(const Session&) = delete;

  void setDelegate(std::weak_ptr<platform::PerformanceTraceDelegate> delegate) override {
    recording_->setDelegate(std::move(delegate));
  }
  void startTrace() override {
    if (recording_->askForStart()) {
      thread_->post(TraceThread::Verb::Start, recording_);
    }
  }
  void stopTrace() override {
    if (recording_->askForStop()) {
      thread_->post(TraceThread::Verb::Stop, recording_);
    }
  }
  bool isValid() const override { return recording_->isValid(); }
  std::uint64_t eventsLeftOut() const override { return recording_->eventsLeftOut(); }

 private:
  const std::shared_ptr<TraceThread> thread_;
  const std::shared_ptr<TraceRecording> recording_;
};

LinuxPerformanceTraceService::LinuxPerformanceTraceService(const TraceParts& parts,
                                                           const PerformanceTraceLimits& limits)
    : parts_(parts), limits_(limits), thread_(std::make_shared<TraceThread>(limits)) {}

LinuxPerformanceTraceService::~LinuxPerformanceTraceService() {
  shutdown();
}

std::shared_ptr<platform::PerformanceTraceSession> LinuxPerformanceTraceService::createSession(
    const platform::PerformanceTraceConfiguration& configuration) {
  Status ready = checked(configuration);
  if (ready.ok() && !thread_->run()) {
    ready = Error{0, "performance traces have no thread to run on"};
  }
  if (ready.failed()) {
    logPrefixed(parts_.log, kTraceCategory, platform::LogLevel::Error, kModule, ready->text);
    return nullptr;
  }
  return std::make_shared<Session>(
      thread_, std::make_shared<TraceRecording>(parts_, limits_, configuration.templateNumber, ++sessions_));
}

void LinuxPerformanceTraceService::shutdown() {
  thread_->end();
}

}  // namespace tarn::linux_host
