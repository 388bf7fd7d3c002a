// SPDX-License-Identifier: Apache-2.0
#include "fleet/collect/CollectOptions.h"

#include <CLI/CLI.hpp>
#include <algorithm>
#include <cerrno>
#include <utility>

#include "fleet/program/Settings.h"

namespace tarn::fleet {

namespace {

constexpr const char* kProgram = "tarnreporting-collect";
constexpr const char* kUsualFile = "/etc/tarnreporting/collect.toml";
constexpr int kExitUsage = 64;
constexpr const char* kFooter =
    "Any number of them may work side by side, on one machine or many.\n"
    "\n"
    "Exit status: 0 after SIGTERM, SIGINT, --migrate, --from, --once, --help and --version; 1 when it can't do what "
    "was\n"
    "asked; 64 for wrong usage; 78 for a wrong configuration file.";

std::string checkNotEmpty(const std::string& text) {
  return text.empty() ? "must not be empty" : "";
}

LogLevel levelNamed(const std::string& name) {
  if (name == "debug") return LogLevel::Debug;
  return name == "error" ? LogLevel::Error : LogLevel::Default;
}

std::string versionText() {
  return std::string(kProgram) + " " TARN_VERSION;
}

CollectCommand refuse(std::string text) {
  std::replace(text.begin(), text.end(), '\n', ' ');
  return {std::nullopt, {}, Error{kExitUsage, std::move(text)}};
}

Settings settingsOf(CollectConfiguration& configuration) {
  ServerSettings& server = configuration.server;
  return {{"server", "urls", takeServers(server.urls)},
          {"server", "subject", takeText(server.subject)},
          {"server", "stream", takeText(configuration.stream)},
          {"server", "consumer", takeText(configuration.consumer)},
          {"server", "max_unacknowledged", takeWhole(configuration.mostUnacknowledged, 1, 1'000'000)},
          {"server", "answer_seconds", takeWhole(configuration.answerSeconds, 1, 600)},
          {"server", "again_seconds", takeWhole(configuration.againSeconds, 0, 86'400)},
          {"server", "credentials_file", takeText(server.credentialsFile)},
          {"server", "authority_file", takeText(server.authorityFile)},
          {"server", "certificate_file", takeText(server.certificateFile)},
          {"server", "certificate_key_file", takeText(server.keyFile)},
          {"database", "url", takeText(configuration.database)},
          {"database", "group_messages", takeWhole(configuration.groupMessages, 1, 1024)},
          {"retention", "days", takeWhole(configuration.retentionDays, 0, 36500)}};
}

}  // namespace

void describeCollectCommand(CLI::App& app, CollectOptionTexts& texts) {
  CollectOptions& options = texts.options;
  app.name(kProgram);
  app.description("Takes what devices sent to a stream and puts it into a PostgreSQL database, each record once.");
  app.add_option("--config", options.configurationFile,
                 std::string("Configuration file, TOML (default: ") + kUsualFile + ", if there is one)")
      ->type_name("FILE")
      ->check(checkNotEmpty);
  CLI::Option* const migrate =
      app.add_flag("--migrate", options.migrate, "Bring the database's layout up to date and exit");
  app.add_flag("--keep-layout", options.keepLayout, "Don't bring it up to date at the start; fail where it isn't")
      ->excludes(migrate);
  CLI::Option* const from = app.add_option("--from", options.folder, "Take messages from files *.tnf and exit")
                                ->type_name("FOLDER")
                                ->check(checkNotEmpty)
                                ->excludes(migrate);
  app.add_flag("--once", options.once, "Exit when nothing waits in the stream")->excludes(migrate)->excludes(from);
  app.add_option("--log-level", texts.logLevel, "Least level that is logged: debug, default or error")
      ->capture_default_str()
      ->type_name("LEVEL")
      ->check(CLI::IsMember({"debug", "default", "error"}));
  app.set_help_flag("--help", "Print this help and exit");
  app.set_version_flag("--version", versionText(), "Print the version and exit");
  app.footer(kFooter);
  app.get_formatter()->column_width(38);
}

CollectCommand parseCollectCommand(int argumentCount, const char* const* arguments) {
  CLI::App app;
  CollectOptionTexts texts;
  describeCollectCommand(app, texts);
  try {
    app.parse(argumentCount, arguments);
  } catch (const CLI::CallForHelp&) {
    return {std::nullopt, app.help(), {}};
  } catch (const CLI::CallForVersion&) {
    return {std::nullopt, versionText() + "\n", {}};
  } catch (const CLI::ParseError& fault) {
    return refuse(fault.what());
  }
  texts.options.logLevel = levelNamed(texts.logLevel);
  return {std::move(texts.options), {}, {}};
}

Result<CollectConfiguration> parseCollectConfiguration(std::string_view text, std::string_view name) {
  Result<CollectConfiguration> read;
  read.error = applySettings(settingsOf(read.value), text, name);
  return read;
}

Result<CollectConfiguration> readCollectConfiguration(const CollectOptions& options) {
  const bool isNamed = !options.configurationFile.empty();
  Result<CollectConfiguration> read;
  read.error = readSettings(settingsOf(read.value), isNamed ? options.configurationFile : kUsualFile);
  const bool isMissing = read.error.code() == ENOENT || read.error.code() == ENOTDIR;
  return !isNamed && isMissing ? Result<CollectConfiguration>() : std::move(read);
}

}  // namespace tarn::fleet
