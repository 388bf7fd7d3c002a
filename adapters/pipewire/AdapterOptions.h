// SPDX-License-Identifier: Apache-2.0
// The command line of tarnreporting-pipewire. Parsing looks at no file and changes nothing.
#pragma once

#include <optional>
#include <string>

#include "plist/Result.h"

namespace tarn::streams {

inline constexpr int kExitFailure = 1;         // it can't do what was asked, as to look at a PipeWire that isn't there
inline constexpr int kExitUsage = 64;          // wrong options
inline constexpr int kExitConfiguration = 78;  // a wrong configuration file

enum class LogLevel { Debug, Default, Error };

struct AdapterOptions {
  std::optional<std::string> configurationFile;  // one that is named must be there
  std::string socket;                            // of the service; empty: the client library looks for it
  std::string remote;                            // of PipeWire; empty: its own default
  bool once = false;                             // shows what is there now
  bool print = false;                            // prints instead of sending
  LogLevel logLevel = LogLevel::Default;
};

// What a command line asks for: exactly one of its members says so.
struct AdapterCommand {
  std::optional<AdapterOptions> options;
  std::string output;  // for stdout: the help or the version
  Status usage;        // wrong: one line that names the option
};

AdapterCommand parseAdapterCommand(int argumentCount, const char* const* arguments);

}  // namespace tarn::streams
