// SPDX-License-Identifier: Apache-2.0
#include "tools/script/ScriptParser.h"

#include <gtest/gtest.h>

#include <filesystem>
#include <fstream>
#include <string>
#include <utility>

namespace tarn::script {
namespace {

ScriptStep parsed(std::string_view text) {
  auto [step, error] = parseLine(text, 7);
  EXPECT_TRUE(error.ok()) << text << ": " << error.text();
  return std::move(step);
}

std::string faultOf(std::string_view text) {
  const Result<ScriptStep> result = parseLine(text, 7);
  EXPECT_TRUE(result.failed()) << text << " was taken";
  return result.error.text();
}

bool contains(const std::string& text, std::string_view part) {
  return text.find(part) != std::string::npos;
}

std::string messageLine(const std::string& message) {
  return R"({"op":"sendMessage","category":1,"type":0,"message":)" + message + "}";
}

TEST(ScriptParser, ReadsEveryArgumentOfAMessage) {
  const ScriptStep step = parsed(
      R"({"op":"sendMessage","client":"a","category":"Volume","type":"Summary","reporterIDs":[1,-2],"message":{"b":1,"a":2}})");
  EXPECT_EQ(step.kind, ScriptStep::Kind::Request);
  EXPECT_EQ(step.op, "sendMessage");
  EXPECT_EQ(step.client, "a");
  EXPECT_EQ(step.line, 7U);
  EXPECT_EQ(step.request.operation, wire::Operation::SendMessage);
  EXPECT_EQ(step.request.category, 14U);
  EXPECT_EQ(step.request.type, 11U);
  EXPECT_EQ(step.request.reporterIDs, (std::vector<std::int64_t>{1, -2}));
  EXPECT_EQ(plist::description(step.request.dictionary), "{b = 1; a = 2}");
}

TEST(ScriptParser, KnowsAllElevenOperations) {
  const std::pair<const char*, wire::Operation> rows[] = {
      {R"({"op":"createReportingSession","reporterID":1})", wire::Operation::CreateReportingSession},
      {R"({"op":"setServiceType","reporterID":1,"serviceType":2})", wire::Operation::SetServiceType},
      {R"({"op":"getServiceNameForReporterID","reporterID":1})", wire::Operation::GetServiceNameForReporterID},
      {R"({"op":"setConfiguration","reporterID":1,"configuration":{}})", wire::Operation::SetConfiguration},
      {R"({"op":"startReportingSessionForID","reporterID":1})", wire::Operation::StartReportingSessionForID},
      {R"({"op":"sendMessage","message":{},"category":1,"type":1})", wire::Operation::SendMessage},
      {R"({"op":"stopReportingSessionForID","reporterID":1})", wire::Operation::StopReportingSessionForID},
      {R"({"op":"destroyReportingSession","reporterID":1})", wire::Operation::DestroyReportingSession},
      {R"({"op":"reporterID","reporterID":1})", wire::Operation::ReporterID},
      {R"({"op":"getAllReporters"})", wire::Operation::GetAllReporters},
      {R"({"op":"killService"})", wire::Operation::KillService},
  };
  for (const auto& [text, operation] : rows) {
    EXPECT_EQ(parsed(text).request.operation, operation) << text;
  }
}

TEST(ScriptParser, NamesTheMainConnectionWhenALineNamesNone) {
  EXPECT_EQ(parsed(R"({"op":"getAllReporters"})").client, "main");
}

TEST(ScriptParser, LeavesReporterIDsOutWhenTheLineDoes) {
  EXPECT_FALSE(parsed(messageLine("{}")).request.reporterIDs.has_value());
}

TEST(ScriptParser, KeepsAnEmptyListOfReporterIDs) {
  const ScriptStep step = parsed(R"({"op":"sendMessage","category":1,"type":0,"message":{},"reporterIDs":[]})");
  ASSERT_TRUE(step.request.reporterIDs.has_value());
  EXPECT_TRUE(step.request.reporterIDs->empty());
}

TEST(ScriptParser, ReadsSleepAndDisconnect) {
  const ScriptStep sleep = parsed(R"({"op":"sleep","seconds":0.25})");
  EXPECT_EQ(sleep.kind, ScriptStep::Kind::Sleep);
  EXPECT_EQ(sleep.seconds, 0.25);
  const ScriptStep disconnect = parsed(R"({"op":"disconnect","client":"b"})");
  EXPECT_EQ(disconnect.kind, ScriptStep::Kind::Disconnect);
  EXPECT_EQ(disconnect.client, "b");
}

TEST(ScriptParser, KeepsIntegersAndDoublesApart) {
  const plist::Dictionary message =
      parsed(messageLine(R"({"i":-3,"u":18446744073709551615,"d":3.0,"e":1e2,"b":true})")).request.dictionary;
  EXPECT_EQ(message.get("i").kind(), plist::Kind::Signed);
  EXPECT_EQ(message.get("u").unsignedValue(), 18446744073709551615U);
  EXPECT_EQ(message.get("d").kind(), plist::Kind::Double);
  EXPECT_EQ(message.get("e").kind(), plist::Kind::Double);
  EXPECT_EQ(message.get("b").kind(), plist::Kind::Bool);
}

TEST(ScriptParser, ReadsDatesAndData) {
  const plist::Dictionary message =
      parsed(messageLine(R"({"at":{"$date":12.5},"bytes":{"$data":"CgsM"}})")).request.dictionary;
  EXPECT_EQ(message.get("at").dateValue().epochSeconds, 12.5);
  EXPECT_EQ(message.get("bytes").kind(), plist::Kind::Data);
  EXPECT_EQ(message.get("bytes").data(), "\x0a\x0b\x0c");
}

TEST(ScriptParser, RefusesNamesThatOnlyThePrintersWrite) {
  for (const char* name : {"Tessels", "Undefined", "DSP_Playback", "Session_Generic", "playback", ""}) {
    const std::string text = R"({"op":"sendMessage","message":{},"type":0,"category":")" + std::string(name) + "\"}";
    EXPECT_TRUE(contains(faultOf(text), "expected an integer from 0 to 4294967295 or one of Generic, Record")) << name;
  }
  EXPECT_TRUE(contains(faultOf(R"({"op":"sendMessage","message":{},"category":0,"type":"MemoryLog"})"), "MemoryLog"));
  EXPECT_TRUE(contains(faultOf(R"({"op":"setServiceType","reporterID":1,"serviceType":"Generic"})"), "Generic"));
}

TEST(ScriptParser, TakesTheNamesOfTheFallbacksThemselves) {
  EXPECT_EQ(parsed(R"({"op":"sendMessage","message":{},"category":"Unknown","type":"Generic"})").request.category,
            0xFFFFFFFFU);
  EXPECT_EQ(parsed(R"({"op":"sendMessage","message":{},"category":"Generic","type":"Generic"})").request.type, 0U);
  EXPECT_EQ(parsed(R"({"op":"sendMessage","message":{},"category":"Generic","type":"Unknown"})").request.type, 65535U);
  EXPECT_EQ(parsed(R"({"op":"setServiceType","reporterID":1,"serviceType":"unknown"})").request.serviceType, 65535U);
}

TEST(ScriptParser, ListsEachNameOnceInAComplaint) {
  const std::string fault = faultOf(R"({"op":"setServiceType","reporterID":1,"serviceType":"none"})");
  EXPECT_TRUE(contains(fault,
                       "generic, wisp, telephony, haptics, alarms, standalone, soundautoconfig, longformaudio, "
                       "nonlongformaudio, audiodeviceusage, alerts, test, apiusage, systemsounds, unknown"))
      << fault;
}

TEST(ScriptParser, TakesTheLimitsOfEachRangeAndNothingBeyond) {
  EXPECT_EQ(parsed(R"({"op":"reporterID","reporterID":-9223372036854775808})").request.reporterID, INT64_MIN);
  EXPECT_EQ(parsed(R"({"op":"reporterID","reporterID":9223372036854775807})").request.reporterID, INT64_MAX);
  faultOf(R"({"op":"reporterID","reporterID":9223372036854775808})");
  EXPECT_EQ(parsed(R"({"op":"setServiceType","reporterID":1,"serviceType":65535})").request.serviceType, 65535U);
  faultOf(R"({"op":"setServiceType","reporterID":1,"serviceType":65536})");
  faultOf(R"({"op":"setServiceType","reporterID":1,"serviceType":-1})");
  EXPECT_EQ(parsed(R"({"op":"sendMessage","message":{},"category":4294967295,"type":0})").request.category,
            4294967295U);
  faultOf(R"({"op":"sendMessage","message":{},"category":4294967296,"type":0})");
}

TEST(ScriptParser, RefusesValuesOfAnotherKind) {
  faultOf(R"({"op":"reporterID","reporterID":1.0})");
  faultOf(R"({"op":"reporterID","reporterID":"1"})");
  faultOf(R"({"op":"reporterID","reporterID":true})");
  faultOf(R"({"op":"sendMessage","message":[],"category":1,"type":0})");
  faultOf(R"({"op":"sendMessage","message":{},"category":true,"type":0})");
  faultOf(R"({"op":"sendMessage","message":{},"category":1,"type":0.0})");
  faultOf(R"({"op":"sendMessage","message":{},"category":1,"type":0,"reporterIDs":1})");
  faultOf(R"({"op":"sendMessage","message":{},"category":1,"type":0,"reporterIDs":["1"]})");
  faultOf(R"({"op":"sleep","seconds":-1})");
  faultOf(R"({"op":"sleep","seconds":"1"})");
  faultOf(R"({"op":"sleep","seconds":1e30})");
  faultOf(R"({"op":"getAllReporters","client":1})");
  faultOf(R"({"op":"getAllReporters","client":""})");
  faultOf(R"({"op":17})");
}

TEST(ScriptParser, ShowsAWrongValueAsItIsWritten) {
  EXPECT_TRUE(contains(faultOf("[]"), "the line is [], expected"));
  EXPECT_TRUE(contains(faultOf(R"({"op":"reporterID","reporterID":true})"), "is true, expected"));
  EXPECT_TRUE(contains(faultOf(R"({"op":"reporterID","reporterID":{"a":[1,"b"]}})"), R"(is {"a":[1,"b"]}, expected)"));
  EXPECT_TRUE(contains(faultOf(R"({"op":"reporterID","reporterID":"1"})"), R"(is "1", expected)"));
}

TEST(ScriptParser, NamesTheMemberThatIsMissing) {
  EXPECT_TRUE(contains(faultOf(R"({"op":"sendMessage","category":1,"type":0})"), "lacks the member \"message\""));
  EXPECT_TRUE(contains(faultOf(R"({"op":"setServiceType","serviceType":1})"), "lacks the member \"reporterID\""));
  EXPECT_TRUE(contains(faultOf(R"({"client":"a"})"), "there is no member \"op\""));
}

TEST(ScriptParser, RefusesMembersThatTheOperationDoesNotHave) {
  const std::string fault = faultOf(R"({"op":"getAllReporters","reporterID":1})");
  EXPECT_EQ(fault, "getAllReporters has no member \"reporterID\", expected only \"op\", \"client\"");
  faultOf(R"({"op":"reporterID","reporterID":1,"volume":2})");
  faultOf(R"({"op":"disconnect","seconds":1})");
}

TEST(ScriptParser, RefusesOperationsThatAreNoneOfTheRemoteInterface) {
  for (const char* op : {"status", "Sleep", "sendmessage", "sendMessage ", ""}) {
    EXPECT_TRUE(contains(faultOf(R"({"op":")" + std::string(op) + "\"}"), "expected a remote operation")) << op;
  }
}

TEST(ScriptParser, RefusesWhatIsNotOneJsonObject) {
  for (const char* text : {"", "7", "[]", "{", "{}}", "{\"op\":\"getAllReporters\"} x", "nonsense", "{\"op\":'x'}"}) {
    faultOf(text);
  }
}

TEST(ScriptParser, RefusesAKeyGivenTwice) {
  faultOf(R"({"op":"getAllReporters","op":"killService"})");
  faultOf(messageLine(R"({"a":1,"a":2})"));
  faultOf(messageLine(R"({"list":[{"a":1,"a":1}]})"));
}

TEST(ScriptParser, RefusesWhatAPropertyListCannotHold) {
  faultOf(messageLine(R"({"a":null})"));
  faultOf(messageLine(R"({"a":18446744073709551616})"));
  faultOf(messageLine(R"({"a":-9223372036854775809})"));
  faultOf(messageLine(R"({"a":{"$data":"x"}})"));
  faultOf(messageLine(R"({"a":{"$date":"x"}})"));
  faultOf(messageLine("{\"a\":\"\xff\"}"));
}

TEST(ScriptParser, TakesMessagesAsDeepAsTheWireDoes) {
  const auto nested = [](std::size_t levels) {
    std::string text = "{\"a\":";
    for (std::size_t level = 1; level < levels; ++level) {
      text += '[';
    }
    text += "1";
    text.append(levels - 1, ']');
    return messageLine(text + "}");
  };
  EXPECT_EQ(parsed(nested(wire::kMaxNesting)).request.dictionary.size(), 1U);
  EXPECT_TRUE(contains(faultOf(nested(wire::kMaxNesting + 1)), "nested deeper"));
}

TEST(ScriptParser, SurvivesNestingWithoutEnd) {
  faultOf(std::string(1000000, '['));
}

TEST(ScriptParser, ShowsLongValuesShortened) {
  const std::string fault = faultOf(R"({"op":"reporterID","reporterID":")" + std::string(100000, 'x') + "\"}");
  EXPECT_LT(fault.size(), 200U);
  EXPECT_TRUE(contains(fault, "...")) << fault;
}

// The fuzzer's seeds and the examples, with every line cut short at every place as well.
TEST(ScriptParser, TakesOrRefusesEveryBeginningOfTheSeeds) {
  std::size_t taken = 0;
  for (const auto& entry : std::filesystem::directory_iterator(TARN_SCRIPT_SEEDS)) {
    std::ifstream file(entry.path());
    for (std::string line; std::getline(file, line);) {
      for (std::size_t length = 0; length <= line.size(); ++length) {
        const Status fault = parseLine(std::string_view(line).substr(0, length), 1).error;
        ASSERT_TRUE(fault.ok() || !fault->text.empty()) << entry.path() << ": " << line;
        ASSERT_TRUE(fault.failed() || length == line.size()) << "taken: " << line.substr(0, length);
        taken += fault.ok() ? 1U : 0U;
      }
    }
  }
  EXPECT_GT(taken, 40U);
}

TEST(ScriptParser, TellsBlankLinesFromOthers) {
  EXPECT_TRUE(isBlank(""));
  EXPECT_TRUE(isBlank(" \t\r"));
  EXPECT_FALSE(isBlank(" {"));
}

}  // namespace
}  // namespace tarn::script
