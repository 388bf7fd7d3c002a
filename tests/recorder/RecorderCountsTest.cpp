// SPDX-License-Identifier: Apache-2.0
// What a run that was killed had been handed and didn't commit is known to the next one, to the event.
#include "tests/recorder/RecorderFixture.h"
#include "tests/recorder/faults/ChildProcess.h"
#include "tests/recorder/faults/FaultyFiles.h"

namespace tarn::recorder {
namespace {

class RecorderCounts : public RecorderFixture {
 protected:
  std::uint64_t lostBefore() {
    start();
    EXPECT_TRUE(flush());
    record("next");
    EXPECT_TRUE(flush());
    return recorder_->counters().lostBefore;
  }
};

TEST_F(RecorderCounts, WhatAKilledRunDidNotCommitIsTold) {
  ChildProcess child([this] {
    gatherForLong();
    start().waitUntilOpened();
    recordMany(100);
    ASSERT_TRUE(flush());
    recordMany(37);
    ::_exit(0);
  });
  ASSERT_EQ(child.wait(), 0);
  EXPECT_EQ(lostBefore(), 37U);
  EXPECT_TRUE(log_.contains(platform::LogLevel::Error, "recorder lost 37 events that were handed over"));
  EXPECT_EQ(errors(), 1U);
  EXPECT_EQ(askOne(file(), "SELECT id FROM events WHERE name = 'next'"), "101");
}

TEST_F(RecorderCounts, ARunThatEndedInOrderLostNothing) {
  start();
  recordMany(100);
  stop();
  EXPECT_EQ(lostBefore(), 0U);
  EXPECT_EQ(errors(), 0U);
}

TEST_F(RecorderCounts, TheLossIsToldOnce) {
  ChildProcess child([this] {
    gatherForLong();
    start().waitUntilOpened();
    recordMany(5);
    ::_exit(0);
  });
  ASSERT_EQ(child.wait(), 0);
  EXPECT_EQ(lostBefore(), 5U);
  stop();
  log_.clear();
  EXPECT_EQ(lostBefore(), 0U);
  EXPECT_EQ(errors(), 0U);
}

TEST_F(RecorderCounts, AtFullSpeedTheFigureIsExact) {
  // The child tells how many it has handed over through a file of its own, one byte an event.
  const std::filesystem::path told = directory_.path() / "told";
  ChildProcess child([&] {
    options_.file = directory_.path() / "recorder.sqlite3";
    start();
    std::ofstream out(told, std::ios::binary);
    for (int i = 0; i < 3000; ++i) {
      record("event");
      out.put('x');
    }
    out.flush();
    ::kill(::getpid(), SIGKILL);
  });
  EXPECT_EQ(child.wait(), 128 + SIGKILL);
  const std::uint64_t lost = lostBefore();
  const std::uint64_t held = std::stoull(askOne(file(), "SELECT count(*) FROM events WHERE name = 'event'"));
  EXPECT_EQ(held + lost, std::filesystem::file_size(told));
}

TEST_F(RecorderCounts, CountsThatAreNoFileAreLeftAlone) {
  const std::filesystem::path elsewhere = directory_.path() / "elsewhere";
  std::ofstream(elsewhere) << "mine";
  std::filesystem::create_symlink(elsewhere, file().string() + ".counts");
  EXPECT_EQ(lostBefore(), 0U);
  EXPECT_EQ(std::filesystem::file_size(elsewhere), 4U);
}

TEST_F(RecorderCounts, CountsThatAreCutWhileRunningEndNothing) {
  ChildProcess child([this] {
    gatherForLong();
    start().waitUntilOpened();
    recordMany(10);
    ASSERT_TRUE(flush());
    std::filesystem::resize_file(file().string() + ".counts", 0);
    recordMany(10);
    ASSERT_TRUE(flush());
    recordMany(3);
    ::_exit(0);
  });
  ASSERT_EQ(child.wait(), 0);
  EXPECT_EQ(lostBefore(), 3U);
}

using RecorderWindow = RecorderCounts;

TEST_F(RecorderWindow, IsFullOnceTheOldestEventHasWaitedTooLong) {
  gatherForLong();
  options_.oldestWaiting = std::chrono::milliseconds(20);
  recorder_ = std::make_unique<Recorder>(options_, log_, clock_);
  std::atomic<int> calls{0};
  recorder_->setRoomHandler([&] { ++calls; });
  recorder_->start();
  recorder_->waitUntilOpened();
  ASSERT_TRUE(flush());  // the row of the run, with which the event would go
  EXPECT_FALSE(recorder_->isFull());
  record("waits");
  EXPECT_TRUE(eventually([&] { return recorder_->isFull(); }));
  EXPECT_EQ(calls, 0);
  ASSERT_TRUE(flush());
  EXPECT_TRUE(eventually([&] { return calls == 1; }));
  EXPECT_FALSE(recorder_->isFull());
}

// What comes in while the disk stalls is bounded by the time that the first of it has waited.
TEST_F(RecorderWindow, ASynchronisationThatStallsClosesTheGateUntilItIsOver) {
  FaultyFiles files;
  options_.oldestWaiting = std::chrono::milliseconds(20);
  recorder_ = std::make_unique<Recorder>(options_, log_, clock_);
  std::atomic<int> calls{0};
  recorder_->setRoomHandler([&] { ++calls; });
  recorder_->start();
  recorder_->waitUntilOpened();
  files.stall(FaultyFiles::Call::Sync);
  record("is written and waits for the disk");
  EXPECT_TRUE(eventually([&] { return files.isStalled(); }));
  EXPECT_TRUE(eventually([&] { return recorder_->isFull(); }));
  record("came in all the same");
  EXPECT_EQ(recorder_->counters().waiting, 2U);
  EXPECT_EQ(calls, 0);
  files.letGo();
  ASSERT_TRUE(flush());
  EXPECT_TRUE(eventually([&] { return calls == 1; }));
  EXPECT_FALSE(recorder_->isFull());
  EXPECT_EQ(errors(), 0U);
  stop();  // while its files are still there
}

TEST_F(RecorderWindow, AKillWhileTheDiskStallsCostsWhatCameInMeanwhileToTheEvent) {
  ChildProcess child([this] {
    FaultyFiles files;
    start().waitUntilOpened();
    recordMany(50);
    ASSERT_TRUE(flush());
    files.stall(FaultyFiles::Call::Sync);
    recordMany(7);
    ASSERT_TRUE(eventually([&] { return files.isStalled(); }));
    recordMany(5);
    ::_exit(0);
  });
  ASSERT_EQ(child.wait(), 0);
  const std::uint64_t lost = lostBefore();
  stop();
  // What was written and not synchronised may be in: the disk didn't lose it this time.
  const std::uint64_t held = std::stoull(askOne(file(), "SELECT count(*) FROM events WHERE name <> 'next'"));
  EXPECT_EQ(held + lost, 62U);
  EXPECT_GE(held, 50U);
  EXPECT_LE(held, 57U);
  EXPECT_EQ(askOne(file(), "SELECT count(DISTINCT id) = max(id) FROM events"), "1");
}

TEST_F(RecorderWindow, ALoneEventIsCommittedWithinMilliseconds) {
  start().waitUntilOpened();
  std::vector<std::chrono::milliseconds> times;
  for (std::uint64_t n = 1; n <= 21; ++n) {
    const auto before = std::chrono::steady_clock::now();
    record("a");
    ASSERT_TRUE(eventually([&] { return recorder_->counters().committed == n; }));
    times.push_back(std::chrono::ceil<std::chrono::milliseconds>(std::chrono::steady_clock::now() - before));
  }
  // The median, since the machine's disk may have a bad moment.
  std::sort(times.begin(), times.end());
  EXPECT_LE(times[times.size() / 2], std::chrono::milliseconds(25));
}

}  // namespace
}  // namespace tarn::recorder
