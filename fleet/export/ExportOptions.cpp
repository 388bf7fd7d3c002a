// SPDX-License-Identifier: Apache-2.0
#include "fleet/export/ExportOptions.h"

#include <CLI/CLI.hpp>
#include <algorithm>
#include <cerrno>
#include <utility>

#include "fleet/program/Settings.h"

namespace tarn::fleet {

namespace {

constexpr const char* kProgram = "tarnreporting-export";
constexpr const char* kFooter =
    "Nothing leaves unless the configuration says so; --show and --status may be asked for at any time and send\n"
    "nothing.\n"
    "\n"
    "Exit status: 0 after SIGTERM, SIGINT, --show, --status, --once, --help and --version, and when the configuration "
    "says off;\n"
    "1 when it can't do what was asked; 64 for wrong usage; 78 for a wrong configuration file.";

std::string checkNotEmpty(const std::string& text) {
  return text.empty() ? "must not be empty" : "";
}

std::optional<LogLevel> levelNamed(const std::string& name) {
  if (name == "debug") return LogLevel::Debug;
  if (name == "default") return LogLevel::Default;
  if (name == "error") return LogLevel::Error;
  return std::nullopt;
}

std::optional<Mode> modeNamed(const std::string& name) {
  if (name == "off") return Mode::Off;
  if (name == "local") return Mode::Local;
  if (name == "export") return Mode::Export;
  return std::nullopt;
}

ExportCommand refuse(std::string text) {
  std::replace(text.begin(), text.end(), '\n', ' ');
  return {std::nullopt, {}, Error{kExitUsage, std::move(text)}};
}

std::string versionText() {
  return std::string(kProgram) + " " TARN_VERSION;
}

Settings settingsOf(ExportConfiguration& configuration) {
  Rules& rules = configuration.rules;
  ServerSettings& server = configuration.server;
  const auto takeMode = [&rules](const SettingValue& value) -> std::string {
    const std::optional<Mode> mode = modeNamed(value.text);
    if (!mode) return R"(must be "off", "local" or "export")";
    rules.mode = *mode;
    return {};
  };
  return {{"privacy", "mode", takeMode},
          {"privacy", "categories", takeTexts(rules.categories)},
          {"privacy", "types", takeTexts(rules.types)},
          {"privacy", "others", takeTexts(rules.others)},
          {"privacy", "keys", takeTexts(rules.keys)},
          {"privacy", "hashed", takeTexts(rules.hashed)},
          {"privacy", "sample", takeNumber(rules.sample, 0, 1)},
          {"privacy", "rotate_days", takeWhole(rules.rotateDays, 0, 36500)},
          {"privacy", "key_file", takeText(configuration.keyFile)},
          {"server", "urls", takeServers(server.urls)},
          {"server", "subject", takeText(server.subject)},
          {"server", "answer_seconds", takeWhole(server.answerSeconds, 1, 600)},
          {"server", "longest_pause_seconds", takeWhole(server.longestPauseSeconds, 1, 3600)},
          {"server", "credentials_file", takeText(server.credentialsFile)},
          {"server", "authority_file", takeText(server.authorityFile)},
          {"server", "certificate_file", takeText(server.certificateFile)},
          {"server", "certificate_key_file", takeText(server.keyFile)},
          {"local", "folder", takeText(configuration.folder)},
          {"local", "max_megabytes", takeWhole(configuration.maxMegabytes, 1, 1 << 20)}};
}

}  // namespace

void describeExportCommand(CLI::App& app, ExportOptionTexts& texts) {
  ExportOptions& options = texts.options;
  options.stateDirectory = "/var/lib/tarnreporting";
  options.ownDirectory = "/var/lib/tarnreporting-export";
  app.name(kProgram);
  app.description("Carries what the reporting service recorded off the device, as far as its configuration allows.");
  app.add_option(
         "--config", options.configurationFile,
         "Configuration file, TOML (default: export.toml beside the installed one of the service, if there is one)")
      ->type_name("FILE")
      ->check(checkNotEmpty);
  app.add_option("--state-dir", options.stateDirectory, "The service's state directory, which is read")
      ->capture_default_str()
      ->type_name("DIR")
      ->check(checkNotEmpty);
  app.add_option("--own-dir", options.ownDirectory, "Its own directory, which remembers how far it is")
      ->capture_default_str()
      ->type_name("DIR")
      ->check(checkNotEmpty);
  app.add_option("--machine-id", options.machineId, "What the machine calls itself; it leaves as a keyed hash")
      ->capture_default_str()
      ->type_name("FILE")
      ->check(checkNotEmpty);
  app.add_flag("--show", options.show, "Print exactly what would leave, a line of JSON each, and how much it is a day");
  app.add_option("--since", texts.since, "With --show: only what was recorded from then on (2026-11-20, -1h, today)")
      ->type_name("T")
      ->check(checkNotEmpty);
  app.add_flag("--status", options.status, "Print how far it is, what waits and its last error, as a line of JSON")
      ->excludes("--show");
  app.add_flag("--once", options.once, "Exit when all that is there has left");
  app.add_option("--log-level", texts.logLevel, "Least level that is logged: debug, default or error")
      ->capture_default_str()
      ->type_name("LEVEL")
      ->check(CLI::IsMember({"debug", "default", "error"}));
  app.set_help_flag("--help", "Print this help and exit");
  app.set_version_flag("--version", versionText(), "Print the version and exit");
  app.footer(kFooter);
  app.get_formatter()->column_width(38);
}

ExportCommand parseExportCommand(int argumentCount, const char* const* arguments) {
  CLI::App app;
  ExportOptionTexts texts;
  describeExportCommand(app, texts);
  try {
    app.parse(argumentCount, arguments);
  } catch (const CLI::CallForHelp&) {
    return {std::nullopt, app.help(), {}};
  } catch (const CLI::CallForVersion&) {
    return {std::nullopt, versionText() + "\n", {}};
  } catch (const CLI::ParseError& fault) {
    return refuse(fault.what());
  }
  if (!texts.since.empty() && !texts.options.show) return refuse("--since: only with --show");
  if (!texts.since.empty()) {
    texts.options.since = texts.since;
  }
  texts.options.logLevel = levelNamed(texts.logLevel).value_or(LogLevel::Default);
  return {std::move(texts.options), {}, {}};
}

Result<ExportConfiguration> parseExportConfiguration(std::string_view text, std::string_view name) {
  Result<ExportConfiguration> read;
  read.error = applySettings(settingsOf(read.value), text, name);
  return read;
}

Result<ExportConfiguration> readExportConfiguration(const ExportOptions& options) {
  const bool isNamed = !options.configurationFile.empty();
  Result<ExportConfiguration> read;
  read.error =
      readSettings(settingsOf(read.value), isNamed ? options.configurationFile : options.usualConfigurationFile);
  const bool isMissing = read.error.code() == ENOENT || read.error.code() == ENOTDIR;
  return !isNamed && isMissing ? Result<ExportConfiguration>() : std::move(read);
}

}  // namespace tarn::fleet
