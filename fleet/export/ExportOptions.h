// SPDX-License-Identifier: Apache-2.0
// The command line and the configuration of tarnreporting-export. Parsing looks at no file and changes nothing.
#pragma once

#include <optional>
#include <string>

#include "fleet/privacy/Rules.h"
#include "fleet/program/ProgramLog.h"
#include "fleet/publish/ServerSettings.h"
#include "plist/Result.h"

namespace CLI {
class App;
}

namespace tarn::fleet {

inline constexpr int kExitFailure = 1;         // it can't do what was asked
inline constexpr int kExitUsage = 64;          // wrong options
inline constexpr int kExitConfiguration = 78;  // a wrong configuration file

struct ExportOptions {
  std::string configurationFile;  // empty: the usual one, which need not be there
  std::string usualConfigurationFile = "/etc/tarnreporting/export.toml";
  std::string stateDirectory;  // of the service, whose store is read
  std::string ownDirectory;    // where the cursor lies
  std::string machineId = "/etc/machine-id";
  bool show = false;
  bool status = false;
  std::optional<std::string> since;  // as it was given
  bool once = false;                 // ends when all that is there has left
  LogLevel logLevel = LogLevel::Default;
};

// What parsing writes to.
struct ExportOptionTexts {
  ExportOptions options;
  std::string since, logLevel = "default";
};

// The program's options and what it says of itself, for the parser and for the manual page.
void describeExportCommand(CLI::App& app, ExportOptionTexts& texts);

// What a command line asks for: exactly one of its members says so.
struct ExportCommand {
  std::optional<ExportOptions> options;
  std::string output;  // for stdout: the help or the version
  Status usage;        // wrong: one line that names the option
};
ExportCommand parseExportCommand(int argumentCount, const char* const* arguments);

struct ExportConfiguration {
  Rules rules;
  std::string keyFile = "/etc/tarnreporting/fleet.key";
  ServerSettings server;
  std::string folder;  // of `local`; empty: "messages" in the program's own
  std::int64_t maxMegabytes = 256;
};

Result<ExportConfiguration> parseExportConfiguration(std::string_view text, std::string_view name);
// The file of the options. One that isn't named need not be there: then nothing leaves.
Result<ExportConfiguration> readExportConfiguration(const ExportOptions& options);

}  // namespace tarn::fleet
