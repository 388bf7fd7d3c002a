// SPDX-License-Identifier: Apache-2.0
// Rows of messages that repeat earlier ones, where such are kept.
#include "recorder/store/StoreReport.h"
#include "recorder/store/reading/SessionReader.h"
#include "tests/recorder/store/RecordsFixture.h"

namespace tarn::recorder {
namespace {

using platform::SessionNumber;
using Rows = std::vector<std::string>;

class RecorderRepeated : public RecordsFixture {
 protected:
  RecorderRepeated() {
    options_.redundant = Redundant::Mark;
    clock_.setEpochSeconds(1000);
  }

  SessionNumber startSession() {
    const SessionNumber session = records_->created({});
    records_->started(session);
    return session;
  }
  static Dictionary message(int volume, double stamp) {
    return {{"audiotag", "PlaybackStart"}, {"volume", volume}, {"tarnreporting_timestamp", stamp}};
  }
  // Both events of a message.
  void send(SessionNumber session, const Dictionary& payload) {
    recordFor(session, "sys.oxbow.tarnkit.Playback.Start", payload);
    recordFor(session, "sys.oxbow.generic.Playback.Start", payload);
  }
  Rows repeated() { return ask(file(), "SELECT * FROM redundant_messages ORDER BY id"); }
  std::string count() { return askOne(file(), "SELECT count(*) FROM redundant_messages"); }
};

TEST_F(RecorderRepeated, ARepeatedMessageHasARowWithTheEventThatItRepeats) {
  begin();
  const SessionNumber other = startSession();
  const SessionNumber session = startSession();
  send(session, message(3, 10));
  send(other, message(3, 11));
  clock_.setEpochSeconds(1002.5);
  records_->repeated(session, message(3, 12));
  records_->repeated(other, message(3, 13));
  ASSERT_TRUE(flush());
  EXPECT_EQ(repeated(), (Rows{"1|2|2|1002.5|12.0|1|4", "2|1|1|1002.5|13.0|3|4"}));
}

TEST_F(RecorderRepeated, ByDefaultTheyAreOnlyCounted) {
  options_.redundant = RecorderOptions().redundant;
  begin();
  const SessionNumber session = startSession();
  send(session, message(3, 10));
  records_->repeated(session, message(3, 12));
  records_->stopped(session, 2, 1);
  ASSERT_TRUE(flush());
  EXPECT_EQ(count(), "0");
  EXPECT_EQ(ask(file(), "SELECT redundant FROM periods"), Rows{"1"});
}

TEST_F(RecorderRepeated, OneWhoseMessageHasNoEventSaysSo) {
  begin();
  const SessionNumber session = startSession();
  records_->repeated(session, message(3, 12));
  ASSERT_TRUE(flush());
  EXPECT_EQ(repeated(), Rows{"1|1|1|1000.0|12.0|NULL|0"});
}

TEST_F(RecorderRepeated, IdsGoOnFromRunToRunAndAreNeverGivenTwice) {
  for (int run = 0; run < 2; ++run) {
    begin();
    const SessionNumber session = startSession();
    send(session, message(run, 10));
    records_->repeated(session, message(run, 11));
    ASSERT_TRUE(flush());
    stop();
  }
  EXPECT_EQ(ask(file(), "SELECT id, session, event FROM redundant_messages"), (Rows{"1|1|1", "2|2|3"}));
}

TEST_F(RecorderRepeated, RowsGoWithTheEventsBeforeThem) {
  options_.maxAgeDays = 1;
  options_.maintenanceInterval = std::chrono::milliseconds(5);
  begin();
  const SessionNumber session = startSession();
  send(session, message(3, 10));
  records_->repeated(session, message(3, 11));
  ASSERT_TRUE(flush());
  clock_.advance(std::chrono::hours(20));
  send(session, message(4, 12));
  records_->repeated(session, message(4, 13));
  ASSERT_TRUE(flush());
  EXPECT_EQ(count(), "2");
  clock_.advance(std::chrono::hours(5));
  ASSERT_TRUE(eventually([&] { return count() == "1"; }));
  EXPECT_EQ(ask(file(), "SELECT id, event, after_event FROM redundant_messages"), Rows{"2|3|4"});
  EXPECT_EQ(askOne(file(), "SELECT min(id) FROM events"), "3");
}

TEST_F(RecorderRepeated, TheyStayWithinTheSizeWhenNothingElseComes) {
  options_.maxMegabytes = 1;
  begin();
  const SessionNumber session = startSession();
  send(session, message(3, 10));
  for (int round = 0; round < 40; ++round) {
    for (int i = 0; i < 1000; ++i) {
      records_->repeated(session, message(3, 11));
    }
    ASSERT_TRUE(flush());
  }
  const std::int64_t left = std::stoll(count());
  EXPECT_LT(left, 30'000);
  EXPECT_GT(left, 1000);
  EXPECT_EQ(askOne(file(), "SELECT max(id) FROM redundant_messages"), "40000") << "the oldest went";
  EXPECT_LE(std::filesystem::file_size(file()), (std::uintmax_t{1} << 20) * 3 / 2);
  stop();
  EXPECT_TRUE(inspectStore(file()).value.isWhole());
}

TEST_F(RecorderRepeated, AFileFromBeforeGetsTheTableAndKeepsWhatItHas) {
  begin();
  send(startSession(), message(3, 10));
  ASSERT_TRUE(flush());
  stop();
  change(file(),
         "DROP TABLE redundant_messages; DROP TABLE row_hashes; ALTER TABLE runs DROP COLUMN machine; PRAGMA "
         "user_version = 1");
  EXPECT_TRUE(inspectStore(file()).value.isWhole()) << "nothing is wrong with one of before";
  SessionReader reader(file());
  ASSERT_TRUE(reader.open().ok());
  const auto none = reader.repeated(1);
  EXPECT_TRUE(none.ok()) << none.error.text();
  EXPECT_TRUE(none.value.empty());
  begin();
  const SessionNumber session = startSession();
  send(session, message(4, 10));
  records_->repeated(session, message(4, 11));
  ASSERT_TRUE(flush());
  EXPECT_EQ(repeated(), Rows{"1|2|2|1000.0|11.0|3|4"});
  EXPECT_EQ(askOne(file(), "SELECT count(*) FROM events"), "4");
  EXPECT_EQ(errors(), 0U);
}

TEST_F(RecorderRepeated, AReaderFindsThoseOfASession) {
  begin();
  const SessionNumber first = startSession();
  const SessionNumber second = startSession();
  send(first, message(3, 10));
  records_->repeated(second, message(9, 11));
  records_->repeated(first, message(3, 12));
  ASSERT_TRUE(flush());
  SessionReader reader(file());
  ASSERT_TRUE(reader.open().ok());
  const auto rows = reader.repeated(first);
  ASSERT_TRUE(rows.ok()) << rows.error.text();
  ASSERT_EQ(rows.value.size(), 1U);
  const RepeatedRow& row = rows.value.front();
  EXPECT_EQ(row.id, 2);
  EXPECT_EQ(row.period, 1);
  EXPECT_EQ(row.time, 1000);
  EXPECT_EQ(row.stamp, 12);
  EXPECT_EQ(row.event, 1);
  EXPECT_EQ(row.afterEvent, 2);
  EXPECT_EQ(reader.repeated(second).value.front().event, std::nullopt);
}

}  // namespace
}  // namespace tarn::recorder
