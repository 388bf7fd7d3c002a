// Where the service and its tool find each other when nobody names a place. Threads: any.
#pragma once

#include <optional>
#include <string>

namespace tarn::linux_host {

// What the defaults depend on; unset and relative variables don't count.
struct HostEnvironment {
  bool isRoot = false;
  std::string runtimeDirectory;  // XDG_RUNTIME_DIR
  std::string stateHome;         // XDG_STATE_HOME
  std::string home;              // HOME

  // That of this process.
  static HostEnvironment current();
};

// $XDG_RUNTIME_DIR/tarnreporting.sock, for root /run/tarnreporting/socket; nothing when there is no such variable.
std::optional<std::string> defaultSocketPath(const HostEnvironment& environment);
// $XDG_STATE_HOME/tarnreporting, without it ~/.local/state/tarnreporting, for root /var/lib/tarnreporting; nothing when
// there is no home either.
std::optional<std::string> defaultStateDirectory(const HostEnvironment& environment);

}  // namespace tarn::linux_host
