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

struct CommandEnd {
  enum class Kind {
    Exited,     // by itself, with `status`
    Signalled,  // by the signal `status` that somebody else sent
    TimedOut,   // ended by us, because its time was up
  };
  // What a shell exits with when it can't run the command that it was given.
  static constexpr int kNotExecutable = 126;
  static constexpr int kNotFound = 127;

  Kind kind = Kind::Exited;
  int status = 0;
};

// A command and the pipe from its standard output. Destroying it ends the command and all that it started.
class RunningCommand {
 public:
  virtual ~RunningCommand() = default;
  // The next line with its newline, or the next `mostBytes` of a longer one. Nothing at the end of the output, which is
  // also where the command's time is up: what it printed until then has been given.
  virtual std::optional<std::string> readLine(std::size_t mostBytes) = 0;
  // Closes the pipe, waits for the end, at most until the command's time is up, then ends it with all that it started.
  virtual CommandEnd close() = 0;
};

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
