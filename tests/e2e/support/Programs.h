// SPDX-License-Identifier: Apache-2.0
// Programs: runs the real programs as a person or a service manager would, on private directories, and never waits
// longer than a deadline. Used by the end-to-end tests. Threads: one at a time.
#pragma once

#include <sys/types.h>

#include <chrono>
#include <functional>
#include <memory>
#include <nlohmann/json.hpp>
#include <optional>
#include <string>
#include <vector>

#include "client/ClientConnection.h"

namespace tarn::e2e {

using nlohmann::json;

// What every wait of these tests is bounded by.
inline constexpr std::chrono::seconds kDeadline{8};

// Polls until it holds; whether it did in time.
bool eventually(const std::function<bool()>& condition, std::chrono::milliseconds deadline = kDeadline);

class TemporaryDirectory {
 public:
  TemporaryDirectory();
  ~TemporaryDirectory();
  TemporaryDirectory(const TemporaryDirectory&) = delete;
  TemporaryDirectory& operator=(const TemporaryDirectory&) = delete;

  const std::string& path() const { return path_; }
  std::string operator/(const std::string& name) const { return path_ + "/" + name; }

 private:
  std::string path_;
};

std::string contentOf(const std::string& path);
void writeFile(const std::string& path, const std::string& content);

// A program that runs, its output in files.
class Process {
 public:
  struct Setup {
    std::vector<std::string> words;        // the program and its arguments
    std::string input;                     // what it reads on stdin
    int inputFd = -1;                      // what it reads instead of `input`
    int outputFd = -1;                     // where stdout goes instead of a file
    int listenFd = -1;                     // handed over as a service manager does
    int adminListenFd = -1;                // with that one, by the name "admin"
    std::vector<std::string> environment;  // NAME=VALUE, besides the test's own
  };
  Process(const Setup& setup, const TemporaryDirectory& directory);
  Process(const Process&) = delete;
  Process& operator=(const Process&) = delete;
  // Kills it when it still runs.
  ~Process();

  pid_t id() const { return process_; }
  void signal(int number) const;
  // The exit status, 128 and the signal's number, or nothing when it still runs at the deadline.
  std::optional<int> wait(std::chrono::milliseconds deadline = kDeadline);
  bool isRunning();
  std::string output() const { return contentOf(outputPath_); }
  std::string complaints() const { return contentOf(complaintsPath_); }

 private:
  pid_t process_ = -1;
  std::optional<int> status_;
  std::string outputPath_;
  std::string complaintsPath_;
};

struct Finished {
  int status = -1;  // -1: it was still running at the deadline
  std::string output;
  std::string complaints;
};
Finished runToEnd(const Process::Setup& setup, const TemporaryDirectory& directory);

// The lines of a text, each a JSON value.
std::vector<json> jsonLines(const std::string& text);

}  // namespace tarn::e2e
