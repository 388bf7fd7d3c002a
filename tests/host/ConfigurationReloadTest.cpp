// SPDX-License-Identifier: Apache-2.0
// Reading the configuration anew: what is taken over, what waits, and what is told of it.
#include "host/ConfigurationReload.h"

#include <gtest/gtest.h>

#include <limits>
#include <map>
#include <optional>

#include "testing/ManualClock.h"
#include "testing/RecordingLog.h"

namespace tarn::linux_host {
namespace {

using Names = std::vector<std::string>;

class ToldManager final : public ServiceManager {
 public:
  void notifyReady() override { told.emplace_back("ready"); }
  void notifyReloading(std::chrono::microseconds monotonicNow) override {
    told.push_back("reloading " + std::to_string(monotonicNow.count()));
  }

  Names told;
};

class ConfigurationReloadTest : public ::testing::Test {
 protected:
  void request() { reload_.request(); }
  void runQueue() { loop_.queue()->run(std::numeric_limits<std::size_t>::max()); }
  // One whole reload of what `file_` says.
  void reload() {
    request();
    runQueue();
  }
  plist::Dictionary status() const {
    plist::Dictionary status;
    reload_.describe(status);
    return status;
  }
  Names waiting() const {
    Names names;
    for (const auto& name : status().get("configuration_waiting").array()) {
      names.push_back(name.asText());
    }
    return names;
  }

  testing::ManualClock clock_;
  testing::RecordingLog log_;
  ToldManager manager_;
  MainLoop loop_{clock_};
  std::string file_;
  int reads_ = 0;
  std::vector<HostConfiguration> adopted_;
  ConfigurationReload reload_{loop_,
                              log_,
                              manager_,
                              HostConfiguration(),
                              [this] {
                                ++reads_;
                                return parseConfiguration(file_, "c.toml");
                              },
                              [this](const HostConfiguration& inForce) { adopted_.push_back(inForce); }};
};

TEST_F(ConfigurationReloadTest, AGoodFileIsTakenOverAndCounted) {
  file_ = "[limits]\nsessions_per_user = 5\n";
  reload();
  ASSERT_EQ(adopted_.size(), 1U);
  EXPECT_EQ(adopted_[0].limits.quotas.sessionsPerUser, 5U);
  EXPECT_EQ(status().get("configuration_generation"), plist::ValueView(1));
  EXPECT_EQ(status().get("configuration_reload_time"), plist::ValueView(clock_.epochSeconds()));
  EXPECT_TRUE(
      log_.contains(platform::LogLevel::Default, "configuration 1 is in force, changed: limits.sessions_per_user"));
}

TEST_F(ConfigurationReloadTest, ABadFileLeavesAllAsItWasAndSaysWhereAndWhy) {
  file_ = "[limits]\nsessions_per_user = 5\n";
  reload();
  file_ = "[limits]\nsessions_per_user = 6\nlog_bytes = true\n";
  reload();
  EXPECT_EQ(adopted_.size(), 1U);
  EXPECT_EQ(status().get("configuration_generation"), plist::ValueView(1));
  EXPECT_EQ(status().get("configuration_reloads_refused"), plist::ValueView(1));
  const std::string why = "c.toml:3: \"limits.log_bytes\" must be a whole number from 65536 to 1099511627776";
  EXPECT_EQ(status().get("configuration_fault"), plist::ValueView(why));
  EXPECT_TRUE(log_.contains(platform::LogLevel::Error, "configuration 1 stays in force: " + why));
  file_.clear();
  reload();
  EXPECT_EQ(status().get("configuration_fault"), plist::ValueView(""));
  EXPECT_EQ(adopted_.back(), HostConfiguration());
}

TEST_F(ConfigurationReloadTest, RequestsThatComeTogetherAreOneThatReadsTheLast) {
  file_ = "[limits]\nsessions_per_user = 5\n";
  request();
  request();
  file_ = "[limits]\nsessions_per_user = 7\n";
  request();
  runQueue();
  EXPECT_EQ(reads_, 1);
  ASSERT_EQ(adopted_.size(), 1U);
  EXPECT_EQ(adopted_[0].limits.quotas.sessionsPerUser, 7U);
  EXPECT_EQ(status().get("configuration_generation"), plist::ValueView(1));
  reload();
  EXPECT_EQ(reads_, 2);
}

TEST_F(ConfigurationReloadTest, TheManagerIsToldOfBeginAndEndAlsoOfABadOne) {
  clock_.setMonotonic(std::chrono::microseconds(1234));
  reload();
  file_ = "bad";
  reload();
  EXPECT_EQ(manager_.told, (Names{"reloading 1234", "ready", "reloading 1234", "ready"}));
}

TEST_F(ConfigurationReloadTest, WhatNeedsARestartStaysAndIsNamedUntilItIsTakenBack) {
  file_ = "[paths]\nflume = \"/other\"\n[tally]\nin_use = [\"a\"]\n";
  reload();
  EXPECT_EQ(adopted_.back().paths.flume, std::nullopt);
  EXPECT_EQ(adopted_.back().tally.inUse, Names{"a"});
  EXPECT_EQ(waiting(), Names{"paths.flume"});
  EXPECT_TRUE(log_.contains("changed: tally.in_use; these changed keys wait for a restart: paths.flume"));
  reload();
  EXPECT_TRUE(log_.contains("configuration 2 is in force, changed: nothing; these changed keys wait for a restart"));
  file_ = "[tally]\nin_use = [\"a\"]\n";
  reload();
  EXPECT_EQ(waiting(), Names{});
}

TEST(SettingValues, AdminIsSharedOrSeparate) {
  const auto read = [](const std::string& value) { return parseConfiguration("[access]\nadmin = " + value, "c.toml"); };
  EXPECT_FALSE(HostConfiguration().access.separateAdmin);
  EXPECT_FALSE(read("\"shared\"").value.access.separateAdmin);
  EXPECT_TRUE(read("\"separate\"").value.access.separateAdmin);
  for (const char* const wrong : {"\"\"", "\"Separate\"", "true", "1", "[\"separate\"]"}) {
    EXPECT_EQ(read(wrong).error.text(), "c.toml:2: \"access.admin\" must be \"shared\" or \"separate\"") << wrong;
  }
  EXPECT_EQ(parseConfiguration("[access]\nadmins = 1", "c.toml").error.text(),
            "c.toml:2: unknown key \"access.admins\"");
}

// Each setting is in force after a reload unless it waits for a restart, and then it is named.
TEST(SettingEffects, EverySettingIsTakenOverOrWaits) {
  const std::map<std::string, std::string> others{
      {"log.level", "\"debug\""},      {"tally.in_use", "[]"},
      {"rtc.backends", "[]"},          {"rtc.no_backends", "true"},
      {"rtc.available", "false"},      {"snare.refuse", "\"DailyLimitExceeded\""},
      {"recorder.enabled", "false"},   {"recorder.redundant", "\"mark\""},
      {"access.admin", "\"separate\""}};
  for (const SettingDescription& setting : describedSettings()) {
    const std::string name = std::string(setting.section) + "." + std::string(setting.key);
    SCOPED_TRACE(name);
    const bool isPath = setting.section == "paths";
    const std::string other = others.contains(name) ? others.at(name) : isPath ? "\"/other\"" : "65537";
    const std::string text =
        "[" + std::string(setting.section) + "]\n" + std::string(setting.key) + " = " + other + "\n";
    Result<HostConfiguration> read = parseConfiguration(text, "other");
    if (read.failed()) {
      read = parseConfiguration(text.substr(0, text.find("65537")) + "200", "other");
    }
    ASSERT_TRUE(read.ok()) << read.error->text;
    ASSERT_NE(read.value, HostConfiguration());
    HostConfiguration inForce;
    const SettingChanges changes = adoptSettings(inForce, read.value);
    const bool waits = setting.effect == SettingEffect::AtRestart;
    EXPECT_EQ(changes.taken, waits ? Names{} : Names{name});
    EXPECT_EQ(changes.waiting, waits ? Names{name} : Names{});
    EXPECT_EQ(inForce, waits ? HostConfiguration() : read.value);
  }
}

}  // namespace
}  // namespace tarn::linux_host
