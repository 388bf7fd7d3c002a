// SPDX-License-Identifier: Apache-2.0
// Where the service and its tool find each other when nobody names a place. Both ask here, so they agree.
//
// Pure functions of the environment, which current() alone looks at: tests make their own. Nothing is asked of the
// disk, so a path that is given need not be there. Threads: any.
#pragma once

#include <optional>
#include <string>
#include <vector>

namespace tarn::linux_host {

// What the defaults depend on; unset and relative variables don't count.
struct HostEnvironment {
  bool isRoot = false;
  std::string runtimeDirectory;    // XDG_RUNTIME_DIR
  std::string stateHome;           // XDG_STATE_HOME
  std::string home;                // HOME
  std::string program = {};        // the path of this program
  std::string serviceSocket = {};  // TARNREPORTING_SOCKET: where clients look for the service

  // That of this process. To be asked before other threads change variables.
  static HostEnvironment current();
};

// $XDG_RUNTIME_DIR/tarnreporting.sock, for root /run/tarnreporting/socket; nothing when there is no such variable.
std::optional<std::string> defaultSocketPath(const HostEnvironment& environment);
// The admin socket that belongs to an ordinary one: its path followed by "-admin".
std::string adminSocketPath(const std::string& socketPath);
// Where a client looks for the service, in this order: the place that the environment names, and then nothing else;
// without that the user's and the system's. Never empty.
std::vector<std::string> serviceSocketPaths(const HostEnvironment& environment);
// The configuration of the installation that the program is part of: of PREFIX/bin that is
// PREFIX/etc/tarnreporting/tarnreportingd.toml, but /etc/... for the prefix /usr and /etc/PREFIX/... for one in /opt.
// Empty when the program's place isn't known.
std::string defaultConfigurationFile(const HostEnvironment& environment);
// A file beside that configuration: "device.json" tells what the device is. Empty when the program's place isn't known.
std::string besideDefaultConfiguration(const HostEnvironment& environment, std::string_view name);
std::string defaultDevicePropertiesFile(const HostEnvironment& environment);
// $XDG_STATE_HOME/tarnreporting, without it ~/.local/state/tarnreporting, for root /var/lib/tarnreporting; nothing when
// there is no home either.
std::optional<std::string> defaultStateDirectory(const HostEnvironment& environment);

}  // namespace tarn::linux_host
