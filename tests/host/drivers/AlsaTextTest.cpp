// SPDX-License-Identifier: Apache-2.0
// The kernel's texts on a PCM substream.
#include "host/drivers/AlsaText.h"

#include <gtest/gtest.h>

namespace tarn::linux_host {
namespace {

TEST(AlsaText, ClosedSubstreamTellsItsStateAlone) {
  const auto status = parseAlsaStatus("closed\n");
  ASSERT_TRUE(status);
  EXPECT_EQ(kAlsaStates[status->state], "closed");
  EXPECT_FALSE(status->triggerNanoseconds || status->nowNanoseconds || status->hardwarePointer || status->overruns);
}

TEST(AlsaText, OpenSubstreamTellsStateTimesPointerAndOverruns) {
  const auto status = parseAlsaStatus(
      "state: RUNNING\nowner_pid   : 1841\ntrigger_time: 4242.424242424\ntstamp      : 4250.000000001\n"
      "delay       : 1024\navail       : 15360\navail_max   : 16384\n-----\nhw_ptr      : 363636\n"
      "appl_ptr    : 364660\nxrun_counter: 2\n");
  ASSERT_TRUE(status);
  EXPECT_EQ(kAlsaStates[status->state], "RUNNING");
  EXPECT_EQ(status->triggerNanoseconds, 4242424242424);
  EXPECT_EQ(status->nowNanoseconds, 4250000000001);
  EXPECT_EQ(status->hardwarePointer, 363636U);
  EXPECT_EQ(status->overruns, 2U);
  EXPECT_EQ(status->owner, 1841U);
}

TEST(AlsaText, ParametersTellFormatRateAndSizes) {
  const auto parameters = parseAlsaParameters(
      "access: RW_INTERLEAVED\nformat: S16_LE\nsubformat: STD\nchannels: 2\nrate: 44100 (44100/1)\n"
      "period_size: 1024\nbuffer_size: 4096\n");
  EXPECT_EQ(parameters, (AlsaParameters{"S16_LE", 2, 44100, 1024, 4096}));
}

TEST(AlsaText, ParametersThatAreNotWholeAreNone) {
  const std::string whole = "format: S16_LE\nchannels: 2\nrate: 44100\nperiod_size: 1024\nbuffer_size: 4096\n";
  ASSERT_TRUE(parseAlsaParameters(whole));
  for (const char* const text : {"", "closed\n", "no setup\n"}) {
    EXPECT_FALSE(parseAlsaParameters(text)) << text;
  }
  for (const char* const key : {"format", "channels", "rate", "period_size", "buffer_size"}) {
    std::string without = whole;
    without.insert(without.find(key), "x");
    EXPECT_FALSE(parseAlsaParameters(without)) << key;
  }
}

TEST(AlsaText, EveryStateIsKnownAndOthersAreOther) {
  for (std::size_t state = 1; state + 1 < kAlsaStateCount; ++state) {
    EXPECT_EQ(parseAlsaStatus("state: " + std::string(kAlsaStates[state]) + "\n")->state, state);
  }
  EXPECT_EQ(kAlsaStates[parseAlsaStatus("state: LEVITATING\n")->state], "other");
  EXPECT_EQ(kAlsaStates[kAlsaXrun], "XRUN");
}

TEST(AlsaText, TextWithoutAStateIsNoStatus) {
  for (const char* text : {"", "\n", "error -19\n", "state:\n", "RUNNING\n", "closed: x\n", "hw_ptr: 5\n"}) {
    EXPECT_FALSE(parseAlsaStatus(text)) << text;
  }
}

TEST(AlsaText, NumbersThatAreNoneAreNotTold) {
  for (const std::string odd : {"", "-1", "x", "1x", "1.5", "99999999999999999999", "0x10"}) {
    const auto status = parseAlsaStatus("state: RUNNING\nhw_ptr: " + odd + "\nxrun_counter: " + odd + "\n");
    ASSERT_TRUE(status);
    EXPECT_FALSE(status->hardwarePointer) << odd;
    EXPECT_FALSE(status->overruns) << odd;
  }
  for (const std::string odd : {"", "1", "1.", "1.5", ".000000001", "1.0000000001", "-1.000000000", "0.000000000",
                                "9223372036.000000000", "99999999999999999999.000000000", "1.00000000x"}) {
    EXPECT_FALSE(parseAlsaStatus("state: RUNNING\ntrigger_time: " + odd + "\n")->triggerNanoseconds) << odd;
  }
}

TEST(AlsaText, InfoTellsDirectionAndName) {
  const auto info = parseAlsaInfo("card: 0\nstream: CAPTURE\nid: ALC287 Analog\nname: other\nsubname: subdevice #0\n");
  ASSERT_TRUE(info);
  EXPECT_FALSE(info->isPlayback);
  EXPECT_EQ(info->id, "ALC287 Analog");
  EXPECT_TRUE(parseAlsaInfo("stream: PLAYBACK\n")->isPlayback);
  EXPECT_EQ(parseAlsaInfo("stream: PLAYBACK\nid:\n")->id, "");
  for (const char* text : {"", "id: x\n", "stream: SIDEWAYS\n", "stream\n"}) {
    EXPECT_FALSE(parseAlsaInfo(text)) << text;
  }
}

TEST(AlsaText, NamesArePrintableAndBounded) {
  EXPECT_EQ(alsaName("PCH\n"), "PCH");
  EXPECT_EQ(alsaName(" a\tb\xC3\xA9\x01 \nsecond"), "a?b???");
  EXPECT_EQ(alsaName(std::string(500, 'x')).size(), 80U);
}

}  // namespace
}  // namespace tarn::linux_host
