// SPDX-License-Identifier: Apache-2.0
#include "tools/report/SessionPicture.h"

#include <gtest/gtest.h>

#include "tests/report/Rows.h"

namespace tarn::report {
namespace {

using Spans = std::vector<Span>;
using Times = std::vector<double>;

constexpr const char* kOn = R"("session_output_running":true)";
constexpr const char* kOff = R"("session_output_running":false)";

TEST(SessionPicture, OutputRunsFromTheMessageThatSaysSoUntilOneThatSaysOtherwise) {
  const SessionPicture picture =
      OneSession().message(20, "Playback.Start", kOn).message(50, "Playback.Stop", kOff).picture();
  EXPECT_EQ(fromStart(picture.output), (Spans{{20, 50, ""}}));
  EXPECT_TRUE(picture.input.empty());
}

TEST(SessionPicture, InputRunsByItsOwnKey) {
  const SessionPicture picture = OneSession()
                                     .message(20, "Input.Start", R"("session_input_running":1)")
                                     .message(30, "Input.Stop", R"("session_input_running":0)")
                                     .picture();
  EXPECT_EQ(fromStart(picture.input), (Spans{{20, 30, ""}}));
  EXPECT_TRUE(picture.output.empty());
}

TEST(SessionPicture, WhatRunsAlreadyIsNotBegunAnew) {
  const SessionPicture picture = OneSession()
                                     .message(20, "Playback.Start", kOn)
                                     .message(30, "Playback.Start", kOn)
                                     .message(50, "Playback.Stop", kOff)
                                     .message(60, "Playback.Stop", kOff)
                                     .picture();
  EXPECT_EQ(fromStart(picture.output), (Spans{{20, 50, ""}}));
}

TEST(SessionPicture, WhatNobodyEndsLastsUntilThePeriodStops) {
  EXPECT_EQ(fromStart(OneSession().message(20, "Playback.Start", kOn).picture().output), (Spans{{20, 90, ""}}));
}

TEST(SessionPicture, SecondPeriodBeginsAnew) {
  OneSession rows;
  rows.periods = {periodRow(1, 10, 40), periodRow(1, 60, 90)};
  const SessionPicture picture = rows.message(20, "Playback.Start", kOn).message(70, "Playback.Start", kOn).picture();
  EXPECT_EQ(fromStart(picture.output), (Spans{{20, 40, ""}, {70, 90, ""}}));
}

TEST(SessionPicture, DurationEndsOutputInputAndGroup) {
  const SessionPicture picture =
      OneSession()
          .message(20, "Playback.Start",
                   R"("session_output_running":true,"session_input_running":true,"lagoon_session":1)")
          .message(45, "Generic.Stop", R"("session_duration":25)")
          .picture();
  const Spans expected{{20, 45, ""}};
  EXPECT_EQ(fromStart(picture.output), expected);
  EXPECT_EQ(fromStart(picture.input), expected);
  EXPECT_EQ(fromStart(picture.groups), expected);
}

TEST(SessionPicture, RouteHoldsUntilTheNextOneOrThePeriodsStop) {
  const SessionPicture picture = OneSession()
                                     .message(20, "Playback.Start", R"("active_devices":"Speaker")")
                                     .message(25, "RouteChange.Generic", R"("active_devices":"Speaker")")
                                     .message(30, "RouteChange.Generic", R"("active_devices":"Headphones")")
                                     .picture();
  EXPECT_EQ(fromStart(picture.routes), (Spans{{20, 30, "Speaker"}, {30, 90, "Headphones"}}));
}

TEST(SessionPicture, VolumeStepsWhereItChanges) {
  const SessionPicture picture = OneSession()
                                     .message(20, "Playback.Start", R"("KvSessionVolume":0.5)")
                                     .message(25, "Volume.Generic", R"("KvSessionVolume":0.5)")
                                     .message(30, "Volume.Generic", R"("KvSessionVolume":0.75)")
                                     .picture();
  EXPECT_EQ(picture.volume, (std::vector<Step>{{kStart + 20, 0.5}, {kStart + 30, 0.75}}));
}

TEST(SessionPicture, OverloadsAreThoseThatTheSummaryCounts) {
  const SessionPicture picture = OneSession()
                                     .message(20, "IO.Error", R"("issue_type":"overload")")
                                     .message(21, "Performance.Generic", R"("issue_type":"overload")")
                                     .message(22, "Performance.IssueDetector", R"("issue_type":"overload")")
                                     .message(23, "IO.Error", R"("issue_type":"overload","session_duration":3)")
                                     .picture();
  EXPECT_EQ(timesOf(picture.overloads), (Times{20, 21, 22}));
  EXPECT_EQ(timesOf(picture.errors), (Times{23}));
  EXPECT_TRUE(picture.issues.empty());
}

TEST(SessionPicture, ErrorsAreOfTheCategoryOrTheType) {
  const SessionPicture picture = OneSession()
                                     .message(20, "Error.Error", R"("issue_type":"xrun")")
                                     .message(21, "Error.Generic", "")
                                     .message(22, "DSP_Error.Generic", "")
                                     .message(23, "Playback.Error", "")
                                     .message(24, "Playback.Generic", "")
                                     .picture();
  EXPECT_EQ(timesOf(picture.errors), (Times{20, 21, 22, 23}));
  EXPECT_EQ(picture.errors[0].what, "xrun");
  EXPECT_EQ(picture.errors[1].what, "Error.Generic");
}

TEST(SessionPicture, IssueTellsWhatAndWhere) {
  const SessionPicture picture =
      OneSession().message(20, "Performance.IssueDetector", R"("issue_type":"Silence","node":"mixer")").picture();
  EXPECT_EQ(picture.issues, (std::vector<Mark>{{kStart + 20, "Silence at mixer", 1}}));
}

TEST(SessionPicture, DerivedSegmentsHaveTheirNumbersAndChangeNoLane) {
  const SessionPicture picture =
      OneSession()
          .message(
              90, "Volume.Summary",
              R"("msgidx":1,"msgcnt":1,"play_seconds":20,"KvSessionVolume":0.5,"active_devices":"Speaker","mFormatID":"aac")")
          .message(
              90, "Input.Summary",
              R"("msgidx":1,"msgcnt":1,"inputrunning_seconds":60,"active_devices":"Microphone","vocoders":"opus:48000.0")")
          .message(90, "Lagoon.Summary",
                   R"("msgidx":1,"msgcnt":1,"play_seconds":100,"active_devices":"Room","mFormatID":"flac")")
          .picture();
  EXPECT_EQ(picture.segments,
            (std::vector<Segment>{{Segment::Kind::Output, 20, 0.5, "Speaker", "aac"},
                                  {Segment::Kind::Input, 60, std::nullopt, "Microphone", "opus:48000.0"},
                                  {Segment::Kind::Group, 100, std::nullopt, "Room", "flac"}}));
  EXPECT_TRUE(picture.routes.empty());
  EXPECT_TRUE(picture.volume.empty());
}

TEST(SessionPicture, SummaryOfAClientsOwnIsAPlainMessage) {
  const SessionPicture picture = OneSession()
                                     .message(20, "Playback.Summary", R"("KvSessionVolume":0.25)")
                                     .message(30, "Volume.Summary", R"("KvSessionVolume":0.5,"play_seconds":7)")
                                     .message(40, "Session_Generic.Summary", R"("total_active_time":1)")
                                     .message(50, "Flume.Simple", R"("KvSessionVolume":0.75)")
                                     .picture();
  EXPECT_EQ(picture.volume, (std::vector<Step>{{kStart + 20, 0.25}, {kStart + 30, 0.5}, {kStart + 50, 0.75}}));
  EXPECT_TRUE(picture.segments.empty());
  EXPECT_FALSE(picture.totals);
}

TEST(SessionPicture, FormatThatWasChosenGoesBeforeItsKind) {
  const auto formatOf = [](const std::string& members) {
    return OneSession()
        .message(90, "Volume.Summary", R"("msgidx":1,"msgcnt":1,"mFormatID":"aac")" + members)
        .picture()
        .segments.at(0)
        .format;
  };
  EXPECT_EQ(formatOf(""), "aac");
  EXPECT_EQ(formatOf(R"(,"session_selected_format":"unknown")"), "aac");
  EXPECT_EQ(formatOf(R"(,"session_selected_format":"flac 44100 Hz stereo")"), "flac 44100 Hz stereo");
}

TEST(SessionPicture, StampMayBeADate) {
  OneSession rows;
  rows.events.push_back(messageRow(1, 90, "Error.Error", R"("tarnreporting_timestamp":"2026-11-20T10:00:30Z")"));
  EXPECT_EQ(timesOf(rows.picture().errors), (Times{30}));
}

TEST(SessionPicture, LastSummaryOfTheSessionCounts) {
  const SessionPicture picture =
      OneSession()
          .message(50, "Session_Generic.Summary", R"("summaryServiceName":"wisp","total_active_time":1)")
          .message(
              90, "Session_Generic.Summary",
              R"("summaryServiceName":"wisp","total_active_time":4,"active_count":2,"overload_count":1,"num_messages":3,"num_unique_messages":5)")
          .picture();
  ASSERT_TRUE(picture.totals);
  EXPECT_EQ(*picture.totals, (SessionTotals{4, 2, 1, 3, 5}));
}

TEST(SessionPicture, DriverCountersAreTheKeysThatNameAKindOfChannel) {
  const SessionPicture picture =
      OneSession()
          .message(90, "Flume.Simple", R"("Foo_Haptics_Simple_EngineOn":4,"audiotag":"FlumeSimple")")
          .message(90, "Flume.State", R"("Foo_Haptics_State_Engine":"name:on;")")
          .picture();
  EXPECT_EQ(picture.counters, (std::vector<Counter>{{kStart + 90, "Foo_Haptics_Simple_EngineOn", "4"},
                                                    {kStart + 90, "Foo_Haptics_State_Engine", "name:on;"}}));
}

TEST(SessionPicture, MessagesAreDrawnInTheOrderOfTheirStamps) {
  const SessionPicture picture =
      OneSession().stamped(21, 50, "Playback.Stop", kOff).stamped(22, 20, "Playback.Start", kOn).picture();
  EXPECT_EQ(fromStart(picture.output), (Spans{{20, 50, ""}}));
}

TEST(SessionPicture, StampFarOutsideTheSessionsLifeCountsAsOfItsArrival) {
  const SessionPicture picture = OneSession()
                                     .message(20, "Playback.Start", kOn)
                                     .message(25, "Error.Error", "")
                                     .stamped(50, 1'000'000, "Playback.Stop", kOff)
                                     .picture();
  EXPECT_FALSE(picture.inMessagesTime);
  EXPECT_EQ(fromStart(picture.output), (Spans{{20, 50, ""}}));
  EXPECT_EQ(picture.to, kStart + 100);
}

TEST(SessionPicture, StampAMinuteOutsideTheSessionsLifeIsTaken) {
  const SessionPicture picture =
      OneSession().stamped(1, -60, "Error.Error", "").stamped(2, -61, "Error.Error", "").picture();
  EXPECT_EQ(timesOf(picture.errors), (Times{-60, 2}));
  EXPECT_EQ(picture.from, kStart - 60);
}

TEST(SessionPicture, SessionThatWasPlayedAgainIsDrawnInItsMessagesTime) {
  const SessionPicture picture =
      OneSession()
          .stamped(20, 100'020, "Playback.Start", kOn)
          .stamped(20, 100'050, "Playback.Stop", kOff)
          .message(90, "Session_Generic.Summary", R"("summaryServiceName":"wisp","active_count":2)")
          .picture();
  EXPECT_TRUE(picture.inMessagesTime);
  EXPECT_EQ(fromStart(picture.output), (Spans{{100'020, 100'050, ""}}));
  EXPECT_EQ(picture.from, kStart + 100'020);
  EXPECT_EQ(picture.to, kStart + 100'050);
  EXPECT_TRUE(picture.running.empty());
  EXPECT_EQ(picture.activeSeconds, 80);
}

TEST(SessionPicture, OpenSessionAndPeriodEndNow) {
  OneSession rows;
  rows.session = sessionRow(1, 0, std::nullopt);
  rows.periods = {periodRow(1, 10, std::nullopt)};
  const SessionPicture picture = rows.message(20, "Playback.Start", kOn).picture(40);
  EXPECT_EQ(fromStart(picture.running), (Spans{{10, 40, ""}}));
  EXPECT_EQ(fromStart(picture.output), (Spans{{20, 40, ""}}));
  EXPECT_EQ(picture.activeSeconds, 30);
}

TEST(SessionPicture, ClockThatWasSetBackMakesNoTimeNegative) {
  OneSession rows;
  rows.session = sessionRow(1, 100, 20);
  rows.periods = {periodRow(1, 90, 30)};
  const SessionPicture picture = rows.picture();
  EXPECT_EQ(picture.activeSeconds, 0);
  EXPECT_LE(picture.from, picture.to);
}

TEST(SessionPicture, EventsAreCountedByBackEndAndMessagesOnce) {
  OneSession rows;
  rows.message(20, "Error.Error", "");
  EventRow other = rows.events.back();
  other.name = "sys.oxbow.longformaudio.Error.Error";
  rows.events.push_back(other);
  other.backend = "rtc";
  other.name = "sendMessage";
  rows.events.push_back(other);
  const SessionPicture picture = rows.picture();
  EXPECT_EQ(picture.events, (std::map<std::string, std::int64_t>{{"rtc", 1}, {"tally", 2}}));
  EXPECT_EQ(picture.errors.size(), 1U);
}

TEST(SessionPicture, PayloadThatIsNoObjectIsAMessageWithoutFields) {
  OneSession rows;
  rows.message(20, "Error.Error", "");
  rows.events.back().payload = "nonsense";
  EXPECT_EQ(timesOf(rows.picture().errors), (Times{20}));
}

}  // namespace
}  // namespace tarn::report
