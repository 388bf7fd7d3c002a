// SPDX-License-Identifier: Apache-2.0
// HostSetup: what the service reads and takes hold of before anything of it runs: its settings, the right to its socket
// and to its state directory, its log.
//
// Owned by the entry point; the platform stands on it. Threads: one, before all others.
//
// Order: settings, state directory, signals, the right to the socket, the lock on the state directory, the log. What
// another service works on is only touched once it is known that there is none.
#pragma once

#include <memory>

#include "host/log/LogFloodGuard.h"
#include "host/log/LogSessionIds.h"
#include "host/log/QueuedLog.h"
#include "host/loop/SignalSource.h"
#include "host/machine/LinuxClock.h"
#include "host/settings/HostConfiguration.h"
#include "host/settings/JsonDeviceProperties.h"
#include "host/settings/ServiceOptions.h"
#include "host/socket/ListenSocket.h"
#include "host/system/FileLock.h"
#include "plist/Result.h"

namespace tarn::linux_host {

class HostSetup {
 public:
  HostSetup() = default;
  HostSetup(const HostSetup&) = delete;
  HostSetup& operator=(const HostSetup&) = delete;

  // Called once. An error tells what is in the way, in one line for whoever started the service, and its code is the
  // exit status (78 for settings, else 1); then nothing else may be used. Also takes write permission for the group and
  // all for others out of the process's mask. May wait some seconds for a service that is just ending.
  [[nodiscard]] Status prepare(const ServiceOptions& options);
  // Gives what was logged a last while of half a second to be written, the counts of floods included; the process may
  // end then. Any thread.
  void settleLog();

  // Reads the configuration as it is now, checked whole; what an option says stands in it in the place of what the file
  // says. Once prepared. Threads: any.
  Result<HostConfiguration> readConfiguration() const;
  // Logs from this level on. Once prepared. Threads: any.
  void setLogLevel(platform::LogLevel level) noexcept;

  // What was read: the file's settings, or the defaults without one.
  HostConfiguration configuration;
  JsonDeviceProperties deviceProperties;
  // Blocked from here on; served once SignalSource::start() was called.
  std::shared_ptr<SignalSource> signals;
  // Handed over, or claimed and not bound yet; the platform takes them. There is an admin socket where one was handed
  // over, named or is wanted by the configuration.
  ListenSockets sockets;
  LinuxClock clock;
  // By what the log names sessions; the platform says where they go on from.
  LogSessionIds sessionIds;
  // The guard against floods, in front of the queue.
  std::unique_ptr<LogFloodGuard> log;

 private:
  // With its drop-ins. A file that is named must be there; the installed ones may be absent.
  Status readSettings();

  ServiceOptions options_;

  // Held for the life of the process.
  FileLock stateLock_;
  // The log itself, to which the guard hands on.
  std::unique_ptr<QueuedLog> queuedLog_;
};

}  // namespace tarn::linux_host
