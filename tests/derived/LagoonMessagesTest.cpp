// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <cmath>
#include <utility>

#include "derived/TarnReportingSessionLagoonMessagesWorker.h"
#include "service/vocabulary/TarnReportingLog.h"
#include "testing/FakePlatform.h"
#include "tests/derived/DerivedMessages.h"

namespace tarn {
namespace {

using namespace testing;

class CreateLagoonMessages : public ::testing::Test {
 protected:
  static TarnReportingSessionMessageList create(const TarnReportingSessionMessages& messages,
                                                const plist::Dictionary& previousValues = {},
                                                double minimumPlaytime = 0.5) {
    return TarnReportingSessionLagoonMessagesWorker::createLagoonMessages(messageListOf(messages),
                                                                          previous(previousValues), minimumPlaytime);
  }
  // Output starts inside a group session.
  static std::shared_ptr<TarnReportingSessionMessage> start(double time, plist::Dictionary more = {}) {
    more.set("session_output_running", true);
    more.set("lagoon_session", 1);
    return at(time, std::move(more));
  }
  static std::shared_ptr<TarnReportingSessionMessage> end(double time) {
    return at(time, {{"session_duration", time}});
  }

  FakePlatform platform_;
};

const std::vector<std::string> kColumns{"play_seconds", "msgidx", "msgcnt"};

TEST_F(CreateLagoonMessages, PlayingInAGroupUntilTheSessionsEndYieldsOneMessage) {
  const auto derived = create({start(0), end(100)});
  ASSERT_EQ(derived.size(), 1U);
  EXPECT_EQ(derived[0]->category(), AudioEventCategory::Lagoon);
  EXPECT_EQ(derived[0]->type(), AudioEventType::Summary);
  EXPECT_EQ(plist::description(derived[0]->message()),
            "{session_selected_format = unknown; active_devices = unknown; mFormatID = unknown; mChannelsPerFrame = "
            "-1; play_seconds = 100; play_secondsBucketed = 60; msgidx = 1; msgcnt = 1}");
  EXPECT_EQ(derived[0]->message().get("play_seconds").kind(), plist::Kind::Float);
}

TEST_F(CreateLagoonMessages, PlayingWithoutAGroupYieldsNothing) {
  EXPECT_TRUE(create({at(0, {{"session_output_running", true}}), end(100)}).empty());
  EXPECT_TRUE(create({at(0, {{"session_output_running", true}, {"lagoon_session", 2}}), end(100)}).empty());
}

TEST_F(CreateLagoonMessages, FormatChangeCutsTheSegment) {
  EXPECT_EQ(rows(create({start(0, {{"mFormatID", "aac"}}), at(40, {{"mFormatID", "lpcm"}}), end(100)}),
                 {"play_seconds", "mFormatID", "msgidx", "msgcnt"}),
            (Rows{"40 aac 1 2", "60 lpcm 2 2"}));
}

TEST_F(CreateLagoonMessages, LeavingTheGroupClosesTheSegmentAndStartsNone) {
  EXPECT_EQ(rows(create({start(0), at(40, {{"lagoon_session", 0}}), end(100)}), kColumns), (Rows{"40 1 1"}));
}

TEST_F(CreateLagoonMessages, FieldThatOnlyTheNewMessageHasIsNoChange) {
  EXPECT_EQ(rows(create({start(0), at(40, {{"mFormatID", "aac"}, {"mChannelsPerFrame", 2}, {"active_devices", "TV"}}),
                         end(100)}),
                 {"play_seconds", "mFormatID", "mChannelsPerFrame", "active_devices"}),
            (Rows{"100 aac 2 TV"}));
}

TEST_F(CreateLagoonMessages, StateWithoutChannelsReportsMinusOne) {
  const auto derived = create({start(0, {{"mFormatID", "aac"}}), end(100)});
  EXPECT_EQ(rows(derived, {"mFormatID", "mChannelsPerFrame"}), (Rows{"aac -1"}));
}

TEST_F(CreateLagoonMessages, HalfASecondYieldsNothing) {
  EXPECT_TRUE(create({start(0), end(0.5)}).empty());
  EXPECT_EQ(create({start(0), end(std::nextafter(0.5, 1))}).size(), 1U);
}

TEST_F(CreateLagoonMessages, WatchedValuesCutTheSegment) {
  const auto lengths = [](plist::Dictionary before, plist::Dictionary after) {
    return rows(create({start(0, std::move(before)), at(40, std::move(after)), end(100)}), {"play_seconds"});
  };
  const Rows cut{"40", "60"};
  const Rows whole{"100"};
  EXPECT_EQ(lengths({{"mFormatID", "a"}}, {{"mFormatID", "b"}}), cut);
  EXPECT_EQ(lengths({{"mFormatID", "a"}}, {{"mFormatID", "a"}}), whole);
  EXPECT_EQ(lengths({{"active_devices", "a"}}, {{"active_devices", "b"}}), cut);
  EXPECT_EQ(lengths({{"mChannelsPerFrame", 2}}, {{"mChannelsPerFrame", 6}}), cut);
  EXPECT_EQ(lengths({{"mChannelsPerFrame", 2}}, {{"mChannelsPerFrame", 2.5}}), whole);
  EXPECT_EQ(lengths({{"mChannelsPerFrame", 2}}, {{"mChannelsPerFrame", "2 channels"}}), whole);
  EXPECT_EQ(lengths({{"active_devices", "5"}}, {{"active_devices", 5}}), whole);
  EXPECT_EQ(lengths({{"session_selected_format", "a"}}, {{"session_selected_format", "b"}}), whole);
  EXPECT_EQ(lengths({}, {{"session_output_running", 1}, {"lagoon_session", true}}), whole);
}

TEST_F(CreateLagoonMessages, OutputStopInTheGroupClosesTheSegment) {
  EXPECT_EQ(rows(create({start(0), at(40, {{"session_output_running", false}}),
                         at(50, {{"session_output_running", true}}), end(100)}),
                 kColumns),
            (Rows{"40 1 2", "50 2 2"}));
}

TEST_F(CreateLagoonMessages, JoiningAGroupWhilePlayingStartsTheSegment) {
  EXPECT_EQ(
      rows(create({at(0, {{"session_output_running", true}}), at(40, {{"lagoon_session", 1}}), end(100)}), kColumns),
      (Rows{"60 1 1"}));
}

TEST_F(CreateLagoonMessages, SegmentThatEndsWithTheGroupUnsetBeforeItIsSkipped) {
  // The last message both joins and ends, so its segment has no length, and the state before it isn't in a group. A
  // minimum below zero takes every length.
  const auto playing = at(0, {{"session_output_running", true}});
  EXPECT_TRUE(create({playing, start(40, {{"session_duration", 1}})}, {}, -1).empty());
  EXPECT_EQ(segmentsLookedAt(platform_), 1U);
  EXPECT_EQ(rows(create({playing, start(40, {{"session_duration", 1}})}, {{"lagoon_session", 1}}, -1), kColumns),
            (Rows{"40 1 1"}));
}

TEST_F(CreateLagoonMessages, GroupWithoutOutputYieldsNothing) {
  EXPECT_TRUE(create({at(0, {{"lagoon_session", 1}}), end(100)}).empty());
  EXPECT_EQ(segmentsLookedAt(platform_), 0U);
}

TEST_F(CreateLagoonMessages, JoiningAGroupIsNoEndOfASegment) {
  const auto alone = at(0, {{"session_output_running", true}, {"lagoon_session", 0}});
  EXPECT_EQ(rows(create({alone, at(40, {{"lagoon_session", 1}}), end(100)}), kColumns), (Rows{"60 1 1"}));
  EXPECT_EQ(segmentsLookedAt(platform_), 1U);
}

TEST_F(CreateLagoonMessages, OutputStartInTheGroupIsNoEndOfASegment) {
  const auto silent = at(0, {{"session_output_running", false}, {"lagoon_session", 1}});
  EXPECT_EQ(rows(create({silent, at(40, {{"session_output_running", true}}), end(100)}), kColumns), (Rows{"60 1 1"}));
  EXPECT_EQ(segmentsLookedAt(platform_), 1U);
}

TEST_F(CreateLagoonMessages, EndInTheStartingMessageEndsAlthoughOutputDidNotRun) {
  EXPECT_EQ(rows(create({start(20, {{"session_duration", 1}}), start(30), end(40)}), kColumns), (Rows{"10 1 1"}));
  EXPECT_TRUE(platform_.log.contains(LogLevel::Debug, "playingTime=0.000000, tarnTimestamp=20,"));
}

TEST_F(CreateLagoonMessages, SessionsEndTakesRunningAway) {
  EXPECT_EQ(rows(create({start(0), end(100), at(110, {{"lagoon_session", 1}}), end(200)}), kColumns),
            (Rows{"100 1 1"}));
}

TEST_F(CreateLagoonMessages, RejoiningTheGroupStartsAnew) {
  EXPECT_EQ(
      rows(create({start(0), at(40, {{"lagoon_session", 0}}), at(60, {{"lagoon_session", 1}}), end(100)}), kColumns),
      (Rows{"40 1 2", "40 2 2"}));
}

TEST_F(CreateLagoonMessages, PlayingInAGroupBeforeTheFirstMessageCounts) {
  const plist::Dictionary playing{
      {"session_output_running", true}, {"lagoon_session", 1}, {"tarnreporting_timestamp", 10.0}};
  EXPECT_EQ(rows(create({end(100)}, playing), kColumns), (Rows{"90 1 1"}));
}

TEST_F(CreateLagoonMessages, PlayingWithoutAGroupBeforeTheFirstMessageStartsWithTheGroup) {
  const plist::Dictionary playing{{"session_output_running", true}, {"tarnreporting_timestamp", 10.0}};
  EXPECT_EQ(rows(create({at(40, {{"lagoon_session", 1}}), end(100)}, playing), kColumns), (Rows{"60 1 1"}));
}

TEST_F(CreateLagoonMessages, GroupFlagOfTheStateCountsWithoutAStart) {
  // In the group, but not playing: the message that starts output needs no flag of its own.
  const plist::Dictionary inGroup{{"lagoon_session", 1}, {"tarnreporting_timestamp", 10.0}};
  EXPECT_EQ(rows(create({at(20, {{"session_output_running", true}}), end(100)}, inGroup), kColumns), (Rows{"80 1 1"}));
}

TEST_F(CreateLagoonMessages, SessionsEndTakesTheGroupFlagAway) {
  EXPECT_EQ(rows(create({start(0), end(100), at(110, {{"session_output_running", true}}), end(200)}), kColumns),
            (Rows{"100 1 1"}));
}

TEST_F(CreateLagoonMessages, RapidMessagesAreNotCombined) {
  const TarnReportingSessionMessages messages{
      start(0, {{"active_devices", "a"}}), at(1, {{"spatial-audio-accessory-feature", true}}),
      at(2, {{"spatializationEnabled", true}, {"active_devices", "b"}}), end(9)};
  EXPECT_EQ(rows(create(messages), {"play_seconds"}), (Rows{"2", "7"}));
  EXPECT_FALSE(messages[1]->message().contains("spatializationEnabled"));
}

TEST_F(CreateLagoonMessages, MessagesGoToAnalyticsAndTheSummaryFileAlone) {
  const auto derived = create({start(0), end(100)});
  ASSERT_EQ(derived.size(), 1U);
  EXPECT_EQ(derived[0]->destinationWorkers(),
            (TarnReportingSessionMessage::DestinationWorkers{"TarnReportingSessionTallyWorker",
                                                             "TarnReportingSessionSummaryJsonFileWorker"}));
}

TEST_F(CreateLagoonMessages, InternalBuildsAddressEveryone) {
  platform_.deviceProperties.set("InternalBuild", true);
  const auto derived = create({start(0), end(100)});
  ASSERT_EQ(derived.size(), 1U);
  EXPECT_TRUE(derived[0]->destinationWorkers().empty());
}

TEST_F(CreateLagoonMessages, AbsurdTimesAreTakenAsTheyAre) {
  const auto endAt = [](const plist::ValueView& time) { return stamped(time, {{"session_duration", 1}}); };
  EXPECT_TRUE(create({start(10), end(10)}).empty());
  EXPECT_TRUE(create({start(10), endAt(-5)}).empty());
  EXPECT_TRUE(create({start(10), endAt(std::nan(""))}).empty());
  EXPECT_TRUE(create({start(10), unstamped({{"session_duration", 1}})}).empty());
  EXPECT_EQ(rows(create({start(-10), endAt("-2.5")}), kColumns), (Rows{"7.5 1 1"}));
  // Without a time stamp there is no start until a message has one.
  EXPECT_EQ(
      rows(create({unstamped({{"session_output_running", true}, {"lagoon_session", 1}}), at(50), end(100)}), kColumns),
      (Rows{"50 1 1"}));
}

TEST_F(CreateLagoonMessages, LogsWhatItDoes) {
  create({start(1), at(3, {{"lagoon_session", 0}}), at(4, {{"lagoon_session", 1}}), end(4.25)});
  EXPECT_EQ(platform_.log.messages(),
            (std::vector<std::string>{
                "entering createLagoonMessages createLagoonMessages",
                "playingTime { func=createLagoonMessages, playingTime=2.000000, tarnTimestamp=3, "
                "tarnTimestamp_double=3.000000, startTarnTimestamp=1, startTarnTimestamp_double=1.000000 }",
                "added lagoon message { func=createLagoonMessages, action=add, count=1 }",
                "playingTime { func=createLagoonMessages, playingTime=0.250000, tarnTimestamp=4.25, "
                "tarnTimestamp_double=4.250000, startTarnTimestamp=4, startTarnTimestamp_double=4.000000 }",
                "skipped lagoon message, too short or not actually an lagoon session { func=createLagoonMessages, "
                "action=skip, count=1 }"}));
  for (const auto& entry : platform_.log.entries()) {
    EXPECT_EQ(entry.level, LogLevel::Debug);
    EXPECT_EQ(entry.category, "tarnrr");
    EXPECT_EQ(entry.module, "TarnReportingSessionLagoonMessagesWorker");
  }
}

// The operations that the walk is made of.

using Worker = TarnReportingSessionLagoonMessagesWorker;

Worker::Fields fieldsOf(const plist::Dictionary& payload) {
  return {Worker::fieldKeys(), payload};
}

bool watchedFieldChanges(const plist::Dictionary& message, const plist::Dictionary& previous) {
  return Worker::watchedFieldChangeInMessage(fieldsOf(message), fieldsOf(previous));
}

TEST(LagoonOperations, FiveFieldsAreWatched) {
  EXPECT_TRUE(watchedFieldChanges({{"session_output_running", true}}, {{"session_output_running", false}}));
  EXPECT_TRUE(watchedFieldChanges({{"lagoon_session", 1}}, {{"lagoon_session", 2}}));
  EXPECT_TRUE(watchedFieldChanges({{"mChannelsPerFrame", 1}}, {{"mChannelsPerFrame", 2}}));
  EXPECT_TRUE(watchedFieldChanges({{"mFormatID", "a"}}, {{"mFormatID", "b"}}));
  EXPECT_TRUE(watchedFieldChanges({{"active_devices", "a"}}, {{"active_devices", "b"}}));
  EXPECT_FALSE(watchedFieldChanges({{"session_selected_format", "a"}}, {{"session_selected_format", "b"}}));
  EXPECT_FALSE(watchedFieldChanges({{"tarnreporting_timestamp", 1}}, {{"tarnreporting_timestamp", 2}}));
  EXPECT_FALSE(watchedFieldChanges({{"session_duration", 1}}, {{"session_duration", 2}}));
}

TEST(LagoonOperations, EqualValuesAreNoWatchedChange) {
  const plist::Dictionary payload{{"session_output_running", true},
                                  {"lagoon_session", 1},
                                  {"mChannelsPerFrame", 2},
                                  {"mFormatID", "a"},
                                  {"active_devices", "b"}};
  EXPECT_FALSE(watchedFieldChanges(payload, payload));
}

TEST(LagoonOperations, AValueMissingOnEitherSideIsNoChange) {
  const plist::Dictionary none;
  const plist::Dictionary one{{"mFormatID", "a"}, {"mChannelsPerFrame", 5}, {"session_output_running", true}};
  for (const auto& [left, right] : {std::pair(none, one), std::pair(one, none), std::pair(none, none)}) {
    EXPECT_FALSE(Worker::didStringChangeInKey(Worker::Field::FormatID, fieldsOf(left), fieldsOf(right)));
    EXPECT_FALSE(Worker::didIntChangeInKey(Worker::Field::Channels, fieldsOf(left), fieldsOf(right)));
    EXPECT_FALSE(Worker::didBoolChangeInKey(Worker::Field::Running, fieldsOf(left), fieldsOf(right)));
  }
}

TEST(LagoonOperations, EachComparisonReadsItsType) {
  const auto changes = [](auto operation, const plist::ValueView& left, const plist::ValueView& right) {
    const plist::Dictionary leftPayload{{"mFormatID", left}};
    const plist::Dictionary rightPayload{{"mFormatID", right}};
    return operation(Worker::Field::FormatID, fieldsOf(leftPayload), fieldsOf(rightPayload));
  };
  EXPECT_TRUE(changes(Worker::didStringChangeInKey, "2", "2.0"));
  EXPECT_FALSE(changes(Worker::didStringChangeInKey, "2", 2));
  EXPECT_TRUE(changes(Worker::didIntChangeInKey, 2, 3));
  EXPECT_FALSE(changes(Worker::didIntChangeInKey, 2, 2.75));
  EXPECT_TRUE(changes(Worker::didBoolChangeInKey, 0, 3));
  EXPECT_FALSE(changes(Worker::didBoolChangeInKey, 1, 3));
}

TEST(LagoonOperations, CoalescingTakesTheFirstThatHoldsTheValue) {
  const plist::Dictionary first{{"mFormatID", "first"}};
  const plist::Dictionary second{{"mFormatID", "second"}, {"active_devices", "second"}};
  const Worker::Fields firstFields = fieldsOf(first);
  const Worker::Fields secondFields = fieldsOf(second);
  const auto coalesce = [&](Worker::Field key) { return Worker::coalesceKey(key, {&firstFields, &secondFields}); };
  EXPECT_EQ(coalesce(Worker::Field::FormatID).asText(), "first");
  EXPECT_EQ(coalesce(Worker::Field::ActiveDevices).asText(), "second");
  EXPECT_FALSE(coalesce(Worker::Field::Channels).present());
}

}  // namespace
}  // namespace tarn
