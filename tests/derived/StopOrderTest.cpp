// What happens at a session's stop, in which order, with every line of it: producers derive, their messages go through
// the intake and reach the consumers that still run, and later producers and the summary's counts take them in.
#include "derived/TarnReportingSessionInputMessagesWorker.h"
#include "derived/TarnReportingSessionLagoonMessagesWorker.h"
#include "derived/TarnReportingSessionVolumeMessagesWorker.h"
#include "session/TarnReportingSessionSummaryWorker.h"
#include "session/TarnReportingSessionTallyWorker.h"
#include "tests/session/SessionFixture.h"

namespace tarn {
namespace {

using namespace testing;

class StopOrder : public SessionFixture {
 protected:
  // A session that played in a group at two volumes, recorded, and is about to stop.
  std::shared_ptr<TarnReportingSession> playedSession() {
    useWorkers<TarnReportingSessionVolumeMessagesWorker, TarnReportingSessionLagoonMessagesWorker,
               TarnReportingSessionSummaryWorker, TarnReportingSessionInputMessagesWorker,
               TarnReportingSessionTallyWorker>();
    const auto session = makeSession();
    session->setServiceType(AudioServiceType::Wisp);
    const plist::Dictionary configuration{{"HostApplicationDisplayID", "music"}};
    session->updateConfigurationWithContentsOfConfiguration(&configuration);
    session->start();
    send(*session, {{"session_output_running", true},
                    {"session_input_running", true},
                    {"lagoon_session", 1},
                    {"KvSessionVolume", 0.5}});
    send(*session, {{"KvSessionVolume", 0.75}});
    send(*session, {{"session_output_running", false}, {"session_input_running", false}, {"session_duration", 20.0}});
    return session;
  }
  // Ten seconds after the message before.
  void send(TarnReportingSession& session, plist::Dictionary payload) {
    platform_.advance(std::chrono::seconds(10));
    session.sendMessage(message(std::move(payload), AudioEventCategory::Playback, AudioEventType::State));
  }
};

TEST_F(StopOrder, EveryLineOfAStop) {
  const auto session = playedSession();
  platform_.log.clear();
  session->stop();
  EXPECT_EQ(platform_.log.messages(),
            (std::vector<std::string>{
                "stop called. reporterID=7",
                "ending session. reporterID=7",
                "entering createVolumeMessages createVolumeMessages",
                "playingTime { func=createVolumeMessages, playingTime=10.000000, tarnTimestamp=1750000020, "
                "tarnTimestamp_double=1750000020.000000, startTarnTimestamp=1750000010, "
                "startTarnTimestamp_double=1750000010.000000 }",
                "added volume message { func=createVolumeMessages, action=add, count=1 }",
                "playingTime { func=createVolumeMessages, playingTime=10.000000, tarnTimestamp=1750000030, "
                "tarnTimestamp_double=1750000030.000000, startTarnTimestamp=1750000020, "
                "startTarnTimestamp_double=1750000020.000000 }",
                "added volume message { func=createVolumeMessages, action=add, count=2 }",
                "sending volume event for reporter 7",
                "TarnReportingSessionWorker action=sendMessage reporterID=7 app=music redundant=NO "
                "message={session_selected_format = unknown; mFormatID = unknown; active_devices = unknown; "
                "HostApplicationDisplayID = music; KvSessionVolume = 0.5; KvSessionVolumeBucketed = 0.5; "
                "play_seconds = 10; spatial-audio-accessory-feature = 0; spatializationEnabled = 0; ringerstate = "
                "0; mChannelsPerFrame = -1; play_secondsBucketed = 10; msgidx = 1; msgcnt = 2; invalid_timestamp = "
                "nil; tarnreporting_timestamp = 1750000030; audiotag = VolumeSummary}",
                "TarnReportingSessionWorker action=handleMessage worker=TarnReportingSessionTallyWorker "
                "reporterID=7",
                "TarnReportingSessionWorker action=handleMessage worker=TarnReportingSessionSummaryWorker "
                "reporterID=7",
                "TarnReportingSessionWorker action=sendMessage reporterID=7 app=music redundant=NO "
                "message={session_selected_format = unknown; mFormatID = unknown; active_devices = unknown; "
                "HostApplicationDisplayID = music; KvSessionVolume = 0.75; KvSessionVolumeBucketed = 0.75; "
                "play_seconds = 10; spatial-audio-accessory-feature = 0; spatializationEnabled = 0; ringerstate = "
                "0; mChannelsPerFrame = -1; play_secondsBucketed = 10; msgidx = 2; msgcnt = 2; invalid_timestamp = "
                "nil; tarnreporting_timestamp = 1750000030; audiotag = VolumeSummary}",
                "TarnReportingSessionWorker action=handleMessage worker=TarnReportingSessionTallyWorker "
                "reporterID=7",
                "TarnReportingSessionWorker action=handleMessage worker=TarnReportingSessionSummaryWorker "
                "reporterID=7",
                "TarnReportingSessionWorker action=stop worker=TarnReportingSessionVolumeMessagesWorker "
                "reporterID=7",
                "entering createLagoonMessages createLagoonMessages",
                "playingTime { func=createLagoonMessages, playingTime=20.000000, tarnTimestamp=1750000030, "
                "tarnTimestamp_double=1750000030.000000, startTarnTimestamp=1750000010, "
                "startTarnTimestamp_double=1750000010.000000 }",
                "added lagoon message { func=createLagoonMessages, action=add, count=1 }",
                "sending lagoon event for reporter 7",
                "TarnReportingSessionWorker action=sendMessage reporterID=7 app=music redundant=NO "
                "message={session_selected_format = unknown; active_devices = unknown; mFormatID = unknown; "
                "mChannelsPerFrame = -1; play_seconds = 20; play_secondsBucketed = 30; msgidx = 1; msgcnt = 1; "
                "invalid_timestamp = nil; tarnreporting_timestamp = 1750000030; audiotag = LagoonSummary; "
                "HostApplicationDisplayID = music}",
                "TarnReportingSessionWorker action=handleMessage worker=TarnReportingSessionTallyWorker "
                "reporterID=7",
                "TarnReportingSessionWorker action=stop worker=TarnReportingSessionLagoonMessagesWorker "
                "reporterID=7",
                "TarnReportingSessionWorker action=sendMessage reporterID=7 app=music redundant=NO "
                "message={total_active_time = 20; active_count = 1; overload_count = 0; average_active_time = 20; "
                "num_messages = 6; num_unique_messages = 8; num_redundant_messages = -2; singleMessageSession = 0; "
                "summaryServiceName = wisp; HostApplicationDisplayID = music; thermal_state = Nominal; "
                "low_power_enabled = 0; vmInfo_phys_footprint_MiB = 8; load_avg_1_min = 0; load_avg_5_min = 0; "
                "load_avg_15_min = 0; invalid_timestamp = nil; tarnreporting_timestamp = 1750000030; audiotag = "
                "Session_GenericSummary}",
                "TarnReportingSessionWorker action=handleMessage worker=TarnReportingSessionTallyWorker "
                "reporterID=7",
                "TarnReportingSessionWorker action=handleMessage worker=TarnReportingSessionSummaryWorker "
                "reporterID=7",
                "TarnReportingSessionWorker action=stop worker=TarnReportingSessionSummaryWorker reporterID=7",
                "entering createInputMessages createInputMessages",
                "runningTime { func=createInputMessages, runningTime=20.000000, tarnTimestamp=1750000030, "
                "tarnTimestamp_double=1750000030.000000, startTarnTimestamp=1750000010, "
                "startTarnTimestamp_double=1750000010.000000 }",
                "added input message { func=createInputMessages, action=add, count=1 }",
                "returning input messages { func=createInputMessages, action=return, count=1 }",
                "sending input summary event for reporter 7",
                "TarnReportingSessionWorker action=sendMessage reporterID=7 app=music redundant=NO "
                "message={HostApplicationDisplayID = music; inputrunning_seconds = 20; "
                "inputrunning_secondsBucketed = 30; msgidx = 1; vp_config_operation_mode = unknown; "
                "vp_config_input_port = unknown; active_devices = unknown; msgcnt = 1; invalid_timestamp = nil; "
                "tarnreporting_timestamp = 1750000030; audiotag = InputSummary}",
                "TarnReportingSessionWorker action=handleMessage worker=TarnReportingSessionTallyWorker "
                "reporterID=7",
                "TarnReportingSessionWorker action=stop worker=TarnReportingSessionInputMessagesWorker reporterID=7",
                "TarnReportingSessionWorker action=stop worker=TarnReportingSessionTallyWorker reporterID=7"}));
}

TEST_F(StopOrder, EveryEventOfAStop) {
  const auto session = playedSession();
  platform_.tally.clear();
  session->stop();
  EXPECT_EQ(platform_.tally.sentNames(),
            (std::vector<std::string>{
                "sys.oxbow.tarnkit.Volume.Summary", "sys.oxbow.wisp.Volume.Summary", "sys.oxbow.tarnkit.Volume.Summary",
                "sys.oxbow.wisp.Volume.Summary", "sys.oxbow.tarnkit.Lagoon.Summary", "sys.oxbow.wisp.Lagoon.Summary",
                "sys.oxbow.tarnkit.Session_Generic.Summary", "sys.oxbow.wisp.Session_Generic.Summary",
                "sys.oxbow.tarnkit.Input.Summary", "sys.oxbow.wisp.Input.Summary"}));
}

TEST_F(StopOrder, SummaryCountsWhatWasDerivedBeforeIt) {
  const auto session = playedSession();
  session->stop();
  const auto summaries = platform_.tally.payloads("sys.oxbow.tarnkit.Session_Generic.Summary");
  ASSERT_EQ(summaries.size(), 1U);
  EXPECT_EQ(summaries[0].get("num_messages").asInt64(), 6);         // three of the client, two volumes, one Lagoon
  EXPECT_EQ(summaries[0].get("num_unique_messages").asInt64(), 8);  // and the markers of start and stop
  EXPECT_EQ(summaries[0].get("active_count").asInt64(), 1);
}

}  // namespace
}  // namespace tarn
