// SPDX-License-Identifier: Apache-2.0
// Damage to the rows of runs, sessions, periods and repeated messages that SQLite itself doesn't see.
#include <random>

#include "recorder/store/StoreReport.h"
#include "tests/recorder/store/RecordsFixture.h"
#include "tests/support/Seeds.h"

namespace tarn::recorder {
namespace {

class SessionDamage : public RecordsFixture {
 protected:
  SessionDamage() { options_.redundant = Redundant::Mark; }

  static Dictionary message(int volume) { return {{"audiotag", "PlaybackStart"}, {"volume", volume}}; }
  // A run with so many sessions of one period, an event and a repeated message each.
  void makeSessions(int count) {
    begin();
    for (int i = 1; i <= count; ++i) {
      const SessionNumber session = records_->created({i, 3, 4711, 1000, "player", "org.example.music", 5, "avplayer"});
      records_->started(session);
      recordFor(session, "event", message(i));
      records_->repeated(session, message(i));
      records_->stopped(session, 2, 1);
      records_->ended(session, platform::SessionEnd::Destroyed);
    }
    end();
  }
  std::string damaged() {
    const auto inspected = inspectStore(file());
    EXPECT_TRUE(inspected.ok()) << inspected.error.text();
    EXPECT_TRUE(inspected.value.lost.empty());
    return textOf(inspected.value.damagedRows);
  }
  Rows rows() {
    Rows all;
    for (const SessionSums::Table& table : SessionSums::kTables) {
      const Rows some = ask(file(), "SELECT * FROM " + std::string(table.name) + " ORDER BY id");
      all.insert(all.end(), some.begin(), some.end());
    }
    return all;
  }
};

TEST_F(SessionDamage, WhatWasWrittenIsWhole) {
  makeSessions(3);
  EXPECT_EQ(damaged(), "");
  EXPECT_EQ(askOne(file(), "SELECT count(*) FROM row_hashes"), "10");
}

TEST_F(SessionDamage, AChangedRowOfEachTableIsToldByItsId) {
  makeSessions(5);
  const std::filesystem::path whole = directory_.path() / "whole";
  std::filesystem::copy_file(file(), whole);
  const std::pair<const char*, const char*> changes[] = {
      {"UPDATE runs SET version = '1.2.2'", "runs 1"},
      {"UPDATE sessions SET process = 'qlayer' WHERE id = 2", "sessions 2"},
      {"UPDATE sessions SET uid = 1001 WHERE id IN (2, 3, 5)", "sessions 2-3, 5"},
      {"UPDATE sessions SET ended = NULL WHERE id = 4", "sessions 4"},
      {"UPDATE periods SET messages = 3 WHERE id = 5", "periods 5"},
      {"UPDATE periods SET started = started + 1 WHERE id = 1", "periods 1"},
      {"UPDATE redundant_messages SET event = 2 WHERE id = 1", "redundant_messages 1"},
      {"UPDATE sessions SET id = 9 WHERE id = 3", "sessions 3, 9"},
      {"DELETE FROM periods WHERE id = 2", "periods 2"},
      {"DELETE FROM row_hashes WHERE id = 4 * 5 + 1", "sessions 5"},
      {"UPDATE row_hashes SET hash = hash + 1 WHERE id = 4 * 3 + 2", "periods 3"},
      {"UPDATE runs SET version = '1'; UPDATE periods SET messages = 9 WHERE id = 1", "runs 1; periods 1"}};
  for (const auto& [sql, told] : changes) {
    std::filesystem::copy_file(whole, file(), std::filesystem::copy_options::overwrite_existing);
    change(file(), sql);
    EXPECT_EQ(damaged(), told) << sql;
    EXPECT_FALSE(inspectStore(file()).value.isWhole()) << sql;
  }
}

TEST_F(SessionDamage, MoreRowsThanAreLookedAtAtOnceAreAllLookedAt) {
  makeSessions(700);
  EXPECT_EQ(damaged(), "");
  change(file(), "UPDATE sessions SET pid = 4712 WHERE id IN (1, 256, 257, 700)");
  EXPECT_EQ(damaged(), "sessions 1, 256-257, 700");
}

// Each bit that flips is seen, or every row is still as it was.
TEST_F(SessionDamage, AFlippedBitIsSeenOrHarmless) {
  makeSessions(60);
  const Rows before = rows();
  ASSERT_GT(before.size(), 180U);
  std::ifstream in(file(), std::ios::binary);
  const std::string whole{std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>()};
  for (const std::uint64_t seed : tarn::testing::testSeeds(1)) {
    SCOPED_TRACE(tarn::testing::seedNote(seed));
    std::mt19937_64 random(seed);
    for (int flip = 0; flip < 200; ++flip) {
      std::string bytes = whole;
      const std::size_t bit = random() % (bytes.size() * 8);
      bytes[bit / 8] = static_cast<char>(bytes[bit / 8] ^ (1 << (bit % 8)));
      std::ofstream(file(), std::ios::binary) << bytes;
      const auto inspected = inspectStore(file());
      const bool seen = inspected.failed() || !inspected.value.isWhole();
      ASSERT_TRUE(seen || rows() == before) << "bit " << bit;
      std::filesystem::remove(file().string() + "-wal");
      std::filesystem::remove(file().string() + "-shm");
    }
  }
}

TEST_F(SessionDamage, AChangeAfterTheDamageDoesNotHideIt) {
  begin();
  const SessionNumber session = create();
  records_->started(session);
  ASSERT_TRUE(flush());
  change(file(), "UPDATE sessions SET reporter = 11; UPDATE periods SET started = started + 1");
  records_->stopped(session, 1, 0);
  end();
  EXPECT_EQ(sessions("end_reason"), Rows{"stopped"});
  EXPECT_EQ(damaged(), "sessions 1; periods 1");
}

TEST_F(SessionDamage, ARunningRecorderFindsADamagedRowAndLeavesItBehind) {
  makeSessions(3);
  change(file(), "UPDATE sessions SET uid = 1001 WHERE id = 2");
  options_.verifyInterval = options_.verifyRest = std::chrono::milliseconds(1);
  begin();
  ASSERT_TRUE(eventually([&] { return log_.count("got 3 events from recorder.sqlite3.damaged-") == 1; }));
  ASSERT_TRUE(flush());
  end();
  EXPECT_EQ(errors(), 1U);
  EXPECT_TRUE(log_.contains("damaged: sessions 2 aren't as they were written"));
  EXPECT_TRUE(log_.contains("; 1 rows of sessions, their periods or runs were damaged and are left behind"));
  EXPECT_EQ(sessions("id"), (Rows{"1", "3"}));
  EXPECT_EQ(periods("id"), (Rows{"1", "2", "3"}));
  EXPECT_EQ(askOne(file(), "SELECT count(*) FROM redundant_messages"), "3");
  EXPECT_EQ(damaged(), "");
}

TEST_F(SessionDamage, AFileFromBeforeGetsItsChecksumsWhenItIsOpened) {
  makeSessions(3);
  change(file(), "DROP TABLE row_hashes; ALTER TABLE runs DROP COLUMN machine; PRAGMA user_version = 1");
  EXPECT_EQ(damaged(), "") << "nothing says otherwise";
  makeSessions(1);
  EXPECT_EQ(errors(), 0U);
  EXPECT_EQ(damaged(), "");
  change(file(), "UPDATE sessions SET reporter = 99 WHERE id = 1");
  EXPECT_EQ(damaged(), "sessions 1");
}

}  // namespace
}  // namespace tarn::recorder
