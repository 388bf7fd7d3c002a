// SPDX-License-Identifier: Apache-2.0
// Messages for one session that stand one after the other in a ring are handed over together.
#include <numeric>

#include "tests/host/ring/RingFixture.h"
#include "wire/Encoder.h"

namespace tarn::linux_host {
namespace {

using testing::ClientRing;
using testing::eventually;
using Sizes = std::vector<std::size_t>;

class RingRuns : public testing::RingFixture {
 protected:
  // Shapes 5 and 6 are for sessions 77 and 78, shape 7 for both, shape 8 for every one.
  void startWithShapes() {
    start();
    ASSERT_EQ(declare(5, {77}), "");
    ASSERT_EQ(declare(6, {78}), "");
    ASSERT_EQ(declare(7, {77, 78}), "");
    ASSERT_EQ(declare(8), "");
  }
  void post(std::uint32_t shape, std::uint64_t number) { ASSERT_TRUE(ring_.message(shape, {number})); }
  // Numbers 0 and up of shape 5.
  void postRun(std::uint64_t count) {
    for (std::uint64_t number = 0; number < count; ++number) {
      post(5, number);
    }
  }
  // All that was posted is there when the ring is first looked at.
  void openAndServe(std::size_t count) {
    ASSERT_EQ(open(ring_).error.text(), "");
    ASSERT_TRUE(eventuallyServed(count));
    ASSERT_TRUE(eventually([&] { return seen(ring_.header()->taken) == ring_.producer.head(); }));
  }
  Sizes runs() {
    return running_.onQueue([&] { return owner_->runs; });
  }
  static std::vector<std::int64_t> upTo(std::int64_t count) {
    std::vector<std::int64_t> numbers(static_cast<std::size_t>(count));
    std::iota(numbers.begin(), numbers.end(), 0);
    return numbers;
  }

  ClientRing ring_;
};

TEST_F(RingRuns, MessagesForOneSessionAreHandedOverTogether) {
  startWithShapes();
  postRun(20);
  openAndServe(20);
  EXPECT_EQ(runs(), Sizes{20});
  EXPECT_EQ(numbers(), upTo(20));
  EXPECT_EQ(counts().messages, 20U);
  EXPECT_EQ(seen(ring_.header()->taken_messages), 20U);
  running_.onQueue([&] {
    EXPECT_EQ(owner_->announced, 20U);
    EXPECT_EQ(owner_->requests[19].reporterIDs, (std::vector<std::int64_t>{77}));
    EXPECT_EQ(owner_->requests[19].category, 4U);
    EXPECT_EQ(owner_->requests[19].type, 1U);
    EXPECT_TRUE(owner_->requests[19].dictionary.contains("tarnreporting_timestamp"));
  });
}

TEST_F(RingRuns, OneReachesOverShapesOfOneSessionEach) {
  startWithShapes();
  for (std::uint64_t number = 0; number < 6; ++number) {
    post(number % 2 == 0 ? 5 : 6, number);
  }
  openAndServe(6);
  EXPECT_EQ(runs(), Sizes{6});
  EXPECT_EQ(numbers(), upTo(6));
  running_.onQueue([&] {
    EXPECT_EQ(owner_->requests[4].reporterIDs, (std::vector<std::int64_t>{77}));
    EXPECT_EQ(owner_->requests[5].reporterIDs, (std::vector<std::int64_t>{78}));
  });
}

TEST_F(RingRuns, OneEndsAtAMessageForOtherThanOneSession) {
  startWithShapes();
  post(5, 0);
  post(7, 1);
  post(5, 2);
  post(5, 3);
  post(8, 4);
  post(5, 5);
  openAndServe(6);
  EXPECT_EQ(runs(), (Sizes{1, 2, 1}));
  EXPECT_EQ(numbers(), upTo(6));
  EXPECT_EQ(counts().messages, 6U);
}

TEST_F(RingRuns, WhatEndsTheSessionInTheMiddleComesInItsPlace) {
  startWithShapes();
  post(5, 0);
  post(5, 1);
  wire::Request stop;
  stop.operation = wire::Operation::StopReportingSessionForID;
  stop.reporterID = 77;
  std::string frame;
  wire::Encoder(frame).request(1, stop);
  ASSERT_TRUE(ring_.post(TARNRING_FRAME, frame.substr(wire::kFrameHeaderBytes)));
  post(5, 2);
  openAndServe(4);
  EXPECT_EQ(runs(), (Sizes{2, 1}));
  running_.onQueue([&] {
    EXPECT_EQ(owner_->requests[1].dictionary["number"].asInt64(), 1);
    EXPECT_EQ(owner_->requests[2].operation, wire::Operation::StopReportingSessionForID);
    EXPECT_EQ(owner_->requests[3].dictionary["number"].asInt64(), 2);
  });
}

TEST_F(RingRuns, WhatIsRefusedInTheMiddleIsPassed) {
  startWithShapes();
  post(5, 0);
  ASSERT_TRUE(ring_.message(5, {1, 1}));
  ASSERT_TRUE(ring_.message(5, {}));
  post(5, 1);
  openAndServe(2);
  EXPECT_EQ(runs(), Sizes{2});
  EXPECT_EQ(numbers(), upTo(2));
  EXPECT_EQ(refused(TARNRING_BAD_VALUES), 2U);
  EXPECT_EQ(seen(ring_.header()->taken_messages), 4U);
  EXPECT_EQ(counts().messages, 2U);
}

TEST_F(RingRuns, AMessageThatWaitsForItsShapeHoldsWhatComesAfterIt) {
  startWithShapes();
  post(5, 0);
  post(9, 1);
  post(5, 2);
  ASSERT_EQ(open(ring_).error.text(), "");
  ASSERT_TRUE(eventuallyServed(1));
  EXPECT_FALSE(eventually([&] { return owner_->count != 1; }, std::chrono::seconds(0)));
  ASSERT_EQ(declare(9, {77}), "");
  ASSERT_TRUE(eventuallyServed(3));
  EXPECT_EQ(numbers(), upTo(3));
}

TEST_F(RingRuns, OneEndsWithTheShareOfTheTurn) {
  limits.turnBytes = 5 * 32;  // a message takes 32 bytes
  startWithShapes();
  postRun(12);
  openAndServe(12);
  EXPECT_EQ(runs(), (Sizes{5, 5, 2}));
  EXPECT_EQ(numbers(), upTo(12));
}

TEST_F(RingRuns, OneEndsWhenItsOwnerTakesNoMore) {
  startWithShapes();
  postRun(8);
  running_.onQueue([&] { owner_->mostOfRun = 3; });
  openAndServe(8);
  EXPECT_EQ(runs(), (Sizes{3, 3, 2}));
  EXPECT_EQ(numbers(), upTo(8));
}

TEST_F(RingRuns, OfOneEachMessageIsTakenBeforeItIsHandedOver) {
  startWithShapes();
  postRun(3);
  running_.onQueue([&] { owner_->watched = ring_.header(); });
  openAndServe(3);
  running_.onQueue([&] { EXPECT_EQ(owner_->takenThen, (std::vector<std::uint64_t>{1, 2, 3})); });
  EXPECT_EQ(runs(), Sizes{3});
}

TEST_F(RingRuns, WithoutThemMessagesAreHandedOverOneByOne) {
  startWithShapes();
  postRun(3);
  running_.onQueue([&] { owner_->takesRuns = false; });
  openAndServe(3);
  EXPECT_EQ(runs(), Sizes{});
  EXPECT_EQ(numbers(), upTo(3));
  EXPECT_EQ(counts().messages, 3U);
  running_.onQueue([&] { EXPECT_EQ(owner_->workedOff, (Sizes{1, 2, 3})); });
}

TEST_F(RingRuns, AMessageThatIsGivenUpIsNotServedAgainAndTheNextOneIs) {
  startWithShapes();
  owner_->hasNoMemory = true;
  postRun(3);
  ASSERT_EQ(open(ring_).error.text(), "");
  ASSERT_TRUE(eventually([&] { return seen(ring_.header()->taken_messages) == 3; }));
  owner_->hasNoMemory = false;
  post(5, 3);
  ASSERT_TRUE(eventuallyServed(1));
  EXPECT_EQ(numbers(), std::vector<std::int64_t>{3});
  EXPECT_EQ(runs(), (Sizes{1, 1, 1, 1}));
}

TEST_F(RingRuns, TheEndOfAConnectionServesWhatWasPostedByThenAndNoMore) {
  startWithShapes();
  ASSERT_EQ(open(ring_).error.text(), "");
  owner_->takes = false;
  postRun(3);
  auto drained = std::make_shared<std::atomic<bool>>(false);
  running_.onQueue([&] {
    rings_->end([drained] { *drained = true; });
    post(5, 3);  // too late
  });
  owner_->takes = true;
  ASSERT_TRUE(eventually([&] { return drained->load(); }));
  EXPECT_EQ(numbers(), upTo(3));
}

}  // namespace
}  // namespace tarn::linux_host
