// SPDX-License-Identifier: Apache-2.0
// A hand-over to a back-end is seen in the traces.
#include "testing/FakePlatform.h"
#include "tests/recorder/RecorderFixture.h"

namespace tarn::recorder {
namespace {

TEST_F(RecorderFixture, AHandOverIsAnIntervalNamedAfterItsBackEnd) {
  tarn::testing::FakePlatform platform;
  start();
  record("before");
  platform.signposts.setRecording(true);
  record("one");
  record("two");
  EXPECT_EQ(platform.signposts.count("recorder.tally"), 2U);
  EXPECT_EQ(platform.signposts.begun(), 2U);
  stop();
}

}  // namespace
}  // namespace tarn::recorder
