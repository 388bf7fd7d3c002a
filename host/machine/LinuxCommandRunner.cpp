// SPDX-License-Identifier: Apache-2.0
#include "host/machine/LinuxCommandRunner.h"

#include <fcntl.h>
#include <poll.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <csignal>
#include <string>
#include <utility>

#include "host/system/SystemError.h"
#include "host/system/UniqueDescriptor.h"

namespace tarn::linux_host {

namespace {

using SteadyClock = std::chrono::steady_clock;
using platform::CommandEnd;

// How long the end of a command that closed its output may go unnoticed.
constexpr std::chrono::milliseconds kEndPause{5};

// Milliseconds to `deadline`, rounded up so that a wait doesn't end before it; 0 once it has passed.
int millisecondsUntil(SteadyClock::time_point deadline) {
  const auto left = std::chrono::ceil<std::chrono::milliseconds>(deadline - SteadyClock::now()).count();
  return static_cast<int>(std::clamp<decltype(left)>(left, 0, 60'000));
}

class RunningShell final : public platform::RunningCommand {
 public:
  RunningShell(pid_t process, UniqueDescriptor output, SteadyClock::time_point deadline)
      : process_(process), output_(std::move(output)), deadline_(deadline) {}
  ~RunningShell() override {
    if (process_ > 0) {
      kill();
      reap(0);
    }
  }
  RunningShell(const RunningShell&) = delete;
  RunningShell& operator=(const RunningShell&) = delete;

  std::optional<std::string> readLine(std::size_t mostBytes) override {
    if (mostBytes == 0) return std::nullopt;
    for (std::size_t searched = 0;;) {
      const auto newline = unread_.find('\n', searched);
      if (newline != std::string::npos) return take(std::min(newline + 1, mostBytes));
      if (unread_.size() >= mostBytes) return take(mostBytes);
      searched = unread_.size();
      if (!readMore()) break;
    }
    if (unread_.empty()) return std::nullopt;
    return take(std::min(unread_.size(), mostBytes));
  }

  CommandEnd close() override {
    if (process_ <= 0) return end_;
    output_.reset();
    while (!timedOut_ && !reap(WNOHANG)) {
      timedOut_ = SteadyClock::now() >= deadline_;
      ::poll(nullptr, 0, timedOut_ ? 0 : static_cast<int>(kEndPause.count()));
    }
    if (process_ > 0) {
      kill();
      reap(0);
    }
    if (timedOut_) {
      end_ = {CommandEnd::Kind::TimedOut, 0};
    }
    return end_;
  }

 private:
  std::string take(std::size_t bytes) {
    std::string line = unread_.substr(0, bytes);
    unread_.erase(0, bytes);
    return line;
  }

  // Waits for output; false at its end, which the deadline also is.
  bool readMore() {
    while (output_) {
      pollfd wanted{output_.get(), POLLIN, 0};
      const int wait = millisecondsUntil(deadline_);
      const int ready = ::poll(&wanted, 1, wait);
      if (ready > 0) {
        std::array<char, 4096> block{};
        const ssize_t got = ::read(output_.get(), block.data(), block.size());
        if (got > 0) {
          unread_.append(block.data(), static_cast<std::size_t>(got));
          return true;
        }
        if (got == 0 || errno != EINTR) {
          output_.reset();
        }
      } else if (ready == 0 && wait == 0) {
        timedOut_ = true;
        output_.reset();
      }
    }
    return false;
  }

  void kill() const { ::kill(-process_, SIGKILL); }

  // Collects the shell's exit status; false while it runs.
  bool reap(int options) {
    int status = 0;
    pid_t reaped = 0;
    do {
      reaped = ::waitpid(process_, &status, options);
    } while (reaped < 0 && errno == EINTR);
    if (reaped == 0) return false;
    process_ = 0;
    if (reaped > 0 && WIFSIGNALED(status)) {
      end_ = {CommandEnd::Kind::Signalled, WTERMSIG(status)};
    } else if (reaped > 0) {
      end_ = {CommandEnd::Kind::Exited, WEXITSTATUS(status)};
    }
    return true;
  }

  pid_t process_;  // 0 once its end is known
  UniqueDescriptor output_;
  const SteadyClock::time_point deadline_;
  std::string unread_;
  bool timedOut_ = false;
  CommandEnd end_;
};

// What a new process is set up with. The calls fail only when there is no memory for their lists.
class SpawnPlan {
 public:
  explicit SpawnPlan(int output) {
    ::posix_spawn_file_actions_init(&actions_);
    ::posix_spawn_file_actions_addopen(&actions_, STDIN_FILENO, "/dev/null", O_RDONLY, 0);
    ::posix_spawn_file_actions_adddup2(&actions_, output, STDOUT_FILENO);
    // The service's own error output may be its log; a tool must not write into that.
    ::posix_spawn_file_actions_addopen(&actions_, STDERR_FILENO, "/dev/null", O_WRONLY, 0);
    // The service may block or ignore signals that a tool expects to get.
    sigset_t signals;
    ::sigemptyset(&signals);
    ::posix_spawnattr_init(&attributes_);
    ::posix_spawnattr_setsigmask(&attributes_, &signals);
    ::sigfillset(&signals);
    ::posix_spawnattr_setsigdefault(&attributes_, &signals);
    ::posix_spawnattr_setpgroup(&attributes_, 0);
    ::posix_spawnattr_setflags(&attributes_, POSIX_SPAWN_SETPGROUP | POSIX_SPAWN_SETSIGMASK | POSIX_SPAWN_SETSIGDEF);
  }
  ~SpawnPlan() {
    ::posix_spawn_file_actions_destroy(&actions_);
    ::posix_spawnattr_destroy(&attributes_);
  }
  SpawnPlan(const SpawnPlan&) = delete;
  SpawnPlan& operator=(const SpawnPlan&) = delete;

  Result<pid_t> spawn(const char* path, char* const arguments[]) const {
    pid_t process = 0;
    const int error = ::posix_spawn(&process, path, &actions_, &attributes_, arguments, environ);
    return {process, error == 0 ? Status() : systemError(error)};
  }

 private:
  posix_spawn_file_actions_t actions_{};
  posix_spawnattr_t attributes_{};
};

}  // namespace

Result<std::unique_ptr<platform::RunningCommand>> LinuxCommandRunner::start(std::string_view commandText,
                                                                            std::chrono::nanoseconds timeLimit) {
  const auto deadline = SteadyClock::now() + timeLimit;
  std::array<int, 2> ends{};
  if (::pipe2(ends.data(), O_CLOEXEC) != 0) return {nullptr, lastSystemError()};
  UniqueDescriptor readEnd(ends[0]);
  const UniqueDescriptor writeEnd(ends[1]);

  std::string shell = "sh";
  std::string option = "-c";
  std::string command(commandText);
  const std::array<char*, 4> arguments{shell.data(), option.data(), command.data(), nullptr};
  Result<pid_t> process = SpawnPlan(writeEnd.get()).spawn("/bin/sh", arguments.data());
  if (process.failed()) return {nullptr, std::move(process.error)};
  return {std::make_unique<RunningShell>(process.value, std::move(readEnd), deadline), {}};
}

}  // namespace tarn::linux_host
