// SPDX-License-Identifier: Apache-2.0
#include "fleet/export/ExportOptions.h"

#include <gtest/gtest.h>

#include <vector>

namespace tarn::fleet {
namespace {

ExportCommand parsed(std::vector<const char*> words) {
  words.insert(words.begin(), "tarnreporting-export");
  return parseExportCommand(static_cast<int>(words.size()), words.data());
}

TEST(ExportOptions, NothingLeavesUnlessItIsSaid) {
  const auto read = parseExportConfiguration("", "export.toml");
  ASSERT_TRUE(read.ok());
  EXPECT_EQ(read.value.rules.mode, Mode::Off);
  EXPECT_TRUE(read.value.rules.others.empty());
}

TEST(ExportOptions, AFileThatIsNotNamedNeedNotBeThere) {
  ExportOptions options;
  EXPECT_TRUE(readExportConfiguration(options).ok());
  options.configurationFile = "/nowhere/export.toml";
  EXPECT_EQ(readExportConfiguration(options).error.text(), "/nowhere/export.toml: No such file or directory");
}

TEST(ExportOptions, TheConfigurationSaysWhatLeaves) {
  const auto read = parseExportConfiguration(
      "[privacy]\nmode = 'local'\nkeys = ['a', 'b*']\nhashed = []\nsample = 0.25\nrotate_days = 30\n"
      "[server]\nurls = 'tls://one:4222,tls://two:4222'\nanswer_seconds = 3\nlongest_pause_seconds = 7\n",
      "export.toml");
  ASSERT_TRUE(read.ok()) << read.error.text();
  EXPECT_EQ(read.value.rules.mode, Mode::Local);
  EXPECT_EQ(read.value.rules.keys, (std::vector<std::string>{"a", "b*"}));
  EXPECT_TRUE(read.value.rules.hashed.empty());
  EXPECT_EQ(read.value.rules.sample, 0.25);
  EXPECT_EQ(read.value.rules.rotateDays, 30);
  EXPECT_EQ(read.value.server.longestPauseSeconds, 7);
  EXPECT_TRUE(parseExportConfiguration("[server]\nlongest_pause_seconds = 0\n", "export.toml").failed());
  EXPECT_EQ(read.value.server.urls, "tls://one:4222,tls://two:4222");
  EXPECT_EQ(read.value.server.answerSeconds, 3);
}

constexpr const char* kNoServers =
    "f:2: \"server.urls\" must be addresses like nats://host:4222 or tls://host:4222, with commas between them";

TEST(ExportOptions, ServersAreAddresses) {
  for (const char* const right :
       {"nats://a", "nats://user:p@ss@a.b-c:1", "tls://[::1]:65535", "nats://a,tls://b:4222"}) {
    EXPECT_TRUE(parseExportConfiguration("[server]\nurls = '" + std::string(right) + "'", "f").ok()) << right;
  }
  for (const char* const wrong :
       {"a:4222", "http://a", "nats://", "nats://[", "nats://[]", "nats://[::1", "nats://[::1]x", "nats://a b",
        "nats://a:", "nats://a:0", "nats://a:65536", "nats://a:1x", "nats://a,", ",nats://a", "nats://user@"}) {
    EXPECT_EQ(parseExportConfiguration("[server]\nurls = '" + std::string(wrong) + "'", "f").error.text(), kNoServers)
        << wrong;
  }
}

TEST(ExportOptions, AWrongConfigurationIsRefusedByLineAndName) {
  const auto fault = [](std::string_view text) { return parseExportConfiguration(text, "f").error.text(); };
  EXPECT_EQ(fault("[privacy]\nmode = 'on'"), "f:2: \"privacy.mode\" must be \"off\", \"local\" or \"export\"");
  EXPECT_EQ(fault("[privacy]\nmode = true"), "f:2: \"privacy.mode\" must be \"off\", \"local\" or \"export\"");
  EXPECT_EQ(fault("[privacy]\nsample = 1.5"), "f:2: \"privacy.sample\" must be a number from 0 to 1");
  EXPECT_EQ(fault("[privacy]\nrotate_days = 0.5"),
            "f:2: \"privacy.rotate_days\" must be a whole number from 0 to 36500");
  EXPECT_EQ(fault("[privacy]\nkeys = ['']"), "f:2: \"privacy.keys\" must be a list of texts, none of them empty");
  EXPECT_EQ(fault("[privacy]\nkeys = 'a'"), "f:2: \"privacy.keys\" must be a list of texts, none of them empty");
  EXPECT_EQ(fault("[server]\nurls = 4222"), kNoServers);
  EXPECT_EQ(fault("[server]\nurls = ''"), kNoServers);
  EXPECT_EQ(fault("[privacy]\n\nkey = 'a'"), "f:3: unknown key \"privacy.key\"");
  EXPECT_EQ(fault("[other]\n"), "f:1: unknown section \"other\"");
  EXPECT_EQ(fault("mode = 'off'"), "f:1: unknown key \"mode\"");
  EXPECT_EQ(fault("[privacy]\nb = 1\na = 1"), "f:2: unknown key \"privacy.b\"");
}

TEST(ExportOptions, SinceIsForShowAlone) {
  EXPECT_EQ(parsed({"--since", "-1h"}).usage.text(), "--since: only with --show");
  const ExportCommand command = parsed({"--show", "--since", "-1h"});
  ASSERT_TRUE(command.options);
  EXPECT_TRUE(command.options->show);
  EXPECT_EQ(command.options->since, "-1h");
}

TEST(ExportOptions, HelpAndVersionArePrintedAndWrongUsageIsOneLine) {
  EXPECT_NE(parsed({"--help"}).output.find("--own-dir"), std::string::npos);
  EXPECT_EQ(parsed({"--version"}).output.substr(0, 21), "tarnreporting-export ");
  EXPECT_TRUE(parsed({"--nothing"}).usage.failed());
  EXPECT_EQ(parsed({"--log-level", "loud"}).usage.text().find('\n'), std::string::npos);
  EXPECT_TRUE(parsed({"--config", ""}).usage.failed());
}

}  // namespace
}  // namespace tarn::fleet
