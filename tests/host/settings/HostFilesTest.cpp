// SPDX-License-Identifier: Apache-2.0
// The files that the service is given: configuration and device properties.
#include <gtest/gtest.h>

#include "host/settings/HostConfiguration.h"
#include "host/settings/JsonDeviceProperties.h"
#include "tests/host/TemporaryFolder.h"

namespace tarn::linux_host {
namespace {

std::string errorOf(std::string_view text) {
  const Result<HostConfiguration> read = parseConfiguration(text, "c.toml");
  return read.error.text();
}

TEST(HostConfiguration, EmptyFileHasEveryDefault) {
  const Result<HostConfiguration> read = parseConfiguration("", "c.toml");
  ASSERT_TRUE(read.ok()) << read.error->text;
  const HostConfiguration& host = read.value;
  EXPECT_EQ(host.tally.inUse, (std::vector<std::string>{"*"}));
  EXPECT_EQ(host.rtc.backends, (std::vector<std::string>{"recorder"}));
  EXPECT_FALSE(host.rtc.noBackends);
  EXPECT_TRUE(host.rtc.available);
  EXPECT_EQ(host.rtc.startDelay.count(), 0);
  EXPECT_FALSE(host.snare.refuse);
  EXPECT_FALSE(host.paths.diagnosticLogs);
  EXPECT_FALSE(host.paths.flume);
  EXPECT_FALSE(host.paths.alsa);
  EXPECT_FALSE(host.paths.traceAnalysis);
  EXPECT_EQ(host.recorder.maxMegabytes, 256);
  EXPECT_EQ(host.recorder.maxAgeDays, 30);
  EXPECT_EQ(host.limits.maxFrameBytes, 1048576U);
}

TEST(HostConfiguration, EverySettingIsRead) {
  const Result<HostConfiguration> read = parseConfiguration(R"(
[log]
level = "info"
[tally]
in_use = ["sys.oxbow.*", "other"]
[rtc]
backends = []
no_backends = true
available = false
start_delay_ms = 1500
[snare]
refuse = "DailyLimitExceeded"
[paths]
diagnostic_logs = "/var/log/audio"
flume = "/run/flume"
alsa = "/proc/asound"
trace_analysis = "/opt/analysis.so"
exported = "/var/lib/exporter/arrived"
[recorder]
max_megabytes = 1
max_age_days = 7
summary_max_age_days = 14
redundant = "mark"
set_aside_max_age_days = 15
summary_file_max_age_days = 16
trace_max_age_days = 17
perf_data_max_age_days = 18
[limits]
max_frame_bytes = 65536
)",
                                                            "c.toml");
  ASSERT_TRUE(read.ok()) << read.error->text;
  const HostConfiguration& host = read.value;
  EXPECT_EQ(host.logLevel, platform::LogLevel::Info);
  EXPECT_EQ(host.tally.inUse, (std::vector<std::string>{"sys.oxbow.*", "other"}));
  EXPECT_TRUE(host.rtc.backends.empty());
  EXPECT_TRUE(host.rtc.noBackends);
  EXPECT_FALSE(host.rtc.available);
  EXPECT_EQ(host.rtc.startDelay, std::chrono::milliseconds(1500));
  EXPECT_EQ(host.snare.refuse, platform::SnareReason::DailyLimitExceeded);
  EXPECT_EQ(host.paths.diagnosticLogs, "/var/log/audio");
  EXPECT_EQ(host.paths.flume, "/run/flume");
  EXPECT_EQ(host.paths.alsa, "/proc/asound");
  EXPECT_EQ(host.paths.traceAnalysis, "/opt/analysis.so");
  EXPECT_EQ(host.recorder.maxMegabytes, 1);
  EXPECT_EQ(host.recorder.redundant, recorder::Redundant::Mark);
  EXPECT_EQ(host.recorder.exported, "/var/lib/exporter/arrived");
  EXPECT_EQ(host.recorder.maxAgeDays, 7);
  EXPECT_EQ(host.recorder.summaryMaxAgeDays, 14);
  EXPECT_EQ(host.recorder.fileMaxAges, (recorder::FileMaxAges{15, 16, 17, 18}));
  EXPECT_EQ(host.limits.maxFrameBytes, 65536U);
}

TEST(HostConfiguration, UnknownKeysAndSectionsAreErrorsWithTheirLine) {
  EXPECT_EQ(errorOf("[tally]\nin_use = []\nin_usee = []\n"), "c.toml:3: unknown key \"tally.in_usee\"");
  EXPECT_EQ(errorOf("\n[taly]\n"), "c.toml:2: unknown section [taly]");
  EXPECT_EQ(errorOf("in_use = []\n"), "c.toml:1: unknown key \"in_use\"");
  EXPECT_EQ(errorOf("[rtc.more]\nx = 1\n"), "c.toml:1: unknown key \"rtc.more\"");
  EXPECT_EQ(errorOf("rtc = 5\n"), "c.toml:1: [rtc] must be a section");
}

TEST(HostConfiguration, ErrorThatStandsFirstInTheFileIsTold) {
  EXPECT_EQ(errorOf("[tally]\nx = 1\n[limits]\ny = 1\n"), "c.toml:2: unknown key \"tally.x\"");
  EXPECT_EQ(errorOf("[tally]\nx = 1\na = 1\n"), "c.toml:2: unknown key \"tally.x\"");
}

TEST(HostConfiguration, WrongTypesAreErrorsWithTheirLine) {
  EXPECT_EQ(errorOf("[tally]\nin_use = \"*\"\n"), "c.toml:2: \"tally.in_use\" must be a list of texts");
  EXPECT_EQ(errorOf("[rtc]\nbackends = [\"a\", 1]\n"), "c.toml:2: \"rtc.backends\" must be a list of texts");
  EXPECT_EQ(errorOf("[rtc]\n\navailable = 1\n"), "c.toml:3: \"rtc.available\" must be true or false");
  EXPECT_EQ(errorOf("[rtc]\nno_backends = \"no\"\n"), "c.toml:2: \"rtc.no_backends\" must be true or false");
  EXPECT_EQ(errorOf("[snare]\nrefuse = false\n"), "c.toml:2: \"snare.refuse\" must be a text");
  EXPECT_EQ(errorOf("[paths]\nflume = 1\n"), "c.toml:2: \"paths.flume\" must be a folder's path");
  EXPECT_EQ(errorOf("[paths]\nalsa = true\n"), "c.toml:2: \"paths.alsa\" must be a folder's path");
  EXPECT_EQ(errorOf("[paths]\ndiagnostic_logs = \"\"\n"),
            "c.toml:2: \"paths.diagnostic_logs\" must be a folder's path");
  EXPECT_EQ(errorOf("[paths]\ntrace_analysis = []\n"), "c.toml:2: \"paths.trace_analysis\" must be a file's path");
  EXPECT_EQ(errorOf("[recorder]\nmax_megabytes = 1.0\n"),
            "c.toml:2: \"recorder.max_megabytes\" must be a whole number from 1 to 1048576");
}

TEST(HostConfiguration, ARefusalIsTheNameOfAReasonCode) {
  for (std::size_t code = 0; code < platform::kSnareReasonNames.size(); ++code) {
    const std::string name(platform::kSnareReasonNames[code]);
    const Result<HostConfiguration> read = parseConfiguration("[snare]\nrefuse = \"" + name + "\"\n", "c.toml");
    ASSERT_TRUE(read.ok()) << read.error->text;
    EXPECT_EQ(read.value.snare.refuse, static_cast<platform::SnareReason>(code)) << name;
  }
  const Result<HostConfiguration> none = parseConfiguration("[snare]\nrefuse = \"\"\n", "c.toml");
  ASSERT_TRUE(none.ok()) << none.error->text;
  EXPECT_FALSE(none.value.snare.refuse);
  for (const char* wrong : {"dailylimitexceeded", "DailyLimitExceeded ", "6", "kAilmentErrorNone"}) {
    EXPECT_EQ(errorOf("\n[snare]\nrefuse = \"" + std::string(wrong) + "\"\n"),
              "c.toml:3: \"snare.refuse\" must be the name of a reason code, or empty");
  }
}

TEST(HostConfiguration, WhatIsKeptOfRepeatedMessagesIsOneOfTwoWords) {
  const Result<HostConfiguration> count = parseConfiguration("[recorder]\nredundant = \"count\"\n", "c.toml");
  ASSERT_TRUE(count.ok()) << count.error->text;
  EXPECT_EQ(count.value.recorder.redundant, recorder::Redundant::Count);
  EXPECT_EQ(parseConfiguration("", "c.toml").value.recorder.redundant, recorder::Redundant::Count);
  for (const char* wrong : {"\"Mark\"", "\"\"", "true", "1"}) {
    EXPECT_EQ(errorOf("\n[recorder]\nredundant = " + std::string(wrong) + "\n"),
              "c.toml:3: \"recorder.redundant\" must be \"count\" or \"mark\"");
  }
}

TEST(HostConfiguration, NumbersAreReadToTheirLimitsAndRefusedBehindThem) {
  struct Range {
    std::string section;
    std::string key;
    std::int64_t lowest;
    std::int64_t highest;
  };
  const std::vector<Range> ranges{
      {"rtc", "start_delay_ms", 0, 3600000},        {"recorder", "max_megabytes", 1, 1048576},
      {"recorder", "max_age_days", 1, 36500},       {"recorder", "summary_max_age_days", 1, 36500},
      {"recorder", "trace_max_age_days", 1, 36500}, {"limits", "max_frame_bytes", 64, 67108864}};
  for (const Range& range : ranges) {
    const auto with = [&](std::int64_t number) {
      return errorOf("[" + range.section + "]\n" + range.key + " = " + std::to_string(number) + "\n");
    };
    const std::string refusal = "c.toml:2: \"" + range.section + "." + range.key + "\" must be a whole number from " +
                                std::to_string(range.lowest) + " to " + std::to_string(range.highest);
    EXPECT_EQ(with(range.lowest), "");
    EXPECT_EQ(with(range.highest), "");
    EXPECT_EQ(with(range.lowest - 1), refusal);
    EXPECT_EQ(with(range.highest + 1), refusal);
  }
}

TEST(HostConfiguration, SyntaxErrorNamesItsLine) {
  EXPECT_EQ(errorOf("[tally]\n\nin_use = nope\n[rtc]\n").substr(0, 9), "c.toml:3:");
  EXPECT_EQ(errorOf("[tally]\n[tally]\n").substr(0, 9), "c.toml:2:");
}

TEST(HostConfiguration, LettersOutsideAsciiAreReadInTextsAndRefusedAsKeys) {
  const Result<HostConfiguration> read =
      parseConfiguration("[paths]\nflume = \"\"\"\\\n \xd1\x90\xc3\xa9\"\"\"\n", "c.toml");
  ASSERT_TRUE(read.ok()) << read.error->text;
  EXPECT_EQ(read.value.paths.flume, "\xd1\x90\xc3\xa9");
  EXPECT_EQ(errorOf("[paths]\n\xd1\x90 = 1\n").substr(0, 10), "c.toml:2: ");
}

TEST(HostConfiguration, ErrorsAreOneLine) {
  EXPECT_EQ(errorOf("[\"a\\nb\"]\n"), "c.toml:1: unknown section [a\\nb]");
}

TEST(HostConfiguration, FileIsReadAndOneThatCannotBeIsNamed) {
  const TemporaryFolder folder;
  folder.write("good.toml", "[recorder]\nmax_age_days = 2\n");
  folder.write("bad.toml", "\nx = 1\n");
  EXPECT_EQ(readConfiguration(folder.path("good.toml")).value.recorder.maxAgeDays, 2);
  EXPECT_EQ(readConfiguration(folder.path("bad.toml")).error.text(), folder.path("bad.toml") + ":2: unknown key \"x\"");
  EXPECT_EQ(readConfiguration(folder.path("none")).error.text(), folder.path("none") + ": No such file or directory");
  EXPECT_EQ(readConfiguration(folder.path()).error.text(), folder.path() + ": Is a directory");
}

TEST(HostConfiguration, DropInsHaveTheLastWordInTheOrderOfTheirNames) {
  const TemporaryFolder folder;
  folder.write("c.toml", "[recorder]\nmax_age_days = 2\nmax_megabytes = 3\n[snare]\nrefuse = \"NotSupported\"\n");
  folder.write("c.toml.d/90-last.toml", "[recorder]\nmax_age_days = 9\n");
  folder.write("c.toml.d/10-first.toml",
               "[recorder]\nmax_age_days = 1\n[rtc]\nbackends = []\n[snare]\nrefuse = \"\"\n");
  const Result<HostConfiguration> read = readConfigurationWithDropIns(folder.path("c.toml"), false);
  ASSERT_TRUE(read.ok()) << read.error->text;
  EXPECT_EQ(read.value.recorder.maxAgeDays, 9);
  EXPECT_EQ(read.value.recorder.maxMegabytes, 3);
  EXPECT_TRUE(read.value.rtc.backends.empty());
  EXPECT_FALSE(read.value.snare.refuse);
}

TEST(HostConfiguration, OnlyFilesNamedAsSettingsAreDropIns) {
  const TemporaryFolder folder;
  folder.write("c.toml", "");
  folder.write("c.toml.d/README", "no settings");
  folder.write("c.toml.d/.hidden.toml", "no settings");
  folder.write("c.toml.d/old.toml~", "no settings");
  EXPECT_EQ(readConfigurationWithDropIns(folder.path("c.toml"), false).error.text(), "");
}

TEST(HostConfiguration, WrongDropInIsToldWithItsFileAndNothingIsTaken) {
  const TemporaryFolder folder;
  folder.write("c.toml", "[recorder]\nmax_age_days = 2\n");
  folder.write("c.toml.d/a.toml", "[recorder]\nmax_age_days = 3\n");
  folder.write("c.toml.d/b.toml", "\n[recorder]\nmax_age = 3\n");
  const Result<HostConfiguration> wrong = readConfigurationWithDropIns(folder.path("c.toml"), false);
  EXPECT_EQ(wrong.error.text(), folder.path("c.toml.d/b.toml") + ":3: unknown key \"recorder.max_age\"");
  EXPECT_EQ(wrong.value, HostConfiguration());
}

TEST(HostConfiguration, DropInThatCannotBeReadIsNamed) {
  const TemporaryFolder folder;
  folder.write("c.toml", "");
  std::filesystem::create_directories(folder.path("c.toml.d/a.toml"));
  EXPECT_EQ(readConfigurationWithDropIns(folder.path("c.toml"), false).error.text(),
            folder.path("c.toml.d/a.toml") + ": Is a directory");
  folder.write("e.toml.d", "a file in the folder's place");
  EXPECT_EQ(readConfigurationWithDropIns(folder.path("e.toml"), true).error.text(),
            folder.path("e.toml.d") + ": Not a directory");
}

TEST(HostConfiguration, MoreDropInsThanAnybodyHasAreRefused) {
  const TemporaryFolder folder;
  folder.write("c.toml", "");
  for (int number = 0; number <= 256; ++number) {
    folder.write("c.toml.d/" + std::to_string(number) + ".toml", "");
  }
  EXPECT_EQ(readConfigurationWithDropIns(folder.path("c.toml"), false).error.text(),
            folder.path("c.toml.d") + ": too many files");
}

TEST(HostConfiguration, OnlyTheInstalledFileMayBeAbsentBesideItsDropIns) {
  const TemporaryFolder folder;
  const Result<HostConfiguration> none = readConfigurationWithDropIns(folder.path("c.toml"), true);
  EXPECT_TRUE(none.ok());
  EXPECT_EQ(none.value, HostConfiguration());
  folder.write("c.toml.d/a.toml", "[recorder]\nmax_age_days = 3\n");
  EXPECT_EQ(readConfigurationWithDropIns(folder.path("c.toml"), true).value.recorder.maxAgeDays, 3);
  EXPECT_EQ(readConfigurationWithDropIns(folder.path("c.toml"), false).error.text(),
            folder.path("c.toml") + ": No such file or directory");
}

TEST(JsonDeviceProperties, WithoutAFileTheDeviceHasNeitherProperty) {
  const JsonDeviceProperties properties;
  EXPECT_EQ(properties.boolean("InternalBuild"), false);
  EXPECT_EQ(properties.boolean("haptics"), false);
  EXPECT_FALSE(properties.boolean("other"));
}

TEST(JsonDeviceProperties, FileTellsWhatTheDeviceIsAndNothingElseIsKnown) {
  const TemporaryFolder folder;
  folder.write("p.json", R"({"InternalBuild": true, "newer": {"any": [1]}, "flag": true})");
  JsonDeviceProperties properties;
  ASSERT_EQ(properties.load(folder.path("p.json")).text(), "");
  EXPECT_EQ(properties.boolean("InternalBuild"), true);
  EXPECT_EQ(properties.boolean("flag"), true);
  EXPECT_FALSE(properties.boolean("haptics"));
  EXPECT_FALSE(properties.boolean("newer"));
}

TEST(JsonDeviceProperties, WhatTheFileSaysOfTheMachineGoesBeforeWhatTheMachineSays) {
  const TemporaryFolder folder;
  folder.write("p.json", R"({"haptics": true, "model": "Player 3", "chassis": "embedded", "shop": "Berlin"})");
  JsonDeviceProperties properties;
  ASSERT_EQ(properties.load(folder.path("p.json")).text(), "");
  EXPECT_EQ(properties.over({{"vendor", "ACME"}, {"model", "Board"}}),
            (plist::Dictionary{{"vendor", "ACME"}, {"model", "Player 3"}, {"chassis", "embedded"}}));
}

TEST(JsonDeviceProperties, WrongFilesAreToldWithTheirPlaceAndChangeNothing) {
  const TemporaryFolder folder;
  const std::string path = folder.path("p.json");
  JsonDeviceProperties properties;
  folder.write("p.json", "{\n\"newer\": 1,\n\"haptics\": 1}");
  EXPECT_EQ(properties.load(path).text(), path + ":3: \"haptics\" must be true or false");
  folder.write("p.json", "{\"model\": 3}");
  EXPECT_EQ(properties.load(path).text(), path + ":1: \"model\" must be a text");
  folder.write("p.json", "{\n\"haptics\": yes}");
  EXPECT_EQ(properties.load(path).text().substr(0, path.size() + 6), path + ":2:12:");
  folder.write("p.json", "[]");
  EXPECT_EQ(properties.load(path).text(), path + ":1:1: device properties are one JSON object");
  EXPECT_EQ(properties.load(folder.path("none")).text(), folder.path("none") + ": No such file or directory");
  EXPECT_EQ(properties.boolean("haptics"), false);
}

}  // namespace
}  // namespace tarn::linux_host
