// SPDX-License-Identifier: Apache-2.0
// Files of older layouts: each is brought to the present one when it is opened, whole or not at all.
#include <random>

#include "recorder/store/StoreReport.h"
#include "recorder/store/reading/EventReader.h"
#include "tests/recorder/RecorderFixture.h"
#include "tests/recorder/faults/ChildProcess.h"
#include "tests/support/Seeds.h"

namespace tarn::recorder {
namespace {

using Rows = std::vector<std::string>;

class StoreMigration : public RecorderFixture {
 protected:
  // As the first recorder made it: 128 events, all with their checksums.
  void makeVersion0() {
    std::ifstream text(std::string(TARN_STORE_FILES) + "/version0.sql");
    change(file(), std::string(std::istreambuf_iterator<char>(text), {}));
    before_ = ask(file(), kAll);
    ASSERT_EQ(before_.size(), 128U);
  }
  // A larger one of which nothing is proven.
  void makeLargeVersion0() {
    change(file(),
           "PRAGMA page_size = 8192; PRAGMA auto_vacuum = INCREMENTAL; PRAGMA journal_mode = WAL;"
           "CREATE TABLE events(id INTEGER PRIMARY KEY, time REAL, backend TEXT, name TEXT, payload TEXT, detail TEXT);"
           "WITH RECURSIVE n(i) AS (SELECT 1 UNION ALL SELECT i + 1 FROM n WHERE i < 20000) INSERT INTO events SELECT "
           "i, 1750000000.0 + i, 'tally', 'event' || (i % 7), '{\"n\":' || (i / 2) || ',\"text\":\"' || "
           "hex(zeroblob(100)) || '\"}', '{}' FROM n");
    before_ = ask(file(), kAll);
    ASSERT_EQ(before_.size(), 20'000U);
  }
  void open() {
    start();
    recorder_->waitUntilOpened();
    ASSERT_TRUE(flush());
    stop();
  }

  static constexpr const char* kAll = "SELECT id, time, backend, name, payload, detail FROM events ORDER BY id";
  Rows before_;
};

TEST_F(StoreMigration, AStoreOfVersion0KeepsItsEventsAndTheirChecksums) {
  makeVersion0();
  open();
  EXPECT_EQ(errors(), 0U);
  EXPECT_TRUE(log_.contains("had the layout of an older service; its 128 events have the present one now"));
  EXPECT_EQ(askOne(file(), "PRAGMA user_version"), "2");
  EXPECT_EQ(ask(file(), kAll), before_);
  EXPECT_EQ(askOne(file(), "SELECT count(session) FROM events"), "0");
  const auto report = inspectStore(file());
  ASSERT_TRUE(report.ok());
  EXPECT_TRUE(report.value.isWhole());
  EXPECT_EQ(report.value.whole, 128);
}

TEST_F(StoreMigration, PayloadsThatRepeatAreStoredOnce) {
  makeVersion0();
  const std::string different = askOne(file(), "SELECT count(DISTINCT payload) FROM events WHERE backend = 'tally'");
  open();
  EXPECT_EQ(askOne(file(), "SELECT count(*) FROM event_texts WHERE name IS NULL"),
            std::to_string(std::stoi(different) + 1))
      << "and that of the mirror's session";
}

TEST_F(StoreMigration, IdsGoOnAfterIt) {
  makeVersion0();
  start();
  record("next");
  ASSERT_TRUE(flush());
  EXPECT_EQ(askOne(file(), "SELECT id FROM events WHERE name = 'next'"), "129");
}

TEST_F(StoreMigration, ItHappensOnce) {
  makeVersion0();
  open();
  log_.clear();
  open();
  EXPECT_FALSE(log_.contains("had the layout of an older service"));
  EXPECT_EQ(ask(file(), kAll), before_);
}

TEST_F(StoreMigration, ADamagedEventStaysDamaged) {
  makeVersion0();
  change(file(), "UPDATE events SET name = 'other' WHERE id = 50");
  start();
  ASSERT_TRUE(eventually([&] { return log_.contains(" are lost ("); })) << "the next look at the rows finds it";
  stop();
  const auto report = inspectStore(file());
  ASSERT_TRUE(report.ok());
  EXPECT_EQ(report.value.notedLost, (std::vector<IdRange>{{50, 50}})) << "it is found, and the others are carried over";
  EXPECT_EQ(report.value.whole, 127);
}

TEST_F(StoreMigration, AStoreThatWasNotMigratedCanBeReadAndChecked) {
  makeVersion0();
  EventReader reader(file());
  EventQuery query;
  query.nameGlob = "*.Start";
  const auto page = reader.read(query);
  ASSERT_TRUE(page.ok()) << page.error.text();
  EXPECT_EQ(page.value.rows.size(), 2U);
  EXPECT_EQ(page.value.lookedUpTo, 128);
  query.session = 1;
  EXPECT_TRUE(reader.read(query).value.rows.empty());
  const auto report = inspectStore(file());
  ASSERT_TRUE(report.ok());
  EXPECT_EQ(report.value.whole, 128);
}

TEST_F(StoreMigration, AReaderGoesOnThroughIt) {
  makeVersion0();
  EventReader reader(file());
  EventQuery query;
  query.after = reader.read(query).value.lookedUpTo;
  start();
  record("next");
  ASSERT_TRUE(flush());
  const auto page = reader.read(query);
  ASSERT_EQ(page.value.rows.size(), 1U);
  EXPECT_EQ(page.value.rows.front().name, "next");
}

TEST_F(StoreMigration, AKillLeavesTheOldFileOrTheNewOne) {
  makeLargeVersion0();
  const std::string file0 = directory_.path() / "copy";
  std::filesystem::copy_file(file(), file0);
  for (const std::uint64_t seed : tarn::testing::testSeeds(1)) {
    SCOPED_TRACE(tarn::testing::seedNote(seed));
    std::mt19937_64 random(seed);
    for (int round = 0; round < 10; ++round) {
      for (const char* const suffix : {"-wal", "-shm", ".counts"}) {
        std::filesystem::remove(file().string() + suffix);
      }
      std::filesystem::copy_file(file0, file(), std::filesystem::copy_options::overwrite_existing);
      {
        ChildProcess child([this] {
          start();
          recorder_->waitUntilOpened();
          ::pause();
        });
        std::this_thread::sleep_for(std::chrono::milliseconds(random() % 120));
        child.killAndWait();
      }
      ASSERT_EQ(ask(file(), kAll), before_);
      ASSERT_EQ(askOne(file(), "PRAGMA quick_check"), "ok");
      open();
      ASSERT_EQ(askOne(file(), "PRAGMA user_version"), "2");
      ASSERT_EQ(ask(file(), kAll), before_);
    }
  }
}

TEST_F(StoreMigration, ItDoesNotNeedMuchMoreRoom) {
  makeLargeVersion0();
  const auto before = std::filesystem::file_size(file());
  open();
  EXPECT_LT(std::filesystem::file_size(file()), before * 5 / 4);
}

TEST_F(StoreMigration, AStoreOfVersion1GetsTheMachinesOfItsRuns) {
  options_.machine = R"({"model":"Player 3"})";
  start();
  record("before");
  ASSERT_TRUE(flush());
  stop();
  change(file(), "ALTER TABLE runs DROP COLUMN machine; PRAGMA user_version = 1");
  const Rows before = ask(file(), kAll);
  EXPECT_TRUE(inspectStore(file()).ok());
  open();
  EXPECT_EQ(errors(), 0U);
  EXPECT_EQ(askOne(file(), "PRAGMA user_version"), "2");
  EXPECT_EQ(ask(file(), "SELECT id, machine FROM runs"), (Rows{"1|NULL", "2|{\"model\":\"Player 3\"}"}));
  EXPECT_EQ(ask(file(), kAll), before);
  EXPECT_TRUE(filesSetAside().empty());
}

TEST_F(StoreMigration, TablesOfOthersUnderVersion1AreNotChanged) {
  change(file(),
         "PRAGMA journal_mode = WAL; CREATE TABLE runs(id INTEGER PRIMARY KEY, miles REAL);"
         "PRAGMA user_version = 1");
  open();
  ASSERT_EQ(filesSetAside().size(), 1U);
  EXPECT_EQ(askOne(filesSetAside().front(), "SELECT count(*) FROM pragma_table_info('runs')"), "2");
}

TEST_F(StoreMigration, ANewerLayoutIsRefusedAndLeftAlone) {
  open();
  change(file(), "PRAGMA user_version = 3");
  log_.clear();
  start();
  record("waits");
  ASSERT_TRUE(eventually([&] { return errors() == 1; }));
  EXPECT_TRUE(log_.contains(platform::LogLevel::Error,
                            "its layout is version 3, of a newer service; this one knows those up to 2"));
  EXPECT_FALSE(recorder_->flush(std::chrono::milliseconds(100)));
  EXPECT_TRUE(filesSetAside().empty());
  EXPECT_EQ(askOne(file(), "PRAGMA user_version"), "3");
  EXPECT_TRUE(inspectStore(file()).failed());
  EXPECT_EQ(EventReader(file()).read({}).error.text(), file().string() + ": its layout is that of a newer service");
}

TEST_F(StoreMigration, AViewThatIsMissingOrOtherIsMadeAnew) {
  start();
  record("event");
  stop();
  change(file(), "DROP VIEW events; CREATE VIEW events AS SELECT 1 AS id");
  EXPECT_NE(inspectStore(file()).value.damage, "");
  open();
  EXPECT_EQ(errors(), 0U);
  EXPECT_EQ(ask(file(), "SELECT id, name FROM events"), Rows{"1|event"});
}

}  // namespace
}  // namespace tarn::recorder
