// SPDX-License-Identifier: Apache-2.0
// One client can't fill the log with one kind of line.
#include "host/log/LogFloodGuard.h"

#include <gtest/gtest.h>
#include <unistd.h>

#include <filesystem>

#include "host/loop/QueueProgress.h"
#include "host/loop/ServerQueue.h"
#include "host/system/ProcessExecutable.h"
#include "testing/ManualClock.h"
#include "testing/RecordingLog.h"

namespace tarn::linux_host {
namespace {

using namespace std::chrono_literals;
using platform::LogLevel;

constexpr platform::LogCategory kCategory{"sys.oxbow.tarnkit", "tarnrs"};
constexpr const char* kModule = "Module";
constexpr std::uint64_t kMost = LogFloodGuard::kMostLines;

class LogFloodGuardTest : public ::testing::Test {
 protected:
  // `count` lines of one place in the source.
  void write(std::uint64_t count, int line = 7, LogLevel level = LogLevel::Default) {
    for (std::uint64_t index = 0; index < count; ++index) {
      guard_.write({kCategory, level, kModule, line, "a line"});
    }
  }
  std::uint64_t lines() const { return log_.count("a line"); }
  LogClient client(std::uint64_t connection, std::int32_t process = ::getpid()) const {
    return {connection, process, ::getuid()};
  }
  std::string whoIs(std::uint64_t connection) const {
    return "connection " + std::to_string(connection) + " of process " + std::to_string(::getpid()) + ", uid " +
           std::to_string(::getuid()) + ", " + std::filesystem::canonical("/proc/self/exe").string();
  }

  testing::RecordingLog log_;
  testing::ManualClock clock_;
  LogFloodGuard guard_{log_, clock_};
};

TEST_F(LogFloodGuardTest, LinesUpToTheBoundPass) {
  const LogClientScope scope(client(3));
  write(kMost);
  EXPECT_EQ(lines(), kMost);
  EXPECT_EQ(log_.count("too many"), 0U);
}

TEST_F(LogFloodGuardTest, FloodIsToldOnceWithWhoItIsAndThenByCount) {
  const LogClientScope scope(client(3));
  write(kMost + 500);
  EXPECT_EQ(lines(), kMost);
  EXPECT_EQ(
      log_.count("Module:7     too many lines like the last one from " + whoIs(3) + "; those that follow are counted"),
      1U);
  clock_.advance(10s);
  write(300);
  EXPECT_TRUE(log_.contains(LogLevel::Default, "Module:7     500 lines like that from " + whoIs(3) + " were left out"));
  EXPECT_EQ(lines(), kMost);  // it goes on
  clock_.advance(10s);
  write(1);
  EXPECT_TRUE(log_.contains(LogLevel::Default, "300 lines like that from "));
  EXPECT_EQ(log_.count("too many"), 1U);
}

TEST_F(LogFloodGuardTest, FloodIsOverWithAWindowOfFewLines) {
  const LogClientScope scope(client(3));
  write(kMost + 1);
  clock_.advance(10s);
  write(kMost);  // counted still, and few enough
  clock_.advance(10s);
  write(5);
  EXPECT_EQ(lines(), kMost + 5);
}

TEST_F(LogFloodGuardTest, ABurstBelowTheWindowsEndIsNoNewWindow) {
  const LogClientScope scope(client(3));
  write(kMost);
  clock_.advance(10s - 1ns);
  write(1);
  EXPECT_EQ(lines(), kMost);
  clock_.advance(1ns);
  EXPECT_EQ(log_.count("were left out"), 0U);
}

TEST_F(LogFloodGuardTest, OtherPlacesOtherProcessesAndTheServiceItselfAreNotMeant) {
  {
    const LogClientScope scope(client(3));
    write(kMost + 1);
    write(1, 8);
  }
  EXPECT_EQ(lines(), kMost + 1);
  {
    const LogClientScope scope(client(4, 1));
    write(1);
  }
  write(3 * kMost);
  EXPECT_EQ(lines(), 4 * kMost + 2);
}

TEST_F(LogFloodGuardTest, ManyConnectionsOfAProcessAreOneClient) {
  for (std::uint64_t connection = 1; connection <= kMost + 50; ++connection) {
    const LogClientScope scope(client(connection));
    write(1);
  }
  EXPECT_EQ(lines(), kMost);
}

TEST_F(LogFloodGuardTest, DetailThatWasAskedForIsNeverLeftOut) {
  const LogClientScope scope(client(3));
  testing::RecordingLog all;
  LogFloodGuard guard(all, clock_);
  for (std::uint64_t index = 0; index < 2 * kMost; ++index) {
    guard.write({kCategory, LogLevel::Debug, kModule, 7, "a line"});
    guard.write({kCategory, LogLevel::Info, kModule, 8, "a line"});
  }
  EXPECT_EQ(all.count("a line"), 4 * kMost);
}

TEST_F(LogFloodGuardTest, CountsOfASilentClientAreToldWithTheNextLineAndAtTheEnd) {
  {
    const LogClientScope scope(client(3));
    write(kMost + 20);
  }
  clock_.advance(30s);
  {
    const LogClientScope scope(client(4, 1));
    write(1, 8);
    EXPECT_TRUE(log_.contains(LogLevel::Default, "20 lines like that from "));
    write(kMost + 2, 9);
  }
  guard_.tellCounts();
  EXPECT_TRUE(log_.contains(LogLevel::Default, "Module:9     2 lines like that from "));
  guard_.tellCounts();
  EXPECT_EQ(log_.count("were left out"), 2U);
}

TEST_F(LogFloodGuardTest, ClientsBeyondTheTableShareAPlace) {
  for (std::int32_t process = 1; process <= static_cast<std::int32_t>(LogFloodGuard::kMostKinds); ++process) {
    const LogClientScope scope(client(1, process));
    write(1);
  }
  const std::uint64_t before = lines();
  for (std::int32_t process = 100'000; process < 100'300; ++process) {
    const LogClientScope scope(client(1, process));
    write(1);
  }
  EXPECT_EQ(lines() - before, kMost);
}

TEST(LogClientScopeTest, WorkOfTheServerQueueIsThatOfWhoeverHandedItOver) {
  testing::ManualClock clock;
  QueueProgress progress;
  ServerQueue queue(clock, progress);
  std::vector<std::uint64_t> connections;
  const auto note = [&connections] { connections.push_back(LogClientScope::current().connection); };
  {
    const LogClientScope scope({5, 41, 0});
    queue.async([&queue, note] {
      note();
      queue.async(note);
    });
  }
  queue.async(note);
  queue.run(10);
  EXPECT_EQ(connections, (std::vector<std::uint64_t>{5, 0, 5}));
  EXPECT_EQ(LogClientScope::current().connection, 0U);
}

TEST(ProcessExecutable, IsThePathOrTheShortNameOrNothingThatIsKnown) {
  EXPECT_EQ(executableOf(::getpid()), std::filesystem::canonical("/proc/self/exe").string());
  EXPECT_EQ(executableOf(0x7FFFFFFF), "an unknown program");
}

}  // namespace
}  // namespace tarn::linux_host
