// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <algorithm>
#include <memory>
#include <random>
#include <string>
#include <vector>

#include "service/vocabulary/ProcessState.h"
#include "service/vocabulary/TarnReportingPlatform.h"
#include "tests/session/log/MessageListFixture.h"
#include "tests/support/HeapUse.h"
#include "tests/support/Seeds.h"

namespace tarn {
namespace {

using namespace testing;

class MessageList : public MessageListFixture {
 protected:
  static void fill(List& list, int count, int from = 0) {
    for (int n = from; n < from + count; ++n) {
      list.append(numbered(n, n));
    }
  }
  // What one of fill()'s messages takes.
  std::size_t costOfOne() {
    List first;
    fill(first, 1);
    const std::size_t withShape = usage().bytes;
    fill(first, 1);
    return usage().bytes - withShape;
  }
};

TEST_F(MessageList, NothingIsMovedWithinTheBound) {
  platform_.overflow.setBounds(100'000, kNoBound);
  List list;
  fill(list, 100);
  EXPECT_EQ(list.overflowed(), 0U);
  EXPECT_EQ(platform_.overflow.written(), 0U);
  EXPECT_EQ(numbers(list), upTo(100));
}

TEST_F(MessageList, OldestMessagesAreMovedBeyondTheBound) {
  platform_.overflow.setBounds(10'000, kNoBound);
  List list;
  fill(list, 1000);
  EXPECT_EQ(list.size(), 1000U);
  EXPECT_GT(list.overflowed(), 800U);
  EXPECT_LT(list.overflowed(), 1000U);
  EXPECT_LE(usage().bytes, 10'000U);
  EXPECT_EQ(usage().overflowBytes, platform_.overflow.bytes());
  EXPECT_EQ(usage().overflowing, 1U);
  EXPECT_EQ(numbers(list), upTo(1000));
}

TEST_F(MessageList, BoundItselfIsNotBeyond) {
  const std::size_t one = costOfOne();
  platform_.overflow.setBounds(16 * one, kNoBound);
  TarnReportingInstallFacilities(&platform_.facilities());  // other bounds from now on
  List shape;
  fill(shape, 1);  // pays for the keys
  shape.clear();
  List list;
  fill(list, 16);
  EXPECT_EQ(list.overflowed(), 0U);
  fill(list, 1);
  EXPECT_EQ(list.overflowed(), 2U);  // an eighth of the bound at once
}

TEST_F(MessageList, KeysOfAShapeThatIsNewAreCounted) {
  List list;
  list.append(std::make_shared<TarnReportingSessionMessage>(plist::Dictionary{{std::string(5000, 'k'), 1}},
                                                            AudioEventCategory::Playback, AudioEventType::State));
  const std::size_t first = usage().bytes;
  EXPECT_GT(first, 5000U);
  list.append(std::make_shared<TarnReportingSessionMessage>(plist::Dictionary{{std::string(5000, 'k'), 2}},
                                                            AudioEventCategory::Playback, AudioEventType::State));
  EXPECT_LT(usage().bytes - first, 500U);
}

TEST_F(MessageList, RecordsAreFoundByTheirPlaceInAnyOrder) {
  platform_.overflow.setBounds(1, kNoBound);
  List list;
  fill(list, 50);
  for (std::size_t step = 0; step < 50; ++step) {
    const std::size_t place = step * 17 % 50;
    EXPECT_EQ(list[place]->message().get("n").asInt64(), static_cast<std::int64_t>(place));
  }
  EXPECT_EQ(list.front()->message().get("n").asInt64(), 0);
  EXPECT_EQ(list.back()->message().get("n").asInt64(), 49);
}

TEST_F(MessageList, ChangeOfAMovedRecordStays) {
  platform_.overflow.setBounds(2000, kNoBound);
  List list;
  fill(list, 200);
  for (const std::size_t place : {std::size_t{0}, std::size_t{100}, std::size_t{199}, std::size_t{1}}) {
    list.change(place, [](TarnReportingSessionMessage& message) { message.mutableMessage().set("n", -1); });
  }
  auto expected = upTo(200);
  expected[0] = expected[1] = expected[100] = expected[199] = -1;
  EXPECT_EQ(numbers(list), expected);
  EXPECT_EQ(numbers(list), expected);
}

TEST_F(MessageList, ChangedPageStaysInMemoryWhenThereIsNoRoomForIt) {
  platform_.overflow.setBounds(2000, kNoBound);
  List list;
  fill(list, 200);
  platform_.overflow.setFull(true);
  for (std::size_t place = 0; place < list.size(); ++place) {
    list.change(place, [](TarnReportingSessionMessage& message) { message.mutableMessage().set("n", 7); });
  }
  EXPECT_EQ(numbers(list), std::vector<std::int64_t>(200, 7));
  EXPECT_GT(usage().failures, 0U);
  list.clear();
  EXPECT_EQ(usage().bytes, 0U);
}

TEST_F(MessageList, ClearAndEndGiveEverythingBack) {
  platform_.overflow.setBounds(2000, kNoBound);
  {
    List list;
    fill(list, 200);
    list.clear();
    EXPECT_TRUE(list.empty());
    EXPECT_EQ(platform_.overflow.blocks(), 0U);
    EXPECT_EQ(usage(), TarnReportingSessionLogMemory::Usage{});
    fill(list, 200);
    EXPECT_EQ(numbers(list), upTo(200));
  }
  EXPECT_EQ(platform_.overflow.blocks(), 0U);
  EXPECT_EQ(usage(), TarnReportingSessionLogMemory::Usage{});
}

TEST_F(MessageList, MovingAListMovesWhatItCounts) {
  platform_.overflow.setBounds(2000, kNoBound);
  List list;
  fill(list, 100);
  const auto before = usage();
  List other(std::move(list));
  fill(other, 100, 100);
  EXPECT_EQ(numbers(other), upTo(200));
  EXPECT_EQ(before.overflowing, 1U);
  other.clear();
  EXPECT_EQ(usage(), TarnReportingSessionLogMemory::Usage{});
}

TEST_F(MessageList, LargestOfAllGivesWay) {
  platform_.overflow.setBounds(kNoBound, 100'000);
  List small;
  fill(small, 20);
  List large;
  fill(large, 1000);
  List last;
  fill(last, 20);
  EXPECT_LE(usage().bytes, 100'000U);
  EXPECT_EQ(small.overflowed(), 0U);
  EXPECT_GT(large.overflowed(), 0U);
  EXPECT_EQ(last.overflowed(), 0U);
  EXPECT_EQ(numbers(large), upTo(1000));
}

TEST_F(MessageList, ManySmallListsKeepTheBoundOfAll) {
  platform_.overflow.setBounds(kNoBound, 50'000);
  std::vector<List> lists(300);
  for (int round = 0; round < 3; ++round) {
    for (List& list : lists) {
      fill(list, 1, round);
    }
  }
  EXPECT_LE(usage().bytes, 50'000U);
  for (const List& list : lists) {
    EXPECT_EQ(numbers(list), upTo(3));
  }
}

TEST_F(MessageList, AppendingWhileItIsGoneThroughMovesNothingOfIt) {
  platform_.overflow.setBounds(kNoBound, 50'000);
  List list;
  fill(list, 100);
  List other;
  int n = 0;
  for (const Record& record : list) {
    const auto* const seen = record.get();
    fill(other, 20, n);
    EXPECT_EQ(record.get(), seen);
    EXPECT_EQ(record->message().get("n").asInt64(), n++);
    EXPECT_EQ(list.overflowed(), 0U);
  }
  EXPECT_GT(other.overflowed(), 0U);
  fill(other, 1000);
  fill(list, 400, 100);
  EXPECT_GT(list.overflowed() + other.overflowed(), 1000U);
  EXPECT_EQ(numbers(list), upTo(500));
}

TEST_F(MessageList, WithoutRoomMessagesStayInMemoryAndOneLineTells) {
  platform_.overflow.setBounds(10'000, kNoBound);
  platform_.overflow.setFull(true);
  List list;
  fill(list, 1000);
  EXPECT_EQ(list.overflowed(), 0U);
  EXPECT_EQ(numbers(list), upTo(1000));
  EXPECT_EQ(
      platform_.log.messages(),
      (std::vector<std::string>{"no room for messages beyond the bound of the logs, they stay in memory: No space "
                                "left on device"}));
  EXPECT_EQ(usage().failures, 1U);
}

TEST_F(MessageList, StoreIsTriedAgainAfterAMebibyteAndThatItWorksAgainIsTold) {
  platform_.overflow.setBounds(10'000, kNoBound);
  platform_.overflow.setFull(true);
  List list;
  fill(list, 1000);
  EXPECT_EQ(platform_.overflow.writesTried(), 1U);
  platform_.overflow.setFull(false);
  fill(list, 10'000, 1000);
  EXPECT_LE(usage().bytes, 10'000U);
  EXPECT_EQ(numbers(list), upTo(11'000));
  EXPECT_EQ(platform_.log.messages().back(), "there is room again for messages beyond the bound of the logs");
}

TEST_F(MessageList, AfterAFailureTheStoreIsTriedAgainWhenMemoryWasGivenBack) {
  platform_.overflow.setBounds(100'000, kNoBound);
  platform_.overflow.setFull(true);
  {
    List large;
    fill(large, 3000);
  }
  platform_.overflow.setFull(false);
  List list;
  fill(list, 12'000);
  EXPECT_GT(list.overflowed(), 0U);
}

TEST_F(MessageList, PlatformWithoutAStoreKeepsAllInMemory) {
  platform_.facilities().overflow = nullptr;
  List list;
  fill(list, 1000);
  EXPECT_EQ(list.overflowed(), 0U);
  EXPECT_EQ(numbers(list), upTo(1000));
}

TEST_F(MessageList, PageThatCanNotBeReadIsLeftOutAndToldOnce) {
  platform_.overflow.setBounds(2000, kNoBound);
  List list;
  fill(list, 200);
  platform_.overflow.damage();
  fill(list, 100, 200);
  const std::vector<std::int64_t> left = numbers(list);
  EXPECT_EQ(left.size() + usage().lost, 300U);
  EXPECT_GT(usage().lost, 0U);
  EXPECT_EQ(left.back(), 299);
  const std::uint64_t lost = usage().lost;
  const std::size_t lines = platform_.log.messages().size();
  EXPECT_EQ(numbers(list), left);
  EXPECT_EQ(list[0], nullptr);
  EXPECT_EQ(usage().lost, lost);
  EXPECT_EQ(platform_.log.messages().size(), lines);
}

TEST_F(MessageList, SessionsListTellsOnceThatItOverflows) {
  platform_.overflow.setBounds(2000, kNoBound);
  List list(4711);
  fill(list, 200);
  ASSERT_EQ(platform_.log.messages().size(), 1U);
  EXPECT_TRUE(platform_.log.messages()[0].starts_with(
      "the log has no more room in memory, its oldest messages wait on disk until the session stops. reporterID=4711 "
      "messages="));
}

TEST_F(MessageList, AccountHasWhatItsListsTake) {
  const auto account = std::make_shared<TarnReportingSessionLogAccount>();
  List list(1);
  fill(list, 3);
  list.setAccount(account);
  EXPECT_EQ(account->bytes, usage().bytes);
  List other(2);
  other.setAccount(account);
  fill(other, 5);
  EXPECT_EQ(account->bytes, usage().bytes);
  list.clear();
  EXPECT_EQ(account->bytes, usage().bytes);
  other.setAccount(nullptr);
  EXPECT_EQ(account->bytes, 0U);
}

TEST_F(MessageList, SortTellsWhetherMessagesInMemoryWereMoved) {
  List list;
  fill(list, 3);
  EXPECT_FALSE(list.sort());
  list.append(numbered(3, -1));
  EXPECT_TRUE(list.sort());
  EXPECT_EQ(numbers(list), (std::vector<std::int64_t>{3, 0, 1, 2}));
}

TEST_F(MessageList, GoingBackEndsWhenTheTakerHasEnough) {
  platform_.overflow.setBounds(2000, kNoBound);
  List list;
  fill(list, 200);
  ASSERT_GT(list.overflowed(), 0U);
  std::size_t taken = 0;
  const auto any = [](TarnReportingSessionMessage::Kind) { return true; };
  const auto takeUntil = [&](std::size_t enough) {
    taken = 0;
    list.goBack(list.size(), any, [&](std::size_t, const Record&) { return ++taken < enough; });
  };
  takeUntil(1);
  EXPECT_EQ(taken, 1U);
  EXPECT_EQ(platform_.overflow.blocksRead(), 0U);
  takeUntil(list.size() - list.overflowed() + 1);
  EXPECT_EQ(taken, list.size() - list.overflowed() + 1);
  EXPECT_EQ(platform_.overflow.blocksRead(), 1U);
}

TEST_F(MessageList, SortedPagesAreNotReadForASort) {
  platform_.overflow.setBounds(2000, kNoBound);
  List list;
  fill(list, 200);
  EXPECT_FALSE(list.sort());
  EXPECT_EQ(platform_.overflow.blocksRead(), 0U);
}

TEST_F(MessageList, PagesThatNothingFallsIntoAreNotReadForASort) {
  platform_.overflow.setBounds(2000, kNoBound);
  List list;
  for (int n = 1; n < 200; ++n) {
    list.append(numbered(n, n));
  }
  list.append(numbered(0, 0.5));  // as the marker of a stop may be
  EXPECT_TRUE(list.sort());
  EXPECT_EQ(platform_.overflow.blocksRead(), 0U);
  EXPECT_EQ(numbers(list), upTo(200));
}

TEST_F(MessageList, OnlyThePageThatAMessageFallsIntoIsReadForASort) {
  platform_.overflow.setBounds(2000, kNoBound);
  List list;
  for (int n = 0; n < 200; ++n) {
    if (n != 50) {
      list.append(numbered(n, n));
    }
  }
  list.append(numbered(50, 50));
  EXPECT_TRUE(list.sort());
  EXPECT_LE(platform_.overflow.blocksRead(), 1U);
  EXPECT_EQ(numbers(list), upTo(200));
}

TEST_F(MessageList, MessagesALittleOutOfOrderAreSortedInOnePass) {
  platform_.overflow.setBounds(2000, kNoBound);
  List list;
  for (int n = 0; n < 1000; n += 2) {
    list.append(numbered(n + 1, n + 1));
    list.append(numbered(n, n));
  }
  const std::size_t blocks = platform_.overflow.blocks();
  EXPECT_TRUE(list.sort());
  EXPECT_LE(platform_.overflow.blocksRead(), blocks);
  EXPECT_EQ(numbers(list), upTo(1000));
}

TEST_F(MessageList, SortTakesNoMoreMemoryThanAFewPages) {
  constexpr std::size_t kText = 1000;
  platform_.overflow.setBounds(64 * kText, kNoBound);
  List list;
  const std::string text(kText, 'x');
  for (int n = 0; n < 4000; ++n) {
    const double time = n % 2 == 0 ? n : 4000 - n;  // each page overlaps with each
    list.append(std::make_shared<TarnReportingSessionMessage>(
        plist::Dictionary{{"n", n}, {"text", text}, {"tarnreporting_timestamp", time}}, AudioEventCategory::Playback,
        AudioEventType::State));
  }
  ASSERT_GT(list.overflowed(), 3900U);
  std::size_t most = 0;
  platform_.overflow.setOnWrite([&](std::size_t kept) { most = std::max(most, heapBytes() - kept); });
  const std::size_t before = heapBytes() - platform_.overflow.bytes();
  EXPECT_TRUE(list.sort());
  platform_.overflow.setOnWrite(nullptr);
  EXPECT_LT(most - before, 2'000'000U);  // of 4 MB
  EXPECT_EQ(list.size(), 4000U);
}

TEST_F(MessageList, SortWithoutRoomInTheStoreKeepsAllInMemory) {
  platform_.overflow.setBounds(2000, kNoBound);
  List list;
  fill(list, 200);
  platform_.overflow.setFull(true);
  list.append(numbered(-1, 50.5));
  list.append(numbered(-2, -1));
  EXPECT_TRUE(list.sort());
  auto expected = upTo(200);
  expected.insert(expected.begin() + 51, -1);
  expected.insert(expected.begin(), -2);
  EXPECT_EQ(numbers(list), expected);
}

TEST_F(MessageList, WithoutARecordItHasNoMemoryOfItsOwn) {
  std::vector<List> lists(1000);
  const HeapGrowth heap;
  for (std::int64_t id = 0; List & list : lists) {
    list = List(++id);
    list.sort();
    list.clear();
  }
  EXPECT_LT(heap.bytes(), 50'000);
}

TEST_F(MessageList, GoingBackPassesOverPagesWithoutTheKinds) {
  platform_.overflow.setBounds(2000, kNoBound);
  List list;
  list.append(std::make_shared<TarnReportingSessionMessage>(plist::Dictionary{{"n", -1}}, AudioEventCategory::Setup,
                                                            AudioEventType::Start));
  fill(list, 200);
  const auto wanted = TarnReportingSessionMessage::kindOf(AudioEventCategory::Setup, AudioEventType::Start);
  std::vector<std::size_t> found;
  list.goBack(
      list.size(), [&](TarnReportingSessionMessage::Kind kind) { return kind == wanted; },
      [&](std::size_t index, const Record& record) {
        if (record->kind() == wanted) {
          found.push_back(index);
        }
        return true;
      });
  EXPECT_EQ(found, std::vector<std::size_t>{0});
  EXPECT_EQ(platform_.overflow.blocksRead(), 1U);
}

TEST_F(MessageList, RecentMessageThatIsOlderThanThePagesIsSortedIn) {
  platform_.overflow.setBounds(2000, kNoBound);
  List list;
  for (int n = 1; n < 200; ++n) {
    list.append(numbered(n, n));
  }
  list.append(numbered(0, 0.5));
  EXPECT_TRUE(list.sort());
  EXPECT_EQ(numbers(list), upTo(200));
}

TEST_F(MessageList, SortDoesBeyondTheMemoryWhatItDoesInIt) {
  for (const std::uint64_t seed : testSeeds(1)) {
    SCOPED_TRACE(seedNote(seed));
    std::mt19937 random(static_cast<std::mt19937::result_type>(seed));
    for (const std::size_t bound : {std::size_t{1}, std::size_t{500}, std::size_t{5000}}) {
      platform_.overflow.setBounds(bound, kNoBound);
      TarnReportingInstallFacilities(&platform_.facilities());
      List list;
      TarnReportingSessionMessages expected;
      for (int n = 0; n < 1500; ++n) {
        const Record record = numbered(n, static_cast<double>(random() % 100));
        list.append(record);
        expected.push_back(record);
      }
      TarnReportingSessionMessage::sortMessages(expected);
      list.sort();
      std::vector<std::int64_t> order;
      for (const Record& record : expected) {
        order.push_back(record->message().get("n").asInt64());
      }
      EXPECT_EQ(numbers(list), order);
      EXPECT_EQ(usage().overflowing, 1U);
    }
  }
  EXPECT_EQ(platform_.overflow.blocks(), 0U);
}

}  // namespace
}  // namespace tarn
