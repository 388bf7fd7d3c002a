// SPDX-License-Identifier: Apache-2.0
// TraceAnalysis: the optional library that reads finished performance traces; loaded when it is first wanted.
//
//   load() -> library -> openTrace(file) -> model -> allSignpostIntervals()
//                     -> probesForDictionaries(descriptions, model) -> probes, with what each of them measured
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

// An interval between two signposts, by the names that were given when they were set.
struct SignpostInterval {
  std::string subsystem;
  std::string name;
  double durationSeconds = 0;  // as the trace's time model converts its ticks
};

// A probe, as made from a description. Probes nest: one without events of its own groups those below it.
struct TraceProbe {
  // As the description names it.
  std::string name;
  std::string kind;  // the name of its class
  bool measuresSignpostIntervals = false;
  std::vector<SignpostInterval> events;  // of a probe that measures signpost intervals
  // In the description's order.
  std::vector<TraceProbe> children;
};

// An opened trace file, read once; it may be large, so it is let go of as soon as its probes are made.
class TraceModel {
 public:
  virtual ~TraceModel() = default;
  // All signpost intervals, in the order of the trace, copied. An error says why the file has none to give.
  virtual Result<std::vector<SignpostInterval>> allSignpostIntervals() = 0;
};

// What the loaded library can do. Shared with the facility; it stays loaded.
class TraceAnalysisLibrary {
 public:
  virtual ~TraceAnalysisLibrary() = default;
  // Opens the trace file at this path, which takes as long as reading all of it. The model is never null without an
  // error.
  virtual Result<std::shared_ptr<TraceModel>> openTrace(std::string_view location) = 0;
  // The probes that the descriptions ask for, in their order; a description that asks for none is skipped. None at all
  // when the descriptions ask for more than the library's bounds.
  virtual std::vector<TraceProbe> probesForDictionaries(const std::vector<plist::Dictionary>& descriptions,
                                                        TraceModel& trace) = 0;
};

// Owned by the platform, which may lack it. A library that isn't installed costs nothing but the attempt.
class TraceAnalysis {
 public:
  // What came of loading.
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
