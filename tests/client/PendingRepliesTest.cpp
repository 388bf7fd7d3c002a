// SPDX-License-Identifier: Apache-2.0
// Which starts are reported as cancelled, and when.
#include "client/PendingReplies.h"

#include <gtest/gtest.h>

#include "client/Requests.h"

namespace tarn::client {
namespace {

using Strings = std::vector<std::string>;

class Line {
 public:
  // Puts the request in line; returns its ID.
  std::uint64_t add(const Request& request) {
    const std::uint64_t id = next_++;
    pending_.add(id, request, [this, id](Reply&&) { called_.push_back(id); });
    return id;
  }
  bool take(std::uint64_t id, bool failed = false) {
    ReplyHandler handler;
    return pending_.take(id, failed, handler);
  }
  std::vector<std::uint64_t> cancelled() {
    called_.clear();
    ReplyHandler handler;
    while (pending_.takeCancelled(handler)) {
      handler(Reply());
    }
    return called_;
  }
  PendingReplies& pending() { return pending_; }

 private:
  PendingReplies pending_;
  std::uint64_t next_ = 1;
  std::vector<std::uint64_t> called_;
};

using IDs = std::vector<std::uint64_t>;

TEST(PendingReplies, RepliesMayComeInAnyOrder) {
  Line line;
  const auto a = line.add(getAllReporters());
  const auto b = line.add(getAllReporters());
  const auto c = line.add(getAllReporters());
  EXPECT_TRUE(line.take(b));
  EXPECT_FALSE(line.take(b));
  EXPECT_TRUE(line.take(c));
  EXPECT_TRUE(line.take(a));
  EXPECT_FALSE(line.take(99));
  EXPECT_EQ(line.pending().size(), 0U);
}

TEST(PendingReplies, AHeldStartOutlivesOtherRequests) {
  Line line;
  line.add(createReportingSession(5));
  const auto start = line.add(startReportingSessionForID(5));
  const auto message = line.add(sendMessage({}, 0, 0));
  EXPECT_TRUE(line.take(1));
  EXPECT_TRUE(line.take(message));
  EXPECT_TRUE(line.cancelled().empty());
  const auto stop = line.add(stopReportingSessionForID(5));
  EXPECT_TRUE(line.take(start));
  EXPECT_TRUE(line.take(stop));
  EXPECT_TRUE(line.cancelled().empty());
}

TEST(PendingReplies, AForgottenStartIsNeitherAnsweredNorCancelled) {
  Line line;
  line.add(createReportingSession(5));
  const auto start = line.add(startReportingSessionForID(5));
  EXPECT_TRUE(line.take(1));
  EXPECT_EQ(line.pending().heldCount(), 1U);
  line.pending().forget(start);
  EXPECT_EQ(line.pending().size(), 0U);
  EXPECT_FALSE(line.take(start));
  EXPECT_TRUE(line.take(line.add(destroyReportingSession(5))));
  EXPECT_TRUE(line.cancelled().empty());
}

TEST(PendingReplies, ASecondStartOfARunningSessionIsCancelledAtOnce) {
  Line line;
  line.add(createReportingSession(5));
  line.add(startReportingSessionForID(5));
  const auto second = line.add(startReportingSessionForID(5));
  EXPECT_EQ(line.cancelled(), IDs{second});
}

TEST(PendingReplies, AStartAfterAStopIsAStartAgain) {
  Line line;
  line.add(createReportingSession(5));
  line.add(startReportingSessionForID(5));
  line.add(stopReportingSessionForID(5));
  line.add(startReportingSessionForID(5));
  EXPECT_TRUE(line.cancelled().empty());
  EXPECT_EQ(line.pending().heldCount(), 2U);
}

TEST(PendingReplies, DestroyingTheSessionCancelsItsHeldStartOnceItIsAnswered) {
  Line line;
  line.add(createReportingSession(5));
  const auto start = line.add(startReportingSessionForID(5));
  const auto destroy = line.add(destroyReportingSession(5));
  EXPECT_TRUE(line.cancelled().empty());
  line.take(destroy);
  EXPECT_EQ(line.cancelled(), IDs{start});
}

TEST(PendingReplies, ReplacingTheSessionCancelsItsHeldStart) {
  Line line;
  line.add(createReportingSession(5));
  const auto start = line.add(startReportingSessionForID(5));
  line.take(line.add(createReportingSession(5)));
  EXPECT_EQ(line.cancelled(), IDs{start});
}

TEST(PendingReplies, ChangingTheTypeCancelsTheHeldStartAndSettingTheSameTypeDoesNot) {
  Line line;
  line.add(createReportingSession(5));
  line.add(setServiceType(3, 5));
  const auto start = line.add(startReportingSessionForID(5));
  line.take(line.add(setServiceType(3, 5)));
  EXPECT_TRUE(line.cancelled().empty());
  line.take(line.add(setServiceType(4, 5)));
  EXPECT_EQ(line.cancelled(), IDs{start});
}

TEST(PendingReplies, ANewSessionHasTheUnknownType) {
  Line line;
  line.add(createReportingSession(5));
  line.add(startReportingSessionForID(5));
  line.take(line.add(setServiceType(65535, 5)));
  EXPECT_TRUE(line.cancelled().empty());
}

TEST(PendingReplies, ARefusedRequestChangesNothing) {
  Line line;
  line.add(createReportingSession(5));
  line.add(startReportingSessionForID(5));
  line.take(line.add(destroyReportingSession(5)), true);
  EXPECT_TRUE(line.cancelled().empty());
}

TEST(PendingReplies, OtherSessionsAndLaterStartsAreLeftAlone) {
  Line line;
  line.add(createReportingSession(5));
  line.add(createReportingSession(6));
  const auto start = line.add(startReportingSessionForID(5));
  line.add(startReportingSessionForID(6));
  const auto replace = line.add(createReportingSession(5));
  line.add(startReportingSessionForID(5));
  line.take(replace);
  EXPECT_EQ(line.cancelled(), IDs{start});
  EXPECT_EQ(line.pending().heldCount(), 2U);
}

TEST(PendingReplies, StartsOfUnknownSessionsAreAnsweredAtOnceSoTheyWait) {
  Line line;
  const auto a = line.add(startReportingSessionForID(9));
  const auto b = line.add(startReportingSessionForID(9));
  const auto zero = line.add(startReportingSessionForID(0));
  EXPECT_TRUE(line.cancelled().empty());
  EXPECT_TRUE(line.take(b));
  EXPECT_TRUE(line.take(a));
  EXPECT_TRUE(line.take(zero));
}

TEST(PendingReplies, AForgottenRequestStillTakesItsReplyOffTheLine) {
  Line line;
  const auto id = line.add(getAllReporters());
  line.pending().forget(id);
  EXPECT_TRUE(line.take(id));
  EXPECT_EQ(line.pending().size(), 0U);
}

TEST(PendingReplies, TakeAllKeepsTheOrderOfRequests) {
  Line line;
  line.add(getAllReporters());
  line.add(startReportingSessionForID(9));
  line.add(killService());
  const std::vector<PendingReplies::Rest> rest = line.pending().takeAll();
  ASSERT_EQ(rest.size(), 3U);
  EXPECT_FALSE(rest[1].killedService);
  EXPECT_TRUE(rest[2].killedService);
  EXPECT_EQ(line.pending().size(), 0U);
}

}  // namespace
}  // namespace tarn::client
