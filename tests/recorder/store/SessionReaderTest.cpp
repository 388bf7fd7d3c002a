// SPDX-License-Identifier: Apache-2.0
#include "recorder/store/reading/SessionReader.h"

#include <sys/stat.h>

#include "tests/ctl/SessionStoreFixture.h"
#include "tests/recorder/faults/ChildProcess.h"

namespace tarn::recorder {
namespace {

class SessionReaderTest : public testing::SessionStoreFixture {
 protected:
  void SetUp() override { makeStore(); }
  // A session of that id, from one time to another; 0: it hasn't ended.
  Session session(std::int64_t id, double created = 1000, double ended = 0) {
    Session made;
    made.id = id;
    made.created = created;
    made.ended = ended;
    return made;
  }
  std::vector<std::int64_t> found(const SessionQuery& query) {
    SessionReader reader(file());
    EXPECT_TRUE(reader.open().ok());
    const auto rows = reader.sessions(query);
    EXPECT_TRUE(rows.ok()) << rows.error.text();
    std::vector<std::int64_t> ids;
    for (const SessionRow& row : rows.value) {
      ids.push_back(row.id);
    }
    return ids;
  }
};

using Ids = std::vector<std::int64_t>;
using Names = std::vector<std::string>;

TEST_F(SessionReaderTest, RowsCarryEveryColumn) {
  Session made = session(7, 1000.5, 1001.25);
  made.endReason = "client-gone";
  addSession(made);
  addPeriod(7, 1000.75, 1001, 3, 9, 12, 2);
  SessionReader reader(file());
  ASSERT_TRUE(reader.open().ok());
  const auto read = reader.session(7);
  ASSERT_TRUE(read.ok()) << read.error.text();
  ASSERT_TRUE(read.value.has_value());
  const SessionRow& row = *read.value;
  EXPECT_EQ(std::tie(row.id, row.run, row.reporter, row.connection, row.pid, row.uid),
            std::make_tuple(7, 1, 4101, 3, 812, 1000));
  EXPECT_EQ(row.process, "player");
  EXPECT_EQ(row.application, "org.example.music");
  EXPECT_EQ(row.serviceType, 7);
  EXPECT_EQ(row.serviceName, "longformaudio");
  EXPECT_EQ(row.created, 1000.5);
  EXPECT_EQ(row.ended, 1001.25);
  EXPECT_EQ(row.endReason, "client-gone");
  const auto periods = reader.periods(7);
  ASSERT_EQ(periods.value.size(), 1U);
  const PeriodRow& period = periods.value.front();
  EXPECT_EQ(std::tie(period.session, period.started, period.messages, period.redundant),
            std::make_tuple(7, 1000.75, 12, 2));
  EXPECT_EQ(period.stopped, 1001);
  EXPECT_EQ(period.firstEvent, 3);
  EXPECT_EQ(period.lastEvent, 9);
  const auto run = reader.run(row.run);
  ASSERT_TRUE(run.value.has_value());
  EXPECT_EQ(run.value->version, "0.1.0");
  EXPECT_EQ(run.value->started, 1795150000);
  EXPECT_FALSE(run.value->ended.has_value());
}

TEST_F(SessionReaderTest, WhatHasNotHappenedIsNotThere) {
  addSession(session(7));
  addPeriod(7, 1000, 0);
  SessionReader reader(file());
  ASSERT_TRUE(reader.open().ok());
  EXPECT_FALSE(reader.session(7).value->ended.has_value());
  EXPECT_FALSE(reader.periods(7).value.front().stopped.has_value());
  EXPECT_FALSE(reader.periods(7).value.front().firstEvent.has_value());
  EXPECT_FALSE(reader.session(8).value.has_value());
  EXPECT_FALSE(reader.run(8).value.has_value());
}

TEST_F(SessionReaderTest, ASpanHasTheSessionsThatWereThereInIt) {
  addSession(session(1, 1000, 1100));
  addSession(session(2, 1050, 0));
  addSession(session(3, 1200, 1300));
  SessionQuery query;
  query.since = 1100;
  EXPECT_EQ(found(query), (Ids{1, 2, 3}));
  query.since = 1100.5;
  EXPECT_EQ(found(query), (Ids{2, 3}));
  query.until = 1200;
  EXPECT_EQ(found(query), Ids{2});
  query.until = 1200.5;
  EXPECT_EQ(found(query), (Ids{2, 3}));
}

TEST_F(SessionReaderTest, ApplicationOpenAndLimitNarrowTheList) {
  Session other = session(2);
  other.application = "org.example.film";
  addSession(session(1, 1000, 1100));
  addSession(other);
  addSession(session(3));
  SessionQuery query;
  query.applicationGlob = "*.music";
  EXPECT_EQ(found(query), (Ids{1, 3}));
  query.open = true;
  EXPECT_EQ(found(query), Ids{3});
  SessionQuery newest;
  newest.limit = 2;
  EXPECT_EQ(found(newest), (Ids{2, 3}));
}

TEST_F(SessionReaderTest, TheNewestEventOfANameIsFoundHoweverFarBack) {
  addEvent(1, 1, "tally", "n", R"({"at":1})");
  addEvent(1, 2, "tally", "n", R"({"at":2})");
  for (int i = 0; i < 600; ++i) {
    addEvent(1, 3, "tally", "other", "{}");
  }
  addEvent(2, 4, "tally", "n", R"({"at":603})");
  SessionReader reader(file());
  ASSERT_TRUE(reader.open().ok());
  const auto at = [&reader](std::int64_t first, std::int64_t last) {
    const auto row = reader.newest(1, "n", first, last);
    EXPECT_TRUE(row.ok()) << row.error.text();
    return row.value ? row.value->payload : "none";
  };
  EXPECT_EQ(at(1, 603), R"({"at":2})");
  EXPECT_EQ(at(1, 33), R"({"at":2})");
  EXPECT_EQ(at(1, 34), R"({"at":2})");
  EXPECT_EQ(at(1, 1), R"({"at":1})");
  EXPECT_EQ(at(2, 2), R"({"at":2})");
  EXPECT_EQ(at(3, 603), "none");
  EXPECT_EQ(at(5, 4), "none");
}

TEST_F(SessionReaderTest, TheNewestEventIsThatOfTheLastSpanWhichHasOne) {
  for (int i = 1; i <= 1100; ++i) {
    const bool isOfOne = i == 10 || i == 255 || i == 256 || i == 300 || i == 900;
    addEvent(isOfOne ? 1 : 2, i, "tally", i == 900 ? "other" : "n", "{}");
  }
  addEvent(0, 1101, "tally", "n", "{}");
  SessionReader reader(file());
  ASSERT_TRUE(reader.open().ok());
  const auto newest = [&reader](std::int64_t session, std::int64_t first, std::int64_t last) {
    const auto row = reader.newest(session, "n", first, last);
    EXPECT_TRUE(row.ok()) << row.error.text();
    return row.value ? row.value->id : 0;
  };
  EXPECT_EQ(newest(1, 1, 1101), 300);
  EXPECT_EQ(newest(1, 1, 299), 256);
  EXPECT_EQ(newest(1, 1, 255), 255);
  EXPECT_EQ(newest(1, 254, 255), 255);
  EXPECT_EQ(newest(1, 10, 254), 10);
  EXPECT_EQ(newest(1, 11, 254), 0);
  EXPECT_EQ(newest(2, 1, 1101), 1100);
  EXPECT_EQ(newest(3, 1, 1101), 0);
}

TEST_F(SessionReaderTest, PeriodsOfSeveralSessions) {
  addPeriod(2, 20, 30);
  addPeriod(1, 10, 15);
  addPeriod(2, 40, 50);
  addPeriod(3, 60, 70);
  SessionReader reader(file());
  ASSERT_TRUE(reader.open().ok());
  std::vector<double> starts;
  for (const PeriodRow& period : reader.periods(1, 2).value) {
    starts.push_back(period.started);
  }
  EXPECT_EQ(starts, (std::vector<double>{10, 20, 40}));
}

TEST_F(SessionReaderTest, EverythingItTellsIsOfOneMoment) {
  sql("PRAGMA journal_mode=WAL;");
  addSession(session(1));
  SessionReader reader(file());
  ASSERT_TRUE(reader.open().ok());
  addSession(session(2));
  EXPECT_EQ(reader.sessions().value.size(), 1U);
  EXPECT_FALSE(reader.session(2).value.has_value());
}

TEST_F(SessionReaderTest, ATableThatIsMissingIsAnError) {
  sql("DROP TABLE periods;");
  SessionReader reader(file());
  ASSERT_TRUE(reader.open().ok());
  EXPECT_EQ(reader.periods(1).error.text(), file().string() + ": no such table: periods");
}

class SessionReaderOpenTest : public testing::SessionStoreFixture {
 protected:
  std::string faultOfOpening() { return SessionReader(file()).open().text(); }
};

TEST_F(SessionReaderOpenTest, AFileThatIsNotThereIsSaidToBeMissing) {
  EXPECT_EQ(faultOfOpening(), file().string() + " is not there");
}

TEST_F(SessionReaderOpenTest, AStoreOfTheFirstVersionSaysThatItHasNoSessionsYet) {
  makeOldStore();
  EXPECT_EQ(
      faultOfOpening(),
      file().string() + " has no sessions yet: it is of version 0, and a service that knows them begins with them");
}

TEST_F(SessionReaderOpenTest, ANewerStoreIsRefused) {
  makeStore();
  sql("PRAGMA user_version = 3;");
  EXPECT_EQ(faultOfOpening(), file().string() + " is of version 3, which is newer than this program: it reads up to 2");
}

TEST_F(SessionReaderOpenTest, AFileThatMayNotBeReadIsSaidToRefuse) {
  makeStore();
  for (const auto& refused : {file(), directory()}) {
    ASSERT_EQ(::chmod(refused.c_str(), 0), 0);
    ChildProcess child([&] {
      becomeOrdinaryUser(directory());
      EXPECT_EQ(faultOfOpening(), file().string() + " refuses this user: Permission denied");
      EXPECT_EQ(EventReader(file()).read({}).error.text(), file().string() + " refuses this user: Permission denied");
    });
    EXPECT_EQ(child.wait(), 0);
    ASSERT_EQ(::chmod(refused.c_str(), 0755), 0);
  }
}

class SessionReaderViewTest : public testing::SessionStoreFixture {};

TEST_F(SessionReaderViewTest, ReadsEventsThatAreAView) {
  makeStore();
  addMessage(5, 1000, "Playback.Start", R"({"n":1})");
  SessionReader reader(file());
  ASSERT_TRUE(reader.open().ok());
  const auto row = reader.newest(5, "sys.oxbow.tarnkit.Playback.Start", 1, 3);
  ASSERT_TRUE(row.value.has_value()) << row.error.text();
  EXPECT_EQ(row.value->payload, R"({"n":1})");
  EXPECT_EQ(EventReader(file()).read({}).value.rows.size(), 3U);
}

TEST_F(SessionReaderViewTest, AViewThatNeverEndsIsGivenUp) {
  makeStore();
  addEvent(1, 1, "tally", "n", "{}");
  sql("DROP TABLE event_rows; CREATE VIEW event_rows AS WITH RECURSIVE n(i) AS (SELECT 1 UNION ALL SELECT i + 1 FROM n)"
      " SELECT i AS id, 0 AS time, 0 AS kind, 0 AS payload, NULL AS cut, i % 2 + 5 AS session FROM n;");
  SessionReader reader(file());
  ASSERT_TRUE(reader.open().ok());
  EXPECT_EQ(reader.newest(1, "n", 1, 2).error.text(), file().string() + ": its tables lead into themselves");
}

class EventQueryTest : public testing::SessionStoreFixture {
 protected:
  void SetUp() override {
    makeStore();
    addMessage(1, 100, "Playback.Start", R"({"n":1})");
    addMessage(2, 200, "Playback.Start", R"({"n":2})");
    addMessage(1, 300, "Playback.Stop", R"({"n":3})");
  }
  Ids found(const EventQuery& query) {
    const auto page = EventReader(file()).read(query);
    EXPECT_TRUE(page.ok()) << page.error.text();
    Ids ids;
    for (const EventRow& row : page.value.rows) {
      ids.push_back(row.id);
    }
    return ids;
  }
};

TEST_F(EventQueryTest, BySession) {
  EventQuery query;
  query.session = 2;
  EXPECT_EQ(found(query), (Ids{4, 5, 6}));
}

TEST_F(EventQueryTest, BySpanOfTime) {
  EventQuery query;
  query.since = 200;
  EXPECT_EQ(found(query), (Ids{4, 5, 6, 7, 8, 9}));
  query.until = 300;
  EXPECT_EQ(found(query), (Ids{4, 5, 6}));
  query.since = 201;
  EXPECT_EQ(found(query), Ids{});
  query.since.reset();
  EXPECT_EQ(found(query), (Ids{1, 2, 3, 4, 5, 6}));
}

TEST_F(EventQueryTest, RowsTellTheirSession) {
  addEvent(0, 400, "tally", "nobody's", "{}");
  const auto page = EventReader(file()).read({});
  EXPECT_TRUE(page.value.hasSessions);
  EXPECT_EQ(page.value.rows.front().session, 1);
  EXPECT_FALSE(page.value.rows.back().session.has_value());
}

class OldEventQueryTest : public testing::SessionStoreFixture {
 protected:
  void SetUp() override {
    makeOldStore();
    sql("INSERT INTO events VALUES(1, 100, 'tally', 'a', '{}', '{}'), (2, 200, 'tally', 'b', '{}', '{}');");
  }
};

TEST_F(OldEventQueryTest, AFileWithoutSessionsHasSpansOfTimeAll) {
  EventQuery query;
  query.since = 150;
  const auto page = EventReader(file()).read(query);
  EXPECT_FALSE(page.value.hasSessions);
  ASSERT_EQ(page.value.rows.size(), 1U);
  EXPECT_EQ(page.value.rows.front().name, "b");
  EXPECT_EQ(page.value.lookedUpTo, 2);
}

TEST_F(OldEventQueryTest, AFileWithoutSessionsHasNoEventsOfAny) {
  EventQuery query;
  query.session = 1;
  const auto page = EventReader(file()).read(query);
  EXPECT_TRUE(page.ok()) << page.error.text();
  EXPECT_TRUE(page.value.rows.empty());
}

}  // namespace
}  // namespace tarn::recorder
