// FakePlatform: a whole platform of fakes, installed for as long as it lives. A test's fixture holds one.
//
// At its end, work that never ran and replies that never came are destroyed while the facilities are still there, then
// they are taken away, and with them every process-wide answer that was read from them; so one test leaves nothing to
// the next.
#pragma once

#include <chrono>

#include "platform/Facilities.h"
#include "platform/testing/FakeAccessoryQueries.h"
#include "platform/testing/FakeCommandRunner.h"
#include "platform/testing/FakeDefaultsStore.h"
#include "platform/testing/FakeDeviceProperties.h"
#include "platform/testing/FakeFileSystem.h"
#include "platform/testing/FakeFlumeService.h"
#include "platform/testing/FakeGyreService.h"
#include "platform/testing/FakeListener.h"
#include "platform/testing/FakeLocalCalendar.h"
#include "platform/testing/FakeNotificationCenter.h"
#include "platform/testing/FakePerfDataWriters.h"
#include "platform/testing/FakePerformanceTraceService.h"
#include "platform/testing/FakeProcessControl.h"
#include "platform/testing/FakeProcessEnvironment.h"
#include "platform/testing/FakeProcessFacts.h"
#include "platform/testing/FakePylonService.h"
#include "platform/testing/FakeRandomSource.h"
#include "platform/testing/FakeRtcReportingService.h"
#include "platform/testing/FakeSignposts.h"
#include "platform/testing/FakeSnareService.h"
#include "platform/testing/FakeTallyService.h"
#include "platform/testing/FakeTattleService.h"
#include "platform/testing/FakeTraceAnalysis.h"
#include "platform/testing/FakeTracePoints.h"
#include "platform/testing/FakeWattlogService.h"
#include "platform/testing/ManualClock.h"
#include "platform/testing/ManualConditions.h"
#include "platform/testing/ManualWorkQueues.h"
#include "platform/testing/OrderRecord.h"
#include "platform/testing/RecordingLog.h"

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
  FakeListener listener;

 private:
  platform::Facilities facilities_;
};

}  // namespace tarn::testing
