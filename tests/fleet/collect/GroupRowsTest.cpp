// SPDX-License-Identifier: Apache-2.0
#include "fleet/collect/GroupRows.h"

#include <gtest/gtest.h>

#include <algorithm>

#include "fleet/collect/CollectOptions.h"
#include "fleet/collect/Schema.h"
#include "tests/fleet/Batches.h"
#include "tests/fleet/collect/MadeUpFleet.h"

namespace tarn::fleet {
namespace {

using testing::someBatch;

TEST(FleetGroupRows, WhatIsLeftOutIsWhatIsNeitherAnEventNorInAGap) {
  v1::Batch batch = someBatch();
  EXPECT_EQ(leftOutOf(batch), "{[12,12]}");
  batch.set_last(25);
  EXPECT_EQ(leftOutOf(batch), "{[12,12],[22,25]}");
  batch.mutable_gaps(0)->set_last(18);
  EXPECT_EQ(leftOutOf(batch), "{[12,12],[19,20],[22,25]}");
  batch.clear_events();
  EXPECT_EQ(leftOutOf(batch), "{[11,13],[19,25]}");
  batch.clear_gaps();
  EXPECT_EQ(leftOutOf(batch), "{[11,25]}");
  batch.set_last(10);
  EXPECT_EQ(leftOutOf(batch), "{}");
}

TEST(FleetGroupRows, NothingIsLeftOutBetweenAGapAndItsNeighbours) {
  v1::Batch batch = someBatch();
  batch.mutable_events(0)->set_ahead(0);
  batch.mutable_events(1)->set_ahead(1);
  batch.mutable_gaps(0)->set_first(13);
  EXPECT_EQ(leftOutOf(batch), "{}");
}

TEST(FleetGroupRows, DevicesStandOnceAndInOrder) {
  v1::Batch first = someBatch();
  v1::Batch second = someBatch();
  second.set_device(std::string(kDeviceBytes, 'a'));
  const GroupRows rows({&first, &second, &first});
  EXPECT_EQ(rows.deviceNames(),
            (std::vector<std::string>{"61616161616161616161616161616161", "64646464646464646464646464646464"}));
}

TEST(FleetGroupRows, DaysAreThoseOfUtcOnceAndInOrder) {
  v1::Batch batch = someBatch();
  batch.mutable_events(0)->set_time(1795132800);         // 2026-11-20, its first second
  batch.mutable_events(1)->set_time(1795132799.999999);  // the last of the day before
  batch.mutable_events(2)->set_time(-5);
  const GroupRows rows({&batch, &batch});
  EXPECT_EQ(rows.days(), (std::vector<std::string>{"1970-01-01", "2026-11-19", "2026-11-20"}));
}

TEST(FleetGroupRows, EachRunOfABatchHasARowAndEventsTakeItsKey) {
  v1::Batch first = someBatch();
  v1::Batch second = someBatch();
  *second.add_runs() = second.runs(0);
  second.mutable_sessions(0)->set_run(1);
  GroupRows rows({&first, &second});
  rows.setDevices({{"64646464646464646464646464646464", 3}});
  EXPECT_EQ(rows.runs().rows(), 3);
  // Eight bytes that stand nowhere else: the key of the second batch's second run.
  rows.setRuns({0x1111111111111111, 0x2222222222222222, 0x3333333333333333});
  const std::string events = rows.events().finish();
  const auto timesIn = [&events](char byte) {
    int times = 0;
    for (std::size_t at = events.find(std::string(8, byte)); at != std::string::npos;
         at = events.find(std::string(8, byte), at + 8)) {
      ++times;
    }
    return times;
  };
  EXPECT_EQ(timesIn(0x11), 2);
  EXPECT_EQ(timesIn(0x22), 0);
  EXPECT_EQ(timesIn(0x33), 2);
  EXPECT_EQ(rows.sessions().rows(), 2);
  EXPECT_EQ(rows.gaps().rows(), 2);
  EXPECT_EQ(rows.told().rows(), 2);
}

TEST(FleetGroupRows, ABatchOfSessionsAloneTellsOfNoIds) {
  v1::Batch batch = someBatch();
  batch.clear_events();
  batch.clear_gaps();
  batch.set_last(10);
  GroupRows rows({&batch});
  rows.setDevices({{"64646464646464646464646464646464", 3}});
  rows.setRuns({1});
  EXPECT_EQ(rows.told().rows(), 0);
  EXPECT_EQ(rows.events().rows(), 0);
  EXPECT_EQ(rows.sessions().rows(), 1);
}

TEST(FleetGroupRows, HoursCountWhatWasPlayedAndWhatWentWrongAsMessagesTellIt) {
  v1::Kind kind;
  v1::Event event;
  kind.set_backend("tally");
  kind.set_name("sys.oxbow.tarnkit.Volume.Summary");
  EXPECT_TRUE(isMeasured(kind, event));
  kind.set_name("sys.oxbow.longformaudio.Volume.Summary");
  EXPECT_FALSE(isMeasured(kind, event));
  kind.set_name("sys.oxbow.tarnkit.IO.Error");
  EXPECT_FALSE(isMeasured(kind, event));
  event.set_payload(R"({"issue_type":"overload"})");
  EXPECT_TRUE(isMeasured(kind, event));
  event.set_payload(R"({"issue_type":"silence"})");
  EXPECT_TRUE(isMeasured(kind, event));
  kind.set_backend("rtc");
  EXPECT_FALSE(isMeasured(kind, event));
}

TEST(FleetGroupRows, TheMadeUpFleetSendsWhatAReaderTakesAndTheSameForItsSeed) {
  const testing::MadeUpFleet fleet({3, 500, 60, 0.5, 9, 1795000000});
  const testing::MadeUpFleet again({3, 500, 60, 0.5, 9, 1795000000});
  ASSERT_GT(fleet.messages(), 27U);
  EXPECT_EQ(fleet.truth().made, 1500);
  EXPECT_EQ(fleet.truth().made, fleet.truth().events + fleet.truth().gaps + fleet.truth().leftOut);
  for (std::size_t i = 0; i < fleet.messages(); ++i) {
    EXPECT_EQ(batchFault(fleet.batch(i)), "");
    EXPECT_EQ(fleet.batch(i).SerializeAsString(), again.batch(i).SerializeAsString());
  }
}

TEST(FleetSchema, StepsAreNumberedWithoutGaps) {
  int version = 0;
  for (const SchemaStep& step : schemaSteps()) {
    EXPECT_EQ(step.version, ++version);
    EXPECT_FALSE(step.sql.empty());
  }
  EXPECT_GE(version, 2);
}

TEST(FleetCollectOptions, WhatExcludesEachOtherIsWrongUsage) {
  const auto usageOf = [](std::vector<const char*> arguments) {
    arguments.insert(arguments.begin(), "tarnreporting-collect");
    return parseCollectCommand(static_cast<int>(arguments.size()), arguments.data());
  };
  EXPECT_TRUE(usageOf({}).options.has_value());
  EXPECT_TRUE(usageOf({"--migrate"}).options->migrate);
  EXPECT_EQ(usageOf({"--from", "there"}).options->folder, "there");
  EXPECT_EQ(usageOf({"--migrate", "--keep-layout"}).usage.code(), 64);
  EXPECT_EQ(usageOf({"--migrate", "--from", "there"}).usage.code(), 64);
  EXPECT_EQ(usageOf({"--once", "--from", "there"}).usage.code(), 64);
  EXPECT_EQ(usageOf({"--log-level", "loud"}).usage.code(), 64);
  EXPECT_NE(usageOf({"--help"}).output.find("--migrate"), std::string::npos);
}

TEST(FleetCollectOptions, TheConfigurationSaysWhereAndHowLong) {
  const auto read = parseCollectConfiguration(
      "[server]\nurls = \"nats://a:1,nats://b:2\"\nstream = \"S\"\nconsumer = \"c\"\nanswer_seconds = "
      "7\nagain_seconds = 0\n[database]\nurl = "
      "\"dbname=x\"\ngroup_messages = 8\n[retention]\ndays = 30\n",
      "collect.toml");
  ASSERT_TRUE(read.ok()) << read.error.text();
  EXPECT_EQ(read.value.server.urls, "nats://a:1,nats://b:2");
  EXPECT_EQ(read.value.stream, "S");
  EXPECT_EQ(read.value.consumer, "c");
  EXPECT_EQ(read.value.answerSeconds, 7);
  EXPECT_EQ(read.value.againSeconds, 0);
  EXPECT_EQ(read.value.database, "dbname=x");
  EXPECT_EQ(read.value.groupMessages, 8);
  EXPECT_EQ(read.value.retentionDays, 30);
  EXPECT_EQ(parseCollectConfiguration("[retention]\ndays = -1\n", "collect.toml").error.text(),
            "collect.toml:2: \"retention.days\" must be a whole number from 0 to 36500");
}

}  // namespace
}  // namespace tarn::fleet
