// SPDX-License-Identifier: Apache-2.0
#include "service/vocabulary/TarnReportingPlatform.h"

#include <gtest/gtest.h>

#include "platform/Facilities.h"
#include "service/vocabulary/TarnReportingUtility.h"
#include "testing/FakePlatform.h"

namespace tarn {
namespace {

TEST(TarnReportingPlatform, FacilitiesAreThoseThatWereInstalled) {
  const testing::FakePlatform platform;
  EXPECT_EQ(&TarnReportingFacilities().clock, &platform.clock);
  EXPECT_EQ(&TarnReportingFacilities().tally, &platform.tally);
}

TEST(TarnReportingPlatform, UninstallingForgetsTheInternalBuildAnswer) {
  {
    testing::FakePlatform platform;
    platform.deviceProperties.set("InternalBuild", true);
    ASSERT_TRUE(TarnReportingUtilityIsInternalBuild());
  }
  const testing::FakePlatform platform;
  EXPECT_FALSE(TarnReportingUtilityIsInternalBuild());
}

TEST(TarnReportingPlatform, UninstallingLetsGoOfTheServerQueue) {
  std::weak_ptr<platform::WorkQueue> queue;
  {
    const testing::FakePlatform platform;
    queue = TarnReportingUtilityGetReportingServerQueue();
    ASSERT_FALSE(queue.expired());
  }
  EXPECT_TRUE(queue.expired());
}

TEST(TarnReportingPlatformDeathTest, AskingWithoutAnInstallationEndsTheProcess) {
  EXPECT_DEATH(static_cast<void>(TarnReportingFacilities()), "facilities are not installed");
}

}  // namespace
}  // namespace tarn
