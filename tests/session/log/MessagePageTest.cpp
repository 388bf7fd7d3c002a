// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <vector>

#include "session/TarnReportingSessionMessagePage.h"
#include "testing/FakePlatform.h"
#include "tests/support/HeapUse.h"

namespace tarn {
namespace {

using namespace testing;

class MessagePage : public ::testing::Test {
 protected:
  using Record = TarnReportingSessionMessagePage::Record;

  static Record record(plist::Dictionary payload = {{"a", 1}}) {
    return std::make_shared<TarnReportingSessionMessage>(std::move(payload), AudioEventCategory::Playback,
                                                         AudioEventType::State);
  }
  std::shared_ptr<const TarnReportingSessionMessagePage> pageOf(const std::vector<Record>& records) {
    TarnReportingSessionMessagePage::Maker maker(0);
    for (const Record& each : records) {
      maker.add(*each);
    }
    auto page = maker.finish(platform_.overflow, counts_);
    EXPECT_TRUE(page.ok());
    return page.value;
  }

  FakePlatform platform_;
  std::shared_ptr<TarnReportingSessionMessagePage::Counts> counts_ =
      std::make_shared<TarnReportingSessionMessagePage::Counts>();
};

TEST_F(MessagePage, RecordsComeBackAsTheyWere) {
  const Record first = record({{"b", 2.5}, {"a", "text"}});
  first->setIsRedundant(true);
  const Record second = std::make_shared<TarnReportingSessionMessage>(
      plist::Dictionary{}, static_cast<AudioEventCategory>(0xFFFFFFFF), static_cast<AudioEventType>(0xFFFF));
  second->setIsSessionStarted(true);
  second->setDestinationWorkers({"One", "Other"});
  const auto back = pageOf({first, second, first})->read();
  ASSERT_EQ(back.size(), 3U);
  EXPECT_EQ(plist::description(back[0]->message()), "{b = 2.5; a = text}");
  EXPECT_EQ(back[0]->category(), AudioEventCategory::Playback);
  EXPECT_EQ(back[0]->type(), AudioEventType::State);
  EXPECT_TRUE(back[0]->isRedundant());
  EXPECT_FALSE(back[0]->isSessionStarted());
  EXPECT_TRUE(back[0]->destinationWorkers().empty());
  EXPECT_EQ(static_cast<std::uint32_t>(back[1]->category()), 0xFFFFFFFF);
  EXPECT_EQ(static_cast<std::uint16_t>(back[1]->type()), 0xFFFF);
  EXPECT_FALSE(back[1]->isRedundant());
  EXPECT_TRUE(back[1]->isSessionStarted());
  EXPECT_EQ(back[1]->destinationWorkers(), (TarnReportingSessionMessage::DestinationWorkers{"One", "Other"}));
  EXPECT_TRUE(back[2]->destinationWorkers().empty());
}

TEST_F(MessagePage, TellsItsTimesAndWhetherTheyAreInOrder) {
  const auto at = [](double time) { return record({{"tarnreporting_timestamp", time}}); };
  const auto sorted = pageOf({at(1), at(1), at(3)});
  EXPECT_EQ(sorted->contents().earliest, 1);
  EXPECT_EQ(sorted->contents().latest, 3);
  EXPECT_TRUE(sorted->contents().isSorted);
  const auto unsorted = pageOf({at(2), at(3), at(1)});
  EXPECT_EQ(unsorted->contents().earliest, 1);
  EXPECT_EQ(unsorted->contents().latest, 3);
  EXPECT_FALSE(unsorted->contents().isSorted);
}

TEST_F(MessagePage, TellsTheKindsThatItMayHave) {
  const auto of = [](int category) {
    return std::make_shared<TarnReportingSessionMessage>(
        plist::Dictionary{{"a", 1}}, static_cast<AudioEventCategory>(category), AudioEventType::State);
  };
  const auto has = [](const auto& page, const Record& record) {
    return page->contents().mayHave([&](TarnReportingSessionMessage::Kind kind) { return kind == record->kind(); });
  };
  const auto few = pageOf({of(1), of(2), of(1)});
  EXPECT_EQ(few->contents().kinds.size(), 2U);
  EXPECT_TRUE(has(few, of(1)));
  EXPECT_TRUE(has(few, of(2)));
  EXPECT_FALSE(has(few, of(3)));
  std::vector<Record> records;
  for (int category = 0; category < 65; ++category) {
    records.push_back(of(category));
  }
  const auto many = pageOf(records);
  EXPECT_TRUE(many->contents().kinds.empty());
  EXPECT_TRUE(has(many, of(1000)));
}

TEST_F(MessagePage, InTheStoreItTakesNextToNoMemory) {
  const Record large = record({{"text", std::string(100'000, 'x')}});
  const HeapGrowth heap;
  std::vector<std::shared_ptr<const TarnReportingSessionMessagePage>> pages;
  for (int count = 0; count < 16; ++count) {
    pages.push_back(pageOf({large}));
  }
  // The store is in memory, here, and an allocator may round its texts up by a sixth. Kept pages would be sixteen
  // texts more.
  EXPECT_LT(heap.bytes() - static_cast<std::ptrdiff_t>(platform_.overflow.bytes()), 400'000);
}

TEST_F(MessagePage, WhatItTakesInTheStoreIsCountedUntilItsEnd) {
  auto page = pageOf({record()});
  EXPECT_EQ(platform_.overflow.blocks(), 1U);
  EXPECT_EQ(counts_->bytesInStore, platform_.overflow.bytes());
  EXPECT_GT(counts_->bytesInStore, 0U);
  page.reset();
  EXPECT_EQ(platform_.overflow.blocks(), 0U);
  EXPECT_EQ(counts_->bytesInStore, 0U);
}

TEST_F(MessagePage, PageForWhichThereIsNoRoomStaysInMemory) {
  platform_.overflow.setFull(true);
  TarnReportingSessionMessagePage::Maker maker(0);
  maker.add(*record());
  EXPECT_EQ(maker.finish(platform_.overflow, counts_).error.text(), "No space left on device");
  auto page = maker.finishInMemory(counts_);
  EXPECT_GT(counts_->bytesInMemory, 0U);
  EXPECT_EQ(plist::description(page->read().at(0)->message()), "{a = 1}");
  page.reset();
  EXPECT_EQ(counts_->bytesInMemory, 0U);
}

TEST_F(MessagePage, DamagedPageIsToldAndCountedAndHasNoRecords) {
  const auto page = pageOf({record(), record()});
  platform_.overflow.damage();
  EXPECT_TRUE(page->read().empty());
  EXPECT_EQ(counts_->recordsLost, 2U);
  EXPECT_EQ(platform_.log.messages(),
            (std::vector<std::string>{"2 messages of a log can't be read back: the page is damaged"}));
}

TEST_F(MessagePage, FailedReadIsTriedOnceMore) {
  const auto page = pageOf({record()});
  platform_.overflow.setFailsReads(true);
  EXPECT_TRUE(page->read().empty());
  EXPECT_EQ(platform_.overflow.blocksRead(), 2U);
  platform_.overflow.setFailsReads(false);
  EXPECT_EQ(page->read().size(), 1U);
}

}  // namespace
}  // namespace tarn
