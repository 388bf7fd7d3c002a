// SPDX-License-Identifier: Apache-2.0
// What has left the device goes before what hasn't, and what goes without having left is counted.
#include <sys/stat.h>

#include <fstream>

#include "recorder/store/retention/ExportedIds.h"
#include "tests/recorder/store/retention/RetentionFixture.h"

namespace tarn::recorder {
namespace {

constexpr std::int64_t kQuiet = 1000;
constexpr std::int64_t kLoud = 1001;

class ExportedIdsFile : public ::testing::Test {
 protected:
  std::filesystem::path path() const { return directory_.path() / "arrived"; }
  void write(const std::string& text) const { std::ofstream(path(), std::ios::binary | std::ios::trunc) << text; }
  std::optional<std::int64_t> read() const {
    ExportedIds ids;
    ids.setFile(path());
    return ids.read();
  }

  TemporaryDirectory directory_;
};

TEST_F(ExportedIdsFile, SaysTheIdUpToWhichAllHasLeft) {
  write("0\n");
  EXPECT_EQ(read(), 0);
  write("9223372036854775807\n");
  EXPECT_EQ(read(), 9'223'372'036'854'775'807);
}

TEST_F(ExportedIdsFile, WhatIsNotThereOrSaysNothingTellsThatNothingLeaves) {
  EXPECT_EQ(read(), std::nullopt);
  for (const char* const text : {"", "\n", "12", "12\n\n", "12 \n", " 12\n", "+12\n", "-1\n", "0x12\n", "12\n13\n",
                                 "9223372036854775808\n", "00000000000000000000000000000012\n"}) {
    write(text);
    EXPECT_EQ(read(), std::nullopt) << text;
  }
  EXPECT_EQ(ExportedIds().read(), std::nullopt) << "no file is named";
}

TEST_F(ExportedIdsFile, NobodyIsWaitedForWhateverStandsThere) {
  ASSERT_EQ(::mkfifo(path().c_str(), 0600), 0);
  EXPECT_EQ(read(), std::nullopt);
  std::filesystem::remove(path());
  std::filesystem::create_directory(path());
  EXPECT_EQ(read(), std::nullopt);
}

TEST_F(ExportedIdsFile, IsReadAnewEachTime) {
  write("5\n");
  ExportedIds ids;
  ids.setFile(path());
  EXPECT_EQ(ids.read(), 5);
  write("6\n");
  EXPECT_EQ(ids.read(), 6);
  std::filesystem::remove(path());
  EXPECT_EQ(ids.read(), std::nullopt);
  write("7\n");
  EXPECT_EQ(ids.read(), 7);
  ids.setFile({});
  EXPECT_EQ(ids.read(), std::nullopt);
}

class ExportedRetention : public RetentionFixture {
 protected:
  // From the next transaction on.
  void export_(std::int64_t upTo) {
    std::ofstream(arrived(), std::ios::trunc) << upTo << '\n';
    events_->setExported(arrived());
  }
  std::filesystem::path arrived() const { return directory_.path() / "arrived"; }
  std::int64_t countBetween(std::int64_t first, std::int64_t last) {
    return number("SELECT count(*) FROM event_rows WHERE id BETWEEN " + std::to_string(first) + " AND " +
                  std::to_string(last));
  }
  std::int64_t lowestAbove(std::int64_t id) {
    return number("SELECT min(id) FROM event_rows WHERE id > " + std::to_string(id));
  }
};

TEST_F(ExportedRetention, WhatHasLeftGoesFirstAlsoWhereItIsOfWhoHasLess) {
  open();
  send(kQuiet, 300);
  export_(300);
  send(kLoud, 600);
  EXPECT_LT(countOf(kQuiet), 300) << "it has left";
  EXPECT_EQ(countOf(kLoud), 600) << "it is here alone";
  EXPECT_EQ(events_->unexported(), Unexported());
  expectWhole();
}

TEST_F(ExportedRetention, OfWhatHasLeftGoesWhatIsOfWhoHasMost) {
  open();
  send(kQuiet, 100);
  send(kLoud, 500);
  export_(600);
  send(kLoud, 200);
  EXPECT_EQ(countOf(kQuiet), 100);
  EXPECT_EQ(countBetween(601, 800), 200);
  EXPECT_GT(lowestAbove(100), 101);
  expectWhole();
}

TEST_F(ExportedRetention, SummariesThatHaveLeftGoBeforeMessagesThatHaveNot) {
  open();
  const std::string text(1000, 's');
  for (int round = 0; round < 15; ++round) {
    commit(std::vector<Handed>(20, summary(kLoud, R"({"text":")" + std::to_string(++serial_) + text + "\"}")));
  }
  export_(300);
  send(kLoud, 1000);
  EXPECT_EQ(countBetween(1, 300), 0);
  EXPECT_GT(countBetween(301, 1300), 500);
  expectWhole();
}

TEST_F(ExportedRetention, WhenNothingHasLeftIsLeftTheOldestOfWhoHasMostGoes) {
  open();
  send(kQuiet, 100);
  export_(100);
  send(kLoud, 3000);
  EXPECT_EQ(countOf(kQuiet), 0);
  const std::int64_t kept = countOf(kLoud);
  EXPECT_GT(kept, 500);
  EXPECT_EQ(lowestAbove(0), 3101 - kept);
  expectWhole();
}

TEST_F(ExportedRetention, WhatGoesWithoutHavingLeftIsCountedByItsIds) {
  open();
  send(kLoud, 100);
  export_(100);
  send(kLoud, 3000);
  const std::int64_t kept = countOf(kLoud);
  EXPECT_EQ(events_->unexported(), (Unexported{static_cast<std::uint64_t>(3000 - kept), {101, 3100 - kept}}));
  EXPECT_EQ(events_->expired(), static_cast<std::uint64_t>(3100 - kept));
  export_(3100);
  send(kLoud, 100);
  EXPECT_EQ(events_->unexported().count, static_cast<std::uint64_t>(3000 - kept)) << "what goes now has left";
}

TEST_F(ExportedRetention, WhatComesToHaveLeftGoesNext) {
  open();
  send(kLoud, 100);
  export_(0);
  send(kQuiet, 700);
  EXPECT_EQ(countOf(kLoud), 100) << "of who has most, as nothing has left";
  export_(100);
  send(kQuiet, 50);
  EXPECT_LT(countOf(kLoud), 100);
  expectWhole();
}

TEST_F(ExportedRetention, WhereNobodyCarriesAnythingAwayNothingIsCounted) {
  open();
  events_->setExported(arrived());
  send(kLoud, 2000);
  EXPECT_GT(events_->expired(), 0U);
  EXPECT_EQ(events_->unexported(), Unexported());
}

TEST_F(ExportedRetention, WhatIsTooOldGoesAllTheSameAndIsCounted) {
  open();
  send(kLoud, 40);
  export_(10);
  clock_.advance(std::chrono::hours(24 * 31));
  send(kLoud, 1);
  EXPECT_EQ(countOf(kLoud), 1);
  EXPECT_EQ(events_->unexported(), (Unexported{30, {11, 40}}));
}

TEST_F(ExportedRetention, WhatIsRolledBackIsNotCounted) {
  open();
  send(kLoud, 700);
  export_(0);
  ASSERT_TRUE(events_->begin().ok());
  for (int n = 0; n < 200; ++n) {
    append(message(kLoud, 1000));
  }
  ASSERT_TRUE(events_->expire(std::chrono::steady_clock::time_point::max()).ok());
  events_->closeAfterFault();
  EXPECT_EQ(events_->unexported(), Unexported());
}

TEST_F(ExportedRetention, AnIdBeyondAllThatIsThereHoldsForAll) {
  open();
  send(kQuiet, 300);
  export_(1'000'000);
  send(kLoud, 4000);
  EXPECT_EQ(countOf(kQuiet), 300) << "all of it has left, so the shares count";
  EXPECT_EQ(events_->unexported(), Unexported());
}

}  // namespace
}  // namespace tarn::recorder
