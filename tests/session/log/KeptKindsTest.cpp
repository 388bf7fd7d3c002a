// SPDX-License-Identifier: Apache-2.0
// The look-up of the newest message of a kind, when messages lie in pages: what is read back, and what is kept of it.
#include <gtest/gtest.h>

#include <algorithm>
#include <cstdint>
#include <memory>
#include <random>
#include <utility>

#include "session/TarnReportingSessionMessageLog.h"
#include "tests/session/log/MessageListFixture.h"
#include "tests/support/HeapUse.h"
#include "tests/support/Seeds.h"

namespace tarn {
namespace {

using namespace testing;

constexpr int kMostKept = 256;

class KeptKinds : public KilobyteLists {
 protected:
  // Every message is moved, into a page of its own.
  KeptKinds() {
    setBounds(1, kNoBound);
    firstPlace_ = store_.places().size();
  }

  static std::shared_ptr<TarnReportingSessionMessage> ofKind(int kind, int n, double time = 0) {
    return std::make_shared<TarnReportingSessionMessage>(plist::Dictionary{{"n", n}, {"tarnreporting_timestamp", time}},
                                                         static_cast<AudioEventCategory>(kind), AudioEventType::State);
  }
  // One message each, numbered as its kind.
  void addKinds(int from, int to) {
    for (int kind = from; kind < to; ++kind) {
      log_.append(ofKind(kind, kind));
    }
  }
  // The number of the newest of that kind; -1 when there is none.
  std::int64_t look(int kind) const {
    const TarnReportingSessionMessage* const newest =
        log_.newest(static_cast<AudioEventCategory>(kind), AudioEventType::State);
    return newest == nullptr ? -1 : newest->message().get("n").asInt64();
  }
  // How many pages that takes.
  std::size_t readsOf(int from, int to) const {
    const std::size_t before = platform_.overflow.blocksRead();
    for (int kind = from; kind < to; ++kind) {
      EXPECT_EQ(look(kind), kind);
    }
    return platform_.overflow.blocksRead() - before;
  }
  // Looks all up, and again: then what is kept takes no reading. The kinds are more than are kept.
  void expectMostKept(int from, int to) const {
    readsOf(from, to);
    EXPECT_EQ(readsOf(from, to), static_cast<std::size_t>(to - from - kMostKept));
  }
  void change(std::size_t index, int n) {
    log_.messages().change(index, [n](TarnReportingSessionMessage& message) { message.mutableMessage().set("n", n); });
  }

  TarnReportingSessionMessageLog log_{4711};
  std::size_t firstPlace_ = 0;
};

TEST_F(KeptKinds, SoManyAreKeptAndNoMore) {
  addKinds(0, 300);
  EXPECT_EQ(readsOf(0, 300), 300U);
  EXPECT_EQ(readsOf(0, 300), 44U);
}

TEST_F(KeptKinds, KindWithANewerMessageMakesRoomForAnother) {
  addKinds(0, kMostKept);
  readsOf(0, kMostKept);
  for (int kind = 0; kind < 10; ++kind) {
    log_.append(ofKind(kind, kind));
  }
  addKinds(kMostKept, kMostKept + 10);
  readsOf(kMostKept, kMostKept + 10);
  EXPECT_EQ(readsOf(10, kMostKept + 10), 0U);
}

TEST_F(KeptKinds, AfterAClearAsManyAreKeptAgain) {
  addKinds(0, 300);
  readsOf(0, 300);
  log_.clear();
  addKinds(300, 600);
  expectMostKept(300, 600);
}

TEST_F(KeptKinds, AfterASortAsManyAreKeptAgain) {
  addKinds(0, 300);
  readsOf(0, 300);
  log_.append(ofKind(300, 300, -1));
  log_.sort();
  expectMostKept(0, 301);
}

TEST_F(KeptKinds, AfterAChangeInPlaceAsManyAreKeptAgain) {
  addKinds(0, 300);
  readsOf(0, 300);
  change(0, 0);
  expectMostKept(0, 300);
}

TEST_F(KeptKinds, ChangeOfAMessageThatWasReadAgainIsSeen) {
  addKinds(0, 5);
  readsOf(0, 5);  // all are kept, and the page of the first isn't at hand any more
  change(0, 7);
  readsOf(1, 5);
  EXPECT_EQ(look(0), 7);
}

TEST_F(KeptKinds, LostMessagesTakeNoRoom) {
  addKinds(0, 2 * kMostKept);
  for (std::size_t place = 0; place < kMostKept; ++place) {
    store_.lose(store_.places()[firstPlace_ + place]);
  }
  for (int kind = 0; kind < kMostKept; ++kind) {
    EXPECT_EQ(look(kind), -1);
  }
  EXPECT_EQ(usage().lost, static_cast<std::uint64_t>(kMostKept));
  readsOf(kMostKept, 2 * kMostKept);
  EXPECT_EQ(readsOf(kMostKept, 2 * kMostKept), 0U);
}

TEST_F(KeptKinds, InMemoryTheNewestOfEachIsFoundAfterASort) {
  setBounds(kNoBound, kNoBound);
  TarnReportingSessionMessageLog log(7);
  log.append(ofKind(0, 0, 1));
  log.append(ofKind(1, 1, 5));
  log.append(ofKind(2, 2, 4));
  log.append(ofKind(1, 3, 3));
  log.append(ofKind(2, 4, 2));
  const auto newest = [&](int kind) {
    return log.newest(static_cast<AudioEventCategory>(kind), AudioEventType::State)->message().get("n").asInt64();
  };
  EXPECT_EQ(newest(1), 3);
  log.sort();
  EXPECT_EQ(newest(0), 0);
  EXPECT_EQ(newest(1), 1);
  EXPECT_EQ(newest(2), 2);
  log.sort();  // in order by now
  EXPECT_EQ(newest(0), 0);
  EXPECT_EQ(newest(1), 1);
  EXPECT_EQ(newest(2), 2);
}

TEST_F(KeptKinds, SortOfALogInOrderReadsNothing) {
  addKinds(0, 20);
  log_.sort();
  EXPECT_EQ(platform_.overflow.blocksRead(), 0U);
}

TEST_F(KeptKinds, KindOfWhichNothingIsLeftAfterASortIsNotFound) {
  log_.append(ofKind(0, 0, 2));
  log_.append(ofKind(1, 1, 1));
  log_.append(ofKind(2, 2, 3));
  store_.lose(store_.places()[firstPlace_ + 2]);
  log_.sort();
  EXPECT_EQ(look(0), 0);
  EXPECT_EQ(look(1), 1);
  EXPECT_EQ(look(2), -1);
}

TEST_F(KeptKinds, SortReadsNoPagesForTheLookUp) {
  addKinds(0, 20);
  log_.append(ofKind(20, 20, -1));
  log_.sort();
  EXPECT_EQ(platform_.overflow.blocksRead(), 0U);
}

TEST_F(KeptKinds, AfterASortALookUpReadsBackNoFurtherThanToTheKind) {
  addKinds(0, 20);
  log_.append(ofKind(20, 20, -1));
  log_.sort();
  EXPECT_EQ(readsOf(18, 20), 2U);
  EXPECT_EQ(readsOf(17, 18), 1U);
}

TEST_F(KeptKinds, MessageThatCameAfterASortIsFoundWithoutLookingBack) {
  addKinds(0, 20);
  log_.append(ofKind(20, 20, -1));
  log_.sort();
  addKinds(3, 4);
  EXPECT_EQ(readsOf(3, 4), 1U);
}

TEST_F(KeptKinds, WhatIsFoundIsWhatAWalkFinds) {
  for (const std::uint64_t seed : testSeeds(3)) {
    SCOPED_TRACE(seedNote(seed));
    std::mt19937 random(static_cast<std::mt19937::result_type>(seed));
    setBounds(random() % 2 == 0 ? 1000 : kNoBound, kNoBound);
    TarnReportingSessionMessageLog log(7);
    for (int n = 0; n < 1000; ++n) {
      const int kind = static_cast<int>(random() % 12);
      const auto category = static_cast<AudioEventCategory>(kind);
      log.append(ofKind(kind, n, static_cast<double>(n - static_cast<int>(random() % 7))));
      if (random() % 50 == 0) {
        log.sort();
      }
      const auto asked = static_cast<AudioEventCategory>(random() % 13);
      const TarnReportingSessionMessage* const found = log.newest(asked, AudioEventType::State);
      std::int64_t expected = -1;
      for (const auto& record : log.messages()) {
        expected = record->category() == asked ? record->message().get("n").asInt64() : expected;
      }
      ASSERT_EQ(found == nullptr ? -1 : found->message().get("n").asInt64(), expected) << "of " << n;
      ASSERT_NE(log.newest(category, AudioEventType::State), nullptr);
    }
  }
}

TEST_F(KeptKinds, FirstMessageInMemoryIsLetGoWhenItIsMoved) {
  setBounds(8 * kKilobyte, kNoBound);
  TarnReportingSessionMessageLog log(4711);
  for (int n = 0; n < 8; ++n) {
    log.append(kilobyte(n, n));
  }
  auto ninth = std::make_shared<TarnReportingSessionMessage>(kilobyte(8, 8)->message(),
                                                             static_cast<AudioEventCategory>(1), AudioEventType::State);
  const std::weak_ptr<TarnReportingSessionMessage> record = ninth;
  log.append(std::move(ninth));
  for (int n = 9; n < 16; ++n) {
    log.append(kilobyte(n, n));
  }
  ASSERT_EQ(log.messages().overflowed(), 8U);  // it is the first in memory
  EXPECT_EQ(log.newest(static_cast<AudioEventCategory>(1), AudioEventType::State), record.lock().get());
  log.append(kilobyte(16, 16));
  EXPECT_TRUE(record.expired());
}

class LookUpInALargePage : public KilobyteLists {
 protected:
  // A page of a hundred messages, of which the first fifty are the newest of their kinds, and what stays in memory.
  LookUpInALargePage() {
    setBounds(800 * kKilobyte, kNoBound);
    for (int n = 0; n < 900; ++n) {
      const auto message = kilobyte(n, n);
      log_.append(std::make_shared<TarnReportingSessionMessage>(message->message(), kind(std::min(n, 50)),
                                                                AudioEventType::State));
    }
    queue_ = platform_.workQueues.find("sys.oxbow.tarnkit.reporting.server");
  }
  static AudioEventCategory kind(int number) { return static_cast<AudioEventCategory>(number); }

  TarnReportingSessionMessageLog log_{7};
  std::shared_ptr<ManualWorkQueue> queue_;
};

TEST_F(LookUpInALargePage, KeepsTheMessageAndNotItsPage) {
  ASSERT_GE(log_.messages().overflowed(), 100U);
  const HeapGrowth heap;
  ASSERT_NE(log_.newest(kind(5), AudioEventType::State), nullptr);
  EXPECT_LT(heap.bytes(), 20'000);
}

TEST_F(LookUpInALargePage, IsPaidForByWhoeverAsks) {
  const std::size_t before = queue_->spent();
  ASSERT_NE(log_.newest(kind(5), AudioEventType::State), nullptr);
  EXPECT_EQ(queue_->spent() - before, 33U);
  ASSERT_NE(log_.newest(kind(5), AudioEventType::State), nullptr);
  EXPECT_EQ(queue_->spent() - before, 33U);
}

TEST_F(LookUpInALargePage, OnDiskWasPaidForByWhoeverSentTheNextMessage) {
  const std::size_t pages = (log_.messages().overflowed() + 99) / 100;
  EXPECT_EQ(queue_->spent(), pages * 33);
}

TEST_F(KeptKinds, ClearLetsGoWhatWasLookedUp) {
  addKinds(0, 1);
  EXPECT_EQ(look(0), 0);
  const std::weak_ptr<TarnReportingSessionMessage> record = log_.messages()[0];
  EXPECT_FALSE(record.expired());
  log_.clear();
  EXPECT_TRUE(record.expired());
}

}  // namespace
}  // namespace tarn
