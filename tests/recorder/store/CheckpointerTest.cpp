// SPDX-License-Identifier: Apache-2.0
// The log is brought into the database while commits go on, and what fails is left to the writer.
#include "recorder/store/Checkpointer.h"

#include "tests/recorder/RecorderFixture.h"
#include "tests/recorder/faults/FaultyFiles.h"

namespace tarn::recorder {
namespace {

class CheckpointerTest : public RecorderFixture {
 protected:
  CheckpointerTest() {
    EXPECT_EQ(writer_.open(file().string(), SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE), SQLITE_OK);
    EXPECT_EQ(writer_.run("PRAGMA journal_mode=WAL; PRAGMA wal_autocheckpoint=0; CREATE TABLE numbers(number);"
                          "INSERT INTO numbers VALUES(1), (2), (3)"),
              SQLITE_OK);
  }
  // What the database holds without its log.
  std::string inDatabase() {
    const std::filesystem::path copy = directory_.path() / "copy.sqlite3";
    std::filesystem::copy_file(file(), copy, std::filesystem::copy_options::overwrite_existing);
    return askOne(copy, "SELECT count(*) FROM numbers");
  }

  FaultyFiles files_;
  Connection writer_;
  Checkpointer checkpointer_;
};

TEST_F(CheckpointerTest, BringsTheLogIn) {
  ASSERT_NE(inDatabase(), "3");
  checkpointer_.open(file().string());
  ASSERT_TRUE(checkpointer_.begin());
  checkpointer_.finish();
  EXPECT_EQ(inDatabase(), "3");
  EXPECT_GT(checkpointer_.takeBroughtIn(), 0);
  EXPECT_EQ(checkpointer_.takeBroughtIn(), 0) << "it is told once";
}

TEST_F(CheckpointerTest, CommitsGoOnWhileItDoes) {
  checkpointer_.open(file().string());
  files_.stall(FaultyFiles::Call::SyncOfDatabase);
  ASSERT_TRUE(checkpointer_.begin());
  ASSERT_TRUE(eventually([&] { return files_.isStalled(); }));
  EXPECT_EQ(writer_.run("INSERT INTO numbers VALUES(4)"), SQLITE_OK);
  EXPECT_TRUE(checkpointer_.begin()) << "it is under way";
  files_.letGo();
  checkpointer_.finish();
  ASSERT_TRUE(checkpointer_.begin());
  checkpointer_.finish();
  EXPECT_EQ(inDatabase(), "4");
}

TEST_F(CheckpointerTest, AFailureIsLeftToTheWriterOnce) {
  checkpointer_.open(file().string());
  files_.fail(FaultyFiles::Call::Sync, 1, FaultyFiles::Fault::InputOutput);
  ASSERT_TRUE(checkpointer_.begin());
  checkpointer_.finish();
  EXPECT_TRUE(files_.hasFailed());
  EXPECT_FALSE(checkpointer_.begin());
  EXPECT_TRUE(checkpointer_.begin());
  checkpointer_.finish();
  EXPECT_EQ(inDatabase(), "3");
}

TEST_F(CheckpointerTest, WhatAReaderHoldsUpIsNotBroughtIn) {
  checkpointer_.open(file().string());
  Connection reader;
  ASSERT_EQ(reader.open(file().string(), SQLITE_OPEN_READONLY), SQLITE_OK);
  ASSERT_EQ(reader.run("BEGIN; SELECT * FROM numbers"), SQLITE_OK);
  ASSERT_EQ(writer_.run("INSERT INTO numbers VALUES(4)"), SQLITE_OK);
  ASSERT_TRUE(checkpointer_.begin());
  checkpointer_.finish();
  EXPECT_EQ(checkpointer_.takeBroughtIn(), 0);
  EXPECT_TRUE(checkpointer_.begin()) << "it is no failure";
  checkpointer_.finish();
}

TEST_F(CheckpointerTest, WithoutAFileAllIsLeftToTheWriter) {
  EXPECT_FALSE(checkpointer_.begin());
  checkpointer_.open((directory_.path() / "nothing").string());
  EXPECT_FALSE(checkpointer_.begin());
  EXPECT_FALSE(std::filesystem::exists(directory_.path() / "nothing"));
}

TEST_F(CheckpointerTest, GoesOnAfterAnotherOpening) {
  for (int round = 0; round < 3; ++round) {
    checkpointer_.open(file().string());
    ASSERT_TRUE(checkpointer_.begin());
    checkpointer_.close();
    EXPECT_FALSE(checkpointer_.begin());
  }
  EXPECT_EQ(inDatabase(), "3");
}

class RecorderCheckpoint : public RecorderFixture {
 protected:
  // 46 events are committed, and a checkpoint has got as far as the synchronisation of the database.
  void stallInACheckpoint() {
    gatherForLong();
    options_.maxMegabytes = 2;
    start();
    record("makes the tables");
    stop();
    start().waitUntilOpened();
    files_.stall(FaultyFiles::Call::SyncOfDatabase);
    recordMany(45, 1000);
    ASSERT_TRUE(flush());
    ASSERT_TRUE(eventually([&] { return files_.isStalled(); }));
  }

  FaultyFiles files_;
};

TEST_F(RecorderCheckpoint, DoesNotHoldUpCommits) {
  stallInACheckpoint();
  ASSERT_TRUE(files_.isStalled());
  record("next");
  EXPECT_TRUE(flush());
  EXPECT_TRUE(files_.isStalled());
  files_.letGo();
  stop();
  EXPECT_EQ(errors(), 0U);
  EXPECT_EQ(askOne(file(), "SELECT count(*) FROM events"), "47");
}

TEST_F(RecorderCheckpoint, ThatFailsWhileNothingComesIsMetAgainAndOver) {
  stallInACheckpoint();
  ASSERT_TRUE(files_.isStalled());
  files_.fail(FaultyFiles::Call::Sync, 1, FaultyFiles::Fault::InputOutput, 2);
  files_.letGo();
  EXPECT_TRUE(eventually([&] { return log_.count("recorder writes to ") == 1; }));
  EXPECT_EQ(errors(), 1U);
  stop();
  EXPECT_EQ(askOne(file(), "SELECT count(*) FROM events"), "46");
}

}  // namespace
}  // namespace tarn::recorder
