// SPDX-License-Identifier: Apache-2.0
// CommandRunner: runs a tool of the device through the system shell and gives what it prints.
//
// Threads: any; one running command is for one thread at a time, several may run at once. readLine and close block.
#pragma once

#include <chrono>
#include <cstddef>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "plist/Result.h"

namespace tarn::platform {

// How a command ended: what kind of end, and the number that goes with it.
struct CommandEnd {
  enum class Kind {
    Exited,     // by itself, with `status`
    Signalled,  // by the signal `status` that somebody else sent
    TimedOut,   // ended by us, because its time was up
  };
  // What a shell exits with when it can't run the command that it was given.
  static constexpr int kNotExecutable = 126;
  static constexpr int kNotFound = 127;

  // By itself, unless it is told otherwise.
  Kind kind = Kind::Exited;
  // An exit status, a signal's number, or 0 when its time was up.
  int status = 0;
};

// A command and the pipe from its standard output. Destroying it ends the command and all that it started, and waits
// for that. The owner reads it to its end or not, as it likes: what isn't read holds the command up, since a pipe has
// little room.
class RunningCommand {
 public:
  virtual ~RunningCommand() = default;
  // The next line with its newline, or the next `mostBytes` of a longer one: bytes as they came, UTF-8 or not. Nothing
  // at the end of the output, which is also where the command's time is up: what it printed until then has been given.
  // Nothing for 0 bytes.
  virtual std::optional<std::string> readLine(std::size_t mostBytes) = 0;
  // Closes the pipe, waits for the end, at most until the command's time is up, then ends it with all that it started.
  // A second call gives the same end at once.
  virtual CommandEnd close() = 0;
};

// Owned by the platform. For workers that need a tool of the device, on queues that may block.
class CommandRunner {
 public:
  virtual ~CommandRunner() = default;
  // Hands `commandText` to the system shell. Its standard input is empty and its error output is dropped. `timeLimit`
  // counts from here. A tool that doesn't exist is not an error here: the shell runs, prints nothing and exits with
  // kNotFound.
  virtual Result<std::unique_ptr<RunningCommand>> start(std::string_view commandText,
                                                        std::chrono::nanoseconds timeLimit) = 0;
};

}  // namespace tarn::platform
