// SPDX-License-Identifier: Apache-2.0
#include "host/settings/ServiceOptions.h"

#include <CLI/CLI.hpp>
#include <algorithm>
#include <utility>

#include "host/log/LogLine.h"

namespace tarn::linux_host {

namespace {

constexpr const char* kProgram = "tarnreportingd";
constexpr const char* kPurpose = "Gathers audio analytics: serves reporting sessions to the clients that connect.";
constexpr const char* kFooter =
    "The listener is the socket that the service manager hands over (LISTEN_FDS), else --socket; one that it names\n"
    "admin is the admin socket. SIGTERM and SIGINT end each client and its sessions, then the service, once "
    "everything\n"
    "that it recorded is on disk.\n"
    "\n"
    "Exit status: 0 after SIGTERM, SIGINT, --help and --version; 1 when it can't serve (the state directory, the "
    "socket\n"
    "or the log can't be used, or another service is live on the socket); 2 when a client ended it; 64 for wrong "
    "usage;\n"
    "78 for a wrong configuration or device-properties file, or when --check finds something bad.";

std::string checkNotEmpty(const std::string& text) {
  return text.empty() ? "must not be empty" : "";
}

std::string checkLevel(const std::string& name) {
  return logLevelFromName(name) ? "" : "\"" + name + "\" is none of debug, info, default, error";
}

void addOptions(CLI::App& app, ServiceOptionTexts& raw) {
  app.add_option("--socket", raw.socketPath,
                 "Socket to listen on (default: $XDG_RUNTIME_DIR/tarnreporting.sock, for root "
                 "/run/tarnreporting/socket)")
      ->type_name("PATH")
      ->check(checkNotEmpty);
  app.add_option("--admin-socket", raw.adminSocketPath,
                 "Socket for its owner alone, over which everything is allowed (default: none, and with [access] admin "
                 "= \"separate\" the socket's path followed by -admin)")
      ->type_name("PATH")
      ->check(checkNotEmpty);
  app.add_option("--state-dir", raw.stateDirectory,
                 "Where the recorder, defaults, notifications and reports are kept (default: "
                 "$XDG_STATE_HOME/tarnreporting, without it ~/.local/state/tarnreporting, for root "
                 "/var/lib/tarnreporting)")
      ->type_name("DIR")
      ->check(checkNotEmpty);
  app.add_option("--config", raw.configurationFile,
                 "Configuration file, TOML (default: the installed tarnreporting/tarnreportingd.toml, if there is one)")
      ->type_name("FILE")
      ->check(checkNotEmpty);
  app.add_option("--device-properties", raw.devicePropertiesFile,
                 "What the device is, JSON (default: the installed tarnreporting/device.json, if there is one, else "
                 R"({"InternalBuild": false, "haptics": false}))")
      ->type_name("FILE")
      ->check(checkNotEmpty);
  app.add_option("--log-level", raw.logLevel,
                 "Least level that is logged: debug, info, default or error (default: as the configuration says)")
      ->type_name("LEVEL")
      ->check(checkLevel);
  app.add_option("--log-target", raw.logTarget,
                 "Where the log goes: stderr, journal, or a file that is appended to (default: stderr)")
      ->type_name("stderr|journal|FILE")
      ->check(checkNotEmpty);
  app.add_flag("--check", raw.check,
               "Start nothing: say whether options, configuration, state directory, store, space and socket would do, "
               "one line each");
}

ServiceCommand refuse(std::string text) {
  std::replace(text.begin(), text.end(), '\n', ' ');
  return {std::nullopt, {}, Error{kExitUsage, std::move(text)}};
}

std::optional<std::string> orNothing(const std::string& text) {
  return text.empty() ? std::nullopt : std::optional(text);
}

}  // namespace

void describeServiceCommand(CLI::App& app, ServiceOptionTexts& texts, const std::string& version) {
  app.name(kProgram);
  app.description(kPurpose);
  addOptions(app, texts);
  app.set_help_flag("--help", "Print this help and exit");
  app.set_version_flag("--version", version, "Print the version and exit");
  app.footer(kFooter);
  app.get_formatter()->column_width(38);
}

ServiceCommand parseServiceCommand(int argumentCount, const char* const* arguments, const HostEnvironment& environment,
                                   const std::string& version) {
  CLI::App app;
  ServiceOptionTexts raw;
  describeServiceCommand(app, raw, version);
  try {
    app.parse(argumentCount, arguments);
  } catch (const CLI::CallForHelp&) {
    return {std::nullopt, app.help(), {}};
  } catch (const CLI::CallForVersion&) {
    return {std::nullopt, version + "\n", {}};
  } catch (const CLI::ParseError& fault) {
    return refuse(fault.what());
  }
  ServiceOptions options;
  const std::optional<std::string> stateDirectory =
      raw.stateDirectory.empty() ? defaultStateDirectory(environment) : std::optional(raw.stateDirectory);
  if (!stateDirectory) return refuse("--state-dir: must be given, neither XDG_STATE_HOME nor HOME names a folder");
  options.socketPath = raw.socketPath.empty() ? defaultSocketPath(environment) : std::optional(raw.socketPath);
  options.socketIsDefault = raw.socketPath.empty();
  options.adminSocketPath = orNothing(raw.adminSocketPath);
  options.stateDirectory = *stateDirectory;
  options.configurationFile = orNothing(raw.configurationFile);
  options.defaultConfigurationFile = defaultConfigurationFile(environment);
  options.devicePropertiesFile = orNothing(raw.devicePropertiesFile);
  options.defaultDevicePropertiesFile = defaultDevicePropertiesFile(environment);
  options.logLevel = logLevelFromName(raw.logLevel);
  options.logTarget = raw.logTarget;
  options.isCheck = raw.check;
  return {std::move(options), {}, {}};
}

}  // namespace tarn::linux_host
