// SPDX-License-Identifier: Apache-2.0
#include "tests/e2e/support/Programs.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>
#include <csignal>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <sstream>
#include <thread>

namespace tarn::e2e {

bool eventually(const std::function<bool()>& condition, std::chrono::milliseconds deadline) {
  const auto end = std::chrono::steady_clock::now() + deadline;
  while (!condition()) {
    if (std::chrono::steady_clock::now() >= end) return false;
    std::this_thread::sleep_for(std::chrono::milliseconds(5));
  }
  return true;
}

TemporaryDirectory::TemporaryDirectory() {
  std::string name = (std::filesystem::temp_directory_path() / "tarn.XXXXXX").string();
  EXPECT_NE(::mkdtemp(name.data()), nullptr);
  path_ = name;
}

TemporaryDirectory::~TemporaryDirectory() {
  std::error_code ignored;
  std::filesystem::remove_all(path_, ignored);
}

std::string contentOf(const std::string& path) {
  std::ifstream file(path, std::ios::binary);
  return {std::istreambuf_iterator<char>(file), {}};
}

void writeFile(const std::string& path, const std::string& content) {
  std::filesystem::create_directories(std::filesystem::path(path).parent_path());
  std::ofstream(path, std::ios::binary) << content;
}

namespace {

// Writes the number's digits and an end after them; there is room for all that a process ID can have.
void writeNumber(pid_t number, char* at) {
  pid_t unit = 1;
  while (number / unit >= 10) {
    unit *= 10;
  }
  for (; unit > 0; unit /= 10) {
    *at++ = static_cast<char>('0' + number / unit % 10);
  }
  *at = '\0';
}

// Runs in the child between fork and exec: system calls only.
[[noreturn]] void becomeProgram(const Process::Setup& setup, int input, int output, int complaints,
                                std::vector<char*>& words, std::vector<char*>& environment, char* listenPid) {
  ::dup2(input, STDIN_FILENO);
  ::dup2(output, STDOUT_FILENO);
  ::dup2(complaints, STDERR_FILENO);
  if (setup.listenFd >= 0) {
    constexpr int kFirstHandedOver = 3;
    const int admin = setup.adminListenFd < 0 ? -1 : ::fcntl(setup.adminListenFd, F_DUPFD, kFirstHandedOver + 2);
    ::dup2(setup.listenFd, kFirstHandedOver);
    ::fcntl(kFirstHandedOver, F_SETFD, 0);  // it may have been that number already
    if (admin >= 0) {
      ::dup2(admin, kFirstHandedOver + 1);
    }
    writeNumber(::getpid(), listenPid);
  }
  ::close_range(3U + (setup.listenFd >= 0 ? 1U : 0U) + (setup.adminListenFd >= 0 ? 1U : 0U), ~0U, 0);
  ::execve(words[0], words.data(), environment.data());
  ::_exit(127);
}

std::vector<char*> pointers(std::vector<std::string>& texts) {
  std::vector<char*> all;
  for (std::string& text : texts) {
    all.push_back(text.data());
  }
  all.push_back(nullptr);
  return all;
}

int openNew(const std::string& path) {
  return ::open(path.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0600);
}

}  // namespace

Process::Process(const Setup& setup, const TemporaryDirectory& directory) {
  static int count = 0;
  const std::string base = directory / ("process" + std::to_string(++count));
  outputPath_ = base + ".out";
  complaintsPath_ = base + ".err";
  writeFile(base + ".in", setup.input);
  const int input = setup.inputFd >= 0 ? ::dup(setup.inputFd) : ::open((base + ".in").c_str(), O_RDONLY | O_CLOEXEC);
  const int output = setup.outputFd >= 0 ? ::dup(setup.outputFd) : openNew(outputPath_);
  const int complaints = openNew(complaintsPath_);

  std::vector<std::string> words = setup.words;
  std::vector<std::string> variables = setup.environment;
  for (char** variable = environ; *variable != nullptr; ++variable) {
    variables.emplace_back(*variable);
  }
  constexpr std::string_view kListenPid = "LISTEN_PID=0000000000";
  std::size_t listenPid = 0;
  if (setup.listenFd >= 0) {
    const bool isPair = setup.adminListenFd >= 0;
    variables.emplace_back(isPair ? "LISTEN_FDS=2" : "LISTEN_FDS=1");
    if (isPair) {
      variables.emplace_back("LISTEN_FDNAMES=socket:admin");
    }
    listenPid = variables.size();
    variables.emplace_back(kListenPid);
  }
  std::vector<char*> wordPointers = pointers(words);
  std::vector<char*> variablePointers = pointers(variables);
  char* digits = setup.listenFd >= 0 ? variablePointers[listenPid] + kListenPid.find('=') + 1 : nullptr;
  process_ = ::fork();
  if (process_ == 0) {
    becomeProgram(setup, input, output, complaints, wordPointers, variablePointers, digits);
  }
  EXPECT_GT(process_, 0);
  for (const int fd : {input, output, complaints}) {
    ::close(fd);
  }
}

Process::~Process() {
  if (isRunning()) {
    signal(SIGKILL);
    wait();
  }
}

void Process::signal(int number) const {
  ::kill(process_, number);
}

bool Process::isRunning() {
  int status = 0;
  if (!status_ && ::waitpid(process_, &status, WNOHANG) == process_) {
    status_ = WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status);
  }
  return !status_;
}

std::optional<int> Process::wait(std::chrono::milliseconds deadline) {
  eventually([this] { return !isRunning(); }, deadline);
  return status_;
}

Finished runToEnd(const Process::Setup& setup, const TemporaryDirectory& directory) {
  Process process(setup, directory);
  const auto status = process.wait();
  return {status.value_or(-1), process.output(), process.complaints()};
}

std::vector<json> jsonLines(const std::string& text) {
  std::vector<json> lines;
  std::istringstream stream(text);
  for (std::string line; std::getline(stream, line);) {
    lines.push_back(json::parse(line));
  }
  return lines;
}

}  // namespace tarn::e2e
