// SPDX-License-Identifier: Apache-2.0
// What drivers count in their channel files while a session runs, from the files to the recorder's rows.
#include <filesystem>

#include "tests/e2e/support/ServiceFixture.h"

namespace tarn::e2e {
namespace {

namespace fs = std::filesystem;

constexpr std::uint16_t kWisp = 1;

class DriverChannels : public ServiceFixture {
 protected:
  void writeChannels(const std::string& name, const std::vector<json>& channels) {
    fs::create_directories(folder_);
    const json file = {
        {"driver", "OxbowFoo<0x12>"}, {"group", "Haptics"}, {"subgroup", "Stats"}, {"channels", channels}};
    // As drivers do: readers see the old file or the new one.
    writeFile(folder_ + "/" + name + ".tmp", file.dump());
    fs::rename(folder_ + "/" + name + ".tmp", folder_ + "/" + name);
  }
  static json simple(const std::string& name, int value) {
    return {{"name", name}, {"format", "simple"}, {"unit", "times"}, {"value", value}};
  }
  static json histogram(int first, int second) {
    return {
        {"name", "Latency"}, {"format", "histogram"},
        {"unit", "us"},      {"min", 4},
        {"max", 96},         {"buckets", json::array({json::array({0, 50, first}), json::array({50, 100, second})})}};
  }
  static json stateChannel(int transitions, int residency, double dutyCycle) {
    return {
        {"name", "Engine"},
        {"format", "state"},
        {"states",
         json::array(
             {{{"name", "on"}, {"transitions", transitions}, {"residency", residency}, {"duty_cycle", dutyCycle}}})}};
  }
  void startSession(std::int64_t reporterID) {
    if (!client_) {
      client_ = connect();
    }
    ASSERT_TRUE(client_->call(client::createReportingSession(reporterID)).ok());
    ASSERT_TRUE(client_->call(client::setServiceType(kWisp, reporterID)).ok());
    ASSERT_EQ(client_->send(client::startReportingSessionForID(reporterID)), client::SendStatus::Sent);
    ASSERT_TRUE(client_->call(client::reporterID(reporterID)).ok());  // after it the session runs
  }
  void stopSession(std::int64_t reporterID) {
    ASSERT_TRUE(client_->call(client::stopReportingSessionForID(reporterID)).ok());
  }
  // Expects one event of each name, with just these entries besides what the intake adds.
  void expectEvents(const std::string& type, const json& expected) {
    const std::vector<Event> found = events("sys.oxbow.*.Flume." + type);
    ASSERT_EQ(names(found),
              (std::vector<std::string>{"sys.oxbow.tarnkit.Flume." + type, "sys.oxbow.wisp.Flume." + type}));
    for (const Event& event : found) {
      EXPECT_EQ(event.backend, "tally");
      json payload = event.payload;
      EXPECT_EQ(payload.value("audiotag", ""), "Flume" + type);
      for (const char* key : {"tarnreporting_timestamp", "invalid_timestamp", "audiotag", "HostApplicationDisplayID"}) {
        payload.erase(key);
      }
      EXPECT_EQ(payload, expected);
    }
  }
  std::size_t logLines(const std::string& part) const {
    const std::string log = serviceLog();
    std::size_t count = 0;
    for (std::size_t at = log.find(part); at != std::string::npos; at = log.find(part, at + 1)) {
      ++count;
    }
    return count;
  }

  std::string folder_ = state() + "/flume";
  std::unique_ptr<client::ClientConnection> client_;
};

TEST_F(DriverChannels, ASessionTellsWhatTheDriversCountedWhileItRan) {
  writeChannels("foo.json", {simple("Engine On", 10), simple("Idle", 5), histogram(3, 7), stateChannel(2, 1000, 0.1)});
  ASSERT_TRUE(startService());
  startSession(7);
  writeChannels("foo.json", {simple("Engine On", 14), simple("Idle", 5), histogram(3, 9), stateChannel(5, 2500, 0.25)});
  stopSession(7);
  ledgerAtRest();
  expectEvents("Simple", {{"OxbowFoo_Haptics_Stats_Simple_EngineOn", 4}});
  expectEvents("Histogram", {{"OxbowFoo_Haptics_Stats_Histogram_Latency",
                              "count=2,lower=0,upper=100,min=4,max=96,unit=us::50-100:2"}});
  expectEvents("State",
               {{"OxbowFoo_Haptics_Stats_State_Engine", "name:on,transition:3,residency:1500,duty_cycle:0.250000;"}});
  EXPECT_EQ(logLines("Z error tarn"), 0U);
}

TEST_F(DriverChannels, BrokenFilesAreOneComplaintEachAndTheOthersGoOn) {
  writeChannels("foo.json", {simple("a", 10)});
  writeChannels("bar.json", {simple("b", 10)});
  writeFile(folder_ + "/broken.json", "{\"driver\": ");
  ASSERT_TRUE(startService());
  startSession(7);
  writeFile(folder_ + "/bar.json", "");
  writeChannels("foo.json", {simple("a", 13)});
  stopSession(7);
  ledgerAtRest();
  expectEvents("Simple", {{"OxbowFoo_Haptics_Stats_Simple_a", 3}});
  EXPECT_EQ(logLines("driver channels: the file broken.json"), 1U);
  EXPECT_EQ(logLines("driver channels: the file bar.json"), 1U);
  EXPECT_EQ(logLines("Z error tarn"), 2U);
}

TEST_F(DriverChannels, FolderOfTheConfigurationCounts) {
  folder_ = directory_ / "elsewhere";
  writeFile(directory_ / "config.toml", "[paths]\nflume = \"" + folder_ + "\"\n");
  writeChannels("foo.json", {simple("a", 1)});
  ASSERT_TRUE(startService({"--config", directory_ / "config.toml"}));
  startSession(7);
  writeChannels("foo.json", {simple("a", 2)});
  stopSession(7);
  ledgerAtRest();
  expectEvents("Simple", {{"OxbowFoo_Haptics_Stats_Simple_a", 1}});
}

TEST_F(DriverChannels, WithoutChannelsNothingIsSentAndNothingComplainedAbout) {
  ASSERT_TRUE(startService());
  for (const std::int64_t reporterID : {7, 8, 9}) {
    startSession(reporterID);
    stopSession(reporterID);
  }
  ledgerAtRest();
  EXPECT_TRUE(events("sys.oxbow.tarnkit.Flume.*").empty());
  EXPECT_EQ(logLines("Z error tarn"), 0U);
}

// Sound hardware as the kernel tells of it, in a folder of the test's own.
class SoundHardware : public DriverChannels {
 protected:
  void played(int frames) {
    const std::string card = folder_ + "/asound/card0";
    fs::create_directories(card + "/pcm0p/sub0");
    writeFile(card + "/id", "PCH\n");
    writeFile(card + "/pcm0p/sub0/info",
              "card: 0\ndevice: 0\nsubdevice: 0\nstream: PLAYBACK\nid: Codec\nname: Codec\n");
    writeFile(
        card + "/pcm0p/sub0/status",
        "state: RUNNING\nowner_pid   : 1\ntrigger_time: 1.000000000\ntstamp      : 2.000000000\n-----\nhw_ptr      : " +
            std::to_string(frames) + "\n");
  }
  // How many events a session has sent during which something was played.
  std::size_t eventsOfASession(const std::vector<std::string>& options) {
    played(100);
    EXPECT_TRUE(startService(options));
    startSession(7);
    played(148);
    stopSession(7);
    ledgerAtRest();
    return events("sys.oxbow.tarnkit.Flume.Simple").size();
  }
};

TEST_F(SoundHardware, IsLookedAtWhereTheConfigurationNamesItsTree) {
  writeFile(directory_ / "config.toml", "[paths]\nalsa = \"" + folder_ + "/asound\"\n");
  ASSERT_EQ(eventsOfASession({"--config", directory_ / "config.toml"}), 1U);
  const json payload = events("sys.oxbow.tarnkit.Flume.Simple").at(0).payload;
  EXPECT_EQ(payload.value("PCH_Speaker_pcm0p_Simple_Codecsub0Frames", 0), 48) << payload;
}

TEST_F(SoundHardware, IsLeftAloneOtherwise) {
  EXPECT_EQ(eventsOfASession({}), 0U);
}

}  // namespace
}  // namespace tarn::e2e
