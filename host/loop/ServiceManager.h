// ServiceManager: what the process tells the service manager that started it. Without one all of it does nothing.
// Threads: any.
#pragma once

#include <chrono>
#include <optional>

namespace tarn::linux_host {

class ServiceManager {
 public:
  virtual ~ServiceManager() = default;
  // The listener accepts.
  virtual void notifyReady();
  // The service is about to end: from now on it takes at most so long.
  virtual void notifyStopping(std::chrono::microseconds longest);
  virtual void notifyWatchdog();
  // How long the manager lets the service be silent; nothing when it doesn't watch this process.
  virtual std::optional<std::chrono::microseconds> watchdogInterval() const;
};

}  // namespace tarn::linux_host
