// SPDX-License-Identifier: Apache-2.0
#include "recorder/CommitPace.h"

#include <gtest/gtest.h>

#include <limits>

namespace tarn::recorder {
namespace {

using std::chrono::milliseconds;
using std::chrono::nanoseconds;

constexpr milliseconds kWindow{120};
constexpr std::size_t kFewest = 10;

class CommitPaceTest : public ::testing::Test {
 protected:
  // An event takes half a millisecond from here on.
  void noteSlowWriting(milliseconds committing = milliseconds(0)) { pace_.note(100, milliseconds(100), committing); }

  CommitPace pace_{kWindow, kFewest};
};

TEST_F(CommitPaceTest, BoundsNothingBeforeATransaction) {
  EXPECT_EQ(pace_.mostWaiting(), std::numeric_limits<std::size_t>::max());
  EXPECT_FALSE(pace_.isInLockstep());
}

TEST_F(CommitPaceTest, LetsAsManyWaitAsAreWrittenInTheWindow) {
  noteSlowWriting();
  EXPECT_EQ(pace_.mostWaiting(), 240U);
}

TEST_F(CommitPaceTest, SlowTransactionCountsForHalf) {
  noteSlowWriting();
  noteSlowWriting();
  EXPECT_EQ(pace_.mostWaiting(), 160U);  // three quarters of a millisecond
}

TEST_F(CommitPaceTest, FastTransactionCountsForAQuarter) {
  pace_.note(100, milliseconds(160), milliseconds(0));  // counts as 0.8 ms an event
  pace_.note(100, milliseconds(0), milliseconds(0));
  EXPECT_EQ(pace_.mostWaiting(), 200U);
}

TEST_F(CommitPaceTest, FewEventsAreNotMeasured) {
  pace_.note(31, milliseconds(310), milliseconds(0));
  EXPECT_EQ(pace_.mostWaiting(), std::numeric_limits<std::size_t>::max());
  pace_.note(32, milliseconds(32), milliseconds(0));
  EXPECT_EQ(pace_.mostWaiting(), 240U);
}

TEST_F(CommitPaceTest, CommitUnderWayAndTheNextTakeOfTheWindow) {
  noteSlowWriting(milliseconds(40));
  EXPECT_EQ(pace_.mostWaiting(), 160U);
}

TEST_F(CommitPaceTest, SomeMayAlwaysWait) {
  for (int i = 0; i < 3; ++i) {
    pace_.note(100, std::chrono::seconds(100), milliseconds(0));
  }
  EXPECT_EQ(pace_.mostWaiting(), kFewest);
}

TEST_F(CommitPaceTest, GoesInLockstepWhenTwoCommitsLeaveLessThanAQuarter) {
  pace_.note(1, milliseconds(0), milliseconds(90));
  EXPECT_FALSE(pace_.isInLockstep());
  CommitPace slower{kWindow, kFewest};
  slower.note(1, milliseconds(0), milliseconds(90) + nanoseconds(2));
  EXPECT_TRUE(slower.isInLockstep());
}

TEST_F(CommitPaceTest, InLockstepOneCommitTakesOfTheWindow) {
  noteSlowWriting(milliseconds(100));
  EXPECT_EQ(pace_.mostWaiting(), 140U);
}

TEST_F(CommitPaceTest, CommitsBeyondTheWindowLeaveAQuarterForWriting) {
  noteSlowWriting(milliseconds(400));
  EXPECT_EQ(pace_.mostWaiting(), 60U);
}

TEST_F(CommitPaceTest, LeavesLockstepOnceCommitsAreFastAgain) {
  pace_.note(1, milliseconds(0), milliseconds(100));
  pace_.note(1, milliseconds(0), milliseconds(0));
  EXPECT_FALSE(pace_.isInLockstep());
}

TEST_F(CommitPaceTest, ForgetsTheSleepOfAMachineSoon) {
  pace_.note(100, std::chrono::hours(8), std::chrono::hours(8));
  for (int i = 0; i < 12; ++i) {
    pace_.note(100, milliseconds(0), milliseconds(0));
  }
  EXPECT_FALSE(pace_.isInLockstep());
  EXPECT_GE(pace_.mostWaiting(), 20 * kFewest);
}

}  // namespace
}  // namespace tarn::recorder
