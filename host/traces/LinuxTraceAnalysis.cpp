#include "host/traces/LinuxTraceAnalysis.h"

#include <dlfcn.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <utility>

#include "host/log/HostLog.h"
#include "host/system/JsonValues.h"
#include "host/traces/analysis/TraceAnalysisAbi.h"

namespace tarn::linux_host {

using platform::LogLevel;
using platform::Outcome;
using platform::PlatformError;
using platform::SignpostInterval;
using platform::TraceProbe;

namespace {

constexpr std::string_view kModule = "TraceAnalysis";
constexpr std::string_view kBesideTheProgram = "../lib/tarnkit/traceanalysis.so";
// A library that nests its probes deeper, or in a circle, is not followed.
constexpr int kMostProbeDepth = 64;
// Room that is made on a library's word.
constexpr std::uint64_t kMostReserved = std::uint64_t{1} << 21U;

// The tables of a library's classes.
struct Classes {
  const SkeinTraceModelV1* traceModel = nullptr;
  const SkeinSignpostDataModelV1* signpostDataModel = nullptr;
  const SkeinSignpostPlistV1* signpostPlist = nullptr;
  const SkeinSignpostIntervalProbeV1* signpostIntervalProbe = nullptr;
};

// The table of a class, whole; null when the library has none.
template <class Table>
const Table* find(void* library, const std::string& className) {
  void* const symbol = ::dlsym(library, (className + "_V1").c_str());
  if (symbol == nullptr) return nullptr;
  const Table* const table = reinterpret_cast<const Table* (*)()>(symbol)();
  return table != nullptr && table->bytes >= sizeof(Table) ? table : nullptr;
}

// Fills in the tables; the name of the first class that is missing, or an empty text.
std::string findClasses(void* library, Classes& classes) {
  classes.traceModel = find<SkeinTraceModelV1>(library, "SkeinTraceModel");
  classes.signpostDataModel = find<SkeinSignpostDataModelV1>(library, "SkeinSignpostDataModel");
  classes.signpostPlist = find<SkeinSignpostPlistV1>(library, "SkeinSignpostPlist");
  classes.signpostIntervalProbe = find<SkeinSignpostIntervalProbeV1>(library, "SkeinSignpostIntervalProbe");
  if (classes.traceModel == nullptr) return "SkeinTraceModel";
  if (classes.signpostDataModel == nullptr) return "SkeinSignpostDataModel";
  if (classes.signpostPlist == nullptr) return "SkeinSignpostPlist";
  return classes.signpostIntervalProbe == nullptr ? "SkeinSignpostIntervalProbe" : "";
}

std::string textOf(SkeinText text) {
  return std::string(text.bytes, text.size);
}

PlatformError errorOf(const SkeinFailure& failure) {
  const std::string_view text(failure.text, sizeof failure.text);
  return {failure.code, std::string(text.substr(0, text.find('\0')))};
}

SignpostInterval intervalOf(const SkeinInterval& interval, double secondsPerTick) {
  return {textOf(interval.subsystem), textOf(interval.name),
          static_cast<double>(interval.durationTicks) * secondsPerTick};
}

template <class Object>
using Owned = std::unique_ptr<Object, void (*)(Object*)>;

// An opened trace and all its intervals.
class Model final : public platform::TraceModel {
 public:
  Model(const Classes& classes, SkeinTrace* trace)
      : classes_(classes),
        trace_(trace, classes.traceModel->release),
        data_(nullptr, classes.signpostDataModel->release) {}

  Outcome<std::vector<SignpostInterval>> allSignpostIntervals() override {
    if (auto error = makeData()) return {{}, std::move(error)};
    const auto& table = *classes_.signpostDataModel;
    std::vector<SignpostInterval> intervals;
    const std::uint64_t count = table.intervalCount(data_.get());
    intervals.reserve(std::min(count, kMostReserved));
    for (std::uint64_t i = 0; i < count; ++i) {
      intervals.push_back(intervalOf(table.interval(data_.get(), i), secondsPerTick()));
    }
    return {std::move(intervals), {}};
  }

  platform::MaybeError makeData() {
    SkeinFailure failure{};
    if (data_ == nullptr) data_.reset(classes_.signpostDataModel->create(trace_.get(), &failure));
    if (data_ == nullptr) return errorOf(failure);
    return {};
  }
  // Behind makeData() without an error.
  double secondsPerTick() const { return classes_.signpostDataModel->secondsPerTick(data_.get()); }
  const SkeinTrace* trace() const { return trace_.get(); }

 private:
  const Classes classes_;
  const Owned<SkeinTrace> trace_;
  Owned<SkeinSignpostData> data_;  // null until it is first wanted
};

class Library final : public platform::TraceAnalysisLibrary {
 public:
  Library(const Classes& classes, platform::Log& log) : classes_(classes), log_(log) {}

  Outcome<std::shared_ptr<platform::TraceModel>> openTrace(std::string_view location) override {
    SkeinFailure failure{};
    SkeinTrace* const trace = classes_.traceModel->open({location.data(), location.size()}, &failure);
    if (trace == nullptr) return {nullptr, errorOf(failure)};
    return {std::make_shared<Model>(classes_, trace), {}};
  }

  std::vector<TraceProbe> probesForDictionaries(const std::vector<plist::Dictionary>& descriptions,
                                                platform::TraceModel& trace) override {
    auto* const model = dynamic_cast<Model*>(&trace);
    if (model == nullptr) return {};  // not one that this library opened
    if (const auto error = model->makeData()) return refuse(error->text);
    const std::string text = jsonOf(descriptions);
    SkeinFailure failure{};
    const auto& table = *classes_.signpostPlist;
    const Owned<SkeinProbeList> list(table.probesForDictionaries({text.data(), text.size()}, model->trace(), &failure),
                                     table.release);
    if (list == nullptr) return refuse(errorOf(failure).text);
    std::vector<TraceProbe> probes;
    for (std::uint64_t i = 0; i < table.probeCount(list.get()); ++i) {
      probes.push_back(probeOf(*table.probe(list.get(), i), model->secondsPerTick(), 1));
    }
    return probes;
  }

 private:
  std::vector<TraceProbe> refuse(const std::string& why) {
    hostLog(log_, kTraceCategory, LogLevel::Error, kModule, "the trace-analysis library gives no probes: " + why);
    return {};
  }

  // A description that JSON can't hold asks for nothing that there is.
  std::string jsonOf(const std::vector<plist::Dictionary>& descriptions) {
    std::string array = "[";
    for (const plist::Dictionary& description : descriptions) {
      const auto text = jsonText(description);
      if (!text) {
        hostLog(log_, kTraceCategory, LogLevel::Error, kModule, "a probe's description holds what no probe can have");
        continue;
      }
      if (array.size() > 1) array += ',';
      array += *text;
    }
    return array + "]";
  }

  TraceProbe probeOf(const SkeinProbe& probe, double secondsPerTick, int depth) {
    const auto& table = *classes_.signpostPlist;
    const auto& intervals = *classes_.signpostIntervalProbe;
    TraceProbe made{textOf(table.name(&probe)), textOf(table.kind(&probe)), intervals.isKindOf(&probe) != 0, {}, {}};
    const std::uint64_t events = made.measuresSignpostIntervals ? intervals.eventCount(&probe) : 0;
    made.events.reserve(std::min(events, kMostReserved));
    for (std::uint64_t i = 0; i < events; ++i) {
      made.events.push_back(intervalOf(intervals.event(&probe, i), secondsPerTick));
    }
    const std::uint64_t children = depth < kMostProbeDepth ? table.childCount(&probe) : 0;
    for (std::uint64_t i = 0; i < children; ++i) {
      made.children.push_back(probeOf(*table.child(&probe, i), secondsPerTick, depth + 1));
    }
    return made;
  }

  const Classes classes_;
  platform::Log& log_;
};

}  // namespace

LinuxTraceAnalysis::LinuxTraceAnalysis(std::string path, platform::Log& log) : path_(std::move(path)), log_(log) {}

platform::TraceAnalysis::Loaded LinuxTraceAnalysis::load() {
  if (loaded_) return *loaded_;
  Classes classes;
  // Never closed: what it made may live as long as the process.
  void* const library = ::dlopen(path_.c_str(), RTLD_NOW | RTLD_LOCAL);
  if (library == nullptr) {
    const char* const reason = ::dlerror();
    hostLog(log_, kTraceCategory, LogLevel::Error, kModule,
            "the trace-analysis library can't be loaded: " + (reason == nullptr ? path_ : std::string(reason)));
    loaded_ = Loaded{nullptr, "SkeinTraceModel"};
  } else if (std::string missing = findClasses(library, classes); !missing.empty()) {
    hostLog(log_, kTraceCategory, LogLevel::Error, kModule,
            "the trace-analysis library " + path_ + " lacks a class: " + missing);
    loaded_ = Loaded{nullptr, std::move(missing)};
  } else {
    loaded_ = Loaded{std::make_shared<Library>(classes, log_), {}};
  }
  return *loaded_;
}

std::string LinuxTraceAnalysis::defaultPath() {
  std::array<char, 4096> program{};
  const ssize_t size = ::readlink("/proc/self/exe", program.data(), program.size());
  const std::string_view path(program.data(), size > 0 ? static_cast<std::size_t>(size) : 0);
  return std::string(path.substr(0, path.rfind('/') + 1)) + std::string(kBesideTheProgram);
}

}  // namespace tarn::linux_host
