// SPDX-License-Identifier: Apache-2.0
#include "host/settings/HostPaths.h"

#include <unistd.h>

#include <cstdlib>

#include "host/system/ProcessExecutable.h"

namespace tarn::linux_host {

namespace {

constexpr const char* kSystemSocket = "/run/tarnreporting/socket";

std::string variable(const char* name) {
  const char* value = std::getenv(name);
  return value == nullptr ? std::string() : std::string(value);
}

bool counts(const std::string& folder) {
  return folder.starts_with('/');
}

}  // namespace

HostEnvironment HostEnvironment::current() {
  return {::geteuid() == 0, variable("XDG_RUNTIME_DIR"), variable("XDG_STATE_HOME"),
          variable("HOME"), executableOf(::getpid()),    variable("TARNREPORTING_SOCKET")};
}

std::optional<std::string> defaultSocketPath(const HostEnvironment& environment) {
  if (environment.isRoot) return kSystemSocket;
  if (!counts(environment.runtimeDirectory)) return std::nullopt;
  return environment.runtimeDirectory + "/tarnreporting.sock";
}

std::string adminSocketPath(const std::string& socketPath) {
  return socketPath + "-admin";
}

std::vector<std::string> serviceSocketPaths(const HostEnvironment& environment) {
  if (!environment.serviceSocket.empty()) return {environment.serviceSocket};
  std::vector<std::string> paths;
  if (const auto own = defaultSocketPath(environment); own && *own != kSystemSocket) {
    paths.push_back(*own);
  }
  paths.emplace_back(kSystemSocket);
  return paths;
}

std::string defaultConfigurationFile(const HostEnvironment& environment) {
  const std::string folder = environment.program.substr(0, environment.program.rfind('/') + 1);  // PREFIX/bin/
  if (!counts(folder) || folder.size() < 2) return {};
  const std::string prefix = folder.substr(0, folder.rfind('/', folder.size() - 2));
  const std::string place = prefix == "/usr" || prefix.empty() ? "/etc"
                            : prefix.starts_with("/opt/")      ? "/etc" + prefix
                                                               : prefix + "/etc";
  return place + "/tarnreporting/tarnreportingd.toml";
}

std::string besideDefaultConfiguration(const HostEnvironment& environment, std::string_view name) {
  const std::string configuration = defaultConfigurationFile(environment);
  return configuration.empty() ? std::string() : configuration.substr(0, configuration.rfind('/') + 1).append(name);
}

std::string defaultDevicePropertiesFile(const HostEnvironment& environment) {
  return besideDefaultConfiguration(environment, "device.json");
}

std::optional<std::string> defaultStateDirectory(const HostEnvironment& environment) {
  if (environment.isRoot) return "/var/lib/tarnreporting";
  if (counts(environment.stateHome)) return environment.stateHome + "/tarnreporting";
  if (!counts(environment.home)) return std::nullopt;
  return environment.home + "/.local/state/tarnreporting";
}

}  // namespace tarn::linux_host
