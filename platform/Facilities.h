// SPDX-License-Identifier: Apache-2.0
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
class SessionRecords;
class Signposts;
class SnareService;
class TallyService;
class TattleService;
class TraceAnalysis;
class TracePoints;
class WattlogService;
class WorkQueues;

// References and pointers alone, so a copy is the same platform. Each is used on any thread unless its header says
// otherwise.
struct Facilities {
  // Every notion of time.
  Clock& clock;
  // Serial queues, the server queue among them.
  WorkQueues& workQueues;
  // For workers that must wait on the server queue.
  Conditions& conditions;
  // What people and tools see of the process while it runs.
  Log& log;
  // Marks that a system tracer can attach to.
  TracePoints& tracePoints;
  // What the device is.
  DeviceProperties& deviceProperties;
  // Settings of ours that outlive a restart, and people's preferences.
  DefaultsStore& defaults;
  // Words between processes, without content but for a number.
  NotificationCenter& notifications;
  // What reports say of processes and of the machine.
  ProcessFacts& processFacts;
  // For killService and for what can't go on.
  ProcessControl& processControl;
  // Where analytics events go. Every platform has it; one that records nothing says that no event is in use.
  TallyService& tally;
  // The few files of our own.
  FileSystem& fileSystem;
  // For the names of files, and for weeks as people count them.
  LocalCalendar& localCalendar;
  // For moments that devices shouldn't share.
  RandomSource& randomSource;
  // For libraries that are told things by variables.
  ProcessEnvironment& processEnvironment;
  // For tools that print what a report carries.
  CommandRunner& commandRunner;

  // Reporting back-ends from here to `gyre`, each with its workers. The power log:
  WattlogService* wattlog = nullptr;
  // Metrics, in their wire form and as fields.
  PylonService* pylon = nullptr;
  // Captures of logs when something is wrong.
  SnareService* snare = nullptr;
  // Drafts of bug reports, offered to the person at the device.
  TattleService* tattle = nullptr;
  // Stack samples of the whole device.
  GyreService* gyre = nullptr;
  // What drivers count.
  FlumeService* flume = nullptr;
  // Mirrors of sessions in a telemetry service of the device.
  RtcReportingService* rtcReporting = nullptr;
  // Records traces of test sessions.
  PerformanceTraceService* performanceTrace = nullptr;
  // Reads what the one above recorded; the next writes down what that shows.
  TraceAnalysis* traceAnalysis = nullptr;
  PerfDataWriters* perfDataWriters = nullptr;
  // Wireless earbuds.
  AccessoryQueries* accessories = nullptr;
  Signposts* signposts = nullptr;     // null: nothing ever records
  OverflowStore* overflow = nullptr;  // null: what is beyond the memory's bound stays there
  // Which sessions there were, and whose work is done.
  SessionRecords* sessionRecords = nullptr;  // null: nobody keeps them
};

}  // namespace tarn::platform
