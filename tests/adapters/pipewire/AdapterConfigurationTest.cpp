// SPDX-License-Identifier: Apache-2.0
#include "adapters/pipewire/AdapterConfiguration.h"

#include <gtest/gtest.h>

#include <cerrno>
#include <string>

namespace tarn::streams {

namespace {

std::string faultOf(std::string_view text) {
  return parseConfiguration(Adapter::PipeWire, text, "pipewire.toml").error.text();
}

}  // namespace

TEST(PipeWireConfiguration, AnEmptyFileSaysTheDefaults) {
  const auto read = parseConfiguration(Adapter::PipeWire, "", "pipewire.toml");
  ASSERT_TRUE(read.ok());
  EXPECT_FALSE(read.value.off);
  EXPECT_FALSE(read.value.mediaNames);
  EXPECT_TRUE(read.value.profiler);
  EXPECT_EQ(read.value.allow, std::vector<std::string>{"*"});
  EXPECT_TRUE(read.value.deny.empty());
  EXPECT_EQ(read.value.roles, Rules::defaultRoles());
}

TEST(PipeWireConfiguration, EveryKeyIsTaken) {
  const auto read =
      parseConfiguration(Adapter::PipeWire,
                         "[report]\noff = true\nmedia_name = true\nprofiler = false\nwithout_role = \"standalone\"\n"
                         "[applications]\nallow = [\"ox*\"]\ndeny = [\"oxrecord\", \"mpv\"]\n"
                         "[roles]\nMusic = \"nonlongformaudio\"\n\"ringtone\" = \"alerts\"\n",
                         "pipewire.toml");
  ASSERT_TRUE(read.ok()) << read.error.text();
  EXPECT_TRUE(read.value.off);
  EXPECT_TRUE(read.value.mediaNames);
  EXPECT_FALSE(read.value.profiler);
  EXPECT_EQ(serviceTypeName(read.value.withoutRole), "standalone");
  EXPECT_EQ(read.value.allow, std::vector<std::string>{"ox*"});
  EXPECT_EQ(read.value.deny, (std::vector<std::string>{"oxrecord", "mpv"}));
  EXPECT_EQ(serviceTypeName(read.value.serviceTypeOf("Music", "")), "nonlongformaudio");
  EXPECT_EQ(serviceTypeName(read.value.serviceTypeOf("ringtone", "")), "alerts");
  EXPECT_EQ(serviceTypeName(read.value.serviceTypeOf("Movie", "")), "longformaudio");
}

TEST(PipeWireConfiguration, WhatIsNotKnownIsRefusedWithItsLine) {
  EXPECT_EQ(faultOf("[report]\nof = true\n"), "pipewire.toml:2: unknown key \"report.of\"");
  EXPECT_EQ(faultOf("\n[reports]\n"), "pipewire.toml:2: unknown section \"reports\"");
  EXPECT_EQ(faultOf("off = true\n"), "pipewire.toml:1: unknown key \"off\"");
  EXPECT_EQ(faultOf("report = 1\n"), "pipewire.toml:1: \"report\" must be a section");
}

TEST(PipeWireConfiguration, AWrongValueIsRefusedWithWhatItMustBe) {
  EXPECT_EQ(faultOf("[report]\noff = 1\n"), "pipewire.toml:2: \"report.off\" must be true or false");
  EXPECT_EQ(faultOf("[report]\nwithout_role = \"song\"\n"),
            "pipewire.toml:2: \"report.without_role\" must be the name of a service type");
  EXPECT_EQ(faultOf("[roles]\nMusic = \"song\"\n"),
            "pipewire.toml:2: \"roles.Music\" must be the name of a service type");
  EXPECT_EQ(faultOf("[roles]\nMusic = 7\n"), "pipewire.toml:2: \"roles.Music\" must be the name of a service type");
  EXPECT_EQ(faultOf("[applications]\nallow = \"*\"\n"),
            "pipewire.toml:2: \"applications.allow\" must be a list of patterns");
  EXPECT_EQ(faultOf("[applications]\ndeny = [\"a\", \"\"]\n"),
            "pipewire.toml:2: \"applications.deny\" must be a list of patterns, none of them empty");
  EXPECT_EQ(faultOf("[applications]\ndeny = [1]\n"),
            "pipewire.toml:2: \"applications.deny\" must be a list of patterns, none of them empty");
}

TEST(PipeWireConfiguration, OfSeveralFaultsTheFirstIsTold) {
  EXPECT_EQ(faultOf("[roles]\nA = 1\n[applications]\nallow = 1\n"),
            "pipewire.toml:2: \"roles.A\" must be the name of a service type");
}

TEST(PipeWireConfiguration, WhatIsNoTomlIsRefusedWithItsLine) {
  EXPECT_EQ(faultOf("[report]\noff = \n").substr(0, 16), "pipewire.toml:2:");
}

TEST(PipeWireConfiguration, AKeyWithALineEndLeavesTheErrorOneLine) {
  EXPECT_EQ(faultOf("[report]\n\"a\\nb\" = 1\n").find('\n'), std::string::npos);
}

TEST(PipeWireConfiguration, AFileThatIsNotThereIsAnErrorWithItsName) {
  const auto read = readConfiguration(Adapter::PipeWire, "/nowhere/pipewire.toml");
  EXPECT_EQ(read.error.code(), ENOENT);
  EXPECT_EQ(read.error.text().substr(0, 23), "/nowhere/pipewire.toml:");
}

TEST(PipeWireConfiguration, ApplicationsWithoutARoleMayHaveTypes) {
  const auto read = parseConfiguration(Adapter::PipeWire, "[types]\n\"ox*\" = \"telephony\"\nmpd = \"longformaudio\"\n",
                                       "pipewire.toml");
  ASSERT_TRUE(read.ok()) << read.error.text();
  EXPECT_EQ(serviceTypeName(read.value.serviceTypeOf("", "oxcall")), "telephony");
  EXPECT_EQ(serviceTypeName(read.value.serviceTypeOf("odd", "mpd")), "longformaudio");
  EXPECT_EQ(serviceTypeName(read.value.serviceTypeOf("", "mpd2")), "generic");
  EXPECT_EQ(serviceTypeName(read.value.serviceTypeOf("Game", "oxcall")), "nonlongformaudio");
}

TEST(AlsaConfiguration, SoundServersAreDeniedUnlessTheListIsAnotherOne) {
  EXPECT_FALSE(parseConfiguration(Adapter::Alsa, "", "").value.mayReport("pipewire"));
  EXPECT_TRUE(parseConfiguration(Adapter::Alsa, "", "").value.mayReport("mpd"));
  EXPECT_TRUE(parseConfiguration(Adapter::Alsa, "[applications]\ndeny = []\n", "").value.mayReport("pipewire"));
  EXPECT_TRUE(parseConfiguration(Adapter::PipeWire, "", "").value.mayReport("pipewire"));
}

TEST(AlsaConfiguration, WhatOnlyPipeWireHasIsNotKnown) {
  EXPECT_EQ(parseConfiguration(Adapter::Alsa, "[report]\nprofiler = true\n", "a").error.text(),
            "a:2: unknown key \"report.profiler\"");
  EXPECT_EQ(parseConfiguration(Adapter::Alsa, "[report]\nmedia_name = true\n", "a").error.text(),
            "a:2: unknown key \"report.media_name\"");
  EXPECT_EQ(parseConfiguration(Adapter::Alsa, "[roles]\nMusic = \"generic\"\n", "a").error.text(),
            "a:2: unknown key \"roles.Music\"");
}

}  // namespace tarn::streams
