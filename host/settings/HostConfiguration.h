// HostConfiguration: the service's configuration file (TOML), read into the structures that use it. What the file
// leaves out keeps its default there. Unknown keys, wrong types and values outside their range are errors. Threads:
// any; plain data.
#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "host/socket/HostLimits.h"
#include "platform/SnareService.h"
#include "plist/Result.h"
#include "recorder/RecorderOptions.h"
#include "recorder/RecorderRtcReportingService.h"

namespace tarn::linux_host {

struct HostConfiguration {
  struct Tally {
    std::vector<std::string> inUse{"*"};  // glob patterns of the event names that somebody wants
    bool operator==(const Tally&) const = default;
  };
  struct Snare {
    std::optional<platform::SnareReason> refuse;  // with what bug captures are refused; empty in the file: they aren't
    bool operator==(const Snare&) const = default;
  };
  struct Paths {
    std::optional<std::string> diagnosticLogs;  // the folder that holds DiagnosticLogs/; else the state directory
    std::optional<std::string> flume;  // the folder of driver report channels; else flume/ in the state directory
    std::optional<std::string> alsa;   // the kernel's tree of sound hardware; else none is looked at
    std::optional<std::string> traceAnalysis;  // the trace-analysis library; else the one beside the program
    bool operator==(const Paths&) const = default;
  };

  Tally tally;
  tarn::recorder::RecorderRtcReportingService::Behaviour rtc;
  Snare snare;
  Paths paths;
  bool recorderEnabled = true;  // false: nothing stands in for the back-ends, and nothing is recorded
  tarn::recorder::RecorderOptions recorder;
  HostLimits limits;

  bool operator==(const HostConfiguration&) const = default;
};

// Reads the file; at most 1 MiB. An error reads "NAME:LINE: what is wrong", or "NAME: why it can't be read"; then the
// defaults stand beside it.
Result<HostConfiguration> readConfiguration(const std::string& path);
// The same of a text that is in memory; `name` stands for the file in errors.
Result<HostConfiguration> parseConfiguration(std::string_view text, std::string_view name);

}  // namespace tarn::linux_host
