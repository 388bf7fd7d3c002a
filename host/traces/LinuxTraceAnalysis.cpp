// SPDX-License-Identifier: Apache-2.0
#include "host/traces/LinuxTraceAnalysis.h"

#include <dlfcn.h>
#include <unistd.h>

#include <array>
#include <memory>
#include <utility>
#include <vector>

#include "host/log/PrefixedLog.h"
#include "host/system/JsonValues.h"
#include "host/traces/analysis/TraceAnalysisFactory.h"

namespace tarn::linux_host {

using platform::LogLevel;

namespace {

constexpr std::string_view kModule = "TraceAnalysis";
constexpr std::string_view kBesideTheProgram = "../lib/tarnkit/traceanalysis.so";
constexpr const char* kFirstClass = "SkeinTraceModel";

void tell(platform::Log& log, const std::string& text) {
  logPrefixed(log, kTraceCategory, LogLevel::Error, kModule, text);
}

// A description that JSON can't hold asks for nothing that there is.
std::string jsonOf(const std::vector<plist::Dictionary>& descriptions, platform::Log& log) {
  std::string array = "[";
  for (const plist::Dictionary& description : descriptions) {
    const auto text = jsonText(description);
    if (!text) {
      tell(log, "a probe's description holds what no probe can have");
      continue;
    }
    if (array.size() > 1) {
      array += ',';
    }
    array += *text;
  }
  return array + "]";
}

// Null when the library can't make the facility.
std::unique_ptr<platform::TraceAnalysis> makeWith(void* library, platform::Log& log) {
  const trace_analysis::Host host{
      [&log](const auto& descriptions) { return jsonOf(descriptions, log); },
      [&log](const std::string& why) { tell(log, "the trace-analysis library gives no probes: " + why); }};
  void* const factory = ::dlsym(library, trace_analysis::kFactoryName);
  return std::unique_ptr<platform::TraceAnalysis>(
      factory == nullptr ? nullptr : reinterpret_cast<trace_analysis::Factory*>(factory)(host));
}

}  // namespace

LinuxTraceAnalysis::LinuxTraceAnalysis(std::string path, platform::Log& log) : path_(std::move(path)), log_(log) {}

platform::TraceAnalysis::Loaded LinuxTraceAnalysis::load() {
  if (loaded_) return *loaded_;
  loaded_ = Loaded{nullptr, kFirstClass};
  // Never closed: what it made may live as long as the process.
  void* const library = ::dlopen(path_.c_str(), RTLD_NOW | RTLD_LOCAL);
  if (library == nullptr) {
    const char* const reason = ::dlerror();
    tell(log_, "the trace-analysis library can't be loaded: " + (reason == nullptr ? path_ : std::string(reason)));
    return *loaded_;
  }
  if (const auto analysis = makeWith(library, log_)) {
    loaded_ = analysis->load();
  }
  if (!loaded_->missingClass.empty()) {
    tell(log_, "the trace-analysis library " + path_ + " lacks a class: " + loaded_->missingClass);
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
