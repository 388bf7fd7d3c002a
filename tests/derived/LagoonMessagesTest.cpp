#include <gtest/gtest.h>

#include <cmath>

#include "derived/TarnReportingSessionLagoonMessagesWorker.h"
#include "platform/testing/FakePlatform.h"
#include "service/TarnReportingLog.h"
#include "tests/derived/DerivedMessages.h"

namespace tarn {
namespace {

using namespace testing;

class CreateLagoonMessages : public ::testing::Test {
 protected:
  static TarnReportingSessionMessages create(const TarnReportingSessionMessages& messages,
                                             const plist::Dictionary& previousValues = {}) {
    return TarnReportingSessionLagoonMessagesWorker::createLagoonMessages(messages, previous(previousValues), 0.5);
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
  // The last message both joins and ends: the state before it isn't in a group.
  EXPECT_TRUE(create({at(0, {{"session_output_running", true}}), start(40, {{"session_duration", 1}})}).empty());
}

TEST_F(CreateLagoonMessages, PlayingInAGroupBeforeTheFirstMessageCounts) {
  const plist::Dictionary playing{
      {"session_output_running", true}, {"lagoon_session", 1}, {"tarnreporting_timestamp", 10.0}};
  EXPECT_EQ(rows(create({end(100)}, playing), kColumns), (Rows{"90 1 1"}));
}

TEST_F(CreateLagoonMessages, GroupFlagOfTheStateCountsWithoutAStart) {
  // In the group, but not playing: the message that starts output needs no flag of its own.
  EXPECT_EQ(rows(create({at(20, {{"session_output_running", true}}), end(100)}, {{"lagoon_session", 1}}), kColumns),
            (Rows{"80 1 1"}));
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

}  // namespace
}  // namespace tarn
