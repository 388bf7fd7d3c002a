// SPDX-License-Identifier: Apache-2.0
// The command lines of tarnreporting-pipewire and tarnreporting-alsa, which have most of their options in common.
// Parsing looks at no file and changes nothing.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "plist/Result.h"

namespace CLI {
class App;
}

namespace tarn::streams {

inline constexpr int kExitFailure = 1;         // it can't do what was asked, as to look at a PipeWire that isn't there
inline constexpr int kExitUsage = 64;          // wrong options
inline constexpr int kExitConfiguration = 78;  // a wrong configuration file

// Whose streams are reported.
enum class Adapter : std::uint8_t { PipeWire, Alsa };
// The program's name, tarnreporting-alsa, and that of its usual configuration file, alsa.toml.
const char* programOf(Adapter adapter);
const char* configurationNameOf(Adapter adapter);

enum class LogLevel { Debug, Default, Error };

struct AdapterOptions {
  std::optional<std::string> configurationFile;  // one that is named must be there
  std::string socket;                            // of the service; empty: the client library looks for it
  std::string remote;                            // of PipeWire; empty: its own default
  std::string proc = "/proc";                    // ALSA's: the folder of the kernel's texts
  std::int64_t intervalMilliseconds = 1000;      // and how often it is looked at
  bool once = false;                             // shows what is there now
  bool print = false;                            // prints instead of sending
  LogLevel logLevel = LogLevel::Default;
};

// What parsing writes to.
struct AdapterOptionTexts {
  std::string configurationFile, socket, remote, proc = "/proc", logLevel = "default";
  double interval = 1.0;
  bool once = false;
  bool print = false;
};

// The program's options and what it says of itself, for the parser and for the manual page.
void describeAdapterCommand(Adapter adapter, CLI::App& app, AdapterOptionTexts& texts);

// What a command line asks for: exactly one of its members says so.
struct AdapterCommand {
  std::optional<AdapterOptions> options;
  std::string output;  // for stdout: the help or the version
  Status usage;        // wrong: one line that names the option
};

AdapterCommand parseAdapterCommand(Adapter adapter, int argumentCount, const char* const* arguments);

}  // namespace tarn::streams
