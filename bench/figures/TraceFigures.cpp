// SPDX-License-Identifier: Apache-2.0
// What the end of a traced session costs: reading and evaluating a trace that is nearly as large as one may be, and
// writing its perf-data file. In this process, with the analysis library that was built with it.
#include <array>
#include <chrono>
#include <filesystem>
#include <fstream>
#include <memory>
#include <string>

#include "bench/Measure.h"
#include "bench/Processes.h"
#include "bench/figures/Figures.h"
#include "host/machine/LinuxClock.h"
#include "host/machine/LinuxFileSystem.h"
#include "host/traces/LinuxPerfDataWriters.h"
#include "host/traces/LinuxTraceAnalysis.h"
#include "host/traces/TraceFile.h"
#include "platform/Facilities.h"
#include "service/vocabulary/TarnReportingPlatform.h"
#include "session/TarnReportingSession.h"
#include "telemetry/trace/TarnReportingTraceResults.h"
#include "testing/FakePlatform.h"

namespace tarn::bench {

namespace {

using namespace std::chrono_literals;

constexpr double kTarget = 1;
constexpr std::size_t kEvents = 440'000;
constexpr std::array kWorkers{"TarnReportingSessionTallyWorker", "TarnReportingSessionSummaryWorker",
                              "TarnReportingSessionRtcWorker", "TarnReportingSessionVolumeMessagesWorker"};
// One probe that takes every interval.
constexpr std::string_view kDescriptions =
    "<plist><dict><key>name</key><string>everything</string><key>signpost</key><string>*</string></dict></plist>";

// The platform of the tests, but for what a trace is read and written with.
class Platform {
 public:
  explicit Platform(const std::string& directory) : fileSystem_({directory, directory}) {
    fakes_.log.setThreshold(platform::LogLevel::Error);
    TarnReportingInstallFacilities(&facilities_);
  }

 private:
  testing::FakePlatform fakes_;
  linux_host::LinuxClock clock_;
  linux_host::LinuxFileSystem fileSystem_;
  linux_host::LinuxTraceAnalysis analysis_{linux_host::LinuxTraceAnalysis::defaultPath(), fakes_.log};
  linux_host::LinuxPerfDataWriters writers_;
  const platform::Facilities facilities_{.clock = clock_,
                                         .workQueues = fakes_.workQueues,
                                         .conditions = fakes_.conditions,
                                         .log = fakes_.log,
                                         .tracePoints = fakes_.tracePoints,
                                         .deviceProperties = fakes_.deviceProperties,
                                         .defaults = fakes_.defaults,
                                         .notifications = fakes_.notifications,
                                         .processFacts = fakes_.processFacts,
                                         .processControl = fakes_.processControl,
                                         .tally = fakes_.tally,
                                         .fileSystem = fileSystem_,
                                         .localCalendar = fakes_.localCalendar,
                                         .randomSource = fakes_.randomSource,
                                         .processEnvironment = fakes_.processEnvironment,
                                         .commandRunner = fakes_.commandRunner,
                                         .traceAnalysis = &analysis_,
                                         .perfDataWriters = &writers_};
};

// A trace as the service leaves one; its path.
std::string writeTrace(const std::string& directory, std::size_t events) {
  linux_host::TraceFile file({directory, "trace.json", "trace-1", 2, false, std::size_t{1} << 30U, 0});
  if (file.open().failed()) {
    fail("can't write a trace");
  }
  linux_host::SignpostRecord record;
  record.thread = 1;
  for (std::size_t i = 0; i < events; ++i) {
    record.signpost = {
        platform::SignpostCategory::Worker, kWorkers[i % kWorkers.size()], i % 50 == 0 ? "stop" : "handleMessage", {}};
    record.at += 7us + std::chrono::nanoseconds(i % 997);
    record.duration = std::chrono::nanoseconds(400 + i % 5003);
    file.write(record);
  }
  return file.finish().value;
}

// Seconds of processor time, and by the clock.
std::vector<double> measureEvaluation(const std::string& directory, std::size_t events) {
  const Platform platform(directory);
  const std::string trace = writeTrace(directory, events);
  const auto session = TarnReportingSession::initWithID(1, {1});
  session->setServiceType(AudioServiceType::Test);
  const std::string descriptions = directory + "/probes.plist";
  std::ofstream(descriptions) << kDescriptions;
  const plist::Dictionary configuration{{"TarnReportingSkeinPlistFilePath", descriptions},
                                        {"TarnReportingSkeinOutputFileDirectory", directory},
                                        {"TarnReportingSkeinOutputFileName", "results.pdj"}};
  session->updateConfigurationWithContentsOfConfiguration(&configuration);
  const double processor = ownProcessorSeconds();
  const double begun = nowSeconds();
  TarnReportingTraceResults(*session, "bench", 0).processTraceSkein(trace);
  const double seconds = ownProcessorSeconds() - processor;
  if (!std::filesystem::exists(directory + "/results.pdj")) {
    fail("the trace was not evaluated");
  }
  return {seconds, nowSeconds() - begun};
}

}  // namespace

void measureTrace(const Settings& settings, Table& table) {
  Samples processor;
  Samples clock;
  for (int round = 0; round < settings.rounds; ++round) {
    const TemporaryDirectory directory(settings.directory);
    const std::vector<double> seconds =
        measureInChild([&] { return measureEvaluation(directory.path(), settings.count(kEvents)); });
    processor.push_back(seconds[0]);
    clock.push_back(seconds[1]);
  }
  table.addWithTarget({"evaluation of a trace, processor time",
                       milliseconds(median(processor)),
                       "by the clock " + milliseconds(median(clock)),
                       {},
                       "<= 1 s",
                       {}},
                      median(processor), kTarget);
}

}  // namespace tarn::bench
