// SPDX-License-Identifier: Apache-2.0
// How events share their texts, and that nobody sees it.
#include "recorder/store/rows/EventTable.h"

#include "recorder/store/StoreReport.h"
#include "recorder/store/reading/EventReader.h"
#include "tests/recorder/RecorderFixture.h"

namespace tarn::recorder {
namespace {

using Rows = std::vector<std::string>;

class EventTableTest : public RecorderFixture {
 protected:
  void recordAs(std::string_view backend, const std::string& name, const Dictionary& payload,
                const Dictionary& detail = {}) {
    recorder_->record(backend, name, payload, detail, clock_.epochSeconds());
  }
  void mirror(const Dictionary& payload) { recordAs("rtc", "sendMessage", payload, {{"session", 1}}); }
  // Both events of a message.
  void recordMessage(const Dictionary& payload) {
    recordAs("tally", "sys.oxbow.tarnkit.Playback.Start", payload);
    recordAs("tally", "sys.oxbow.generic.Playback.Start", payload);
  }
  std::string payloads() { return askOne(file(), "SELECT count(*) FROM event_texts WHERE name IS NULL"); }
  std::string kinds() { return askOne(file(), "SELECT count(*) FROM event_texts WHERE name IS NOT NULL"); }
  void expectWhole(std::int64_t events) {
    const auto report = inspectStore(file());
    ASSERT_TRUE(report.ok()) << report.error.text();
    EXPECT_TRUE(report.value.isWhole()) << report.value.damage;
    EXPECT_EQ(report.value.whole, events);
  }
};

TEST_F(EventTableTest, BothEventsOfAMessageShareItsPayload) {
  start();
  recordMessage({{"n", 1}});
  recordMessage({{"n", 1}});
  ASSERT_TRUE(flush());
  EXPECT_EQ(payloads(), "2") << "of two messages";
  EXPECT_EQ(ask(file(), "SELECT DISTINCT payload FROM events"), Rows{R"({"n":1})"});
  expectWhole(4);
}

TEST_F(EventTableTest, AMirrorsPayloadIsTheMessagesWithoutItsStamp) {
  const Rows payloadTexts = {R"({"n":1,"text":"größer"})", R"({"text":"ü","n":2})", R"({"text":"ü","n":3})"};
  const Dictionary messages[] = {{{"tarnreporting_timestamp", 1750000000.5}, {"n", 1}, {"text", "größer"}},
                                 {{"text", "ü"}, {"tarnreporting_timestamp", 1e-7}, {"n", 2}},
                                 {{"text", "ü"}, {"n", 3}, {"tarnreporting_timestamp", -5}}};
  start();
  mirror({{"first", true}});  // from the first mirror on they are looked for
  for (const Dictionary& message : messages) {
    recordMessage(message);
  }
  for (Dictionary message : messages) {
    message.remove(plist::Key("tarnreporting_timestamp"));
    mirror(message);
  }
  ASSERT_TRUE(flush());
  EXPECT_EQ(payloads(), "4");
  EXPECT_EQ(ask(file(), "SELECT payload FROM events WHERE backend = 'rtc' AND id > 1 ORDER BY id"), payloadTexts);
  expectWhole(10);
}

TEST_F(EventTableTest, AMirrorsPayloadThatKeepsItsStampIsShared) {
  const Dictionary message{{"tarnreporting_timestamp", 5}, {"n", 1}};
  start();
  mirror({{"first", true}});
  recordMessage(message);
  mirror(Dictionary{{"tarnreporting_timestamp", 5}, {"n", 1}});
  mirror(Dictionary{{"tarnreporting_timestamp", 6}, {"n", 1}});
  ASSERT_TRUE(flush());
  EXPECT_EQ(payloads(), "3");
  EXPECT_EQ(ask(file(), "SELECT payload FROM events WHERE id > 3 ORDER BY id"),
            (Rows{R"({"tarnreporting_timestamp":5,"n":1})", R"({"tarnreporting_timestamp":6,"n":1})"}));
}

TEST_F(EventTableTest, AStampInsideAnotherTextIsNotCutOut) {
  const Dictionary message{{"text", R"("tarnreporting_timestamp":5,)"}, {"n", 1}};
  const Dictionary nested{{"in", Dictionary{{"tarnreporting_timestamp", 5}, {"n", 1}}}};
  start();
  mirror({{"first", true}});
  recordMessage(message);
  mirror({{"text", ""}, {"n", 1}});
  recordMessage(nested);
  mirror({{"in", Dictionary{{"n", 1}}}});
  ASSERT_TRUE(flush());
  EXPECT_EQ(ask(file(), "SELECT payload FROM events WHERE backend = 'rtc' AND id > 1 ORDER BY id"),
            (Rows{R"({"text":"","n":1})", R"({"in":{"n":1}})"}));
  expectWhole(7);
}

TEST_F(EventTableTest, AnEventAfterAMirrorThatSharesItsPayloadHasTheMirrors) {
  Dictionary copy{{"tarnreporting_timestamp", 5}, {"n", 1}};
  start();
  mirror({{"first", true}});
  recordMessage(copy);
  copy.remove(plist::Key("tarnreporting_timestamp"));
  mirror(copy);
  recordAs("gyre", "requestGyre", copy);
  ASSERT_TRUE(flush());
  EXPECT_EQ(askOne(file(), "SELECT payload FROM events WHERE backend = 'gyre'"), R"({"n":1})");
}

TEST_F(EventTableTest, AnEmptyPayloadStandsNowhere) {
  start();
  recordAs("rtc", "flush", {});
  ASSERT_TRUE(flush());
  EXPECT_EQ(payloads(), "0");
  EXPECT_EQ(askOne(file(), "SELECT payload FROM events"), "{}");
}

TEST_F(EventTableTest, AKindIsWrittenAnewWhenItIsFarBack) {
  start();
  for (std::int64_t i = 0; i < EventTable::kReach; ++i) {
    recordAs("tally", "name", {});
  }
  ASSERT_TRUE(flush());
  EXPECT_EQ(kinds(), "1");
  recordAs("tally", "name", {});
  ASSERT_TRUE(flush());
  EXPECT_EQ(kinds(), "2");
  expectWhole(EventTable::kReach + 1);
}

TEST_F(EventTableTest, BackEndNameAndDetailMakeAKind) {
  start();
  recordAs("tally", "name", {});
  recordAs("wattlog", "name", {});
  recordAs("tally", "other", {});
  recordAs("tally", "name", {}, {{"a", 1}});
  recordAs("tally", "name", {});
  ASSERT_TRUE(flush());
  EXPECT_EQ(kinds(), "4");
  EXPECT_EQ(ask(file(), "SELECT backend, name, detail FROM events ORDER BY id"),
            (Rows{"tally|name|{}", "wattlog|name|{}", "tally|other|{}", R"(tally|name|{"a":1})", "tally|name|{}"}));
}

TEST_F(EventTableTest, WhatIsRemovedTakesTheTextsThatNobodyElseHas) {
  options_.maxAgeDays = 1;
  options_.maintenanceInterval = std::chrono::milliseconds(1);
  start();
  mirror({{"first", true}});
  const Dictionary message{{"tarnreporting_timestamp", 5}, {"n", 1}};
  recordMessage(message);
  recordAs("tally", "goes", {{"goes", true}});
  ASSERT_TRUE(flush());
  clock_.advance(std::chrono::hours(20));
  mirror({{"n", 1}});
  ASSERT_TRUE(flush());
  clock_.advance(std::chrono::hours(10));
  ASSERT_TRUE(eventually([&] { return askOne(file(), "SELECT count(*) FROM events") == "1"; }));
  EXPECT_EQ(ask(file(), "SELECT id, payload, detail FROM events"), Rows{R"(5|{"n":1}|{"session":1})"});
  EXPECT_EQ(payloads(), "1") << "that of the message, which the mirror shares";
  EXPECT_EQ(kinds(), "1");
  expectWhole(1);
  clock_.advance(std::chrono::hours(20));
  ASSERT_TRUE(eventually([&] { return askOne(file(), "SELECT count(*) FROM events") == "0"; }));
  EXPECT_EQ(askOne(file(), "SELECT count(*) FROM event_texts"), "0");
}

TEST_F(EventTableTest, TimesOfABlockAreKnownWhenItIsFull) {
  start();
  for (int i = 0; i < 1500; ++i) {
    clock_.setEpochSeconds(1750000000.0 + (i == 700 ? -100 : i));
    record("event");
  }
  ASSERT_TRUE(flush());
  EXPECT_EQ(ask(file(), "SELECT * FROM event_times"), Rows{"0|1749999900.0|1750001022.0"});
  stop();
  start();
  clock_.setEpochSeconds(1750009000.0);
  for (int i = 0; i < 1000; ++i) {
    record("event");
  }
  ASSERT_TRUE(flush());
  EXPECT_EQ(ask(file(), "SELECT * FROM event_times WHERE block = 1"), Rows{"1|1750001023.0|1750009000.0"})
      << "of both runs";
}

}  // namespace
}  // namespace tarn::recorder
