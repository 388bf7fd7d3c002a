// Facilities: everything outside the process that the system may touch, as one struct of references. The entry point
// (or a test's fixture) makes it and installs it once; what it refers to outlives all use.
#pragma once

namespace tarn::platform {

class Clock;
class Conditions;
class DefaultsStore;
class DeviceProperties;
class Log;
class NotificationCenter;
class ProcessControl;
class ProcessFacts;
class TallyService;
class TracePoints;
class WorkQueues;

struct Facilities {
  Clock& clock;
  WorkQueues& workQueues;
  Conditions& conditions;
  Log& log;
  TracePoints& tracePoints;
  DeviceProperties& deviceProperties;
  DefaultsStore& defaults;
  NotificationCenter& notifications;
  ProcessFacts& processFacts;
  ProcessControl& processControl;
  TallyService& tally;
};

}  // namespace tarn::platform
