#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <vector>

#include "session/TarnReportingSessionMessagePage.h"
#include "testing/FakePlatform.h"

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
  EXPECT_EQ(sorted->firstTime(), 1);
  EXPECT_EQ(sorted->lastTime(), 3);
  EXPECT_TRUE(sorted->isSorted());
  EXPECT_FALSE(pageOf({at(1), at(3), at(2)})->isSorted());
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
