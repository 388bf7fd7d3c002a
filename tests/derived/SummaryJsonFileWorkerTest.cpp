// SPDX-License-Identifier: Apache-2.0
// The worker that writes a stopped session into a file: what is in it, byte for byte, and which sessions have one.
#include "derived/TarnReportingSessionSummaryJsonFileWorker.h"

#include <cmath>

#include "session/TarnReportingSessionSummaryWorker.h"
#include "tests/derived/SummaryJsonFileFixture.h"

namespace tarn {
namespace {

using namespace testing;
using Strings = std::vector<std::string>;

class SummaryJsonFileWorker : public SummaryJsonFileFixture {};

TEST_F(SummaryJsonFileWorker, EachPairIsCountedInLogOrderBetweenTheBrackets) {
  const auto session = makeTestSession();
  session->start();
  session->sendMessage(
      message({{"volume", 0.5F}, {"route", "Speaker"}}, AudioEventCategory::Volume, AudioEventType::Summary));
  session->sendMessage(
      message({{"volume", 0.25}, {"route", "Headphones"}}, AudioEventCategory::Volume, AudioEventType::Summary));
  session->sendMessage(message({{"engine", 3}}));
  session->stop();
  EXPECT_EQ(onlyFile(), golden("three_messages.json"));
}

TEST_F(SummaryJsonFileWorker, ValuesOfEveryKindThatJsonHoldsAreWrittenWithSortedKeys) {
  const auto session = makeTestSession();
  session->start();
  session->sendMessage(
      message({{"text", "quote \" slash / back \\ tab \t bell \a \xc3\xa9 \xf0\x9f\x8e\xb5"},
               {"Upper", true},
               {"upper", false},
               {"negative", -7},
               {"largest", UINT64_MAX},
               {"smallest", INT64_MIN},
               {"float", 0.1F},
               {"double", 0.1},
               {"whole", 10.0},
               {"huge", 1e300},
               {"key \"quoted\"\n", ""},
               {"empty array", plist::Array()},
               {"empty dictionary", plist::Dictionary()},
               {"nested", plist::Array{1, plist::Array{2}, plist::Dictionary{{"z", 1}, {"a", "b"}}}}}));
  session->stop();
  EXPECT_EQ(onlyFile(), golden("values.json"));
}

TEST_F(SummaryJsonFileWorker, SessionWithoutClientMessagesShowsItsMarkers) {
  const auto session = makeTestSession();
  session->start();
  session->stop();
  EXPECT_EQ(memberNames(onlyFile()), (Strings{"Setup_Start_1", "Setup_Stop_1"}));
}

TEST_F(SummaryJsonFileWorker, DerivedMessagesOfTheStopAreWritten) {
  useWorkers<TarnReportingSessionSummaryJsonFileWorker, ProducerWorker, TarnReportingSessionSummaryWorker>();
  const auto session = makeTestSession();
  session->start();
  session->stop();
  EXPECT_EQ(memberNames(onlyFile()),
            (Strings{"Setup_Start_1", "Setup_Stop_1", "Generic_Summary_1", "Session_Generic_Summary_1"}));
}

TEST_F(SummaryJsonFileWorker, RedundantMessagesAreNotWrittenAndDoNotAdvanceTheCounters) {
  const auto session = makeTestSession();
  session->start();
  for (int i = 0; i < 3; ++i) {
    session->sendMessage(message({{"n", i}}));
  }
  session->messages()[2]->setIsRedundant(true);  // the one in the middle
  session->stop();
  const json file = json::parse(onlyFile());
  EXPECT_EQ(memberNames(onlyFile()),
            (Strings{"Setup_Start_1", "Playback_Start_1", "Playback_Start_2", "Setup_Stop_1"}));
  EXPECT_EQ(file.at(1).at("Playback_Start_1").at("n"), 0);
  EXPECT_EQ(file.at(2).at("Playback_Start_2").at("n"), 2);
}

TEST_F(SummaryJsonFileWorker, SessionOfRedundantMessagesAloneCreatesNoFileAndClosesNothing) {
  const auto session = makeTestSession();
  session->sendMessage(message({{"n", 1}}));
  session->messages().front()->setIsRedundant(true);
  TarnReportingSessionSummaryJsonFileWorker::initWithSession(session)->stop();
  EXPECT_TRUE(platform_.fileSystem.files().empty());
  EXPECT_FALSE(platform_.log.contains("SummaryJsonFileWorker failed"));
  EXPECT_FALSE(platform_.log.contains("SummaryJsonFileWorker closed"));
}

TEST_F(SummaryJsonFileWorker, StopWithNothingToWriteLeavesTheFileBeforeAlone) {
  const auto session = makeTestSession();
  session->sendMessage(message({{"n", 1}}));
  const auto worker = TarnReportingSessionSummaryJsonFileWorker::initWithSession(session);
  worker->stop();
  const std::string before = onlyFile();
  platform_.log.clear();
  session->messages().front()->setIsRedundant(true);
  worker->stop();
  EXPECT_EQ(onlyFile(), before);
  EXPECT_TRUE(platform_.log.entries().empty());
}

TEST_F(SummaryJsonFileWorker, EmptyLogCreatesNoFile) {
  const auto session = makeTestSession();
  TarnReportingSessionSummaryJsonFileWorker::initWithSession(session)->stop();
  EXPECT_TRUE(platform_.fileSystem.files().empty());
  EXPECT_FALSE(platform_.fileSystem.exists(kDirectory));
}

TEST_F(SummaryJsonFileWorker, MessagesSayWhetherTheSessionWasStartedInPlace) {
  const auto session = makeTestSession();
  const auto early = message({{"n", 1}});
  const auto late = message({{"n", 2}});
  session->sendMessage(early);
  session->start();
  session->sendMessage(late);
  session->stop();
  EXPECT_EQ(early->message()["isSessionStarted"].text(), "NO");
  EXPECT_EQ(late->message()["isSessionStarted"].text(), "YES");
  const json file = json::parse(onlyFile());
  EXPECT_EQ(file.at(0).at("Playback_Start_1").at("isSessionStarted"), "NO");
  EXPECT_EQ(file.at(2).at("Playback_Start_2").at("isSessionStarted"), "YES");
}

TEST_F(SummaryJsonFileWorker, EachStopWritesAFileOfItsPeriod) {
  const auto session = makeTestSession();
  for (int period = 0; period < 2; ++period) {
    session->start();
    session->sendMessage(message({{"period", period}}));
    session->stop();
    platform_.clock.advance(std::chrono::seconds(1));
  }
  const Strings files = platform_.fileSystem.files();
  ASSERT_EQ(files, (Strings{pathOf("20240131-142501+0100-4711-Unknown-test.json"),
                            pathOf("20240131-142502+0100-4711-Unknown-test.json")}));
  const json second = json::parse(contentOf(files[1]));
  EXPECT_EQ(second.size(), 3U);
  EXPECT_EQ(second.at(1).at("Playback_Start_1").at("period"), 1);
}

// Which sessions have a file.

TEST_F(SummaryJsonFileWorker, OtherServiceTypesOutsideInternalBuildsHaveNoWorkerAndNoFile) {
  useWorkers<TarnReportingSessionSummaryJsonFileWorker>();
  for (const auto type : {AudioServiceType::Unknown, AudioServiceType::Alerts, AudioServiceType::APIUsage}) {
    const auto session = makeSession();
    session->setServiceType(type);
    session->start();
    session->sendMessage(message({{"n", 1}}));
    EXPECT_EQ(session->workerInstanceCount(), 0U);
    session->stop();
  }
  EXPECT_TRUE(platform_.fileSystem.files().empty());
}

TEST_F(SummaryJsonFileWorker, InternalBuildsHaveOneForEveryServiceType) {
  platform_.deviceProperties.set("InternalBuild", true);
  const auto session = makeSession(-5);
  session->setServiceType(AudioServiceType::LongFormAudio);
  session->start();
  session->stop();
  EXPECT_EQ(platform_.fileSystem.files(), (Strings{pathOf("20240131-142501+0100--5-Unknown-longformaudio.json")}));
}

TEST_F(SummaryJsonFileWorker, SingleMessageSessionsHaveNone) {
  const auto session = makeSession(1, TarnReportingSession::Mode::SingleMessage);
  session->setServiceType(AudioServiceType::Test);
  session->start();
  session->stop();
  EXPECT_TRUE(platform_.fileSystem.files().empty());
}

TEST_F(SummaryJsonFileWorker, WorkerRunsFromTheBeginning) {
  EXPECT_TRUE(TarnReportingSessionSummaryJsonFileWorker::initWithSession(makeTestSession())->started());
}

// The file's name and place.

TEST_F(SummaryJsonFileWorker, NameHoldsLocalTimeReporterApplicationAndService) {
  const auto session = makeTestSession();
  configure(*session, "org.example.music");
  stopAndStart(*session);
  EXPECT_EQ(platform_.fileSystem.files(), (Strings{pathOf("20240131-142501+0100-4711-org.example.music-test.json")}));
}

TEST_F(SummaryJsonFileWorker, SlashInTheApplicationNameBecomesAnUnderscore) {
  const auto session = makeTestSession();
  configure(*session, "../../etc/x");
  stopAndStart(*session);
  EXPECT_EQ(platform_.fileSystem.files(), (Strings{pathOf("20240131-142501+0100-4711-.._.._etc_x-test.json")}));
}

TEST_F(SummaryJsonFileWorker, NulInTheApplicationNameBecomesAnUnderscore) {
  const auto session = makeTestSession();
  configure(*session, std::string_view("a\0b", 3));
  stopAndStart(*session);
  EXPECT_EQ(platform_.fileSystem.files(), (Strings{pathOf("20240131-142501+0100-4711-a_b-test.json")}));
}

TEST_F(SummaryJsonFileWorker, ApplicationNameThatIsNoTextIsDescribed) {
  const auto session = makeTestSession();
  configure(*session, 2.5);
  stopAndStart(*session);
  EXPECT_EQ(platform_.fileSystem.files(), (Strings{pathOf("20240131-142501+0100-4711-2.5-test.json")}));
}

TEST_F(SummaryJsonFileWorker, TakenNamesGetANumberBeforeTheEnding) {
  const auto session = makeTestSession();
  for (int i = 0; i < 3; ++i) {
    stopAndStart(*session);
  }
  EXPECT_EQ(platform_.fileSystem.files(), (Strings{pathOf("20240131-142501+0100-4711-Unknown-test-2.json"),
                                                   pathOf("20240131-142501+0100-4711-Unknown-test-3.json"),
                                                   pathOf("20240131-142501+0100-4711-Unknown-test.json")}));
}

TEST_F(SummaryJsonFileWorker, TakenFileIsLeftAsItIs) {
  const std::string taken = pathOf("20240131-142501+0100-4711-Unknown-test.json");
  platform_.fileSystem.putFile(taken, "mine");
  stopAndStart(*makeTestSession());
  EXPECT_EQ(contentOf(taken), "mine");
}

TEST_F(SummaryJsonFileWorker, DirectoryIsMadeWithItsParentsForEverybody) {
  stopAndStart(*makeTestSession());
  EXPECT_EQ(platform_.fileSystem.directoryPermissions("/device/DiagnosticLogs/Audio"), 0777U);
  EXPECT_EQ(platform_.fileSystem.directoryPermissions(kDirectory), 0777U);
}

TEST_F(SummaryJsonFileWorker, OpeningAndClosingAreLogged) {
  stopAndStart(*makeTestSession());
  const std::string path = pathOf("20240131-142501+0100-4711-Unknown-test.json");
  EXPECT_EQ(ownLines(platform::LogLevel::Info),
            (Strings{"SummaryJsonFileWorker opened file. action=open file=" + path,
                     "SummaryJsonFileWorker closed file. action=close file=" + path}));
  EXPECT_TRUE(ownLines(platform::LogLevel::Error).empty());
  EXPECT_EQ(platform_.fileSystem.openFiles(), 0U);
}

// Values that JSON can't hold.

struct Misfit {
  const char* name;
  plist::Value value;
  std::string complaint;
};
void PrintTo(const Misfit& misfit, std::ostream* out) {  // NOLINT(readability-identifier-naming): as gtest calls it
  *out << misfit.name;
}

class SummaryJsonFileMisfit : public SummaryJsonFileFixture, public ::testing::WithParamInterface<Misfit> {};

TEST_P(SummaryJsonFileMisfit, LeavesItsMessageOutAndTheFileStaysValid) {
  const auto session = makeTestSession();
  session->start();
  session->sendMessage(message({{"n", 1}}));
  const auto bad = message({{"n", 2}, {"bad", GetParam().value}});
  session->sendMessage(bad);
  session->sendMessage(message({{"n", 3}}));
  session->stop();
  EXPECT_EQ(ownLines(platform::LogLevel::Error), (Strings{"dataWithJSONObject: " + GetParam().complaint}));
  EXPECT_EQ(onlyFile(), golden("without_the_misfit.json"));
  EXPECT_EQ(bad->message()["isSessionStarted"].text(), "YES");
}

// An array of just this item; of an array in braces clang makes a copy.
plist::Array inArray(const plist::ValueView& item) {
  plist::Array array;
  array.append(item);
  return array;
}

INSTANTIATE_TEST_SUITE_P(
    Values, SummaryJsonFileMisfit,
    ::testing::Values(Misfit{"Date", plist::Date{1700000000}, R"(JSON can't hold a date at ["bad"])"},
                      Misfit{"Data", plist::DataView{"\x01\x02"}, R"(JSON can't hold data at ["bad"])"},
                      Misfit{"NotANumber", std::nan(""), R"(JSON can't hold a number that is not finite at ["bad"])"},
                      Misfit{"Infinite", HUGE_VAL, R"(JSON can't hold a number that is not finite at ["bad"])"},
                      Misfit{"InfiniteFloat", -HUGE_VALF, R"(JSON can't hold a number that is not finite at ["bad"])"},
                      Misfit{"NestedDate", plist::Dictionary{{"list", plist::Array{1, plist::Date{0}}}},
                             R"(JSON can't hold a date at ["bad"]["list"][1])"},
                      Misfit{"NestedData", inArray(plist::Array{plist::DataView{""}}),
                             R"(JSON can't hold data at ["bad"][0][0])"},
                      Misfit{"NestedInfinite", plist::Array{plist::Dictionary{{"x", HUGE_VAL}}},
                             R"(JSON can't hold a number that is not finite at ["bad"][0]["x"])"}),
    [](const auto& test) { return std::string(test.param.name); });

TEST_F(SummaryJsonFileWorker, MisfitInTheFirstMessageLeavesNoCommaBehind) {
  const auto session = makeTestSession();
  session->sendMessage(message({{"when", plist::Date{1}}}));
  session->start();
  session->stop();
  EXPECT_EQ(onlyFile().substr(0, 4), "[\n{\n");
  EXPECT_EQ(memberNames(onlyFile()), (Strings{"Setup_Start_1", "Setup_Stop_1"}));
}

TEST_F(SummaryJsonFileWorker, MisfitInTheLastMessageLeavesNoCommaBehind) {
  const auto session = makeTestSession();
  session->start();
  session->sendMessage(message({{"when", plist::Date{1}}, {"tarnreporting_timestamp", now() + 60}}));
  session->stop();
  EXPECT_EQ(memberNames(onlyFile()), (Strings{"Setup_Start_1", "Setup_Stop_1"}));
}

TEST_F(SummaryJsonFileWorker, MisfitsAloneMakeAnEmptyArray) {
  const auto session = makeTestSession();
  session->sendMessage(message({{"when", plist::Date{1}}}));
  TarnReportingSessionSummaryJsonFileWorker::initWithSession(session)->stop();
  EXPECT_EQ(onlyFile(), "[\n]\n");
}

}  // namespace
}  // namespace tarn
