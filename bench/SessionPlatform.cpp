// SPDX-License-Identifier: Apache-2.0
#include "bench/SessionPlatform.h"

#include "bench/Measure.h"
#include "service/TarnReportingWorkerClasses.h"
#include "service/vocabulary/TarnReportingPlatform.h"
#include "session/TarnReportingSession.h"

namespace tarn::bench {

SessionPlatform::SessionPlatform(Tally tally, const std::string& directory)
    : fileSystem_({.diagnosticLogs = directory + "/DiagnosticLogs", .temporary = directory}),
      tally_(tally),
      facilities_{.clock = clock_,
                  .workQueues = fakes_.workQueues,
                  .conditions = fakes_.conditions,
                  .log = fakes_.log,
                  .tracePoints = tracePoints_,
                  .deviceProperties = fakes_.deviceProperties,
                  .defaults = fakes_.defaults,
                  .notifications = fakes_.notifications,
                  .processFacts = fakes_.processFacts,
                  .processControl = fakes_.processControl,
                  .tally = tally_,
                  .fileSystem = fileSystem_,
                  .localCalendar = fakes_.localCalendar,
                  .randomSource = fakes_.randomSource,
                  .processEnvironment = fakes_.processEnvironment,
                  .commandRunner = fakes_.commandRunner,
                  .signposts = &signposts_} {
  fakes_.log.setThreshold(platform::LogLevel::Error);
  TarnReportingInstallFacilities(&facilities_);
  TarnReportingSession::setAllWorkerClasses(TarnReportingWorkerClasses());
}

void SessionPlatform::offerDiagnostics() {
  constexpr std::string_view kSuite = "sys.oxbow.tarnkit.tarnreporting";
  fakes_.deviceProperties.set("InternalBuild", true);
  fakes_.deviceProperties.set("haptics", true);
  fakes_.defaults.set(kSuite, "enable_gyre", true);
  fakes_.defaults.set(kSuite, "io_buffer_size", 256);
  fakes_.defaults.set(kSuite, "io_cycle", 1);
  fakes_.defaults.set(kSuite, "wait_time", 1000.0);
  fakes_.defaults.set(kSuite, "ParleyInvalidXyBackOffSeconds", 3600);
  facilities_.wattlog = &fakes_.wattlog;
  facilities_.pylon = &fakes_.pylon;
  facilities_.snare = &fakes_.snare;
  facilities_.tattle = &fakes_.tattle;
  facilities_.gyre = &fakes_.gyre;
}

void SessionPlatform::DroppingTally::sendEventLazy(std::string_view, PayloadCallback payload) {
  keep(payload().size());
}

}  // namespace tarn::bench
