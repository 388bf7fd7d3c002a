// SPDX-License-Identifier: Apache-2.0
#include "host/machine/LinuxCommandRunner.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <poll.h>
#include <sys/stat.h>
#include <unistd.h>

#include <chrono>
#include <csignal>
#include <cstdlib>
#include <filesystem>
#include <string>
#include <system_error>
#include <thread>
#include <vector>

namespace tarn::linux_host {
namespace {

using namespace std::chrono_literals;
using platform::CommandEnd;

constexpr std::size_t kLineBytes = 2047;

struct Result {
  std::vector<std::string> lines;
  CommandEnd end;
};

Result run(const std::string& command, std::chrono::nanoseconds timeLimit = 60s) {
  LinuxCommandRunner runner;
  auto started = runner.start(command, timeLimit);
  Result result;
  if (started.failed()) {
    ADD_FAILURE() << started.error->text;
    return result;
  }
  while (auto line = started.value->readLine(kLineBytes)) {
    result.lines.push_back(std::move(*line));
  }
  result.end = started.value->close();
  return result;
}

// A named pipe that a tool holds open for as long as it lives.
class LifeLine {
 public:
  LifeLine() {
    std::string pattern = std::filesystem::temp_directory_path() / "tarn-command.XXXXXX";
    if (const char* made = ::mkdtemp(pattern.data())) {
      directory_ = made;
    }
    if (::mkfifo(path().c_str(), 0600) == 0) {
      pipe_ = ::open(path().c_str(), O_RDONLY | O_NONBLOCK | O_CLOEXEC);
    }
  }
  ~LifeLine() {
    ::close(pipe_);
    std::error_code ignored;
    std::filesystem::remove_all(directory_, ignored);
  }
  LifeLine(const LifeLine&) = delete;
  LifeLine& operator=(const LifeLine&) = delete;

  std::string path() const { return directory_ + "/pipe"; }
  // Whether everybody who held the pipe ends within this time.
  bool endsWithin(std::chrono::milliseconds time) const {
    pollfd wanted{pipe_, POLLIN, 0};
    return ::poll(&wanted, 1, static_cast<int>(time.count())) == 1 && (wanted.revents & POLLHUP) != 0;
  }

 private:
  std::string directory_;
  int pipe_ = -1;
};

TEST(LinuxCommandRunner, GivesTheLinesWithTheirNewlines) {
  const auto result = run("printf 'one\\n\\ntwo\\n'");

  EXPECT_EQ(result.lines, (std::vector<std::string>{"one\n", "\n", "two\n"}));
  EXPECT_EQ(result.end.kind, CommandEnd::Kind::Exited);
  EXPECT_EQ(result.end.status, 0);
}

TEST(LinuxCommandRunner, GivesALastLineWithoutNewline) {
  EXPECT_EQ(run("printf 'one\\ntwo'").lines, (std::vector<std::string>{"one\n", "two"}));
}

TEST(LinuxCommandRunner, CutsALongLineAtTheLimit) {
  const auto result = run("head -c 5000 /dev/zero | tr '\\0' x");

  ASSERT_EQ(result.lines.size(), 3U);
  EXPECT_EQ(result.lines[0].size(), kLineBytes);
  EXPECT_EQ(result.lines[1].size(), kLineBytes);
  EXPECT_EQ(result.lines[2].size(), 5000 - 2 * kLineBytes);
}

TEST(LinuxCommandRunner, CarriesMegabytes) {
  const auto result = run("yes 0123456789abcde | head -n 300000");

  ASSERT_EQ(result.lines.size(), 300'000U);
  EXPECT_EQ(result.lines.front(), "0123456789abcde\n");
  EXPECT_EQ(result.lines.back(), "0123456789abcde\n");
}

TEST(LinuxCommandRunner, AToolThatIsMissingPrintsNothingAndIsNotFound) {
  const auto result = run("/nowhere/such-a-tool -l");

  EXPECT_TRUE(result.lines.empty());
  EXPECT_EQ(result.end.kind, CommandEnd::Kind::Exited);
  EXPECT_EQ(result.end.status, CommandEnd::kNotFound);
}

TEST(LinuxCommandRunner, AFileThatIsNoProgramIsNotExecutable) {
  EXPECT_EQ(run("/etc/passwd").end.status, CommandEnd::kNotExecutable);
}

TEST(LinuxCommandRunner, TellsTheExitStatusAndTheSignal) {
  EXPECT_EQ(run("exit 7").end.status, 7);
  const auto killed = run("kill -TERM $$");
  EXPECT_EQ(killed.end.kind, CommandEnd::Kind::Signalled);
  EXPECT_EQ(killed.end.status, SIGTERM);
}

TEST(LinuxCommandRunner, StandardInputIsEmptyAndErrorOutputIsNotCaptured) {
  EXPECT_EQ(run("cat; echo hidden >&2; echo shown").lines, (std::vector<std::string>{"shown\n"}));
}

TEST(LinuxCommandRunner, AHangingToolIsEndedWithWhatItPrintedSoFar) {
  const auto before = std::chrono::steady_clock::now();
  const auto result = run("echo begun; printf half; sleep 600", 300ms);

  EXPECT_EQ(result.lines, (std::vector<std::string>{"begun\n", "half"}));
  EXPECT_EQ(result.end.kind, CommandEnd::Kind::TimedOut);
  EXPECT_GE(std::chrono::steady_clock::now() - before, 300ms);
}

TEST(LinuxCommandRunner, AToolThatClosesItsOutputAndHangsIsEndedToo) {
  const auto result = run("echo last; exec >&-; sleep 600", 300ms);

  EXPECT_EQ(result.lines, (std::vector<std::string>{"last\n"}));
  EXPECT_EQ(result.end.kind, CommandEnd::Kind::TimedOut);
}

TEST(LinuxCommandRunner, WhatAHangingToolStartedEndsWithIt) {
  const LifeLine life;
  LinuxCommandRunner runner;
  auto started = runner.start("(exec 3>" + life.path() + "; echo held; sleep 600) & wait", 500ms);
  ASSERT_FALSE(started.failed());
  ASSERT_EQ(started.value->readLine(kLineBytes), "held\n");
  EXPECT_FALSE(life.endsWithin(0ms));

  EXPECT_EQ(started.value->readLine(kLineBytes), std::nullopt);
  EXPECT_EQ(started.value->close().kind, CommandEnd::Kind::TimedOut);

  EXPECT_TRUE(life.endsWithin(10s));
}

TEST(LinuxCommandRunner, DestroyingARunningCommandEndsIt) {
  const LifeLine life;
  LinuxCommandRunner runner;
  auto started = runner.start("exec 3>" + life.path() + "; echo held; sleep 600", 60s);
  ASSERT_FALSE(started.failed());
  ASSERT_EQ(started.value->readLine(kLineBytes), "held\n");
  EXPECT_FALSE(life.endsWithin(0ms));

  started.value.reset();

  EXPECT_TRUE(life.endsWithin(10s));
}

TEST(LinuxCommandRunner, AToolThatWritesBehindTheCloseIsNotWaitedForLong) {
  LinuxCommandRunner runner;
  auto started = runner.start("exec yes", 60s);
  ASSERT_FALSE(started.failed());
  ASSERT_EQ(started.value->readLine(kLineBytes), "y\n");

  const auto end = started.value->close();

  EXPECT_EQ(end.kind, CommandEnd::Kind::Signalled);
  EXPECT_EQ(end.status, SIGPIPE);
}

TEST(LinuxCommandRunner, SignalsThatTheServiceBlocksOrIgnoresReachTheTool) {
  sigset_t blocked;
  sigset_t before;
  ::sigemptyset(&blocked);
  ::sigaddset(&blocked, SIGTERM);
  ASSERT_EQ(::pthread_sigmask(SIG_BLOCK, &blocked, &before), 0);
  const auto ignored = std::signal(SIGPIPE, SIG_IGN);

  const auto result = run("kill -TERM $$; echo survived");
  const auto piped = run("kill -PIPE $$; echo survived");

  std::signal(SIGPIPE, ignored);
  ::pthread_sigmask(SIG_SETMASK, &before, nullptr);
  EXPECT_TRUE(result.lines.empty());
  EXPECT_TRUE(piped.lines.empty());
}

TEST(LinuxCommandRunner, CommandsOnTwoThreadsDoNotMixTheirOutput) {
  Result first;
  Result second;
  std::thread one([&] { first = run("for i in 1 2 3 4 5 6 7 8; do echo a; done"); });
  std::thread two([&] { second = run("for i in 1 2 3 4 5 6 7 8; do echo b; done"); });
  one.join();
  two.join();

  EXPECT_EQ(first.lines, std::vector<std::string>(8, "a\n"));
  EXPECT_EQ(second.lines, std::vector<std::string>(8, "b\n"));
}

}  // namespace
}  // namespace tarn::linux_host
