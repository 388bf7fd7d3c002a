// SPDX-License-Identifier: Apache-2.0
// ServiceManager: what the process tells the service manager that started it, over the socket that $NOTIFY_SOCKET
// names. Without one all of it does nothing; that a message didn't arrive isn't told, since the service can't do
// anything about it.
//
// A class of its own so that tests see what would be told. Threads: any. Each call is one datagram.
#pragma once

#include <chrono>
#include <optional>
#include <string>

namespace tarn::linux_host {

class ServiceManager {
 public:
  virtual ~ServiceManager() = default;
  // The listener accepts, or a reload is over. A manager that waits for it counts that as done.
  virtual void notifyReady();
  // The configuration is read anew, from this moment of the monotonic clock on, until notifyReady().
  virtual void notifyReloading(std::chrono::microseconds monotonicNow);
  // What the service is at, in one line for people.
  virtual void notifyStatus(const std::string& line);
  // Whether anybody is told; nobody is when no manager started the process.
  virtual bool listens() const;
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
