// SPDX-License-Identifier: Apache-2.0
// TarnReportingTraceResults: makes the perf-data file of one finished trace. It has two sorts of values, in
// milliseconds:
//
//   every signpost interval of the audio subsystems, then per name "NAME Total" and "NAME AVG";
//   every event of the probes that the session's configuration describes, children first, with the same two sums after
//   the last event of a probe. Events of probes of one name that follow each other are summed together.
//
// The measurements of a trace that lacks events are those of what is left of it: such a file has an extension
// "@tdg-perf.trace" with the member "eventsLeftOut", how many there were.
//
// The file is written under a temporary name and moved to its place when it is whole.
//
// Threads: the server queue. One object is for one trace.
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <unordered_set>
#include <vector>

#include "platform/PerfDataWriter.h"
#include "platform/TraceAnalysis.h"
#include "plist/Dictionary.h"

namespace tarn {

class TarnReportingSession;

// Measurements are streamed to the writer as they are found; what grows with the trace are its intervals in memory, and
// a name for each kind of them.
class TarnReportingTraceResults {
 public:
  // Looks at the session; it must outlive this object. `eventsLeftOut` are those that the trace lacks.
  TarnReportingTraceResults(const TarnReportingSession& session, std::string perfDataName, std::uint64_t eventsLeftOut);
  TarnReportingTraceResults(const TarnReportingTraceResults&) = delete;
  TarnReportingTraceResults& operator=(const TarnReportingTraceResults&) = delete;

  // Analyses the trace and writes the file. The process ends here when the analysis library lacks a class. Every other
  // failure is logged and ends the processing. Once. Nothing is written without a trace, probe descriptions, a model or
  // a writer; without signposts the probes' values are written all the same.
  void processTraceSkein(const std::optional<std::string>& tracePath);

 private:
  // Whether there is a writer; names the files. Makes the folder too; a failure there shows when the file is moved.
  bool createPDWriter();
  // Intervals of the subsystems whose names hold "sys.oxbow.audio" or "sys.oxbow.tarnkit": each value in the order of
  // the trace, then the sums by the order in which names came.
  void processSignposts(platform::TraceModel& trace);
  // Goes through the children first; a probe that measures no intervals adds nothing itself.
  void processProbe(const platform::TraceProbe& probe);
  // The sums of the probe that had the last event, which no follower has written.
  void writeLastProbe();
  // The names of the measurements, the data base that they are meant for, and how many events are missing.
  void writeExtensions();
  // A file that can't be closed stays under its temporary name.
  void closeAndMove();

  void writeValue(std::string_view name, double milliseconds);
  void writeSums(const std::string& name, double total, std::size_t count);
  void addKeyVariable(const std::string& name);

  const TarnReportingSession& session_;
  const std::string mPerfDataName_;
  const std::uint64_t eventsLeftOut_;
  std::unique_ptr<platform::PerfDataWriter> mWriter_;
  std::string fullWriterPath_;
  std::string tempWriterPath_;
  // The probe that is being summed; nothing before the first event.
  std::optional<std::string> currentProbe_;
  double totalTimeValue_ = 0;  // in milliseconds
  std::size_t totalTimeMetrics_ = 0;
  // Each once, in the order in which they came. The names that readers of the file look for. The set tells which ones
  // are there already.
  std::vector<std::string> keyVariables_;
  std::unordered_set<std::string> knownKeyVariables_;
};

}  // namespace tarn
