// SPDX-License-Identifier: Apache-2.0
#include "service/vocabulary/ProcessState.h"

#include <gtest/gtest.h>

#include <csignal>
#include <memory>
#include <string>
#include <thread>
#include <vector>

#include "service/vocabulary/TarnReportingLog.h"
#include "service/vocabulary/TarnReportingPlatform.h"
#include "service/vocabulary/TarnReportingUtility.h"
#include "testing/FakePlatform.h"

namespace tarn {
namespace {

constexpr const char* kNotInstalled = "tarnkit: the platform's facilities are not installed";

// Each says so in the log when it goes.
struct First {
  ~First() { TarnReportingLog(TarnReportingSessionCategory(), LogLevel::Error, "ProcessStateTest", "first goes"); }
  int count = 0;
};
struct Second {
  ~Second() { TarnReportingLog(TarnReportingSessionCategory(), LogLevel::Error, "ProcessStateTest", "second goes"); }
};
// Asks for another one when it goes.
struct Asking {
  ~Asking() { ++ProcessState::of<First>()->count; }
};
// Tells whether the server's queue was gone before it.
struct Witness {
  ~Witness() { *queueWasGone = queue.expired(); }
  std::weak_ptr<platform::WorkQueue> queue;
  bool* queueWasGone = nullptr;
};

class ProcessStateTest : public ::testing::Test {
 protected:
  std::vector<std::string> gone() const {
    std::vector<std::string> messages;
    for (const auto& entry : platform_.log.entries()) {
      messages.push_back(entry.message());
    }
    return messages;
  }

  testing::FakePlatform platform_;
};

TEST_F(ProcessStateTest, AStateIsMadeOnceAndOneForEachType) {
  ++ProcessState::of<First>()->count;
  static_cast<void>(ProcessState::of<Second>());
  EXPECT_EQ(ProcessState::of<First>()->count, 1);
  EXPECT_TRUE(gone().empty());
}

TEST_F(ProcessStateTest, AnotherInstallationBeginsAfresh) {
  ++ProcessState::of<First>()->count;
  TarnReportingInstallFacilities(&platform_.facilities());
  EXPECT_EQ(ProcessState::of<First>()->count, 0);
}

TEST_F(ProcessStateTest, StatesGoLastMadeFirstWhileTheFacilitiesCanBeReached) {
  static_cast<void>(ProcessState::of<First>());
  static_cast<void>(ProcessState::of<Second>());
  TarnReportingInstallFacilities(nullptr);
  EXPECT_EQ(gone(), (std::vector<std::string>{"second goes", "first goes"}));
}

TEST_F(ProcessStateTest, WhoHoldsAStateKeepsIt) {
  const auto kept = ProcessState::of<First>();
  TarnReportingInstallFacilities(&platform_.facilities());
  EXPECT_TRUE(gone().empty());
  EXPECT_NE(ProcessState::of<First>(), kept);
}

TEST_F(ProcessStateTest, AStateThatIsAskedForAtTheEndGoesToo) {
  static_cast<void>(ProcessState::of<Asking>());
  TarnReportingInstallFacilities(nullptr);
  EXPECT_EQ(gone(), (std::vector<std::string>{"first goes"}));
}

TEST_F(ProcessStateTest, TheServerQueueGoesBeforeTheStates) {
  bool queueWasGone = false;
  {
    const auto witness = ProcessState::of<Witness>();
    witness->queue = TarnReportingUtilityGetReportingServerQueue();
    witness->queueWasGone = &queueWasGone;
  }
  TarnReportingInstallFacilities(nullptr);
  EXPECT_TRUE(queueWasGone);
}

TEST_F(ProcessStateTest, WithTheFacilitiesTakenAwayThereIsNone) {
  TarnReportingInstallFacilities(nullptr);
  EXPECT_EXIT(static_cast<void>(ProcessState::of<First>()), ::testing::KilledBySignal(SIGABRT), kNotInstalled);
}

TEST_F(ProcessStateTest, ManyThreadsGetTheOne) {
  std::vector<std::shared_ptr<First>> found(8);
  std::vector<std::thread> threads;
  for (auto& each : found) {
    threads.emplace_back([&each] { each = ProcessState::of<First>(); });
  }
  for (std::thread& thread : threads) {
    thread.join();
  }
  for (const auto& each : found) {
    EXPECT_EQ(each, found.front());
  }
}

TEST(ProcessStateDeathTest, WithoutAnInstallationThereIsNone) {
  EXPECT_EXIT(static_cast<void>(ProcessState::of<First>()), ::testing::KilledBySignal(SIGABRT), kNotInstalled);
}

}  // namespace
}  // namespace tarn
