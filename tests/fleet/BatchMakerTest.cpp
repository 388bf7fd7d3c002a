// SPDX-License-Identifier: Apache-2.0
#include "fleet/export/BatchMaker.h"

#include <gtest/gtest.h>

#include "tests/fleet/Batches.h"

namespace tarn::fleet {
namespace {

constexpr std::int64_t kNow = 1'750'000'000'000'000;

class FleetBatchMaker : public ::testing::Test {
 protected:
  static Rules someRules() {
    Rules rules;
    rules.keys = {"a", "process"};
    rules.hashed = {"application"};
    return rules;
  }
  static recorder::EventRow row(std::int64_t id, std::optional<std::int64_t> session = 1,
                                const std::string& payload = R"({"a":1,"b":2})") {
    return {id,     1750000000.0 + static_cast<double>(id), "tally", "sys.oxbow.tarnkit.Volume.Summary", payload, "{}",
            session};
  }
  MadeBatch make(const std::vector<recorder::EventRow>& rows, std::int64_t after = 0) {
    Result<MadeBatch> made = maker_.make(rows, after, kNow, sessions_);
    EXPECT_TRUE(made.ok()) << made.error.text();
    EXPECT_EQ(batchFault(made.value.batch), "");
    return std::move(made.value);
  }

  FleetKey key_ = FleetKey::parse(std::string(64, '7')).value;
  PrivacySieve sieve_{someRules(), key_};
  testing::MadeUpSessions sessions_;
  BatchMaker maker_{sieve_, std::string(kDeviceBytes, 'd'), BatchLimits{1000, 400}};
};

TEST_F(FleetBatchMaker, HasEventsWithTheirSessionAndWhatMayLeaveOfThem) {
  sessions_.add(1).run.machine = R"({"a":"x","b":"y"})";
  const v1::Batch batch = make({row(1), row(2)}).batch;
  ASSERT_EQ(batch.events_size(), 2);
  EXPECT_EQ(batch.events(1).payload(), R"({"a":1})");
  EXPECT_EQ(batch.events(1).ahead(), 1U);
  EXPECT_EQ(batch.events(1).time(), 1750000002);
  EXPECT_EQ(batch.events(1).session(), 1U);
  ASSERT_EQ(batch.kinds_size(), 1);
  EXPECT_EQ(batch.kinds(0).name(), "sys.oxbow.tarnkit.Volume.Summary");
  ASSERT_EQ(batch.sessions_size(), 1);
  EXPECT_EQ(batch.sessions(0).process(), "player");
  EXPECT_EQ(batch.sessions(0).application(), key_.hashOf(0, "org.example.music"));
  ASSERT_EQ(batch.runs_size(), 1);
  EXPECT_EQ(batch.runs(0).machine(), R"({"a":"x"})");
  EXPECT_EQ(batch.looked_at(), kNow);
}

TEST_F(FleetBatchMaker, IdsThatAreGoneAreAGapAndThoseThatStayAreCounted) {
  sessions_.add(1);
  recorder::EventRow mirror = row(12);
  mirror.backend = "rtc";
  mirror.name = "sendMessage";
  const v1::Batch batch = make({row(11), mirror, row(13), row(41)}, 5).batch;
  EXPECT_EQ(batch.first(), 6);
  EXPECT_EQ(batch.last(), 41);
  EXPECT_EQ(batch.events_size(), 3);
  EXPECT_EQ(batch.left_out(), 1);
  ASSERT_EQ(batch.gaps_size(), 2);
  EXPECT_EQ(batch.gaps(0).first(), 6);
  EXPECT_EQ(batch.gaps(0).last(), 10);
  EXPECT_EQ(batch.gaps(1).first(), 14);
  EXPECT_EQ(batch.gaps(1).last(), 40);
}

TEST_F(FleetBatchMaker, AnEventThatIsTooLargeOrNoObjectOrNoTextStays) {
  sessions_.add(1);
  const v1::Batch batch = make({row(1, 1, R"({"a":")" + std::string(500, 'x') + R"("})"), row(2, 1, "[1]"),
                                row(3, 1, "{\"a\":\"\xff\"}"), row(4)})
                              .batch;
  EXPECT_EQ(batch.left_out(), 3);
  EXPECT_EQ(batch.events_size(), 1);
}

TEST_F(FleetBatchMaker, EndsWhenItIsFullAndTheNextGoesOnAfterIt) {
  sessions_.add(1);
  std::vector<recorder::EventRow> rows;
  for (std::int64_t id = 1; id <= 100; ++id) {
    rows.push_back(row(id));
  }
  const std::int64_t last = make(rows).batch.last();
  EXPECT_GT(last, 1);
  EXPECT_LT(last, 100);
  rows.erase(rows.begin(), rows.begin() + last);
  EXPECT_EQ(make(rows, last).batch.first(), last + 1);
}

TEST_F(FleetBatchMaker, AnIdThatIsTooFarAwayHasABatchOfItsOwn) {
  sessions_.add(1);
  constexpr std::int64_t kFar = std::int64_t{1} << 40;
  const v1::Batch first = make({row(1), row(kFar)}).batch;
  EXPECT_EQ(first.last(), 1);
  const v1::Batch gap = make({row(kFar)}, 1).batch;
  EXPECT_EQ(gap.events_size(), 0);
  EXPECT_EQ(gap.last(), kFar - 1);
  EXPECT_EQ(make({row(kFar)}, kFar - 1).batch.events_size(), 1);
}

TEST_F(FleetBatchMaker, EventsOfNobodyAndOfASessionThatIsGoneHaveNone) {
  const v1::Batch batch = make({row(1, std::nullopt), row(2, 9)}).batch;
  EXPECT_EQ(batch.sessions_size(), 0);
  EXPECT_EQ(batch.events(0).session(), 0U);
  EXPECT_EQ(batch.events(1).session(), 0U);
}

TEST_F(FleetBatchMaker, ASessionThatIsNotInTheSampleStaysWhole) {
  Rules rules = someRules();
  rules.sample = 0.5;
  PrivacySieve sieve(rules, key_);
  BatchMaker maker(sieve, std::string(kDeviceBytes, 'd'));
  std::vector<recorder::EventRow> rows;
  for (std::int64_t session = 1; session <= 40; ++session) {
    sessions_.add(session);
    rows.push_back(row(2 * session - 1, session));
    rows.push_back(row(2 * session, session));
  }
  const v1::Batch batch = maker.make(rows, 0, kNow, sessions_).value.batch;
  EXPECT_EQ(batchFault(batch), "");
  EXPECT_GT(batch.sessions_size(), 5);
  EXPECT_LT(batch.sessions_size(), 35);
  EXPECT_EQ(batch.events_size(), 2 * batch.sessions_size());
  EXPECT_EQ(batch.left_out(), 80 - batch.events_size());
}

TEST_F(FleetBatchMaker, SessionsThatHaveNotEndedAreToBeLookedAtAgain) {
  sessions_.add(1);
  sessions_.add(2).session.ended.reset();
  EXPECT_EQ(make({row(1, 1), row(2, 2)}).open, std::vector<std::int64_t>{2});
  sessions_.add(2);
  const MadeBatch later = maker_.makeOfSessions({2, 77}, 2, kNow, sessions_).value;
  EXPECT_TRUE(later.open.empty());
  EXPECT_EQ(batchFault(later.batch), "");
  EXPECT_EQ(later.batch.first(), 3);
  EXPECT_EQ(later.batch.last(), 2);
  EXPECT_EQ(later.batch.sessions_size(), 1);
  EXPECT_EQ(later.batch.sessions(0).ended(), 1750000100);
}

TEST_F(FleetBatchMaker, PeriodsThatAreOverAreToldOnceAndManyComeInParts) {
  StoredSession& session = sessions_.add(1);
  for (std::int64_t id = 1; id <= 600; ++id) {
    session.periods.push_back({id, 1, 1750000000, 1750000001, 1, 0, {}, {}});
  }
  session.periods.back().stopped.reset();
  const MadeBatch first = make({row(1)});
  EXPECT_EQ(first.batch.sessions(0).periods_size(), 512);
  EXPECT_EQ(first.open, std::vector<std::int64_t>{1});
  const MadeBatch second = make({row(2)}, 1);
  EXPECT_EQ(second.batch.sessions(0).periods_size(), 88);
  const MadeBatch third = make({row(3)}, 2);
  ASSERT_EQ(third.batch.sessions(0).periods_size(), 1);
  EXPECT_EQ(third.batch.sessions(0).periods(0).id(), 600);
}

}  // namespace
}  // namespace tarn::fleet
