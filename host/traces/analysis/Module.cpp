// SPDX-License-Identifier: Apache-2.0
// The trace-analysis library: the facility on top of the trace reader and the probes.
#include <exception>
#include <memory>
#include <string>
#include <utility>

#include "host/traces/analysis/ChromeTrace.h"
#include "host/traces/analysis/Probes.h"
#include "host/traces/analysis/TraceAnalysisFactory.h"

namespace tarn::trace_analysis {

namespace {

using platform::SignpostInterval;
using platform::TraceProbe;

constexpr double kSecondsPerTick = 1e-9;

SignpostInterval intervalAt(const ChromeTrace& trace, std::size_t index) {
  const Interval& interval = trace.intervals[index];
  return {trace.texts[interval.subsystem], trace.texts[interval.name],
          static_cast<double>(interval.duration) * kSecondsPerTick};
}

// An opened trace and all its intervals.
class Model final : public platform::TraceModel {
 public:
  explicit Model(ChromeTrace trace) : trace_(std::move(trace)) {}

  Result<std::vector<SignpostInterval>> allSignpostIntervals() override {
    try {
      std::vector<SignpostInterval> intervals;
      intervals.reserve(trace_.intervals.size());
      for (std::size_t i = 0; i < trace_.intervals.size(); ++i) {
        intervals.push_back(intervalAt(trace_, i));
      }
      return {std::move(intervals), {}};
    } catch (const std::exception& error) {
      return {{}, Error{0, error.what()}};
    }
  }

  const ChromeTrace& trace() const { return trace_; }

 private:
  const ChromeTrace trace_;
};

std::vector<TraceProbe> madeOf(const std::vector<Probe>& probes, const ChromeTrace& trace) {
  std::vector<TraceProbe> made;
  for (const Probe& probe : probes) {
    const char* const kind = probe.measuresIntervals ? "SkeinSignpostIntervalProbe" : "SkeinProbe";
    TraceProbe& one = made.emplace_back();
    one = {probe.name, kind, probe.measuresIntervals, {}, madeOf(probe.children, trace)};
    one.events.reserve(probe.events.size());
    for (const std::uint32_t event : probe.events) {
      one.events.push_back(intervalAt(trace, event));
    }
  }
  return made;
}

class Library final : public platform::TraceAnalysisLibrary {
 public:
  explicit Library(Host host) : host_(std::move(host)) {}

  Result<std::shared_ptr<platform::TraceModel>> openTrace(std::string_view location) override {
    try {
      auto read = readTrace(std::string(location));
      if (read.failed()) return {nullptr, std::move(read.error)};
      return {std::make_shared<Model>(std::move(read.value)), {}};
    } catch (const std::exception& error) {
      return {nullptr, Error{0, error.what()}};
    }
  }

  std::vector<TraceProbe> probesForDictionaries(const std::vector<plist::Dictionary>& descriptions,
                                                platform::TraceModel& trace) override {
    const auto* const model = dynamic_cast<const Model*>(&trace);
    if (model == nullptr) return {};  // not one that this library opened
    try {
      const auto read = probesFor(host_.jsonOf(descriptions), model->trace());
      if (read.ok()) return madeOf(read.value, model->trace());
      host_.refuse(read.error->text);
    } catch (const std::exception& error) {
      host_.refuse(error.what());
    }
    return {};
  }

 private:
  const Host host_;
};

class Analysis final : public platform::TraceAnalysis {
 public:
  explicit Analysis(const Host& host) : library_(std::make_shared<Library>(host)) {}
  Loaded load() override { return {library_, {}}; }

 private:
  const std::shared_ptr<Library> library_;
};

}  // namespace

}  // namespace tarn::trace_analysis

extern "C" [[gnu::visibility("default")]] tarn::platform::TraceAnalysis* tarnCreateTraceAnalysis(
    const tarn::trace_analysis::Host& host) {
  try {
    return std::make_unique<tarn::trace_analysis::Analysis>(host).release();
  } catch (const std::exception&) {
    return nullptr;
  }
}
