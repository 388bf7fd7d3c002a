// SPDX-License-Identifier: Apache-2.0
// tarnreporting-export: options, configuration, then what they ask for. docs/fleet.md is its manual.
#include <sodium.h>

#include <cstdio>
#include <iostream>
#include <utility>

#include "fleet/export/ExportOptions.h"
#include "fleet/export/ExportProgram.h"
#include "fleet/export/Health.h"
#include "fleet/export/ShowCommand.h"
#include "host/settings/HostPaths.h"
#include "host/system/SmallFile.h"
#include "host/system/SystemError.h"
#include "tools/ctl/terminal/TimeOption.h"

namespace tarn::fleet {
namespace {

constexpr std::size_t kMostKeyFileBytes = 4096;
constexpr const char* kStore = "/recorder.sqlite3";

int refuse(const Error& error, int status) {
  std::fprintf(stderr, "tarnreporting-export: %s\n", error.text.c_str());
  return status;
}

Result<FleetKey> readKey(const std::string& path) {
  const Result<std::string> text = linux_host::readSmallFile(path, kMostKeyFileBytes);
  if (text.failed()) return {{}, linux_host::errorOf(path, *text.error)};
  Result<FleetKey> key = FleetKey::parse(text.value);
  if (key.failed()) return {{}, linux_host::errorOf(path, *key.error)};
  return key;
}

// The device's name. Blanks around what the file says are its line's.
Result<std::string> readDevice(const FleetKey& key, const std::string& path) {
  const Result<std::string> text = linux_host::readSmallFile(path, kMostKeyFileBytes);
  if (text.failed()) return {{}, linux_host::errorOf(path, *text.error)};
  const std::string id = text.value.substr(0, text.value.find_last_not_of(" \r\n") + 1);
  if (id.empty()) return {{}, Error{0, path + ": says nothing"}};
  return {key.deviceOf(id), {}};
}

int show(const ExportOptions& options, const ExportConfiguration& configuration) {
  std::optional<double> since;
  const double now = ctl::currentTime();
  if (options.since) {
    const Result<double> time = ctl::parseTime(*options.since, now, ctl::userTimeZone());
    if (time.failed()) return refuse({0, "--since: " + time.error->text}, kExitUsage);
    since = time.value;
  }
  Result<FleetKey> key = readKey(configuration.keyFile);
  if (key.failed()) {
    std::fprintf(stderr, "tarnreporting-export: %s; hashes here are of a key made for this look\n",
                 key.error->text.c_str());
    key.value = FleetKey::random();
  }
  const Result<std::string> device = readDevice(key.value, options.machineId);
  if (device.failed()) return refuse(*device.error, kExitFailure);
  StoreTail store(options.stateDirectory + kStore);
  PrivacySieve sieve(configuration.rules, key.value);
  const Status shown = showStore(store, sieve, device.value, since, now, std::cout);
  std::cout.flush();
  return shown.failed() ? refuse(*shown, kExitFailure) : 0;
}

int tellStatus(const ExportOptions& options, Mode mode) {
  StoreTail store(options.stateDirectory + kStore);
  const Status told = showStatus(options, mode, store, ctl::currentTime(), std::cout);
  std::cout.flush();
  return told.failed() ? refuse(*told, kExitFailure) : 0;
}

int run(const ExportOptions& options) {
  const Result<ExportConfiguration> configuration = readExportConfiguration(options);
  if (configuration.failed()) return refuse(*configuration.error, kExitConfiguration);
  if (options.show) return show(options, configuration.value);
  if (options.status) return tellStatus(options, configuration.value.rules.mode);
  // Before anything else is done: no socket, no file.
  if (configuration.value.rules.mode == Mode::Off) return 0;
  const Result<FleetKey> key = readKey(configuration.value.keyFile);
  if (key.failed()) return refuse(*key.error, kExitConfiguration);
  const Result<std::string> device = readDevice(key.value, options.machineId);
  if (device.failed()) return refuse(*device.error, kExitFailure);
  return runExport(options, configuration.value, key.value, device.value);
}

}  // namespace
}  // namespace tarn::fleet

int main(int argumentCount, char** arguments) {
  using namespace tarn::fleet;
  ExportCommand command = parseExportCommand(argumentCount, arguments);
  if (command.usage.failed()) return refuse(*command.usage, kExitUsage);
  if (!command.options) {
    std::fputs(command.output.c_str(), stdout);
    return 0;
  }
  if (sodium_init() < 0) return refuse({0, "libsodium can't be used here"}, kExitFailure);
  const std::string usual = besideDefaultConfiguration(tarn::linux_host::HostEnvironment::current(), "export.toml");
  if (!usual.empty()) {
    command.options->usualConfigurationFile = usual;
  }
  return run(*command.options);
}
