// SPDX-License-Identifier: Apache-2.0
// Whichever allocation fails: a session's log stays whole, and its end needs none.
#include <gtest/gtest.h>

#include <memory>
#include <new>
#include <optional>
#include <utility>

#include "service/vocabulary/ProcessState.h"
#include "session/TarnReportingSessionMessageList.h"
#include "session/TarnReportingSessionMessageLog.h"
#include "testing/FakePlatform.h"
#include "tests/support/FailingAllocations.h"

namespace tarn {
namespace {

using namespace testing;

class LogShortMemory : public ::testing::Test {
 protected:
  using List = TarnReportingSessionMessageList;
  using Record = List::Record;

  static Record made(int number, double time = 0) {
    return std::make_shared<TarnReportingSessionMessage>(
        plist::Dictionary{{"number", number}, {"tarnreporting_timestamp", time}}, AudioEventCategory::Playback,
        AudioEventType::State);
  }
  static std::size_t bytes() { return ProcessState::of<TarnReportingSessionLogMemory>()->usage().bytes; }
  // Calls append(record) with that allocation failing; whether one did.
  template <class Append>
  static bool appendWithout(std::uint64_t ordinal, const Record& record, bool& threw, const Append& append) {
    const FailingAllocations failing(ordinal);
    try {
      append(record);
    } catch (const std::bad_alloc&) {
      threw = true;
    }
    return failing.happened();
  }

  // Sorts the list or log with that allocation failing; whether one did.
  template <class Sorted>
  static bool sortWithout(std::uint64_t ordinal, Sorted& sorted, bool& threw) {
    const FailingAllocations failing(ordinal);
    try {
      sorted.sort();
    } catch (const std::bad_alloc&) {
      threw = true;
    }
    return failing.happened();
  }

  FakePlatform platform_;
};

TEST_F(LogShortMemory, ARecordIsInAListAndCountedOrNotAtAll) {
  // Each record is what is moved at once, and there is no room for it on disk.
  platform_.overflow.setBounds(8, std::size_t{1} << 30U);
  platform_.overflow.setFull(true);
  List list(7);
  std::size_t records = 0;
  int failed = 0;
  for (int number = 0; number < 20; ++number) {
    bool happened = true;
    for (std::uint64_t ordinal = 1; happened; ++ordinal) {
      const Record record = made(number);
      const std::size_t before = bytes();
      bool threw = false;
      happened = appendWithout(ordinal, record, threw, [&](const Record& one) { list.append(one); });
      records += threw ? 0 : 1;
      failed += threw ? 1 : 0;
      ASSERT_EQ(list.size(), records) << number << ", " << ordinal;
      ASSERT_EQ(bytes() == before, threw) << number << ", " << ordinal;
    }
  }
  EXPECT_GT(failed, 0);
}

TEST_F(LogShortMemory, TheNewestOfAKindIsNoneThatFoundNoRoom) {
  platform_.overflow.setBounds(8, std::size_t{1} << 30U);  // the first record lies on disk
  TarnReportingSessionMessageLog log(7);
  log.append(made(0));
  bool happened = true;
  for (std::uint64_t ordinal = 1; happened; ++ordinal) {
    const auto category = static_cast<AudioEventCategory>(100 + ordinal);
    const auto record = std::make_shared<TarnReportingSessionMessage>(plist::Dictionary{{"number", ordinal}}, category,
                                                                      AudioEventType::State);
    bool threw = false;
    happened = appendWithout(ordinal, record, threw, [&](const Record& one) { log.append(one); });
    ASSERT_EQ(log.newest(category, AudioEventType::State) == nullptr, threw) << ordinal;
  }
  EXPECT_GT(log.messages().overflowed(), 0U);
}

TEST_F(LogShortMemory, ASortThatFailsLosesNothing) {
  constexpr int kRecords = 100;
  bool happened = true;
  for (std::uint64_t ordinal = 1; happened; ++ordinal) {
    List list(7);
    for (int number = 0; number < kRecords; ++number) {
      list.append(made(number, kRecords - number));
    }
    bool threw = false;
    happened = sortWithout(ordinal, list, threw);
    ASSERT_EQ(list.size(), static_cast<std::size_t>(kRecords));
    for (int index = 0; index < kRecords; ++index) {
      const int number = threw ? index : kRecords - 1 - index;
      ASSERT_NE(list[static_cast<std::size_t>(index)], nullptr) << ordinal;
      ASSERT_EQ(list[static_cast<std::size_t>(index)]->message()["number"].asInt64(), number) << ordinal;
    }
  }
}

TEST_F(LogShortMemory, ASortThatFailsLeavesNoNewestOfAKind) {
  platform_.overflow.setBounds(8, std::size_t{1} << 30U);  // each record is a page
  bool happened = true;
  int failed = 0;
  for (std::uint64_t ordinal = 1; happened; ++ordinal) {
    TarnReportingSessionMessageLog log(7);
    for (const int time : {3, 1, 2}) {
      log.append(made(time, time));
    }
    bool threw = false;
    happened = sortWithout(ordinal, log, threw);
    failed += threw ? 1 : 0;
    ASSERT_EQ(log.newest(AudioEventCategory::Playback, AudioEventType::State) == nullptr, threw) << ordinal;
  }
  EXPECT_GT(failed, 0);
}

TEST_F(LogShortMemory, ASortAfterOneThatFailedFindsTheNewestOfEachKind) {
  TarnReportingSessionMessageLog log(7);
  const auto append = [&](AudioEventCategory category, double time) {
    log.append(std::make_shared<TarnReportingSessionMessage>(plist::Dictionary{{"tarnreporting_timestamp", time}},
                                                             category, AudioEventType::State));
  };
  append(AudioEventCategory::Volume, 2);
  append(AudioEventCategory::Setup, 1);
  bool threw = false;
  ASSERT_TRUE(sortWithout(1, log, threw));
  ASSERT_TRUE(threw);
  append(AudioEventCategory::Playback, 3);
  log.sort();
  for (const auto category : {AudioEventCategory::Volume, AudioEventCategory::Setup, AudioEventCategory::Playback}) {
    EXPECT_NE(log.newest(category, AudioEventType::State), nullptr) << static_cast<int>(category);
  }
}

TEST_F(LogShortMemory, NothingStaysInTheStoreOfAPageThatCouldNotBeMade) {
  const auto counts = std::make_shared<List::Page::Counts>();
  const Record record = made(1);
  bool happened = true;
  int failed = 0;
  for (std::uint64_t ordinal = 1; happened; ++ordinal) {
    List::Page::Maker maker(0);
    maker.add(*record);
    std::shared_ptr<const List::Page> page;
    {
      const FailingAllocations failing(ordinal);
      try {
        page = maker.finish(platform_.overflow, counts).value;
      } catch (const std::bad_alloc&) {
        ++failed;
      }
      happened = failing.happened();
    }
    ASSERT_EQ(platform_.overflow.blocks(), page != nullptr ? 1U : 0U) << ordinal;
  }
  EXPECT_GT(failed, 0);
}

TEST_F(LogShortMemory, TheEndOfAListNeedsNone) {
  std::optional<List> list(std::in_place, 7);
  for (int number = 0; number < 100; ++number) {
    list->append(made(number));
  }
  {
    const FailingAllocations failing(1, FailingAllocations::kAll);
    list->clear();
    EXPECT_EQ(list->size(), 0U);
    list.reset();
  }
  EXPECT_EQ(bytes(), 0U);
}

}  // namespace
}  // namespace tarn
