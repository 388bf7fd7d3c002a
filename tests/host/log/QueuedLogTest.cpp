// SPDX-License-Identifier: Apache-2.0
// The log never blocks whoever logs, keeps what it can and tells what it lost.
#include "host/log/QueuedLog.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <algorithm>
#include <cstring>
#include <filesystem>
#include <map>
#include <sstream>
#include <thread>
#include <vector>

#include "host/log/FileOutput.h"
#include "host/log/JournalOutput.h"
#include "host/system/UniqueDescriptor.h"
#include "tests/host/Eventually.h"
#include "tests/host/log/LogFixture.h"

namespace tarn::linux_host {
namespace {

using namespace std::chrono_literals;
using platform::LogLevel;
using testing::eventually;

class QueuedLogTest : public LogFixture {
 protected:
  // A log to the file "log" of the folder.
  std::unique_ptr<QueuedLog> toFile(std::size_t mostBytes = QueuedLog::kMostBytes) {
    auto output = std::make_unique<FileOutput>(folder_.path("log"));
    EXPECT_TRUE(output->open().ok());
    auto log = std::make_unique<QueuedLog>(std::move(output), clock_, LogLevel::Default, mostBytes);
    log->start();
    return log;
  }
};

TEST_F(QueuedLogTest, ThresholdIsTheOneAskedFor) {
  EXPECT_EQ(QueuedLog(std::make_unique<StreamOutput>(2), clock_, LogLevel::Error).threshold(), LogLevel::Error);
}

TEST_F(QueuedLogTest, WritesALineAnEntryInTheirOrder) {
  const auto log = toFile();
  log->write(entry("one"));
  log->write(entry("two\nthree"));
  EXPECT_TRUE(log->settle(20s));
  EXPECT_EQ(folder_.read("log"), line("one") + line("two\n\tthree"));
}

TEST_F(QueuedLogTest, EndWritesWhatWaits) {
  toFile()->write(entry("one"));
  EXPECT_EQ(folder_.read("log"), line("one"));
}

TEST_F(QueuedLogTest, EntriesOfSeveralThreadsStayWholeAndInTheirOrder) {
  const auto log = toFile(std::size_t{64} << 20);
  std::vector<std::thread> threads;
  for (char name = 'a'; name < 'e'; ++name) {
    threads.emplace_back([&log, name] {
      for (int count = 0; count < 200; ++count) {
        log->write(entry(std::string(3000, name) + std::to_string(count)));
      }
    });
  }
  for (std::thread& thread : threads) {
    thread.join();
  }
  EXPECT_TRUE(log->settle(20s));
  std::map<char, int> next;
  std::istringstream lines(folder_.read("log"));
  for (std::string read; std::getline(lines, read);) {
    const char name = read[line("").size() - 1];
    ASSERT_EQ(read + "\n", line(std::string(3000, name) + std::to_string(next[name]++)));
  }
  EXPECT_EQ(next, (std::map<char, int>{{'a', 200}, {'b', 200}, {'c', 200}, {'d', 200}}));
}

TEST_F(QueuedLogTest, FullDiskKeepsTheLinesAndTellsWhatItLost) {
  std::filesystem::create_symlink("/dev/full", folder_.path("log"));
  const auto log = toFile(2 * line("one").size());
  log->write(entry("one"));
  log->write(entry("two"));
  log->write(entry("no more room"));
  log->write(entry("nor here"));
  EXPECT_FALSE(log->settle(20ms));
  std::filesystem::remove(folder_.path("log"));
  EXPECT_TRUE(log->settle(20s));
  log->write(entry("four"));  // what was told is not told again
  EXPECT_TRUE(log->settle(20s));
  EXPECT_EQ(withoutLineNumbers(folder_.read("log")),
            line("one") + line("two") + lostLine("2 log lines were lost: No space left on device") + line("four"));
}

TEST_F(QueuedLogTest, PipeThatNobodyReadsHoldsNobodyUp) {
  int ends[2];
  ASSERT_EQ(::pipe2(ends, 0), 0);  // the writing end blocks, as a standard error stream does
  const UniqueDescriptor reading(ends[0]);
  const UniqueDescriptor writing(ends[1]);
  QueuedLog log(std::make_unique<StreamOutput>(writing.get()), clock_, LogLevel::Default, 100'000);
  log.start();
  const std::string text(10'000, 'x');
  const auto begin = std::chrono::steady_clock::now();
  for (int count = 0; count < 1000; ++count) {
    log.write(entry(text));
  }
  EXPECT_LT(std::chrono::steady_clock::now() - begin, 5s);
  EXPECT_FALSE(log.settle(300ms));
  std::string seen;
  EXPECT_TRUE(eventually([&] {
    std::string buffer(std::size_t{1} << 20, '\0');
    const ssize_t size = ::read(reading.get(), buffer.data(), buffer.size());
    seen.append(buffer, 0, static_cast<std::size_t>(std::max<ssize_t>(size, 0)));
    return seen.find(" log lines were lost") != std::string::npos && seen.ends_with('\n');
  }));
  std::string expected;
  std::size_t kept = 0;
  for (; kept < 1000 && seen.starts_with(expected + line(text)); ++kept) {
    expected += line(text);
  }
  EXPECT_GE(kept, 9U);
  EXPECT_EQ(withoutLineNumbers(seen.substr(expected.size())),
            lostLine(std::to_string(1000 - kept) + " log lines were lost: Resource temporarily unavailable"));
}

TEST_F(QueuedLogTest, JournalThatNobodyReadsHoldsNobodyUpAndGetsTheLinesLater) {
  const std::string path = folder_.path("journal");
  sockaddr_un address{};
  address.sun_family = AF_UNIX;
  std::memcpy(address.sun_path, path.data(), path.size());
  const UniqueDescriptor journal(::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
  ASSERT_EQ(::bind(journal.get(), reinterpret_cast<const sockaddr*>(&address), sizeof address), 0);
  auto output = std::make_unique<JournalOutput>(path);
  ASSERT_TRUE(output->open().ok());
  QueuedLog log(std::move(output), clock_, LogLevel::Default, std::size_t{64} << 20);
  log.start();
  constexpr int kLines = 2000;  // more than a socket's queue takes
  for (int count = 0; count < kLines; ++count) {
    log.write(entry("line " + std::to_string(count)));
  }
  EXPECT_FALSE(log.settle(50ms));
  int next = 0;
  EXPECT_TRUE(eventually([&] {
    std::string text(4096, '\0');
    const ssize_t size = ::recv(journal.get(), text.data(), text.size(), 0);
    if (size > 0) {
      EXPECT_TRUE(text.starts_with("MESSAGE=line " + std::to_string(next) + "\n")) << text;
      ++next;
    }
    return next == kLines;
  }));
  EXPECT_TRUE(log.settle(20s));
}

TEST_F(QueuedLogTest, EndIsNotHeldUpByAnOutputThatTakesNothing) {
  std::filesystem::create_symlink("/dev/full", folder_.path("log"));
  auto log = toFile();
  log->write(entry("one"));
  const auto begin = std::chrono::steady_clock::now();
  log.reset();
  EXPECT_LT(std::chrono::steady_clock::now() - begin, 5s);
}

}  // namespace
}  // namespace tarn::linux_host
