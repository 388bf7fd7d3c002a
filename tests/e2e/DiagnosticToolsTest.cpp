// SPDX-License-Identifier: Apache-2.0
// What a running service does for those who study faults: the prompt to file a bug report, the trace at an overload and
// the memory log, each where the device and its settings want it and nowhere else.
#include <algorithm>
#include <csignal>
#include <filesystem>
#include <sstream>

#include "tests/e2e/support/ServiceFixture.h"

namespace tarn::e2e {
namespace {

namespace fs = std::filesystem;

constexpr const char* kSuite = "sys.oxbow.tarnkit.tarnreporting";

class DiagnosticTools : public ServiceFixture {
 protected:
  bool startOn(bool internalBuild, const std::vector<std::string>& more = {}) {
    writeFile(directory_ / "device.json", internalBuild ? R"({"InternalBuild": true})" : R"({"InternalBuild": false})");
    std::vector<std::string> options = {"--device-properties", directory_ / "device.json"};
    options.insert(options.end(), more.begin(), more.end());
    return startService(options);
  }
  void setDefault(const std::string& key, const std::string& value) {
    EXPECT_EQ(ctl({"defaults", "write", kSuite, key, value}).status, 0);
  }
  // Plays these lines within a started session.
  void playInSession(const std::string& serviceType, const std::string& lines) {
    play(R"({"op":"createReportingSession","reporterID":5}
{"op":"setServiceType","reporterID":5,"serviceType":")" +
         serviceType + R"("}
{"op":"startReportingSessionForID","reporterID":5}
)" + lines +
         R"({"op":"stopReportingSessionForID","reporterID":5}
)");
  }
  // What a back-end has received once the service is at rest.
  std::vector<Event> received(const std::string& backend) {
    ledgerAtRest();
    std::vector<Event> found = events();
    std::erase_if(found, [&](const Event& event) { return event.backend != backend; });
    return found;
  }
  // The lines of the service's log that hold this, without their time.
  std::vector<std::string> logLines(const std::string& part) const {
    std::vector<std::string> found;
    std::istringstream log(serviceLog());
    for (std::string line; std::getline(log, line);) {
      if (line.find(part) != std::string::npos) {
        found.push_back(line.substr(line.find(' ') + 1));
      }
    }
    return found;
  }

  // A call that goes wrong later than 5 seconds after its first message.
  const std::string faultyCall_ =
      R"({"op":"sendMessage","reporterIDs":[5],"category":"Playback","type":"Start","message":{"n":1,"tarnreporting_timestamp":4000000000}}
{"op":"sendMessage","reporterIDs":[5],"category":"Playback","type":"Start","message":{"plac_invalid_x":1,"tarnreporting_timestamp":4000000005}}
{"op":"sendMessage","reporterIDs":[5],"category":"Playback","type":"Start","message":{"plac_invalid_x":2,"tarnreporting_timestamp":4000000006}}
{"op":"sendMessage","reporterIDs":[5],"category":"Playback","type":"Start","message":{"plac_invalid_x":3,"tarnreporting_timestamp":4000000007}}
)";
  const std::string overload_ =
      R"({"op":"sendMessage","reporterIDs":[5],"category":"IO","type":"Error","message":{"smallest_buffer_frame_size":512,"io_cycle":4,"HostApplicationDisplayID":"org.example"}}
)";
  const std::string memoryLog_ =
      R"({"op":"sendMessage","reporterIDs":[5],"category":"Generic","type":19,"message":{}}
)";
};

TEST_F(DiagnosticTools, AFaultyCallPromptsOnceInTheBackOffOverARestart) {
  setDefault("ParleyInvalidXyBackOffSeconds", "3600");
  ASSERT_TRUE(startOn(true, {"--log-level", "info"}));
  playInSession("telephony", faultyCall_);
  auto prompts = received("tattle");
  ASSERT_EQ(prompts.size(), 1U);
  EXPECT_EQ(prompts[0].name, "createDraft");
  const json draft = {
      {"title", "Invalid x/y coordinates during a Parley call (Tat)"},
      {"description",
       "Invalid coordinates were provided to the audio layer during a Parley call, making it impossible "
       "to render spatial audio correctly. Filing this docket will help determine what went wrong."},
      {"component", {{"name", "Parley Core - Dialworks"}, {"version", "All"}, {"identifier", 1084682}}},
      {"reproducibility", 6},
      {"classification", 7},
      {"extensions", {"sys.oxbow.Vetch.audio"}}};
  EXPECT_EQ(prompts[0].payload, draft);
  EXPECT_EQ(prompts[0].detail.at("reason"), "a Parley spatial positioning error occurred");
  EXPECT_TRUE(prompts[0].detail.at("process").get<std::string>().starts_with("tarnreporting"));
  EXPECT_TRUE(logWillSay("Successfully created draft"));
  const Finished stored = ctl({"defaults", "read", kSuite, "ParleyInvalidXyTatlastRun"});
  EXPECT_EQ(stored.status, 0);
  EXPECT_GT(json::parse(stored.output).get<double>(), 1.7e9);

  playInSession("telephony", faultyCall_);
  ASSERT_EQ(stopService(SIGTERM), 0);
  ASSERT_TRUE(startOn(true));
  playInSession("telephony", faultyCall_);
  EXPECT_EQ(received("tattle").size(), 1U);
  // Whoever forgets the last run is asked again.
  ASSERT_EQ(ctl({"defaults", "delete", kSuite, "ParleyInvalidXyTatlastRun"}).status, 0);
  playInSession("telephony", faultyCall_);
  EXPECT_EQ(received("tattle").size(), 2U);
}

TEST_F(DiagnosticTools, NobodyIsPromptedWithoutABackOffOrOnAnotherBuild) {
  ASSERT_TRUE(startOn(true));
  playInSession("telephony", faultyCall_);
  EXPECT_TRUE(received("tattle").empty());
  ASSERT_EQ(stopService(SIGTERM), 0);
  setDefault("ParleyInvalidXyBackOffSeconds", "3600");
  ASSERT_TRUE(startOn(false));
  playInSession("telephony", faultyCall_);
  EXPECT_TRUE(received("tattle").empty());
}

TEST_F(DiagnosticTools, AnOverloadAsksForATraceAndPostsItsNotification) {
  setDefault("enable_gyre", "true");
  setDefault("wait_time", "1000");
  ASSERT_TRUE(startOn(true));
  playInSession("generic", overload_ + overload_);
  const auto gyres = received("gyre");
  ASSERT_EQ(gyres.size(), 1U);
  EXPECT_EQ(gyres[0].name, "requestGyre");
  EXPECT_EQ(gyres[0].payload.at("smallest_buffer_frame_size"), 512);
  EXPECT_EQ(gyres[0].payload.at("audiotag"), "IOError");
  const json detail = {{"subsystem", "sys.oxbow.tarnkit"},
                       {"reason", "AudioOverloads"},
                       {"application", "org.example"},
                       {"options", {1, 1, 0, 0, 0}}};
  EXPECT_EQ(gyres[0].detail, detail);
  EXPECT_EQ(fs::file_size(state() + "/notifications/sys.oxbow.tarnkit.dropped-gyre"), 8U);
}

TEST_F(DiagnosticTools, TheSettingsOfATraceCountFromTheNextSession) {
  ASSERT_TRUE(startOn(true));
  playInSession("generic", overload_);
  EXPECT_TRUE(received("gyre").empty());
  setDefault("enable_gyre", "true");
  setDefault("io_buffer_size", "513");
  playInSession("generic", overload_);
  EXPECT_TRUE(received("gyre").empty());
  setDefault("io_buffer_size", "512");
  setDefault("io_cycle", "4");
  playInSession("generic", overload_);
  EXPECT_EQ(received("gyre").size(), 1U);
}

TEST_F(DiagnosticTools, OtherBuildsAskForNoTrace) {
  setDefault("enable_gyre", "true");
  ASSERT_TRUE(startOn(false));
  playInSession("test", overload_);
  EXPECT_TRUE(received("gyre").empty());
  EXPECT_FALSE(fs::exists(state() + "/notifications/sys.oxbow.tarnkit.dropped-gyre"));
}

TEST_F(DiagnosticTools, SettingsOfAnyKindAreBorne) {
  ASSERT_TRUE(startOn(true));
  for (const char* value :
       {"null", "false", "-1", "1e999", "\"text\"", "[1]", "{\"a\":1}", R"({"$date":5})", R"({"$data":"AA=="})"}) {
    for (const char* key :
         {"ParleyInvalidXyBackOffSeconds", "ParleyInvalidXyTatlastRun", "io_buffer_size", "io_cycle"}) {
      ctl({"defaults", "write", kSuite, key, value});  // some are no values of a store
    }
    setDefault("enable_gyre", "\"1 means on\"");
    playInSession("test", faultyCall_ + overload_);
  }
  EXPECT_TRUE(service().isRunning());
}

TEST_F(DiagnosticTools, AMemoryLogWithoutItsToolsSaysSoInExactlyTheseLines) {
  ASSERT_TRUE(startOn(false));
  playInSession("test", memoryLog_ + memoryLog_);  // the second comes too soon
  const std::string begin = "error tarnrr wiredlog: ";
  auto lines = logLines("wiredlog");
  ASSERT_EQ(lines.size(), 4U) << serviceLog();
  const auto said = [&](const std::string& text) {
    return std::find(lines.begin(), lines.end(), begin + text) - lines.begin();
  };
  const std::ptrdiff_t end = 4;
  EXPECT_LT(said("requesting '/usr/bin/zonetally -l'"), said("unable to execute '/usr/bin/zonetally -l'"));
  EXPECT_LT(said("unable to execute '/usr/bin/zonetally -l'"), end);
  EXPECT_LT(said("requesting '/usr/local/bin/restop'"), said("unable to execute '/usr/local/bin/restop'"));
  EXPECT_LT(said("unable to execute '/usr/local/bin/restop'"), end);
  EXPECT_TRUE(logLines("WIRED LOG BLOCK").empty());
}

TEST_F(DiagnosticTools, OnlyTestSessionsAndInternalBuildsLogMemory) {
  ASSERT_TRUE(startOn(false));
  playInSession("generic", memoryLog_);
  EXPECT_TRUE(logLines("wiredlog").empty());
  ASSERT_EQ(stopService(SIGTERM), 0);
  ASSERT_TRUE(startOn(true));
  playInSession("generic", memoryLog_);
  EXPECT_EQ(logLines("wiredlog: requesting").size(), 2U);
}

}  // namespace
}  // namespace tarn::e2e
