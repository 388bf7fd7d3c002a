// SPDX-License-Identifier: Apache-2.0
#include "testing/FakePlatform.h"

#include "service/vocabulary/TarnReportingPlatform.h"

namespace tarn::testing {

FakePlatform::FakePlatform()
    : facilities_{clock,
                  workQueues,
                  conditions,
                  log,
                  tracePoints,
                  deviceProperties,
                  defaults,
                  notifications,
                  processFacts,
                  processControl,
                  tally,
                  fileSystem,
                  localCalendar,
                  randomSource,
                  processEnvironment,
                  commandRunner,
                  &wattlog,
                  &pylon,
                  &snare,
                  &tattle,
                  &gyre,
                  &flume,
                  &rtcReporting,
                  &performanceTrace,
                  &traceAnalysis,
                  &perfDataWriters,
                  &accessories,
                  &signposts,
                  &overflow,
                  &sessionRecords} {
  const auto record = [this](auto&... fakes) { (fakes.recordOrderIn(order), ...); };
  record(log, conditions, defaults, notifications, commandRunner, wattlog, pylon, snare, tattle, gyre, flume);
  TarnReportingInstallFacilities(&facilities_);
}

FakePlatform::~FakePlatform() {
  for (auto* replies :
       {&snare.replies(), &tattle.replies(), &rtcReporting.completions(), &performanceTrace.callbacks()}) {
    replies->dropAll();
  }
  workQueues.dropAll();
  TarnReportingInstallFacilities(nullptr);
}

}  // namespace tarn::testing
