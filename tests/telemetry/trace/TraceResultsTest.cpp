// SPDX-License-Identifier: Apache-2.0
// What becomes of a finished trace: the values, sums and key variables of the perf-data file, and where it ends up.
#include "tests/telemetry/trace/TraceFixture.h"

namespace tarn {
namespace {

using namespace testing;
using platform::LogLevel;
using Operation = FakeFileSystem::Operation;

class TraceResults : public TraceFixture {
 protected:
  void describeProbes(std::string_view plist) { platform_.fileSystem.putFile(kDescriptions, plist); }
  FakeTraceAnalysis& analysis() { return platform_.traceAnalysis; }
  void expectNoFile() const {
    EXPECT_TRUE(platform_.perfDataWriters.files().empty());
    EXPECT_EQ(analysisLoads(), 0U);
  }
  std::size_t analysisLoads() const { return platform_.traceAnalysis.loads(); }
};

TEST_F(TraceResults, FileIsWrittenUnderATemporaryNameAndMovedIntoTheAudioTraces) {
  play();
  const std::string path = std::string(kDirectory) + "/20240131-142501+0100-tarnkit-Unknown-test.pdj";
  EXPECT_EQ(file().path, kTemporaryFile);
  EXPECT_EQ(file().name, "TarnReporting");
  EXPECT_EQ(file().resultsVersion, 4);
  EXPECT_EQ(file().flags, 0U);
  EXPECT_TRUE(file().closed);
  EXPECT_EQ(platform_.fileSystem.content(path), "values");
  EXPECT_FALSE(platform_.fileSystem.exists(kTemporaryFile));
  EXPECT_EQ(platform_.fileSystem.directoryPermissions(kDirectory), 0777U);
  const Strings info = lines(LogLevel::Info);
  ASSERT_EQ(info.size(), 6U);
  EXPECT_EQ(info[3], "Starting Skein Process Trace. Path: /device/traces/1");
  EXPECT_EQ(info[4], "tempWriterPath: /device/tmp/temp_perfdata.pdj");
  EXPECT_EQ(info[5], "Moving file from tempWriterPath: /device/tmp/temp_perfdata.pdj to " + path);
  EXPECT_TRUE(errors().empty());
}

TEST_F(TraceResults, ConfigurationNamesTheFileItsDirectoryAndItsContent) {
  play({{"TarnReportingSkeinOutputFileName", "mine.pdj"},
        {"TarnReportingSkeinOutputFileDirectory", "/device/else/where"}});
  EXPECT_EQ(file().name, "mine.pdj");
  EXPECT_EQ(platform_.fileSystem.content("/device/else/where/mine.pdj"), "values");
}

TEST_F(TraceResults, DirectoryMayEndWithASlash) {
  play({{"TarnReportingSkeinOutputFileName", "mine.pdj"}, {"TarnReportingSkeinOutputFileDirectory", "/device/else/"}});
  EXPECT_EQ(platform_.fileSystem.content("/device/else/mine.pdj"), "values");
}

TEST_F(TraceResults, NamesThatAreNoTextsCountAsNone) {
  const std::vector<plist::Value> wrongs{
      5, 2.5, true, "", plist::Date{1}, plist::DataView{"x"}, plist::Array{"a"}, plist::Dictionary{{"a", "b"}}};
  for (const plist::Value& wrong : wrongs) {
    SCOPED_TRACE(description(wrong));
    platform_.fileSystem.putFile("/device/traces/" + std::to_string(platform_.performanceTrace.traces().size() + 1),
                                 "");
    putTemporaryFile();
    play({{"TarnReportingSkeinOutputFileName", wrong}, {"TarnReportingSkeinOutputFileDirectory", wrong}});
    EXPECT_EQ(platform_.perfDataWriters.files().back()->name, "TarnReporting");
    EXPECT_TRUE(
        platform_.fileSystem.exists(std::string(kDirectory) + "/20240131-142501+0100-tarnkit-Unknown-test.pdj"));
  }
  EXPECT_EQ(platform_.perfDataWriters.files().size(), wrongs.size());
}

TEST_F(TraceResults, GeneratedNameHoldsTheApplicationWithoutSlashes) {
  play({{"KvHostApplicationDisplayID", std::string_view("org/ex\0ample", 12)}});
  EXPECT_TRUE(
      platform_.fileSystem.exists(std::string(kDirectory) + "/20240131-142501+0100-tarnkit-org_ex_ample-test.pdj"));
}

TEST_F(TraceResults, NameOfTheContentIsThatOfTheSessionsFirstStart) {
  platform_.fileSystem.putFile("/device/traces/2", "");
  const auto session = makeTestSession({{"TarnReportingSkeinOutputFileName", "first.pdj"}});
  session->start();
  const plist::Dictionary later{{"TarnReportingSkeinOutputFileName", "second.pdj"}};
  session->updateConfigurationWithContentsOfConfiguration(&later);
  session->stop();
  EXPECT_EQ(file().name, "first.pdj");
  EXPECT_EQ(platform_.fileSystem.content(std::string(kDirectory) + "/second.pdj"), "values");
}

TEST_F(TraceResults, IntervalsOfTheAudioSubsystemsAreValuesWithTheirSums) {
  analysis().setIntervals({interval("a", 0.25), interval("b", 1, "sys.oxbow.audio"), interval("other", 9, "sys.oxbow"),
                           interval("a", 0.75, "the.sys.oxbow.audio.queue"), interval("b", 0.5),
                           interval("none", 3, "")});
  play();
  EXPECT_EQ(file().values, (Values{{"a", 250},
                                   {"b", 1000},
                                   {"a", 750},
                                   {"b", 500},
                                   {"a Total", 1000},
                                   {"a AVG", 500},
                                   {"b Total", 1500},
                                   {"b AVG", 750}}));
  EXPECT_EQ(keyVariables(), (Strings{"a", "b"}));
  EXPECT_TRUE(platform_.log.contains(LogLevel::Debug, "name:a time:250.000000 ms"));
  EXPECT_FALSE(platform_.log.contains("name:other"));
}

TEST_F(TraceResults, SubsystemsMayHoldTheAudioOnesAnywhere) {
  analysis().setIntervals({interval("a", 1, "sys.oxbow.tarnkit"), interval("b", 1, "the.sys.oxbow.tarnkit"),
                           interval("c", 1, "sys.oxbow.tarnkit.reporting"), interval("d", 1, "sys.oxbow.audio.hal"),
                           interval("e", 1, "sys.oxbow.tarn"), interval("f", 1, "sys.oxbow.audi")});
  play();
  EXPECT_EQ(keyVariables(), (Strings{"a", "b", "c", "d"}));
}

TEST_F(TraceResults, SignpostsComeBeforeProbesAndAllValuesBeforeTheExtensions) {
  analysis().setIntervals({interval("a", 0.001)});
  analysis().setProbes({probe("p", {0.002})});
  play();
  EXPECT_EQ(file().values, (Values{{"a", 1}, {"a Total", 1}, {"a AVG", 1}, {"p", 2}, {"p Total", 2}, {"p AVG", 2}}));
  for (const auto& extension : file().extensions) {
    EXPECT_EQ(extension.valuesBefore, 6U);
  }
}

TEST_F(TraceResults, EachMeasurementIsToldBeforeItIsWritten) {
  analysis().setIntervals({interval("a", 1), interval("a", 1)});
  analysis().setProbes({probe("p", {1, 1})});
  std::vector<std::pair<std::string, std::size_t>> written;
  platform_.order.start([&](const std::string& entry) {
    if (entry.starts_with("log name:")) {
      written.emplace_back(entry.substr(9, 7), file().values.size());
    }
  });
  play();
  EXPECT_EQ(written, (std::vector<std::pair<std::string, std::size_t>>{
                         {"a time:", 0}, {"a time:", 1}, {"event o", 4}, {"event o", 5}}));
}

TEST_F(TraceResults, TraceThatLacksEventsIsSaidToBeCut) {
  platform_.performanceTrace.setEventsLeftOut(12345);
  play();
  ASSERT_EQ(file().extensions.size(), 3U);
  EXPECT_EQ(file().extensions[2].name, "@tdg-perf.trace");
  EXPECT_EQ(file().extensions[2].members,
            (std::vector<std::pair<std::string, std::string>>{{"eventsLeftOut", "12345"}}));
  EXPECT_TRUE(file().extensions[2].ended);
}

TEST_F(TraceResults, OneEventThatIsLackingIsTold) {
  platform_.performanceTrace.setEventsLeftOut(1);
  play();
  EXPECT_EQ(file().extensions.size(), 3U);
}

TEST_F(TraceResults, EventsOfProbesAreValuesUnderTheProbesName) {
  analysis().setProbes({probe("p", {0.001, 0.003})});
  play();
  EXPECT_EQ(file().values, (Values{{"p", 1}, {"p", 3}, {"p Total", 4}, {"p AVG", 2}}));
  EXPECT_TRUE(platform_.log.contains(LogLevel::Debug, "p, SkeinSignpostIntervalProbe"));
  EXPECT_TRUE(platform_.log.contains(LogLevel::Debug, "name:event of p time:3.000000 ms"));
}

TEST_F(TraceResults, SumsOfAProbeComeBeforeTheFirstEventOfTheNext) {
  analysis().setProbes({probe("p", {0.001, 0.003}), probe("q", {0.005}), probe("r", {0.007})});
  play();
  EXPECT_EQ(file().values, (Values{{"p", 1},
                                   {"p", 3},
                                   {"p Total", 4},
                                   {"p AVG", 2},
                                   {"q", 5},
                                   {"q Total", 5},
                                   {"q AVG", 5},
                                   {"r", 7},
                                   {"r Total", 7},
                                   {"r AVG", 7}}));
}

TEST_F(TraceResults, ProbesThatWereFollowedAreKeyVariablesAndTheLastIsNot) {
  analysis().setProbes({probe("p", {1}), probe("q", {1}), probe("r", {1})});
  play();
  EXPECT_EQ(keyVariables(), (Strings{"p", "p Total", "p AVG", "q", "q Total", "q AVG"}));
}

TEST_F(TraceResults, ProbeNamedAsASignpostAddsNoKeyVariables) {
  analysis().setIntervals({interval("p", 1)});
  analysis().setProbes({probe("p", {1}), probe("q", {1})});
  play();
  EXPECT_EQ(keyVariables(), Strings{"p"});
}

TEST_F(TraceResults, ProbesOfOneNameThatFollowEachOtherAreSummedTogether) {
  analysis().setProbes({probe("p", {0.001}), probe("p", {0.003}), probe("q", {0.001}), probe("p", {0.002})});
  play();
  EXPECT_EQ(file().values, (Values{{"p", 1},
                                   {"p", 3},
                                   {"p Total", 4},
                                   {"p AVG", 2},
                                   {"q", 1},
                                   {"q Total", 1},
                                   {"q AVG", 1},
                                   {"p", 2},
                                   {"p Total", 2},
                                   {"p AVG", 2}}));
  EXPECT_EQ(keyVariables(), (Strings{"p", "p Total", "p AVG", "q", "q Total", "q AVG"}));
}

TEST_F(TraceResults, ChildrenComeBeforeTheirProbeHoweverDeep) {
  analysis().setProbes({probe("root", {0.001}, {probe("a", {0.002}, {probe("leaf", {0.003})}), probe("b", {0.004})})});
  play();
  Strings names;
  for (const auto& [name, value] : file().values) {
    if (name.find(' ') == std::string::npos) {
      names.push_back(name);
    }
  }
  EXPECT_EQ(names, (Strings{"leaf", "a", "b", "root"}));
}

TEST_F(TraceResults, ProbesOfOtherKindsAndWithoutEventsWriteNothing) {
  platform::TraceProbe group = probe("group", {5}, {probe("p", {0.001})});
  group.kind = "SkeinGroupProbe";
  group.measuresSignpostIntervals = false;
  analysis().setProbes({group, probe("idle", {}), probe("p", {0.001})});
  play();
  EXPECT_EQ(file().values, (Values{{"p", 1}, {"p", 1}, {"p Total", 2}, {"p AVG", 1}}));
  EXPECT_TRUE(platform_.log.contains("group, SkeinGroupProbe"));
  EXPECT_TRUE(platform_.log.contains("idle, SkeinSignpostIntervalProbe"));
}

TEST_F(TraceResults, WithoutAnEventThereAreNoSumsOfAProbe) {
  analysis().setProbes({probe("idle", {})});
  play();
  EXPECT_TRUE(file().values.empty());
  EXPECT_TRUE(keyVariables().empty());
  EXPECT_TRUE(file().closed);
}

TEST_F(TraceResults, ExtensionsAreTheKeyVariablesAndTheDatabase) {
  analysis().setIntervals({interval("a", 1)});
  play();
  ASSERT_EQ(file().extensions.size(), 2U);
  EXPECT_EQ(file().extensions[1].name, "@tdg-perf.database_id");
  EXPECT_EQ(file().extensions[1].members,
            (std::vector<std::pair<std::string, std::string>>{{"InfluxDB", "TarnReporter"}}));
  for (const auto& extension : file().extensions) {
    EXPECT_TRUE(extension.ended);
  }
}

TEST_F(TraceResults, TraceThatIsNotThereIsLogged) {
  ASSERT_TRUE(platform_.fileSystem.moveFile(kTrace, "/device/gone").ok());
  play();
  EXPECT_EQ(errors(), Strings{"No traceResults at path: /device/traces/1"});
  expectNoFile();
}

TEST_F(TraceResults, DescriptionsMayBeOneDictionary) {
  play();
  EXPECT_EQ(analysis().descriptions(), (std::vector<plist::Dictionary>{{{"name", "probe"}}}));
}

TEST_F(TraceResults, DescriptionsMayBeAnArrayInItsOrder) {
  describeProbes(
      "<array><dict><key>name</key><string>a</string></dict><dict><key>name</key><string>b</string></dict></array>");
  play();
  EXPECT_EQ(analysis().descriptions(), (std::vector<plist::Dictionary>{{{"name", "a"}}, {{"name", "b"}}}));
}

TEST_F(TraceResults, DescriptionsMayBeBinary) {
  // [{"name": "a"}]
  std::string bytes =
      "bplist00\xA1\x01\xD1\x02\x03\x54name\x51"
      "a\x08\x0A\x0D\x12";
  bytes += std::string(6, '\0') + "\x01\x01" + std::string(7, '\0') + "\x04" + std::string(15, '\0') + "\x14";
  describeProbes(bytes);
  play();
  EXPECT_TRUE(errors().empty());
  EXPECT_EQ(analysis().descriptions(), (std::vector<plist::Dictionary>{{{"name", "a"}}}));
}

TEST_F(TraceResults, ItemsThatDescribeNoProbeAreLoggedAndLeftOut) {
  describeProbes("<array><string>a</string><dict/><integer>1</integer></array>");
  play();
  EXPECT_EQ(errors(), (Strings{"unsupported class string of a probe in /device/probes.plist",
                               "unsupported class integer of a probe in /device/probes.plist"}));
  EXPECT_EQ(analysis().descriptions(), (std::vector<plist::Dictionary>{{}}));
  EXPECT_TRUE(file().closed);
}

TEST_F(TraceResults, ArrayOfItemsThatDescribeNoProbeIsAnalysedWithoutProbes) {
  describeProbes("<array><array/></array>");
  play();
  EXPECT_EQ(errors(), Strings{"unsupported class array of a probe in /device/probes.plist"});
  EXPECT_EQ(analysisLoads(), 1U);
  EXPECT_TRUE(file().closed);
}

TEST_F(TraceResults, RootOfAnotherClassIsLogged) {
  const std::vector<std::pair<std::string, std::string>> cases{{"<string>a</string>", "string"},
                                                               {"<integer>1</integer>", "integer"},
                                                               {"<integer>18446744073709551615</integer>", "integer"},
                                                               {"<real>1</real>", "real"},
                                                               {"<true/>", "boolean"},
                                                               {"<date>2026-11-20T10:00:00Z</date>", "date"},
                                                               {"<data>AA==</data>", "data"}};
  for (const auto& [plist, name] : cases) {
    describeProbes(plist);
    platform_.fileSystem.putFile("/device/traces/" + std::to_string(platform_.performanceTrace.traces().size() + 1),
                                 "");
    platform_.log.clear();
    play();
    EXPECT_EQ(errors(), Strings{"unsupported root class " + name});
  }
  expectNoFile();
}

TEST_F(TraceResults, EmptyArrayDescribesNothingAndEndsQuietly) {
  describeProbes("<array/>");
  play();
  EXPECT_TRUE(errors().empty());
  expectNoFile();
}

TEST_F(TraceResults, DescriptionsThatCannotBeParsedAreLoggedWithTheirPlace) {
  describeProbes("<plist>\n<dict>\n<array/>\n</dict></plist>");
  play();
  EXPECT_EQ(errors(), Strings{"line 3: <key> is wanted here failed to get SkeinProbes from /device/probes.plist"});
  expectNoFile();
}

TEST_F(TraceResults, DescriptionsThatCannotBeReadAreLogged) {
  platform_.fileSystem.failNext(Operation::ReadFile, Error{13, "Permission denied"});
  play();
  EXPECT_EQ(errors(), Strings{"Permission denied failed to get SkeinProbes from /device/probes.plist"});
  expectNoFile();
}

TEST_F(TraceResults, LibraryIsToldThatItsResultsAreKnownToBeNoPromise) {
  play();
  EXPECT_EQ(platform_.processEnvironment.value("APPROVED_BY_SKEIN_TEAM"),
            "tarnkit measures its own test sessions with it");
}

TEST_F(TraceResults, LibraryIsToldSoBeforeItIsLoaded) {
  std::optional<std::string> seen;
  analysis().onLoad([&] { seen = platform_.processEnvironment.value("APPROVED_BY_SKEIN_TEAM"); });
  play();
  EXPECT_TRUE(seen.has_value());
}

TEST_F(TraceResults, EnvironmentThatRefusesIsLoggedAndTheAnalysisTriedAllTheSame) {
  platform_.processEnvironment.refuse(Error{12, "Cannot allocate memory"});
  play();
  EXPECT_EQ(errors(), Strings{"failed to set APPROVED_BY_SKEIN_TEAM: Cannot allocate memory"});
  EXPECT_TRUE(file().closed);
}

TEST_F(TraceResults, MissingClassEndsTheProcess) {
  analysis().setMissingClass("SkeinTraceModel");
  play();
  EXPECT_EQ(errors(), Strings{"Unable to find class SkeinTraceModel"});
  EXPECT_EQ(platform_.processControl.exitStatuses(), std::vector<int>{1});
  EXPECT_TRUE(platform_.perfDataWriters.files().empty());
}

TEST_F(TraceResults, LibraryIsOnlyLoadedForATraceWithProbes) {
  EXPECT_EQ(analysisLoads(), 0U);
  makeTestSession()->start();
  EXPECT_EQ(analysisLoads(), 0U);
}

TEST_F(TraceResults, TraceThatCannotBeOpenedIsLogged) {
  analysis().failOpening(Error{22, "not a trace"});
  play();
  EXPECT_EQ(errors(), Strings{"failed to create Skein model: not a trace"});
  EXPECT_TRUE(platform_.perfDataWriters.files().empty());
}

TEST_F(TraceResults, TraceWithoutReadableIntervalsStillGivesItsProbes) {
  analysis().setIntervals({interval("a", 1)});
  analysis().failIntervals(Error{22, "cut off"});
  analysis().setProbes({probe("p", {0.001})});
  play();
  EXPECT_EQ(errors(), Strings{"failed to create Skein signpost data model: cut off"});
  EXPECT_EQ(file().values, (Values{{"p", 1}, {"p Total", 1}, {"p AVG", 1}}));
}

TEST_F(TraceResults, DirectoryThatCannotBeMadeIsLoggedAndTheFileWrittenAllTheSame) {
  platform_.fileSystem.failNext(Operation::CreateDirectories, Error{30, "Read-only file system"});
  play();
  EXPECT_EQ(errors(),
            (Strings{std::string("can't create logging directory at ") + kDirectory + ": Read-only file system",
                     "Failed to move file"}));
  EXPECT_TRUE(file().closed);
}

TEST_F(TraceResults, WriterThatCannotBeOpenedIsLoggedAndNothingWritten) {
  analysis().setIntervals({interval("a", 1)});
  analysis().setProbes({probe("p", {1})});
  platform_.perfDataWriters.failOpen(Error{13, "Permission denied"});
  const auto session = makeTestSession();
  session->start();
  session->stop();
  EXPECT_EQ(errors(), Strings{"Failed to open perfdata writer. errno: 13"});
  EXPECT_FALSE(session->started());
  EXPECT_TRUE(platform_.fileSystem.exists(kTemporaryFile));  // nothing was moved
}

TEST_F(TraceResults, FileThatCannotBeClosedIsNotMoved) {
  platform_.perfDataWriters.failClose(Error{28, "No space left on device"});
  play();
  EXPECT_EQ(errors(), Strings{"Failed to close perfdata writer. errno: 28"});
  EXPECT_FALSE(platform_.log.contains("Moving file"));
  EXPECT_TRUE(platform_.fileSystem.exists(kTemporaryFile));
}

TEST_F(TraceResults, FileThatCannotBeMovedIsLogged) {
  platform_.fileSystem.failNext(Operation::MoveFile, Error{18, "Invalid cross-device link"});
  play();
  EXPECT_EQ(errors(), Strings{"Failed to move file"});
  EXPECT_TRUE(platform_.log.contains("Moving file from tempWriterPath: /device/tmp/temp_perfdata.pdj to "));
}

TEST_F(TraceResults, ManyIntervalsKeepTheirSums) {
  constexpr int kCount = 100'000;
  std::vector<platform::SignpostInterval> intervals;
  for (int count = 0; count < kCount; ++count) {
    intervals.push_back(interval(count % 2 == 0 ? "even" : "odd", 0.001));
  }
  analysis().setIntervals(intervals);
  play();
  ASSERT_EQ(file().values.size(), std::size_t{kCount} + 4);
  EXPECT_NEAR(file().values[kCount].second, kCount / 2, 1e-6);
  EXPECT_NEAR(file().values[kCount + 1].second, 1, 1e-9);
}

}  // namespace
}  // namespace tarn
