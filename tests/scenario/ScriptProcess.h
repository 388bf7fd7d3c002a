// SPDX-License-Identifier: Apache-2.0
// ScriptProcess: one client process: tarnreportingctl playing one script, its output in files of its own.
//
// Threads: one.
#pragma once

#include <sys/types.h>

#include <string>

namespace tarn::scenario {

struct Service {
  std::string ctl;  // the tarnreportingctl to play with
  std::string socket;
  std::string stateDirectory;
};

class ScriptProcess {
 public:
  // Begins to play `script`. What the program prints goes to files in `directory`. Throws std::runtime_error.
  ScriptProcess(const Service& service, std::string script, const std::string& directory);
  ScriptProcess(const ScriptProcess&) = delete;
  ScriptProcess& operator=(const ScriptProcess&) = delete;
  ScriptProcess(ScriptProcess&&) noexcept;
  ScriptProcess& operator=(ScriptProcess&&) = delete;
  // Ends a process that still runs.
  ~ScriptProcess();

  // Waits for its end; the exit status, or 128 and the signal's number.
  int wait();

  const std::string& script() const { return script_; }
  std::string outputPath() const { return outputBase_ + ".replies"; }
  std::string complaintsPath() const { return outputBase_ + ".complaints"; }

 private:
  std::string script_;
  std::string outputBase_;
  pid_t process_ = -1;
};

}  // namespace tarn::scenario
