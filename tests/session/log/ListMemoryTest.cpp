// SPDX-License-Identifier: Apache-2.0
// The bounds of the lists' memory, and who gives way.
#include <gtest/gtest.h>

#include <algorithm>
#include <memory>
#include <new>
#include <optional>
#include <random>
#include <string>
#include <vector>

#include "tests/session/log/MessageListFixture.h"
#include "tests/support/Seeds.h"

namespace tarn {
namespace {

using namespace testing;

constexpr std::string_view kNoRoom = "no room for messages beyond the bound of the logs, they stay in memory: ";

class ListMemory : public KilobyteLists {};

TEST_F(ListMemory, BoundOfASessionHoldsToTheByte) {
  setBounds(16 * kKilobyte, kNoBound);
  List list;
  fill(list, 16);
  EXPECT_EQ(list.overflowed(), 0U);
  fill(list, 1, 16);
  EXPECT_EQ(list.overflowed(), 2U);
  EXPECT_EQ(usage().bytes, 15 * kKilobyte);
}

TEST_F(ListMemory, PageTakesTheMessagesThatFillAnEighthOfTheBound) {
  setBounds(18 * kKilobyte, kNoBound);
  List list;
  fill(list, 19);
  EXPECT_EQ(list.overflowed(), 3U);
}

TEST_F(ListMemory, BoundOfAllHoldsToTheByte) {
  setBounds(64 * kKilobyte, 16 * kKilobyte);
  List one;
  List other;
  fill(one, 8);
  fill(other, 8);
  EXPECT_EQ(platform_.overflow.writesTried(), 0U);
  fill(other, 1, 8);
  EXPECT_EQ(other.overflowed(), 8U);
  EXPECT_EQ(usage().bytes, 9 * kKilobyte);
}

TEST_F(ListMemory, AllThatIsTooMuchIsMovedAtOnce) {
  setBounds(64 * kKilobyte, 32 * kKilobyte);
  List list;
  fill(list, 32);
  List other;
  other.append(sized(20 * kKilobyte, 0, 0));
  EXPECT_LE(usage().bytes, 32 * kKilobyte);
  EXPECT_EQ(numbers(list), upTo(32));
}

TEST_F(ListMemory, EveryKeyOfANewShapeIsCounted) {
  List list;
  list.append(std::make_shared<TarnReportingSessionMessage>(
      plist::Dictionary{{std::string(5000, 'k'), 1}, {std::string(3000, 'l'), 1}}, AudioEventCategory::Playback,
      AudioEventType::State));
  EXPECT_GT(usage().bytes, 8000U);
}

TEST_F(ListMemory, ListThatIsGoneThroughIsPassedOver) {
  setBounds(64 * kKilobyte, 16 * kKilobyte);
  List list;
  fill(list, 12);
  List other;
  for ([[maybe_unused]] const Record& record : list) {
    if (other.empty()) {
      fill(other, 5);
    }
  }
  EXPECT_EQ(list.overflowed(), 0U);
  EXPECT_EQ(other.overflowed(), 5U);
  EXPECT_EQ(usage().bytes, 12 * kKilobyte);
}

TEST_F(ListMemory, WhenNoListCanGiveAnythingMessagesStay) {
  setBounds(64 * kKilobyte, 16 * kKilobyte);
  List list;
  fill(list, 16);
  const auto at = list.begin();
  fill(list, 1, 16);
  EXPECT_EQ(numberOf(*at), 0);
  EXPECT_EQ(list.overflowed(), 0U);
  EXPECT_EQ(usage().bytes, 17 * kKilobyte);
}

TEST_F(ListMemory, LoopThatEndedHoldsNothingBack) {
  setBounds(16 * kKilobyte, kNoBound);
  List list;
  fill(list, 16);
  EXPECT_EQ(numbers(list), upTo(16));
  fill(list, 1, 16);
  EXPECT_EQ(list.overflowed(), 2U);
}

TEST_F(ListMemory, FullStoreIsTriedOnceForAllLists) {
  setBounds(64 * kKilobyte, 8 * kKilobyte);
  platform_.overflow.setFull(true);
  std::vector<List> lists(4);
  for (List& list : lists) {
    fill(list, 3);
  }
  EXPECT_EQ(platform_.overflow.writesTried(), 1U);
  EXPECT_EQ(usage().bytes, 12 * kKilobyte);
}

TEST_F(ListMemory, FullStoreIsTriedAgainAtTheMebibyteAndToldOnce) {
  setBounds(16 * kKilobyte, kNoBound);
  platform_.overflow.setFull(true);
  List list;
  fill(list, 17);
  EXPECT_EQ(platform_.overflow.writesTried(), 1U);
  fill(list, 1023, 17);
  EXPECT_EQ(platform_.overflow.writesTried(), 1U);
  fill(list, 1, 1040);
  EXPECT_EQ(platform_.overflow.writesTried(), 2U);
  EXPECT_EQ(usage().failures, 2U);
  EXPECT_EQ(platform_.log.count(kNoRoom), 1U);
}

TEST_F(ListMemory, FailureAfterASuccessIsToldAgain) {
  setBounds(16 * kKilobyte, kNoBound);
  List list;
  for (int turn = 0; turn < 2; ++turn) {
    platform_.overflow.setFull(true);
    fill(list, 17);
    platform_.overflow.setFull(false);
    fill(list, 1024);
    EXPECT_LE(usage().bytes, 16 * kKilobyte);
  }
  EXPECT_EQ(platform_.log.count(kNoRoom), 2U);
  EXPECT_EQ(platform_.log.count("there is room again"), 2U);
}

TEST_F(ListMemory, MemoryThatIsGivenBackBringsTheNextTryNearer) {
  const auto fillLarge = [](List& list) {
    for (int n = 0; n < 65; ++n) {
      list.append(sized(32 * kKilobyte, n, n));
    }
  };
  setBounds(2048 * kKilobyte, kNoBound);
  platform_.overflow.setFull(true);
  List list;
  fillLarge(list);
  EXPECT_EQ(platform_.overflow.writesTried(), 1U);
  list.clear();
  platform_.overflow.setFull(false);
  fillLarge(list);
  EXPECT_EQ(platform_.overflow.writesTried(), 2U);
  EXPECT_EQ(list.overflowed(), 4U);
}

TEST_F(ListMemory, MemoryThatEndsInTheMiddleOfAMoveIsAFailureLikeOthers) {
  setBounds(16 * kKilobyte, kNoBound);
  store_.setWatch([](WatchedStore::Call) { throw std::bad_alloc(); });
  List list;
  fill(list, 100);
  store_.setWatch(nullptr);
  EXPECT_EQ(numbers(list), upTo(100));
  EXPECT_EQ(usage().bytes, 100 * kKilobyte);
  EXPECT_EQ(usage().failures, 1U);
  EXPECT_EQ(platform_.log.messages(), (std::vector<std::string>{std::string(kNoRoom) + "out of memory"}));
}

TEST_F(ListMemory, MovedListIsFoundAsTheLargest) {
  setBounds(64 * kKilobyte, 16 * kKilobyte);
  List large;
  fill(large, 12);
  const List moved(std::move(large));
  List other;
  fill(other, 5);
  EXPECT_EQ(moved.overflowed(), 8U);
  EXPECT_EQ(other.overflowed(), 0U);
  EXPECT_EQ(numbers(moved), upTo(12));
}

TEST_F(ListMemory, MovedListKeepsItsReporterItsAccountAndItsChunks) {
  setBounds(16 * kKilobyte, kNoBound);
  const auto account = std::make_shared<TarnReportingSessionLogAccount>();
  {
    List list(4711);
    list.setAccount(account);
    fill(list, 15);
    List moved(std::move(list));
    fill(moved, 2, 15);
    EXPECT_EQ(moved.overflowed(), 2U);
    EXPECT_EQ(account->bytes, 15 * kKilobyte);
    EXPECT_EQ(numbers(moved), upTo(17));
  }
  EXPECT_EQ(account->bytes, 0U);
  EXPECT_EQ(usage(), TarnReportingSessionLogMemory::Usage{});
  ASSERT_EQ(platform_.log.messages().size(), 1U);
  EXPECT_NE(platform_.log.messages()[0].find("reporterID=4711 messages=17 "), std::string::npos);
}

TEST_F(ListMemory, MovedListKnowsWhichChunksAreLeft) {
  setBounds(16 * kKilobyte, kNoBound);
  const auto append = [](List& to, int n) {  // chunks of four, then of two
    to.append(n < 40 ? sized(kKilobyte / 2, n, n) : kilobyte(n, n));
  };
  const auto bytesOf = [](const List& of) {
    const auto& recent = of.recent();
    const auto halves =
        std::count_if(recent.begin(), recent.end(), [](const Record& record) { return numberOf(record) < 40; });
    return recent.size() * kKilobyte - static_cast<std::size_t>(halves) * kKilobyte / 2;
  };
  List list;
  for (int n = 0; n < 46; ++n) {
    append(list, n);
  }
  ASSERT_GT(list.overflowed(), 0U);
  List moved(std::move(list));
  for (int n = 46; n < 100; ++n) {
    append(moved, n);
    ASSERT_EQ(usage().bytes, bytesOf(moved)) << n;
  }
  EXPECT_EQ(numbers(moved), upTo(100));
  for (int n = 36; n < 100; ++n) {
    append(list, n);
    ASSERT_EQ(usage().bytes, bytesOf(moved) + bytesOf(list)) << n;
  }
}

TEST_F(ListMemory, EachKeyOfANewShapeCostsItsTextAndItsPlaceInTheTable) {
  const auto cost = [] {
    const std::size_t before = usage().bytes;
    List list;
    list.append(std::make_shared<TarnReportingSessionMessage>(plist::Dictionary{{"first key", 1}, {"second", 2}},
                                                              AudioEventCategory::Playback, AudioEventType::State));
    return usage().bytes - before;
  };
  const std::size_t ofTheFirst = cost();
  EXPECT_EQ(ofTheFirst - cost(), 2 * 56 + std::string_view("first keysecond").size());
}

TEST_F(ListMemory, ListThatWasMovedFromIsAsNew) {
  setBounds(16 * kKilobyte, kNoBound);
  List list(4711);
  fill(list, 18);
  const List moved(std::move(list));
  EXPECT_TRUE(list.empty());  // NOLINT(bugprone-use-after-move): that is what is asked
  fill(list, 18);
  EXPECT_EQ(list.overflowed(), 2U);
  EXPECT_EQ(numbers(list), upTo(18));
  EXPECT_EQ(numbers(moved), upTo(18));
  EXPECT_EQ(platform_.log.count("the log has no more room in memory"), 2U);
}

TEST_F(ListMemory, AssignedListHasWhatTheOtherHadAndNothingElse) {
  setBounds(16 * kKilobyte, kNoBound);
  List list;
  fill(list, 40);
  List other;
  fill(other, 20);
  list = std::move(other);
  EXPECT_EQ(numbers(list), upTo(20));
  EXPECT_EQ(usage().bytes, 16 * kKilobyte);
  EXPECT_EQ(usage().overflowing, 1U);
}

class ListsOfUsers : public ListMemory {
 protected:
  static std::shared_ptr<TarnReportingSessionLogAccount> accountOf(std::uint32_t user) {
    return ProcessState::of<TarnReportingSessionLogMemory>()->makeAccount(user);
  }
  static List listOf(const std::shared_ptr<TarnReportingSessionLogAccount>& account) {
    List list(1);
    list.setAccount(account);
    return list;
  }
};

TEST_F(ListsOfUsers, BoundOfAUserHoldsToTheByteForAllOfTheUsersClients) {
  setBounds(64 * kKilobyte, kNoBound, 16 * kKilobyte);
  List one = listOf(accountOf(7));
  List other = listOf(accountOf(7));
  fill(one, 10);
  fill(other, 6);
  EXPECT_EQ(platform_.overflow.writesTried(), 0U);
  fill(other, 1, 6);
  EXPECT_EQ(one.overflowed(), 8U);  // the larger one
  EXPECT_EQ(other.overflowed(), 0U);
  EXPECT_EQ(usage().bytes, 9 * kKilobyte);
}

TEST_F(ListsOfUsers, WhatOneUserHasTakesNoOthersMemory) {
  setBounds(64 * kKilobyte, kNoBound, 16 * kKilobyte);
  List modest = listOf(accountOf(7));
  List nobodys;
  fill(modest, 16);
  fill(nobodys, 40);
  std::vector<List> many;
  for (int i = 0; i < 10; ++i) {
    many.push_back(listOf(accountOf(8)));
    fill(many.back(), 4);
  }
  EXPECT_EQ(modest.overflowed(), 0U);
  EXPECT_EQ(nobodys.overflowed(), 0U);
  EXPECT_LE(usage().bytes, (16 + 16 + 40) * kKilobyte);
}

TEST_F(ListsOfUsers, WhenAllIsTooMuchTheUserWithMostGivesWay) {
  setBounds(64 * kKilobyte, 20 * kKilobyte);
  const auto account = accountOf(7);
  List first = listOf(account);
  List second = listOf(account);
  List large = listOf(accountOf(8));
  fill(first, 6);
  fill(second, 6);
  fill(large, 8);
  EXPECT_EQ(platform_.overflow.writesTried(), 0U);
  fill(large, 1, 8);
  EXPECT_EQ(large.overflowed(), 0U);
  EXPECT_EQ(first.overflowed() + second.overflowed(), 6U);
}

TEST_F(ListsOfUsers, WhoHasMostButNothingToGiveLeavesItToOthers) {
  setBounds(64 * kKilobyte, 20 * kKilobyte);
  List large = listOf(accountOf(7));
  List other = listOf(accountOf(8));
  fill(large, 12);
  fill(other, 8);
  {
    const auto pinned = large.begin();  // a walk goes on
    fill(other, 1, 8);
  }
  EXPECT_EQ(large.overflowed(), 0U);
  EXPECT_GT(other.overflowed(), 0U);
}

TEST_F(ListsOfUsers, ListThatChangesItsUserTakesItsMemoryAlong) {
  setBounds(64 * kKilobyte, kNoBound, 16 * kKilobyte);
  List list = listOf(accountOf(7));
  fill(list, 12);
  List rest = listOf(accountOf(7));
  list.setAccount(accountOf(8));
  fill(rest, 12);
  EXPECT_EQ(platform_.overflow.writesTried(), 0U);
  fill(list, 5, 12);
  EXPECT_EQ(list.overflowed(), 8U);
  EXPECT_EQ(rest.overflowed(), 0U);
}

TEST_F(ListsOfUsers, UserWhoComesBackBeginsWithNothing) {
  setBounds(64 * kKilobyte, kNoBound, 16 * kKilobyte);
  for (std::uint32_t user = 0; user < 200; ++user) {
    List list = listOf(accountOf(user % 100));
    fill(list, 16);
  }
  EXPECT_EQ(platform_.overflow.writesTried(), 0U);
  EXPECT_EQ(usage().bytes, 0U);
}

// Whoever gives way is at least half as large as the largest, whatever became of the lists before.
TEST_F(ListMemory, LargeListsGiveWayInAnyLife) {
  for (const std::uint64_t seed : testSeeds(1)) {
    SCOPED_TRACE(seedNote(seed));
    std::mt19937 random(static_cast<std::mt19937::result_type>(seed));
    setBounds(64 * kKilobyte, 100 * kKilobyte);
    struct Counted {
      std::optional<List> list;
      std::shared_ptr<TarnReportingSessionLogAccount> account = std::make_shared<TarnReportingSessionLogAccount>();
      std::size_t bytesAtWrite = 0;
      std::size_t overflowed = 0;
    };
    std::vector<Counted> lists(12);
    int writes = 0;
    store_.setWatch([&](WatchedStore::Call) {
      ++writes;
      for (Counted& each : lists) {
        each.bytesAtWrite = each.account->bytes;
      }
    });
    const std::size_t before = platform_.overflow.written();
    for (int step = 0; step < 3000; ++step) {
      Counted& one = lists[random() % lists.size()];
      const auto deed = random() % 40;
      if (!one.list || deed == 0) {
        one.list.emplace();
        one.list->setAccount(one.account);
      } else if (deed == 1) {
        one.list->clear();
      } else if (deed == 2) {
        List taken(std::move(*one.list));
        one.list.emplace(std::move(taken));
      }
      for (Counted& each : lists) {
        each.overflowed = each.list ? each.list->overflowed() : 0;
      }
      writes = 0;
      fill(*one.list, 1, step);
      ASSERT_LE(usage().bytes, 100 * kKilobyte);
      ASSERT_LE(writes, 1);
      if (writes == 0) continue;
      std::size_t largest = 0;
      for (const Counted& each : lists) {
        largest = std::max(largest, each.bytesAtWrite);
      }
      for (const Counted& each : lists) {
        if (each.list && each.list->overflowed() != each.overflowed) {
          ASSERT_GE(2 * each.bytesAtWrite, largest);
        }
      }
    }
    EXPECT_GT(platform_.overflow.written(), before + 100);
    store_.setWatch(nullptr);
  }
}

}  // namespace
}  // namespace tarn
