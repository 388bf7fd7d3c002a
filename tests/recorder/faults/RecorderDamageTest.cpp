// SPDX-License-Identifier: Apache-2.0
// Damage that SQLite itself doesn't see, and logs that are damaged, cut or gone: each is told, what can be read stays,
// and no id is given twice.
#include <sys/stat.h>

#include <random>

#include "recorder/store/StoreReport.h"
#include "tests/recorder/RecorderFixture.h"
#include "tests/recorder/faults/ChildProcess.h"
#include "tests/support/Seeds.h"

namespace tarn::recorder {
namespace {

class RecorderDamage : public RecorderFixture {
 protected:
  // A recorder that ends without a word, once all of it is committed.
  void recordAndCrash(int count) {
    ChildProcess child([this, count] {
      start();
      recordMany(count);
      ASSERT_TRUE(flush());
      ::_exit(0);
    });
    ASSERT_EQ(child.wait(), 0);
  }
  std::filesystem::path log() const { return file().string() + "-wal"; }
  std::filesystem::path index() const { return file().string() + "-shm"; }
  // Changes bytes wherever they stand in a file that nobody has open.
  void replaceInFile(const std::filesystem::path& path, const std::string& from, const std::string& to) {
    std::string bytes = contents(path);
    ASSERT_NE(bytes.find(from), std::string::npos);
    for (std::size_t at = 0; (at = bytes.find(from, at)) != std::string::npos; at += to.size()) {
      bytes.replace(at, from.size(), to);
    }
    std::ofstream(path, std::ios::binary) << bytes;
  }
  static std::string contents(const std::filesystem::path& path) {
    std::ifstream in(path, std::ios::binary);
    return {std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>()};
  }
  StoreReport report() {
    const auto inspected = inspectStore(file());
    EXPECT_FALSE(inspected.failed()) << inspected.error->text;
    return inspected.value;
  }
  std::string idsOf() { return askOne(file(), "SELECT count(*), min(id), max(id) FROM events"); }
};

using Ranges = std::vector<IdRange>;

TEST_F(RecorderDamage, AWholeStoreIsWhole) {
  start();
  recordMany(1000);
  ASSERT_TRUE(flush());
  EXPECT_TRUE(report().isWhole());
  EXPECT_EQ(report().whole, 1000);
  stop();
  EXPECT_TRUE(report().isWhole());
}

TEST_F(RecorderDamage, AChangedRowIsToldByItsId) {
  start();
  recordMany(1000);
  stop();
  replaceInFile(file(), "event500", "evenT500");
  EXPECT_FALSE(report().isWhole());
  EXPECT_EQ(report().lost, (Ranges{{501, 501}}));
  EXPECT_EQ(report().whole, 999);
}

TEST_F(RecorderDamage, AMissingRowIsToldByItsId) {
  start();
  recordMany(200);
  stop();
  change(file(), "DELETE FROM event_rows WHERE id IN (7, 8, 200)");
  EXPECT_EQ(report().lost, (Ranges{{7, 8}, {200, 200}}));
}

TEST_F(RecorderDamage, ARowWithoutItsChecksumIsUnproven) {
  start();
  recordMany(200);
  ASSERT_TRUE(flush());
  stop();
  change(file(), "UPDATE event_groups SET seconds = seconds + 1 WHERE first = 65");
  EXPECT_TRUE(report().lost.empty());
  EXPECT_EQ(report().unproven, (Ranges{{65, 128}}));
}

TEST_F(RecorderDamage, AFileThatIsNotThereIsNotChecked) {
  EXPECT_TRUE(inspectStore(file()).failed());
}

TEST_F(RecorderDamage, RowsOfARecorderWithoutChecksumsAreTakenAsTheyAre) {
  change(file(),
         "CREATE TABLE events(id INTEGER PRIMARY KEY, time REAL, backend TEXT, name TEXT, payload TEXT, detail TEXT);"
         "INSERT INTO events(id, time, name) VALUES(41, 1750000000, 'old')");
  start();
  record("next");
  stop();
  EXPECT_TRUE(report().isWhole());
  EXPECT_EQ(report().whole, 1);
}

TEST_F(RecorderDamage, WhatRetentionRemovedIsNotMissed) {
  options_.maxMegabytes = 1;
  start();
  for (int round = 0; round < 10; ++round) {
    recordMany(500, 1000);
    ASSERT_TRUE(flush());
  }
  ASSERT_GT(recorder_->counters().expired, 0U);
  stop();
  EXPECT_TRUE(report().isWhole()) << textOf(report().lost);
}

// Each bit that flips is seen, or every row is still as it was.
TEST_F(RecorderDamage, AFlippedBitIsSeenOrHarmless) {
  start();
  recordMany(700, 60);
  stop();
  const std::string whole = contents(file());
  const auto rows = ask(file(), "SELECT * FROM events ORDER BY id");
  for (const std::uint64_t seed : tarn::testing::testSeeds(1)) {
    SCOPED_TRACE(tarn::testing::seedNote(seed));
    std::mt19937_64 random(seed);
    for (int flip = 0; flip < 150; ++flip) {
      std::string bytes = whole;
      const std::size_t bit = random() % (bytes.size() * 8);
      bytes[bit / 8] = static_cast<char>(bytes[bit / 8] ^ (1 << (bit % 8)));
      std::ofstream(file(), std::ios::binary) << bytes;
      const auto inspected = inspectStore(file());
      const bool seen = inspected.failed() || !inspected.value.isWhole();
      ASSERT_TRUE(seen || ask(file(), "SELECT * FROM events ORDER BY id") == rows) << "bit " << bit;
      std::filesystem::remove(log());
      std::filesystem::remove(index());
    }
  }
}

// No checksum holds what makes the tables; SQLite refuses much of it, but not all.
TEST_F(RecorderDamage, ATableUnderAnotherNameIsSeen) {
  start();
  recordMany(10);
  stop();
  const std::string whole = contents(file());
  const std::pair<const char*, const char*> changes[] = {{"tablerecorder_state", "tablebecorder_state"},
                                                         {"tableevent_rowsevent_rows", "tableevent_rowsevent_row3"},
                                                         {"vieweventsevents", "vieweventsevent3"}};
  for (const auto& [from, to] : changes) {
    replaceInFile(file(), from, to);
    const auto inspected = inspectStore(file());
    EXPECT_TRUE(inspected.failed() || !inspected.value.isWhole()) << to;
    std::ofstream(file(), std::ios::binary) << whole;
  }
}

TEST_F(RecorderDamage, AnIndexThatSaysOtherwiseIsSeen) {
  start();
  recordMany(10);
  stop();
  const std::string entry("\x03\x19\x01", 3);  // how its record begins, other than the row's
  replaceInFile(file(), entry + "event5", entry + "eventx");
  EXPECT_NE(report().damage, "");
  EXPECT_TRUE(report().lost.empty());
}

TEST_F(RecorderDamage, ARunningRecorderFindsAChangedRowAndCarriesTheRestOver) {
  start();
  recordMany(1000);
  stop();
  replaceInFile(file(), "event500", "evenT500");
  options_.verifyInterval = options_.verifyRest = std::chrono::milliseconds(1);
  start();
  ASSERT_TRUE(eventually([&] { return log_.count("got 999 events from recorder.sqlite3.damaged-") == 1; }));
  record("next");
  ASSERT_TRUE(flush());
  stop();
  EXPECT_EQ(errors(), 1U);
  EXPECT_TRUE(log_.contains("events 501 aren't as they were written"));
  EXPECT_TRUE(log_.contains("1 are lost (501)"));
  EXPECT_EQ(filesSetAside().size(), 1U);
  EXPECT_EQ(idsOf(), "1000|1|1001");
  EXPECT_EQ(report().notedLost, (Ranges{{501, 501}}));
  EXPECT_TRUE(report().lost.empty());
}

TEST_F(RecorderDamage, AnIdleRecorderComparesAWholeFileAndFindsNothing) {
  options_.verifyInterval = options_.verifyRest = std::chrono::milliseconds(1);
  start();
  recordMany(5000);
  ASSERT_TRUE(flush());
  std::this_thread::sleep_for(std::chrono::milliseconds(100));
  stop();
  EXPECT_EQ(errors(), 0U);
  EXPECT_EQ(filesSetAside().size(), 0U);
}

TEST_F(RecorderDamage, ALogThatIsGoneAfterACrashIsToldAndItsIdsAreNotGivenAgain) {
  start();
  recordMany(50);
  stop();
  recordAndCrash(100);
  std::filesystem::remove(log());
  std::filesystem::remove(index());
  start();
  record("next");
  ASSERT_TRUE(flush());
  EXPECT_TRUE(log_.contains(platform::LogLevel::Error, "misses 100 committed events (51-150)"));
  EXPECT_EQ(errors(), 1U);
  EXPECT_EQ(idsOf(), "51|1|151");
  EXPECT_EQ(report().notedLost, (Ranges{{51, 150}}));
  stop();
  log_.clear();
  start().waitUntilOpened();
  EXPECT_EQ(errors(), 0U) << "it is told once";
}

TEST_F(RecorderDamage, AFileThatLostAllWithItsLogIsToldAndItsIdsAreNotGivenAgain) {
  recordAndCrash(100);
  std::filesystem::remove(log());
  std::filesystem::remove(index());
  start();
  record("next");
  ASSERT_TRUE(flush());
  EXPECT_TRUE(log_.contains(platform::LogLevel::Error, "holds nothing of the events up to 100 that were committed"));
  EXPECT_EQ(errors(), 1U);
  EXPECT_EQ(ask(file(), "SELECT id, name FROM events"), std::vector<std::string>{"101|next"});
}

TEST_F(RecorderDamage, ALogThatIsDamagedAfterACrashIsReadUpToThereAndTheRestIsTold) {
  ChildProcess child([this] {
    start();
    for (int commit = 0; commit < 20; ++commit) {
      recordMany(10);
      ASSERT_TRUE(flush());
    }
    ::_exit(0);
  });
  ASSERT_EQ(child.wait(), 0);
  std::string bytes = contents(log());
  bytes[bytes.size() / 2] = static_cast<char>(bytes[bytes.size() / 2] ^ 1);
  std::ofstream(log(), std::ios::binary) << bytes;
  start();
  record("next");
  ASSERT_TRUE(flush());
  stop();
  EXPECT_EQ(errors(), 1U);
  const long held = std::stol(askOne(file(), "SELECT count(*) FROM events WHERE id <= 200"));
  EXPECT_GT(held, 0);
  EXPECT_LT(held, 200);
  EXPECT_EQ(askOne(file(), "SELECT max(id) FROM events"), "201");
  EXPECT_EQ(report().notedLost, (Ranges{{held + 1, 200}}));
}

TEST_F(RecorderDamage, ALogThatIsCutWhileRunningIsToldAndWritingGoesOn) {
  start();
  for (int commit = 0; commit < 10; ++commit) {
    recordMany(10);
    ASSERT_TRUE(flush());
  }
  std::filesystem::resize_file(log(), std::filesystem::file_size(log()) / 2);
  record("next");
  ASSERT_TRUE(flush());
  stop();
  EXPECT_TRUE(log_.contains(platform::LogLevel::Error, "its log was cut"));
  EXPECT_TRUE(log_.contains(platform::LogLevel::Error, "committed events ("));
  EXPECT_EQ(ask(file(), "SELECT id FROM events WHERE name = 'next'"), std::vector<std::string>{"101"});
  EXPECT_TRUE(report().lost.empty());
  EXPECT_EQ(report().whole + countOf(report().notedLost), 101);
}

TEST_F(RecorderDamage, ALogThatIsTakenAwayWhileRunningLosesNothing) {
  start();
  recordMany(100);
  ASSERT_TRUE(flush());
  std::filesystem::remove(log());
  record("next");
  ASSERT_TRUE(flush());
  stop();
  EXPECT_TRUE(log_.contains(platform::LogLevel::Error, "its log was taken away"));
  EXPECT_EQ(idsOf(), "101|1|101");
  EXPECT_TRUE(report().isWhole());
}

TEST_F(RecorderDamage, AnIndexThatIsCutWhileRunningEndsNothing) {
  ChildProcess child([this] {
    start();
    for (int round = 1; round <= 20; ++round) {
      recordMany(100);
      ASSERT_TRUE(flush());
      std::filesystem::resize_file(index(), round % 2 == 0 ? 0 : 4096);
    }
    recordMany(100);
    ASSERT_TRUE(flush());
    stop();
    EXPECT_TRUE(log_.contains(platform::LogLevel::Error, "the index of its log was cut"));
  });
  ASSERT_EQ(child.wait(), 0);
  EXPECT_EQ(idsOf(), "2100|1|2100");
  EXPECT_TRUE(report().isWhole());
}

TEST_F(RecorderDamage, WhatIsNoFileInTheLogsPlaceIsSetAside) {
  start();
  recordMany(10);
  stop();
  const std::filesystem::path elsewhere = directory_.path() / "elsewhere";
  std::ofstream(elsewhere) << "mine";
  for (const auto& place : {log(), index()}) {
    log_.clear();
    std::filesystem::create_directory(place);
    start().waitUntilOpened();
    stop();
    ASSERT_EQ(::mkfifo(place.c_str(), 0600), 0);
    start().waitUntilOpened();
    stop();
    std::filesystem::create_symlink(elsewhere, place);
    start().waitUntilOpened();
    record("next");
    ASSERT_TRUE(flush());
    stop();
    EXPECT_EQ(errors(), 3U);
    EXPECT_EQ(log_.count("no regular file; it is set aside as recorder.sqlite3.damaged-"), 3U);
  }
  EXPECT_EQ(contents(elsewhere), "mine");
  EXPECT_EQ(idsOf(), "12|1|12");
}

}  // namespace
}  // namespace tarn::recorder
