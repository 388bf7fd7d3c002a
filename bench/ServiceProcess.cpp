// SPDX-License-Identifier: Apache-2.0
#include "bench/ServiceProcess.h"

#include <fcntl.h>
#include <signal.h>
#include <sys/prctl.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <cstdint>
#include <cstdlib>
#include <fstream>
#include <iostream>

#include "bench/Measure.h"
#include "client/Socket.h"

namespace tarn::bench {

namespace {

constexpr double kReadySeconds = 20;
// Whatever is streamed is logged in memory: how much a message takes there is one of the figures.
constexpr std::uint64_t kLogBytes = std::uint64_t{1} << 36U;

}  // namespace

ServiceProcess::ServiceProcess(const Settings& settings, const ServiceSetup& setup)
    : directory_(settings.directory), program_(settings.serviceFile), mostFileBytes_(setup.mostFileBytes) {
  writeConfiguration(setup);
  start();
  waitUntilReady();
}

ServiceProcess::~ServiceProcess() {
  ::kill(id_, SIGTERM);
  int status = 0;
  ::waitpid(id_, &status, 0);
  if (!WIFEXITED(status) || WEXITSTATUS(status) != EXIT_SUCCESS) {
    showOutput();
  }
}

void ServiceProcess::killAndStart() {
  ::kill(id_, SIGKILL);
  ::waitpid(id_, nullptr, 0);
  start();
  waitUntilReady();
}

void ServiceProcess::writeConfiguration(const ServiceSetup& setup) const {
  std::ofstream file(directory_.path() + "/config.toml");
  file << "[tally]\nin_use = [" << (setup.recordsEvents ? "\"*\"" : "") << "]\n"
       << "[rtc]\navailable = " << (setup.mirrorsSessions ? "true" : "false") << '\n'
       << "[recorder]\nmax_megabytes = " << setup.maxMegabytes << '\n'
       << "[limits]\n";
  for (const char* const bound :
       {"log_bytes_per_session", "log_bytes", "log_share_per_user", "log_bytes_per_connection", "log_bytes_per_user"}) {
    file << bound << " = " << kLogBytes << '\n';
  }
}

void ServiceProcess::start() {
  const std::string state = stateDirectory();
  const std::string configuration = directory_.path() + "/config.toml";
  const std::string socket = socketPath();
  const std::string log = logPath();
  id_ = ::fork();
  if (id_ < 0) {
    fail("can't start a process");
  }
  if (id_ == 0) {
    ::prctl(PR_SET_PDEATHSIG, SIGTERM);
    if (mostFileBytes_ != 0) {
      const auto most = static_cast<rlim_t>(mostFileBytes_);
      const rlimit limit{.rlim_cur = most, .rlim_max = most};
      ::signal(SIGXFSZ, SIG_IGN);
      ::setrlimit(RLIMIT_FSIZE, &limit);
    }
    // What it says would stand between the progress of the table.
    const int output = ::open(outputPath().c_str(), O_WRONLY | O_CREAT | O_APPEND | O_CLOEXEC, 0600);
    if (output < 0 || ::dup2(output, STDERR_FILENO) < 0) {
      std::_Exit(126);
    }
    ::execl(program_.c_str(), program_.c_str(), "--socket", socket.c_str(), "--state-dir", state.c_str(), "--config",
            configuration.c_str(), "--log-level", "error", "--log-target", log.c_str(), nullptr);
    std::_Exit(127);
  }
}

void ServiceProcess::showOutput() const {
  std::cerr << '\n';
  for (const std::string& file : {outputPath(), logPath()}) {
    std::ifstream lines(file);
    for (std::string line; std::getline(lines, line);) {
      std::cerr << "the service: " << line << '\n';
    }
  }
}

void ServiceProcess::waitUntilReady() const {
  const double latest = nowSeconds() + kReadySeconds;
  for (;;) {
    const Result<client::Socket> connected = client::Socket::connect(socketPath(), std::chrono::seconds(2));
    if (connected.ok()) return;
    if (::waitpid(id_, nullptr, WNOHANG) != 0) {
      showOutput();
      fail("the service ended at once");
    }
    if (nowSeconds() > latest) {
      showOutput();
      fail("the service doesn't answer: " + connected.error.text());
    }
    ::usleep(2000);
  }
}

}  // namespace tarn::bench
