// SPDX-License-Identifier: Apache-2.0
// tarnreporting-pipewire: options, configuration, then the program. docs/pipewire.md is its manual.
#include <pipewire/pipewire.h>

#include <cerrno>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <string>

#include "adapters/pipewire/AdapterConfiguration.h"
#include "adapters/pipewire/AdapterOptions.h"
#include "adapters/pipewire/Program.h"

namespace tarn::streams {
namespace {

int refuse(const Error& error, int status) {
  std::fprintf(stderr, "tarnreporting-pipewire: %s\n", error.text.c_str());
  return status;
}

// Of the user, if the environment names a place for it.
std::string defaultConfigurationFile() {
  constexpr const char* kName = "/tarnreporting/pipewire.toml";
  if (const char* const folder = std::getenv("XDG_CONFIG_HOME"); folder != nullptr && folder[0] == '/') {
    return std::string(folder) + kName;
  }
  const char* const home = std::getenv("HOME");
  return home != nullptr && home[0] == '/' ? std::string(home) + "/.config" + kName : "";
}

Result<Rules> rulesOf(const AdapterOptions& options) {
  if (options.configurationFile) return readConfiguration(*options.configurationFile);
  const std::string usual = defaultConfigurationFile();
  if (usual.empty()) return {};
  Result<Rules> rules = readConfiguration(usual);
  return rules.error.code() == ENOENT || rules.error.code() == ENOTDIR ? Result<Rules>{} : std::move(rules);
}

// For the loop to take; before any thread is there that they could go to.
void blockSignals() {
  sigset_t signals;
  ::sigemptyset(&signals);
  ::sigaddset(&signals, SIGINT);
  ::sigaddset(&signals, SIGTERM);
  ::pthread_sigmask(SIG_BLOCK, &signals, nullptr);
}

int runAdapter(int argumentCount, char** arguments) {
  const AdapterCommand command = parseAdapterCommand(argumentCount, arguments);
  if (command.usage.failed()) return refuse(*command.usage, kExitUsage);
  if (!command.options) {
    std::fputs(command.output.c_str(), stdout);
    return 0;
  }
  const Result<Rules> rules = rulesOf(*command.options);
  if (rules.failed()) return refuse(*rules.error, kExitConfiguration);
  blockSignals();
  pw_init(nullptr, nullptr);
  if (std::getenv("PIPEWIRE_DEBUG") == nullptr) {
    pw_log_set_level(SPA_LOG_LEVEL_ERROR);  // it warns of modules and ranks that aren't wanted here
  }
  const int status = Program(*command.options, rules.value).run();
  pw_deinit();
  return status;
}

}  // namespace
}  // namespace tarn::streams

int main(int argumentCount, char** arguments) {
  return tarn::streams::runAdapter(argumentCount, arguments);
}
