// SPDX-License-Identifier: Apache-2.0
// ServiceOptions: the command line of tarnreportingd.
//
// Parsing looks at no file and changes nothing, so tests try every line without a service. Threads: one at a time.
#pragma once

#include <optional>
#include <string>

#include "host/settings/HostPaths.h"
#include "platform/Log.h"
#include "plist/Result.h"

namespace CLI {
class App;
}

namespace tarn::linux_host {

// Exit statuses of the service, which packages and the service manager rely on; 64 and 78 are those of sysexits.h.
inline constexpr int kExitSuccess = 0;
inline constexpr int kExitFailure = 1;         // it can't serve: state directory, socket, log
inline constexpr int kExitKilled = 2;          // a client asked for the end
inline constexpr int kExitUsage = 64;          // wrong options
inline constexpr int kExitConfiguration = 78;  // a wrong configuration or device-properties file

// What the options say, with the defaults for those that weren't given. Paths are as they were written.
struct ServiceOptions {
  std::optional<std::string> socketPath;  // nothing: none named and no default, so the listener must be handed over
  bool socketIsDefault = false;           // then its folder is the service's own to make
  std::optional<std::string> adminSocketPath;  // nothing: beside the socket, if the configuration wants one
  // Never empty: without the option and without a default the command line is wrong.
  std::string stateDirectory;
  // One that is named must be there.
  std::optional<std::string> configurationFile;
  std::string defaultConfigurationFile;  // read when none is named, as far as it is there
  // Likewise; without any file the device has neither of the known properties.
  std::optional<std::string> devicePropertiesFile;
  std::string defaultDevicePropertiesFile;
  // What is logged, from this level on, and where: "stderr", "journal" or a file's path.
  std::optional<platform::LogLevel> logLevel;  // nothing: as the configuration says
  std::string logTarget = "stderr";
  bool isCheck = false;  // say whether all of this would do, and exit
};

// What a command line asks for: exactly one of its members says so.
struct ServiceCommand {
  std::optional<ServiceOptions> options;  // nothing: print what there is and exit
  std::string output;                     // for stdout: the help or the version
  Status usage;                           // wrong: the code is the exit status, the text names the option
};

// The options' values as they were written; empty: not given.
struct ServiceOptionTexts {
  std::string socketPath;
  std::string adminSocketPath;
  std::string stateDirectory;
  std::string configurationFile;
  std::string devicePropertiesFile;
  std::string logLevel;
  std::string logTarget = "stderr";
  bool check = false;
};

// Puts the whole command line into `app`: what parses it here, and what manual pages and completions are made of.
// `texts` outlives `app`; `version` is what --version tells.
void describeServiceCommand(CLI::App& app, ServiceOptionTexts& texts, const std::string& version);
// Reads `arguments` as main() gets them, the program's name first. An option given with an empty value and one that
// isn't known are wrong usage: the status is 64 and the text one line.
ServiceCommand parseServiceCommand(int argumentCount, const char* const* arguments, const HostEnvironment& environment,
                                   const std::string& version);

}  // namespace tarn::linux_host
