// SPDX-License-Identifier: Apache-2.0
// What becomes of files that can't be used, and of files that go away.
#include <fcntl.h>

#include <cerrno>
#include <cstdio>

#include "recorder/store/StoreReport.h"
#include "tests/recorder/RecorderFixture.h"

namespace tarn::recorder {
namespace {

class RecorderFileTest : public RecorderFixture {
 protected:
  void write(const std::filesystem::path& path, const std::string& bytes) {
    std::ofstream(path, std::ios::binary) << bytes;
  }
  void overwrite(const std::filesystem::path& path, std::streamoff at, std::size_t count) {
    std::fstream stream(path, std::ios::binary | std::ios::in | std::ios::out);
    stream.seekp(at);
    stream << std::string(count, '\x5a');
  }
  // The recorder starts on the file as it is: it must set it aside, say so once, and write into a fresh one.
  void expectSetAside() {
    start();
    record("fresh");
    ASSERT_TRUE(flush());
    stop();
    EXPECT_EQ(errors(), 1U);
    EXPECT_TRUE(log_.contains(platform::LogLevel::Error, "set aside as recorder.sqlite3.damaged-"));
    EXPECT_EQ(filesSetAside().size(), 1U);
    EXPECT_EQ(ask(file(), "SELECT id, name FROM events"), std::vector<std::string>{"1|fresh"});
  }
  // The same for a file of 3000 events, of which some can still be read.
  void expectTheRestCarriedOver() {
    start();
    record("fresh");
    ASSERT_TRUE(flush());
    stop();
    EXPECT_EQ(errors(), 1U);
    EXPECT_EQ(filesSetAside().size(), 1U);
    EXPECT_EQ(askOne(file(), "SELECT max(id) FROM events"), "3001");
    EXPECT_GT(std::stol(askOne(file(), "SELECT count(*) FROM events")), 1000);
    EXPECT_EQ(askOne(file(), "SELECT count(*) FROM events WHERE id <= 3000 AND name <> 'event' || (id - 1)"), "0");
    const auto report = inspectStore(file());
    ASSERT_FALSE(report.failed()) << report.error->text;
    EXPECT_EQ(report.value.damage, "");
    EXPECT_TRUE(report.value.lost.empty()) << textOf(report.value.lost);
    EXPECT_EQ(report.value.whole + countOf(report.value.notedLost), 3001);
    EXPECT_TRUE(log_.contains(std::to_string(countOf(report.value.notedLost)) + " are lost ("));
  }
};

TEST_F(RecorderFileTest, GarbageIsSetAsideUntouched) {
  const std::string garbage(10'000, 'g');
  write(file(), garbage);
  expectSetAside();
  std::ifstream aside(filesSetAside().front(), std::ios::binary);
  EXPECT_EQ(std::string(std::istreambuf_iterator<char>(aside), {}), garbage);
}

TEST_F(RecorderFileTest, AFewBytesThatAreNoDatabaseAreSetAside) {
  write(file(), "hello");
  expectSetAside();
}

TEST_F(RecorderFileTest, AFileOfZeroBytesIsSetAsideWhenItIsLong) {
  write(file(), std::string(20'000, '\0'));
  expectSetAside();
}

TEST_F(RecorderFileTest, AnEmptyFileIsUsed) {
  write(file(), "");
  start();
  record("fresh");
  ASSERT_TRUE(flush());
  EXPECT_EQ(errors(), 0U);
  EXPECT_EQ(askOne(file(), "SELECT name FROM events"), "fresh");
}

TEST_F(RecorderFileTest, OfADatabaseDamagedInTheMiddleTheRestIsCarriedOver) {
  start();
  recordMany(3000, 100);
  stop();
  overwrite(file(), static_cast<std::streamoff>(std::filesystem::file_size(file()) / 2), 20'000);
  expectTheRestCarriedOver();
}

TEST_F(RecorderFileTest, OfATruncatedDatabaseTheRestIsCarriedOver) {
  start();
  recordMany(3000, 100);
  stop();
  std::filesystem::resize_file(file(), std::filesystem::file_size(file()) / 2);
  expectTheRestCarriedOver();
}

TEST_F(RecorderFileTest, LogAndIndexGoWithTheFile) {
  write(file(), std::string(10'000, 'g'));
  write(file().string() + "-wal", "w");
  write(file().string() + "-shm", "s");
  expectSetAside();
  EXPECT_TRUE(std::filesystem::exists(filesSetAside().front().string() + "-wal"));
  EXPECT_TRUE(std::filesystem::exists(filesSetAside().front().string() + "-shm"));
}

TEST_F(RecorderFileTest, AnotherEventsTableIsSetAside) {
  change(file(), "CREATE TABLE events(id INTEGER PRIMARY KEY, what TEXT)");
  expectSetAside();
  EXPECT_EQ(askOne(filesSetAside().front(), "SELECT count(*) FROM events"), "0");
}

TEST_F(RecorderFileTest, EventsColumnsInAnotherOrderAreAnotherTable) {
  change(file(),
         "CREATE TABLE events(id INTEGER PRIMARY KEY, backend TEXT, time REAL, name TEXT, payload TEXT, detail TEXT)");
  expectSetAside();
}

TEST_F(RecorderFileTest, AViewOfThatNameIsSetAside) {
  change(file(), "CREATE VIEW events AS SELECT 1 AS id");
  expectSetAside();
}

TEST_F(RecorderFileTest, ATableThatRefusesOurRowsIsSetAside) {
  start();
  stop();
  change(file(), "CREATE TRIGGER refusal BEFORE INSERT ON event_rows BEGIN SELECT RAISE(ABORT, 'not this one'); END");
  expectSetAside();
}

TEST_F(RecorderFileTest, IdsThatLeaveNoRoomAreSetAside) {
  start();
  stop();
  change(file(), "INSERT INTO event_rows(id) VALUES(9223372036854775807)");
  expectSetAside();
}

TEST_F(RecorderFileTest, ADirectoryInItsPlaceIsSetAside) {
  std::filesystem::create_directory(file());
  expectSetAside();
}

TEST_F(RecorderFileTest, TheRightTableWithoutOurNotesIsUsed) {
  change(file(),
         "CREATE TABLE events(id INTEGER PRIMARY KEY, time REAL, backend TEXT, name TEXT, payload TEXT, detail TEXT);"
         "INSERT INTO events(id, time, name) VALUES(41, 1750000000, 'old')");
  start();
  record("next");
  ASSERT_TRUE(flush());
  EXPECT_EQ(errors(), 0U);
  EXPECT_EQ(ask(file(), "SELECT id, name FROM events"), (std::vector<std::string>{"41|old", "42|next"}));
}

TEST_F(RecorderFileTest, FilesSetAsideInTheSameSecondGetDifferentNames) {
  for (int round = 0; round < 3; ++round) {
    write(file(), "garbage " + std::to_string(round));
    start();
    ASSERT_TRUE(flush());
    recorder_->waitUntilOpened();
    stop();
  }
  EXPECT_EQ(filesSetAside().size(), 3U);
}

TEST_F(RecorderFileTest, DamageFoundWhileRunningMovesOnToAFreshFile) {
  options_.maxMegabytes = 26;
  start();
  for (int round = 0; round < 16; ++round) {
    recordMany(1000, 1000);
    ASSERT_TRUE(flush());
  }
  // After the first pages, which say what the tables are and are always at hand, and far from the newest ones;
  // retention comes by here first.
  overwrite(file(), 24 * 8192, 2 << 20);
  for (int round = 0; round < 10; ++round) {
    recordMany(1000, 1000);
    ASSERT_TRUE(flush());
  }
  const RecorderCounters counters = recorder_->counters();
  stop();
  EXPECT_EQ(counters.committed, 26'000U);
  EXPECT_EQ(errors(), 1U);
  EXPECT_TRUE(log_.contains(platform::LogLevel::Error, "it is set aside as recorder.sqlite3.damaged-"));
  EXPECT_TRUE(log_.contains("its kind is over its share")) << "the cap has no room for both";
  EXPECT_EQ(askOne(file(), "PRAGMA integrity_check"), "ok");
  EXPECT_EQ(askOne(file(), "SELECT max(id) FROM events"), "26000");
  const auto report = inspectStore(file());
  ASSERT_FALSE(report.failed()) << report.error->text;
  EXPECT_TRUE(report.value.lost.empty()) << textOf(report.value.lost);
  EXPECT_TRUE(log_.contains(" are lost (")) << "the note goes with the oldest events, the line stays";
}

TEST_F(RecorderFileTest, ADroppedTableMovesOnToAFreshFile) {
  start();
  record("before");
  ASSERT_TRUE(flush());
  change(file(), "DROP TABLE event_rows");
  record("after");
  ASSERT_TRUE(flush());
  EXPECT_EQ(errors(), 1U);
  EXPECT_EQ(filesSetAside().size(), 1U);
  EXPECT_EQ(ask(file(), "SELECT id, name FROM events"), std::vector<std::string>{"2|after"});
}

TEST_F(RecorderFileTest, ARenamedFileKeepsItsEventsAndAFreshOneIsBegun) {
  start();
  recordMany(5);
  ASSERT_TRUE(flush());
  const std::filesystem::path elsewhere = directory_.path() / "elsewhere.sqlite3";
  std::filesystem::rename(file(), elsewhere);
  record("after");
  ASSERT_TRUE(flush());
  EXPECT_EQ(errors(), 1U);
  EXPECT_EQ(ask(file(), "SELECT id, name FROM events"), std::vector<std::string>{"6|after"});
  EXPECT_EQ(askOne(elsewhere, "SELECT count(*) FROM events"), "5");
  EXPECT_EQ(askOne(elsewhere, "PRAGMA integrity_check"), "ok");
}

TEST_F(RecorderFileTest, AStatusThatCanNotBeReadIsNoFileTakenAway) {
  // A folder that one of the path's names can't be: the file is still where it was. The two change places in one step,
  // so that nobody sees neither.
  const auto swap = [](const std::filesystem::path& one, const std::filesystem::path& other) {
    ASSERT_EQ(::renameat2(AT_FDCWD, one.c_str(), AT_FDCWD, other.c_str(), RENAME_EXCHANGE), 0) << errno;
  };
  const std::filesystem::path folder = directory_.path() / "state";
  options_.file = folder / "recorder.sqlite3";
  start();
  record("before");
  ASSERT_TRUE(flush());
  std::ofstream(directory_.path() / "elsewhere") << "in the way";
  swap(folder, directory_.path() / "elsewhere");
  record("after");
  ASSERT_TRUE(eventually([&] { return errors() == 1; }));
  EXPECT_FALSE(log_.contains("taken away"));
  swap(folder, directory_.path() / "elsewhere");
  ASSERT_TRUE(flush());
  EXPECT_EQ(ask(file(), "SELECT id, name FROM events"), (std::vector<std::string>{"1|before", "2|after"}));
}

TEST_F(RecorderFileTest, ADeletedDirectoryIsMadeAnew) {
  options_.file = directory_.path() / "state" / "recorder.sqlite3";
  start();
  record("before");
  ASSERT_TRUE(flush());
  std::filesystem::remove_all(file().parent_path());
  record("after");
  ASSERT_TRUE(flush());
  EXPECT_EQ(errors(), 1U);
  EXPECT_EQ(ask(file(), "SELECT id, name FROM events"), std::vector<std::string>{"2|after"});
}

}  // namespace
}  // namespace tarn::recorder
