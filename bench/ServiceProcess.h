// SPDX-License-Identifier: Apache-2.0
// ServiceProcess: a tarnreportingd of its own, on a private socket and state directory, ended with the object.
// What it writes to stderr or its log is shown only when it fails.
#pragma once

#include <sys/types.h>

#include <string>

#include "bench/Processes.h"

namespace tarn::bench {

// How a run of the program measures.
struct Settings {
  bool quick = false;
  int rounds = 7;           // how often each figure is measured
  std::string directory;    // where the services keep their state
  std::string serviceFile;  // the program of the service

  // A count for a full run, cut to a small part for a quick one.
  std::size_t count(std::size_t full) const { return quick ? full / 50 + 1 : full; }
};

struct ServiceSetup {
  bool recordsEvents = false;    // whether somebody wants every event, or nobody any
  int maxMegabytes = 65536;      // retention; the default never bites here
  bool mirrorsSessions = false;  // whether the real-time-communication reporting service takes sessions
  long mostFileBytes = 0;        // no file of its may grow beyond that, as if the disk were full; 0: any may
};

class ServiceProcess {
 public:
  // Waits until the service accepts connections.
  ServiceProcess(const Settings& settings, const ServiceSetup& setup);
  ~ServiceProcess();
  ServiceProcess(const ServiceProcess&) = delete;
  ServiceProcess& operator=(const ServiceProcess&) = delete;

  // Kills it and starts it anew.
  void killAndStart();

  pid_t id() const noexcept { return id_; }
  std::string socketPath() const { return directory_.path() + "/socket"; }
  std::string stateDirectory() const { return directory_.path() + "/state"; }

 private:
  void writeConfiguration(const ServiceSetup& setup) const;
  void start();
  void showOutput() const;
  std::string outputPath() const { return directory_.path() + "/stderr"; }
  std::string logPath() const { return directory_.path() + "/log"; }
  void waitUntilReady() const;

  TemporaryDirectory directory_;
  const std::string program_;
  const long mostFileBytes_;
  pid_t id_ = -1;
};

}  // namespace tarn::bench
