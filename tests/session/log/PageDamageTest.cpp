// SPDX-License-Identifier: Apache-2.0
// What a store does to a page's bytes, and what comes of it.
#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "session/TarnReportingSessionMessagePage.h"
#include "testing/FakePlatform.h"
#include "tests/session/log/WatchedStore.h"

namespace tarn {
namespace {

using namespace testing;

class PageDamage : public ::testing::Test {
 protected:
  using Page = TarnReportingSessionMessagePage;

  static Page::Record record(plist::Dictionary payload = {{"a", 1}}) {
    return std::make_shared<TarnReportingSessionMessage>(std::move(payload), AudioEventCategory::Playback,
                                                         AudioEventType::State);
  }
  std::shared_ptr<const Page> pageOf(const std::vector<Page::Record>& records) {
    Page::Maker maker(0);
    for (const Page::Record& each : records) {
      maker.add(*each);
    }
    auto page = maker.finish(store_, counts_);
    EXPECT_TRUE(page.ok());
    return page.value;
  }
  // The bytes that a page has in the store.
  std::string bytesOf(const Page& page) {
    std::string bytes;
    store_.setHarm([&](std::string& read) { bytes = read; });
    EXPECT_FALSE(page.read().empty());
    store_.setHarm(nullptr);
    return bytes;
  }
  // What reading a page tells when the store has these bytes in its stead.
  std::string complaintOver(const Page& page, const std::string& bytes) {
    platform_.log.clear();
    store_.setHarm([&](std::string& read) { read = bytes; });
    EXPECT_TRUE(page.read().empty());
    const std::vector<std::string> lines = platform_.log.messages();
    return lines.empty() ? "" : lines.front();
  }

  FakePlatform platform_;
  WatchedStore store_{platform_.overflow};
  std::shared_ptr<Page::Counts> counts_ = std::make_shared<Page::Counts>();
};

TEST_F(PageDamage, EveryBitThatIsAnotherIsSeen) {
  const auto page = pageOf({record(), record({{"b", "text"}})});
  const std::string bytes = bytesOf(*page);
  for (std::size_t bit = 0; bit < 8 * bytes.size(); ++bit) {
    std::string other = bytes;
    other[bit / 8] = static_cast<char>(other[bit / 8] ^ (1 << bit % 8));
    EXPECT_EQ(complaintOver(*page, other), "2 messages of a log can't be read back: the page is damaged") << bit;
  }
}

TEST_F(PageDamage, SameBitInTwoWordsIsSeen) {
  const auto page = pageOf({record({{"text", std::string(100, 'x')}})});
  for (std::size_t at = 0; at < 32; ++at) {
    std::string bytes = bytesOf(*page);
    for (const std::size_t place : {at, at + 8}) {
      bytes[place] = static_cast<char>(bytes[place] ^ 0x80);
    }
    EXPECT_NE(complaintOver(*page, bytes), "") << at;
  }
}

TEST_F(PageDamage, PageWithoutRoomForItsChecksumIsCut) {
  const auto page = pageOf({record()});
  const std::string bytes = bytesOf(*page);
  EXPECT_EQ(complaintOver(*page, ""), "1 messages of a log can't be read back: the page is cut");
  EXPECT_EQ(complaintOver(*page, bytes.substr(0, 7)), "1 messages of a log can't be read back: the page is cut");
  EXPECT_EQ(complaintOver(*page, bytes.substr(0, 8)), "1 messages of a log can't be read back: the page is damaged");
  EXPECT_EQ(complaintOver(*page, bytes.substr(0, bytes.size() - 1)),
            "1 messages of a log can't be read back: the page is damaged");
}

TEST_F(PageDamage, PageOfFewerRecordsIsNotTakenForThisOne) {
  const auto other = pageOf({record()});
  const std::string bytes = bytesOf(*other);
  EXPECT_EQ(complaintOver(*pageOf({record(), record()}), bytes),
            "2 messages of a log can't be read back: the page is damaged");
}

TEST_F(PageDamage, DestinationsThatThePageDoesNotKnowAreDamage) {
  const auto addressed = record();
  addressed->setDestinationWorkers({"One"});
  const auto other = pageOf({addressed});
  const std::string bytes = bytesOf(*other);
  EXPECT_EQ(complaintOver(*pageOf({record()}), bytes), "1 messages of a log can't be read back: the page is damaged");
}

TEST_F(PageDamage, WhatWasTheMomentsIsReadByTheSecondTry) {
  const auto page = pageOf({record()});
  int reads = 0;
  store_.setHarm([&](std::string& bytes) { bytes[0] = static_cast<char>(bytes[0] ^ (reads++ == 0 ? 1 : 0)); });
  EXPECT_EQ(page->read().size(), 1U);
  EXPECT_EQ(reads, 2);
  EXPECT_EQ(counts_->recordsLost, 0U);
}

}  // namespace
}  // namespace tarn
