// SPDX-License-Identifier: Apache-2.0
#include "tools/ctl/sessions/SessionMessage.h"

#include "service/vocabulary/TarnReportingVocabulary.h"
#include "tests/ctl/SessionStoreFixture.h"

namespace tarn::ctl {
namespace {

recorder::EventRow row(const std::string& name, const std::string& payload) {
  return {42, 1000.5, "tally", name, payload, "{}"};
}

bool isDerived(const std::string& kind, const std::string& payload) {
  const auto message = messageOf(row("sys.oxbow.tarnkit." + kind, payload));
  return message && message->isDerived;
}

TEST(SessionMessage, ComesBackFromItsAnalyticsEvent) {
  const auto message = messageOf(
      row("sys.oxbow.tarnkit.DSP_Playback.Start", R"({"n":1,"tarnreporting_timestamp":1795158000.125,"x":[1,"a"]})"));
  ASSERT_TRUE(message.has_value());
  EXPECT_EQ(message->event, 42);
  EXPECT_EQ(message->handedOver, 1000.5);
  EXPECT_EQ(message->stamp, 1795158000.125);
  EXPECT_EQ(message->kind(), "DSP_Playback.Start");
  EXPECT_EQ(message->payload.get("n").kind(), plist::Kind::Signed);
  EXPECT_FALSE(message->isDerived);
}

TEST(SessionMessage, TheSecondNameSaysTheSame) {
  EXPECT_EQ(messageOf(row("sys.oxbow.longformaudio.Playback.Start", "{}"))->kind(), "Playback.Start");
}

TEST(SessionMessage, OtherEventsAreNone) {
  EXPECT_FALSE(messageOf(row("sys.oxbow.tarnkit.tarnreportingclientuptime", "{}")).has_value());
  EXPECT_FALSE(messageOf(row("org.example.Playback.Start", "{}")).has_value());
  EXPECT_FALSE(messageOf(row("sys.oxbow.tarnkit.Playback.Start", "[]")).has_value());
  EXPECT_FALSE(messageOf(row("sys.oxbow.tarnkit.Playback.Start", "{")).has_value());
  recorder::EventRow mirror = row("sendMessage", "{}");
  mirror.backend = "rtc";
  EXPECT_FALSE(messageOf(mirror).has_value());
}

TEST(SessionMessage, AStampMayBeADateOrMissing) {
  EXPECT_EQ(
      messageOf(row("sys.oxbow.tarnkit.IO.Error", R"({"tarnreporting_timestamp":"2026-11-20T07:00:00.25Z"})"))->stamp,
      1795158000.25);
  EXPECT_EQ(messageOf(row("sys.oxbow.tarnkit.IO.Error", "{}"))->stamp, 1000.5);
  EXPECT_EQ(messageOf(row("sys.oxbow.tarnkit.IO.Error", R"({"tarnreporting_timestamp":"soon"})"))->stamp, 1000.5);
}

TEST(SessionMessage, DatesAreTextsThatADateIsWrittenAs) {
  EXPECT_EQ(report::secondsOfDateText("1970-01-01T00:00:00Z"), 0);
  EXPECT_EQ(report::secondsOfDateText("1969-12-31T23:59:59Z"), -1);
  EXPECT_EQ(report::secondsOfDateText("2000-02-29T12:00:00Z"), 951825600);
  EXPECT_EQ(report::secondsOfDateText("2026-11-20T07:00:00.125Z"), 1795158000.125);
  for (const char* text : {"", "2026-11-20", "2026-11-20T07:00:00", "2026-11-20 07:00:00Z", "2026-02-30T00:00:00Z",
                           "2026-11-20T07:00:00.0Z", "2026-11-20T07:00:61Z", "2026-11-20T07:00:00ZZ", "1-1-1T1:1:1Z"}) {
    EXPECT_FALSE(report::secondsOfDateText(text).has_value()) << text;
  }
}

TEST(SessionMessage, WhatTheServiceMadeIsKnownByWhatOnlyItWrites) {
  EXPECT_TRUE(isDerived("Volume.Summary", R"({"msgidx":1,"msgcnt":1,"play_seconds":3.0})"));
  EXPECT_TRUE(isDerived("Input.Summary", R"({"msgidx":1,"msgcnt":1})"));
  EXPECT_TRUE(isDerived("Lagoon.Summary", R"({"msgidx":1,"msgcnt":1})"));
  EXPECT_TRUE(isDerived("Session_Generic.Summary", R"({"summaryServiceName":"wisp"})"));
  EXPECT_TRUE(isDerived("Flume.Simple", R"({"Driver_Group_Sub_Simple_Overruns":3})"));
  EXPECT_FALSE(isDerived("Volume.Summary", R"({"play_seconds":3.0})"));
  EXPECT_FALSE(isDerived("Volume.Generic", R"({"msgidx":1,"msgcnt":1})"));
  EXPECT_FALSE(isDerived("Session_Generic.Summary", R"({"n":1})"));
  EXPECT_FALSE(isDerived("Flume.Simple", R"({"n":1})"));
  EXPECT_FALSE(isDerived("Setup.Setup", R"({"ringerstate":true,"last_updated":1.0})"));
}

TEST(SessionMessage, MeansWhatAReportTakesItFor) {
  const auto meaning = [](const char* kind, const char* payload) {
    return messageOf(row(std::string("sys.oxbow.wisp.") + kind, payload))->meaning;
  };
  EXPECT_EQ(meaning("DSP_Error.Generic", "{}"), report::MessageKind::Error);
  EXPECT_EQ(meaning("IO.IssueDetector", R"({"issue_type":"Silence"})"), report::MessageKind::Issue);
  EXPECT_EQ(meaning("IO.Error", R"({"issue_type":"overload"})"), report::MessageKind::Overload);
  EXPECT_EQ(meaning("Volume.Summary", R"({"msgidx":1,"msgcnt":2})"), report::MessageKind::VolumeSegment);
  EXPECT_EQ(meaning("Volume.Summary", "{}"), report::MessageKind::Plain);
}

TEST(SessionMessage, AnOverloadIsWhatTheSummaryCounts) {
  const auto message = [](const char* payload) {
    return *messageOf(row("sys.oxbow.tarnkit.IO.IssueDetector", payload));
  };
  EXPECT_TRUE(isOverload(message(R"({"issue_type":"overload"})")));
  EXPECT_FALSE(isOverload(message(R"({"issue_type":"Silence"})")));
  EXPECT_FALSE(isOverload(message(R"({"issue_type":"overload","session_duration":3})")));
  EXPECT_FALSE(isOverload(message("{}")));
}

TEST(SessionMessage, NumbersAreThoseThatPrintAsTheNames) {
  for (const std::uint32_t number : {0U, 1U, 4U, 17U, 0x10000004U, 0x08000001U, 0x80000011U}) {
    const std::string name = TarnReportingUtilityCategoryString(static_cast<AudioEventCategory>(number));
    EXPECT_EQ(categoryNumber(name), number) << name;
  }
  const std::string odd = TarnReportingUtilityCategoryString(static_cast<AudioEventCategory>(0x00300003));
  ASSERT_TRUE(categoryNumber(odd).has_value()) << odd;
  EXPECT_EQ(TarnReportingUtilityCategoryString(static_cast<AudioEventCategory>(*categoryNumber(odd))), odd);
  EXPECT_FALSE(categoryNumber("Nothing").has_value());
  for (const int number : {0, 1, 14, 19, 65535}) {
    const auto name = TarnReportingUtilityTypeString(static_cast<AudioEventType>(static_cast<std::uint16_t>(number)));
    const auto found = typeNumber(name);
    ASSERT_TRUE(found.has_value()) << name;
    EXPECT_EQ(TarnReportingUtilityTypeString(static_cast<AudioEventType>(*found)), name);
  }
  EXPECT_FALSE(typeNumber("Nothing").has_value());
}

class SessionMessagesTest : public testing::SessionStoreFixture {};

TEST_F(SessionMessagesTest, EachComesOnceInTheOrderOfHandOver) {
  makeStore();
  addMessage(1, 2000, "Playback.Start", R"({"tarnreporting_timestamp":20.0})");
  addMessage(2, 2000, "Playback.Start", R"({"tarnreporting_timestamp":15.0})");
  addMessage(1, 2001, "Playback.Stop", R"({"tarnreporting_timestamp":10.0})");
  addEvent(1, 2002, "wattlog", "Loom_Haptics_ClientStatus", "{}");
  const auto messages = messagesOf(file(), 1);
  ASSERT_EQ(messages.value.size(), 2U);
  EXPECT_EQ(messages.value[0].kind(), "Playback.Start");
  EXPECT_EQ(messages.value[1].stamp, 10);
}

}  // namespace
}  // namespace tarn::ctl
