// SPDX-License-Identifier: Apache-2.0
#include "service/vocabulary/TarnReportingSignpost.h"

#include <gtest/gtest.h>

#include "platform/Facilities.h"
#include "service/vocabulary/TarnReportingPlatform.h"
#include "testing/FakePlatform.h"

namespace tarn {
namespace {

using testing::FakePlatform;
using testing::FakeSignposts;

TEST(TarnReportingSignpost, SetsNothingWhileNothingRecords) {
  const FakePlatform platform;
  { const TarnReportingSignpost signpost(SignpostCategory::Worker, "Worker", "start"); }
  EXPECT_EQ(platform.signposts.begun(), 0U);
  EXPECT_TRUE(platform.signposts.intervals().empty());
}

TEST(TarnReportingSignpost, IsAnIntervalThatEndsWithItsScope) {
  FakePlatform platform;
  platform.signposts.setRecording(true);
  {
    const TarnReportingSignpost signpost(SignpostCategory::Message, "Session", "sendMessage", {"reporterID", 7});
    EXPECT_EQ(platform.signposts.begun(), 1U);
    EXPECT_TRUE(platform.signposts.intervals().empty());
  }
  EXPECT_EQ(platform.signposts.intervals(),
            (std::vector<FakeSignposts::Post>{{SignpostCategory::Message, "Session.sendMessage", "reporterID=7"}}));
}

TEST(TarnReportingSignpost, InnerIntervalsEndFirst) {
  FakePlatform platform;
  platform.signposts.setRecording(true);
  {
    const TarnReportingSignpost outer(SignpostCategory::Operation, "Client", "stop");
    const TarnReportingSignpost inner(SignpostCategory::Worker, "Worker", "stop");
  }
  const auto intervals = platform.signposts.intervals();
  ASSERT_EQ(intervals.size(), 2U);
  EXPECT_EQ(intervals[0].name, "Worker.stop");
  EXPECT_EQ(intervals[1].name, "Client.stop");
}

TEST(TarnReportingSignpost, ABeginBeforeTheRecordingHasNoEnd) {
  FakePlatform platform;
  {
    const TarnReportingSignpost signpost(SignpostCategory::Worker, "Worker", "start");
    platform.signposts.setRecording(true);
  }
  EXPECT_TRUE(platform.signposts.intervals().empty());
}

TEST(TarnReportingSignpost, AnEndBehindTheRecordingIsLeftToTheRecorder) {
  FakePlatform platform;
  platform.signposts.setRecording(true);
  {
    const TarnReportingSignpost signpost(SignpostCategory::Worker, "Worker", "start");
    platform.signposts.setRecording(false);
  }
  EXPECT_EQ(platform.signposts.count("Worker.start"), 1U);
}

TEST(TarnReportingSignpost, APlatformWithoutTracesRecordsNothing) {
  FakePlatform platform;
  platform.signposts.setRecording(true);
  platform.facilities().signposts = nullptr;
  TarnReportingInstallFacilities(&platform.facilities());
  { const TarnReportingSignpost signpost(SignpostCategory::Worker, "Worker", "start"); }
  EXPECT_EQ(platform.signposts.begun(), 0U);
}

TEST(TarnReportingSignpost, WithoutAPlatformNothingHappens) {
  { FakePlatform().signposts.setRecording(true); }
  const TarnReportingSignpost signpost(SignpostCategory::Worker, "Worker", "start");
  EXPECT_FALSE(detail::signpostSwitch->load());
}

}  // namespace
}  // namespace tarn
