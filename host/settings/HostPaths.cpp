#include "host/settings/HostPaths.h"

#include <unistd.h>

#include <cstdlib>

namespace tarn::linux_host {

namespace {

std::string variable(const char* name) {
  const char* value = std::getenv(name);
  return value == nullptr ? std::string() : std::string(value);
}

bool counts(const std::string& folder) {
  return folder.starts_with('/');
}

}  // namespace

HostEnvironment HostEnvironment::current() {
  return {::geteuid() == 0, variable("XDG_RUNTIME_DIR"), variable("XDG_STATE_HOME"), variable("HOME")};
}

std::optional<std::string> defaultSocketPath(const HostEnvironment& environment) {
  if (environment.isRoot) return "/run/tarnreporting/socket";
  if (!counts(environment.runtimeDirectory)) return std::nullopt;
  return environment.runtimeDirectory + "/tarnreporting.sock";
}

std::optional<std::string> defaultStateDirectory(const HostEnvironment& environment) {
  if (environment.isRoot) return "/var/lib/tarnreporting";
  if (counts(environment.stateHome)) return environment.stateHome + "/tarnreporting";
  if (!counts(environment.home)) return std::nullopt;
  return environment.home + "/.local/state/tarnreporting";
}

}  // namespace tarn::linux_host
