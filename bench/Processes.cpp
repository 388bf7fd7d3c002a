// SPDX-License-Identifier: Apache-2.0
#include "bench/Processes.h"

#include <poll.h>
#include <signal.h>
#include <sys/prctl.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/sysmacros.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <ctime>
#include <filesystem>
#include <fstream>
#include <iostream>
#include <sstream>
#include <system_error>

namespace tarn::bench {

void fail(const std::string& what) {
  std::cerr << "tarnreportingbench: " << what << '\n';
  std::exit(EXIT_FAILURE);
}

double processorSeconds(pid_t process) {
  clockid_t clock{};
  timespec time{};
  if (::clock_getcpuclockid(process, &clock) != 0 || ::clock_gettime(clock, &time) != 0) {
    fail("can't read the processor time of process " + std::to_string(process));
  }
  return static_cast<double>(time.tv_sec) + static_cast<double>(time.tv_nsec) / 1e9;
}

double residentBytes(pid_t process) {
  std::ifstream file(process == 0 ? "/proc/self/statm" : "/proc/" + std::to_string(process) + "/statm");
  double total = 0;
  double resident = 0;
  if (!(file >> total >> resident)) {
    fail("can't read the memory of process " + std::to_string(process));
  }
  return resident * static_cast<double>(::sysconf(_SC_PAGESIZE));
}

double peakResidentBytes() {
  std::ifstream file("/proc/self/status");
  for (std::string line; std::getline(file, line);) {
    if (line.starts_with("VmHWM:")) return std::stod(line.substr(sizeof "VmHWM:")) * 1024;
  }
  fail("can't read the memory of this process");
}

OneProcessor::OneProcessor() {
  if (::sched_getaffinity(0, sizeof before_, &before_) != 0) {
    fail("can't find out the processors");
  }
  int last = CPU_SETSIZE - 1;
  while (!CPU_ISSET(static_cast<std::size_t>(last), &before_)) {
    --last;
  }
  cpu_set_t one;
  CPU_ZERO(&one);
  CPU_SET(static_cast<std::size_t>(last), &one);
  if (::sched_setaffinity(0, sizeof one, &one) != 0) {
    fail("can't stay on one processor");
  }
}

OneProcessor::~OneProcessor() {
  ::sched_setaffinity(0, sizeof before_, &before_);
}

ChildProcess::ChildProcess(const std::function<void()>& body) : id_(::fork()) {
  if (id_ < 0) {
    fail("can't start a process");
  }
  if (id_ == 0) {
    ::prctl(PR_SET_PDEATHSIG, SIGKILL);
    body();
    std::_Exit(EXIT_SUCCESS);
  }
}

ChildProcess::~ChildProcess() {
  ::kill(id_, SIGKILL);
  ::waitpid(id_, nullptr, 0);
}

SocketPair::SocketPair() {
  int ends[2];
  if (::socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends) != 0) {
    fail("can't make a socket");
  }
  ours = ends[0];
  theirs = ends[1];
}

std::vector<double> measureInChild(const std::function<std::vector<double>()>& measure,
                                   const std::function<void()>& meanwhile) {
  const SocketPair ends;
  const ChildProcess child([&] {
    for (const double value : measure()) {
      if (::write(ends.theirs, &value, sizeof value) != sizeof value) {
        std::_Exit(EXIT_FAILURE);
      }
    }
  });
  ::close(ends.theirs);
  pollfd results{.fd = ends.ours, .events = POLLIN, .revents = 0};
  while (meanwhile && ::poll(&results, 1, 0) == 0) {
    meanwhile();
  }
  std::vector<double> values;
  double value = 0;
  while (::recv(ends.ours, &value, sizeof value, MSG_WAITALL) == sizeof value) {
    values.push_back(value);
  }
  ::close(ends.ours);
  if (values.empty()) {
    fail("a measurement in a process of its own failed");
  }
  return values;
}

TemporaryDirectory::TemporaryDirectory(const std::string& parent) : path_(parent + "/tarnbench-XXXXXX") {
  if (::mkdtemp(path_.data()) == nullptr) {
    fail("can't make a directory in " + parent + ": " + std::generic_category().message(errno));
  }
}

TemporaryDirectory::~TemporaryDirectory() {
  std::error_code ignored;
  std::filesystem::remove_all(path_, ignored);
}

std::string diskOf(const std::string& directory) {
  struct stat facts {};
  if (::stat(directory.c_str(), &facts) != 0) return "unknown";
  const std::string wanted = std::to_string(major(facts.st_dev)) + ":" + std::to_string(minor(facts.st_dev));
  std::ifstream mounts("/proc/self/mountinfo");
  for (std::string line; std::getline(mounts, line);) {
    std::istringstream fields(line);
    std::string field;
    std::string device;
    fields >> field >> field >> device;
    if (device != wanted) continue;
    while (fields >> field && field != "-") {
    }
    std::string type;
    std::string source;
    fields >> type >> source;
    return type + " on " + source;
  }
  return "unknown";
}

}  // namespace tarn::bench
