// LinuxTraceAnalysis: the trace-analysis library as a shared object (see analysis/TraceAnalysisFactory.h), loaded on
// the first call and kept. Why one can't be loaded, and descriptions that it refuses, are told in the log.
//
// Owner: the platform; traces and libraries that it handed out may outlive it. Threads: the server queue.
#pragma once

#include <optional>
#include <string>

#include "platform/Log.h"
#include "platform/TraceAnalysis.h"

namespace tarn::linux_host {

class LinuxTraceAnalysis final : public platform::TraceAnalysis {
 public:
  // The log outlives everything that comes from here.
  LinuxTraceAnalysis(std::string path, platform::Log& log);

  Loaded load() override;

  // Where the library that was built and installed with this program lies: "../lib/tarnkit/traceanalysis.so" as seen
  // from the program's folder.
  static std::string defaultPath();

 private:
  const std::string path_;
  platform::Log& log_;
  std::optional<Loaded> loaded_;
};

}  // namespace tarn::linux_host
