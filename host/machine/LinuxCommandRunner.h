// SPDX-License-Identifier: Apache-2.0
// LinuxCommandRunner: runs commands with /bin/sh, each in a process group of its own, so that a command that must end
// takes along what it started.
//
// A command sees no signal mask or ignored signal of the service's, reads from /dev/null and can't write to the
// service's error stream, which may be its log. Keeps no state. Threads: any.
#pragma once

#include "platform/CommandRunner.h"

namespace tarn::linux_host {

class LinuxCommandRunner final : public platform::CommandRunner {
 public:
  // Returns as soon as the shell is started; the error is that of the pipe or of the spawn (EMFILE, EAGAIN, ENOMEM),
  // with no command beside it. The command holds one descriptor, the reading end of its output. Closing notices its end
  // within 5 ms; when its time is up, or when it is destroyed while it runs, the whole group gets SIGKILL.
  Result<std::unique_ptr<platform::RunningCommand>> start(std::string_view commandText,
                                                          std::chrono::nanoseconds timeLimit) override;
};

}  // namespace tarn::linux_host
