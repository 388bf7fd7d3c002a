// SPDX-License-Identifier: Apache-2.0
#include "adapters/pipewire/AdapterOptions.h"

#include <CLI/CLI.hpp>
#include <algorithm>
#include <utility>

namespace tarn::streams {

namespace {

constexpr const char* kProgram = "tarnreporting-pipewire";
constexpr const char* kVersion = "tarnreporting-pipewire " TARN_VERSION;
constexpr const char* kPurpose = "Reports every audio stream of PipeWire to the reporting service.";
constexpr const char* kFooter =
    "It looks at properties, states and links, never at sound. PipeWire and the service may come and go.\n"
    "\n"
    "Exit status: 0 after SIGTERM, SIGINT, --once, --help and --version; 1 when it can't look at PipeWire at all or\n"
    "--once finds none; 64 for wrong usage; 78 for a wrong configuration file.";

struct RawOptions {
  std::string configurationFile, socket, remote, logLevel = "default";
  bool once = false;
  bool print = false;
};

std::string checkNotEmpty(const std::string& text) {
  return text.empty() ? "must not be empty" : "";
}

std::optional<LogLevel> levelNamed(std::string_view name) {
  if (name == "debug") return LogLevel::Debug;
  if (name == "default") return LogLevel::Default;
  return name == "error" ? std::optional(LogLevel::Error) : std::nullopt;
}

std::string checkLevel(const std::string& name) {
  return levelNamed(name) ? "" : "\"" + name + "\" is none of debug, default, error";
}

void addOptions(CLI::App& app, RawOptions& raw) {
  app.add_option("--config", raw.configurationFile,
                 "Configuration file, TOML (default: tarnreporting/pipewire.toml in $XDG_CONFIG_HOME or ~/.config, if "
                 "there is one)")
      ->type_name("FILE")
      ->check(checkNotEmpty);
  app.add_option("--socket", raw.socket,
                 "Socket of the service (default: $TARNREPORTING_SOCKET, else the user's, else the system's)")
      ->type_name("PATH")
      ->check(checkNotEmpty);
  app.add_option("--remote", raw.remote, "Name of the PipeWire to look at (default: that of its own configuration)")
      ->type_name("NAME")
      ->check(checkNotEmpty);
  app.add_flag("--print", raw.print,
               "Print what would be sent, a line each, as tarnreportingctl run takes it; send "
               "nothing");
  app.add_flag("--once", raw.once, "With --print: a table of the streams that are there now, and exit");
  app.add_option("--log-level", raw.logLevel, "Least level that is logged: debug, default or error (default: default)")
      ->type_name("LEVEL")
      ->check(checkLevel);
}

AdapterCommand refuse(std::string text) {
  std::replace(text.begin(), text.end(), '\n', ' ');
  return {std::nullopt, {}, Error{kExitUsage, std::move(text)}};
}

}  // namespace

AdapterCommand parseAdapterCommand(int argumentCount, const char* const* arguments) {
  CLI::App app(kPurpose, kProgram);
  RawOptions raw;
  addOptions(app, raw);
  app.set_help_flag("--help", "Print this help and exit");
  app.set_version_flag("--version", kVersion, "Print the version and exit");
  app.footer(kFooter);
  app.get_formatter()->column_width(38);
  try {
    app.parse(argumentCount, arguments);
  } catch (const CLI::CallForHelp&) {
    return {std::nullopt, app.help(), {}};
  } catch (const CLI::CallForVersion&) {
    return {std::nullopt, std::string(kVersion) + "\n", {}};
  } catch (const CLI::ParseError& fault) {
    return refuse(fault.what());
  }
  if (raw.once && !raw.print) return refuse("--once: only with --print");
  AdapterOptions options;
  if (!raw.configurationFile.empty()) {
    options.configurationFile = std::move(raw.configurationFile);
  }
  options.socket = std::move(raw.socket);
  options.remote = std::move(raw.remote);
  options.once = raw.once;
  options.print = raw.print;
  options.logLevel = levelNamed(raw.logLevel).value_or(LogLevel::Default);
  return {std::move(options), {}, {}};
}

}  // namespace tarn::streams
