// SPDX-License-Identifier: Apache-2.0
#include "host/traces/LinuxTracePoints.h"

#include <gtest/gtest.h>

#include "testing/FakeSignposts.h"

namespace tarn::linux_host {
namespace {

using testing::FakeSignposts;

TEST(LinuxTracePoints, AreMarksOfTheTracesThatRecord) {
  FakeSignposts signposts;
  LinuxTracePoints points(signposts);
  points.emit(0x21044814, 1);
  signposts.setRecording(true);
  points.emit(0x21044838, 7);
  EXPECT_EQ(signposts.marks(), (std::vector<FakeSignposts::Post>{{platform::SignpostCategory::TracePoint,
                                                                  "tracePoint.session_message", "argument=7"}}));
}

TEST(LinuxTracePoints, EveryCodeHasAProbeOfItsOwn) {
  EXPECT_EQ(LinuxTracePoints::probeName(0x21044814), "operation_create");
  EXPECT_EQ(LinuxTracePoints::probeName(0x21044818), "operation_start");
  EXPECT_EQ(LinuxTracePoints::probeName(0x2104481C), "operation_stop");
  EXPECT_EQ(LinuxTracePoints::probeName(0x21044824), "operation_send");
  EXPECT_EQ(LinuxTracePoints::probeName(0x21044828), "session_created");
  EXPECT_EQ(LinuxTracePoints::probeName(0x2104482C), "session_started");
  EXPECT_EQ(LinuxTracePoints::probeName(0x21044830), "session_stopping");
  EXPECT_EQ(LinuxTracePoints::probeName(0x21044834), "session_destroyed");
  EXPECT_EQ(LinuxTracePoints::probeName(0x21044838), "session_message");
}

TEST(LinuxTracePoints, AnUnknownCodeIsAMarkAllTheSame) {
  FakeSignposts signposts;
  LinuxTracePoints points(signposts);
  signposts.setRecording(true);
  points.emit(0x21044820, -1);
  ASSERT_EQ(signposts.marks().size(), 1U);
  EXPECT_EQ(signposts.marks()[0].name, "tracePoint.other");
  EXPECT_EQ(signposts.marks()[0].argument, "argument=-1");
}

}  // namespace
}  // namespace tarn::linux_host
