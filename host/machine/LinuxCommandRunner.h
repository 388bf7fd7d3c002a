// LinuxCommandRunner: runs commands with /bin/sh, each in a process group of its own, so that a command that must end
// takes along what it started.
//
// Threads: any.
#pragma once

#include "platform/CommandRunner.h"

namespace tarn::linux_host {

class LinuxCommandRunner final : public platform::CommandRunner {
 public:
  Result<std::unique_ptr<platform::RunningCommand>> start(std::string_view commandText,
                                                          std::chrono::nanoseconds timeLimit) override;
};

}  // namespace tarn::linux_host
