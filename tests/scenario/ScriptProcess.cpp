// SPDX-License-Identifier: Apache-2.0
#include "tests/scenario/ScriptProcess.h"

#include <fcntl.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <csignal>
#include <stdexcept>
#include <system_error>
#include <utility>

namespace tarn::scenario {

ScriptProcess::ScriptProcess(const Service& service, std::string script, const std::string& directory)
    : script_(std::move(script)), outputBase_(directory + "/" + script_.substr(script_.find_last_of('/') + 1)) {
  std::array<std::string, 7> words = {service.ctl, "--socket", service.socket, "--state-dir", service.stateDirectory,
                                      "run",       script_};
  std::array<char*, 8> arguments{};
  for (std::size_t index = 0; index < words.size(); ++index) {
    arguments[index] = words[index].data();
  }
  constexpr int kFlags = O_WRONLY | O_CREAT | O_TRUNC;
  posix_spawn_file_actions_t actions;
  ::posix_spawn_file_actions_init(&actions);
  ::posix_spawn_file_actions_addopen(&actions, STDIN_FILENO, "/dev/null", O_RDONLY, 0);
  ::posix_spawn_file_actions_addopen(&actions, STDOUT_FILENO, outputPath().c_str(), kFlags, 0600);
  ::posix_spawn_file_actions_addopen(&actions, STDERR_FILENO, complaintsPath().c_str(), kFlags, 0600);
  const int error = ::posix_spawn(&process_, service.ctl.c_str(), &actions, nullptr, arguments.data(), environ);
  ::posix_spawn_file_actions_destroy(&actions);
  if (error != 0) {
    throw std::runtime_error("can't start " + service.ctl + ": " + std::generic_category().message(error));
  }
}

ScriptProcess::ScriptProcess(ScriptProcess&& other) noexcept
    : script_(std::move(other.script_)),
      outputBase_(std::move(other.outputBase_)),
      process_(std::exchange(other.process_, -1)) {}

ScriptProcess::~ScriptProcess() {
  if (process_ > 0) {
    ::kill(process_, SIGKILL);
    wait();
  }
}

int ScriptProcess::wait() {
  int status = 0;
  ::waitpid(std::exchange(process_, -1), &status, 0);
  return WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status);
}

}  // namespace tarn::scenario
