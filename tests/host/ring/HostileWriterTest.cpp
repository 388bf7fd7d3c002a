// SPDX-License-Identifier: Apache-2.0
// Clients that write what they like into memory that they share with the service.
#include <random>

#include "tests/host/ring/RingFixture.h"
#include "tests/support/Seeds.h"

namespace tarn::linux_host {
namespace {

using testing::ClientRing;
using testing::eventually;

class HostileWriter : public testing::RingFixture {
 protected:
  // What the first record says of itself.
  static void writeHead(const ClientRing& ring, std::uint32_t kind, std::uint32_t length) {
    const std::uint64_t word = std::uint64_t{kind} << 32U | length;
    std::memcpy(ring.data(), &word, sizeof word);
  }
  bool eventuallyClosed() {
    return eventually([&] { return faults(RingFault::Broken) == 1 && counts().open == 0; });
  }
};

TEST_F(HostileWriter, AHeadThatMakesNoSenseClosesTheRing) {
  start();
  std::uint64_t closed = 0;
  for (const std::uint64_t head :
       {~std::uint64_t{0}, ~std::uint64_t{7}, std::uint64_t{4}, std::uint64_t{4104}, std::uint64_t{1} << 63}) {
    const ClientRing ring;
    ASSERT_EQ(open(ring).error.text(), "");
    ring::SharedWords::storeRelease(&ring.header()->head, head);
    EXPECT_TRUE(eventually([&] { return faults(RingFault::Broken) == closed + 1; })) << head;
    ++closed;
  }
  EXPECT_EQ(counts().open, 0U);
  EXPECT_EQ(log_.entries(platform::LogLevel::Error).size(), closed);
}

TEST_F(HostileWriter, ATakenThatMakesNoSenseClosesTheRing) {
  start();
  const ClientRing ring;
  ring.header()->taken = 3;
  ring.header()->head = 3;
  ASSERT_EQ(open(ring).error.text(), "");
  EXPECT_TRUE(eventuallyClosed());
}

TEST_F(HostileWriter, LengthsThatLieCloseTheRing) {
  struct Row {
    std::uint32_t kind;
    std::uint32_t length;
    std::uint64_t head;
  };
  start();
  std::uint64_t closed = 0;
  for (const Row& row : {Row{TARNRING_MESSAGE, 16, 16},            // beyond what is published
                         Row{TARNRING_MESSAGE, 0xFFFFFFFF, 4096},  // beyond everything
                         Row{TARNRING_MESSAGE, 1017, 4096},        // over a quarter
                         Row{0, 8, 16}, Row{5, 8, 16}, Row{0xFFFFFFFF, 8, 16},
                         Row{TARNRING_FILLER, 8, 4096},     // that doesn't reach the end
                         Row{TARNRING_FILLER, 4088, 4096}}  // that nothing follows
  ) {
    const ClientRing ring;
    writeHead(ring, row.kind, row.length);
    ASSERT_EQ(open(ring).error.text(), "");
    ring::SharedWords::storeRelease(&ring.header()->head, row.head);
    EXPECT_TRUE(eventually([&] { return faults(RingFault::Broken) == closed + 1; })) << row.kind << ' ' << row.length;
    ++closed;
  }
}

TEST_F(HostileWriter, ARecordMayNotReachOverTheEndOfTheArea) {
  start();
  const ClientRing ring;
  ring.header()->taken = ring.header()->head = 4096 - 16;
  const std::uint64_t word = std::uint64_t{TARNRING_FRAME} << 32U | 16;
  std::memcpy(ring.data() + 4096 - 16, &word, sizeof word);
  ASSERT_EQ(open(ring).error.text(), "");
  ring::SharedWords::storeRelease(&ring.header()->head, 4096 + 64);
  EXPECT_TRUE(eventuallyClosed());
}

TEST_F(HostileWriter, OthersDoNotNotice) {
  start();
  ClientRing good;
  ClientRing bad;
  ASSERT_EQ(open(good).error.text(), "");
  ASSERT_EQ(declare(5), "");
  ASSERT_EQ(open(bad).error.text(), "");
  ring::SharedWords::storeRelease(&bad.header()->head, 12345);
  ASSERT_TRUE(eventually([&] { return faults(RingFault::Broken) == 1; }));
  good.message(5, {1});
  EXPECT_TRUE(eventuallyServed(1));
}

TEST_F(HostileWriter, AClientThatFillsItsRingForEverLeavesOthersTheirTurn) {
  start();
  ClientRing greedy;
  ASSERT_EQ(open(greedy).error.text(), "");
  ASSERT_EQ(declare(5), "");
  std::atomic<bool> over{false};
  std::thread poster([&] {
    while (!over) {
      greedy.message(5, {1});
    }
  });
  const auto other = std::make_shared<testing::NotingOwner>(running_.loop);
  const auto rings = running_.onQueue([&] { return board_->connect(other); });
  ClientRing modest;
  ASSERT_EQ(running_.onQueue([&] { return rings->open(modest.descriptors()).error.text(); }), "");
  modest.post(TARNRING_FRAME, "\x83\x01\x01\x05");
  EXPECT_TRUE(eventually([&] { return other->count == 1; }));
  over = true;
  poster.join();
}

// Posts, and scribbles over everything while the service reads.
void scribble(ClientRing& ring, std::mt19937_64& random, const std::atomic<bool>& over) {
  auto* const words = reinterpret_cast<std::uint64_t*>(ring.header());
  const std::size_t headerWords = sizeof(tarnring_header) / 8;
  const std::size_t dataWords = ring.dataBytes() / 8;
  while (!over) {
    const std::uint64_t choice = random() % 16;
    if (choice == 0) {
      ring::SharedWords::store(words + random() % headerWords, random());
    } else if (choice < 4) {
      const std::size_t at = TARNRING_HEADER_BYTES / 8 + random() % dataWords;
      const std::uint64_t kind = random() % 6;
      ring::SharedWords::store(words + at, random() % 2 != 0 ? random() : kind << 32U | random() % 1100);
    } else if (choice < 8) {
      ring::SharedWords::storeRelease(&ring.header()->head,
                                      ring::SharedWords::load(&ring.header()->taken) + random() % 600 * 8);
    } else {
      ring.message(static_cast<std::uint32_t>(random() % 8), {random()});
    }
  }
}

TEST_F(HostileWriter, ScribblingOverHeaderAndDataHarmsNobodyElse) {
  start();
  for (const std::uint64_t seed : testing::testSeeds(4713)) {
    SCOPED_TRACE(testing::seedNote(seed));
    std::mt19937_64 random(seed);
    for (int round = 0; round < 40; ++round) {
      ClientRing ring;
      ASSERT_EQ(open(ring).error.text(), "");
      for (int shape = 0; shape < 4; ++shape) {
        ASSERT_EQ(declare(shape), "");
      }
      std::atomic<bool> over{false};
      std::thread writer([&] { scribble(ring, random, over); });
      std::this_thread::sleep_for(std::chrono::milliseconds(10));
      over = true;
      writer.join();
      ASSERT_TRUE(end());
      ASSERT_EQ(counts().open, 0U);
      rings_ = running_.onQueue([&] { return board_->connect(owner_); });
    }
  }
  ClientRing ring;
  ASSERT_EQ(open(ring).error.text(), "");
  ASSERT_EQ(declare(5), "");
  const std::size_t before = owner_->count;
  ring.message(5, {1});
  EXPECT_TRUE(eventuallyServed(before + 1));
}

}  // namespace
}  // namespace tarn::linux_host
