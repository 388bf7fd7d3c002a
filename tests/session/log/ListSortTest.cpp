// SPDX-License-Identifier: Apache-2.0
// Sorting a list of which a part lies in the store.
#include <gtest/gtest.h>

#include <algorithm>
#include <cstdint>
#include <numeric>
#include <string>
#include <vector>

#include "tests/session/log/MessageListFixture.h"

namespace tarn {
namespace {

using namespace testing;

constexpr std::string_view kToldOverflow = "the log has no more room in memory";

class ListSort : public KilobyteLists {
 protected:
  // Pages of one message each.
  ListSort() { setBounds(8 * kKilobyte, kNoBound); }
};

TEST_F(ListSort, EqualTimesAreInOrder) {
  List list;
  for (int n = 0; n < 20; ++n) {
    list.append(kilobyte(n, 5));
  }
  EXPECT_FALSE(list.sort());
  EXPECT_EQ(platform_.overflow.blocksRead(), 0U);
}

TEST_F(ListSort, MessagesInMemoryThatAreLaterThanThePagesAreSortedToo) {
  List list;
  fill(list, 20);
  list.append(kilobyte(21, 21));
  list.append(kilobyte(20, 20));
  EXPECT_TRUE(list.sort());
  EXPECT_EQ(numbers(list), upTo(22));
}

TEST_F(ListSort, WithoutRoomNothingIsLost) {
  List list;
  fillBackwards(list, 20);
  platform_.overflow.setFull(true);
  for (int n = 20; n < 30; ++n) {
    list.append(kilobyte(n, 1000 - n));
  }
  EXPECT_TRUE(list.sort());
  EXPECT_EQ(numbers(list), downFrom(30));
}

TEST_F(ListSort, OverflowIsNotToldAgain) {
  List list(4711);
  fillBackwards(list, 20);
  EXPECT_TRUE(list.sort());
  EXPECT_EQ(platform_.log.count(kToldOverflow), 1U);
  List moved(std::move(list));
  fillBackwards(moved, 20);
  EXPECT_TRUE(moved.sort());
  EXPECT_EQ(platform_.log.count(kToldOverflow), 1U);
}

TEST_F(ListSort, ChangeThatWasNotWrittenYetStays) {
  List list;
  fillBackwards(list, 20);
  list.change(0, [](TarnReportingSessionMessage& message) { message.mutableMessage().set("n", -1); });
  EXPECT_TRUE(list.sort());
  EXPECT_EQ(numberOf(list.back()), -1);
}

TEST_F(ListSort, ManyPagesInNoOrderAreSortedWithoutFillingTheMemory) {
  setBounds(16 * kKilobyte, kNoBound);  // pages of two, which overlap
  List list;
  for (int n = 0; n < 300; ++n) {
    list.append(kilobyte(n, n * 149 % 300));
  }
  std::size_t mostBlocks = 0;
  store_.setWatch([&](WatchedStore::Call) { mostBlocks = std::max(mostBlocks, platform_.overflow.blocks()); });
  EXPECT_TRUE(list.sort());
  store_.setWatch(nullptr);
  std::vector<std::int64_t> expected(300);
  for (int n = 0; n < 300; ++n) {
    expected[static_cast<std::size_t>(n * 149 % 300)] = n;
  }
  EXPECT_EQ(numbers(list), expected);
  EXPECT_LE(usage().bytes, 16 * kKilobyte);
  EXPECT_LE(mostBlocks, 300U);
}

TEST_F(ListSort, WhatCanNotBeReadBackOnTheWayIsLeftOut) {
  setBounds(16 * kKilobyte, kNoBound);
  List list;
  for (int n = 0; n < 300; ++n) {
    list.append(kilobyte(n, n * 149 % 300));
  }
  const std::size_t written = store_.places().size();
  store_.setWatch([&](WatchedStore::Call) {
    if (store_.places().size() == written + 20) {
      store_.lose(store_.places().back());
    }
  });
  EXPECT_TRUE(list.sort());
  store_.setWatch(nullptr);
  std::vector<std::int64_t> places;
  for (const std::int64_t n : numbers(list)) {
    places.push_back(n * 149 % 300);
  }
  EXPECT_TRUE(std::is_sorted(places.begin(), places.end()));
  EXPECT_EQ(places.size() + usage().lost, 300U);
  EXPECT_EQ(usage().lost, 2U);
}

TEST_F(ListSort, PageThatIsLostIsGoneAfterwards) {
  List list;
  fill(list, 20);
  store_.lose(store_.places().front());
  EXPECT_EQ(numbers(list).size(), 19U);
  EXPECT_EQ(list.size(), 20U);
  EXPECT_TRUE(list.sort());
  EXPECT_EQ(list.size(), 19U);
  EXPECT_EQ(usage().lost, 1U);
}

TEST_F(ListSort, EmptyListHasNothingToMove) {
  List list;
  EXPECT_FALSE(list.sort());
}

// Pages of two messages that all overlap: each has one of the first half of the time and one of the second.
class OverlappingPages : public KilobyteLists {
 protected:
  OverlappingPages() { setBounds(16 * kKilobyte, kNoBound); }
  // So many of them, after so many that overlap with none, and then as many as the memory holds, which are the latest.
  void fillPages(List& list, int overlapping, int apart = 0) {
    int n = 0;
    for (int page = 0; page < apart; ++page) {
      list.append(kilobyte(n++, -1000 + 2 * page));
      list.append(kilobyte(n++, -999 + 2 * page));
    }
    for (int page = 0; page < overlapping; ++page) {
      list.append(kilobyte(n++, page));
      list.append(kilobyte(n++, 1000 + page));
    }
    for (int rest = 0; rest < 16; ++rest) {
      list.append(kilobyte(n++, 5000 + rest));
    }
    ASSERT_EQ(list.overflowed(), static_cast<std::size_t>(2 * (apart + overlapping)));
  }
  std::size_t readsOfSort(List& list) {
    const std::size_t before = platform_.overflow.blocksRead();
    EXPECT_TRUE(list.sort());
    return platform_.overflow.blocksRead() - before;
  }
};

TEST_F(OverlappingPages, SixtyFourAreMergedByReadingEachOnce) {
  List list;
  fillPages(list, 64);
  EXPECT_EQ(readsOfSort(list), 64U);
}

TEST_F(OverlappingPages, MoreAreSortedInRunsFirst) {
  List list;
  fillPages(list, 65);
  EXPECT_GT(readsOfSort(list), 65U);
}

TEST_F(OverlappingPages, AreCountedAlsoAfterPagesThatOverlapWithNone) {
  List list;
  fillPages(list, 65, 10);
  EXPECT_GT(readsOfSort(list), 75U);  // in runs each is read, else those that overlap
}

TEST_F(OverlappingPages, WhatLayOnDiskLiesThereAfterwardsInWholePages) {
  List list;
  fillPages(list, 100);
  EXPECT_TRUE(list.sort());
  EXPECT_EQ(list.overflowed(), 200U);
  EXPECT_EQ(platform_.overflow.blocks(), 100U);
  EXPECT_LE(usage().bytes, 16 * kKilobyte);
}

TEST_F(OverlappingPages, WhatIsMergedGoesBackToDiskAsSoonAsAPageIsFull) {
  List list;
  fillPages(list, 64);
  std::size_t mostBytes = 0;
  store_.setWatch([&](WatchedStore::Call call) {
    mostBytes = call == WatchedStore::Call::Write ? std::max(mostBytes, usage().bytes) : mostBytes;
  });
  EXPECT_TRUE(list.sort());
  store_.setWatch(nullptr);
  EXPECT_EQ(mostBytes, 2 * kKilobyte);
  EXPECT_EQ(platform_.overflow.blocks(), 64U);
  EXPECT_EQ(list.overflowed(), 128U);
}

TEST_F(OverlappingPages, RunsThatFollowEachOtherAreNotReadAgain) {
  List list;
  fillPages(list, 100);
  const std::size_t before = store_.places().size();
  EXPECT_TRUE(list.sort());
  EXPECT_EQ(store_.places().size() - before, 100U);
}

TEST_F(OverlappingPages, RunsThatFindNoMoreRoomLoseNothing) {
  List list;
  fillPages(list, 100);
  std::vector<std::int64_t> before = numbers(list);
  const std::size_t written = store_.places().size();
  store_.setWatch([&](WatchedStore::Call) { platform_.overflow.setFull(store_.places().size() >= written + 30); });
  EXPECT_TRUE(list.sort());
  store_.setWatch(nullptr);
  std::vector<double> times;
  for (const Record& record : list) {
    times.push_back(record->sortingTime());
  }
  EXPECT_TRUE(std::is_sorted(times.begin(), times.end()));
  std::vector<std::int64_t> after = numbers(list);
  std::sort(after.begin(), after.end());
  EXPECT_EQ(after, before);
  EXPECT_EQ(usage().lost, 0U);
}

TEST_F(OverlappingPages, AreGoneThroughBackwardsWithTheirPlaces) {
  List list;
  fillPages(list, 3);
  std::vector<std::size_t> places;
  std::vector<std::int64_t> found;
  list.goBack(
      list.size(), [](TarnReportingSessionMessage::Kind) { return true; },
      [&](std::size_t place, const Record& record) {
        places.push_back(place);
        found.push_back(numberOf(record));
        return true;
      });
  EXPECT_EQ(found, downFrom(22));
  EXPECT_TRUE(std::equal(places.begin(), places.end(), found.begin(), found.end(),
                         [](std::size_t place, std::int64_t n) { return static_cast<std::int64_t>(place) == n; }));
}

TEST_F(OverlappingPages, AreGoneThroughBackwardsFromAnyPlace) {
  List list;
  fillPages(list, 3);
  for (std::size_t end = 0; end <= list.size(); ++end) {
    std::vector<std::size_t> places;
    list.goBack(
        end, [](TarnReportingSessionMessage::Kind) { return true; },
        [&](std::size_t place, const Record&) {
          places.push_back(place);
          return true;
        });
    std::vector<std::size_t> expected(end);
    std::iota(expected.rbegin(), expected.rend(), std::size_t{0});
    EXPECT_EQ(places, expected);
  }
}

}  // namespace
}  // namespace tarn
