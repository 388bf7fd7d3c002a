// SPDX-License-Identifier: Apache-2.0
// A message whose payload is a draft becomes what one with the finished payload becomes.
#include "plist/PackedBuilder.h"
#include "tests/session/SessionFixture.h"

namespace tarn {
namespace {

using namespace testing;

constexpr auto kPlayback = AudioEventCategory::Playback;
constexpr auto kStart = AudioEventType::Start;

class DraftIntake : public SessionFixture {
 protected:
  DraftIntake() { useWorkers<EarlyWorker, ConsumerWorker>(); }

  std::shared_ptr<TarnReportingSession> startedSession() {
    const auto session = makeSession();
    session->start();
    script().received.clear();
    trail().clear();
    return session;
  }
  plist::Dictionary stamped(plist::Dictionary payload) const {
    payload.set("tarnreporting_timestamp", now());
    return payload;
  }
  TarnReportingSession::Taken sendDraft(TarnReportingSession& session, const plist::Dictionary& payload,
                                        AudioEventCategory category = kPlayback, AudioEventType type = kStart) {
    const plist::KeyList keys = payload.keys();
    draft_.begin(4096);
    for (const auto& entry : payload) {
      draft_.add(entry.value);
    }
    draft_.finish(keys);
    return session.sendMessage(draft_, category, type);
  }
  static std::string newest(const TarnReportingSession& session) {
    return session.messages().empty() ? "" : session.messages().back()->description();
  }

  plist::PackedBuilder::Draft draft_;
};

TEST_F(DraftIntake, BecomesWhatTheFinishedPayloadBecomes) {
  plist::Dictionary many = stamped({});
  for (int i = 0; i < 100; ++i) {
    many.set(plist::Key("key" + std::to_string(i)), i);
  }
  const std::vector<plist::Dictionary> payloads{stamped({{"a", 1}, {"b", "text"}}),
                                                stamped({}),
                                                {{"a", 1}},
                                                {},
                                                {{"tarnreporting_timestamp", 0}, {"a", 1}},
                                                {{"tarnreporting_timestamp", now() - 31536000}},
                                                {{"tarnreporting_timestamp", now() - 31536001}},
                                                {{"tarnreporting_timestamp", now() + 1e6}},
                                                {{"tarnreporting_timestamp", "yesterday"}},
                                                stamped({{"a b", 1}, {"a_b", 2}}),
                                                stamped({{"audiotag", "own"}}),
                                                stamped({{"HostApplicationDisplayID", "own"}}),
                                                stamped({{"HostApplicationDisplayID", "Unknown"}}),
                                                stamped({{"text", std::string(300, 'x')}}),
                                                many};
  for (const std::string& application : {std::string(), std::string("sys.oxbow.music"), std::string(300, 'y')}) {
    for (const plist::Dictionary& payload : payloads) {
      const auto one = startedSession();
      const auto other = startedSession();
      const plist::Dictionary configuration{{"HostApplicationDisplayID", application}};
      for (const auto& session : {one, other}) {
        session->updateConfigurationWithContentsOfConfiguration(application.empty() ? nullptr : &configuration);
      }
      for (int round = 0; round < 2; ++round) {  // the second is redundant
        const auto record = message(payload);
        const std::size_t workers = other->sendMessage(record);
        const TarnReportingSession::Taken taken = sendDraft(*one, payload);
        EXPECT_EQ(taken.workers, workers);
        EXPECT_EQ(taken.isRedundant, record->isRedundant());
        EXPECT_EQ(newest(*one), newest(*other));
        EXPECT_TRUE(one->messages().back()->message().sharesKeysWith(other->messages().back()->message()));
        EXPECT_EQ(one->messages().size(), other->messages().size());
        EXPECT_EQ(one->totalMessageCount(), other->totalMessageCount());
        EXPECT_EQ(one->previousValues().dictionary(), other->previousValues().dictionary());
      }
    }
  }
}

TEST_F(DraftIntake, GetsTheTagOfItsKind) {
  const auto session = startedSession();
  sendDraft(*session, stamped({{"a", 1}}));
  EXPECT_EQ(session->messages().back()->message()["audiotag"].text(), "PlaybackStart");
  sendDraft(*session, stamped({{"a", 1}}), kPlayback, AudioEventType::Stop);
  EXPECT_EQ(session->messages().back()->message()["audiotag"].text(), "PlaybackStop");
  sendDraft(*session, stamped({{"a", 1}}), static_cast<AudioEventCategory>(0x10000004), AudioEventType::Stop);
  EXPECT_EQ(session->messages().back()->message()["audiotag"].text(), "DSP_PlaybackStop");
}

TEST_F(DraftIntake, GetsTheApplicationThatItsSessionHasThen) {
  const auto one = startedSession();
  const auto other = startedSession();
  const auto applicationOf = [&](TarnReportingSession& session, int number) {
    sendDraft(session, stamped({{"a", number}}));
    return std::string(session.messages().back()->message()["HostApplicationDisplayID"].text());
  };
  EXPECT_EQ(applicationOf(*one, 1), "Unknown");
  const plist::Dictionary configuration{{"KvHostApplicationDisplayID", "player"}};
  one->updateConfigurationWithContentsOfConfiguration(&configuration);
  EXPECT_EQ(applicationOf(*one, 2), "player");
  EXPECT_EQ(applicationOf(*other, 1), "Unknown");
  const plist::Dictionary number{{"HostApplicationDisplayID", 7}};
  one->updateConfigurationWithContentsOfConfiguration(&number);
  EXPECT_EQ(applicationOf(*one, 3), "7");
}

TEST_F(DraftIntake, ReachesTheWorkersAsARecordOfItsOwn) {
  const auto session = startedSession();
  EXPECT_EQ(sendDraft(*session, stamped({{"a", 1}})).workers, 2U);
  ASSERT_EQ(script().received.size(), 1U);
  const auto record = script().received[0];
  EXPECT_EQ(record, session->messages().back());
  EXPECT_TRUE(record->isSessionStarted());
  EXPECT_EQ(sendDraft(*session, stamped({{"a", 1}})).workers, 1U);  // who asks for redundant ones
  EXPECT_EQ(trail(), (std::vector<std::string>{"EarlyWorker handle", "ConsumerWorker handle", "EarlyWorker handle"}));
  sendDraft(*session, stamped({{"a", 2}}));
  EXPECT_EQ(record->message()["a"].asInt64(), 1);
}

TEST_F(DraftIntake, IsToldAsItWasTakenIn) {
  const auto session = startedSession();
  sendDraft(*session, stamped({{"a", 1}}));
  EXPECT_TRUE(platform_.log.contains(
      LogLevel::Debug,
      "TarnReportingSessionWorker action=sendMessage reporterID=7 app=Unknown redundant=NO message={a = 1; "));
}

}  // namespace
}  // namespace tarn
