// SPDX-License-Identifier: Apache-2.0
// The views by which people read the store, on a stream as the service hands it over.
#include <algorithm>

#include "recorder/store/StoreReport.h"
#include "recorder/store/StoreViews.h"
#include "tests/recorder/store/RecordsFixture.h"

namespace tarn::recorder {
namespace {

using Rows = std::vector<std::string>;

class StoreViews : public RecordsFixture {
 protected:
  // As the analytics worker and the mirror hand a message over.
  void message(const std::string& kind, const Dictionary& payload) {
    recorder_->record("tally", "sys.oxbow.tarnkit." + kind, payload, {}, 5);
    recorder_->record("tally", "sys.oxbow.music." + kind, payload, {}, 5);
    recorder_->record("rtc", "sendMessage", payload, {{"session", 1}, {"category", 1}, {"type", 1}}, 5);
  }
  Rows rows(const std::string& columns, const std::string& view) {
    EXPECT_TRUE(!recorder_ || flush());
    return ask(file(), "SELECT " + columns + " FROM " + view);
  }
};

TEST_F(StoreViews, MessagesAreThereOnceWithTheirCommonKeys) {
  start();
  workFor(7);
  message("Playback.Start", {{"audiotag", "PlaybackStart"},
                             {"HostApplicationDisplayID", "org.example.music"},
                             {"tarnreporting_timestamp", 1750000000.5},
                             {"session_output_running", true},
                             {"KvSessionVolume", 0.5},
                             {"active_devices", "Speaker"},
                             {"other", 1}});
  recorder_->record("tally", "sys.oxbow.tarnkit.tarnreportingclientuptime", {{"seconds", 5}}, {}, 6);
  EXPECT_EQ(rows("id, time, session, audiotag, application, happened, output_running, input_running, volume, devices",
                 "v_messages"),
            Rows{"1|5.0|7|PlaybackStart|org.example.music|1750000000.5|1|NULL|0.5|Speaker"});
  EXPECT_EQ(rows("payload ->> 'other'", "v_messages"), Rows{"1"});
}

TEST_F(StoreViews, DerivedMessagesHaveViewsOfTheirOwn) {
  start();
  workFor(7);
  message("Volume.Summary", {{"audiotag", "VolumeSummary"},
                             {"play_seconds", 20},
                             {"KvSessionVolume", 0.5},
                             {"spatial-audio-accessory-feature", false},
                             {"msgidx", 1},
                             {"msgcnt", 2}});
  message("Input.Summary", {{"audiotag", "InputSummary"}, {"inputrunning_seconds", 60}, {"vocoders", "opus:48000.0"}});
  message("Lagoon.Summary", {{"audiotag", "LagoonSummary"}, {"play_seconds", 100}, {"mChannelsPerFrame", 2}});
  message("Session_Generic.Summary",
          {{"audiotag", "Session_GenericSummary"}, {"overload_count", 3}, {"summaryServiceName", "music"}});
  EXPECT_EQ(rows("id, session, play_seconds, volume, spatial_accessory, msgidx, msgcnt", "v_volume"),
            Rows{"1|7|20|0.5|0|1|2"});
  EXPECT_EQ(rows("id, session, input_seconds, vocoders", "v_input"), Rows{"4|7|60|opus:48000.0"});
  EXPECT_EQ(rows("id, session, play_seconds, channels", "v_group"), Rows{"7|7|100|2"});
  EXPECT_EQ(rows("id, session, overload_count, service_name", "v_summaries"), Rows{"10|7|3|music"});
}

TEST_F(StoreViews, IssuesAreMessagesThatTellOfOne) {
  start();
  message("Playback.IssueDetector", {{"audiotag", "PlaybackIssueDetector"},
                                     {"issue_type", "Silence"},
                                     {"node", "Out"},
                                     {"any_channel_silence_seconds", 4}});
  message("Playback.Start", {{"audiotag", "PlaybackStart"}, {"note", R"("issue_type":)"}});
  EXPECT_EQ(rows("id, session, audiotag, issue_type, node, silence_seconds", "v_issues"),
            Rows{"1|NULL|PlaybackIssueDetector|Silence|Out|4"});
}

TEST_F(StoreViews, DriverCountersAreOneRowAChannel) {
  start();
  message("Flume.Simple", {{"audiotag", "FlumeSimple"}, {"Amp_Simple_hits", 3}, {"Amp_Haptics_Simple_drops", 1}});
  message("Flume.State", {{"audiotag", "FlumeState"}, {"Amp_State_power", "name:on"}});
  EXPECT_EQ(
      rows("id, kind, channel, value", "v_drivers ORDER BY id, channel"),
      (Rows{"1|simple|Amp_Haptics_Simple_drops|1", "1|simple|Amp_Simple_hits|3", "4|state|Amp_State_power|name:on"}));
}

class StoreOfManySessions : public StoreViews {
 protected:
  // Events of three sessions and of nobody by turns, in many commits and two runs, so that spans and kinds begin anew.
  void fill() {
    start();
    for (int i = 0; i < 2000; ++i) {
      workFor(i % 4);
      record("event" + std::to_string(i % 5), {{"n", i}});
      if (i % 250 == 0) {
        ASSERT_TRUE(flush());
      }
      if (i == 1000) {
        stop();
        start();
      }
    }
    workFor(0);
    ASSERT_TRUE(flush());
  }
  // As its rows alone tell it.
  Rows fromRows(const std::string& where) {
    return ask(file(), "SELECT * FROM (" + std::string(kSelectEvents) + ") " + where + " ORDER BY id");
  }
  // Whether no table is gone through as a whole.
  bool isLookedUp(const std::string& question) {
    const Rows plan = ask(file(), "EXPLAIN QUERY PLAN " + question);
    EXPECT_FALSE(plan.empty());
    return std::none_of(plan.begin(), plan.end(),
                        [](const std::string& step) { return step.find("SCAN") != std::string::npos; });
  }
};

TEST_F(StoreOfManySessions, EventsAreTheRowsHoweverTheyAreAskedFor) {
  fill();
  EXPECT_EQ(rows("count(*), count(session), min(id), max(id)", "events"), Rows{"2000|1500|1|2000"});
  for (const char* const where :
       {"WHERE 1", "WHERE session = 2", "WHERE session = 9", "WHERE session IS NULL", "WHERE session BETWEEN 1 AND 2",
        "WHERE session IN (1, 3)", "WHERE name = 'event3'", "WHERE name GLOB 'event[12]'", "WHERE name = 'none'",
        "WHERE session = 3 AND name = 'event3'", "WHERE session = 1 AND id > 1200 AND id <= 1300",
        "WHERE name = 'event0' AND id > 1900", "WHERE id = 700"}) {
    EXPECT_EQ(rows("*", "events " + std::string(where) + " ORDER BY id"), fromRows(where)) << where;
  }
}

TEST_F(StoreOfManySessions, SessionsAndNamesAreLookedUp) {
  fill();
  for (const char* const question :
       {"SELECT * FROM events WHERE session = 2", "SELECT * FROM events WHERE session = 2 ORDER BY id",
        "SELECT name, count(*) FROM events WHERE session = 2 GROUP BY name",
        "SELECT * FROM events WHERE name = 'event3'", "SELECT * FROM events WHERE name = 'event3' ORDER BY id",
        "SELECT * FROM events WHERE session = 2 AND name = 'event3' ORDER BY id DESC LIMIT 1",
        "SELECT * FROM v_messages WHERE session = 2", "SELECT * FROM events WHERE id > 5 ORDER BY id LIMIT 10"}) {
    EXPECT_TRUE(isLookedUp(question)) << question;
  }
  EXPECT_FALSE(isLookedUp("SELECT * FROM events WHERE time > 5")) << "that is gone through";
}

TEST_F(StoreOfManySessions, SpansThatBeganAnywhereAreBroughtInOrder) {
  fill();
  stop();
  const Rows before = fromRows("WHERE session = 2");
  change(file(),
         "UPDATE session_spans SET first = first + 3; ALTER TABLE runs DROP COLUMN machine; PRAGMA user_version = 1");
  EXPECT_NE(rows("*", "events WHERE session = 2 ORDER BY id"), before);
  start().waitUntilOpened();
  EXPECT_EQ(rows("*", "events WHERE session = 2 ORDER BY id"), before);
  EXPECT_EQ(errors(), 0U);
}

TEST_F(StoreOfManySessions, ALostSpanIsTold) {
  fill();
  stop();
  EXPECT_TRUE(inspectStore(file()).value.isWhole());
  change(file(), "DELETE FROM session_spans WHERE session = 2 AND first = 512");
  EXPECT_EQ(inspectStore(file()).value.damage, "damaged: the spans of its session don't lead to event 515");
  EXPECT_TRUE(inspectStore(file()).value.lost.empty());
  options_.verifyInterval = options_.verifyRest = std::chrono::milliseconds(1);
  start();
  ASSERT_TRUE(eventually([&] { return log_.count("got 2000 events from recorder.sqlite3.damaged-") == 1; }));
  ASSERT_TRUE(flush());
  stop();
  EXPECT_EQ(rows("count(*)", "events WHERE session = 2"), Rows{"500"});
  EXPECT_TRUE(inspectStore(file()).value.isWhole());
}

}  // namespace
}  // namespace tarn::recorder
