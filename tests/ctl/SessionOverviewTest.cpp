// SPDX-License-Identifier: Apache-2.0
#include "tools/ctl/sessions/SessionOverview.h"

#include <nlohmann/json.hpp>

#include "tests/ctl/SessionStoreFixture.h"

namespace tarn::ctl {
namespace {

class SessionOverviewTest : public testing::SessionStoreFixture {
 protected:
  void SetUp() override { makeStore(); }
  void add(std::int64_t id, double ended = 0, const std::string& endReason = {}) {
    Session session;
    session.id = id;
    session.created = 1000;
    session.ended = ended;
    session.endReason = endReason;
    addSession(session);
  }
  std::vector<SessionOverview> overviews(double now = 2000) {
    recorder::SessionReader reader(file());
    EXPECT_TRUE(reader.open().ok());
    auto made = overviewsOf(reader, reader.sessions().value, now);
    EXPECT_TRUE(made.ok()) << made.error.text();
    return made.value;
  }
  void addOverload(std::int64_t session) {
    addMessage(session, 1500, "IO.IssueDetector", R"({"issue_type":"overload"})");
  }
  void addSummary(std::int64_t session, int overloads) {
    addMessage(session, 1600, "Session_Generic.Summary",
               R"({"overload_count":)" + std::to_string(overloads) + R"(,"summaryServiceName":"longformaudio"})");
  }
};

TEST_F(SessionOverviewTest, ActiveIsTheTimeBetweenStartsAndStops) {
  add(1, 1300, "stopped");
  addPeriod(1, 1000, 1010.5, 0, 0, 10, 2);
  addPeriod(1, 1200, 1230, 0, 0, 5, 1);
  const SessionOverview overview = overviews().front();
  EXPECT_EQ(overview.active, 40.5);
  EXPECT_EQ(overview.messages, 15);
  EXPECT_EQ(overview.redundant, 3);
  EXPECT_EQ(overview.periods.size(), 2U);
  EXPECT_EQ(overview.state(), "stopped");
}

TEST_F(SessionOverviewTest, OneThatRunsIsActiveUntilNow) {
  add(1);
  addPeriod(1, 1900, 0);
  EXPECT_EQ(overviews(2000).front().active, 100);
  EXPECT_EQ(overviews(2000).front().state(), "running");
}

TEST_F(SessionOverviewTest, OneThatWasKilledWasActiveUntilItsEnd) {
  add(1, 1950, "killed");
  addPeriod(1, 1900, 0);
  EXPECT_EQ(overviews(2000).front().active, 50);
  EXPECT_EQ(overviews(2000).front().state(), "killed");
}

TEST_F(SessionOverviewTest, OneThatHasNotStartedIsOpen) {
  add(1);
  EXPECT_EQ(overviews().front().state(), "open");
  EXPECT_EQ(overviews().front().active, 0);
}

TEST_F(SessionOverviewTest, EachSessionHasItsOwnPeriodsAndOverloads) {
  add(1, 1300, "stopped");
  add(2, 1300, "destroyed");
  add(5, 1300, "stopped");
  addPeriod(5, 1000, 1005);
  addPeriod(1, 1000, 1001);
  addPeriod(3, 1000, 1100);  // of a session that is gone
  addOverload(5);
  const auto all = overviews();
  ASSERT_EQ(all.size(), 3U);
  EXPECT_EQ(all[0].active, 1);
  EXPECT_EQ(all[1].active, 0);
  EXPECT_EQ(all[2].active, 5);
  EXPECT_EQ(all[0].overloads, 0);
  EXPECT_EQ(all[2].overloads, 1);
}

TEST_F(SessionOverviewTest, OverloadsOfOneThatRunsAreCountedByItsEvents) {
  add(1);
  addPeriod(1, 1000, 0, 1);
  addOverload(1);
  addMessage(1, 1500, "IO.IssueDetector", R"({"issue_type":"overload","session_duration":3})");
  addMessage(1, 1500, "IO.IssueDetector", R"({"issue_type":"Silence"})");
  addOverload(1);
  EXPECT_EQ(overviews().front().overloads, 2);
}

TEST_F(SessionOverviewTest, ASummaryCountsForAllBeforeIt) {
  add(1);
  addOverload(1);
  addSummary(1, 7);  // of which retention has taken six
  addPeriod(1, 1000, 1100, 1, lastEvent());
  EXPECT_EQ(overviews().front().overloads, 7);
  addOverload(1);
  addPeriod(1, 1200, 0, lastEvent() - 2);
  EXPECT_EQ(overviews().front().overloads, 8);
}

TEST_F(SessionOverviewTest, ASummaryCountsHoweverManyEventsOfOthersCameAfterIt) {
  add(1, 1300, "stopped");
  add(2);
  addOverload(1);
  addSummary(1, 7);
  for (int i = 0; i < 300; ++i) {
    addEvent(2, 1600, "rtc", "flush", "{}");
  }
  addPeriod(1, 1000, 1300, 1, addMessage(1, 1600, "Playback.Generic", "{}"));
  addPeriod(2, 1000, 0, 7);
  const auto all = overviews();
  EXPECT_EQ(all[0].overloads, 7);
  EXPECT_EQ(all[1].overloads, 0);
}

TEST_F(SessionOverviewTest, TheLastSummaryOfOneThatEndedCountsForAll) {
  add(1, 1300, "stopped");
  addOverload(1);
  addSummary(1, 1);
  addPeriod(1, 1000, 1100, 1, lastEvent());
  const std::int64_t second = addMessage(1, 1200, "Playback.Start", "{}");
  addSummary(1, 5);
  addPeriod(1, 1200, 1300, second, lastEvent());
  EXPECT_EQ(overviews().front().overloads, 5);
}

TEST_F(SessionOverviewTest, OneThatEndedWithoutASummaryIsCountedByItsEvents) {
  add(1, 1300, "killed");
  addOverload(1);
  addPeriod(1, 1000, 0, 1, lastEvent());
  EXPECT_EQ(overviews().front().overloads, 1);
}

TEST_F(SessionOverviewTest, OfManyWithoutASummaryEachIsCountedByItsEvents) {
  addSession({});
  for (std::int64_t id = 2; id <= 80; ++id) {
    add(id, 1300, "killed");
    addPeriod(id, 1000, 1300, lastEvent() + 1, lastEvent() + 3);
    addOverload(id);
    addOverload(id % 2 == 0 ? id : 2);
  }
  addOverload(0);
  addSummary(3, 40);
  addPeriod(3, 1400, 1500, lastEvent() - 2, lastEvent());
  addOverload(3);
  addPeriod(3, 1600, 0, lastEvent() - 2);
  const auto all = overviews();
  ASSERT_EQ(all.size(), 80U);
  EXPECT_EQ(all[0].overloads, 0);
  EXPECT_EQ(all[1].overloads, 2 + 39);
  EXPECT_EQ(all[2].overloads, 41);
  EXPECT_EQ(all[3].overloads, 2);
  EXPECT_EQ(all[4].overloads, 1);
}

TEST_F(SessionOverviewTest, JsonHasEveryColumnAndWhatIsCounted) {
  add(1, 1300.5, "client-gone");
  addPeriod(1, 1000, 1010.5, 1, 3, 10, 2);
  addOverload(1);
  const auto json = nlohmann::json::parse(overviewJson(overviews().front()));
  EXPECT_EQ(json, nlohmann::json::parse(R"({"id":1,"run":1,"reporter":4101,"connection":3,"pid":812,"uid":1000,
      "process":"player","application":"org.example.music","service_type":7,"service_name":"longformaudio",
      "created":1000.0,"ended":1300.5,"end_reason":"client-gone","running":false,"active":10.5,
      "periods":[{"started":1000.0,"stopped":1010.5,"messages":10,"redundant":2,"first_event":1,"last_event":3}],
      "messages":10,"redundant":2,"overloads":1})"));
}

TEST_F(SessionOverviewTest, JsonSaysNullForWhatIsNotKnown) {
  add(1);
  sql("UPDATE sessions SET process = '', application = NULL;");
  const auto json = nlohmann::json::parse(overviewJson(overviews().front()));
  for (const char* name : {"ended", "end_reason", "process", "application"}) {
    EXPECT_TRUE(json.at(name).is_null()) << name;
  }
}

}  // namespace
}  // namespace tarn::ctl
