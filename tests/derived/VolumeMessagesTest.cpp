// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <cmath>
#include <limits>

#include "derived/TarnReportingSessionVolumeMessagesWorker.h"
#include "service/vocabulary/TarnReportingLog.h"
#include "testing/FakePlatform.h"
#include "tests/derived/DerivedMessages.h"

namespace tarn {
namespace {

using namespace testing;

class CreateVolumeMessages : public ::testing::Test {
 protected:
  static TarnReportingSessionMessageList create(const TarnReportingSessionMessages& messages,
                                                const plist::Dictionary& previousValues = {},
                                                std::string_view process = "music") {
    return TarnReportingSessionVolumeMessagesWorker::createVolumeMessages(messageListOf(messages),
                                                                          previous(previousValues), process, 0.5);
  }
  static std::shared_ptr<TarnReportingSessionMessage> start(double time, plist::Dictionary more = {}) {
    more.set("session_output_running", true);
    return at(time, std::move(more));
  }
  static std::shared_ptr<TarnReportingSessionMessage> end(double time, plist::Dictionary more = {}) {
    more.set("session_output_running", false);
    return at(time, std::move(more));
  }
  // Runs from 0 at volume 0.5, takes the message at 20, stops at 30.
  static Rows lengthsWith(plist::Dictionary atTwenty, plist::Dictionary atStart = {}) {
    atStart.set("KvSessionVolume", 0.5);
    return rows(create({start(0, std::move(atStart)), at(20, std::move(atTwenty)), end(30)}), {"play_seconds"});
  }

  FakePlatform platform_;
};

const std::vector<std::string> kColumns{"play_seconds", "KvSessionVolume", "msgidx", "msgcnt"};

TEST_F(CreateVolumeMessages, OutputFromStartToStopYieldsOneMessage) {
  const auto derived = create({start(0, {{"KvSessionVolume", 0.5}}), end(10)});
  ASSERT_EQ(derived.size(), 1U);
  EXPECT_EQ(derived[0]->category(), AudioEventCategory::Volume);
  EXPECT_EQ(derived[0]->type(), AudioEventType::Summary);
  EXPECT_TRUE(derived[0]->destinationWorkers().empty());
  EXPECT_EQ(plist::description(derived[0]->message()),
            "{session_selected_format = unknown; mFormatID = unknown; active_devices = unknown; "
            "HostApplicationDisplayID = music; KvSessionVolume = 0.5; KvSessionVolumeBucketed = 0.5; play_seconds = "
            "10; spatial-audio-accessory-feature = 0; spatializationEnabled = 0; ringerstate = 0; mChannelsPerFrame = "
            "-1; play_secondsBucketed = 10; msgidx = 1; msgcnt = 1}");
}

TEST_F(CreateVolumeMessages, NumbersHaveTheirKinds) {
  const auto derived = create({start(0, {{"KvSessionVolume", 0.5F}}), end(10)});
  ASSERT_EQ(derived.size(), 1U);
  const plist::Dictionary& payload = derived[0]->message();
  EXPECT_EQ(payload.get("KvSessionVolume").kind(), plist::Kind::Float);
  EXPECT_EQ(payload.get("KvSessionVolumeBucketed").kind(), plist::Kind::Text);
  EXPECT_EQ(payload.get("play_seconds").kind(), plist::Kind::Float);
  EXPECT_EQ(payload.get("play_secondsBucketed").kind(), plist::Kind::Text);
  for (const char* key : {"spatial-audio-accessory-feature", "spatializationEnabled", "ringerstate"}) {
    EXPECT_EQ(payload.get(key).kind(), plist::Kind::Bool) << key;
  }
  for (const char* key : {"mChannelsPerFrame", "msgidx", "msgcnt"}) {
    EXPECT_TRUE(payload.get(key).kind() == plist::Kind::Signed || payload.get(key).kind() == plist::Kind::Unsigned)
        << key;
  }
}

TEST_F(CreateVolumeMessages, HalfASecondYieldsNothing) {
  EXPECT_TRUE(create({start(0, {{"KvSessionVolume", 0.5}}), end(0.5)}).empty());
  EXPECT_EQ(create({start(0, {{"KvSessionVolume", 0.5}}), end(std::nextafter(0.5, 1))}).size(), 1U);
}

TEST_F(CreateVolumeMessages, VolumeChangeWhileRunningCutsTheSegment) {
  EXPECT_EQ(
      rows(create({start(0, {{"KvSessionVolume", 0.5}}), at(20, {{"KvSessionVolume", 0.75}}), end(30)}), kColumns),
      (Rows{"20 0.5 1 2", "10 0.75 2 2"}));
}

TEST_F(CreateVolumeMessages, VolumeChangeWhileNotRunningStartsAndYieldsNothing) {
  EXPECT_TRUE(create({at(0, {{"KvSessionVolume", 0.5}}), at(20, {{"KvSessionVolume", 0.75}}), end(30)}).empty());
}

TEST_F(CreateVolumeMessages, SessionDurationEndsTheSegmentWithoutARunningKey) {
  // Output has ended with it: neither the volume nor the late stop starts or ends anything.
  EXPECT_EQ(rows(create({start(0, {{"KvSessionVolume", 0.5}}), at(10, {{"session_duration", 10.0}}),
                         at(20, {{"KvSessionVolume", 0.75}}), end(30)}),
                 kColumns),
            (Rows{"10 0.5 1 1"}));
}

TEST_F(CreateVolumeMessages, SessionDurationInARunningMessageCutsAndGoesOn) {
  EXPECT_EQ(
      rows(create({start(0, {{"KvSessionVolume", 0.5}}), start(10, {{"session_duration", 10.0}}), end(15)}), kColumns),
      (Rows{"10 0.5 1 2", "5 0.5 2 2"}));
}

TEST_F(CreateVolumeMessages, DifferencesSeenWhileNotRunningAreNoSegment) {
  const plist::Dictionary differences{{"session_selected_format", "lpcm"},
                                      {"active_devices", "Speaker"},
                                      {"spatializationEnabled", true},
                                      {"ringerstate", true},
                                      {"KvSessionVolume", 0.75}};
  // The running state still says that output runs; the session's end says that it doesn't.
  create({start(0, {{"KvSessionVolume", 0.5}}), at(10, {{"session_duration", 10.0}}), at(20, differences)});
  EXPECT_EQ(segmentsLookedAt(platform_), 1U);
}

TEST_F(CreateVolumeMessages, EndsWithoutRunningOutputAreNoSegment) {
  create({end(0, {{"KvSessionVolume", 0.5}}), end(10), at(20, {{"session_duration", 20.0}}),
          start(30, {{"session_duration", 30.0}})});
  EXPECT_EQ(segmentsLookedAt(platform_), 0U);
}

TEST_F(CreateVolumeMessages, SpatialisationOnAndOffWithinFiveSecondsCollapses) {
  EXPECT_EQ(rows(create({start(0), at(1, {{"KvSessionVolume", 0.5}}),
                         at(10, {{"spatial-audio-accessory-feature", true}, {"spatializationEnabled", true}}),
                         at(14, {{"spatializationEnabled", false}}), end(30)}),
                 {"play_seconds", "spatializationEnabled"}),
            (Rows{"30 0"}));
}

TEST_F(CreateVolumeMessages, SpatialisationOnAndOffFiveSecondsApartIsTwoChanges) {
  EXPECT_EQ(rows(create({start(0), at(1, {{"KvSessionVolume", 0.5}}),
                         at(10, {{"spatial-audio-accessory-feature", true}, {"spatializationEnabled", true}}),
                         at(15, {{"spatializationEnabled", false}}), end(30)}),
                 {"play_seconds", "spatializationEnabled"}),
            (Rows{"10 0", "5 1", "15 0"}));
}

TEST_F(CreateVolumeMessages, WithoutAVolumeSegmentsAreSkipped) {
  EXPECT_TRUE(create({start(0), end(10), start(20), at(30, {{"session_duration", 1}})}).empty());
}

TEST_F(CreateVolumeMessages, VolumeThatComesWithTheStopIsTooLate) {
  EXPECT_TRUE(create({start(0), end(10, {{"KvSessionVolume", 0.5}})}).empty());
}

TEST_F(CreateVolumeMessages, EmptyProcessNameYieldsNothing) {
  EXPECT_TRUE(create({start(0, {{"KvSessionVolume", 0.5}}), end(10)}, {}, "").empty());
}

TEST_F(CreateVolumeMessages, WatchedValuesCutTheSegment) {
  const Rows cut{"20", "10"};
  EXPECT_EQ(lengthsWith({{"session_selected_format", "lpcm"}}), cut);
  EXPECT_EQ(lengthsWith({{"active_devices", "Speaker"}}), cut);
  EXPECT_EQ(lengthsWith({{"spatializationEnabled", true}}), cut);
  EXPECT_EQ(lengthsWith({{"ringerstate", true}}), cut);
  EXPECT_EQ(lengthsWith({{"KvSessionVolume", 0.25}}), cut);
}

TEST_F(CreateVolumeMessages, CarriedValuesDoNotCutTheSegment) {
  const Rows whole{"30"};
  EXPECT_EQ(lengthsWith({{"spatial-audio-accessory-feature", true}}), whole);
  EXPECT_EQ(lengthsWith({{"mFormatID", "aac"}}), whole);
  EXPECT_EQ(lengthsWith({{"mChannelsPerFrame", 2}}), whole);
  EXPECT_EQ(lengthsWith({{"anything", 2}}), whole);
  EXPECT_EQ(lengthsWith({{"session_output_running", true}}), whole);
}

TEST_F(CreateVolumeMessages, EqualValuesOfOtherKindsAreNoChange) {
  const Rows whole{"30"};
  EXPECT_EQ(lengthsWith({{"ringerstate", 0}}), whole);
  EXPECT_EQ(lengthsWith({{"spatializationEnabled", 0.0}}), whole);
  EXPECT_EQ(lengthsWith({{"KvSessionVolume", 0.5F}}), whole);
  EXPECT_EQ(lengthsWith({{"active_devices", "unknown"}}), whole);
}

TEST_F(CreateVolumeMessages, ValuesOfTheWrongKindAreReadAsConverted) {
  const Rows whole{"30"};
  const Rows cut{"20", "10"};
  EXPECT_EQ(lengthsWith({{"KvSessionVolume", "0.5 of all"}}), whole);
  EXPECT_EQ(lengthsWith({{"KvSessionVolume", "0.75"}}), cut);
  EXPECT_EQ(lengthsWith({{"ringerstate", "quiet"}}), whole);
  EXPECT_EQ(lengthsWith({{"ringerstate", "1"}}), cut);
  EXPECT_EQ(lengthsWith({{"spatializationEnabled", plist::Array{1}}}), whole);
  EXPECT_EQ(lengthsWith({{"active_devices", 5}}, {{"active_devices", "5"}}), whole);
  EXPECT_EQ(lengthsWith({{"active_devices", 6}}, {{"active_devices", "5"}}), cut);
  EXPECT_EQ(lengthsWith({{"session_selected_format", plist::Dictionary{}}}, {{"session_selected_format", "{}"}}),
            whole);
}

TEST_F(CreateVolumeMessages, SinglePrecisionComparesAndPrintsAsSuch) {
  const auto derived = create({start(0, {{"KvSessionVolume", 0.1F}}), at(20, {{"KvSessionVolume", 0.1F}}),
                               at(25, {{"KvSessionVolume", 0.1}}), end(30.1)});
  EXPECT_EQ(rows(derived, {"KvSessionVolume", "KvSessionVolumeBucketed", "play_seconds"}),
            (Rows{"0.1 0.125 25", "0.1 0.125 5.1"}));
}

TEST_F(CreateVolumeMessages, LengthIsBucketedFromTheDoubleAndStoredAsAFloat) {
  const double length = 7.5 - 1e-9;  // nearer to 5, but 7.5 in single precision
  const auto derived = create({start(0, {{"KvSessionVolume", 1}}), end(length)});
  EXPECT_EQ(rows(derived, {"play_seconds", "play_secondsBucketed", "KvSessionVolumeBucketed"}), (Rows{"7.5 5 1.0"}));
}

TEST_F(CreateVolumeMessages, ChangesSeenInTheStoppingMessageCountForNothing) {
  EXPECT_EQ(rows(create({start(0, {{"KvSessionVolume", 0.5}}), end(10, {{"KvSessionVolume", 0.75}})}), kColumns),
            (Rows{"10 0.5 1 1"}));
}

TEST_F(CreateVolumeMessages, PreviousValuesFillTheState) {
  const auto derived = create({start(0), end(10)}, {{"KvSessionVolume", 0.25},
                                                    {"session_selected_format", "aac"},
                                                    {"mFormatID", "aac "},
                                                    {"active_devices", "Headphones"},
                                                    {"mChannelsPerFrame", 2},
                                                    {"spatial-audio-accessory-feature", true},
                                                    {"spatializationEnabled", 1},
                                                    {"ringerstate", true},
                                                    {"other", 1}});
  ASSERT_EQ(derived.size(), 1U);
  EXPECT_EQ(plist::description(derived[0]->message()),
            "{session_selected_format = aac; mFormatID = aac ; active_devices = Headphones; HostApplicationDisplayID = "
            "music; KvSessionVolume = 0.25; KvSessionVolumeBucketed = 0.25; play_seconds = 10; "
            "spatial-audio-accessory-feature = 1; spatializationEnabled = 1; ringerstate = 1; mChannelsPerFrame = 2; "
            "play_secondsBucketed = 10; msgidx = 1; msgcnt = 1}");
}

TEST_F(CreateVolumeMessages, OutputThatRanBeforeTheFirstMessageYieldsNothingByItself) {
  const plist::Dictionary running{
      {"session_output_running", true}, {"tarnreporting_timestamp", 0.0}, {"KvSessionVolume", 0.5}};
  EXPECT_TRUE(create({end(10)}, running).empty());
  EXPECT_TRUE(create({at(10, {{"KvSessionVolume", 0.75}}), at(20, {{"session_duration", 20}})}, running).empty());
}

TEST_F(CreateVolumeMessages, RunningMessageAfterOutputThatRanBeforeStartsAnew) {
  const plist::Dictionary running{
      {"session_output_running", true}, {"tarnreporting_timestamp", 0.0}, {"KvSessionVolume", 0.5}};
  EXPECT_EQ(rows(create({start(10), end(15)}, running), kColumns), (Rows{"5 0.5 1 1"}));
}

TEST_F(CreateVolumeMessages, SegmentsWithoutATimeOrAStartAreSkipped) {
  const plist::Dictionary volume{{"KvSessionVolume", 0.5}};
  EXPECT_TRUE(create({start(0), unstamped({{"session_output_running", false}})}, volume).empty());
  EXPECT_TRUE(create({start(-10), unstamped({{"session_output_running", false}})}, volume).empty());
  EXPECT_TRUE(create({unstamped({{"session_output_running", true}}), end(10)}, volume).empty());
  // The skipped cut at no time leaves no start for the next segment.
  EXPECT_TRUE(create({start(0), unstamped({{"KvSessionVolume", 0.75}}), end(10)}, volume).empty());
  EXPECT_TRUE(platform_.log.contains(LogLevel::Debug, "tarnTimestamp=(null), tarnTimestamp_double=0.000000"));
}

TEST_F(CreateVolumeMessages, AbsurdTimesAreTakenAsTheyAre) {
  const plist::Dictionary volume{{"KvSessionVolume", 0.5}};
  const double infinity = std::numeric_limits<double>::infinity();
  EXPECT_TRUE(create({start(10), end(10)}, volume).empty());
  EXPECT_TRUE(create({start(10), end(-5)}, volume).empty());
  EXPECT_TRUE(create({start(0), end(std::nan(""))}, volume).empty());
  EXPECT_TRUE(create({start(infinity), end(infinity)}, volume).empty());
  const std::vector<std::string> columns{"play_seconds", "play_secondsBucketed"};
  EXPECT_EQ(rows(create({start(-20), end(-10)}, volume), columns), (Rows{"10 10"}));
  EXPECT_EQ(rows(create({start(0), end(infinity)}, volume), columns), (Rows{"inf 18000"}));
  EXPECT_EQ(rows(create({start(-1e308), end(1e30)}, volume), {"play_secondsBucketed"}), (Rows{"18000"}));
  EXPECT_EQ(rows(create({stamped("3", {{"session_output_running", "1"}}), stamped("5.5 s", {{"session_duration", ""}})},
                        volume),
                 columns),
            (Rows{"2.5 1"}));
}

TEST_F(CreateVolumeMessages, LogsWhatItDoes) {
  create({start(1, {{"KvSessionVolume", 0.5}}), end(3), start(4), end(4.25)});
  EXPECT_EQ(platform_.log.messages(),
            (std::vector<std::string>{
                "entering createVolumeMessages createVolumeMessages",
                "playingTime { func=createVolumeMessages, playingTime=2.000000, tarnTimestamp=3, "
                "tarnTimestamp_double=3.000000, startTarnTimestamp=1, startTarnTimestamp_double=1.000000 }",
                "added volume message { func=createVolumeMessages, action=add, count=1 }",
                "playingTime { func=createVolumeMessages, playingTime=0.250000, tarnTimestamp=4.25, "
                "tarnTimestamp_double=4.250000, startTarnTimestamp=4, startTarnTimestamp_double=4.000000 }",
                "skipped volume message, too short { func=createVolumeMessages, action=skip, count=1 }"}));
  for (const auto& entry : platform_.log.entries()) {
    EXPECT_EQ(entry.level, LogLevel::Debug);
    EXPECT_EQ(entry.category, "tarnrr");
    EXPECT_EQ(entry.module, "TarnReportingSessionVolumeMessagesWorker");
  }
}

}  // namespace
}  // namespace tarn
