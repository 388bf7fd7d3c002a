// SPDX-License-Identifier: Apache-2.0
// Probes: what somebody wants to know of a trace, described by dictionaries.
//
//   {"name": "Tally", "type": "SkeinSignpostIntervalProbe", "subsystem": "sys.oxbow.*", "signpost": "*Tally*",
//    "children": [...]}
//
// name       required: the probe's own name
// type       "SkeinSignpostIntervalProbe" measures intervals, "SkeinProbe" only groups its children; left out it is the
//            first when there is a "signpost", else the second
// subsystem  pattern of the intervals' subsystem ("*" any run of characters, "?" any one); left out: every subsystem
// signpost   pattern of the intervals' names; left out: every name
// children   further descriptions
//
// A description without a name, with a value of the wrong type or with a type that there isn't asks for no probe, and
// neither do its children. Unknown keys are ignored. Threads: one at a time. Nothing is thrown.
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "host/traces/analysis/ChromeTrace.h"
#include "plist/Result.h"

namespace tarn::trace_analysis {

// Beyond any of these there are no probes at all, and the failure says which.
struct ProbeLimits {
  std::size_t mostProbes = 256;
  std::size_t mostDepth = 16;
  std::size_t mostEvents = 1'000'000;  // of all probes together
};

struct Probe {
  std::string name;
  bool measuresIntervals = false;
  std::vector<std::uint32_t> events;  // which of the trace's intervals
  std::vector<Probe> children;
};

// The probes that a JSON array of descriptions asks for. It fails when the text is no array, or asks for more than the
// limits allow.
Result<std::vector<Probe>> probesFor(std::string_view descriptions, const ChromeTrace& trace,
                                     const ProbeLimits& limits = {});

// Whether the whole text matches; takes at most as many steps as the product of both lengths.
bool matchesPattern(std::string_view pattern, std::string_view text) noexcept;

}  // namespace tarn::trace_analysis
