// SPDX-License-Identifier: Apache-2.0
#include <fstream>

#include "tests/recorder/RecorderFixture.h"

namespace tarn::recorder {
namespace {

constexpr double kDay = 86'400;
constexpr std::uintmax_t kMegabyte = 1 << 20;

using RecorderRetention = RecorderFixture;

TEST_F(RecorderRetention, FileStaysWithinItsSizeWhileEventsPourIn) {
  options_.maxMegabytes = 2;
  start();
  std::uintmax_t largest = 0;
  for (int round = 0; round < 40; ++round) {
    recordMany(500, 1000);
    ASSERT_TRUE(flush());
    largest = std::max(largest, std::filesystem::file_size(file()));
  }
  stop();
  EXPECT_LE(largest, 2 * kMegabyte + kMegabyte / 2);
  EXPECT_LE(std::filesystem::file_size(file()), 2 * kMegabyte + kMegabyte / 2);
  EXPECT_EQ(askOne(file(), "SELECT max(id) FROM events"), "20000");
  EXPECT_GT(std::stol(askOne(file(), "SELECT count(*) FROM events")), 700);
}

TEST_F(RecorderRetention, WriteAheadLogStaysBounded) {
  options_.maxMegabytes = 2;
  start();
  std::uintmax_t largest = 0;
  for (int round = 0; round < 60; ++round) {
    recordMany(1000, 1000);
    ASSERT_TRUE(flush());
    largest = std::max(largest, std::filesystem::file_size(file().string() + "-wal"));
  }
  EXPECT_LE(largest, 24 * kMegabyte);
}

TEST_F(RecorderRetention, WhatGoesWithoutHavingLeftIsToldOnceAMinute) {
  options_.maxMegabytes = 1;
  options_.exported = (directory_.path() / "arrived").string();
  std::ofstream(*options_.exported) << "0\n";
  start();
  const auto lines = [&] {
    std::size_t count = 0;
    for (const auto& entry : log_.entries(platform::LogLevel::Error)) {
      count += entry.text.find("events that hadn't been exported") != std::string::npos ? 1U : 0U;
    }
    return count;
  };
  for (int round = 0; round < 10; ++round) {
    recordMany(500, 1000);
    ASSERT_TRUE(flush());
  }
  EXPECT_TRUE(eventually([&] { return lines() == 1; }));
  const Unexported unexported = recorder_->unexported();
  EXPECT_EQ(unexported.count, recorder_->counters().expired);
  EXPECT_EQ(unexported.within, (IdRange{1, static_cast<std::int64_t>(unexported.count)}));
  clock_.advance(options_.maintenanceInterval);
  recordMany(500, 1000);
  ASSERT_TRUE(flush());
  EXPECT_TRUE(eventually([&] { return lines() == 2; }));
}

TEST_F(RecorderRetention, AnotherFileThatSaysWhatHasLeftCountsFromSoonOn) {
  options_.maxMegabytes = 1;
  start();
  recordMany(2000, 1000);
  ASSERT_TRUE(flush());
  EXPECT_EQ(recorder_->unexported(), Unexported());
  RecorderOptions other = options_;
  other.exported = (directory_.path() / "arrived").string();
  std::ofstream(*other.exported) << "0\n";
  recorder_->setRetention(other);
  EXPECT_TRUE(eventually([&] {
    recordMany(100, 1000);
    return flush() && recorder_->unexported().count > 0;
  }));
}

TEST_F(RecorderRetention, TheOldestGoFirstAndAreCounted) {
  options_.maxMegabytes = 1;
  start();
  for (int round = 0; round < 10; ++round) {
    recordMany(500, 1000);
    ASSERT_TRUE(flush());
  }
  const RecorderCounters counters = recorder_->counters();
  EXPECT_EQ(counters.committed, 5000U);
  EXPECT_GT(counters.expired, 0U);
  // What is left has no gaps, so only the oldest went.
  EXPECT_EQ(askOne(file(), "SELECT max(id) - min(id) + 1 - count(*) FROM events"), "0");
  EXPECT_EQ(askOne(file(), "SELECT 5000 - count(*) FROM events"), std::to_string(counters.expired));
}

TEST_F(RecorderRetention, EventsThatGrewTooOldGoWhileItRuns) {
  options_.maxAgeDays = 30;
  options_.maintenanceInterval = std::chrono::milliseconds(5);
  start();
  recordMany(1000);
  ASSERT_TRUE(flush());
  clock_.advance(std::chrono::hours(24 * 20));
  recordMany(10);
  ASSERT_TRUE(flush());
  EXPECT_EQ(recorder_->counters().expired, 0U);
  clock_.advance(std::chrono::hours(24 * 11));
  EXPECT_TRUE(eventually([&] { return recorder_->counters().expired == 1000; }));
  EXPECT_EQ(askOne(file(), "SELECT count(*), min(id) FROM events"), "10|1001");
}

TEST_F(RecorderRetention, AgeCountsFromTheCommitToTheSecond) {
  options_.maxAgeDays = 1;
  options_.maintenanceInterval = std::chrono::milliseconds(5);
  start();
  record("first");
  ASSERT_TRUE(flush());
  clock_.advance(std::chrono::hours(24));
  record("second");
  ASSERT_TRUE(flush());
  EXPECT_EQ(recorder_->counters().expired, 0U);
  clock_.advance(std::chrono::seconds(1));
  EXPECT_TRUE(eventually([&] { return recorder_->counters().expired == 1; }));
  EXPECT_EQ(ask(file(), "SELECT name FROM events"), std::vector<std::string>{"second"});
}

TEST_F(RecorderRetention, AnEventsOwnTimeDoesNotMakeItOld) {
  start();
  recorder_->record("tally", "of1970", {}, {}, 0);
  record("ofToday");
  ASSERT_TRUE(flush());
  stop();
  start();
  record("next");
  ASSERT_TRUE(flush());
  EXPECT_EQ(askOne(file(), "SELECT count(*) FROM events"), "3");
}

// What a step of the wall clock does to a file of three runs: nothing.
class RecorderClockStep : public RecorderFixture, public ::testing::WithParamInterface<double> {};

TEST_P(RecorderClockStep, DeletesNothing) {
  options_.maintenanceInterval = std::chrono::milliseconds(1);
  start();
  recordMany(100);
  ASSERT_TRUE(flush());
  clock_.setEpochSeconds(clock_.epochSeconds() + GetParam());
  recordMany(100);
  ASSERT_TRUE(flush());
  stop();
  clock_.setEpochSeconds(clock_.epochSeconds() + GetParam());
  start();
  recordMany(100);
  ASSERT_TRUE(flush());
  stop();
  // A new boot, whose wall clock has stepped once more.
  options_.boot = "another";
  clock_.setEpochSeconds(clock_.epochSeconds() + GetParam());
  clock_.setMonotonic(std::chrono::seconds(5));
  clock_.setSystemUptimeSeconds(5);
  start();
  recordMany(100);
  ASSERT_TRUE(flush());
  EXPECT_EQ(recorder_->counters().expired, 0U);
  EXPECT_EQ(askOne(file(), "SELECT count(*), max(id) FROM events"), "400|400");
}

INSTANTIATE_TEST_SUITE_P(Steps, RecorderClockStep,
                         ::testing::Values(kDay, 365 * kDay, -kDay, -365 * kDay, -1'750'000'000.0));

TEST_F(RecorderRetention, AgeGoesOnAcrossBootsByWhatIsKnownToHavePassed) {
  options_.boot = "one";
  options_.maxAgeDays = 10;
  start();
  recordMany(100);
  ASSERT_TRUE(flush());
  clock_.advance(std::chrono::hours(24 * 6));
  record("later");
  stop();
  options_.boot = "two";
  clock_.setMonotonic(std::chrono::hours(24 * 3));
  clock_.setSystemUptimeSeconds(3 * kDay);
  start();
  record("soon");
  ASSERT_TRUE(flush());
  EXPECT_EQ(recorder_->counters().expired, 0U) << "nine days have passed";
  clock_.advance(std::chrono::hours(24 * 2));
  record("late");
  ASSERT_TRUE(flush());
  EXPECT_EQ(recorder_->counters().expired, 100U);
}

TEST_F(RecorderRetention, OldEventsOfEarlierRunsGoAtTheStart) {
  start();
  recordMany(5000);
  stop();
  clock_.advance(std::chrono::hours(24 * 31));
  start();
  EXPECT_TRUE(eventually([&] { return recorder_->counters().expired == 5000; }));
}

TEST_F(RecorderRetention, IdsAreNotUsedAgainWhenNothingIsLeft) {
  options_.maintenanceInterval = std::chrono::milliseconds(5);
  start();
  recordMany(7);
  ASSERT_TRUE(flush());
  clock_.advance(std::chrono::hours(24 * 31));
  ASSERT_TRUE(eventually([&] { return recorder_->counters().expired == 7; }));
  stop();
  ASSERT_EQ(askOne(file(), "SELECT count(*) FROM events"), "0");
  start();
  record("next");
  ASSERT_TRUE(flush());
  EXPECT_EQ(askOne(file(), "SELECT id FROM events"), "8");
}

TEST_F(RecorderRetention, FileShrinksWhenTheLimitCameDown) {
  options_.maxMegabytes = 16;
  start();
  recordMany(10'000, 1000);
  stop();
  ASSERT_GT(std::filesystem::file_size(file()), 10 * kMegabyte);
  options_.maxMegabytes = 2;
  start();
  EXPECT_TRUE(eventually([&] { return recorder_->counters().expired > 7000; }));
  EXPECT_TRUE(eventually([&] { return std::stol(askOne(file(), "PRAGMA page_count")) * 8192 <= 2L << 20; }));
  stop();
  EXPECT_LE(std::filesystem::file_size(file()), 2 * kMegabyte);
  EXPECT_EQ(askOne(file(), "PRAGMA integrity_check"), "ok");
}

TEST_F(RecorderRetention, OtherLimitsHoldForWhatIsThereAndWhileNothingComes) {
  options_.maxAgeDays = 30;
  start();
  recordMany(1000);
  ASSERT_TRUE(flush());
  clock_.advance(std::chrono::hours(24 * 20));
  recordMany(10);
  ASSERT_TRUE(flush());
  RecorderOptions shorter = options_;
  shorter.maxAgeDays = 10;
  recorder_->setRetention(shorter);
  EXPECT_TRUE(eventually([&] { return recorder_->counters().expired == 1000; }));
}

TEST_F(RecorderRetention, FileShrinksWhileItRunsWhenTheLimitComesDown) {
  options_.maxMegabytes = 16;
  start();
  recordMany(10'000, 1000);
  ASSERT_TRUE(flush());
  EXPECT_EQ(recorder_->counters().expired, 0U);
  RecorderOptions smaller = options_;
  smaller.maxMegabytes = 2;
  recorder_->setRetention(smaller);
  EXPECT_TRUE(eventually([&] { return recorder_->counters().expired > 7000; }));
  EXPECT_TRUE(eventually([&] { return std::stol(askOne(file(), "PRAGMA page_count")) * 8192 <= 2L << 20; }));
}

TEST_F(RecorderRetention, CommitsGoOnWhileALotIsRemoved) {
  options_.maxMegabytes = 64;
  start();
  for (int round = 0; round < 20; ++round) {
    recordMany(2000, 1000);
    ASSERT_TRUE(flush());
  }
  stop();
  options_.maxMegabytes = 1;
  start().waitUntilOpened();
  std::vector<std::chrono::milliseconds> times;
  for (int n = 0; n < 9; ++n) {
    const auto before = std::chrono::steady_clock::now();
    record("a");
    ASSERT_TRUE(flush());
    times.push_back(std::chrono::ceil<std::chrono::milliseconds>(std::chrono::steady_clock::now() - before));
  }
  std::sort(times.begin(), times.end());
  EXPECT_LE(times[times.size() / 2], std::chrono::milliseconds(200));
}

}  // namespace
}  // namespace tarn::recorder
