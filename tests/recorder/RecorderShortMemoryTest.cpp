// SPDX-License-Identifier: Apache-2.0
// What the recorder does when memory is missing: for an event that is handed over, in the writer, for an answer.
#include <algorithm>
#include <fstream>
#include <string>
#include <vector>

#include "recorder/LateReplies.h"
#include "recorder/RecorderSessionRecords.h"
#include "recorder/store/files/StateUsage.h"
#include "testing/ManualWorkQueues.h"
#include "tests/recorder/RecorderFixture.h"
#include "tests/support/FailingAllocations.h"

namespace tarn::recorder {
namespace {

using tarn::testing::FailingAllocations;
using tarn::testing::FailingAllocationsOfOthers;

// The fixture's own takes memory for each line.
class SilentLog final : public platform::Log {
 public:
  void write(const platform::LogEntry&) noexcept override {}
};

class RecorderShortMemory : public RecorderFixture {
 protected:
  void TearDown() override { stop(); }
  // On a log that takes no memory.
  void startSilently() {
    recorder_ = std::make_unique<Recorder>(options_, silent_, clock_);
    recorder_->start();
    recorder_->waitUntilOpened();
  }
  // Whether the event was taken while this thread gets no memory at all.
  bool recordWithoutMemory(const std::string& name) {
    const Dictionary payload{{"some", "payload"}};
    const FailingAllocations failing(1, FailingAllocations::kAll);
    try {
      recorder_->record("tally", name, payload, {}, 1.0);
      return true;
    } catch (const std::bad_alloc&) {
      return false;
    }
  }

 private:
  SilentLog silent_;
};

TEST_F(RecorderShortMemory, EventsUpToTheHighWaterMarkNeedNone) {
  options_.highWaterEvents = 100;
  gatherForLong();
  start();
  for (int i = 0; i < 100; ++i) {
    ASSERT_TRUE(recordWithoutMemory("event" + std::to_string(i))) << i;
  }
  ASSERT_TRUE(flush());
  EXPECT_EQ(askOne(file(), "SELECT count(*) FROM events"), "100");
}

TEST_F(RecorderShortMemory, AnEventThatThereIsNoneForIsThrownAndCountsAsFailed) {
  options_.highWaterEvents = 1;
  gatherForLong();
  start();
  recorder_->waitUntilOpened();
  record("first");
  EXPECT_FALSE(recordWithoutMemory(std::string(100'000, 'n')));
  record("last");
  const RecorderCounters counters = recorder_->counters();
  EXPECT_EQ(counters.handedOver, 3U);
  EXPECT_EQ(counters.failed, 1U);
  EXPECT_EQ(counters.handedOver, counters.committed + counters.waiting + counters.failed);
  EXPECT_TRUE(flush());
  EXPECT_EQ(ask(file(), "SELECT name FROM events ORDER BY id"), (std::vector<std::string>{"first", "last"}));
}

TEST_F(RecorderShortMemory, AnEventThatWasNotTakenHoldsNobodyUp) {
  options_.highWaterEvents = 1;
  options_.oldestWaiting = std::chrono::milliseconds(0);
  start();
  recorder_->waitUntilOpened();
  EXPECT_FALSE(recordWithoutMemory(std::string(100'000, 'n')));
  EXPECT_FALSE(recorder_->isFull());
}

TEST_F(RecorderShortMemory, WhatIsSettledDoesNotWaitForAnEventThatWasNotTaken) {
  tarn::testing::ManualWorkQueues queues(clock_);
  const auto queue = queues.makeSerialQueue("settled", platform::QualityOfService::Utility);
  start();
  recorder_->waitUntilOpened();
  EXPECT_FALSE(recordWithoutMemory(std::string(4'000'000, 'n')));
  record("taken");
  bool settled = false;
  recorder_->settle(queue, [&settled] { settled = true; });
  ASSERT_TRUE(flush());
  ASSERT_TRUE(eventually([&] { return queue->waiting() == 1; }));
  queues.runUntilIdle();
  EXPECT_TRUE(settled);
}

TEST_F(RecorderShortMemory, ANoteThatThereIsNoneForIsThrownAndWasNotMade) {
  options_.highWaterEvents = 1;
  gatherForLong();
  RecorderSessionRecords records(start(), clock_, [](platform::SessionNumber session) noexcept { return session; });
  recorder_->waitUntilOpened();
  platform::SessionFacts facts;
  facts.process = std::string(1000, 'p');
  bool thrown = false;
  {
    const FailingAllocations failing(1, FailingAllocations::kAll);
    try {
      records.created(facts);
    } catch (const std::bad_alloc&) {
      thrown = true;
    }
  }
  EXPECT_TRUE(thrown);
  EXPECT_EQ(records.created(facts), 1);
  ASSERT_TRUE(flush());
  EXPECT_EQ(askOne(file(), "SELECT count(*), max(id) FROM sessions"), "1|1");
}

// The writer's allocations, SQLite's own among them, fail one after the other.
TEST_F(RecorderShortMemory, TheWriterTriesAgainAndWritesEverythingOnce) {
  startSilently();
  int written = 0;
  int happened = 0;
  for (std::uint64_t ordinal = 1; ordinal < 200; ordinal += 1 + ordinal / 20) {
    recordMany(3);
    written += 3;
    const FailingAllocationsOfOthers failing(ordinal);
    ASSERT_TRUE(flush()) << ordinal;
    happened += static_cast<int>(failing.happened());
  }
  EXPECT_GT(happened, 10);
  EXPECT_EQ(askOne(file(), "SELECT count(*), min(id), max(id) FROM events"),
            std::to_string(written) + "|1|" + std::to_string(written));
  EXPECT_TRUE(filesSetAside().empty());
}

TEST_F(RecorderShortMemory, AnEventKeepsItsOwnTextWhenThereIsNoneForTheNextOnes) {
  gatherForLong();
  startSilently();
  int happened = 0;
  for (std::uint64_t ordinal = 1; ordinal < 60; ++ordinal) {
    record("short", {{"name", "short"}});
    // So many digits take memory.
    record("long", {{"name", "long"}, {"time", 1750000000.1234567 + static_cast<double>(ordinal)}});
    const FailingAllocationsOfOthers failing(ordinal);
    ASSERT_TRUE(flush()) << ordinal;
    happened += static_cast<int>(failing.happened());
  }
  EXPECT_GT(happened, 10);
  EXPECT_EQ(askOne(file(), "SELECT count(*) FROM events"), "118");
  EXPECT_EQ(ask(file(), "SELECT id, payload FROM events WHERE NOT json_valid(payload)"), (std::vector<std::string>{}));
  EXPECT_EQ(askOne(file(), "SELECT count(*) FROM events WHERE payload ->> '$.name' IS NOT name"), "0");
}

TEST_F(RecorderShortMemory, TheWriterTriesAgainWhenNothingAtAllIsLeftForAWhile) {
  startSilently();
  record("before");
  ASSERT_TRUE(flush());
  {
    const FailingAllocationsOfOthers failing(1, FailingAllocations::kAll);
    recordMany(50);
    ASSERT_TRUE(eventually([&] { return failing.happened() > 10; }));
  }
  ASSERT_TRUE(flush());
  EXPECT_EQ(askOne(file(), "SELECT count(*), max(id) FROM events"), "51|51");
  EXPECT_TRUE(filesSetAside().empty());
}

// A queue that has no memory for what is handed over to it, twice.
class ShortQueue final : public platform::WorkQueue {
 public:
  void async(platform::Work work) override {
    if (refused_++ < 2) throw std::bad_alloc();
    work();
    done_ = true;
  }
  void asyncAfter(std::chrono::nanoseconds, platform::Work) override {}
  bool isCurrent() const noexcept override { return false; }
  std::size_t waiting() const noexcept override { return 0; }
  bool isDone() const { return done_; }

 private:
  int refused_ = 0;
  std::atomic<bool> done_{false};
};

TEST_F(RecorderShortMemory, AnAnswerThatThereIsNoneForComesLater) {
  gatherForLong();
  start();
  recorder_->waitUntilOpened();
  record("an event");
  const auto queue = std::make_shared<ShortQueue>();
  std::atomic<bool> answered{false};
  recorder_->settle(queue, [&answered] { answered = true; });
  EXPECT_TRUE(eventually([&] { return queue->isDone(); }));
  EXPECT_TRUE(answered);
}

TEST_F(RecorderShortMemory, ALookAtTheStateDirectoryIsGivenUpWithoutEndingTheProcess) {
  std::filesystem::create_directories(file().parent_path());
  for (const char* const name : {".damaged-1", ".damaged-2"}) {
    std::ofstream(file().string() + name) << std::string(3000, 'x');
  }
  std::vector<StateUsage::Removed> removed{{"not looked yet", "", false}};
  StateUsage usage(file(), 90, {{"summary file", file().parent_path(), "", true, 4, 90}}, 1'000'000);
  const auto isNew = [](const std::string&) { return 0.0; };
  const int failed = tarn::testing::failEachAllocation([&] { removed = usage.tidy(isNew); }, [] {});
  EXPECT_GT(failed, 5);
  EXPECT_TRUE(removed.empty());
}

TEST(LateRepliesShortMemory, AReplyThatThereIsNoneForLeavesTheOthersInTheirOrder) {
  tarn::testing::ManualClock clock;
  tarn::testing::ManualWorkQueues queues(clock);
  std::vector<int> replies;
  const auto reply = [&](int number) -> platform::Work { return [&replies, number] { replies.push_back(number); }; };
  LateReplies late(queues, {"replies"});
  EXPECT_TRUE(late.add(reply(1)));
  const int failed = tarn::testing::failEachAllocation([&] { EXPECT_TRUE(late.add(reply(2))); }, [] {});
  EXPECT_GT(failed, 0);
  EXPECT_TRUE(late.add(reply(3)));
  queues.runUntilIdle();
  EXPECT_EQ(replies, (std::vector<int>{1, 2, 3}));
}

}  // namespace
}  // namespace tarn::recorder
