// SPDX-License-Identifier: Apache-2.0
// The views by which people read the store, on a stream as the service hands it over.
#include "recorder/RecorderSessionRecords.h"
#include "tests/recorder/RecorderFixture.h"

namespace tarn::recorder {
namespace {

using platform::SessionNumber;
using Rows = std::vector<std::string>;

thread_local SessionNumber worksFor = 0;

SessionNumber current() noexcept {
  return worksFor;
}

class StoreViews : public RecorderFixture {
 protected:
  StoreViews() { options_.sessionOf = current; }
  ~StoreViews() override { worksFor = 0; }

  // As the analytics worker and the mirror hand a message over.
  void message(const std::string& kind, const Dictionary& payload) {
    recorder_->record("tally", "sys.oxbow.tarnkit." + kind, payload, {}, 5);
    recorder_->record("tally", "sys.oxbow.music." + kind, payload, {}, 5);
    recorder_->record("rtc", "sendMessage", payload, {{"session", 1}, {"category", 1}, {"type", 1}}, 5);
  }
  Rows rows(const std::string& columns, const std::string& view) {
    EXPECT_TRUE(flush());
    return ask(file(), "SELECT " + columns + " FROM " + view);
  }
};

TEST_F(StoreViews, MessagesAreThereOnceWithTheirCommonKeys) {
  start();
  worksFor = 7;
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
  worksFor = 7;
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

TEST_F(StoreViews, EventsBySessionAndByNameAreTheEvents) {
  start();
  for (int i = 0; i < 2000; ++i) {
    worksFor = i % 3;
    record("event" + std::to_string(i % 5), {{"n", i}});
    if (i % 250 == 0) {
      ASSERT_TRUE(flush());
    }
    if (i == 1000) {  // spans and kinds begin anew
      stop();
      start();
    }
  }
  worksFor = 0;
  const std::string ofSession = " WHERE session = 2 ORDER BY id";
  EXPECT_EQ(rows("*", "v_events_by_session" + ofSession), rows("*", "events" + ofSession));
  EXPECT_EQ(rows("count(*)", "v_events_by_session"), rows("count(session)", "events"));
  const std::string ofName = " WHERE name = 'event3' ORDER BY id";
  EXPECT_EQ(rows("*", "v_events_by_name" + ofName), rows("*", "events" + ofName));
  EXPECT_EQ(rows("count(*)", "v_events_by_name"), Rows{"2000"});
}

}  // namespace
}  // namespace tarn::recorder
