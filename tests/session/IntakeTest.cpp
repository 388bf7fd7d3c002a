// SPDX-License-Identifier: Apache-2.0
// What the session does to a message before any worker sees it.
#include "tests/session/SessionFixture.h"

namespace tarn {
namespace {

using namespace testing;

class Intake : public SessionFixture {
 protected:
  plist::Dictionary stamped(plist::Dictionary payload) const {
    payload.set("tarnreporting_timestamp", now());
    return payload;
  }
  // The message as the session logged it.
  plist::Dictionary sent(const std::shared_ptr<TarnReportingSession>& session, plist::Dictionary payload) {
    const auto record = message(std::move(payload));
    session->sendMessage(record);
    return record->message();
  }
};

TEST_F(Intake, MessageWithoutATimeStampIsStampedAndMarkedNil) {
  const plist::Dictionary payload = sent(makeSession(), {{"a", 1}});
  EXPECT_EQ(payload["invalid_timestamp"].text(), "nil");
  EXPECT_EQ(payload["tarnreporting_timestamp"].doubleValue(), now());
}

TEST_F(Intake, MessageWithTheTimeStampZeroKeepsItAsInvalidAndGetsAFreshOne) {
  const plist::Dictionary payload = sent(makeSession(), {{"tarnreporting_timestamp", 0}});
  EXPECT_EQ(payload["invalid_timestamp"], plist::ValueView(0));
  EXPECT_EQ(payload["tarnreporting_timestamp"].doubleValue(), now());
}

TEST_F(Intake, TimeStampOfJustAYearAgoIsKeptAndAnOlderOneReplaced) {
  const auto session = makeSession();
  const double limit = now() - 31536000;
  EXPECT_FALSE(sent(session, {{"tarnreporting_timestamp", limit}}).contains("invalid_timestamp"));
  EXPECT_EQ(sent(session, {{"tarnreporting_timestamp", limit - 1}})["invalid_timestamp"].doubleValue(), limit - 1);
}

TEST_F(Intake, TimeStampInTheFutureIsKept) {
  EXPECT_EQ(sent(makeSession(), {{"tarnreporting_timestamp", now() + 1e6}})["tarnreporting_timestamp"].doubleValue(),
            now() + 1e6);
}

TEST_F(Intake, TimeStampThatIsNoNumberIsKeptAsInvalid) {
  const plist::Dictionary payload = sent(makeSession(), {{"tarnreporting_timestamp", "yesterday"}});
  EXPECT_EQ(payload["invalid_timestamp"].text(), "yesterday");
  EXPECT_EQ(payload["tarnreporting_timestamp"].doubleValue(), now());
}

TEST_F(Intake, StampIsLookedForBeforeBlanksAreReplaced) {
  const plist::Dictionary payload = sent(makeSession(), {{"tarnreporting timestamp", now() - 5}});
  EXPECT_EQ(payload["invalid_timestamp"].text(), "nil");
  EXPECT_EQ(payload["tarnreporting_timestamp"].doubleValue(), now() - 5);
}

TEST_F(Intake, MessageThatIsStampedKeepsItsPayloadOtherwise) {
  EXPECT_EQ(sent(makeSession(), {{"tarnreporting_timestamp", now() - 1}, {"a", 1}}),
            (plist::Dictionary{{"tarnreporting_timestamp", now() - 1},
                               {"a", 1},
                               {"audiotag", "PlaybackStart"},
                               {"HostApplicationDisplayID", "Unknown"}}));
}

TEST_F(Intake, KeyWithABlankReplacesTheKeyWithAnUnderscore) {
  const plist::Dictionary payload = sent(makeSession(), {{"a b", "with blank"}, {"a_b", "without"}});
  EXPECT_EQ(payload["a_b"].text(), "with blank");
  EXPECT_FALSE(payload.contains("a b"));
}

TEST_F(Intake, KeysWithBlanksThatBecomeOneAreSettledInWireOrder) {
  const plist::Dictionary payload = sent(makeSession(), {{"a b c", 1}, {"a_b c", 2}, {"a b_c", 3}, {"d", 4}});
  EXPECT_EQ(payload["a_b_c"].asInt64(), 3);
  EXPECT_EQ(payload["d"].asInt64(), 4);
  EXPECT_EQ(payload.size(), 6U);  // a_b_c, d, stamp, invalid stamp, tag, application
}

TEST_F(Intake, TagAndApplicationFollowTheKeysWhoseBlanksWereReplaced) {
  std::string order;
  for (const auto& entry : sent(makeSession(), stamped({{"a b", 1}, {"c", 2}}))) {
    order += std::string(entry.key.text()) + " ";
  }
  EXPECT_EQ(order, "c tarnreporting_timestamp a_b audiotag HostApplicationDisplayID ");
}

TEST_F(Intake, PayloadWithoutBlanksInItsKeysIsNotMadeAnew) {
  const auto record = message({{"a", "b c"}});
  const plist::Dictionary before = record->message();
  TarnReportingSession::removeWhiteSpaceFromKeys(*record);
  EXPECT_TRUE(record->message().sharesStorageWith(before));
}

TEST_F(Intake, OnlyTheBlankIsReplaced) {
  const plist::Dictionary payload = sent(makeSession(), {{"a\tb\nc", 1}, {" ", 2}, {"x  y", 3}});
  EXPECT_EQ(payload["a\tb\nc"].asInt64(), 1);
  EXPECT_EQ(payload["_"].asInt64(), 2);
  EXPECT_EQ(payload["x__y"].asInt64(), 3);
}

TEST_F(Intake, TagIsCategoryAndTypeJoined) {
  const auto session = makeSession();
  EXPECT_EQ(sent(session, {{"audiotag", "the client's"}})["audiotag"].text(), "PlaybackStart");
  const auto dsp = message({}, static_cast<AudioEventCategory>(0x10000004), AudioEventType::Stop);
  session->sendMessage(dsp);
  EXPECT_EQ(dsp->message()["audiotag"].text(), "DSP_PlaybackStop");
}

TEST_F(Intake, ApplicationNameComesFromTheConfigurationUnlessTheMessageKnowsBetter) {
  const auto session = makeSession();
  EXPECT_EQ(sent(session, {})["HostApplicationDisplayID"].text(), "Unknown");
  const plist::Dictionary configuration{{"HostApplicationDisplayID", "com.example.player"}};
  session->updateConfigurationWithContentsOfConfiguration(&configuration);
  EXPECT_EQ(sent(session, {})["HostApplicationDisplayID"].text(), "com.example.player");
  EXPECT_EQ(sent(session, {{"HostApplicationDisplayID", "Unknown"}})["HostApplicationDisplayID"].text(),
            "com.example.player");
  EXPECT_EQ(sent(session, {{"HostApplicationDisplayID", "own"}})["HostApplicationDisplayID"].text(), "own");
}

TEST_F(Intake, SecondOfTwoIdenticalMessagesIsRedundantCountedMergedAndForwardedToThoseWhoAsk) {
  useWorkers<EarlyWorker, ConsumerWorker>();
  const auto session = makeSession();
  session->start();
  trail().clear();
  session->sendMessage(message(stamped({{"volume", 0.5}})));
  platform_.advance(std::chrono::seconds(1));
  const auto second = message(stamped({{"volume", 0.5}}));
  session->sendMessage(second);
  EXPECT_TRUE(second->isRedundant());
  EXPECT_EQ(session->totalMessageCount(), 2);
  EXPECT_EQ(session->messages().size(), 2U);  // the start marker and the first
  EXPECT_EQ(session->previousValues().get("tarnreporting_timestamp").doubleValue(), now());
  EXPECT_EQ(trail(), (std::vector<std::string>{"EarlyWorker handle", "ConsumerWorker handle", "EarlyWorker handle"}));
  EXPECT_TRUE(platform_.log.contains(LogLevel::Debug, "marking event redundant"));
}

TEST_F(Intake, MessagesThatDifferOnlyInTimesAndUptimesAreRedundant) {
  const auto session = makeSession();
  session->sendMessage(message(stamped({{"a", 1}, {"systemuptime_sec", 1}, {"processuptime_ms", 2}})));
  platform_.advance(std::chrono::seconds(5));
  const auto second = message(stamped({{"processuptime_ms", 9}, {"a", 1.0}}));
  session->sendMessage(second);
  EXPECT_TRUE(second->isRedundant());
}

TEST_F(Intake, InvalidTimeStampTakesPartInTheComparison) {
  const auto session = makeSession();
  session->sendMessage(message(stamped({{"a", 1}})));
  const auto unstamped = message({{"a", 1}});
  session->sendMessage(unstamped);
  EXPECT_FALSE(unstamped->isRedundant());
}

TEST_F(Intake, OnlyTheLatestMessageOfTheSameCategoryAndTypeCounts) {
  const auto session = makeSession();
  session->sendMessage(message(stamped({{"a", 1}})));
  session->sendMessage(message(stamped({{"a", 2}})));
  const auto third = message(stamped({{"a", 1}}));
  session->sendMessage(third);
  EXPECT_FALSE(third->isRedundant());
  const auto otherType = message(stamped({{"a", 1}}), AudioEventCategory::Playback, AudioEventType::Stop);
  session->sendMessage(otherType);
  EXPECT_FALSE(otherType->isRedundant());
}

TEST_F(Intake, ErrorTypeMessageIdenticalToThePreviousOneIsNew) {
  const auto session = makeSession();
  for (int i = 0; i < 2; ++i) {
    const auto error = message(stamped({{"a", 1}}), AudioEventCategory::Playback, AudioEventType::Error);
    session->sendMessage(error);
    EXPECT_FALSE(error->isRedundant());
    const auto category = message(stamped({{"a", 1}}), AudioEventCategory::Error, AudioEventType::Start);
    session->sendMessage(category);
    EXPECT_FALSE(category->isRedundant());
  }
}

TEST_F(Intake, ErrorCategoryWithADomainFlagIsNotExempt) {
  const auto session = makeSession();
  const auto flagged = static_cast<AudioEventCategory>(0x2000000B);
  session->sendMessage(message(stamped({{"a", 1}}), flagged));
  const auto second = message(stamped({{"a", 1}}), flagged);
  session->sendMessage(second);
  EXPECT_TRUE(second->isRedundant());
}

TEST_F(Intake, MessageEqualToAMarkerIsRedundant) {
  const auto session = makeSession();
  session->start();
  plist::Dictionary payload = session->messages()[0]->message();
  payload.remove("tarnreporting_timestamp");
  payload.remove("invalid_timestamp");
  payload.set("HostApplicationDisplayID", "own");  // the marker has none
  const auto different = message(payload, AudioEventCategory::Setup, AudioEventType::Start);
  session->sendMessage(different);
  EXPECT_FALSE(different->isRedundant());
  const auto same = message(payload, AudioEventCategory::Setup, AudioEventType::Start);
  session->sendMessage(same);
  EXPECT_TRUE(same->isRedundant());
}

TEST_F(Intake, PayloadChangedInPlaceCountsInTheComparison) {
  const auto session = makeSession();
  session->sendMessage(message(stamped({{"a", 1}})));
  session->messages()[0]->mutableMessage().set("a", 2);
  const auto second = message(stamped({{"a", 2}}));
  session->sendMessage(second);
  EXPECT_TRUE(second->isRedundant());
  EXPECT_EQ(session->previousValues().get("a").asInt64(), 2);
}

TEST_F(Intake, PayloadChangedInPlaceLeavesPreviousValuesAlone) {
  const auto session = makeSession();
  session->sendMessage(message(stamped({{"a", 1}})));
  session->messages()[0]->mutableMessage().set("a", 2);
  EXPECT_EQ(session->previousValues().get("a").asInt64(), 1);
}

TEST_F(Intake, DestinationsNameTheOnlyWorkersThatHandleTheMessage) {
  useWorkers<EarlyWorker, ConsumerWorker>();
  const auto session = makeSession();
  session->start();
  trail().clear();
  const auto addressed = message({{"a", 1}});
  addressed->setDestinationWorkers({"ConsumerWorker", "NoSuchWorker"});
  session->sendMessage(addressed);
  EXPECT_EQ(trail(), (std::vector<std::string>{"ConsumerWorker handle"}));
}

TEST_F(Intake, MessageAddressedToAnEmptyListReachesEveryConsumer) {
  useWorkers<EarlyWorker, ConsumerWorker>();
  const auto session = makeSession();
  session->start();
  trail().clear();
  const auto addressed = message({{"a", 1}});
  addressed->setDestinationWorkers({});
  session->sendMessage(addressed);
  EXPECT_EQ(trail(), (std::vector<std::string>{"EarlyWorker handle", "ConsumerWorker handle"}));
}

TEST_F(Intake, RedundantMessageIsWithheldAlsoFromTheWorkersThatItIsAddressedTo) {
  useWorkers<EarlyWorker, ConsumerWorker>();
  const auto session = makeSession();
  session->start();
  session->sendMessage(message(stamped({{"a", 1}})));
  trail().clear();
  const auto repeated = message(stamped({{"a", 1}}));
  repeated->setDestinationWorkers({"ConsumerWorker"});
  session->sendMessage(repeated);
  EXPECT_TRUE(repeated->isRedundant());
  EXPECT_EQ(trail(), std::vector<std::string>{});  // the one that asks for such isn't addressed
  const auto toTheOther = message(stamped({{"a", 1}}));
  toTheOther->setDestinationWorkers({"EarlyWorker"});
  session->sendMessage(toTheOther);
  EXPECT_EQ(trail(), std::vector<std::string>{"EarlyWorker handle"});
}

TEST_F(Intake, RedundantMessageIsWithheldFromAWorkerThatSaysNo) {
  auto row = TarnReportingSessionWorkerClass::of<EarlyWorker>();
  row.handleRedundantMessages = [](TarnReportingSessionWorkerProtocol&) { return false; };
  useWorkers({row});
  const auto session = makeSession();
  trail().clear();
  session->sendMessage(message(stamped({{"a", 1}})));
  session->sendMessage(message(stamped({{"a", 1}})));
  EXPECT_EQ(trail(), std::vector<std::string>{"EarlyWorker handle"});
}

TEST_F(Intake, SameMessageInTheNextPeriodIsNew) {
  useWorkers<ConsumerWorker>();
  const auto session = makeSession();
  for (int period = 0; period < 2; ++period) {
    session->start();
    const auto record = message(stamped({{"a", 1}}));
    session->sendMessage(record);
    EXPECT_FALSE(record->isRedundant());
    session->stop();
  }
}

TEST_F(Intake, CategoryAndTypeAreToldApart) {
  const auto session = makeSession();
  const auto send = [&](std::uint32_t category, std::uint16_t type) {
    const auto record =
        message(stamped({{"a", 1}}), static_cast<AudioEventCategory>(category), static_cast<AudioEventType>(type));
    session->sendMessage(record);
    return record->isRedundant();
  };
  EXPECT_FALSE(send(1, 0));
  EXPECT_FALSE(send(0, 0x8000));
  EXPECT_FALSE(send(2, 0));
  EXPECT_FALSE(send(0x10001, 0));
  EXPECT_FALSE(send(0, 1));
  // Each is compared with its own, and not with one whose numbers share bits with it.
  EXPECT_TRUE(send(1, 0));
  EXPECT_TRUE(send(0, 0x8000));
  EXPECT_TRUE(send(2, 0));
  EXPECT_TRUE(send(0x10001, 0));
  EXPECT_TRUE(send(0, 1));
}

TEST_F(Intake, EpochTimeIsTheStampAsANumberOrZero) {
  const auto epochTime = [](plist::Dictionary payload) {
    return TarnReportingSession::getEpochTimeFromTarnReportingStateMessage(*message(std::move(payload)));
  };
  EXPECT_EQ(epochTime({{"tarnreporting_timestamp", 12.5}}), 12.5);
  EXPECT_EQ(epochTime({{"tarnreporting_timestamp", "7 s"}}), 7);
  EXPECT_EQ(epochTime({{"a", 1}}), 0);
}

TEST_F(Intake, AllWorkersReceiveTheSameRecord) {
  useWorkers<ConsumerWorker>();
  const auto session = makeSession();
  session->start();
  const auto record = message({{"a", 1}});
  session->sendMessage(record);
  ASSERT_EQ(script().received.size(), 1U);
  EXPECT_EQ(script().received[0], record);
  EXPECT_TRUE(record->isSessionStarted());
}

TEST_F(Intake, MessageBeforeStartReachesTheEarlyWorkersAndIsMarkedSo) {
  useWorkers<EarlyWorker, ConsumerWorker>();
  const auto session = makeSession();
  trail().clear();
  const auto record = message({{"a", 1}});
  session->sendMessage(record);
  EXPECT_FALSE(record->isSessionStarted());
  EXPECT_EQ(trail(), (std::vector<std::string>{"EarlyWorker handle"}));
}

TEST_F(Intake, ReplyComesWithoutErrorBehindTheDelivery) {
  useWorkers<EarlyWorker>();
  const auto session = makeSession();
  trail().clear();
  session->sendMessage(message({{"a", 1}}), [](const std::optional<platform::RemoteError>& error) {
    EXPECT_FALSE(error);
    trail().emplace_back("reply");
  });
  EXPECT_EQ(trail(), (std::vector<std::string>{"EarlyWorker handle", "reply"}));
}

TEST_F(Intake, LogsTheMessageAsItWasTakenIn) {
  const auto session = makeSession();
  session->sendMessage(message(stamped({{"a", 1}})));
  EXPECT_TRUE(platform_.log.contains(
      LogLevel::Debug,
      "TarnReportingSessionWorker action=sendMessage reporterID=7 app=Unknown redundant=NO message={a = 1; "));
  session->sendMessage(message(stamped({{"a", 1}})));
  EXPECT_TRUE(platform_.log.contains(LogLevel::Debug, "app=Unknown redundant=YES message={a = 1; "));
}

TEST_F(Intake, LineOfAMessageNamesTheApplicationOfTheConfiguration) {
  const auto session = makeSession();
  const plist::Dictionary configuration{{"HostApplicationDisplayID", "com.example.player"}};
  session->updateConfigurationWithContentsOfConfiguration(&configuration);
  session->sendMessage(message(stamped({{"HostApplicationDisplayID", "own"}})));
  EXPECT_TRUE(platform_.log.contains(LogLevel::Debug, "reporterID=7 app=com.example.player redundant=NO"));
  EXPECT_TRUE(platform_.log.contains(LogLevel::Debug, "HostApplicationDisplayID = own"));
}

}  // namespace
}  // namespace tarn
