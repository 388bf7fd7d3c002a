// SPDX-License-Identifier: Apache-2.0
// FakePlatform: a whole platform of fakes, installed for as long as it lives. A test's fixture holds one.
//
// At its end, work that never ran and replies that never came are destroyed while the facilities are still there, then
// they are taken away, and with them all that the process shared on them (ProcessState.h); so one test leaves nothing
// to the next.
#pragma once

#include <chrono>

#include "platform/Facilities.h"
#include "testing/FakeCommandRunner.h"
#include "testing/FakeDefaultsStore.h"
#include "testing/FakeDeviceProperties.h"
#include "testing/FakeFileSystem.h"
#include "testing/FakeListener.h"
#include "testing/FakeLocalCalendar.h"
#include "testing/FakeNotificationCenter.h"
#include "testing/FakeOverflowStore.h"
#include "testing/FakeProcessControl.h"
#include "testing/FakeProcessEnvironment.h"
#include "testing/FakeProcessFacts.h"
#include "testing/FakeRandomSource.h"
#include "testing/FakeSignposts.h"
#include "testing/FakeTracePoints.h"
#include "testing/ManualClock.h"
#include "testing/ManualConditions.h"
#include "testing/ManualWorkQueues.h"
#include "testing/RecordingLog.h"
#include "testing/backends/FakeAccessoryQueries.h"
#include "testing/backends/FakeFlumeService.h"
#include "testing/backends/FakeGyreService.h"
#include "testing/backends/FakePerfDataWriters.h"
#include "testing/backends/FakePerformanceTraceService.h"
#include "testing/backends/FakePylonService.h"
#include "testing/backends/FakeRtcReportingService.h"
#include "testing/backends/FakeSnareService.h"
#include "testing/backends/FakeTallyService.h"
#include "testing/backends/FakeTattleService.h"
#include "testing/backends/FakeTraceAnalysis.h"
#include "testing/backends/FakeWattlogService.h"
#include "testing/backends/OrderRecord.h"
#include "testing/backends/RecordingSessionRecords.h"

namespace tarn::testing {

class FakePlatform {
 public:
  FakePlatform();
  ~FakePlatform();
  FakePlatform(const FakePlatform&) = delete;
  FakePlatform& operator=(const FakePlatform&) = delete;

  // What is installed; a test may set the pointers to null, for a platform that lacks those services.
  platform::Facilities& facilities() { return facilities_; }
  // Runs due work of all queues until there is none.
  void runUntilIdle() { workQueues.runUntilIdle(); }
  // Moves the time on; work runs at the moment when it is due.
  void advance(std::chrono::nanoseconds duration) { workQueues.advance(duration); }

  OrderRecord order;  // of the fakes that take part in it
  ManualClock clock;
  RecordingLog log;
  ManualWorkQueues workQueues{clock};
  ManualConditions conditions;
  FakeTracePoints tracePoints;
  FakeDeviceProperties deviceProperties;
  FakeDefaultsStore defaults;
  FakeNotificationCenter notifications;
  FakeProcessFacts processFacts;
  FakeProcessControl processControl;
  FakeTallyService tally;
  FakeFileSystem fileSystem;
  FakeLocalCalendar localCalendar;
  FakeRandomSource randomSource;
  FakeProcessEnvironment processEnvironment;
  FakeCommandRunner commandRunner;
  FakeWattlogService wattlog;
  FakePylonService pylon;
  FakeSnareService snare;
  FakeTattleService tattle;
  FakeGyreService gyre;
  FakeFlumeService flume;
  FakeRtcReportingService rtcReporting;
  FakePerformanceTraceService performanceTrace;
  FakeTraceAnalysis traceAnalysis;
  FakePerfDataWriters perfDataWriters;
  FakeAccessoryQueries accessories;
  FakeSignposts signposts;
  FakeOverflowStore overflow;
  RecordingSessionRecords sessionRecords;
  FakeListener listener;

 private:
  platform::Facilities facilities_;
};

}  // namespace tarn::testing
