// SPDX-License-Identifier: Apache-2.0
// What is asked for again, though it was acknowledged.
#include "fleet/format/Again.h"

#include <gtest/gtest.h>

#include <limits>

#include "tests/fleet/ExporterFixture.h"

namespace tarn::fleet {
namespace {

using Ranges = std::vector<recorder::IdRange>;

constexpr std::int64_t kGreatest = std::numeric_limits<std::int64_t>::max();

class FleetAgain : public FleetExporter {
 protected:
  void beginWith(std::int64_t events) {
    makeStore();
    addSession({});
    addEvents(events);
    begin();
    runToTheEnd();
  }
  // What was acknowledged is gone, and these are asked for.
  void loseAndAsk(const Ranges& ranges) {
    publisher_.loseMessages();
    publisher_.ask(ranges);
    passBetweenAnswers();
  }
  void passBetweenAnswers() {
    now_ += 11s;
    step();
    runToTheEnd();
  }
  std::vector<std::unique_ptr<v1::Batch>> batches() const {
    std::vector<std::unique_ptr<v1::Batch>> all;
    for (const auto& [id, bytes] : publisher_.messages()) {
      all.push_back(std::move(unpackMessage(bytes).value));
    }
    return all;
  }
};

TEST(FleetAgainMessage, ComesBackAsItWas) {
  const Ranges ranges{{1, 1}, {5, 9}, {kGreatest, kGreatest}};
  EXPECT_EQ(unpackAgain(packAgain(ranges)).value, ranges);
  EXPECT_EQ(againSubject("tarnreporting", "0f"), "tarnreporting-again.0f");
}

TEST(FleetAgainMessage, WhatIsNoneIsRefused) {
  const std::string good = packAgain({{1, 2}});
  EXPECT_TRUE(unpackAgain("").failed());
  EXPECT_TRUE(unpackAgain(good.substr(0, 3)).failed());
  EXPECT_TRUE(unpackAgain("tnf\x01" + good.substr(4)).failed());
  EXPECT_TRUE(unpackAgain(good.substr(0, good.size() - 1)).failed());
  EXPECT_TRUE(unpackAgain(good + std::string(1, '\x07')).failed());
  EXPECT_TRUE(unpackAgain(packAgain({{0, 2}})).failed());
  EXPECT_TRUE(unpackAgain(packAgain({{-4, 2}})).failed());
  EXPECT_TRUE(unpackAgain(packAgain({{3, 2}})).failed());
  EXPECT_EQ(unpackAgain(packAgain(Ranges(kMostRanges, {kGreatest, kGreatest}))).value.size(), kMostRanges);
  EXPECT_TRUE(unpackAgain(packAgain(Ranges(kMostRanges + 1, {1, 1}))).failed());
  EXPECT_TRUE(unpackAgain(good.substr(0, 4) + std::string(1 << 20, 'x')).failed());
}

TEST_F(FleetAgain, ExactlyTheIdsComeOnceMoreWithTheirSession) {
  beginWith(100);
  loseAndAsk({{10, 20}, {40, 40}});
  const Arrived arrived = arrivedAt(publisher_);
  EXPECT_EQ(arrived.events.size(), 12U);
  EXPECT_EQ(*arrived.events.begin(), 10);
  EXPECT_EQ(*arrived.events.rbegin(), 40);
  EXPECT_EQ(arrived.gaps.size(), 0U);
  for (const auto& batch : batches()) {
    EXPECT_EQ(batch->sessions_size(), 1);
    EXPECT_TRUE(batch->last() == 20 || batch->last() == 40);
  }
  EXPECT_EQ(run_->exporter.askedAgain(), 12);
  EXPECT_EQ(run_->exporter.arrived(), 100);
}

TEST_F(FleetAgain, TheyGoUnderANameOfTheirOwnAsTheOldOneMayBeKnown) {
  beginWith(10);
  const std::string before = publisher_.messages().begin()->first;
  publisher_.ask({{1, 10}});
  passBetweenAnswers();
  ASSERT_EQ(publisher_.messages().size(), 2U);
  EXPECT_EQ(publisher_.repeats(), 0);
  EXPECT_EQ(arrivedAt(publisher_).repeated, 10) << "which the records' identity tells";
}

TEST_F(FleetAgain, WhatTheStoreHasNoMoreIsAGapUpToTheEndOfWhatWasAskedFor) {
  beginWith(100);
  sql("DELETE FROM event_rows WHERE id < 20 OR id BETWEEN 25 AND 40");
  loseAndAsk({{1, 30}, {35, 38}});
  const Arrived arrived = arrivedAt(publisher_);
  EXPECT_EQ(arrived.events, (std::set<std::int64_t>{20, 21, 22, 23, 24}));
  EXPECT_EQ(arrived.gaps.size(), 19U + 6U + 4U);
  EXPECT_EQ(*arrived.gaps.rbegin(), 38);
}

TEST_F(FleetAgain, AStoreWithoutAnyOfThemLeavesAGap) {
  beginWith(100);
  sql("DELETE FROM event_rows WHERE id <= 60");
  loseAndAsk({{5, 50}});
  EXPECT_EQ(arrivedAt(publisher_).events.size(), 0U);
  EXPECT_EQ(arrivedAt(publisher_).gaps.size(), 46U);
}

TEST_F(FleetAgain, MoreThanAPageComesInSeveralMessages) {
  beginWith(7000);
  loseAndAsk({{1, 6500}});
  EXPECT_EQ(arrivedAt(publisher_).events.size(), 6500U);
  EXPECT_EQ(arrivedAt(publisher_).repeated, 0);
  EXPECT_EQ(arrivedAt(publisher_).gaps.size(), 0U);
  EXPECT_GE(publisher_.messages().size(), 4U);
}

TEST_F(FleetAgain, WhatDoesNotFitIntoOneMessageIsNotTakenForGone) {
  makeStore();
  addSession({});
  for (int i = 0; i < 50; ++i) {
    addEvent(1, 1795158000, "tally", "sys.oxbow.tarnkit.Volume.Summary",
             R"({"a":")" + std::string(10'000, 'x') + "\"}");
  }
  begin();
  runToTheEnd();
  loseAndAsk({{1, 50}});
  EXPECT_EQ(arrivedAt(publisher_).events.size(), 50U);
  EXPECT_EQ(arrivedAt(publisher_).gaps.size(), 0U);
  EXPECT_EQ(publisher_.messages().size(), 2U);
}

TEST_F(FleetAgain, WhatSeveralAskForComesOnce) {
  beginWith(100);
  publisher_.ask({{40, 60}, {10, 20}});
  publisher_.ask({{15, 45}});
  loseAndAsk({{10, 20}});
  EXPECT_EQ(arrivedAt(publisher_).events.size(), 51U);
  EXPECT_EQ(arrivedAt(publisher_).repeated, 0);
}

TEST_F(FleetAgain, WhatItHasNotReadYetIsLeftToItself) {
  beginWith(100);
  loseAndAsk({{101, 200}, {90, kGreatest}, {kGreatest, kGreatest}});
  EXPECT_EQ(arrivedAt(publisher_).events.size(), 11U);
  EXPECT_EQ(arrivedAt(publisher_).gaps.size(), 0U);
  EXPECT_EQ(run_->exporter.askedAgain(), 11);
  publisher_.loseMessages();
  addEvents(20);
  runToTheEnd();
  EXPECT_EQ(arrivedAt(publisher_).events.size(), 20U);
}

TEST_F(FleetAgain, NewEventsComeMeanwhile) {
  beginWith(9000);
  addEvents(10);
  publisher_.loseMessages();
  publisher_.ask({{1, 9000}});
  now_ += 11s;
  step();
  EXPECT_TRUE(arrivedAt(publisher_).events.contains(9010));
  EXPECT_FALSE(run_->exporter.isAtTheEnd()) << "the rest of what was asked for is to come";
  runToTheEnd();
  EXPECT_EQ(arrivedAt(publisher_).events.size(), 9010U);
}

TEST_F(FleetAgain, TheCursorStandsWhereItStood) {
  beginWith(100);
  publisher_.losesAnswers = 1;
  publisher_.ask({{1, 50}});
  now_ += 11s;
  step();
  EXPECT_EQ(run_->exporter.arrived(), 100);
  publisher_.losesAnswers = 0;
  begin();
  runToTheEnd();
  EXPECT_EQ(run_->exporter.arrived(), 100);
  addEvents(1);
  runToTheEnd();
  EXPECT_EQ(run_->exporter.arrived(), 101);
}

TEST_F(FleetAgain, PeriodsThatWereToldOfAreToldOnceMore) {
  makeStore();
  addSession({});
  sql("INSERT INTO periods VALUES(7, 1, 1795158000, 1795158010, 3, 0, 1, 3)");
  addEvents(3);
  begin();
  runToTheEnd();
  loseAndAsk({{2, 2}});
  ASSERT_EQ(batches().size(), 1U);
  ASSERT_EQ(batches().front()->sessions_size(), 1);
  EXPECT_EQ(batches().front()->sessions(0).periods_size(), 1);
}

TEST_F(FleetAgain, WhenNothingNewComesItSaysOnceHowFarItIs) {
  beginWith(100);
  publisher_.loseMessages();
  for (int second = 0; second < 29; ++second) {
    now_ += 1s;
    step();
  }
  EXPECT_EQ(publisher_.messages().size(), 0U);
  for (int second = 0; second < 100; ++second) {
    now_ += 1s;
    step();
  }
  ASSERT_EQ(publisher_.messages().size(), 1U);
  EXPECT_EQ(publisher_.order().size(), 2U) << "the events and its word, and no repetition";
  EXPECT_EQ(batches().front()->first(), 101);
  EXPECT_EQ(batches().front()->last(), 100);
  EXPECT_EQ(batches().front()->sessions_size(), 0);
}

TEST_F(FleetAgain, WhereNobodyAsksItSaysNothingAndAnswersNothing) {
  publisher_.hasAskers = false;
  beginWith(100);
  loseAndAsk({{1, 100}});
  for (int second = 0; second < 100; ++second) {
    now_ += 1s;
    step();
  }
  EXPECT_EQ(publisher_.messages().size(), 0U);
}

TEST_F(FleetAgain, ItSaysItAnewWhenItIsFurtherAndAfterARestart) {
  beginWith(100);
  const auto beQuiet = [this] {
    for (int second = 0; second < 40; ++second) {
      now_ += 1s;
      step();
    }
    return batches();
  };
  publisher_.loseMessages();
  EXPECT_EQ(beQuiet().size(), 1U);
  addEvents(5);
  runToTheEnd();
  publisher_.loseMessages();
  EXPECT_EQ(beQuiet().front()->last(), 105);
  publisher_.loseMessages();
  begin();
  EXPECT_EQ(beQuiet().front()->last(), 105);
}

TEST_F(FleetAgain, WithoutAnythingInTheStoreThereIsNothingToSay) {
  makeStore();
  begin();
  for (int second = 0; second < 100; ++second) {
    now_ += 1s;
    step();
  }
  EXPECT_EQ(publisher_.messages().size(), 0U);
}

TEST_F(FleetAgain, AnotherStoreInItsPlaceDoesNotAnswerForTheOneBefore) {
  beginWith(100);
  sql("DELETE FROM event_rows");
  sql("DELETE FROM runs");
  sql("INSERT INTO runs VALUES(1, 'another', '0.1.0', 1795250000, NULL, NULL)");
  begin();
  publisher_.loseMessages();
  publisher_.ask({{1, 100}});
  now_ += 11s;
  step();
  EXPECT_EQ(arrivedAt(publisher_).gaps.size(), 0U);
}

}  // namespace
}  // namespace tarn::fleet
