// SPDX-License-Identifier: Apache-2.0
#include "recorder/store/reading/EventReader.h"

#include <sys/stat.h>

#include "tests/recorder/RecorderFixture.h"
#include "tests/recorder/faults/ChildProcess.h"

namespace tarn::recorder {
namespace {

thread_local std::int64_t worksFor = 0;

std::int64_t currentSession() noexcept {
  return worksFor;
}

class EventReaderTest : public RecorderFixture {
 protected:
  static std::vector<std::string> names(const Result<EventPage>& result) {
    std::vector<std::string> all;
    for (const EventRow& row : result.value.rows) {
      all.push_back(row.name);
    }
    return all;
  }
  void recordAs(std::string_view backend, const std::string& name) {
    recorder_->record(backend, name, {}, {}, clock_.epochSeconds());
  }
};

using Names = std::vector<std::string>;

TEST_F(EventReaderTest, RowsCarryEveryColumn) {
  start();
  recorder_->record("wattlog", "audio", {{"a", 1}}, {{"agent", 28}}, 1750000000.5);
  ASSERT_TRUE(flush());
  EventReader reader(file());
  const Result<EventPage> result = reader.read({});
  ASSERT_TRUE(result.ok()) << result.error.text();
  ASSERT_EQ(result.value.rows.size(), 1U);
  const EventRow& row = result.value.rows.front();
  EXPECT_EQ(row.id, 1);
  EXPECT_EQ(row.time, 1750000000.5);
  EXPECT_EQ(row.backend, "wattlog");
  EXPECT_EQ(row.name, "audio");
  EXPECT_EQ(row.payload, R"({"a":1})");
  EXPECT_EQ(row.detail, R"({"agent":28})");
}

TEST_F(EventReaderTest, QueriesByBackendNameAndId) {
  start();
  recordAs("tally", "x.one");
  recordAs("wattlog", "x.two");
  recordAs("tally", "y.three");
  recordAs("tally", "x.four");
  ASSERT_TRUE(flush());
  EventReader reader(file());
  EventQuery query;
  query.backend = "tally";
  EXPECT_EQ(names(reader.read(query)), (Names{"x.one", "y.three", "x.four"}));
  query.nameGlob = "x.*";
  EXPECT_EQ(names(reader.read(query)), (Names{"x.one", "x.four"}));
  query.after = 1;
  EXPECT_EQ(names(reader.read(query)), Names{"x.four"});
}

TEST_F(EventReaderTest, LimitCutsAndTheNextQueryGoesOn) {
  start();
  recordMany(5);
  ASSERT_TRUE(flush());
  EventReader reader(file());
  EventQuery query;
  query.limit = 3;
  const Result<EventPage> first = reader.read(query);
  EXPECT_EQ(names(first), (Names{"event0", "event1", "event2"}));
  EXPECT_TRUE(first.value.more);
  query.after = first.value.lookedUpTo;
  const Result<EventPage> second = reader.read(query);
  EXPECT_EQ(names(second), (Names{"event3", "event4"}));
  EXPECT_FALSE(second.value.more);
}

TEST_F(EventReaderTest, EventsThatDoNotMatchAreNotLookedAtAgain) {
  start();
  recordMany(5);
  ASSERT_TRUE(flush());
  EventReader reader(file());
  EventQuery query;
  query.nameGlob = "none*";
  EXPECT_EQ(reader.read(query).value.lookedUpTo, 5);
}

// Over more events than are gone through one after the other, with names, sessions and times of all kinds.
TEST_F(EventReaderTest, EveryQueryFindsInALargeFileWhatGoingThroughItFinds) {
  options_.sessionOf = currentSession;
  start();
  for (int i = 0; i < 12'000; ++i) {
    worksFor = i % 1000 < 900 ? 0 : i / 1000;
    clock_.setEpochSeconds(1750000000.0 + (i / 2000 == 3 ? -500'000 : i));  // somebody set the clock, twice
    record(i % 4000 == 3999 ? "rare" : "often" + std::to_string(i % 3));
  }
  worksFor = 0;
  ASSERT_TRUE(flush());
  const auto expectSame = [&](EventQuery query, const std::string& where) {
    std::vector<std::string> found;
    EventReader reader(file());
    query.limit = 700;
    for (bool more = true; more;) {
      const Result<EventPage> page = reader.read(query);
      ASSERT_TRUE(page.ok()) << page.error.text();
      for (const EventRow& row : page.value.rows) {
        found.push_back(std::to_string(row.id));
      }
      query.after = page.value.lookedUpTo;
      more = page.value.more;
    }
    EXPECT_EQ(query.after, 12'000);
    const auto wanted = ask(file(), "SELECT id FROM events WHERE " + where + " ORDER BY id");
    EXPECT_FALSE(wanted.empty()) << where;
    EXPECT_EQ(found, wanted) << where;
  };
  EventQuery query;
  query.nameGlob = "r?re";
  expectSame(query, "name = 'rare'");
  query.nameGlob = "often1";
  expectSame(query, "name = 'often1'");
  query = {};
  query.session = 9;
  expectSame(query, "session = 9");
  query.nameGlob = "often2";
  expectSame(query, "session = 9 AND name = 'often2'");
  query = {};
  query.since = 1750010000.0;
  expectSame(query, "time >= 1750010000.0");
  query.until = 1750010100.0;
  expectSame(query, "time >= 1750010000.0 AND time < 1750010100.0");
  query.since.reset();
  query.until = 1749999999.0;
  expectSame(query, "time < 1749999999.0");
}

TEST_F(EventReaderTest, ARowTellsItsSession) {
  options_.sessionOf = currentSession;
  start();
  record("nobody's");
  worksFor = 3;
  record("a session's");
  worksFor = 0;
  ASSERT_TRUE(flush());
  const Result<EventPage> page = EventReader(file()).read({});
  ASSERT_EQ(page.value.rows.size(), 2U);
  EXPECT_EQ(page.value.rows[0].session, std::nullopt);
  EXPECT_EQ(page.value.rows[1].session, 3);
}

TEST_F(EventReaderTest, AMissingFileIsToldAndIsReadOnceItIsThere) {
  EventReader reader(file());
  EXPECT_TRUE(reader.read({}).value.missing);
  EXPECT_FALSE(reader.waitForChange(std::chrono::milliseconds(1)));
  start();
  record("a");
  ASSERT_TRUE(flush());
  EXPECT_TRUE(reader.waitForChange(kPatience));
  EXPECT_EQ(names(reader.read({})), Names{"a"});
}

TEST_F(EventReaderTest, AnEmptyFileHoldsNoEventsYet) {
  std::ofstream(file()).flush();
  EventReader reader(file());
  EXPECT_TRUE(reader.read({}).value.missing);
}

TEST_F(EventReaderTest, AFileThatIsNoDatabaseIsAFailure) {
  std::ofstream(file()) << std::string(10'000, 'g');
  EventReader reader(file());
  const Result<EventPage> result = reader.read({});
  ASSERT_TRUE(result.failed());
  EXPECT_NE(result.error->text.find("not a database"), std::string::npos) << result.error->text;
}

TEST_F(EventReaderTest, WaitsUntilSomethingIsWritten) {
  start();
  record("a");
  ASSERT_TRUE(flush());
  EventReader reader(file());
  EventQuery query;
  query.after = reader.read(query).value.lookedUpTo;
  EXPECT_FALSE(reader.waitForChange(std::chrono::milliseconds(30)));
  record("b");
  EXPECT_TRUE(reader.waitForChange(kPatience));
  EXPECT_EQ(names(reader.read(query)), Names{"b"});
}

TEST_F(EventReaderTest, FollowsAcrossARunOfTheService) {
  start();
  record("a");
  stop();
  EventReader reader(file());
  EventQuery query;
  query.after = reader.read(query).value.lookedUpTo;
  start();
  record("b");
  ASSERT_TRUE(flush());
  EXPECT_TRUE(reader.waitForChange(kPatience));
  EXPECT_EQ(names(reader.read(query)), Names{"b"});
}

TEST_F(EventReaderTest, FollowsIntoAFileWhoseIdsGoOn) {
  start();
  recordMany(5);
  ASSERT_TRUE(flush());
  EventReader reader(file());
  EventQuery query;
  query.after = reader.read(query).value.lookedUpTo;
  std::filesystem::rename(file(), directory_.path() / "elsewhere");
  record("after");
  ASSERT_TRUE(flush());
  EXPECT_TRUE(reader.waitForChange(kPatience));
  const Result<EventPage> result = reader.read(query);
  EXPECT_EQ(names(result), Names{"after"});
  EXPECT_EQ(result.value.lookedUpTo, 6);
}

TEST_F(EventReaderTest, FollowsIntoAFileWhoseIdsBeginAnew) {
  start();
  recordMany(5);
  ASSERT_TRUE(flush());
  EventReader reader(file());
  EventQuery query;
  query.after = reader.read(query).value.lookedUpTo;
  ASSERT_EQ(query.after, 5);
  stop();
  for (const char* const suffix : {"", "-wal", "-shm", ".counts"}) {
    std::filesystem::remove(file().string() + suffix);
  }
  EXPECT_TRUE(reader.read(query).value.missing);
  start();
  record("anew");
  ASSERT_TRUE(flush());
  const Result<EventPage> result = reader.read(query);
  EXPECT_EQ(names(result), Names{"anew"});
  EXPECT_EQ(result.value.lookedUpTo, 1);
}

TEST_F(EventReaderTest, AFailureInBetweenRepeatsNothing) {
  start();
  recordMany(5);
  stop();
  EventReader reader(file());
  EventQuery query;
  query.after = reader.read(query).value.lookedUpTo;
  change(file(), "ALTER TABLE event_texts RENAME COLUMN name TO other");
  EXPECT_TRUE(reader.read(query).failed());
  change(file(), "ALTER TABLE event_texts RENAME COLUMN other TO name");
  const Result<EventPage> result = reader.read(query);
  EXPECT_TRUE(result.ok()) << result.error.text();
  EXPECT_EQ(names(result), Names{});
}

TEST_F(EventReaderTest, ReadsADirectoryThatItMayNotWriteTo) {
  ChildProcess child([this] {
    becomeOrdinaryUser(directory_.path());
    start();
    record("a");
    stop();
    ASSERT_EQ(::chmod(directory_.path().c_str(), 0555), 0);
    EventReader reader(file());
    const Result<EventPage> result = reader.read({});
    EXPECT_TRUE(result.ok()) << result.error.text();
    EXPECT_EQ(names(result), Names{"a"});
    EXPECT_FALSE(reader.waitForChange(std::chrono::milliseconds(30)));
    ASSERT_EQ(::chmod(directory_.path().c_str(), 0755), 0);
  });
  EXPECT_EQ(child.wait(), 0);
}

TEST_F(EventReaderTest, FollowsFromADirectoryThatItMayNotWriteToWhenTheServiceStarts) {
  ChildProcess child([this] {
    becomeOrdinaryUser(directory_.path());
    start();
    record("a");
    stop();
    ASSERT_EQ(::chmod(directory_.path().c_str(), 0555), 0);
    EventReader reader(file());
    EventQuery query;
    query.after = reader.read(query).value.lookedUpTo;
    ASSERT_EQ(::chmod(directory_.path().c_str(), 0755), 0);
    start();
    record("b");
    ASSERT_TRUE(flush());
    EXPECT_TRUE(reader.waitForChange(kPatience));
    EXPECT_EQ(names(reader.read(query)), Names{"b"});
    stop();
  });
  EXPECT_EQ(child.wait(), 0);
}

TEST_F(EventReaderTest, PathsWithSpecialCharactersAreReadFromADirectoryThatItMayNotWriteTo) {
  ChildProcess child([this] {
    becomeOrdinaryUser(directory_.path());
    options_.file = directory_.path() / "odd ?name#100%.sqlite3";
    start();
    record("a");
    stop();
    ASSERT_EQ(::chmod(directory_.path().c_str(), 0555), 0);
    EventReader reader(file());
    EXPECT_EQ(names(reader.read({})), Names{"a"});
    ASSERT_EQ(::chmod(directory_.path().c_str(), 0755), 0);
  });
  EXPECT_EQ(child.wait(), 0);
}

}  // namespace
}  // namespace tarn::recorder
