// SPDX-License-Identifier: Apache-2.0
#include "session/TarnReportingSessionTallyWorker.h"

#include "session/TarnReportingSessionSummaryWorker.h"
#include "tests/session/SessionFixture.h"

namespace tarn {
namespace {

using namespace testing;

class TallyWorker : public SessionFixture {
 protected:
  TallyWorker() { useWorkers<TarnReportingSessionSummaryWorker, TarnReportingSessionTallyWorker>(); }
};

TEST_F(TallyWorker, SubmitsBothNamesInOrderBeforeAndAfterStart) {
  const auto session = makeSession();
  session->setServiceType(AudioServiceType::Wisp);
  session->sendMessage(message({{"a", 1}}));
  EXPECT_EQ(platform_.tally.sentNames(),
            (std::vector<std::string>{"sys.oxbow.tarnkit.Playback.Start", "sys.oxbow.wisp.Playback.Start"}));
  const plist::Dictionary payload = platform_.tally.events().at(1).payload;
  EXPECT_EQ(payload["a"].asInt64(), 1);
  EXPECT_EQ(payload["audiotag"].text(), "PlaybackStart");
  EXPECT_EQ(payload["HostApplicationDisplayID"].text(), "Unknown");
}

TEST_F(TallyWorker, CategoryAndTypeZeroAndNoServiceTypeHaveTheirNames) {
  makeSession()->sendMessage(message({}, AudioEventCategory::Undefined, AudioEventType::Generic));
  EXPECT_EQ(platform_.tally.sentNames(),
            (std::vector<std::string>{"sys.oxbow.tarnkit.Undefined.Generic", "sys.oxbow.unknown.Undefined.Generic"}));
}

TEST_F(TallyWorker, NamesThatNobodyUsesAreSkippedWithoutAPayload) {
  platform_.tally.useOnly({"sys.oxbow.unknown.Playback.Start"});
  makeSession()->sendMessage(message({{"a", 1}}));
  EXPECT_EQ(platform_.tally.askedNames().size(), 2U);
  EXPECT_EQ(platform_.tally.sentNames(), (std::vector<std::string>{"sys.oxbow.unknown.Playback.Start"}));
}

TEST_F(TallyWorker, RedundantMessagesAreNotForwarded) {
  const auto session = makeSession();
  for (int i = 0; i < 2; ++i) {
    session->sendMessage(message({{"a", 1}, {"tarnreporting_timestamp", now()}}));
  }
  EXPECT_EQ(platform_.tally.events().size(), 2U);
}

TEST_F(TallyWorker, SummaryIsForwardedAsAnEvent) {
  const auto session = makeSession();
  session->setServiceType(AudioServiceType::Alarms);
  session->start();
  session->stop();
  EXPECT_EQ(platform_.tally.sentNames(), (std::vector<std::string>{"sys.oxbow.tarnkit.Session_Generic.Summary",
                                                                   "sys.oxbow.alarms.Session_Generic.Summary"}));
}

TEST_F(TallyWorker, LatePayloadIsThatOfTheHandOver) {
  platform_.tally.setPayloadCalls(FakeTallyService::PayloadCalls::Later);
  const auto record = message({{"a", 1}});
  makeSession()->sendMessage(record);
  record->mutableMessage().set("a", 2);
  platform_.tally.callPending();
  EXPECT_EQ(platform_.tally.events().at(0).payload["a"].asInt64(), 1);
}

TEST_F(TallyWorker, KindsWhoseNumbersShareBitsHaveTheirOwnNames) {
  const auto session = makeSession();
  const auto namesOf = [&](std::uint32_t category, std::uint16_t type, std::uint16_t service) {
    session->setServiceType(static_cast<AudioServiceType>(service));
    const std::size_t before = platform_.tally.sentNames().size();
    session->sendMessage(
        message({{"serial", before}}, static_cast<AudioEventCategory>(category), static_cast<AudioEventType>(type)));
    const auto names = platform_.tally.sentNames();
    return std::vector<std::string>(names.begin() + static_cast<std::ptrdiff_t>(before), names.end());
  };
  using Names = std::vector<std::string>;
  for (int round = 0; round < 2; ++round) {  // made, then remembered
    EXPECT_EQ(namesOf(1, 0, 0), (Names{"sys.oxbow.tarnkit.Generic.Generic", "sys.oxbow.generic.Generic.Generic"}));
    EXPECT_EQ(namesOf(0, 0x8000, 0),
              (Names{"sys.oxbow.tarnkit.Undefined.Generic", "sys.oxbow.generic.Undefined.Generic"}));
    EXPECT_EQ(namesOf(2, 0, 0), (Names{"sys.oxbow.tarnkit.Record.Generic", "sys.oxbow.generic.Record.Generic"}));
    EXPECT_EQ(namesOf(0x10000001, 0, 0),
              (Names{"sys.oxbow.tarnkit.DSP_Generic.Generic", "sys.oxbow.generic.DSP_Generic.Generic"}));
    EXPECT_EQ(namesOf(0, 1, 0), (Names{"sys.oxbow.tarnkit.Undefined.Start", "sys.oxbow.generic.Undefined.Start"}));
    EXPECT_EQ(namesOf(0, 2, 0), (Names{"sys.oxbow.tarnkit.Undefined.Stop", "sys.oxbow.generic.Undefined.Stop"}));
    EXPECT_EQ(namesOf(0, 0, 0x8000),
              (Names{"sys.oxbow.tarnkit.Undefined.Generic", "sys.oxbow.unknown.Undefined.Generic"}));
    EXPECT_EQ(namesOf(0, 0, 1), (Names{"sys.oxbow.tarnkit.Undefined.Generic", "sys.oxbow.wisp.Undefined.Generic"}));
  }
}

TEST_F(TallyWorker, RunsInASingleMessageSession) {
  makeSession(1, TarnReportingSession::Mode::SingleMessage)->sendMessage(message({{"a", 1}}));
  EXPECT_EQ(platform_.tally.sentNames(),
            (std::vector<std::string>{"sys.oxbow.tarnkit.Playback.Start", "sys.oxbow.unknown.Playback.Start"}));
}

TEST_F(TallyWorker, SubmitsNothingOnceItsSessionIsGone) {
  TarnReportingSessionTallyWorker worker{std::weak_ptr<TarnReportingSession>()};
  worker.handleMessage(message({{"a", 1}}));
  EXPECT_TRUE(platform_.tally.askedNames().empty());
}

TEST_F(TallyWorker, FloodOfKindsLeavesTheNamesRight) {
  const auto session = makeSession();
  for (std::uint32_t i = 0; i < 2000; ++i) {
    session->sendMessage(message({}, static_cast<AudioEventCategory>(i), AudioEventType::Stop));
  }
  session->setServiceType(AudioServiceType::Haptics);
  session->sendMessage(message({{"another", "message"}}, AudioEventCategory::Playback, AudioEventType::Stop));
  EXPECT_EQ(platform_.tally.sentNames().back(), "sys.oxbow.haptics.Playback.Stop");
}

}  // namespace
}  // namespace tarn
