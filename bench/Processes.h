// SPDX-License-Identifier: Apache-2.0
// What the benchmarks ask of the system about processes: starting and ending them, where they run, what they use.
//
// The benchmark has no threads of its own, so a child may be forked at any time. Threads: one.
#pragma once

#include <sched.h>
#include <sys/types.h>

#include <functional>
#include <string>
#include <vector>

namespace tarn::bench {

// What a failed system call ends the program with.
[[noreturn]] void fail(const std::string& what);

// Processor time that a process has used, in seconds, all its threads and the system's work for it counted.
double processorSeconds(pid_t process);
// Resident memory of a process (0: this one), in bytes.
double residentBytes(pid_t process);
// The most that this process has had resident so far (of a child: since its start), in bytes.
double peakResidentBytes();

// While it lives this process and the children that it starts run on one processor only.
class OneProcessor {
 public:
  OneProcessor();
  ~OneProcessor();
  OneProcessor(const OneProcessor&) = delete;
  OneProcessor& operator=(const OneProcessor&) = delete;

 private:
  cpu_set_t before_;
};

// A child of this program that runs `body`; ended and waited for with the object.
class ChildProcess {
 public:
  explicit ChildProcess(const std::function<void()>& body);
  ~ChildProcess();
  ChildProcess(const ChildProcess&) = delete;
  ChildProcess& operator=(const ChildProcess&) = delete;
  pid_t id() const noexcept { return id_; }

 private:
  pid_t id_;
};

// Two ends of a connected Unix-domain stream socket, each closed by whoever takes it.
struct SocketPair {
  SocketPair();
  int ours;
  int theirs;
};

// Runs `measure` in a child, so that memory and caches are as fresh as a new process's; what it returned.
// `meanwhile` is called over and over until then, when there is one.
std::vector<double> measureInChild(const std::function<std::vector<double>()>& measure,
                                   const std::function<void()>& meanwhile = {});

// A directory of its own inside `parent`, removed with the object.
class TemporaryDirectory {
 public:
  explicit TemporaryDirectory(const std::string& parent);
  ~TemporaryDirectory();
  TemporaryDirectory(const TemporaryDirectory&) = delete;
  TemporaryDirectory& operator=(const TemporaryDirectory&) = delete;
  const std::string& path() const noexcept { return path_; }

 private:
  std::string path_;
};

// The file system and the device that a directory is on: "ext4 on /dev/sda1".
std::string diskOf(const std::string& directory);

}  // namespace tarn::bench
