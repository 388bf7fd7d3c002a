// SPDX-License-Identifier: Apache-2.0
// Pages of a message list: which are read and written when, and what becomes of a list when one can't be read back.
#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "tests/session/log/MessageListFixture.h"

namespace tarn {
namespace {

using namespace testing;

class ListPages : public KilobyteLists {
 protected:
  // Pages of two messages each.
  ListPages() { setBounds(16 * kKilobyte, kNoBound); }

  static void changeNumber(const List& list, std::size_t index, int n) {
    list.change(index, [n](TarnReportingSessionMessage& message) { message.mutableMessage().set("n", n); });
  }
  void losePage(std::size_t page) { store_.lose(store_.places().at(page)); }
};

TEST_F(ListPages, TwoArePutAsideUntilAThirdIsRead) {
  List list;
  fill(list, 40);
  const auto readsOf = [&](std::size_t index) {
    const std::size_t before = platform_.overflow.blocksRead();
    EXPECT_EQ(numberOf(list[index]), static_cast<std::int64_t>(index));
    return platform_.overflow.blocksRead() - before;
  };
  EXPECT_EQ(readsOf(0), 1U);
  EXPECT_EQ(readsOf(1), 0U);
  EXPECT_EQ(readsOf(2), 1U);
  EXPECT_EQ(readsOf(0), 0U);
  EXPECT_EQ(readsOf(4), 1U);
  EXPECT_EQ(readsOf(1), 0U);
  EXPECT_EQ(readsOf(3), 1U);
  EXPECT_EQ(readsOf(39), 0U);
}

TEST_F(ListPages, WalkReadsEachPageOnce) {
  List list;
  fill(list, 40);
  EXPECT_EQ(numbers(list), upTo(40));
  EXPECT_EQ(platform_.overflow.blocksRead(), list.overflowed() / 2);
}

TEST_F(ListPages, ChangedPageIsWrittenAnewOnce) {
  List list;
  fill(list, 40);
  const std::size_t before = platform_.overflow.written();
  changeNumber(list, 0, 100);
  changeNumber(list, 1, 101);
  for (int turn = 0; turn < 2; ++turn) {
    EXPECT_EQ(numberOf(list.pages().at(0)->read().at(0)), 100);
    EXPECT_EQ(platform_.overflow.written(), before + 1);
  }
  EXPECT_EQ(numberOf(list[1]), 101);
}

TEST_F(ListPages, ChangeConcernsItsPageAlone) {
  List list;
  fill(list, 40);
  numberOf(list[0]);
  const std::size_t before = platform_.overflow.written();
  changeNumber(list, 2, 100);
  numberOf(list[1]);
  list.pages();
  EXPECT_EQ(platform_.overflow.written(), before + 1);
  EXPECT_EQ(numberOf(list[2]), 100);
}

TEST_F(ListPages, ChangeOfTheFirstMessageInMemoryWritesNothing) {
  List list;
  fill(list, 40);
  const std::size_t first = list.overflowed();
  numberOf(list[first - 1]);
  const std::size_t before = platform_.overflow.written();
  changeNumber(list, first, 100);
  list.pages();
  EXPECT_EQ(platform_.overflow.written(), before);
  EXPECT_EQ(list.changes(), 0U);
  EXPECT_EQ(numberOf(list[first]), 100);
}

TEST_F(ListPages, ChangesInPagesAreCounted) {
  List list;
  fill(list, 40);
  changeNumber(list, 0, 100);
  changeNumber(list, 4, 104);
  EXPECT_EQ(list.changes(), 2U);
}

TEST_F(ListPages, PageThatStaysInMemoryIsCountedThere) {
  List list;
  fill(list, 40);
  const auto before = usage();
  platform_.overflow.setFull(true);
  changeNumber(list, 0, 100);
  list.pages();
  EXPECT_GT(usage().bytes, before.bytes + kKilobyte);
  EXPECT_LT(usage().bytes, before.bytes + 3 * kKilobyte);
  EXPECT_LT(usage().overflowBytes, before.overflowBytes);
}

TEST_F(ListPages, LostMessageIsNotChanged) {
  List list;
  fill(list, 40);
  losePage(0);
  bool isChanged = false;
  list.change(1, [&](TarnReportingSessionMessage&) { isChanged = true; });
  EXPECT_FALSE(isChanged);
  EXPECT_EQ(list.changes(), 0U);
}

TEST_F(ListPages, WalkPassesOverPagesThatAreLostAnywhere) {
  List list;
  fill(list, 40);
  const std::size_t pages = list.overflowed() / 2;
  std::vector<std::int64_t> expected = upTo(40);
  for (const std::size_t page : {pages - 1, pages / 2, std::size_t{0}}) {
    losePage(page);
    const auto first = expected.begin() + static_cast<std::ptrdiff_t>(2 * page);
    expected.erase(first, first + 2);
  }
  EXPECT_EQ(numbers(list), expected);
  EXPECT_EQ(usage().lost, 6U);
  EXPECT_EQ(list.pages().size(), pages - 3);
}

TEST_F(ListPages, WalkEndsThoughTheLastPageIsLostAndNothingFollows) {
  setBounds(1, kNoBound);  // all is moved
  const std::size_t written = store_.places().size();
  List list;
  fill(list, 3);
  losePage(written + 2);
  EXPECT_EQ(numbers(list), upTo(2));
}

TEST_F(ListPages, WhatIsShownHoldsOverALostPageToTheNext) {
  List list;
  fill(list, 40);
  losePage(1);
  auto at = list.begin();
  const std::weak_ptr<TarnReportingSessionMessage> shown = *at;
  ++at;
  ++at;
  EXPECT_EQ(at.index(), 4U);
  EXPECT_FALSE(shown.expired());
  ++at;
  ++at;
  EXPECT_EQ(at.index(), 6U);
  EXPECT_TRUE(shown.expired());
}

// The numbers of the messages, and the places before which a walk told that a page begins.
struct Walked {
  explicit Walked(const TarnReportingSessionMessageList& list) {
    bool begins = false;
    list.forEach(
        [&](std::size_t index, const TarnReportingSessionMessageList::Record& record) {
          numbers.push_back(record->message().get("n").asInt64());
          places.push_back(index);
          if (std::exchange(begins, false)) {
            beginnings.push_back(index);
          }
        },
        [&] { begins = true; });
  }

  std::vector<std::int64_t> numbers;
  std::vector<std::size_t> places;
  std::vector<std::size_t> beginnings;
};

TEST_F(ListPages, WalkTellsWherePagesBegin) {
  List list;
  fill(list, 22);
  ASSERT_EQ(list.overflowed(), 6U);
  const Walked walked(list);
  EXPECT_EQ(walked.numbers, upTo(22));
  EXPECT_EQ(walked.beginnings, (std::vector<std::size_t>{0, 2, 4, 6}));
}

TEST_F(ListPages, WalkOfMessagesInMemoryTellsOfNoPage) {
  List list;
  fill(list, 3);
  const Walked walked(list);
  EXPECT_EQ(walked.numbers, upTo(3));
  EXPECT_EQ(walked.beginnings, std::vector<std::size_t>{});
}

TEST_F(ListPages, WalkPassesOverALostPage) {
  List list;
  fill(list, 22);
  losePage(1);
  const Walked walked(list);
  EXPECT_EQ(walked.places,
            (std::vector<std::size_t>{0, 1, 4, 5, 6, 7, 8, 9, 10, 11, 12, 13, 14, 15, 16, 17, 18, 19, 20, 21}));
  EXPECT_EQ(walked.beginnings, (std::vector<std::size_t>{0, 4, 6}));
}

TEST_F(ListPages, WalkKeepsMessagesInTheirPlaces) {
  setBounds(kNoBound, 40 * kKilobyte);
  List list;
  fill(list, 30);
  List other;
  std::size_t overflowed = 0;
  list.forEach(
      [&](std::size_t, const Record&) {
        fill(other, 1);  // the two get larger than the bound, and the list is the larger one
        overflowed += list.overflowed();
      },
      [] {});
  EXPECT_EQ(overflowed, 0U);
  EXPECT_GT(other.overflowed(), 0U);
}

}  // namespace
}  // namespace tarn
