// SPDX-License-Identifier: Apache-2.0
// The volume, input, Lagoon and orientation workers as a session sees them.
#include "derived/TarnReportingSessionInputMessagesWorker.h"
#include "derived/TarnReportingSessionLagoonMessagesWorker.h"
#include "derived/TarnReportingSessionOrientationMessagesWorker.h"
#include "derived/TarnReportingSessionVolumeMessagesWorker.h"
#include "session/TarnReportingSessionTallyWorker.h"
#include "tests/derived/DerivedMessages.h"
#include "tests/session/SessionFixture.h"

namespace tarn {
namespace {

using namespace testing;

class DerivingWorkers : public SessionFixture {
 protected:
  // A session of these workers and the analytics worker, whose messages come one second after the other.
  template <class... Workers>
  std::shared_ptr<TarnReportingSession> startSession() {
    useWorkers<Workers..., TarnReportingSessionTallyWorker>();
    const auto session = makeSession();
    const plist::Dictionary configuration{{"HostApplicationDisplayID", "music"}};
    session->updateConfigurationWithContentsOfConfiguration(&configuration);
    session->start();
    return session;
  }
  void send(TarnReportingSession& session, plist::Dictionary payload) {
    platform_.advance(std::chrono::seconds(1));
    session.sendMessage(unstamped(std::move(payload)));
  }
  std::vector<plist::Dictionary> summaries(const std::string& category) const {
    return platform_.tally.payloads("sys.oxbow.tarnkit." + category + ".Summary");
  }
  // The lines of this level that the module logged.
  std::vector<std::string> lines(LogLevel level, std::string_view module) const {
    std::vector<std::string> messages;
    for (const auto& entry : platform_.log.entries(level)) {
      if (entry.module == module) {
        messages.push_back(entry.message());
      }
    }
    return messages;
  }
};

TEST_F(DerivingWorkers, VolumeWorkerSendsItsMessagesIntoTheSession) {
  const auto session = startSession<TarnReportingSessionVolumeMessagesWorker>();
  send(*session, {{"session_output_running", true}, {"KvSessionVolume", 0.5}});
  send(*session, {{"session_output_running", false}});
  session->stop();
  const auto sent = summaries("Volume");
  ASSERT_EQ(sent.size(), 1U);
  EXPECT_EQ(sent[0].get("play_seconds").asDouble(), 1);
  EXPECT_EQ(sent[0].get("HostApplicationDisplayID").text(), "music");
  EXPECT_EQ(sent[0].get("audiotag").text(), "VolumeSummary");
  EXPECT_EQ(lines(LogLevel::Default, TarnReportingSessionVolumeMessagesWorker::kClassName),
            (std::vector<std::string>{"sending volume event for reporter 7"}));
}

TEST_F(DerivingWorkers, InputWorkerSendsItsMessagesIntoTheSession) {
  const auto session = startSession<TarnReportingSessionInputMessagesWorker>();
  send(*session, {{"session_input_running", true}});
  send(*session, {{"session_input_running", false}});
  session->stop();
  const auto sent = summaries("Input");
  ASSERT_EQ(sent.size(), 1U);
  EXPECT_EQ(sent[0].get("inputrunning_seconds").asDouble(), 1);
  EXPECT_EQ(sent[0].get("HostApplicationDisplayID").text(), "music");
  EXPECT_EQ(sent[0].get("audiotag").text(), "InputSummary");
  EXPECT_EQ(lines(LogLevel::Default, TarnReportingSessionInputMessagesWorker::kClassName),
            (std::vector<std::string>{"sending input summary event for reporter 7"}));
}

TEST_F(DerivingWorkers, LagoonWorkerSendsItsMessagesToTheirDestinationsAlone) {
  const auto session = startSession<TarnReportingSessionLagoonMessagesWorker, ConsumerWorker>();
  send(*session, {{"session_output_running", true}, {"lagoon_session", 1}});
  send(*session, {{"session_output_running", false}, {"session_duration", 1}});
  session->stop();
  const auto sent = summaries("Lagoon");
  ASSERT_EQ(sent.size(), 1U);
  EXPECT_EQ(sent[0].get("play_seconds").asDouble(), 1);
  EXPECT_EQ(script().received.size(), 2U);  // the client's messages
  EXPECT_EQ(lines(LogLevel::Default, TarnReportingSessionLagoonMessagesWorker::kClassName),
            (std::vector<std::string>{"sending lagoon event for reporter 7"}));
}

TEST_F(DerivingWorkers, LagoonMessagesReachEveryoneOnInternalBuilds) {
  platform_.deviceProperties.set("InternalBuild", true);
  const auto session = startSession<TarnReportingSessionLagoonMessagesWorker, ConsumerWorker>();
  send(*session, {{"session_output_running", true}, {"lagoon_session", 1}});
  send(*session, {{"session_output_running", false}, {"session_duration", 1}});
  session->stop();
  EXPECT_EQ(script().received.size(), 3U);
}

TEST_F(DerivingWorkers, OutputStillMarkedRunningAtTheStopCountsFromThePeriodsLastStamp) {
  // The last values say "running, in a group, at that time", so the walk begins there and the end doesn't lie after it.
  const auto session = startSession<TarnReportingSessionLagoonMessagesWorker>();
  send(*session, {{"session_output_running", true}, {"lagoon_session", 1}});
  send(*session, {{"session_duration", 1}});
  session->stop();
  EXPECT_TRUE(summaries("Lagoon").empty());
}

TEST_F(DerivingWorkers, NothingToTellIsNotLoggedAsSent) {
  const auto session = startSession<TarnReportingSessionVolumeMessagesWorker, TarnReportingSessionLagoonMessagesWorker,
                                    TarnReportingSessionInputMessagesWorker>();
  send(*session, {{"anything", 1}});
  session->stop();
  EXPECT_TRUE(platform_.log.entries(LogLevel::Default).empty());
  EXPECT_EQ(platform_.tally.payloads("sys.oxbow.tarnkit.Playback.State").size(), 1U);
  EXPECT_EQ(platform_.tally.events().size(), 2U);
}

TEST_F(DerivingWorkers, EmptyLogIsLeftAtOnce) {
  const auto session = makeSession();
  platform_.log.clear();
  TarnReportingSessionVolumeMessagesWorker::initWithSession(session)->stop();
  TarnReportingSessionInputMessagesWorker::initWithSession(session)->stop();
  TarnReportingSessionLagoonMessagesWorker::initWithSession(session)->stop();
  EXPECT_TRUE(platform_.log.entries().empty());
}

TEST_F(DerivingWorkers, WorkersWithoutTheirSessionDoNothing) {
  auto session = makeSession();
  session->start();
  const auto volume = TarnReportingSessionVolumeMessagesWorker::initWithSession(session);
  const auto input = TarnReportingSessionInputMessagesWorker::initWithSession(session);
  const auto lagoon = TarnReportingSessionLagoonMessagesWorker::initWithSession(session);
  session.reset();
  platform_.log.clear();
  volume->stop();
  input->stop();
  lagoon->stop();
  EXPECT_TRUE(platform_.log.entries().empty());
}

TEST_F(DerivingWorkers, AreProducersAloneAndStartWithTheSession) {
  const auto isPlainProducer = [](const TarnReportingSessionWorkerClass& row) {
    return row.isProducer && row.asConsumer == nullptr && row.startOnInit == nullptr &&
           row.handleSingleMessageSession == nullptr && row.start == nullptr && row.stop != nullptr;
  };
  EXPECT_TRUE(isPlainProducer(TarnReportingSessionWorkerClass::of<TarnReportingSessionVolumeMessagesWorker>()));
  EXPECT_TRUE(isPlainProducer(TarnReportingSessionWorkerClass::of<TarnReportingSessionInputMessagesWorker>()));
  EXPECT_TRUE(isPlainProducer(TarnReportingSessionWorkerClass::of<TarnReportingSessionLagoonMessagesWorker>()));
}

TEST_F(DerivingWorkers, ValuesThatAPeriodLeftBehindStartTheNext) {
  const auto session = startSession<TarnReportingSessionVolumeMessagesWorker>();
  send(*session, {{"KvSessionVolume", 0.25}, {"active_devices", "Headphones"}});
  session->stop();
  session->start();
  send(*session, {{"session_output_running", true}});
  send(*session, {{"session_output_running", false}});
  session->stop();
  const auto sent = summaries("Volume");
  ASSERT_EQ(sent.size(), 1U);
  EXPECT_EQ(sent[0].get("KvSessionVolume").asDouble(), 0.25);
  EXPECT_EQ(sent[0].get("active_devices").text(), "Headphones");
}

TEST_F(DerivingWorkers, InputThatAPeriodDescribedIsToldInTheNext) {
  const auto session = startSession<TarnReportingSessionInputMessagesWorker>();
  send(*session, {{"vp_config_input_port", "mic"}});
  session->stop();
  session->start();
  send(*session, {{"session_input_running", true}});
  send(*session, {{"session_input_running", false}});
  session->stop();
  ASSERT_EQ(summaries("Input").size(), 1U);
  EXPECT_EQ(summaries("Input")[0].get("vp_config_input_port").text(), "mic");
}

TEST_F(DerivingWorkers, GroupThatAPeriodJoinedHoldsInTheNext) {
  const auto session = startSession<TarnReportingSessionLagoonMessagesWorker>();
  send(*session, {{"lagoon_session", 1}, {"mFormatID", "aac"}});
  session->stop();
  session->start();
  send(*session, {{"session_output_running", true}});
  send(*session, {{"session_output_running", false}});
  session->stop();
  ASSERT_EQ(summaries("Lagoon").size(), 1U);
  EXPECT_EQ(summaries("Lagoon")[0].get("mFormatID").text(), "aac");
}

TEST_F(DerivingWorkers, HalfASecondIsTooShortForEveryWorker) {
  const auto session = startSession<TarnReportingSessionVolumeMessagesWorker, TarnReportingSessionLagoonMessagesWorker,
                                    TarnReportingSessionInputMessagesWorker>();
  const double begin = now();
  session->sendMessage(at(begin, {{"session_output_running", true},
                                  {"session_input_running", true},
                                  {"lagoon_session", 1},
                                  {"KvSessionVolume", 0.5}}));
  session->sendMessage(at(begin + 0.5, {{"session_output_running", false}, {"session_input_running", false}}));
  session->stop();
  for (const char* category : {"Volume", "Lagoon", "Input"}) {
    EXPECT_TRUE(summaries(category).empty()) << category;
  }
  EXPECT_EQ(segmentsLookedAt(platform_), 3U);
}

TEST_F(DerivingWorkers, LastValuesOfThePeriodItselfStartTheWalk) {
  // Known before the first message already, although the volume is only told after output ran.
  const auto session = startSession<TarnReportingSessionVolumeMessagesWorker>();
  send(*session, {{"session_output_running", true}});
  send(*session, {{"session_output_running", false}});
  send(*session, {{"KvSessionVolume", 0.25}});
  session->stop();
  ASSERT_EQ(summaries("Volume").size(), 1U);
  EXPECT_EQ(summaries("Volume")[0].get("KvSessionVolume").asDouble(), 0.25);
}

TEST_F(DerivingWorkers, StampsOutOfOrderAreWalkedInOrder) {
  const auto session = startSession<TarnReportingSessionVolumeMessagesWorker>();
  const double begin = now();
  session->sendMessage(at(begin + 30, {{"session_output_running", false}}));
  session->sendMessage(at(begin + 10, {{"session_output_running", true}, {"KvSessionVolume", 0.5}}));
  session->stop();
  ASSERT_EQ(summaries("Volume").size(), 1U);
  EXPECT_EQ(summaries("Volume")[0].get("play_seconds").asDouble(), 20);
}

TEST_F(DerivingWorkers, WhatIsFoldedAtStopDoesNotReachEarlierEvents) {
  platform_.tally.setPayloadCalls(FakeTallyService::PayloadCalls::Later);
  const auto session = startSession<TarnReportingSessionVolumeMessagesWorker>();
  const auto head = unstamped({{"spatial-audio-accessory-feature", true}});
  session->sendMessage(head);
  send(*session, {{"spatializationEnabled", true}});
  session->stop();
  ASSERT_TRUE(head->message().contains("spatializationEnabled"));
  platform_.tally.callPending();
  const auto payloads = platform_.tally.payloads("sys.oxbow.tarnkit.Playback.State");
  ASSERT_EQ(payloads.size(), 2U);
  EXPECT_FALSE(payloads[0].contains("spatializationEnabled"));
}

TEST_F(DerivingWorkers, OrientationWorkerAppliesToNoSession) {
  const auto session = startSession<TarnReportingSessionOrientationMessagesWorker>();
  EXPECT_EQ(TarnReportingSessionOrientationMessagesWorker::initWithSession(session), nullptr);
  EXPECT_EQ(session->workerInstanceCount(), 1U);
}

}  // namespace
}  // namespace tarn
