// SPDX-License-Identifier: Apache-2.0
#include "adapters/pipewire/AdapterOptions.h"

#include <CLI/CLI.hpp>
#include <algorithm>
#include <utility>

namespace tarn::streams {

namespace {

// What the two say of themselves.
struct Words {
  const char* program;
  const char* configuration;
  const char* purpose;
  const char* footer;
};
constexpr Words kPipeWire{
    "tarnreporting-pipewire", "pipewire.toml", "Reports every audio stream of PipeWire to the reporting service.",
    "It looks at properties, states and links, never at sound. PipeWire and the service may come and go.\n"
    "\n"
    "Exit status: 0 after SIGTERM, SIGINT, --once, --help and --version; 1 when it can't look at PipeWire at all or\n"
    "--once finds none; 64 for wrong usage; 78 for a wrong configuration file."};
constexpr Words kAlsa{
    "tarnreporting-alsa", "alsa.toml",
    "Reports what programs play and record by ALSA, past any sound server, to the reporting service.",
    "It looks at the kernel's texts on sound cards, never at sound, and opens no device. Cards and the service may\n"
    "come and go.\n"
    "\n"
    "Exit status: 0 after SIGTERM, SIGINT, --once, --help and --version; 1 when it can't report; 64 for wrong usage;\n"
    "78 for a wrong configuration file."};

const Words& wordsOf(Adapter adapter) {
  return adapter == Adapter::PipeWire ? kPipeWire : kAlsa;
}

std::string versionOf(Adapter adapter) {
  return std::string(wordsOf(adapter).program) + " " TARN_VERSION;
}

constexpr double kLeastSeconds = 0.01;
constexpr double kMostSeconds = 3600;

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

void addOwnOptions(CLI::App& app, AdapterOptionTexts& raw, Adapter adapter) {
  if (adapter == Adapter::PipeWire) {
    app.add_option("--remote", raw.remote, "Name of the PipeWire to look at (default: that of its own configuration)")
        ->type_name("NAME")
        ->check(checkNotEmpty);
    return;
  }
  app.add_option("--interval", raw.interval, "How often it looks, from 0.01 to 3600 (default: 1)")
      ->type_name("SECONDS")
      ->check(CLI::Range(kLeastSeconds, kMostSeconds));
  app.add_option("--proc", raw.proc, "Folder of the kernel's texts (default: /proc)")
      ->type_name("FOLDER")
      ->check(checkNotEmpty);
}

void addOptions(CLI::App& app, AdapterOptionTexts& raw, Adapter adapter) {
  app.add_option("--config", raw.configurationFile,
                 std::string("Configuration file, TOML (default: tarnreporting/") + configurationNameOf(adapter) +
                     " in $XDG_CONFIG_HOME or ~/.config, if there is one)")
      ->type_name("FILE")
      ->check(checkNotEmpty);
  app.add_option("--socket", raw.socket,
                 "Socket of the service (default: $TARNREPORTING_SOCKET, else the user's, else the system's)")
      ->type_name("PATH")
      ->check(checkNotEmpty);
  addOwnOptions(app, raw, adapter);
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

const char* programOf(Adapter adapter) {
  return wordsOf(adapter).program;
}

const char* configurationNameOf(Adapter adapter) {
  return wordsOf(adapter).configuration;
}

void describeAdapterCommand(Adapter adapter, CLI::App& app, AdapterOptionTexts& texts) {
  app.name(programOf(adapter));
  app.description(wordsOf(adapter).purpose);
  addOptions(app, texts, adapter);
  app.set_help_flag("--help", "Print this help and exit");
  app.set_version_flag("--version", versionOf(adapter), "Print the version and exit");
  app.footer(wordsOf(adapter).footer);
  app.get_formatter()->column_width(38);
}

AdapterCommand parseAdapterCommand(Adapter adapter, int argumentCount, const char* const* arguments) {
  CLI::App app;
  AdapterOptionTexts raw;
  describeAdapterCommand(adapter, app, raw);
  try {
    app.parse(argumentCount, arguments);
  } catch (const CLI::CallForHelp&) {
    return {std::nullopt, app.help(), {}};
  } catch (const CLI::CallForVersion&) {
    return {std::nullopt, versionOf(adapter) + "\n", {}};
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
  options.proc = std::move(raw.proc);
  options.intervalMilliseconds = static_cast<std::int64_t>(raw.interval * 1000.0);
  options.once = raw.once;
  options.print = raw.print;
  options.logLevel = levelNamed(raw.logLevel).value_or(LogLevel::Default);
  return {std::move(options), {}, {}};
}

}  // namespace tarn::streams
