// SPDX-License-Identifier: Apache-2.0
#include "service/vocabulary/TarnReportingServerQueue.h"

#include <gtest/gtest.h>

#include <memory>
#include <thread>

#include "platform/WorkQueue.h"
#include "service/vocabulary/TarnReportingUtility.h"
#include "testing/FakePlatform.h"

namespace tarn {
namespace {

class TarnReportingServerQueueTest : public ::testing::Test {
 protected:
  testing::FakePlatform platform_;
};

TEST_F(TarnReportingServerQueueTest, WorkOfTheServerQueuePasses) {
  bool passed = false;
  TarnReportingUtilityGetReportingServerQueue()->async([&] {
    TarnReportingRequireServerQueue();
    passed = true;
  });
  platform_.runUntilIdle();
  EXPECT_TRUE(passed);
}

TEST_F(TarnReportingServerQueueTest, WorkOfAnotherQueueEndsTheProcess) {
  const auto other = platform_.workQueues.makeSerialQueue("other", platform::QualityOfService::Utility);
  other->async([] { TarnReportingRequireServerQueue(); });
  EXPECT_DEATH(platform_.runUntilIdle(), "tarnkit: code of the server queue was called outside it");
}

TEST_F(TarnReportingServerQueueTest, AnotherThreadEndsTheProcess) {
  const auto call = [] { std::thread([] { TarnReportingRequireServerQueue(); }).join(); };
  EXPECT_DEATH(call(), "tarnkit: code of the server queue was called outside it");
}

}  // namespace
}  // namespace tarn
