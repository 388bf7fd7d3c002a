// SPDX-License-Identifier: Apache-2.0
#include "recorder/Recorder.h"

#include <cmath>
#include <limits>
#include <utility>

#include "testing/ManualWorkQueues.h"
#include "tests/recorder/RecorderFixture.h"

namespace tarn::recorder {
namespace {

using RecorderTest = RecorderFixture;

TEST_F(RecorderTest, ColumnsAreExactlyTheAgreedOnes) {
  start();
  ASSERT_TRUE(flush());
  stop();
  const auto columnsOf = [this](const std::string& table) {
    return askOne(file(), "SELECT group_concat(name) FROM pragma_table_info('" + table + "')");
  };
  EXPECT_EQ(columnsOf("events"), "id,time,backend,name,payload,detail,session");
  EXPECT_EQ(columnsOf("runs"), "id,boot,version,started,ended,end_reason,machine");
  EXPECT_EQ(
      columnsOf("sessions"),
      "id,run,reporter,connection,pid,uid,process,application,service_type,service_name,created,ended,end_reason");
  EXPECT_EQ(columnsOf("periods"), "id,session,started,stopped,messages,redundant,first_event,last_event");
  EXPECT_EQ(askOne(file(), "PRAGMA user_version"), "2");
}

TEST_F(RecorderTest, FileIsInWriteAheadMode) {
  start();
  record("a");
  ASSERT_TRUE(flush());
  EXPECT_EQ(askOne(file(), "PRAGMA journal_mode"), "wal");
}

TEST_F(RecorderTest, IdsFollowTheOrderOfHandOver) {
  start();
  recordMany(10'000);
  ASSERT_TRUE(flush());
  EXPECT_EQ(askOne(file(), "SELECT count(*), min(id), max(id) FROM events"), "10000|1|10000");
  EXPECT_EQ(askOne(file(), "SELECT count(*) FROM events WHERE name = 'event' || (id - 1)"), "10000");
}

TEST_F(RecorderTest, EventsHandedOverBeforeTheStartAreWritten) {
  recorder_ = std::make_unique<Recorder>(options_, log_, clock_);
  record("early");
  recorder_->start();
  ASSERT_TRUE(flush());
  EXPECT_EQ(askOne(file(), "SELECT name FROM events"), "early");
}

TEST_F(RecorderTest, EveryKindOfValueHasItsJsonForm) {
  start();
  const plist::Array list{1, "two"};
  recorder_->record("snare", "requestSnapshot",
                    {{"bool", true},
                     {"int", -5},
                     {"big", std::uint64_t{18446744073709551615U}},
                     {"double", 10.0},
                     {"text", "a\"b\n"},
                     {"date", plist::Date{1763632800}},
                     {"far", plist::Date{1e13}},
                     {"data", plist::DataView{"\x0a\x1b"}},
                     {"list", list},
                     {"nan", std::numeric_limits<double>::quiet_NaN()},
                     {"inf", std::numeric_limits<double>::infinity()},
                     {"minus", -std::numeric_limits<double>::infinity()}},
                    {{"duration", 2.5}}, 1750000000.25);
  ASSERT_TRUE(flush());
  EXPECT_EQ(askOne(file(), "SELECT payload FROM events"),
            R"({"bool":true,"int":-5,"big":18446744073709551615,"double":10.0,"text":"a\"b\n",)"
            R"("date":"2025-11-20T10:00:00Z","far":10000000000000.0,"data":"Chs=","list":[1,"two"],)"
            R"("nan":"nan","inf":"inf","minus":"-inf"})");
  EXPECT_EQ(askOne(file(), "SELECT detail, time, backend FROM events"), R"({"duration":2.5}|1750000000.25|snare)");
  EXPECT_EQ(askOne(file(), "SELECT json_valid(payload) AND json_valid(detail) FROM events"), "1");
}

TEST_F(RecorderTest, EventsThatShareAPayloadAllCarryIt) {
  start();
  const Dictionary shared{{"volume", 0.5}};
  record("a", shared);
  record("b", shared);
  record("c");
  record("d", shared);
  record("e", {{"volume", 0.75}});
  ASSERT_TRUE(flush());
  EXPECT_EQ(ask(file(), "SELECT payload FROM events ORDER BY id"),
            (std::vector<std::string>{R"({"volume":0.5})", R"({"volume":0.5})", "{}", R"({"volume":0.5})",
                                      R"({"volume":0.75})"}));
}

TEST_F(RecorderTest, PayloadIsAsItWasAtHandOver) {
  start();
  Dictionary payload{{"n", 1}};
  record("a", payload);
  payload.set(plist::Key("n"), 2);
  ASSERT_TRUE(flush());
  EXPECT_EQ(askOne(file(), "SELECT payload FROM events"), R"({"n":1})");
}

TEST_F(RecorderTest, SingleEventsAreCommittedWithinTheAgreedTime) {
  start().waitUntilOpened();
  std::vector<std::chrono::milliseconds> times;
  for (std::uint64_t n = 1; n <= 9; ++n) {
    const auto before = std::chrono::steady_clock::now();
    record("a");
    ASSERT_TRUE(eventually([&] { return recorder_->counters().committed == n; }));
    times.push_back(std::chrono::ceil<std::chrono::milliseconds>(std::chrono::steady_clock::now() - before));
  }
  // The median, since the machine's disk may have a bad moment.
  std::sort(times.begin(), times.end());
  EXPECT_LE(times[times.size() / 2], std::chrono::milliseconds(200));
}

TEST_F(RecorderTest, AGroupIsNotHeldBackByEventsThatKeepComing) {
  start().waitUntilOpened();
  const auto before = std::chrono::steady_clock::now();
  // Closer together than the quiet time, so that only the group's own limit ends it.
  while (recorder_->counters().committed == 0 && std::chrono::steady_clock::now() - before < kPatience) {
    record("a");
    std::this_thread::sleep_for(std::chrono::milliseconds(1));
  }
  const RecorderCounters counters = recorder_->counters();
  EXPECT_GT(counters.committed, 0U);
  EXPECT_LT(std::chrono::steady_clock::now() - before, std::chrono::seconds(2));
}

TEST_F(RecorderTest, EventsCloseTogetherShareACommit) {
  gatherForLong();
  start().waitUntilOpened();
  recordMany(100);
  EXPECT_EQ(recorder_->counters().waiting, 100U);
  ASSERT_TRUE(flush());
  const RecorderCounters counters = recorder_->counters();
  EXPECT_EQ(counters.committed, 100U);
  EXPECT_EQ(counters.waiting, 0U);
}

TEST_F(RecorderTest, ALargeGroupIsWrittenAtOnce) {
  gatherForLong();
  options_.groupEvents = 50;
  start().waitUntilOpened();
  recordMany(50);
  EXPECT_TRUE(eventually([&] { return recorder_->counters().committed == 50; }));
}

TEST_F(RecorderTest, AGroupOfManyBytesIsWrittenAtOnce) {
  gatherForLong();
  options_.groupBytes = 100'000;
  start().waitUntilOpened();
  recordMany(11, 10'000);
  EXPECT_TRUE(eventually([&] { return recorder_->counters().committed >= 10; }));
}

class RecorderSettle : public RecorderFixture {
 protected:
  void settle(const std::string& name) {
    recorder_->settle(queue_, [this, name, guard = Guard(this)] { answers_.push_back(name); });
  }
  // Counts the answers that are destroyed, called or not.
  struct Guard {
    explicit Guard(RecorderSettle* settling) : test(settling) {}
    Guard(Guard&& other) noexcept : test(std::exchange(other.test, nullptr)) {}
    Guard& operator=(Guard&&) = delete;
    ~Guard() {
      if (test != nullptr) {
        ++test->destroyed_;
      }
    }
    RecorderSettle* test;
  };

  tarn::testing::ManualWorkQueues queues_{clock_};
  const std::shared_ptr<platform::WorkQueue> queue_ =
      queues_.makeSerialQueue("settled", platform::QualityOfService::Utility);
  std::vector<std::string> answers_;
  std::atomic<int> destroyed_{0};
};

TEST_F(RecorderSettle, AnswersOnItsQueueOnceAllHandedOverBeforeIsCommitted) {
  recorder_ = std::make_unique<Recorder>(options_, log_, clock_);
  recordMany(10);
  settle("ten");
  recordMany(10);
  settle("twenty");
  EXPECT_EQ(queues_.runUntilIdle(), 0U);
  recorder_->start();
  EXPECT_TRUE(eventually([&] { return queue_->waiting() == 2; }));
  EXPECT_TRUE(answers_.empty());
  queues_.runUntilIdle();
  EXPECT_EQ(answers_, (std::vector<std::string>{"ten", "twenty"}));
  EXPECT_EQ(askOne(file(), "SELECT count(*) FROM events"), "20");
}

TEST_F(RecorderSettle, AnswersAtOnceWhenNothingWaits) {
  recorder_ = std::make_unique<Recorder>(options_, log_, clock_);
  settle("nothing");
  queues_.runUntilIdle();
  EXPECT_EQ(answers_, std::vector<std::string>{"nothing"});
}

TEST_F(RecorderSettle, DoesNotWaitForCompany) {
  gatherForLong();
  start().waitUntilOpened();
  record("alone");
  settle("alone");
  EXPECT_TRUE(eventually([&] { return queue_->waiting() == 1; }));
}

TEST_F(RecorderSettle, IsDestroyedUncalledWhenEventsAreGivenUp) {
  std::filesystem::create_directory(directory_.path() / "state");
  std::ofstream(directory_.path() / "state" / "file") << "in the way";
  options_.file = directory_.path() / "state" / "file" / "recorder.sqlite3";
  start();
  record("lost");
  settle("lost");
  recorder_->shutdown();
  settle("later");
  queues_.runUntilIdle();
  EXPECT_TRUE(answers_.empty());
  EXPECT_EQ(destroyed_, 2);
}

TEST_F(RecorderTest, ShutdownCommitsWhatWaits) {
  gatherForLong();
  start();
  recordMany(500);
  recorder_->shutdown();
  EXPECT_EQ(recorder_->counters().committed, 500U);
  EXPECT_FALSE(std::filesystem::exists(file().string() + "-wal")) << "a clean end leaves one file";
  EXPECT_EQ(askOne(file(), "SELECT count(*) FROM events"), "500");
}

TEST_F(RecorderTest, EventsBehindTheShutdownCountAsFailedAndAreLoggedOnce) {
  start();
  recorder_->shutdown();
  recordMany(3);
  const RecorderCounters counters = recorder_->counters();
  EXPECT_EQ(counters.handedOver, 3U);
  EXPECT_EQ(counters.failed, 3U);
  EXPECT_EQ(errors(), 1U);
}

TEST_F(RecorderTest, IdsGoOnInTheNextRun) {
  start();
  recordMany(3);
  stop();
  start();
  record("next");
  stop();
  EXPECT_EQ(askOne(file(), "SELECT id FROM events WHERE name = 'next'"), "4");
}

TEST_F(RecorderTest, IsFullFromTheHighMarkUntilTheLowMark) {
  gatherForLong();
  options_.highWaterEvents = 10;
  options_.lowWaterEvents = 5;
  recorder_ = std::make_unique<Recorder>(options_, log_, clock_);
  std::atomic<int> calls{0};
  std::atomic<bool> fullInHandler{true};
  recorder_->setRoomHandler([&] {
    fullInHandler = recorder_->isFull();
    ++calls;
  });
  recorder_->start();
  recordMany(9);
  EXPECT_FALSE(recorder_->isFull());
  recordMany(1);
  EXPECT_TRUE(recorder_->isFull());
  ASSERT_TRUE(flush());
  EXPECT_TRUE(eventually([&] { return calls == 1; }));
  EXPECT_FALSE(fullInHandler);
  EXPECT_FALSE(recorder_->isFull());
}

TEST_F(RecorderTest, IsCrowdedFromThreeQuartersOfTheHighMarkUntilTheLowMark) {
  gatherForLong();
  options_.highWaterEvents = 12;
  options_.lowWaterEvents = 5;
  recorder_ = std::make_unique<Recorder>(options_, log_, clock_);
  std::atomic<int> calls{0};
  recorder_->setRoomHandler([&] { ++calls; });
  recorder_->start();
  EXPECT_EQ(recorder_->roomUntilCrowded(), 9U);
  recordMany(8);
  EXPECT_FALSE(recorder_->isCrowded());
  EXPECT_EQ(recorder_->roomUntilCrowded(), 1U);
  recordMany(1);
  EXPECT_TRUE(recorder_->isCrowded());
  EXPECT_EQ(recorder_->roomUntilCrowded(), 0U);
  EXPECT_FALSE(recorder_->isFull());
  recordMany(1);
  EXPECT_EQ(recorder_->roomUntilCrowded(), 0U);
  ASSERT_TRUE(flush());
  EXPECT_TRUE(eventually([&] { return calls == 1; }));
  EXPECT_FALSE(recorder_->isCrowded());
  EXPECT_EQ(recorder_->roomUntilCrowded(), 9U);
}

TEST_F(RecorderTest, BytesFillItToo) {
  gatherForLong();
  options_.highWaterBytes = 100'000;
  options_.lowWaterBytes = 50'000;
  start();
  recordMany(9, 10'000);
  EXPECT_FALSE(recorder_->isFull());
  recordMany(1, 10'000);
  EXPECT_TRUE(recorder_->isFull());
  ASSERT_TRUE(flush());
  EXPECT_TRUE(eventually([&] { return !recorder_->isFull(); }));
}

TEST_F(RecorderTest, EventsBeyondTheHighMarkAreTakenAllTheSame) {
  options_.highWaterEvents = 10;
  options_.lowWaterEvents = 5;
  start();
  recordMany(1000);
  ASSERT_TRUE(flush());
  EXPECT_EQ(askOne(file(), "SELECT count(*) FROM events"), "1000");
}

TEST_F(RecorderTest, ReadersSeeCommittedEventsWhileMoreAreWritten) {
  start();
  recordMany(100);
  ASSERT_TRUE(flush());
  std::atomic<bool> done{false};
  std::thread writer([&] {
    for (int i = 0; i < 200; ++i) {
      recordMany(20);
    }
    done = true;
  });
  long last = 100;
  int looks = 0;
  while (!done || looks < 3) {
    const long now = std::stol(askOne(file(), "SELECT count(*) FROM events"));
    EXPECT_GE(now, last);
    last = now;
    ++looks;
  }
  writer.join();
  ASSERT_TRUE(flush());
  EXPECT_EQ(askOne(file(), "SELECT count(*) FROM events"), "4100");
}

TEST_F(RecorderTest, ALongReaderDoesNotStopTheWriter) {
  start();
  recordMany(10);
  ASSERT_TRUE(flush());
  sqlite3* reader = nullptr;
  ASSERT_EQ(sqlite3_open_v2(file().c_str(), &reader, SQLITE_OPEN_READONLY, nullptr), SQLITE_OK);
  ASSERT_EQ(sqlite3_exec(reader, "BEGIN; SELECT count(*) FROM events", nullptr, nullptr, nullptr), SQLITE_OK);
  recordMany(20'000, 1000);
  EXPECT_TRUE(flush());
  sqlite3_close(reader);
  EXPECT_EQ(errors(), 0U);
}

}  // namespace
}  // namespace tarn::recorder
