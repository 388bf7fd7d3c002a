// SPDX-License-Identifier: Apache-2.0
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
  // Loads nothing. The log outlives everything that comes from here.
  LinuxTraceAnalysis(std::string path, platform::Log& log);

  // The first call loads the shared object and blocks for that; its answer, good or not, holds for the life of the
  // process, so a library that is installed later is found after a restart. It is never unloaded: what it made may live
  // as long. Without it the answer names the first class as missing.
  Loaded load() override;

  // Where the library that was built and installed with this program lies: "../lib/tarnkit/traceanalysis.so" as seen
  // from the folder of the running program.
  static std::string defaultPath();

 private:
  const std::string path_;
  platform::Log& log_;
  // The answer, from the first call on.
  std::optional<Loaded> loaded_;
};

}  // namespace tarn::linux_host
