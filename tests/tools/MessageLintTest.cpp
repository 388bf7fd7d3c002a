// SPDX-License-Identifier: Apache-2.0
#include "tools/ctl/MessageLint.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "tools/script/ScriptParser.h"

namespace tarn::ctl {
namespace {

using Findings = std::vector<std::string>;

// What is found in a line of a script.
Findings found(const std::string& line, bool ownKeysAreFine = false) {
  const auto parsed = script::parseLine(line, 1);
  EXPECT_TRUE(parsed.ok()) << line;
  return MessageLint(ownKeysAreFine).findings(parsed.value);
}

Findings inMessage(const std::string& members, bool ownKeysAreFine = false,
                   const std::string& category = "\"Playback\"", const std::string& type = "\"Start\"") {
  return found(R"({"op": "sendMessage", "category": )" + category + R"(, "type": )" + type + R"(, "message": {)" +
                   members + "}}",
               ownKeysAreFine);
}

TEST(MessageLint, AMessageThatTheServiceReadsIsClean) {
  EXPECT_EQ(inMessage(R"("session_output_running": true, "KvSessionVolume": 0.5, "active_devices": "Speaker",
                         "mChannelsPerFrame": 2, "tarnreporting_timestamp": 4102444800.0)"),
            Findings());
}

TEST(MessageLint, NumbersWithoutANameAreUnknown) {
  EXPECT_EQ(inMessage("", false, "18"), Findings{"there is no category 18"});
  EXPECT_EQ(inMessage("", false, "17"), Findings());
  EXPECT_EQ(inMessage("", false, "0"), Findings{"a category 0 is none: it is printed as Undefined"});
  EXPECT_EQ(inMessage("", false, "4294967295"), Findings());
  EXPECT_EQ(inMessage("", false, "268435460"), Findings());  // the DSP's Playback
  EXPECT_EQ(inMessage("", false, "268435456"), Findings{"a category 0 is none: it is printed as Undefined"});
  EXPECT_EQ(inMessage("", false, "65540"), Findings{"there is no domain of categories 65536"});
  EXPECT_EQ(inMessage("", false, "4", "20"), Findings{"there is no type 20"});
  EXPECT_EQ(inMessage("", false, "4", "19"), Findings());
  EXPECT_EQ(found(R"({"op": "setServiceType", "reporterID": 1, "serviceType": 14})"),
            Findings{"there is no service type 14"});
  EXPECT_EQ(found(R"({"op": "setServiceType", "reporterID": 1, "serviceType": 13})"), Findings());
}

TEST(MessageLint, AValueOfAnotherKindIsWrong) {
  EXPECT_EQ(inMessage(R"("KvSessionVolume": "0.5")"),
            Findings{R"(key "KvSessionVolume" is a text: wrong kind, expected number, scalar, 0 to 1)"});
  EXPECT_EQ(inMessage(R"("KvSessionVolume": true)"),
            Findings{R"(key "KvSessionVolume" is a boolean: wrong kind, expected number, scalar, 0 to 1)"});
  EXPECT_EQ(inMessage(R"("session_output_running": "YES")"),
            Findings{R"(key "session_output_running" is a text: wrong kind, expected boolean)"});
  EXPECT_EQ(inMessage(R"("session_output_running": 2)"),
            Findings{R"(key "session_output_running" is an integer: wrong kind, expected boolean)"});
  EXPECT_EQ(inMessage(R"("session_output_running": 1)"), Findings());
  EXPECT_EQ(inMessage(R"("mChannelsPerFrame": 2.5)"),
            Findings{R"(key "mChannelsPerFrame" is a number: wrong kind, expected integer, channels, 0 to 1024)"});
  EXPECT_EQ(inMessage(R"("active_devices": ["Speaker"])"),
            Findings{R"(key "active_devices" is an array: wrong kind, expected text)"});
  EXPECT_EQ(inMessage(R"("tarnreporting_timestamp": {"$date": 4102444800})"), Findings());
  EXPECT_EQ(inMessage(R"("session_duration": {"$date": 5})"),
            Findings{R"(key "session_duration" is a date: wrong kind, expected number, s, 0 to 100000000)"});
}

TEST(MessageLint, AValueBesideItsRangeHasAnotherUnit) {
  const std::string volume = R"(wrong unit or out of range, expected number, scalar, 0 to 1)";
  EXPECT_EQ(inMessage(R"("KvSessionVolume": 0)"), Findings());
  EXPECT_EQ(inMessage(R"("KvSessionVolume": 1)"), Findings());
  EXPECT_EQ(inMessage(R"("KvSessionVolume": 55)"),
            Findings{R"(key "KvSessionVolume" is 55: )" + volume + "; is it per cent? that would be 0.55"});
  EXPECT_EQ(inMessage(R"("KvSessionVolume": -6.5)"),
            Findings{R"(key "KvSessionVolume" is -6.5: )" + volume + "; is it in decibels?"});
  EXPECT_EQ(inMessage(R"("KvSessionVolume": 101)"), Findings{R"(key "KvSessionVolume" is 101: )" + volume});
  EXPECT_EQ(inMessage(R"("tarnreporting_timestamp": 4102444800000)"),
            Findings{R"(key "tarnreporting_timestamp" is 4102444800000: wrong unit or out of range, )"
                     R"(expected number, s since 1970, 0 to 100000000000; is it in milliseconds? )"
                     R"(that would be 4102444800)"});
}

TEST(MessageLint, ARateIsATextInHertz) {
  EXPECT_EQ(inMessage(R"("vp_config_primary_vocoderFs": "16000.0")"), Findings());
  EXPECT_EQ(inMessage(R"("vp_config_primary_vocoderFs": "0.0")"), Findings());
  EXPECT_EQ(inMessage(R"("vp_config_primary_vocoderFs": "16 kHz")"),
            Findings{R"(key "vp_config_primary_vocoderFs" is "16 kHz": wrong unit, expected a number of Hz in a text, )"
                     R"(such as "16000.0")"});
  EXPECT_EQ(inMessage(R"("vp_config_primary_vocoderFs": "16")"),
            Findings{R"(key "vp_config_primary_vocoderFs" is "16": wrong unit, expected Hz; is it in kHz? )"
                     R"(that would be "16000.0")"});
  EXPECT_EQ(inMessage(R"("vp_config_primary_vocoderFs": 16000)"),
            Findings{R"(key "vp_config_primary_vocoderFs" is an integer: wrong kind, expected text, Hz)"});
}

TEST(MessageLint, ATextThatDiffersInItsCaseFromOneThatMeansSomethingIsTold) {
  EXPECT_EQ(inMessage(R"("issue_type": "overload")"), Findings());
  EXPECT_EQ(inMessage(R"("issue_type": "Silence")"), Findings());
  EXPECT_EQ(inMessage(R"("issue_type": "Overload")"),
            Findings{R"(key "issue_type" is "Overload": what means something is "overload")"});
  EXPECT_EQ(inMessage(R"("issue_type": "lowRMS")"),
            Findings{R"(key "issue_type" is "lowRMS": what means something is "LowRMS")"});
}

TEST(MessageLint, AKeyThatNobodyReadsIsToldUnlessOwnKeysAreFine) {
  EXPECT_EQ(inMessage(R"("track": 5)"), Findings{R"(no part reads the key "track")"});
  EXPECT_EQ(inMessage(R"("track": 5)", true), Findings());
}

TEST(MessageLint, AKeyThatLooksLikeAReadOneIsToldInAnyCase) {
  for (const bool ownKeysAreFine : {false, true}) {
    EXPECT_EQ(inMessage(R"("KvSessionVolum": 0.5)", ownKeysAreFine),
              Findings{R"(no part reads the key "KvSessionVolum", did you mean "KvSessionVolume"?)"});
    EXPECT_EQ(inMessage(R"("session_duration_ms": 500)", ownKeysAreFine),
              Findings{R"(no part reads the key "session_duration_ms": wrong unit? there is "session_duration" )"
                       R"((number, s, 0 to 100000000))"});
  }
}

TEST(MessageLint, AKeyThatTheServiceWritesItselfIsToldInAnyCase) {
  for (const bool ownKeysAreFine : {false, true}) {
    EXPECT_EQ(inMessage(R"("thermal_state": "Fair")", ownKeysAreFine),
              Findings{R"(no part reads the key "thermal_state": the service writes it itself )"
                       R"((TarnReportingSessionSummaryWorker))"});
  }
}

TEST(MessageLint, AKeyThatIsReadInOtherMessagesIsUnreadHere) {
  EXPECT_EQ(inMessage(R"("EngineState": "EngineOn")", false, "4", "\"Wattlog\""), Findings());
  EXPECT_EQ(inMessage(R"("EngineState": "EngineOn")"),
            Findings{R"(no part reads the key "EngineState" here, only in *.Wattlog)"});
  EXPECT_EQ(inMessage(R"("EngineState": "EngineOn")", true), Findings());
  EXPECT_EQ(inMessage(R"("io_cycle": 5)", false, "\"IO\"", "\"Error\""), Findings());
  EXPECT_EQ(inMessage(R"("io_cycle": 5)", false, "\"Playback\"", "\"Error\""),
            Findings{R"(no part reads the key "io_cycle" here, only in IO.Error)"});
  EXPECT_EQ(inMessage(R"("io_cycle": 5)", false, "268435463", "\"Error\""),  // the DSP's IO is another category
            Findings{R"(no part reads the key "io_cycle" here, only in IO.Error)"});
}

TEST(MessageLint, BlanksInKeysAreReadAsTheIntakeReadsThem) {
  EXPECT_EQ(inMessage(R"("session duration": 5)"), Findings());
  EXPECT_EQ(inMessage(R"("plac_invalid_x": 5)"), Findings());
}

TEST(MessageLint, ConfigurationsHaveKeysOfTheirOwn) {
  const auto inConfiguration = [](const std::string& members) {
    return found(R"({"op": "setConfiguration", "reporterID": 1, "configuration": {)" + members + "}}");
  };
  EXPECT_EQ(inConfiguration(R"("HostApplicationDisplayID": "a", "TarnReportingTraceType": "x")"), Findings());
  EXPECT_EQ(inConfiguration(R"("KvSessionVolume": 0.5)"),
            Findings{R"(no part reads the key "KvSessionVolume" here, only in messages)"});
  EXPECT_EQ(inMessage(R"("TarnReportingTraceType": "x")"),
            Findings{R"(no part reads the key "TarnReportingTraceType" here, only in configurations)"});
  EXPECT_EQ(inConfiguration(R"("HostApplicationDisplayID": 5)"),
            Findings{R"(key "HostApplicationDisplayID" is an integer: wrong kind, expected text)"});
}

TEST(MessageLint, OtherStepsHaveNothingToFind) {
  EXPECT_EQ(found(R"({"op": "sleep", "seconds": 1})"), Findings());
  EXPECT_EQ(found(R"({"op": "createReportingSession", "reporterID": 1})"), Findings());
}

}  // namespace
}  // namespace tarn::ctl
