// SPDX-License-Identifier: Apache-2.0
// The summary files that a running service leaves for people.
#include <sys/stat.h>

#include <algorithm>
#include <filesystem>

#include "tests/e2e/support/ServiceFixture.h"

namespace tarn::e2e {
namespace {

namespace fs = std::filesystem;

class SummaryFile : public ServiceFixture {
 protected:
  // The names in the directory of summary files, sorted.
  std::vector<std::string> names(const std::string& leadingPart) const {
    std::vector<std::string> found;
    const fs::path directory = leadingPart + "/DiagnosticLogs/Audio/Reporting";
    if (fs::exists(directory)) {
      for (const auto& entry : fs::directory_iterator(directory)) {
        found.push_back(entry.path().filename());
      }
    }
    std::sort(found.begin(), found.end());
    return found;
  }
  static json fileIn(const std::string& leadingPart, const std::string& name) {
    return json::parse(contentOf(leadingPart + "/DiagnosticLogs/Audio/Reporting/" + name));
  }
  // A session of this service type with one message that is repeated and one that no JSON can hold.
  void playSession(const std::string& serviceType) {
    play(R"({"op":"createReportingSession","reporterID":4711}
{"op":"setServiceType","reporterID":4711,"serviceType":")" +
         serviceType + R"("}
{"op":"setConfiguration","reporterID":4711,"configuration":{"KvHostApplicationDisplayID":"org/example"}}
{"op":"startReportingSessionForID","reporterID":4711}
{"op":"sendMessage","reporterIDs":[4711],"category":"Playback","type":"Start","message":{"n":1,"a list":[1,2.0,{"b":true}]}}
{"op":"sendMessage","reporterIDs":[4711],"category":"Playback","type":"Start","message":{"n":1,"a list":[1,2.0,{"b":true}]}}
{"op":"sendMessage","reporterIDs":[4711],"category":"Playback","type":"Start","message":{"n":2,"when":{"$date":5}}}
{"op":"sendMessage","reporterIDs":[4711],"category":"Playback","type":"Start","message":{"n":3}}
{"op":"stopReportingSessionForID","reporterID":4711}
)");
  }
};

TEST_F(SummaryFile, ATestSessionLeavesItUnderTheConfiguredDirectory) {
  const std::string elsewhere = directory_ / "else where";
  writeFile(directory_ / "config.toml", "[paths]\ndiagnostic_logs = \"" + elsewhere + "\"\n");
  ASSERT_TRUE(startService({"--config", directory_ / "config.toml", "--log-level", "info"}));
  playSession("test");
  const auto found = names(elsewhere);
  ASSERT_EQ(found.size(), 1U) << serviceLog();
  EXPECT_TRUE(found[0].ends_with("-4711-org_example-test.json")) << found[0];
  const json file = fileIn(elsewhere, found[0]);
  std::vector<json> playback;
  for (const json& object : file) {
    ASSERT_EQ(object.size(), 1U);
    if (object.begin().key().starts_with("Playback_Start_")) {
      EXPECT_EQ(object.begin().key(), "Playback_Start_" + std::to_string(playback.size() + 1));
      playback.push_back(object.begin().value());
    }
  }
  ASSERT_EQ(playback.size(), 2U);
  EXPECT_EQ(playback[0].at("n"), 1);
  EXPECT_EQ(playback[0].at("a_list"), json::parse(R"([1,2.0,{"b":true}])"));
  EXPECT_EQ(playback[0].at("isSessionStarted"), "YES");
  EXPECT_EQ(playback[0].at("audiotag"), "PlaybackStart");
  EXPECT_EQ(playback[1].at("n"), 3);
  EXPECT_TRUE(file.front().contains("Setup_Start_1"));
  const json& last = file.back();
  EXPECT_TRUE(last.contains("Session_Generic_Summary_1")) << last;
  EXPECT_TRUE(logWillSay("dataWithJSONObject: "));
  EXPECT_TRUE(logWillSay("SummaryJsonFileWorker closed file. action=close file=" + elsewhere));
}

TEST_F(SummaryFile, OtherSessionsLeaveNone) {
  ASSERT_TRUE(startService());
  playSession("haptics");
  EXPECT_TRUE(names(state()).empty());
}

TEST_F(SummaryFile, OnAnInternalBuildEverySessionLeavesOne) {
  writeFile(directory_ / "device.json", "{\"InternalBuild\": true}");
  ASSERT_TRUE(startService({"--device-properties", directory_ / "device.json"}));
  playSession("haptics");
  const auto found = names(state());
  ASSERT_EQ(found.size(), 1U);
  EXPECT_TRUE(found[0].ends_with("-4711-org_example-haptics.json")) << found[0];
}

TEST_F(SummaryFile, TwoStopsWithinASecondLeaveTwoFiles) {
  ASSERT_TRUE(startService());
  std::string script = R"({"op":"createReportingSession","reporterID":1}
{"op":"setServiceType","reporterID":1,"serviceType":"test"}
)";
  constexpr int kPeriods = 5;
  for (int period = 0; period < kPeriods; ++period) {
    script += R"({"op":"startReportingSessionForID","reporterID":1}
{"op":"stopReportingSessionForID","reporterID":1}
)";
  }
  play(script);
  const auto found = names(state());
  EXPECT_EQ(found.size(), std::size_t{kPeriods});
  for (const std::string& name : found) {
    EXPECT_TRUE(fileIn(state(), name).is_array()) << name;
  }
}

TEST_F(SummaryFile, TheMaskAppliesToItsDirectory) {
  const mode_t before = ::umask(027);
  const bool started = startService();
  ::umask(before);
  ASSERT_TRUE(started);
  playSession("test");
  struct stat status {};
  ASSERT_EQ(::stat((state() + "/DiagnosticLogs/Audio/Reporting").c_str(), &status), 0);
  EXPECT_EQ(status.st_mode & 0777U, 0750U);
}

TEST_F(SummaryFile, ADirectoryThatCannotBeMadeIsLoggedAndTheSessionEndsAsUsual) {
  writeFile(directory_ / "file", "");
  writeFile(directory_ / "config.toml", "[paths]\ndiagnostic_logs = \"" + directory_ / "file" + "\"\n");
  ASSERT_TRUE(startService({"--config", directory_ / "config.toml"}));
  playSession("test");
  EXPECT_TRUE(
      logWillSay("can't create logging directory at " + directory_ / "file" + "/DiagnosticLogs/Audio/Reporting: "));
  EXPECT_TRUE(logWillSay("SummaryJsonFileWorker failed to open file. action=open file="));
  EXPECT_EQ(eventsOnceThereAre(1, "sys.oxbow.tarnkit.Session_Generic.Summary").size(), 1U);
}

}  // namespace
}  // namespace tarn::e2e
