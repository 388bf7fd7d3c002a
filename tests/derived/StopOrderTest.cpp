// SPDX-License-Identifier: Apache-2.0
// What happens at a session's stop, in which order, with every line of it: producers derive, their messages go through
// the intake and reach the consumers that still run, later producers and the summary's counts take them in, and the
// file shows all of it.
#include <sstream>

#include "derived/TarnReportingSessionInputMessagesWorker.h"
#include "derived/TarnReportingSessionLagoonMessagesWorker.h"
#include "derived/TarnReportingSessionSummaryJsonFileWorker.h"
#include "derived/TarnReportingSessionSystemMonitorWorker.h"
#include "derived/TarnReportingSessionVolumeMessagesWorker.h"
#include "derived/TarnReportingSystemMonitor.h"
#include "service/vocabulary/TarnReportingUtility.h"
#include "session/TarnReportingSessionSummaryWorker.h"
#include "session/TarnReportingSessionTallyWorker.h"
#include "tests/derived/SummaryJsonFileFixture.h"

namespace tarn {
namespace {

using namespace testing;

class StopOrder : public SummaryJsonFileFixture {
 protected:
  // A session that played in a group at two volumes, recorded, heard the ringer switched off, and is about to stop. It
  // has every worker that derives or shows messages, in the order in which the service makes them.
  std::shared_ptr<TarnReportingSession> playedSession() {
    platform_.clock.setEpochSeconds(1750000000);
    platform_.localCalendar.setSecondsEastOfUtc(7200);
    useWorkers<TarnReportingSessionVolumeMessagesWorker, TarnReportingSessionLagoonMessagesWorker,
               TarnReportingSessionSummaryWorker, TarnReportingSessionInputMessagesWorker,
               TarnReportingSessionTallyWorker, TarnReportingSessionSystemMonitorWorker,
               TarnReportingSessionSummaryJsonFileWorker>();
    TarnReportingSystemMonitor::initializeWithQueue(TarnReportingUtilityGetReportingServerQueue());
    changeRinger(1);
    const auto session = makeSession();
    session->setServiceType(AudioServiceType::Test);
    configure(*session, "music");
    session->start();
    send(*session, {{"session_output_running", true},
                    {"session_input_running", true},
                    {"lagoon_session", 1},
                    {"KvSessionVolume", 0.5}});
    send(*session, {{"KvSessionVolume", 0.75}});
    send(*session, {{"session_output_running", false}, {"session_input_running", false}, {"session_duration", 20.0}});
    changeRinger(0);
    return session;
  }
  // Ten seconds after the message before.
  void send(TarnReportingSession& session, plist::Dictionary payload) {
    platform_.advance(std::chrono::seconds(10));
    session.sendMessage(message(std::move(payload), AudioEventCategory::Playback, AudioEventType::State));
  }
  void changeRinger(std::uint64_t state) {
    ASSERT_TRUE(platform_.notifications.post("sys.oxbow.homeshell.ringerstate", state));
    platform_.runUntilIdle();
  }
};

// The lines of a golden file.
std::vector<std::string> linesOf(const std::string& content) {
  std::vector<std::string> lines;
  std::istringstream stream(content);
  for (std::string line; std::getline(stream, line);) {
    lines.push_back(line);
  }
  return lines;
}

TEST_F(StopOrder, EveryLineOfAStop) {
  const auto session = playedSession();
  platform_.log.clear();
  session->stop();
  EXPECT_EQ(platform_.log.messages(), linesOf(golden("whole_stop.log")));
}

TEST_F(StopOrder, EveryEventOfAStop) {
  const auto session = playedSession();
  platform_.tally.clear();
  session->stop();
  EXPECT_EQ(platform_.tally.sentNames(),
            (std::vector<std::string>{
                "sys.oxbow.tarnkit.Volume.Summary", "sys.oxbow.test.Volume.Summary", "sys.oxbow.tarnkit.Volume.Summary",
                "sys.oxbow.test.Volume.Summary", "sys.oxbow.tarnkit.Lagoon.Summary", "sys.oxbow.test.Lagoon.Summary",
                "sys.oxbow.tarnkit.Session_Generic.Summary", "sys.oxbow.test.Session_Generic.Summary",
                "sys.oxbow.tarnkit.Input.Summary", "sys.oxbow.test.Input.Summary"}));
}

TEST_F(StopOrder, TheFileShowsTheWholeSession) {
  const auto session = playedSession();
  session->stop();
  EXPECT_EQ(platform_.fileSystem.files(), (std::vector<std::string>{pathOf("20250615-170710+0200-7-music-test.json")}));
  EXPECT_EQ(onlyFile(), golden("whole_stop.json"));
}

TEST_F(StopOrder, ASettingThatChangesAfterTheStopReachesNobody) {
  const auto session = playedSession();
  session->stop();
  platform_.tally.clear();
  changeRinger(0);
  EXPECT_TRUE(platform_.tally.sentNames().empty());
}

TEST_F(StopOrder, SummaryCountsWhatWasDerivedBeforeIt) {
  const auto session = playedSession();
  session->stop();
  const auto summaries = platform_.tally.payloads("sys.oxbow.tarnkit.Session_Generic.Summary");
  ASSERT_EQ(summaries.size(), 1U);
  EXPECT_EQ(summaries[0].get("num_messages").asInt64(),
            8);  // three of the client, two settings, two volumes, one Lagoon
  EXPECT_EQ(summaries[0].get("num_unique_messages").asInt64(), 10);  // and the markers of start and stop
  EXPECT_EQ(summaries[0].get("active_count").asInt64(), 1);
}

}  // namespace
}  // namespace tarn
