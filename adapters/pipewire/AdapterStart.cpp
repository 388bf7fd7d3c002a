// SPDX-License-Identifier: Apache-2.0
#include "adapters/pipewire/AdapterStart.h"

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <string>

#include "adapters/pipewire/AdapterConfiguration.h"

namespace tarn::streams {

namespace {

int refuse(Adapter adapter, const Error& error, int status) {
  std::fprintf(stderr, "%s: %s\n", programOf(adapter), error.text.c_str());
  return status;
}

// Of the user, if the environment names a place for it.
std::string defaultConfigurationFile(Adapter adapter) {
  const std::string name = std::string("/tarnreporting/") + configurationNameOf(adapter);
  if (const char* const folder = std::getenv("XDG_CONFIG_HOME"); folder != nullptr && folder[0] == '/') {
    return folder + name;
  }
  const char* const home = std::getenv("HOME");
  return home != nullptr && home[0] == '/' ? home + ("/.config" + name) : "";
}

Result<Rules> rulesOf(Adapter adapter, const AdapterOptions& options) {
  if (options.configurationFile) return readConfiguration(adapter, *options.configurationFile);
  const std::string usual = defaultConfigurationFile(adapter);
  if (usual.empty()) return parseConfiguration(adapter, "", "");
  Result<Rules> rules = readConfiguration(adapter, usual);
  const bool isThere = rules.error.code() != ENOENT && rules.error.code() != ENOTDIR;
  return isThere ? std::move(rules) : parseConfiguration(adapter, "", "");
}

}  // namespace

sigset_t endSignals() {
  sigset_t signals;
  ::sigemptyset(&signals);
  ::sigaddset(&signals, SIGINT);
  ::sigaddset(&signals, SIGTERM);
  return signals;
}

int startAdapter(Adapter adapter, int argumentCount, char** arguments,
                 const std::function<int(const AdapterOptions&, const Rules&)>& work) {
  const AdapterCommand command = parseAdapterCommand(adapter, argumentCount, arguments);
  if (command.usage.failed()) return refuse(adapter, *command.usage, kExitUsage);
  if (!command.options) {
    std::fputs(command.output.c_str(), stdout);
    return 0;
  }
  const Result<Rules> rules = rulesOf(adapter, *command.options);
  if (rules.failed()) return refuse(adapter, *rules.error, kExitConfiguration);
  const sigset_t signals = endSignals();
  ::pthread_sigmask(SIG_BLOCK, &signals, nullptr);
  return work(*command.options, rules.value);
}

}  // namespace tarn::streams
