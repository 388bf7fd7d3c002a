// SPDX-License-Identifier: Apache-2.0
#include "adapters/pipewire/AdapterOptions.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

namespace tarn::streams {

namespace {

AdapterCommand parse(std::vector<const char*> words) {
  words.insert(words.begin(), "tarnreporting-pipewire");
  return parseAdapterCommand(Adapter::PipeWire, static_cast<int>(words.size()), words.data());
}

}  // namespace

TEST(PipeWireOptions, WithoutAnyThereAreDefaults) {
  const AdapterCommand command = parse({});
  ASSERT_TRUE(command.options);
  EXPECT_FALSE(command.options->configurationFile);
  EXPECT_EQ(command.options->socket, "");
  EXPECT_EQ(command.options->remote, "");
  EXPECT_FALSE(command.options->once);
  EXPECT_FALSE(command.options->print);
  EXPECT_EQ(command.options->logLevel, LogLevel::Default);
}

TEST(PipeWireOptions, EachIsTaken) {
  const AdapterCommand command =
      parse({"--config", "c.toml", "--socket", "s", "--remote", "r", "--once", "--print", "--log-level", "debug"});
  ASSERT_TRUE(command.options);
  EXPECT_EQ(command.options->configurationFile, "c.toml");
  EXPECT_EQ(command.options->socket, "s");
  EXPECT_EQ(command.options->remote, "r");
  EXPECT_TRUE(command.options->once);
  EXPECT_TRUE(command.options->print);
  EXPECT_EQ(command.options->logLevel, LogLevel::Debug);
  EXPECT_EQ(parse({"--log-level", "error"}).options->logLevel, LogLevel::Error);
}

TEST(PipeWireOptions, WrongUsageIsOneLineAndItsStatus) {
  const std::vector<std::vector<const char*>> wrong{{"--nothing"},           {"word"},  {"--socket", ""}, {"--config"},
                                                    {"--log-level", "loud"}, {"--once"}};
  for (const auto& words : wrong) {
    const AdapterCommand command = parse(words);
    EXPECT_FALSE(command.options) << words[0];
    EXPECT_EQ(command.usage.code(), kExitUsage) << words[0];
    EXPECT_EQ(command.usage.text().find('\n'), std::string::npos) << words[0];
  }
  EXPECT_EQ(parse({"--once"}).usage.text(), "--once: only with --print");
}

TEST(PipeWireOptions, HelpAndVersionArePrinted) {
  EXPECT_NE(parse({"--help"}).output.find("--print"), std::string::npos);
  EXPECT_EQ(parse({"--version"}).output.substr(0, 23), "tarnreporting-pipewire ");
  EXPECT_FALSE(parse({"--help"}).options);
  EXPECT_FALSE(parse({"--version"}).options);
}

TEST(AlsaOptions, TheyHaveAFolderAndAnIntervalAndNoPipeWire) {
  const auto parseAlsa = [](std::vector<const char*> words) {
    words.insert(words.begin(), "tarnreporting-alsa");
    return parseAdapterCommand(Adapter::Alsa, static_cast<int>(words.size()), words.data());
  };
  EXPECT_EQ(parseAlsa({}).options->proc, "/proc");
  EXPECT_EQ(parseAlsa({}).options->intervalMilliseconds, 1000);
  EXPECT_EQ(parseAlsa({"--interval", "0.25"}).options->intervalMilliseconds, 250);
  EXPECT_EQ(parseAlsa({"--proc", "p"}).options->proc, "p");
  for (const char* const wrong : {"0", "0.001", "3601", "-1", "x", ""}) {
    EXPECT_EQ(parseAlsa({"--interval", wrong}).usage.code(), kExitUsage) << wrong;
  }
  EXPECT_EQ(parseAlsa({"--remote", "r"}).usage.code(), kExitUsage);
  EXPECT_EQ(parse({"--interval", "1"}).usage.code(), kExitUsage);
  EXPECT_EQ(parseAlsa({"--version"}).output.substr(0, 19), "tarnreporting-alsa ");
  EXPECT_NE(parseAlsa({"--help"}).output.find("alsa.toml"), std::string::npos);
}

}  // namespace tarn::streams
