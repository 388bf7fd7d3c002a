// Facilities: everything outside the process that the system may touch, as one struct. The entry point (or a test's
// fixture) makes it and installs it once; what it refers to outlives all use.
//
// A reference is a facility that every platform has. A pointer is a reporting back-end or another service of the device
// that a platform may lack; null says that it does. A worker lands together with the production implementation of the
// facility that it needs, so the entry point composes what exists and nothing that only pretends to: no stand-in
// swallows events. A worker whose facility is null declines its session.
#pragma once

namespace tarn::platform {

class AccessoryQueries;
class Clock;
class CommandRunner;
class Conditions;
class DefaultsStore;
class DeviceProperties;
class FileSystem;
class FlumeService;
class GyreService;
class LocalCalendar;
class Log;
class NotificationCenter;
class OverflowStore;
class PerfDataWriters;
class PerformanceTraceService;
class ProcessControl;
class ProcessEnvironment;
class ProcessFacts;
class PylonService;
class RandomSource;
class RtcReportingService;
class Signposts;
class SnareService;
class TallyService;
class TattleService;
class TraceAnalysis;
class TracePoints;
class WattlogService;
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
  FileSystem& fileSystem;
  LocalCalendar& localCalendar;
  RandomSource& randomSource;
  ProcessEnvironment& processEnvironment;
  CommandRunner& commandRunner;

  WattlogService* wattlog = nullptr;
  PylonService* pylon = nullptr;
  SnareService* snare = nullptr;
  TattleService* tattle = nullptr;
  GyreService* gyre = nullptr;
  FlumeService* flume = nullptr;
  RtcReportingService* rtcReporting = nullptr;
  PerformanceTraceService* performanceTrace = nullptr;
  TraceAnalysis* traceAnalysis = nullptr;
  PerfDataWriters* perfDataWriters = nullptr;
  AccessoryQueries* accessories = nullptr;
  Signposts* signposts = nullptr;     // null: nothing ever records
  OverflowStore* overflow = nullptr;  // null: what is beyond the memory's bound stays there
};

}  // namespace tarn::platform
