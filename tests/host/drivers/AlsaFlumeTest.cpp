// SPDX-License-Identifier: Apache-2.0
// The machine's sound hardware as driver report channels, on recorded trees of the kernel's texts.
#include "host/drivers/AlsaFlume.h"

#include <gtest/gtest.h>

#include <filesystem>

#include "host/drivers/LinuxFlumeService.h"
#include "testing/ManualClock.h"
#include "testing/RecordingLog.h"
#include "tests/host/TemporaryFolder.h"

namespace tarn::linux_host {
namespace {

namespace fs = std::filesystem;
using namespace std::chrono_literals;
using platform::FlumeChannel;
using platform::FlumeSamples;
using Lines = std::vector<std::string>;

constexpr const char* kPlayer = "card0/pcm0p/sub0";

class AlsaFlumeTest : public ::testing::Test {
 protected:
  // The tree as the kernel would show it now.
  void show(const std::string& tree) {
    fs::remove_all(folder_.path("asound"));
    fs::copy(fs::path(TARN_ALSA_TREES) / tree, folder_.path("asound"), fs::copy_options::recursive);
  }
  void status(const std::string& substream, const std::string& text) {
    folder_.write("asound/" + substream + "/status", text);
  }
  static std::string running(double trigger, double now, int frames, const std::string& more = {}) {
    return text("RUNNING", trigger, now, frames) + more;
  }
  static std::string text(const std::string& state, double trigger, double now, int frames) {
    char lines[256];
    std::snprintf(lines, sizeof lines,
                  "state: %s\nowner_pid   : 1\ntrigger_time: %.9f\ntstamp      : %.9f\n-----\nhw_ptr      : %d\n",
                  state.c_str(), trigger, now, frames);
    return lines;
  }
  const FlumeSamples& read() {
    samples_ = alsa_.read();
    return samples_;
  }
  // After a reading; of the player unless another is named.
  const FlumeChannel& channel(const std::string& what, const std::string& pcm = "pcm0p") const {
    static const FlumeChannel kNone;
    for (const FlumeChannel& each : samples_) {
      if (each.name.subGroup == pcm && each.name.name->ends_with(what)) return each;
    }
    ADD_FAILURE() << "no channel " << pcm << " " << what;
    return kNone;
  }
  platform::FlumeState state(const std::string& name) const {
    for (const auto& each : channel(" State").states) {
      if (each.name == name) return each;
    }
    ADD_FAILURE() << "no state " << name;
    return {};
  }

  TemporaryFolder folder_;
  testing::RecordingLog log_;
  testing::ManualClock clock_;
  AlsaFlume alsa_{folder_.path("asound"), log_, clock_};
  FlumeSamples samples_;
};

TEST_F(AlsaFlumeTest, MachineWithoutSoundHardwareHasNoChannelsAndNothingToComplainAbout) {
  EXPECT_TRUE(read().empty());
  fs::create_directory(folder_.path("asound"));
  EXPECT_TRUE(read().empty());
  EXPECT_TRUE(log_.entries().empty());
}

TEST_F(AlsaFlumeTest, EachSubstreamHasThreeChannelsInTheGroupOfItsDirection) {
  show("playing");
  Lines found;
  for (const FlumeChannel& each : read()) {
    found.push_back(*each.name.driver + "/" + *each.name.group + "/" + *each.name.subGroup + "/" + *each.name.name +
                    " in " + *each.unit);
  }
  EXPECT_EQ(
      found,
      (Lines{"PCH/Tx/pcm0c/ALC287 Analog sub0 Frames in frames", "PCH/Tx/pcm0c/ALC287 Analog sub0 Overruns in overruns",
             "PCH/Tx/pcm0c/ALC287 Analog sub0 State in ms", "PCH/Speaker/pcm0p/ALC287 Analog sub0 Frames in frames",
             "PCH/Speaker/pcm0p/ALC287 Analog sub0 Overruns in overruns",
             "PCH/Speaker/pcm0p/ALC287 Analog sub0 State in ms", "PCH/Rx/pcm3p/HDMI 0 sub0 Frames in frames",
             "PCH/Rx/pcm3p/HDMI 0 sub0 Overruns in overruns", "PCH/Rx/pcm3p/HDMI 0 sub0 State in ms"}));
  EXPECT_TRUE(log_.entries().empty());
}

TEST_F(AlsaFlumeTest, WhatWasCountedBeforeTheFirstReadingIsNobodys) {
  show("playing");
  read();
  EXPECT_EQ(channel(" Frames").value, 0);
  EXPECT_EQ(state("RUNNING").residency, 0U);
  EXPECT_EQ(state("RUNNING").transitions, 0U);
  EXPECT_EQ(state("RUNNING").dutyCycle, 0);
}

TEST_F(AlsaFlumeTest, NewStateHoldsSinceItsTriggerAndTheOneBeforeUntilThen) {
  show("idle");
  read();
  clock_.advance(10s);
  show("playing");  // started 7.576 s before the reading
  read();
  EXPECT_EQ(state("RUNNING").residency, 7575U);
  EXPECT_EQ(state("RUNNING").transitions, 1U);
  EXPECT_NEAR(state("RUNNING").dutyCycle, 0.7575757, 1e-6);
  EXPECT_EQ(channel(" Frames").value, 363636);
  clock_.advance(2s);
  show("xrun");  // half a second before the reading
  read();
  EXPECT_EQ(state("RUNNING").residency, 7575U + 1500U);
  EXPECT_EQ(state("XRUN").residency, 500U);
  EXPECT_EQ(state("XRUN").transitions, 1U);
  EXPECT_EQ(channel(" Overruns").value, 1);
  EXPECT_EQ(channel(" Frames").value, 435636);
  // The recorder was prepared without a trigger, so its time until the next reading was that of the state before.
  EXPECT_EQ(channel(" State", "pcm0c").states[2].residency, 1000U);
  EXPECT_EQ(channel(" State", "pcm0c").states[3].residency, 1000U);
}

TEST_F(AlsaFlumeTest, SubstreamThatNobodyHasOpenCountsNothing) {
  show("idle");
  read();
  clock_.advance(10s);
  read();
  ASSERT_EQ(samples_.size(), 9U);
  EXPECT_EQ(channel(" State").states.size(), kAlsaStateCount - 1);
  for (const FlumeChannel& each : samples_) {
    EXPECT_EQ(each.value, 0);
    for (const auto& held : each.states) {
      EXPECT_EQ(held.residency, 0U) << held.name;
      EXPECT_NE(held.name, "closed");
    }
  }
}

TEST_F(AlsaFlumeTest, StateThatStaysHoldsTheWholeTime) {
  show("playing");
  status(kPlayer, running(10, 20, 1000));
  read();
  clock_.advance(5s);
  status(kPlayer, running(10, 25, 241000));
  read();
  EXPECT_EQ(state("RUNNING").residency, 5000U);
  EXPECT_EQ(state("RUNNING").transitions, 0U);
  EXPECT_EQ(state("RUNNING").dutyCycle, 1);
  EXPECT_EQ(channel(" Frames").value, 240000);
}

TEST_F(AlsaFlumeTest, RestartBetweenTwoReadingsIsATransition) {
  show("playing");
  status(kPlayer, running(10, 20, 1000));
  read();
  clock_.advance(5s);
  status(kPlayer, running(24, 25, 48000 / 60));
  read();
  EXPECT_EQ(state("RUNNING").residency, 5000U);
  EXPECT_EQ(state("RUNNING").transitions, 1U);
  EXPECT_EQ(channel(" Frames").value, 800);
}

TEST_F(AlsaFlumeTest, TriggerIsHeldToTheTimeThatPassed) {
  show("idle");
  read();
  clock_.advance(1s);
  status(kPlayer, running(10, 500, 1));
  read();
  EXPECT_EQ(state("RUNNING").residency, 1000U);
  clock_.advance(1s);
  status(kPlayer, text("PAUSED", 700, 600, 2));  // by a clock that was set back
  read();
  EXPECT_EQ(state("PAUSED").residency, 0U);
  EXPECT_EQ(state("RUNNING").residency, 2000U);
}

TEST_F(AlsaFlumeTest, ManyReadingsAreAsGoodAsOne) {
  show("playing");
  status(kPlayer, running(10, 20, 0));
  read();
  for (int i = 1; i <= 1000; ++i) {
    clock_.advance(300us);
    status(kPlayer, running(10, 20 + i * 3e-4, 14 * i));
    read();
  }
  EXPECT_EQ(state("RUNNING").residency, 300U);
  EXPECT_EQ(channel(" Frames").value, 14000);
}

TEST_F(AlsaFlumeTest, KernelsCounterOfOverrunsCountsWhereThereIsOne) {
  show("counting");
  read();
  EXPECT_EQ(samples_.size(), 9U);
  EXPECT_EQ(samples_.back().name.driver, "Mic_1");
  clock_.advance(1s);
  status("card0/pcm2p/sub1", running(100, 102, 5000, "xrun_counter: 5\n"));
  read();
  EXPECT_EQ(samples_[4].name.name, "ALC287 Alt Analog sub1 Overruns");
  EXPECT_EQ(samples_[4].value, 2);
  status("card0/pcm2p/sub1", text("XRUN", 103, 103, 5000) + "xrun_counter: 6\n");
  read();
  EXPECT_EQ(samples_[4].value, 3);
  status("card0/pcm2p/sub1", "closed\n");
  read();
  status("card0/pcm2p/sub1", running(104, 104, 0, "xrun_counter: 1\n"));
  read();
  EXPECT_EQ(samples_[4].value, 4);
}

TEST_F(AlsaFlumeTest, OverrunThatLastsIsOne) {
  show("xrun");
  read();
  EXPECT_EQ(channel(" Overruns").value, 0);
  clock_.advance(1s);
  read();
  EXPECT_EQ(channel(" Overruns").value, 0);
  status(kPlayer, running(4253, 4254, 500000));
  read();
  status(kPlayer, text("XRUN", 4255, 4256, 500001));
  read();
  read();
  EXPECT_EQ(channel(" Overruns").value, 1);
}

TEST_F(AlsaFlumeTest, SubstreamThatCanNotBeReadIsOneComplaintAndTheOthersGoOn) {
  show("playing");
  read();
  clock_.advance(3s);
  status(kPlayer, "error -19\n");
  EXPECT_EQ(read().size(), 6U);
  EXPECT_EQ(read().size(), 6U);
  fs::remove(folder_.path("asound/card0/pcm0c/sub0/info"));
  EXPECT_EQ(read().size(), 3U);
  folder_.write("asound/card0/pcm3p/sub0/info", "id: x\n");
  EXPECT_EQ(read().size(), 0U);
  EXPECT_EQ(log_.messages(),
            (Lines{"driver channels: the substream card0/pcm0p/sub0 tells no state",
                   "driver channels: the substream card0/pcm0c/sub0 can't be read: No such file or directory",
                   "driver channels: the substream card0/pcm3p/sub0 tells no direction"}));
  EXPECT_EQ(log_.entries().front().category, "tarnrd");
  status(kPlayer, running(4242.424242424, 4253, 363636));
  read();
  EXPECT_EQ(state("RUNNING").residency, 3000U);  // it was only not seen
}

TEST_F(AlsaFlumeTest, CardThatGoesTakesItsSumsAlong) {
  show("playing");
  read();
  clock_.advance(3s);
  read();
  EXPECT_EQ(state("RUNNING").residency, 3000U);
  fs::remove_all(folder_.path("asound/card0"));
  EXPECT_TRUE(read().empty());
  show("playing");
  read();
  EXPECT_EQ(state("RUNNING").residency, 0U);
  EXPECT_TRUE(log_.entries().empty());
}

TEST_F(AlsaFlumeTest, OnlyNumberedNamesAreLookedAt) {
  show("playing");
  const fs::path card = folder_.path("asound/card0");
  fs::copy(card / "pcm0p", card / "pcm0x", fs::copy_options::recursive);
  fs::copy(card / "pcm0p", card / "pcmp", fs::copy_options::recursive);
  fs::copy(card / "pcm0p", card / "pcm12345p", fs::copy_options::recursive);
  fs::create_symlink("card0", folder_.path("asound/PCH"));
  fs::create_symlink("card0", folder_.path("asound/cardPCH"));
  EXPECT_EQ(read().size(), 9U);
}

TEST_F(AlsaFlumeTest, CardWithoutAnIdGoesByItsNumber) {
  show("playing");
  fs::remove(folder_.path("asound/card0/id"));
  EXPECT_EQ(read().front().name.driver, "card0");
}

TEST_F(AlsaFlumeTest, SubstreamsAreBoundedAndThatIsToldOnce) {
  show("idle");
  const fs::path pcm = folder_.path("asound/card0/pcm0p");
  for (int i = 1; i < 300; ++i) {
    fs::copy(pcm / "sub0", pcm / ("sub" + std::to_string(i)));
  }
  EXPECT_EQ(read().size(), 3U * AlsaFlume::kMostSubstreams);
  read();
  EXPECT_EQ(log_.messages(),
            (Lines{"driver channels: there are more than 256 PCM substreams, the others are left out"}));
}

TEST_F(AlsaFlumeTest, DifferenceOfTwoSamplesIsWhatHappenedInBetween) {
  show("playing");
  LinuxFlumeService service({&alsa_});
  const auto subscribed = service.subscribe(*service.copyChannels("Speaker", {}).value);
  clock_.advance(100s);
  const auto before = service.createSamples(*subscribed.subscription, *subscribed.channels).value;
  clock_.advance(2s);
  show("xrun");
  const auto after = service.createSamples(*subscribed.subscription, *subscribed.channels).value;
  samples_ = *service.createDelta(before, after).value;
  EXPECT_EQ(samples_.size(), 3U);
  EXPECT_EQ(channel(" Frames").value, 72000);
  EXPECT_EQ(state("RUNNING").residency, 1500U);
  EXPECT_EQ(state("XRUN").residency, 500U);
}

}  // namespace
}  // namespace tarn::linux_host
