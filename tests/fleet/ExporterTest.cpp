// SPDX-License-Identifier: Apache-2.0
#include "tests/fleet/ExporterFixture.h"

#include <random>

#include "tests/support/Seeds.h"

namespace tarn::fleet {
namespace {

TEST_F(FleetExporter, WithoutAStoreItWaitsForOne) {
  begin();
  step();
  EXPECT_TRUE(run_->exporter.isAtTheEnd());
  makeStore();
  addSession({});
  addEvents(10);
  runToTheEnd();
  EXPECT_EQ(arrivedAt(publisher_).events.size(), 10U);
}

TEST_F(FleetExporter, GoesOnWhereItWasAfterARestart) {
  makeStore();
  addSession({});
  addEvents(5000);
  begin();
  runToTheEnd();
  EXPECT_EQ(run_->exporter.arrived(), 5000);
  addEvents(10);
  const std::size_t before = publisher_.messages().size();
  begin();
  EXPECT_EQ(run_->remark, "");
  runToTheEnd();
  EXPECT_EQ(publisher_.messages().size(), before + 1);
  EXPECT_EQ(arrivedAt(publisher_).events.size(), 5010U);
  EXPECT_EQ(arrivedAt(publisher_).repeated, 0);
}

TEST_F(FleetExporter, TheRecorderIsToldWhatHasArrivedAndThatSomebodyCarriesAway) {
  makeStore();
  addSession({});
  addEvents(100);
  publisher_.losesAnswers = 1;
  begin();
  EXPECT_EQ(told(), "0\n") << "before anything is read";
  step();
  EXPECT_EQ(told(), "0\n") << "sent, and not acknowledged";
  publisher_.losesAnswers = 0;
  runToTheEnd();
  EXPECT_EQ(told(), "100\n");
  addEvents(11);
  begin();
  EXPECT_EQ(told(), "100\n");
  runToTheEnd();
  EXPECT_EQ(told(), "111\n");
}

TEST_F(FleetExporter, TheCursorStaysWhileNothingIsAcknowledged) {
  makeStore();
  addSession({});
  addEvents(100);
  publisher_.losesAnswers = 1;
  begin();
  step();
  step();
  EXPECT_EQ(run_->exporter.arrived(), 0);
  begin();
  publisher_.losesAnswers = 0;
  runToTheEnd();
  // The same message, made again: the stream knows it.
  EXPECT_EQ(publisher_.messages().size(), 1U);
  EXPECT_GT(publisher_.repeats(), 0);
  EXPECT_EQ(run_->exporter.arrived(), 100);
}

TEST_F(FleetExporter, ADamagedCursorSendsAgainWhatIsKnownByItsIdentity) {
  makeStore();
  addSession({});
  addEvents(100);
  begin();
  runToTheEnd();
  std::filesystem::resize_file(directory() / "cursor", 20);
  begin();
  EXPECT_NE(run_->remark, "");
  runToTheEnd();
  EXPECT_EQ(arrivedAt(publisher_).events.size(), 100U);
  EXPECT_EQ(publisher_.messages().size(), 1U);
}

TEST_F(FleetExporter, AnotherStoreInItsPlaceIsReadFromItsBeginning) {
  makeStore();
  addSession({});
  addEvents(100);
  begin();
  runToTheEnd();
  sql("DELETE FROM event_rows WHERE id > 50; UPDATE runs SET boot = 'another'");
  begin();
  runToTheEnd();
  EXPECT_EQ(run_->exporter.arrived(), 50);
}

TEST_F(FleetExporter, TheEndOfASessionIsToldThoughNothingMoreCameOfIt) {
  makeStore();
  addSession({});
  addEvents(10);
  begin();
  runToTheEnd();
  EXPECT_TRUE(arrivedAt(publisher_).ended.empty());
  sql("UPDATE sessions SET ended = 1795158100, end_reason = 'destroyed'");
  begin();  // another run of the program knows of it too
  now_ += 20s;
  runToTheEnd();
  EXPECT_EQ(arrivedAt(publisher_).ended, std::set<std::int64_t>{1});
  const std::size_t messages = publisher_.messages().size();
  now_ += 20s;
  runToTheEnd();
  EXPECT_EQ(publisher_.messages().size(), messages);
}

TEST_F(FleetExporter, WhatWentBeforeItLeftIsAGapExactly) {
  makeStore();
  addSession({});
  addEvents(1000);
  publisher_.setDown(true);
  begin();
  step();
  // The device's cap: the oldest go, also some of those in the window.
  sql("DELETE FROM event_rows WHERE id <= 700");
  begin();
  publisher_.setDown(false);
  runToTheEnd();
  const Arrived all = arrivedAt(publisher_);
  EXPECT_EQ(all.events.size(), 300U);
  EXPECT_EQ(all.gaps.size(), 700U);
  EXPECT_EQ(*all.gaps.rbegin(), 700);
}

TEST_F(FleetExporter, RefusalsLostAnswersReorderingAndKillsLeaveNothingMissingAndNothingThatCannotBeToldApart) {
  makeStore();
  addSession({});
  for (const std::uint64_t seed : testing::testSeeds(5)) {
    SCOPED_TRACE(testing::seedNote(seed));
    std::mt19937_64 random(seed);
    std::filesystem::remove(directory() / "cursor");
    publisher_ = FakePublisher(seed);
    publisher_.refuses = 0.3;
    publisher_.losesAnswers = 0.1;
    publisher_.reorders = true;
    begin(seed);
    for (int i = 0; i < 300; ++i) {
      if (random() % 3 == 0) {
        addEvents(static_cast<std::int64_t>(random() % 300));
      }
      if (random() % 20 == 0) {
        publisher_.forgetOutcomes();
        begin(seed + static_cast<std::uint64_t>(i));  // killed, and started again
      }
      step();
    }
    runToTheEnd();
    const Arrived all = arrivedAt(publisher_);
    EXPECT_EQ(all.events.size(), static_cast<std::size_t>(lastEvent()));
    EXPECT_EQ(run_->exporter.arrived(), lastEvent());
    EXPECT_TRUE(all.gaps.empty());
  }
}

}  // namespace
}  // namespace tarn::fleet
