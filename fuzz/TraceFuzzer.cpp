// SPDX-License-Identifier: Apache-2.0
// Bytes as a performance trace and, after the first NUL, as descriptions of probes: they give intervals within the
// trace or a failure, and probes of those intervals.
#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <string_view>

#include "host/traces/analysis/ChromeTrace.h"
#include "host/traces/analysis/Probes.h"

namespace {

using namespace tarn::trace_analysis;

void demand(bool holds) {
  if (!holds) {
    std::abort();
  }
}

void look(const std::vector<Probe>& probes, const ChromeTrace& trace) {
  for (const Probe& probe : probes) {
    demand(!probe.name.empty());
    demand(probe.measuresIntervals || probe.events.empty());
    for (const std::uint32_t event : probe.events) {
      demand(event < trace.intervals.size());
    }
    look(probe.children, trace);
  }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const std::string_view input(reinterpret_cast<const char*>(data), size);
  const std::size_t end = std::min(input.find('\0'), input.size());
  const auto read = parseTrace(input.substr(0, end));
  demand(read.ok() || read.value.intervals.empty());
  std::int64_t last = INT64_MIN;
  for (const Interval& interval : read.value.intervals) {
    demand(interval.duration >= 0 && interval.begin >= last);
    demand(interval.name < read.value.texts.size() && interval.subsystem < read.value.texts.size());
    last = interval.begin;
  }
  const auto probes = probesFor(input.substr(std::min(end + 1, input.size())), read.value);
  demand(probes.ok() || probes.value.empty());
  look(probes.value, read.value);
  return 0;
}
