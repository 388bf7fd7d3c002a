// SPDX-License-Identifier: Apache-2.0
// Rows of runs, sessions and periods, and whose event an event is.
#include "recorder/store/StoreReport.h"
#include "tests/recorder/faults/ChildProcess.h"
#include "tests/recorder/store/RecordsFixture.h"

namespace tarn::recorder {
namespace {

using platform::SessionEnd;
using platform::SessionNumber;
using Rows = std::vector<std::string>;

class RecorderSessionRecordsTest : public RecordsFixture {
 protected:
  // Whatever was written, the checksums say so.
  void TearDown() override {
    end();
    const auto report = inspectStore(file());
    ASSERT_TRUE(report.ok()) << report.error.text();
    EXPECT_EQ(textOf(report.value.damagedRows), "");
  }
  // A process that does this and then ends without a word.
  void crashAfter(const std::function<void()>& work) {
    ChildProcess child([this, &work] {
      begin();
      work();
      ASSERT_TRUE(flush());
      ::_exit(0);
    });
    ASSERT_EQ(child.wait(), 0);
  }
};

TEST_F(RecorderSessionRecordsTest, ASessionHasARowWithWhatIsKnownOfIt) {
  begin();
  const SessionNumber session = records_->created({7, 3, 4711, 1000, "player", "org.example.music", 5, "avplayer"});
  ASSERT_TRUE(flush());
  EXPECT_EQ(session, 1);
  EXPECT_EQ(ask(file(), "SELECT * FROM sessions"),
            Rows{"1|1|7|3|4711|1000|player|org.example.music|5|avplayer|1750000000.0|NULL|NULL"});
}

TEST_F(RecorderSessionRecordsTest, WhatIsNotKnownIsNull) {
  begin();
  create();
  ASSERT_TRUE(flush());
  EXPECT_EQ(sessions("process, application, service_type"), Rows{"NULL|NULL|65535"});
}

TEST_F(RecorderSessionRecordsTest, WhatBecomesKnownIsInTheRow) {
  begin();
  const SessionNumber session = create();
  waitSeconds(5);
  records_->described(session, {10, 1, 2, 3, "player", "org.example.music", 5, "avplayer"});
  ASSERT_TRUE(flush());
  EXPECT_EQ(sessions("id, run, process, application, service_type, service_name, created"),
            Rows{"1|1|player|org.example.music|5|avplayer|1750000000.0"});
}

TEST_F(RecorderSessionRecordsTest, AnEventIsTheSessionsForWhichItsThreadWorks) {
  begin();
  const SessionNumber first = create();
  const SessionNumber second = create();
  recordFor(second, "second's");
  recordFor(first, "first's");
  record("nobody's");
  ASSERT_TRUE(flush());
  EXPECT_EQ(ask(file(), "SELECT name, session FROM events ORDER BY id"),
            (Rows{"second's|2", "first's|1", "nobody's|NULL"}));
  const auto report = inspectStore(file());
  ASSERT_TRUE(report.ok());
  EXPECT_EQ(report.value.whole, 3);
}

TEST_F(RecorderSessionRecordsTest, APeriodKnowsItsTimesItsCountsAndItsEvents) {
  begin();
  const SessionNumber session = create();
  recordFor(session, "before");
  records_->started(session);
  recordFor(session, "first");
  record("nobody's");
  recordFor(session, "last");
  waitSeconds(60);
  records_->stopped(session, 12, 4);
  recordFor(session, "after");
  ASSERT_TRUE(flush());
  EXPECT_EQ(ask(file(), "SELECT * FROM periods"), Rows{"1|1|1750000000.0|1750000060.0|12|4|2|4"});
  EXPECT_EQ(sessions("ended, end_reason"), Rows{"1750000060.0|stopped"});
}

TEST_F(RecorderSessionRecordsTest, APeriodOverManyCommitsKnowsItsEvents) {
  begin();
  const SessionNumber session = create();
  records_->started(session);
  for (int i = 0; i < 5; ++i) {
    recordFor(session, "event");
    ASSERT_TRUE(flush());
  }
  EXPECT_EQ(periods("first_event, last_event"), Rows{"1|NULL"}) << "the first is told at once";
  records_->stopped(session, 5, 0);
  ASSERT_TRUE(flush());
  EXPECT_EQ(periods("first_event, last_event"), Rows{"1|5"});
}

TEST_F(RecorderSessionRecordsTest, APeriodWithoutEventsHasNone) {
  begin();
  const SessionNumber session = create();
  records_->started(session);
  records_->stopped(session, 0, 0);
  ASSERT_TRUE(flush());
  EXPECT_EQ(periods("messages, first_event, last_event"), Rows{"0|NULL|NULL"});
}

TEST_F(RecorderSessionRecordsTest, ASessionThatStartsAgainHasNotEndedAndGetsAnotherPeriod) {
  begin();
  const SessionNumber session = create();
  for (int period = 0; period < 2; ++period) {
    records_->started(session);
    recordFor(session, "event");
    records_->stopped(session, 1, 0);
  }
  records_->started(session);
  ASSERT_TRUE(flush());
  EXPECT_EQ(sessions("ended, end_reason"), Rows{"NULL|NULL"});
  EXPECT_EQ(periods("id, session, messages, first_event, last_event"),
            (Rows{"1|1|1|1|1", "2|1|1|2|2", "3|1|NULL|NULL|NULL"}));
}

TEST_F(RecorderSessionRecordsTest, EveryEndHasItsReason) {
  begin();
  for (const SessionEnd end : {SessionEnd::Stopped, SessionEnd::Destroyed, SessionEnd::Replaced, SessionEnd::Retyped,
                               SessionEnd::ClientGone, SessionEnd::ServiceStopping}) {
    records_->ended(create(), end);
  }
  ASSERT_TRUE(flush());
  EXPECT_EQ(sessions("end_reason"),
            (Rows{"stopped", "destroyed", "replaced", "retyped", "client-gone", "service-stopping"}));
}

TEST_F(RecorderSessionRecordsTest, TheEndOfAStoppedSessionIsItsEnd) {
  begin();
  const SessionNumber session = create();
  records_->started(session);
  records_->stopped(session, 3, 1);
  waitSeconds(10);
  records_->ended(session, SessionEnd::Destroyed);
  ASSERT_TRUE(flush());
  EXPECT_EQ(sessions("ended, end_reason"), Rows{"1750000010.0|destroyed"});
  EXPECT_EQ(periods("stopped, messages"), Rows{"1750000000.0|3"});
}

TEST_F(RecorderSessionRecordsTest, NotesAloneAreCommittedAndCountAsNoEvents) {
  gatherForLong();
  begin();
  create();
  ASSERT_TRUE(flush());
  EXPECT_EQ(sessions("id"), Rows{"1"});
  EXPECT_EQ(recorder_->counters().handedOver, 0U);
  EXPECT_EQ(recorder_->counters().committed, 0U);
}

TEST_F(RecorderSessionRecordsTest, AShutdownCommitsNotes) {
  gatherForLong();
  begin();
  create();
  end();
  EXPECT_EQ(sessions("id"), Rows{"1"});
}

TEST_F(RecorderSessionRecordsTest, IdsGoOnFromRunToRun) {
  for (int run = 0; run < 2; ++run) {
    begin();
    const SessionNumber session = create();
    EXPECT_EQ(session, 1);
    records_->started(session);
    recordFor(session, "event");
    records_->stopped(session, 1, 0);
    end();
  }
  EXPECT_EQ(sessions("id, run"), (Rows{"1|1", "2|2"}));
  EXPECT_EQ(periods("id, session, first_event"), (Rows{"1|1|1", "2|2|2"}));
  EXPECT_EQ(ask(file(), "SELECT session FROM events ORDER BY id"), (Rows{"1", "2"}));
}

TEST_F(RecorderSessionRecordsTest, ARunThatEndsWellSaysSo) {
  begin();
  waitSeconds(100);
  end();
  EXPECT_EQ(ask(file(), "SELECT * FROM runs"),
            Rows{"1|boot|1.2.3|1750000000.0|1750000100.0|stopped|{\"os\":\"Testix\"}"});
}

TEST_F(RecorderSessionRecordsTest, WhatACrashLeavesOpenIsClosedByTheNextRun) {
  crashAfter([this] {
    const SessionNumber running = create();
    const SessionNumber neverStarted = create();
    const SessionNumber stopped = create();
    records_->started(running);
    records_->started(stopped);
    waitSeconds(20);
    recordFor(running, "event");
    recordFor(running, "last");
    records_->stopped(stopped, 7, 0);
    waitSeconds(20);
    recordFor(neverStarted, "event");
  });
  waitSeconds(1000);
  begin();
  EXPECT_EQ(sessions("id, ended, end_reason"),
            (Rows{"1|1750000020.0|killed", "2|1750000040.0|killed", "3|1750000020.0|stopped"}));
  EXPECT_EQ(periods("session, stopped, messages, first_event, last_event"),
            (Rows{"1|1750000020.0|NULL|1|2", "3|1750000020.0|7|NULL|NULL"}));
  EXPECT_EQ(ask(file(), "SELECT id, ended, end_reason FROM runs ORDER BY id"),
            (Rows{"1|1750000040.0|killed", "2|NULL|NULL"}));
}

TEST_F(RecorderSessionRecordsTest, AKilledSessionWithoutEventsEndsWithItsLastRow) {
  crashAfter([this] {
    create();
    const SessionNumber started = create();
    waitSeconds(30);
    records_->started(started);
  });
  waitSeconds(1000);
  begin();
  EXPECT_EQ(sessions("ended, end_reason"), (Rows{"1750000000.0|killed", "1750000030.0|killed"}));
}

TEST_F(RecorderSessionRecordsTest, ReopeningTheFileEndsNoSessionOfThisRun) {
  begin();
  const SessionNumber session = create();
  records_->started(session);
  recordFor(session, "before");
  ASSERT_TRUE(flush());
  std::filesystem::remove(file().string() + "-wal");  // it is brought in, and the file opened again
  recordFor(session, "after");
  records_->stopped(session, 2, 0);
  ASSERT_TRUE(flush());
  EXPECT_TRUE(log_.contains("its log was taken away"));
  EXPECT_EQ(ask(file(), "SELECT id FROM runs"), Rows{"1"});
  EXPECT_EQ(periods("messages, first_event, last_event"), Rows{"2|1|2"});
  EXPECT_EQ(sessions("end_reason"), Rows{"stopped"});
}

TEST_F(RecorderSessionRecordsTest, RowsAreCarriedOutOfADamagedFile) {
  begin();
  const SessionNumber session = create();
  records_->started(session);
  for (int i = 0; i < 200; ++i) {
    recordFor(session, "event" + std::to_string(i));
  }
  records_->stopped(session, 200, 0);
  end();
  change(file(), "UPDATE event_texts SET name = 'other' WHERE name = 'event100'");
  options_.verifyInterval = options_.verifyRest = std::chrono::milliseconds(1);
  begin();
  ASSERT_TRUE(eventually([&] { return log_.count("got 199 events from recorder.sqlite3.damaged-") == 1; }));
  recordFor(create(), "next");
  ASSERT_TRUE(flush());
  EXPECT_EQ(sessions("id, run, end_reason"), (Rows{"1|1|stopped", "2|2|NULL"}));
  EXPECT_EQ(periods("id, session, messages, first_event, last_event"), Rows{"1|1|200|1|200"});
  EXPECT_EQ(ask(file(), "SELECT session, count(*) FROM events GROUP BY session"), (Rows{"1|199", "2|1"}));
  EXPECT_EQ(ask(file(), "SELECT id, end_reason FROM runs ORDER BY id"), (Rows{"1|stopped", "2|NULL"}));
}

TEST_F(RecorderSessionRecordsTest, ASessionStaysWithoutItsEventsUntilItIsOld) {
  options_.maxAgeDays = 1;
  options_.maintenanceInterval = std::chrono::milliseconds(1);
  begin();
  const SessionNumber session = create();
  records_->started(session);
  recordFor(session, "event");
  records_->stopped(session, 1, 0);
  const SessionNumber running = create();
  ASSERT_TRUE(flush());
  clock_.advance(std::chrono::hours(23));
  recordFor(running, "young");
  ASSERT_TRUE(flush());
  EXPECT_EQ(sessions("id"), (Rows{"1", "2"}));
  create();
  ASSERT_TRUE(flush());
  clock_.advance(std::chrono::hours(4));
  EXPECT_TRUE(eventually([&] { return sessions("id") == Rows{"2", "3"}; })) << "one that runs stays";
  EXPECT_EQ(periods("id"), Rows{});
  end();
  begin();
  create();
  ASSERT_TRUE(flush());
  EXPECT_EQ(askOne(file(), "SELECT max(id) FROM sessions"), "4");
}

}  // namespace
}  // namespace tarn::recorder
