// SPDX-License-Identifier: Apache-2.0
#include <numeric>

#include "tests/host/ring/RingFixture.h"
#include "wire/Encoder.h"

namespace tarn::linux_host {
namespace {

using testing::ClientRing;
using testing::eventually;

class ConnectionRingsTest : public testing::RingFixture {};

std::vector<std::int64_t> upTo(std::int64_t count) {
  std::vector<std::int64_t> numbers(static_cast<std::size_t>(count));
  std::iota(numbers.begin(), numbers.end(), 0);
  return numbers;
}

std::string frameOf(const wire::Request& request) {
  std::string frame;
  wire::Encoder(frame).request(1, request);
  return frame.substr(wire::kFrameHeaderBytes);
}

TEST_F(ConnectionRingsTest, MessagesAreServedInTheirOrder) {
  start();
  ClientRing ring;
  EXPECT_EQ(open(ring).value, 1U);
  EXPECT_EQ(declare(5), "");
  for (std::uint64_t number = 0; number < 500; ++number) {
    while (!ring.message(5, {number})) {
      std::this_thread::yield();
    }
  }
  EXPECT_TRUE(eventuallyServed(500));
  EXPECT_EQ(numbers(), upTo(500));
  EXPECT_TRUE(eventually([&] { return seen(ring.header()->taken) == ring.producer.head(); }));
  EXPECT_EQ(seen(ring.header()->taken_messages), 500U);
  EXPECT_EQ(counts().messages, 500U);
}

TEST_F(ConnectionRingsTest, WhatARecordAskedForMayBeDoneBeforeTheNextIsRead) {
  start();
  ClientRing ring;
  ASSERT_EQ(declare(5), "");
  for (std::uint64_t number = 0; number < 3; ++number) {
    ASSERT_TRUE(ring.message(5, {number}));
  }
  ASSERT_EQ(open(ring).error.text(), "");
  ASSERT_TRUE(eventuallyServed(3));
  running_.onQueue([&] { EXPECT_EQ(owner_->workedOff, (std::vector<std::size_t>{1, 2, 3})); });
}

// A service that is killed later must not leave it to the next one, which would serve it again.
TEST_F(ConnectionRingsTest, ARecordIsTakenBeforeItIsHandedOver) {
  start();
  ClientRing ring;
  ASSERT_EQ(declare(5), "");
  for (std::uint64_t number = 0; number < 3; ++number) {
    ASSERT_TRUE(ring.message(5, {number}));
  }
  running_.onQueue([&] { owner_->watched = ring.header(); });
  ASSERT_EQ(open(ring).error.text(), "");
  ASSERT_TRUE(eventuallyServed(3));
  running_.onQueue([&] { EXPECT_EQ(owner_->takenThen, (std::vector<std::uint64_t>{1, 2, 3})); });
}

TEST_F(ConnectionRingsTest, FramesOfTheWireAreServedToo) {
  start();
  ClientRing ring;
  ASSERT_EQ(open(ring).error.text(), "");
  wire::Request create;
  create.operation = wire::Operation::CreateReportingSession;
  create.reporterID = 77;
  ring.post(TARNRING_FRAME, frameOf(create));
  ASSERT_TRUE(eventuallyServed(1));
  running_.onQueue([&] {
    EXPECT_EQ(owner_->requests[0].operation, wire::Operation::CreateReportingSession);
    EXPECT_EQ(owner_->requests[0].reporterID, 77);
  });
}

TEST_F(ConnectionRingsTest, AShapeMayBeDeclaredInTheRing) {
  start();
  ClientRing ring;
  ASSERT_EQ(open(ring).error.text(), "");
  wire::Request shape;
  shape.operation = wire::Operation::DeclareShape;
  shape.dictionary = {
      {"shape", 0}, {"category", 4}, {"type", 1}, {"keys", plist::Array{"number"}}, {"kinds", plist::Array{"integer"}}};
  ring.post(TARNRING_FRAME, frameOf(shape));
  ring.message(0, {9});
  ASSERT_TRUE(eventuallyServed(1));
  EXPECT_EQ(numbers(), std::vector<std::int64_t>{9});
}

TEST_F(ConnectionRingsTest, RecordsThatCannotBeServedAreCountedByReasonAndGoneOnWith) {
  start();
  ClientRing ring;
  ASSERT_EQ(open(ring).error.text(), "");
  ASSERT_EQ(declare(5), "");
  ring.post(TARNRING_FRAME, "\x82\x01\x18\x63");                       // operation 99
  ring.post(TARNRING_FRAME, std::string_view("\x82\x01\x18\x64", 4));  // status, the host's own
  ring.post(TARNRING_FRAME,
            "\x83\x01\x01\x61"
            "a");  // a text for a reporter ID
  ring.post(TARNRING_FRAME,
            "\x86\x01\x06\xA1\x61"
            "a\xF6\x04\x01\xF6");  // null in a dictionary
  ring.post(TARNRING_FRAME, "\xFF");
  ring.post(TARNRING_FRAME, "");
  ring.message(5, {1, 2});
  ring.message(1024, {1});
  EXPECT_EQ(owner_->count, 0U);
  ring.message(5, {7});
  EXPECT_TRUE(eventuallyServed(1));
  EXPECT_EQ(refused(TARNRING_UNKNOWN_OPERATION), 2U);
  EXPECT_EQ(refused(TARNRING_BAD_ARGUMENTS), 1U);
  EXPECT_EQ(refused(TARNRING_NOT_PROPERTY_LIST), 1U);
  EXPECT_EQ(refused(TARNRING_UNREADABLE), 2U);
  EXPECT_EQ(refused(TARNRING_BAD_VALUES), 2U);
  EXPECT_EQ(seen(ring.header()->refused), 8U);
  EXPECT_EQ(seen(ring.header()->last_refusal), static_cast<std::uint64_t>(TARNRING_BAD_VALUES));
}

TEST_F(ConnectionRingsTest, AMessageThatThereIsNoMemoryToServeIsRefusedAndTheNextOneServed) {
  start();
  ClientRing ring;
  ASSERT_EQ(open(ring).error.text(), "");
  ASSERT_EQ(declare(5), "");
  owner_->hasNoMemory = true;
  ring.message(5, {1});
  ASSERT_TRUE(eventually([&] { return refused(TARNRING_OUT_OF_MEMORY) == 1; }));
  owner_->hasNoMemory = false;
  ring.message(5, {2});
  EXPECT_TRUE(eventuallyServed(1));
  EXPECT_EQ(numbers(), std::vector<std::int64_t>{2});
  EXPECT_EQ(seen(ring.header()->last_refusal), static_cast<std::uint64_t>(TARNRING_OUT_OF_MEMORY));
}

TEST_F(ConnectionRingsTest, AMessageWaitsForItsShape) {
  start();
  ClientRing ring;
  ASSERT_EQ(open(ring).error.text(), "");
  ring.message(5, {1});
  EXPECT_FALSE(eventually([&] { return owner_->count != 0; }, std::chrono::seconds(0)));
  EXPECT_EQ(seen(ring.header()->taken), 0U);
  ASSERT_EQ(declare(5), "");
  EXPECT_TRUE(eventuallyServed(1));
}

TEST_F(ConnectionRingsTest, NothingIsServedWhileItsOwnerTakesNothing) {
  start();
  ClientRing ring;
  ASSERT_EQ(open(ring).error.text(), "");
  ASSERT_EQ(declare(5), "");
  owner_->takes = false;
  ring.message(5, {1});
  std::this_thread::sleep_for(std::chrono::milliseconds(20));
  EXPECT_EQ(owner_->count, 0U);
  owner_->takes = true;
  EXPECT_TRUE(eventuallyServed(1));
}

TEST_F(ConnectionRingsTest, DroppedMessagesReachTheLedger) {
  start();
  ClientRing ring;
  ASSERT_EQ(declare(5), "");
  while (ring.message(5, {1})) {
  }
  ring.message(5, {1});  // two are dropped before anybody reads the ring
  const std::uint64_t posted = seen(ring.header()->posted);
  ASSERT_EQ(open(ring).error.text(), "");
  EXPECT_TRUE(eventuallyServed(posted));
  EXPECT_TRUE(eventually([&] { return counts().droppedByClients == 2; }));
  ring.message(5, {1});
  EXPECT_TRUE(eventuallyServed(posted + 1));
  EXPECT_EQ(counts().gaps, 1U);
  EXPECT_EQ(counts().droppedByClients, 2U);
}

TEST_F(ConnectionRingsTest, OfARingThatWasReadBeforeOnlyWhatIsDroppedNowCounts) {
  start();
  ClientRing ring;
  ASSERT_EQ(declare(5), "");
  ASSERT_TRUE(ring.message(5, {1}));
  ASSERT_EQ(open(ring).error.text(), "");
  ASSERT_TRUE(eventually([&] { return seen(ring.header()->taken_messages) == 1; }));
  ASSERT_TRUE(end());
  ring.header()->dropped += 3;
  rings_ = running_.onQueue([&] { return board_->connect(owner_); });
  ASSERT_EQ(open(ring).error.text(), "");
  ASSERT_EQ(declare(5), "");
  ring.header()->dropped += 2;
  ASSERT_TRUE(ring.message(5, {2}));
  ASSERT_TRUE(eventuallyServed(2));
  EXPECT_TRUE(eventually([&] { return counts().droppedByClients == 2; }));
}

TEST_F(ConnectionRingsTest, CommittedFollowsTheRecorder) {
  start();
  ClientRing ring;
  ASSERT_EQ(open(ring).error.text(), "");
  ASSERT_EQ(declare(5), "");
  handedOver = 10;
  committed = 4;
  ring.message(5, {1});
  ASSERT_TRUE(eventuallyServed(1));
  std::this_thread::sleep_for(std::chrono::milliseconds(20));
  EXPECT_EQ(seen(ring.header()->committed), 0U);
  committed = 9;
  std::this_thread::sleep_for(std::chrono::milliseconds(20));
  EXPECT_EQ(seen(ring.header()->committed), 0U);
  committed = 10;
  EXPECT_TRUE(eventually([&] { return seen(ring.header()->committed) == ring.producer.head(); }));
  EXPECT_EQ(seen(ring.header()->committed_messages), 1U);
}

TEST_F(ConnectionRingsTest, NothingCountsAsHandedOverWhileWorkersHaveWork) {
  start();
  ClientRing ring;
  ASSERT_EQ(open(ring).error.text(), "");
  ASSERT_EQ(declare(5), "");
  settled = false;
  ring.message(5, {1});
  ASSERT_TRUE(eventuallyServed(1));
  std::this_thread::sleep_for(std::chrono::milliseconds(20));
  EXPECT_EQ(seen(ring.header()->committed), 0U);
  settled = true;
  EXPECT_TRUE(eventually([&] { return seen(ring.header()->committed) == ring.producer.head(); }));
}

TEST_F(ConnectionRingsTest, AQuietRingSleepsAndIsWoken) {
  limits.awakeFor = std::chrono::milliseconds(10);
  start();
  ClientRing ring;
  ASSERT_EQ(open(ring).error.text(), "");
  ASSERT_EQ(declare(5), "");
  for (std::size_t round = 1; round <= 3; ++round) {
    ASSERT_TRUE(eventually([&] { return seen(ring.header()->asleep) != 0; }));
    ring.message(5, {round});
    EXPECT_TRUE(ring.wakeIfAsleep());
    EXPECT_FALSE(ring.wakeIfAsleep());  // once a sleep
    EXPECT_TRUE(eventuallyServed(round));
  }
}

TEST_F(ConnectionRingsTest, TheEndOfAConnectionServesWhatWasPosted) {
  limits.turnBytes = 64;
  start();
  ClientRing ring;
  ASSERT_EQ(open(ring).error.text(), "");
  ASSERT_EQ(declare(5), "");
  owner_->takes = false;
  for (std::uint64_t number = 0; number < 100; ++number) {
    ASSERT_TRUE(ring.message(5, {number}));
  }
  ring.message(6, {1});  // of a shape that never comes
  auto drained = std::make_shared<std::atomic<bool>>(false);
  running_.onQueue([&] { rings_->end([drained] { *drained = true; }); });
  EXPECT_FALSE(drained->load());
  owner_->takes = true;
  EXPECT_TRUE(eventually([&] { return drained->load(); }));
  EXPECT_EQ(numbers(), upTo(100));
  EXPECT_EQ(refused(TARNRING_UNKNOWN_SHAPE), 1U);
  EXPECT_EQ(counts().open, 0U);
}

// The declaration didn't reach the service any more; the client says it again to the next one.
TEST_F(ConnectionRingsTest, AtTheServicesEndAMessageWithoutItsShapeAndWhatFollowsStayInTheRing) {
  start();
  ClientRing ring;
  ASSERT_EQ(open(ring).error.text(), "");
  ASSERT_EQ(declare(5), "");
  ring.message(5, {0});
  ring.message(6, {1});
  ring.message(5, {2});
  running_.onQueue([&] { board_->serviceEnds = true; });
  EXPECT_TRUE(end());
  EXPECT_EQ(numbers(), upTo(1));
  EXPECT_EQ(seen(ring.header()->taken_messages), 1U);
  EXPECT_EQ(refused(TARNRING_UNKNOWN_SHAPE), 0U);
  EXPECT_EQ(counts().open, 0U);
}

TEST_F(ConnectionRingsTest, AClientThatPostsForEverDoesNotKeepItsConnectionFromEnding) {
  start();
  ClientRing ring;
  ASSERT_EQ(open(ring).error.text(), "");
  ASSERT_EQ(declare(5), "");
  std::atomic<bool> over{false};
  std::thread poster([&] {
    while (!over) {
      ring.message(5, {1});
    }
  });
  EXPECT_TRUE(end());
  over = true;
  poster.join();
}

TEST_F(ConnectionRingsTest, ARingThatItsClientEndedIsClosedOnceItIsRead) {
  start();
  ClientRing ring;
  ASSERT_EQ(open(ring).error.text(), "");
  ASSERT_EQ(declare(5), "");
  ring.message(5, {1});
  ring::SharedWords::storeRelease(&ring.header()->ended, 1);
  EXPECT_TRUE(eventuallyServed(1));
  EXPECT_TRUE(eventually([&] { return counts().open == 0; }));
  EXPECT_EQ(counts().bytesOpen, 0U);
  EXPECT_EQ(seen(ring.header()->committed), ring.producer.head());
}

TEST_F(ConnectionRingsTest, ARingIsReadOnByTheNextConnectionAndByOneAtATime) {
  start();
  ClientRing ring;
  ASSERT_EQ(open(ring).error.text(), "");
  ASSERT_EQ(declare(5), "");
  ring.message(5, {0});
  ASSERT_TRUE(eventuallyServed(1));
  EXPECT_EQ(open(ring).error.text(), "openRing: the ring is open already");
  ASSERT_TRUE(end());
  ring.message(5, {1});
  rings_ = running_.onQueue([&] { return board_->connect(owner_); });
  ASSERT_EQ(open(ring).error.text(), "");
  ASSERT_EQ(declare(5), "");
  EXPECT_TRUE(eventuallyServed(2));
  EXPECT_EQ(numbers(), upTo(2));
}

TEST_F(ConnectionRingsTest, ThereIsABoundToTheRingsOfAConnection) {
  limits.maxRingsAConnection = 2;
  start();
  const ClientRing rings[3];
  EXPECT_EQ(open(rings[0]).error.text(), "");
  EXPECT_EQ(open(rings[1]).error.text(), "");
  EXPECT_EQ(open(rings[2]).error.text(), "openRing: too many rings");
  EXPECT_EQ(faults(RingFault::TooMany), 1U);
  EXPECT_EQ(counts().open, 2U);
}

TEST_F(ConnectionRingsTest, OtherDescriptorsAreRefusedWithOneLine) {
  start();
  const ClientRing ring;
  EXPECT_EQ(openWith({}).error.text(), "openRing: a memory file and an eventfd expected");
  auto swapped = ring.descriptors();
  std::swap(swapped[0], swapped[1]);
  EXPECT_NE(openWith(std::move(swapped)).error.text(), "");
  auto one = ring.descriptors();
  one.pop_back();
  EXPECT_NE(openWith(std::move(one)).error.text(), "");
  EXPECT_EQ(open(ClientRing(4096, 0)).error.text(),
            "openRing: a memory file sealed against shrinking and growing expected");
  EXPECT_EQ(faults(RingFault::Descriptors), 3U);
  EXPECT_EQ(log_.entries(platform::LogLevel::Error).size(), 1U);
  EXPECT_EQ(counts().open, 0U);
}

}  // namespace
}  // namespace tarn::linux_host
