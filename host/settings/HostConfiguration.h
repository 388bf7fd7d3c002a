// HostConfiguration: the service's configuration file (TOML), as one struct. What the file leaves out has the value
// shown here. Unknown keys, wrong types and values outside their range are errors. Threads: any; plain data.
#pragma once

#include <chrono>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "platform/SnareService.h"

namespace tarn::linux_host {

struct HostConfiguration {
  struct Tally {
    std::vector<std::string> inUse{"*"};  // glob patterns of the event names that somebody wants
  };
  struct Rtc {
    std::vector<std::string> backends{"recorder"};  // what the backend's start completion reports
    bool noBackends = false;                        // it reports no list at all
    bool available = true;                          // a hierarchy token is handed out
    std::chrono::milliseconds startDelay{0};        // how late the start completion comes; at most an hour
  };
  struct Snare {
    std::optional<platform::SnareReason> refuse;  // with what bug captures are refused; empty in the file: they aren't
  };
  struct Paths {
    std::optional<std::string> diagnosticLogs;  // the folder that holds DiagnosticLogs/; else the state directory
    std::optional<std::string> flume;  // the folder of driver report channels; else flume/ in the state directory
    std::optional<std::string> alsa;   // the kernel's tree of sound hardware; else none is looked at
    std::optional<std::string> traceAnalysis;  // the trace-analysis library; else the one beside the program
  };
  struct Recorder {
    std::uint64_t maximumMegabytes = 256;  // 1 to 1048576
    std::uint64_t maximumAgeDays = 30;     // 1 to 36500
  };
  struct Limits {
    std::uint32_t maximumFrameBytes = 1048576;  // 64 to 67108864
  };

  Tally tally;
  Rtc rtc;
  Snare snare;
  Paths paths;
  Recorder recorder;
  Limits limits;
};

struct ReadConfiguration {
  std::optional<HostConfiguration> configuration;
  std::string error;  // when there is none: "NAME:LINE: what is wrong", or "NAME: why it can't be read"
};

// Reads the file; at most 1 MiB.
ReadConfiguration readConfiguration(const std::string& path);
// The same of a text that is in memory; `name` stands for the file in errors.
ReadConfiguration parseConfiguration(std::string_view text, std::string_view name);

}  // namespace tarn::linux_host
