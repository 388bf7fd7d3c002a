// SPDX-License-Identifier: Apache-2.0
// TraceAnalysisFactory: how the service gets at the trace-analysis library: one function with C linkage makes the
// facility as platform/TraceAnalysis.h has it. Service and library come from one build of this tree.
//
// The library is linked to nothing of the service; what it needs of it is handed over.
#pragma once

#include <functional>
#include <string>
#include <vector>

#include "platform/TraceAnalysis.h"

namespace tarn::trace_analysis {

// What the library asks of the program that loads it. Both outlive everything that the library makes; called on the
// server queue.
struct Host {
  // The descriptions as a JSON array, without those that JSON can't hold.
  std::function<std::string(const std::vector<plist::Dictionary>&)> jsonOf;
  // Says why descriptions give no probes.
  std::function<void(const std::string&)> refuse;
};

// The caller owns what it gives, which keeps a copy of the host. Null: none can be made. Nothing is thrown.
using Factory = platform::TraceAnalysis*(const Host& host);

constexpr const char* kFactoryName = "tarnCreateTraceAnalysis";

}  // namespace tarn::trace_analysis

extern "C" tarn::trace_analysis::Factory tarnCreateTraceAnalysis;
