// SPDX-License-Identifier: Apache-2.0
#include "tools/report/ReportMaker.h"

#include <gtest/gtest.h>

#include <algorithm>

#include "tests/report/StoreFile.h"

namespace tarn::report {
namespace {

using Ids = std::vector<std::int64_t>;

constexpr const char* kOverload = R"({"issue_type":"overload"})";

class ReportMaker : public ::testing::Test {
 protected:
  Result<Report> make(const ReportRequest& request = {}) {
    ReportStore store(file_.path());
    const Status opened = store.open();
    EXPECT_TRUE(opened.ok()) << opened.text();
    return makeReport(store, request, 1000);
  }
  static Ids idsOf(const std::vector<SessionPicture>& pictures) {
    Ids ids;
    for (const SessionPicture& picture : pictures) {
      ids.push_back(picture.session.id);
    }
    return ids;
  }
  // Three sessions from 0 to 100, 100 to 200 and 200 on.
  void addThree() {
    file_.session(1, 0, "100");
    file_.session(2, 100, "200");
    file_.session(3, 200, "NULL");
    for (int id = 1; id <= 3; ++id) {
      file_.period(id, (id - 1) * 100, std::to_string(id * 100), 5);
    }
  }

  testing::StoreFile file_;
};

TEST_F(ReportMaker, RangeHasTheSessionsOfWhichAPartLiesInIt) {
  addThree();
  const auto idsIn = [&](std::optional<double> since, std::optional<double> until) {
    const Report report = make({{}, {since, until}}).value;
    Ids ids;
    for (const SessionFigures& figures : report.range->sessions) {
      ids.push_back(figures.session.id);
    }
    return ids;
  };
  EXPECT_EQ(idsIn(std::nullopt, std::nullopt), (Ids{3, 2, 1}));
  EXPECT_EQ(idsIn(100, std::nullopt), (Ids{3, 2, 1}));
  EXPECT_EQ(idsIn(100.5, std::nullopt), (Ids{3, 2}));
  EXPECT_EQ(idsIn(std::nullopt, 100), (Ids{1}));
  EXPECT_EQ(idsIn(std::nullopt, 100.5), (Ids{2, 1}));
  EXPECT_EQ(idsIn(500, std::nullopt), (Ids{3}));
}

TEST_F(ReportMaker, EventsOfTheRangeAreCountedBySession) {
  addThree();
  file_.message("1", 50, "IO.Error", kOverload);
  file_.message("1", 60, "Performance.Generic", kOverload);
  file_.message("2", 150, "Performance.Generic", R"({"issue_type":"quiet"})");
  file_.message("2", 160, "Error.Generic");
  file_.message("2", 165, "DSP_Error.Generic");
  file_.message("2", 170, "Volume.Summary", R"({"msgidx":1,"msgcnt":1,"play_seconds":20,"KvSessionVolume":0.5})");
  file_.message("NULL", 170, "IO.Error", kOverload);
  file_.event("1", 50, "tally", "sys.oxbow.longformaudio.IO.Error", kOverload);
  file_.event("1", 50, "rtc", "sendMessage", kOverload);
  const Result<Report> report = make();
  ASSERT_TRUE(report.ok()) << report.error.text();
  EXPECT_EQ(report.value.range->totals.overloads, 2);
  EXPECT_EQ(report.value.range->totals.errors, 2);
  EXPECT_EQ(report.value.range->playSeconds[8], 20);
  EXPECT_EQ(make({{}, {55, std::nullopt}}).value.range->totals.overloads, 1);
}

TEST_F(ReportMaker, WorstSessionsComeFirstThenTheNewestSmallOnes) {
  addThree();
  file_.message("2", 150, "IO.Error", kOverload);
  EXPECT_EQ(idsOf(make().value.sessions), (Ids{2, 3, 1}));
}

TEST_F(ReportMaker, SessionOfManyMessagesIsNoSmallOne) {
  file_.session(1, 0, "100");
  file_.session(2, 0, "100");
  file_.period(1, 0, "100", 65);
  file_.period(2, 0, "100", 64);
  EXPECT_EQ(idsOf(make().value.sessions), (Ids{2}));
}

TEST_F(ReportMaker, AtMostThirtySmallSessionsAreShown) {
  for (int id = 1; id <= 40; ++id) {
    file_.session(id, 0, "100");
  }
  const Ids ids = idsOf(make().value.sessions);
  ASSERT_EQ(ids.size(), 30U);
  EXPECT_EQ(ids.front(), 40);
  EXPECT_EQ(ids.back(), 11);
}

TEST_F(ReportMaker, PicturesAreOfAllEventsOfTheirSession) {
  addThree();
  file_.message("1", 50, "IO.Error", kOverload);
  file_.message("2", 150, "IO.Error", kOverload);
  file_.event("1", 51, "rtc", "sendMessage", kOverload);
  const Result<Report> report = make({{1}, {60, std::nullopt}});
  ASSERT_EQ(idsOf(report.value.sessions), (Ids{1}));
  EXPECT_EQ(report.value.sessions[0].overloads.size(), 1U);
  EXPECT_EQ(report.value.sessions[0].events.at("rtc"), 1);
  EXPECT_EQ(report.value.sessions[0].activeSeconds, 100);
}

TEST_F(ReportMaker, OneNamedSessionHasNoOverviewAndSeveralHaveOne) {
  addThree();
  EXPECT_FALSE(make({{2}, {}}).value.range);
  const Report two = make({{3, 1}, {}}).value;
  ASSERT_TRUE(two.range);
  EXPECT_EQ(two.range->sessions.size(), 2U);
  EXPECT_EQ(idsOf(two.sessions), (Ids{3, 1}));
  EXPECT_TRUE(two.isComplete);
}

TEST_F(ReportMaker, SessionThatIsNamedTwiceIsShownOnce) {
  addThree();
  file_.message("2", 150, "IO.Error", kOverload);
  const Report report = make({{2, 2}, {}}).value;
  ASSERT_EQ(idsOf(report.sessions), (Ids{2}));
  EXPECT_EQ(report.sessions[0].overloads.size(), 1U);
}

TEST_F(ReportMaker, NamedSessionThatIsNotThereIsAnError) {
  addThree();
  EXPECT_EQ(make({{2, 7}, {}}).error.text(), "there is no session 7");
}

TEST_F(ReportMaker, StoreWithoutSessionsMakesAnEmptyReport) {
  const Result<Report> report = make();
  ASSERT_TRUE(report.ok());
  EXPECT_TRUE(report.value.range->sessions.empty());
  EXPECT_TRUE(report.value.sessions.empty());
}

TEST_F(ReportMaker, FileOfTheFirstVersionIsRefusedWithItsName) {
  file_.sql("PRAGMA user_version = 0");
  ReportStore store(file_.path());
  const Status opened = store.open();
  ASSERT_TRUE(opened.failed());
  EXPECT_NE(opened->text.find(file_.path() + " has no sessions yet"), std::string::npos) << opened->text;
}

TEST_F(ReportMaker, FileThatIsNotThereIsRefusedWithItsName) {
  ReportStore store(file_.folder() + "/none.sqlite3");
  const Status opened = store.open();
  ASSERT_TRUE(opened.failed());
  EXPECT_NE(opened->text.find("/none.sqlite3"), std::string::npos) << opened->text;
}

TEST_F(ReportMaker, TellsHowMuchIsRead) {
  addThree();
  for (const char* id : {"1", "40000", "100000"}) {
    file_.sql("INSERT INTO events VALUES(" + std::string(id) +
              ", 50, 'tally', 'sys.oxbow.tarnkit.IO.Error', '{}', '{}', 1)");
  }
  ReportStore store(file_.path());
  ASSERT_TRUE(store.open().ok());
  std::vector<double> told;
  const Result<Report> report = makeReport(store, {}, 1000, [&](double part) { told.push_back(part); });
  ASSERT_TRUE(report.ok());
  EXPECT_EQ(report.value.range->totals.errors, 3);
  ASSERT_EQ(told.size(), 7U);
  EXPECT_TRUE(std::is_sorted(told.begin(), told.end()));
  EXPECT_GT(told.front(), 0);
  EXPECT_EQ(told.back(), 1);
}

TEST_F(ReportMaker, IdsThatNoRecorderGivesAreReadInAsFewParts) {
  addThree();
  for (const char* id : {"-9223372036854775807", "-5", "1", "9223372036854775807"}) {
    file_.sql("INSERT INTO events VALUES(" + std::string(id) +
              ", 50, 'tally', 'sys.oxbow.tarnkit.IO.Error', '{}', '{}', 1)");
  }
  EXPECT_EQ(make().value.range->totals.errors, 4);
}

}  // namespace
}  // namespace tarn::report
