// SPDX-License-Identifier: Apache-2.0
// What retention took out of the middle is known as removed, and what stays needs nothing of it.
#include "recorder/store/retention/RemovedIds.h"
#include "tests/recorder/store/retention/RetentionFixture.h"

namespace tarn::recorder {
namespace {

using Ranges = std::vector<IdRange>;
using Rows = std::vector<std::string>;

constexpr std::int64_t kQuiet = 1000;
constexpr std::int64_t kLoud = 1001;

class RemovedEvents : public RetentionFixture {
 protected:
  // A store in which one user's events stand between those that are gone.
  void fill() {
    open();
    for (int round = 0; round < 150; ++round) {
      send(kQuiet, 1);
      send(kLoud, 19);
    }
    ASSERT_EQ(countOf(kQuiet), 150);
    ASSERT_LT(countOf(kLoud), 1000);
  }
  StoreReport report() {
    const auto inspected = inspectStore(file());
    EXPECT_TRUE(inspected.ok());
    return inspected.value;
  }
};

TEST_F(RemovedEvents, AreNotMissed) {
  fill();
  EXPECT_GT(number("SELECT count(*) FROM recorder_removed"), 50);
  expectWhole();
  ASSERT_TRUE(events_->verify(std::chrono::steady_clock::time_point::max()).ok());
}

TEST_F(RemovedEvents, OneThatIsLostBetweenThemIs) {
  fill();
  close();
  change(file(), "DELETE FROM event_rows WHERE id = 201");
  EXPECT_EQ(report().lost, (Ranges{{201, 201}}));
}

TEST_F(RemovedEvents, ANoteThatWasDamagedTellsNothing) {
  fill();
  close();
  const std::string first = askOne(file(), "SELECT min(first) FROM recorder_removed");
  const std::string last = askOne(file(), "SELECT last FROM recorder_removed ORDER BY first LIMIT 1");
  change(file(), "UPDATE recorder_removed SET last = last + 1 WHERE first = " + first);
  EXPECT_EQ(report().lost, (Ranges{{std::stoll(first), std::stoll(last)}}));
}

TEST_F(RemovedEvents, NotesBeforeTheFirstEventAreForgotten) {
  fill();
  const std::int64_t before = number("SELECT count(*) FROM recorder_removed");
  send(kQuiet, 1500);
  EXPECT_LT(number("SELECT count(*) FROM recorder_removed"), before / 2);
  EXPECT_EQ(number("SELECT value FROM recorder_state WHERE name = 'holds_after'"),
            number("SELECT min(id) - 1 FROM event_rows"));
  expectWhole();
}

TEST_F(RemovedEvents, NeighboursAreOneNote) {
  open();
  std::vector<Handed> events;
  for (int n = 0; n < 20; ++n) {
    events.push_back(n == 0 ? summary(kLoud) : message(kLoud, 100));
  }
  commit(events);
  clock_.advance(std::chrono::hours(24 * 31));
  commit({message(kLoud, 100)});
  EXPECT_EQ(ask(file(), "SELECT first, last FROM recorder_removed"), Rows{"2|20"});
  clock_.advance(std::chrono::hours(24 * 31));
  commit({summary(kLoud)});
  EXPECT_EQ(ask(file(), "SELECT first, last FROM recorder_removed"), Rows{"2|21"});
  clock_.advance(std::chrono::hours(24 * 90));
  commit({message(kLoud, 100)});
  EXPECT_EQ(ask(file(), "SELECT first, last FROM recorder_removed"), Rows());
  EXPECT_EQ(askOne(file(), "SELECT value FROM recorder_state WHERE name = 'holds_after'"), "21");
  expectWhole();
}

// Texts are shared in memory too: an event after a removal must not name one that is gone.
TEST_F(RemovedEvents, AnEventLikeThoseBeforeItStandsWhole) {
  open();
  Handed first = message(kLoud, 100);
  Handed mirror = first;
  mirror.backend = "rtc";
  mirror.name = "sendMessage";
  commit({mirror, first});
  clock_.advance(std::chrono::hours(24 * 31));
  commit({});
  ASSERT_EQ(number("SELECT count(*) FROM event_rows"), 0);
  first.repeatsPayload = true;
  commit({first, mirror});
  EXPECT_EQ(ask(file(), "SELECT payload FROM events"), (Rows{first.payload, first.payload}));
  expectWhole();
}

TEST_F(RemovedEvents, IdsOfACommitThatIsGoneAtOnceAreNotGivenAgain) {
  limits_.maxBytes = 400'000;
  open();
  std::vector<Handed> large;
  for (int n = 0; n < 30; ++n) {
    large.push_back(message(kLoud, 20'000));
  }
  EXPECT_GT(commit(large), 10U);
  close();
  open();
  commit({message(kLoud, 10)});
  EXPECT_EQ(askOne(file(), "SELECT max(id) FROM event_rows"), "31");
  expectWhole();
}

TEST_F(RemovedEvents, MessagesGrowOldBeforeSummaries) {
  open();
  commit({message(kLoud, 100), summary(kLoud), {kLoud, "snare", "requestSnapshot"}, {kLoud, "wattlog", "Status"}});
  clock_.advance(std::chrono::hours(24 * 31));
  EXPECT_EQ(commit({}), 2U);
  EXPECT_EQ(ask(file(), "SELECT id FROM events"), (Rows{"2", "3"}));
  expectWhole();
  clock_.advance(std::chrono::hours(24 * 88));
  EXPECT_EQ(commit({}), 0U);
  clock_.advance(std::chrono::hours(48));
  EXPECT_EQ(commit({}), 2U);
  EXPECT_EQ(events_->expiredByOwner(), (std::map<Owner, std::uint64_t>{{kLoud, 4}}));
}

TEST_F(RemovedEvents, ByAgeGoOnInPiecesAndCountInTheShares) {
  open();
  send(kLoud, 700);
  clock_.advance(std::chrono::hours(24 * 20));
  send(kQuiet, 100);
  clock_.advance(std::chrono::hours(24 * 11));
  for (int looks = 0; looks < 100 && (looks == 0 || events_->hasMoreToExpire()); ++looks) {
    ASSERT_TRUE(events_->begin().ok());
    ASSERT_TRUE(events_->expire(std::chrono::steady_clock::time_point()).ok());
    ASSERT_TRUE(events_->commit().ok());
  }
  EXPECT_EQ(countOf(kLoud), 0);
  EXPECT_EQ(countOf(kQuiet), 100);
  send(kLoud, 200);
  send(-1, 3000);
  EXPECT_EQ(countOf(kQuiet), 100);
  EXPECT_EQ(countOf(kLoud), 200);
  expectWhole();
}

// Pieces of the count, with commits in between that are counted as they come.
TEST_F(RemovedEvents, WhatComesWhileItIsCountedCounts) {
  limits_.maxBytes = 8 * kCap;
  open();
  send(kLoud, 2500, 300);
  send(kQuiet, 2500, 300);
  close();
  limits_.maxBytes = number("SELECT page_count * 8192 FROM pragma_page_count") * 10 / 9;
  open();
  for (int round = 0; round < 20; ++round) {
    ASSERT_TRUE(events_->begin().ok());
    for (int n = 0; n < 50; ++n) {
      append(message(kQuiet, 300));
    }
    ASSERT_TRUE(events_->expire(std::chrono::steady_clock::time_point()).ok());
    ASSERT_TRUE(events_->commit().ok());
  }
  send(-1, 1500, 300);
  send(kLoud, 2000, 300);
  EXPECT_LE(std::abs(bytesOf(kLoud) - bytesOf(kQuiet)), kCap / 16);
  expectWhole();
}

class RemovedEventsOfARecorder : public RecorderFixture {
 protected:
  void recordSummary(int number) { record("sys.oxbow.tarnkit.Volume.Summary", {{"number", number}}); }
};

TEST_F(RemovedEventsOfARecorder, AreNotTakenForDamageWhileItIsLookedFor) {
  options_.maxMegabytes = 1;
  options_.verifyInterval = options_.verifyRest = std::chrono::milliseconds(1);
  options_.verifyTime = std::chrono::milliseconds(1);
  start();
  for (int round = 0; round < 40; ++round) {
    recordSummary(round);
    recordMany(200, 1000);
    ASSERT_TRUE(flush());
  }
  EXPECT_GT(recorder_->counters().expired, 5000U);
  stop();
  EXPECT_EQ(errors(), 0U);
  EXPECT_EQ(filesSetAside().size(), 0U);
  EXPECT_EQ(askOne(file(), "SELECT count(*) FROM v_volume"), "40");
}

TEST_F(RemovedEventsOfARecorder, AreCountedByWhoseTheyWere) {
  options_.maxMegabytes = 1;
  start();
  for (int round = 0; round < 10; ++round) {
    recordMany(500, 1000);
    ASSERT_TRUE(flush());
  }
  const std::map<Owner, std::uint64_t> expected{{kServiceItself, recorder_->counters().expired}};
  EXPECT_EQ(recorder_->expiredByOwner(), expected);
}

TEST_F(RemovedEventsOfARecorder, AreNotLostWhenTheFileIsCarriedOver) {
  options_.maxMegabytes = 2;
  start();
  for (int round = 0; round < 20; ++round) {
    recordSummary(round);
    recordMany(300, 1000);
    ASSERT_TRUE(flush());
  }
  stop();
  const std::int64_t kept = std::stoll(askOne(file(), "SELECT count(*) FROM event_rows"));
  const std::string damaged = askOne(file(), "SELECT max(id) - 5 FROM event_rows");
  change(file(), "UPDATE event_rows SET time = time + 1 WHERE id = " + damaged);
  options_.verifyInterval = options_.verifyRest = std::chrono::milliseconds(1);
  options_.maxMegabytes = 16;
  start();
  ASSERT_TRUE(eventually([&] { return log_.count("1 are lost (" + damaged + ")") == 1; }));
  stop();
  EXPECT_EQ(std::stoll(askOne(file(), "SELECT count(*) FROM event_rows")), kept - 1);
  const auto report = inspectStore(file());
  ASSERT_TRUE(report.ok());
  EXPECT_TRUE(report.value.lost.empty()) << textOf(report.value.lost);
  EXPECT_EQ(countOf(report.value.notedLost), 1);
}

}  // namespace
}  // namespace tarn::recorder
