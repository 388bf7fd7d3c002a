// SPDX-License-Identifier: Apache-2.0
// What the reporter does while no service answers. What a service gets is in the tests with real programs.
#include "adapters/pipewire/Reporter.h"

#include <gtest/gtest.h>

namespace tarn::streams {

namespace {

constexpr const char* kNobody = "/nowhere/tarnreporting.sock";

BeginSession sessionOf(StreamNumber stream) {
  return {stream, 7, "oxplay", {{"media_role", std::string("Music")}}};
}

PostMessage messageOf(StreamNumber stream) {
  return {stream, 4, 1, 1'500'000'000'000'000'000, {{"session_output_running", true}}};
}

}  // namespace

TEST(PipeWireReporter, WhatNobodyTakesWaits) {
  Reporter reporter;
  ASSERT_TRUE(reporter.open(kNobody).ok());
  reporter.carryOut({sessionOf(1), messageOf(1), messageOf(1), EndSession{1, 2}});
  EXPECT_EQ(reporter.counts().sessions, 1U);
  EXPECT_EQ(reporter.counts().messages, 2U);
  EXPECT_EQ(reporter.counts().lost, 0U);
  EXPECT_EQ(reporter.close(0), 2U);
}

TEST(PipeWireReporter, OnlySoManySessionsWaitForAService) {
  Reporter reporter;
  ASSERT_TRUE(reporter.open(kNobody).ok());
  for (StreamNumber stream = 1; stream <= Reporter::kMostWaiting; ++stream) {
    reporter.carryOut({sessionOf(stream), EndSession{stream, 1}});
  }
  EXPECT_EQ(reporter.counts().leftOut, 0U);
  reporter.carryOut({sessionOf(1000), messageOf(1000), EndSession{1000, 1}});
  EXPECT_EQ(reporter.counts().leftOut, 1U);
  EXPECT_EQ(reporter.counts().sessions, Reporter::kMostWaiting);
  EXPECT_EQ(reporter.counts().messages, 0U);
}

TEST(PipeWireReporter, WhatTheLibraryRefusesIsCountedWithItsReason) {
  Reporter reporter;
  ASSERT_TRUE(reporter.open(kNobody).ok());
  PostMessage post = messageOf(1);
  post.fields.push_back({"text", std::string("\xff")});
  reporter.carryOut({sessionOf(1), post});
  EXPECT_EQ(reporter.counts().lost, 1U);
  EXPECT_FALSE(reporter.counts().lastRefusal.empty());
}

TEST(PipeWireReporter, WhatConcernsAStreamThatIsNotKnownIsNothing) {
  Reporter reporter;
  ASSERT_TRUE(reporter.open(kNobody).ok());
  reporter.carryOut({messageOf(9), EndSession{9, 1}});
  EXPECT_EQ(reporter.counts().messages, 0U);
  EXPECT_EQ(reporter.counts().lost, 0U);
}

TEST(PipeWireReporter, NobodyRefusesWhereNobodyAnswers) {
  Reporter reporter;
  ASSERT_TRUE(reporter.open(kNobody).ok());
  reporter.carryOut({sessionOf(1), messageOf(1)});
  EXPECT_EQ(reporter.refused(), 0U);
}

TEST(PipeWireReporter, APathThatIsTooLongIsAnError) {
  Reporter reporter;
  EXPECT_TRUE(reporter.open(std::string(200, 'x')).failed());
}

}  // namespace tarn::streams
