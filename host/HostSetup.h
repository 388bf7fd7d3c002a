// HostSetup: what the service reads and takes hold of before anything of it runs: its settings, the right to its socket
// and to its state directory, its log.
//
// Owned by the entry point; the platform stands on it. Threads: one, before all others.
#pragma once

#include <memory>

#include "host/log/LogFloodGuard.h"
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
  // exit status; then nothing else may be used.
  [[nodiscard]] Status prepare(const ServiceOptions& options);
  // Gives what was logged a last while to be written; the process may end then.
  void settleLog();

  HostConfiguration configuration;
  JsonDeviceProperties deviceProperties;
  std::shared_ptr<SignalSource> signals;
  ListenSocket socket;
  LinuxClock clock;
  // The guard against floods, in front of the queue.
  std::unique_ptr<LogFloodGuard> log;

 private:
  Status readSettings(const ServiceOptions& options);

  FileLock stateLock_;
  std::unique_ptr<QueuedLog> queuedLog_;
};

}  // namespace tarn::linux_host
