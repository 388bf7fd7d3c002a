// The entry points of the trace-analysis library (see TraceAnalysisAbi.h).
#include <algorithm>
#include <exception>
#include <memory>
#include <string>
#include <utility>

#include "host/traces/analysis/ChromeTrace.h"
#include "host/traces/analysis/Probes.h"
#include "host/traces/analysis/TraceAnalysisAbi.h"

using tarn::trace_analysis::ChromeTrace;
using tarn::trace_analysis::Interval;
using tarn::trace_analysis::Probe;

struct SkeinTrace {
  ChromeTrace content;
};

struct SkeinSignpostData {
  const ChromeTrace& content;
};

struct SkeinProbe {
  const Probe& probe;
  const ChromeTrace& content;
  std::vector<SkeinProbe> children;
};

struct SkeinProbeList {
  std::vector<Probe> content;
  std::vector<SkeinProbe> probes;
};

namespace {

constexpr double kSecondsPerTick = 1e-9;

std::string_view viewOf(SkeinText text) {
  return {text.bytes, text.size};
}

SkeinText textOf(std::string_view text) {
  return {text.data(), text.size()};
}

void fail(SkeinFailure* failure, std::int64_t code, std::string_view text) noexcept {
  failure->code = code;
  const std::size_t size = std::min(text.size(), sizeof failure->text - 1);
  std::copy_n(text.data(), size, failure->text);
  failure->text[size] = '\0';
}

// What `make` gives, or null and why.
template <class Make>
auto guarded(SkeinFailure* failure, const Make& make) noexcept -> decltype(make()) {
  try {
    return make();
  } catch (const std::exception& error) {
    fail(failure, 0, error.what());
    return nullptr;
  }
}

SkeinInterval intervalAt(const ChromeTrace& trace, std::size_t index) {
  const Interval& interval = trace.intervals[index];
  return {textOf(trace.texts[interval.subsystem]), textOf(trace.texts[interval.name]), interval.duration};
}

std::vector<SkeinProbe> wrap(const std::vector<Probe>& probes, const ChromeTrace& trace) {
  std::vector<SkeinProbe> wrapped;
  wrapped.reserve(probes.size());
  for (const Probe& probe : probes) {
    wrapped.push_back({probe, trace, wrap(probe.children, trace)});
  }
  return wrapped;
}

template <class T>
void destroy(T* object) {
  const std::unique_ptr<T> owned(object);
}

constexpr SkeinTraceModelV1 kTraceModel{
    sizeof(SkeinTraceModelV1),
    [](SkeinText location, SkeinFailure* failure) {
      return guarded(failure, [&]() -> SkeinTrace* {
        auto read = tarn::trace_analysis::readTrace(std::string(viewOf(location)));
        if (!read.failure.empty()) {
          fail(failure, read.code, read.failure);
          return nullptr;
        }
        return std::make_unique<SkeinTrace>(SkeinTrace{std::move(read.trace)}).release();
      });
    },
    [](SkeinTrace* trace) { destroy(trace); }};

constexpr SkeinSignpostDataModelV1 kSignpostDataModel{
    sizeof(SkeinSignpostDataModelV1),
    [](const SkeinTrace* trace, SkeinFailure* failure) {
      return guarded(failure,
                     [&] { return std::make_unique<SkeinSignpostData>(SkeinSignpostData{trace->content}).release(); });
    },
    [](SkeinSignpostData* data) { destroy(data); },
    [](const SkeinSignpostData* data) { return std::uint64_t{data->content.intervals.size()}; },
    [](const SkeinSignpostData* data, std::uint64_t index) { return intervalAt(data->content, index); },
    [](const SkeinSignpostData* /*data*/) { return kSecondsPerTick; }};

constexpr SkeinSignpostPlistV1 kSignpostPlist{
    sizeof(SkeinSignpostPlistV1),
    [](SkeinText descriptions, const SkeinTrace* trace, SkeinFailure* failure) {
      return guarded(failure, [&]() -> SkeinProbeList* {
        auto read = tarn::trace_analysis::probesFor(viewOf(descriptions), trace->content);
        if (!read.failure.empty()) {
          fail(failure, 0, read.failure);
          return nullptr;
        }
        auto list = std::make_unique<SkeinProbeList>(SkeinProbeList{std::move(read.probes), {}});
        list->probes = wrap(list->content, trace->content);
        return list.release();
      });
    },
    [](SkeinProbeList* probes) { destroy(probes); },
    [](const SkeinProbeList* probes) { return std::uint64_t{probes->probes.size()}; },
    [](const SkeinProbeList* probes, std::uint64_t index) { return &probes->probes[index]; },
    [](const SkeinProbe* probe) { return textOf(probe->probe.name); },
    [](const SkeinProbe* probe) {
      return textOf(probe->probe.measuresIntervals ? "SkeinSignpostIntervalProbe" : "SkeinProbe");
    },
    [](const SkeinProbe* probe) { return std::uint64_t{probe->children.size()}; },
    [](const SkeinProbe* probe, std::uint64_t index) { return &probe->children[index]; }};

constexpr SkeinSignpostIntervalProbeV1 kSignpostIntervalProbe{
    sizeof(SkeinSignpostIntervalProbeV1),
    [](const SkeinProbe* probe) { return std::int32_t{probe->probe.measuresIntervals ? 1 : 0}; },
    [](const SkeinProbe* probe) { return std::uint64_t{probe->probe.events.size()}; },
    [](const SkeinProbe* probe, std::uint64_t index) {
      return intervalAt(probe->content, probe->probe.events[index]);
    }};

}  // namespace

// The names say which class and version: NOLINTBEGIN(readability-identifier-naming)
extern "C" {

[[gnu::visibility("default")]] const SkeinTraceModelV1* SkeinTraceModel_V1() {
  return &kTraceModel;
}
[[gnu::visibility("default")]] const SkeinSignpostDataModelV1* SkeinSignpostDataModel_V1() {
  return &kSignpostDataModel;
}
[[gnu::visibility("default")]] const SkeinSignpostPlistV1* SkeinSignpostPlist_V1() {
  return &kSignpostPlist;
}
[[gnu::visibility("default")]] const SkeinSignpostIntervalProbeV1* SkeinSignpostIntervalProbe_V1() {
  return &kSignpostIntervalProbe;
}

}  // extern "C"
// NOLINTEND(readability-identifier-naming)
