// SPDX-License-Identifier: Apache-2.0
// Many threads at once: nothing is lost, each thread's order is kept, and the account is right at any moment.
#include <atomic>

#include "recorder/store/reading/EventReader.h"
#include "tests/recorder/RecorderFixture.h"

namespace tarn::recorder {
namespace {

using RecorderStress = RecorderFixture;

TEST_F(RecorderStress, TheAccountIsRightAtAnyMomentAndNothingIsLost) {
  constexpr int kThreads = 4;
  constexpr int kEvents = 5'000;
  options_.highWaterEvents = 2'000;
  options_.lowWaterEvents = 500;
  options_.maxMegabytes = 64;
  start();
  std::atomic<bool> done{false};
  std::vector<std::thread> writers;
  for (int t = 0; t < kThreads; ++t) {
    writers.emplace_back([this, t] {
      const Dictionary payload{{"thread", t}};
      for (int i = 0; i < kEvents; ++i) {
        while (recorder_->isFull()) {
          std::this_thread::sleep_for(std::chrono::microseconds(100));
        }
        recorder_->record("tally", std::to_string(t), payload, {{"i", i}}, clock_.epochSeconds());
      }
    });
  }
  std::thread accountant([this, &done] {
    RecorderCounters last;
    while (!done) {
      const RecorderCounters now = recorder_->counters();
      ASSERT_EQ(now.handedOver, now.committed + now.waiting + now.failed);
      ASSERT_GE(now.handedOver, last.handedOver);
      ASSERT_GE(now.committed, last.committed);
      // Threads that saw room at the same moment may each bring one event more.
      ASSERT_LE(now.waiting, 2'000U + kThreads);
      last = now;
    }
  });
  std::thread flusher([this, &done] {
    while (!done) {
      ASSERT_TRUE(flush());
    }
  });
  std::thread reader([this, &done] {
    EventReader events(file());
    EventQuery query;
    std::size_t seen = 0;
    while (!done || seen < std::size_t{kThreads} * kEvents) {
      const Result<EventPage> page = events.read(query);
      ASSERT_TRUE(page.ok()) << page.error.text();
      for (const EventRow& row : page.value.rows) {
        ASSERT_EQ(row.id, static_cast<std::int64_t>(++seen));
      }
      query.after = page.value.lookedUpTo;
      if (page.value.rows.empty()) {
        events.waitForChange(std::chrono::milliseconds(50));
      }
    }
  });
  for (std::thread& writer : writers) {
    writer.join();
  }
  const bool flushed = flush();
  done = true;
  accountant.join();
  flusher.join();
  reader.join();
  EXPECT_TRUE(flushed);
  EXPECT_EQ(askOne(file(), "SELECT count(*), max(id) FROM events"), "20000|20000");
  EXPECT_EQ(askOne(file(),
                   "SELECT count(*) FROM (SELECT json_extract(detail, '$.i') AS i, lag(json_extract(detail, '$.i')) "
                   "OVER (PARTITION BY name ORDER BY id) AS before FROM events) WHERE i <> coalesce(before, -1) + 1"),
            "0");
}

TEST_F(RecorderStress, ShutdownDuringAHailOfEventsKeepsTheAccount) {
  start();
  std::atomic<bool> done{false};
  std::thread writer([this, &done] {
    while (!done) {
      record("a", {{"n", 1}});
      if (recorder_->isFull()) {
        std::this_thread::yield();
      }
    }
  });
  ASSERT_TRUE(eventually([&] { return recorder_->counters().committed > 0; }));
  recorder_->shutdown();
  done = true;
  writer.join();
  const RecorderCounters counters = recorder_->counters();
  EXPECT_EQ(counters.waiting, 0U);
  EXPECT_EQ(counters.handedOver, counters.committed + counters.failed);
  EXPECT_EQ(askOne(file(), "SELECT count(*) FROM events"), std::to_string(counters.committed));
}

}  // namespace
}  // namespace tarn::recorder
