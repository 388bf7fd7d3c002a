// SPDX-License-Identifier: Apache-2.0
// A trace-analysis library that isn't whole: it has no class for probes.
#include <memory>

#include "host/traces/analysis/TraceAnalysisFactory.h"

namespace {

class LackingAnalysis final : public tarn::platform::TraceAnalysis {
 public:
  Loaded load() override { return {nullptr, "SkeinSignpostPlist"}; }
};

}  // namespace

extern "C" tarn::platform::TraceAnalysis* tarnCreateTraceAnalysis(const tarn::trace_analysis::Host& /*host*/) {
  return std::make_unique<LackingAnalysis>().release();
}
