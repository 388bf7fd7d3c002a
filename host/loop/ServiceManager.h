// SPDX-License-Identifier: Apache-2.0
// ServiceManager: what the process tells the service manager that started it, over the socket that $NOTIFY_SOCKET
// names. Without one all of it does nothing; that a message didn't arrive isn't told, since the service can't do
// anything about it.
//
// A class of its own so that tests see what would be told. Threads: any. Each call is one datagram.
#pragma once

#include <chrono>
#include <optional>

namespace tarn::linux_host {

class ServiceManager {
 public:
  virtual ~ServiceManager() = default;
  // The listener accepts. Told once; a manager that waits for it counts the start as done.
  virtual void notifyReady();
  // The service is about to end: from now on it takes at most so long. Asks the manager to wait that long before it
  // kills.
  virtual void notifyStopping(std::chrono::microseconds longest);
  // The service is alive. After watchdogInterval() without this the manager ends it and starts it again.
  virtual void notifyWatchdog();
  // How long the manager lets the service be silent; nothing when it doesn't watch this process, as for a child that
  // inherited the environment.
  virtual std::optional<std::chrono::microseconds> watchdogInterval() const;
};

}  // namespace tarn::linux_host
