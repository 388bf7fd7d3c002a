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

class TarnReportingTraceResults {
 public:
  // Looks at the session; it must outlive this object. `eventsLeftOut` are those that the trace lacks.
  TarnReportingTraceResults(const TarnReportingSession& session, std::string perfDataName, std::uint64_t eventsLeftOut);
  TarnReportingTraceResults(const TarnReportingTraceResults&) = delete;
  TarnReportingTraceResults& operator=(const TarnReportingTraceResults&) = delete;

  // Analyses the trace and writes the file. The process ends here when the analysis library lacks a class. Every other
  // failure is logged and ends the processing.
  void processTraceSkein(const std::optional<std::string>& tracePath);

 private:
  // Whether there is a writer; names the files.
  bool createPDWriter();
  void processSignposts(platform::TraceModel& trace);
  void processProbe(const platform::TraceProbe& probe);
  void writeLastProbe();
  void writeExtensions();
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
  // Each once, in the order in which they came.
  std::vector<std::string> keyVariables_;
  std::unordered_set<std::string> knownKeyVariables_;
};

}  // namespace tarn
