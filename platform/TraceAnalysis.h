// TraceAnalysis: the optional library that reads finished performance traces; loaded when it is first wanted.
//
// Threads: the server queue.
#pragma once

#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "plist/Dictionary.h"
#include "plist/Result.h"

namespace tarn::platform {

// An interval between two signposts.
struct SignpostInterval {
  std::string subsystem;
  std::string name;
  double durationSeconds = 0;  // as the trace's time model converts its ticks
};

// A probe, as made from a description. Probes nest.
struct TraceProbe {
  std::string name;
  std::string kind;  // the name of its class
  bool measuresSignpostIntervals = false;
  std::vector<SignpostInterval> events;  // of a probe that measures signpost intervals
  std::vector<TraceProbe> children;
};

// An opened trace file.
class TraceModel {
 public:
  virtual ~TraceModel() = default;
  // All signpost intervals, in the order of the trace.
  virtual Result<std::vector<SignpostInterval>> allSignpostIntervals() = 0;
};

class TraceAnalysisLibrary {
 public:
  virtual ~TraceAnalysisLibrary() = default;
  // Opens the trace file at this path. The model is never null without an error.
  virtual Result<std::shared_ptr<TraceModel>> openTrace(std::string_view location) = 0;
  // The probes that the descriptions ask for, in their order; a description that asks for none is skipped.
  virtual std::vector<TraceProbe> probesForDictionaries(const std::vector<plist::Dictionary>& descriptions,
                                                        TraceModel& trace) = 0;
};

class TraceAnalysis {
 public:
  struct Loaded {
    std::shared_ptr<TraceAnalysisLibrary> library;  // none: a class is missing
    std::string missingClass;                       // the first class that could not be found
  };

  virtual ~TraceAnalysis() = default;
  // Loads the library on the first call and looks for its classes; later calls give the same answer. A library that
  // can't be loaded has none of its classes.
  virtual Loaded load() = 0;
};

}  // namespace tarn::platform
