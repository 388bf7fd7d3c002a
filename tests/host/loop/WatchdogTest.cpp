// SPDX-License-Identifier: Apache-2.0
#include "host/loop/Watchdog.h"

#include <gtest/gtest.h>
#include <stdlib.h>
#include <sys/socket.h>
#include <sys/un.h>

#include <atomic>
#include <cstring>
#include <string>

#include "host/system/UniqueDescriptor.h"
#include "testing/ManualClock.h"
#include "tests/host/Eventually.h"
#include "tests/host/InChild.h"
#include "tests/host/ScratchFolder.h"

namespace tarn::linux_host {
namespace {

using namespace std::chrono_literals;

struct AliveCase {
  const char* name;
  std::uint64_t stepsBefore;
  std::uint64_t stepsNow;
  bool idle;
  std::optional<std::chrono::nanoseconds> waitedFor;
  bool alive;
};

class WatchdogDecision : public ::testing::TestWithParam<AliveCase> {};

TEST_P(WatchdogDecision, IsAsTheTableSays) {
  const AliveCase& row = GetParam();
  constexpr std::chrono::nanoseconds kNow = 1000s;
  QueueProgress::Sample before;
  before.steps = row.stepsBefore;
  QueueProgress::Sample now;
  now.steps = row.stepsNow;
  now.idle = row.idle;
  if (row.waitedFor) {
    now.waitingSince = kNow - *row.waitedFor;
  }
  EXPECT_EQ(queueIsAlive(before, now, kNow), row.alive);
}

INSTANTIATE_TEST_SUITE_P(Table, WatchdogDecision,
                         ::testing::Values(AliveCase{"Progress", 7, 8, false, std::nullopt, true},
                                           AliveCase{"ManySteps", 7, 7000, false, std::nullopt, true},
                                           AliveCase{"Hung", 7, 7, false, std::nullopt, false},
                                           AliveCase{"Idle", 7, 7, true, std::nullopt, true},
                                           AliveCase{"WaitJustBegun", 7, 7, false, 0ns, true},
                                           AliveCase{"WaitOfThreeMinutes", 7, 7, false, 180s, true},
                                           AliveCase{"WaitJustBelowTheLongest", 7, 7, false, 185s - 1ns, true},
                                           AliveCase{"WaitOfTheLongest", 7, 7, false, 185s, false},
                                           AliveCase{"WaitBeyondTheLongest", 7, 7, false, 185s + 1ns, false},
                                           AliveCase{"LongWaitButProgress", 7, 8, false, 200s, true}),
                         [](const auto& row) { return std::string(row.param.name); });

class FakeManager final : public ServiceManager {
 public:
  void notifyWatchdog() override { ++pings; }
  std::optional<std::chrono::microseconds> watchdogInterval() const override { return interval; }
  std::optional<std::chrono::microseconds> interval;
  std::atomic<int> pings{0};
};

class WatchdogTest : public ::testing::Test {
 protected:
  testing::ManualClock clock_;
  QueueProgress progress_;
  FakeManager manager_;
  Watchdog watchdog_{clock_, progress_, manager_};
};

TEST_F(WatchdogTest, PingsAQueueThatMakesProgressAndNotOneThatHangs) {
  progress_.step();
  EXPECT_TRUE(watchdog_.check());
  EXPECT_FALSE(watchdog_.check());
  EXPECT_FALSE(watchdog_.check());
  progress_.step();
  EXPECT_TRUE(watchdog_.check());
  EXPECT_EQ(manager_.pings, 2);
}

TEST_F(WatchdogTest, PingsThroughADeliberateWaitUpToItsLongest) {
  progress_.step();
  watchdog_.check();
  progress_.beginWait(clock_.monotonic());
  clock_.advance(184s);
  EXPECT_TRUE(watchdog_.check());
  clock_.advance(1s);
  EXPECT_FALSE(watchdog_.check());
  progress_.endWait();
  EXPECT_TRUE(watchdog_.check());
}

TEST_F(WatchdogTest, PingsAQueueThatWorksOnlyWhileOthersHaveTheirTurns) {
  progress_.turn();
  ASSERT_TRUE(watchdog_.check());
  for (int look = 0; look < 4; ++look) {
    clock_.advance(15s);
    progress_.step();
    EXPECT_TRUE(watchdog_.check()) << look;
  }
  clock_.advance(1ns);
  progress_.step();
  EXPECT_FALSE(watchdog_.check());
  progress_.turn();
  EXPECT_TRUE(watchdog_.check());
}

TEST_F(WatchdogTest, ADeliberateWaitAndRestAreTurns) {
  progress_.turn();
  ASSERT_TRUE(watchdog_.check());
  clock_.advance(50s);
  progress_.beginWait(clock_.monotonic());
  EXPECT_TRUE(watchdog_.check());
  progress_.endWait();
  clock_.advance(50s);
  progress_.step();
  EXPECT_TRUE(watchdog_.check());
  progress_.setIdle(true);
  clock_.advance(1h);
  EXPECT_TRUE(watchdog_.check());
  progress_.setIdle(false);
  clock_.advance(50s);
  progress_.step();
  EXPECT_TRUE(watchdog_.check());
}

TEST_F(WatchdogTest, StartsNothingWhenTheManagerDoesNotAsk) {
  progress_.setIdle(true);
  watchdog_.start();
  watchdog_.stop();
  EXPECT_EQ(manager_.pings, 0);
}

TEST_F(WatchdogTest, PingsOnAndOnWhenAsked) {
  manager_.interval = 2ms;
  progress_.setIdle(true);
  watchdog_.start();
  EXPECT_TRUE(testing::eventually([&] { return manager_.pings >= 5; }));
}

// What a service manager sees: a datagram socket named in the environment.
class ServiceManagerTest : public ::testing::Test {
 protected:
  void SetUp() override {
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    const std::string path = folder_.file("notify");
    std::memcpy(address.sun_path, path.data(), path.size());
    socket_ = UniqueDescriptor(::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0));
    ASSERT_EQ(::bind(socket_.get(), reinterpret_cast<sockaddr*>(&address), sizeof address), 0);
    const timeval patience{10, 0};
    ::setsockopt(socket_.get(), SOL_SOCKET, SO_RCVTIMEO, &patience, sizeof patience);
    path_ = path;
  }
  std::string received() const {
    char text[256];
    const auto size = ::recv(socket_.get(), text, sizeof text, 0);
    return size < 0 ? "nothing" : std::string(text, static_cast<std::size_t>(size));
  }

  testing::ScratchFolder folder_;
  UniqueDescriptor socket_;
  std::string path_;
};

TEST_F(ServiceManagerTest, IsToldThatTheServiceIsReadyAndThatItStops) {
  EXPECT_EQ(testing::inChild([this] {
              ::setenv("NOTIFY_SOCKET", path_.c_str(), 1);
              ServiceManager().notifyReady();
              ServiceManager().notifyStopping(10s);
              return 0;
            }),
            0);
  EXPECT_EQ(received(), "READY=1");
  EXPECT_EQ(received(), "STOPPING=1\nEXTEND_TIMEOUT_USEC=10000000");
}

TEST_F(ServiceManagerTest, TellsItsIntervalAndTakesPings) {
  EXPECT_EQ(testing::inChild([this] {
              ::setenv("NOTIFY_SOCKET", path_.c_str(), 1);
              ::setenv("WATCHDOG_USEC", "20000", 1);
              ::setenv("WATCHDOG_PID", std::to_string(::getpid()).c_str(), 1);
              ServiceManager manager;
              const bool asked = manager.watchdogInterval() == std::chrono::microseconds(20000);
              manager.notifyWatchdog();
              return asked ? 0 : 1;
            }),
            0);
  EXPECT_EQ(received(), "WATCHDOG=1");
}

TEST_F(ServiceManagerTest, DoesNotAskWhenItWatchesAnotherProcess) {
  EXPECT_EQ(testing::inChild([] {
              ::setenv("WATCHDOG_USEC", "20000", 1);
              ::setenv("WATCHDOG_PID", "1", 1);
              return ServiceManager().watchdogInterval() ? 1 : 0;
            }),
            0);
}

}  // namespace
}  // namespace tarn::linux_host
