// SPDX-License-Identifier: Apache-2.0
// Traced test sessions of a running service: the trace, and the perf-data file that its analysis leaves.
#include <signal.h>

#include <algorithm>
#include <filesystem>

#include "tests/e2e/support/ServiceFixture.h"

namespace tarn::e2e {
namespace {

namespace fs = std::filesystem;

class Trace : public ServiceFixture {
 protected:
  bool startInternalService(const std::string& configuration = {}) {
    writeFile(directory_ / "device.json", "{\"InternalBuild\": true}");
    writeFile(directory_ / "config.toml", configuration);
    writeFile(directory_ / "probes.plist",
              "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<plist version=\"1.0\"><array>\n"
              "<dict><key>name</key><string>everything</string><key>signpost</key><string>*</string></dict>\n"
              "</array></plist>\n");
    return startService({"--device-properties", directory_ / "device.json", "--config", directory_ / "config.toml",
                         "--log-level", "info"});
  }
  // A whole test session with a few messages.
  void playSession(const json& configuration) {
    std::string script = R"({"op":"createReportingSession","reporterID":4711}
{"op":"setServiceType","reporterID":4711,"serviceType":"test"}
{"op":"setConfiguration","reporterID":4711,"configuration":)" +
                         configuration.dump() + R"(}
{"op":"startReportingSessionForID","reporterID":4711}
)";
    for (int count = 0; count < 10; ++count) {
      script += R"({"op":"sendMessage","reporterIDs":[4711],"category":"Playback","type":"Start","message":{"n":)" +
                std::to_string(count) + "}}\n";
    }
    play(script + "{\"op\":\"stopReportingSessionForID\",\"reporterID\":4711}\n");
  }
  json described() const { return {{"TarnReportingSkeinPlistFilePath", directory_ / "probes.plist"}}; }
  std::vector<fs::path> filesIn(const std::string& directory, const std::string& extension) const {
    std::vector<fs::path> found;
    if (fs::exists(directory)) {
      for (const auto& entry : fs::directory_iterator(directory)) {
        if (entry.path().extension() == extension) {
          found.push_back(entry.path());
        }
      }
    }
    return found;
  }
  std::string traces() const { return state() + "/DiagnosticLogs/Audio/Traces"; }
  // The values under the name.
  static std::vector<double> valuesOf(const json& file, const std::string& name) {
    std::vector<double> values;
    for (const json& value : file.at("values")) {
      EXPECT_EQ(value.at("unit"), "ms");
      EXPECT_TRUE(value.at("value").is_number()) << value;
      if (value.at("name") == name) {
        values.push_back(value.at("value").get<double>());
      }
    }
    return values;
  }
};

TEST_F(Trace, ATestSessionOnAnInternalBuildLeavesATraceAndItsMeasurements) {
  ASSERT_TRUE(startInternalService());
  playSession(described());
  const auto files = filesIn(traces(), ".pdj");
  ASSERT_EQ(files.size(), 1U) << serviceLog();
  EXPECT_TRUE(files[0].filename().string().ends_with("-tarnkit-Unknown-test.pdj")) << files[0];
  const json file = json::parse(contentOf(files[0]));
  EXPECT_EQ(file.at("name"), "TarnReporting");
  EXPECT_EQ(file.at("results_version"), 4);
  const std::vector<double> events = valuesOf(file, "everything");
  EXPECT_GT(events.size(), 10U);
  double total = 0;
  for (const double event : events) {
    EXPECT_GE(event, 0);
    total += event;
  }
  ASSERT_EQ(valuesOf(file, "everything Total").size(), 1U);
  EXPECT_NEAR(valuesOf(file, "everything Total")[0], total, 1e-6);
  EXPECT_NEAR(valuesOf(file, "everything AVG").at(0), total / static_cast<double>(events.size()), 1e-6);
  const json& keyVariables = file.at("extensions").at(0);
  EXPECT_EQ(keyVariables.at("name"), "@tdg-perf.key_variables");
  EXPECT_FALSE(keyVariables.at("members").empty());
  for (const auto& [name, text] : keyVariables.at("members").items()) {
    EXPECT_EQ(text, "[]");
    EXPECT_EQ(valuesOf(file, name + " Total").size(), 1U) << name;
  }
  EXPECT_EQ(file.at("extensions").at(1),
            json::parse(R"({"name": "@tdg-perf.database_id", "members": {"InfluxDB": "TarnReporter"}})"));
  EXPECT_EQ(filesIn(traces(), ".json").size(), 1U);
  EXPECT_TRUE(fs::is_empty(state() + "/tmp"));
  EXPECT_TRUE(logWillSay("Performance Trace Completed: " + traces()));
}

TEST_F(Trace, TheConfigurationNamesTheFileAndEachSessionIsMeasuredAnew) {
  ASSERT_TRUE(startInternalService());
  json configuration = described();
  configuration["TarnReportingSkeinOutputFileName"] = "mine.pdj";
  configuration["TarnReportingSkeinOutputFileDirectory"] = directory_ / "else/where";
  configuration["TarnReportingTraceType"] = "sktrace_profile";
  playSession(configuration);
  const std::string path = directory_ / "else/where/mine.pdj";
  const json first = json::parse(contentOf(path));
  EXPECT_EQ(first.at("name"), "mine.pdj");
  playSession(configuration);
  EXPECT_EQ(valuesOf(json::parse(contentOf(path)), "everything Total").size(), 1U);
  EXPECT_TRUE(filesIn(traces(), ".pdj").empty());
}

TEST_F(Trace, OtherBuildsTraceNothing) {
  ASSERT_TRUE(startInternalService());
  stopService(SIGTERM);
  ASSERT_TRUE(startService());
  playSession(described());
  EXPECT_FALSE(fs::exists(traces()));
}

TEST_F(Trace, WithoutItsDescriptionsASessionIsNotTracedAndEndsAsUsual) {
  ASSERT_TRUE(startInternalService());
  playSession({{"TarnReportingSkeinPlistFilePath", "/none"}});
  EXPECT_TRUE(
      logWillSay("Could not start PerformanceTrace. TarnReportingSkeinPlistFilePath: /none is not a valid path"));
  EXPECT_FALSE(fs::exists(traces()));
  EXPECT_EQ(eventsOnceThereAre(1, "sys.oxbow.tarnkit.Session_Generic.Summary").size(), 1U);
}

TEST_F(Trace, BrokenDescriptionsLeaveTheTraceAndNoMeasurements) {
  ASSERT_TRUE(startInternalService());
  writeFile(directory_ / "probes.plist", "<plist>\n<dict>");
  playSession(described());
  EXPECT_TRUE(
      logWillSay("line 2: the end comes too early failed to get SkeinProbes from " + directory_ / "probes.plist"));
  EXPECT_TRUE(filesIn(traces(), ".pdj").empty());
  EXPECT_EQ(filesIn(traces(), ".json").size(), 1U);
}

TEST_F(Trace, AMissingAnalysisLibraryEndsTheServiceOnceItsEventsAreCommitted) {
  ASSERT_TRUE(startInternalService("[paths]\ntrace_analysis = \"" + directory_ / "none.so" + "\"\n"));
  const std::string script = R"({"op":"createReportingSession","reporterID":1}
{"op":"setServiceType","reporterID":1,"serviceType":"test"}
{"op":"setConfiguration","reporterID":1,"configuration":)" +
                             described().dump() +
                             R"(}
{"op":"startReportingSessionForID","reporterID":1}
{"op":"sendMessage","reporterIDs":[1],"category":"Playback","type":"Start","message":{"n":1}}
{"op":"stopReportingSessionForID","reporterID":1}
)";
  EXPECT_NE(ctl({"run"}, script).status, 0);
  EXPECT_EQ(service().wait(), 1);
  EXPECT_TRUE(logWillSay("Unable to find class SkeinTraceModel"));
  EXPECT_EQ(events("sys.oxbow.tarnkit.Playback.Start").size(), 1U);
}

}  // namespace
}  // namespace tarn::e2e
