// SPDX-License-Identifier: Apache-2.0
#include "adapters/alsa/SubDeviceBook.h"

#include <optional>

#include "tests/adapters/pipewire/StreamBookFixture.h"

namespace tarn::streams {

using Names = std::vector<std::string>;
using linux_host::AlsaParameters;
using linux_host::AlsaStatus;

class SubDevices : public StreamBookFixture {
 protected:
  static std::size_t stateNamed(std::string_view name) {
    std::size_t state = 0;
    while (linux_host::kAlsaStates[state] != name) {
      ++state;
    }
    return state;
  }
  static OpenSubDevice speaker(std::string_view state, std::optional<std::uint64_t> overruns = {}) {
    AlsaStatus status;
    status.state = stateNamed(state);
    status.overruns = overruns;
    return {"PCH:pcm0p", true, false, false, {7, "oxplay"}, status, AlsaParameters{"S16_LE", 2, 44100, 441, 4410}};
  }
  // At `seconds`, when it has been in its state `forSeconds`.
  void look(double seconds, OpenSubDevice now, double forSeconds) {
    now.status.nowNanoseconds = at(seconds);
    now.status.triggerNanoseconds = at(seconds - forSeconds);
    subDevices.looked({now}, at(seconds));
  }
  std::vector<Action> actions() { return book.take(); }

  SubDeviceBook subDevices{book};
};

TEST_F(SubDevices, AProgramThatPlaysHasASessionAndARunSinceTheKernelSays) {
  look(10, speaker("RUNNING"), 0.75);
  const auto done = actions();
  ASSERT_EQ(done.size(), 3U);
  const auto& begin = std::get<BeginSession>(done[0]);
  EXPECT_EQ(begin.application, "oxplay");
  const auto& start = std::get<PostMessage>(done[1]);
  EXPECT_EQ(nameOf(start), "Playback Start");
  EXPECT_EQ(start.stamp, at(9.25));
  EXPECT_EQ(textOfField(start, "active_devices"), "PCH:pcm0p");
  EXPECT_EQ(textOfField(start, "session_selected_format"), "S16LE 44100 Hz 2 ch");
  const auto& setup = std::get<PostMessage>(done[2]);
  EXPECT_EQ(nameOf(setup), "Playback Setup");
  EXPECT_EQ(textOfField(setup, "graph_quantum"), "441");
  EXPECT_EQ(textOfField(setup, "stream_latency_frames"), "4410");
}

TEST_F(SubDevices, NothingIsSaidOfWhatStaysAsItIs) {
  look(10, speaker("RUNNING"), 1);
  actions();
  look(11, speaker("RUNNING"), 2);
  EXPECT_TRUE(actions().empty());
}

TEST_F(SubDevices, APauseEndsTheRunWhenItBegan) {
  look(10, speaker("RUNNING"), 1);
  actions();
  look(12, speaker("PAUSED"), 0.5);
  look(14, speaker("RUNNING"), 0.25);
  const auto posts = said();
  ASSERT_EQ(namesOf(posts), (Names{"Playback Stop", "Playback Start", "Playback Setup"}));
  EXPECT_EQ(posts[0].stamp, at(11.5));
  EXPECT_EQ(posts[1].stamp, at(13.75));
  EXPECT_EQ(textOfField(posts[1], "stream_run"), "2");
}

TEST_F(SubDevices, WhatIsClosedEndsWithTheLook) {
  look(10, speaker("RUNNING"), 1);
  actions();
  subDevices.looked({}, at(11));
  const auto done = actions();
  ASSERT_EQ(done.size(), 3U);
  EXPECT_EQ(std::get<PostMessage>(done[0]).stamp, at(11));
  EXPECT_EQ(textOfField(std::get<PostMessage>(done[1]), "session_duration"), "2.");
  EXPECT_EQ(std::get<EndSession>(done[2]).stamp, at(11));
  subDevices.looked({}, at(12));
  EXPECT_TRUE(actions().empty());
}

TEST_F(SubDevices, AnotherProcessIsAnotherSession) {
  look(10, speaker("RUNNING"), 1);
  actions();
  OpenSubDevice other = speaker("RUNNING");
  other.owner = {8, "oxsing"};
  look(12, other, 0.5);
  const auto done = actions();
  ASSERT_EQ(done.size(), 6U);
  EXPECT_EQ(std::get<EndSession>(done[2]).stamp, at(12));
  EXPECT_EQ(std::get<BeginSession>(done[3]).application, "oxsing");
  EXPECT_EQ(std::get<PostMessage>(done[4]).stamp, at(11.5));
}

TEST_F(SubDevices, OneThatIsOnlyOpenHasASessionWithoutARun) {
  for (const std::string_view state : {"OPEN", "SETUP", "PREPARED", "SUSPENDED"}) {
    look(10, speaker(state), 0);
    EXPECT_LE(actions().size(), 1U) << state;
  }
  subDevices.looked({}, at(11));
  EXPECT_EQ(namesOf(said()), Names{"Generic Stop"});
}

TEST_F(SubDevices, AStartBetweenTwoLooksIsAnotherRun) {
  look(10, speaker("RUNNING"), 1);
  actions();
  look(12, speaker("RUNNING"), 0.5);
  const auto posts = said();
  ASSERT_EQ(namesOf(posts), (Names{"Playback Stop", "Playback Start", "Playback Setup"}));
  EXPECT_EQ(posts[0].stamp, at(11.5));
  EXPECT_EQ(posts[1].stamp, at(11.5));
}

TEST_F(SubDevices, AnOverrunThatIsSeenIsAnOverloadAsLongAsItLasted) {
  look(10, speaker("RUNNING"), 1);
  actions();
  look(12, speaker("XRUN"), 0.5);
  EXPECT_TRUE(actions().empty());
  look(13, speaker("XRUN"), 1.5);
  look(14, speaker("RUNNING"), 0.25);
  const auto posts = said();
  ASSERT_EQ(namesOf(posts), Names{"IO Error"});
  EXPECT_EQ(posts[0].stamp, at(11.5));
  EXPECT_EQ(textOfField(posts[0], "overload_seconds"), "2.25");
  EXPECT_EQ(textOfField(posts[0], "overload_cycles"), "1");
  EXPECT_EQ(textOfField(posts[0], "smallest_buffer_frame_size"), "441");
}

TEST_F(SubDevices, OverrunsThatTheKernelCountedBetweenLooksAreAnOverloadAndNoPause) {
  look(10, speaker("RUNNING", 2), 1);
  actions();
  look(12, speaker("RUNNING", 5), 0.5);
  const auto posts = said();
  ASSERT_EQ(namesOf(posts), Names{"IO Error"});
  EXPECT_EQ(textOfField(posts[0], "overload_cycles"), "3");
  EXPECT_EQ(posts[0].stamp, at(11.5));
}

TEST_F(SubDevices, AMicrophoneIsInput) {
  OpenSubDevice microphone = speaker("RUNNING");
  microphone.name = "PCH:pcm0c";
  microphone.isPlayback = false;
  look(10, microphone, 1);
  const auto posts = said();
  ASSERT_EQ(namesOf(posts), (Names{"Input Start", "Input Setup"}));
  EXPECT_EQ(textOfField(posts[0], "active_devices"), "PCH:pcm0c");
}

TEST_F(SubDevices, OtherParametersAreAnotherFormat) {
  look(10, speaker("RUNNING"), 1);
  actions();
  OpenSubDevice other = speaker("RUNNING");
  other.parameters->format = "FLOAT_LE";
  look(11, other, 2);
  const auto posts = said();
  ASSERT_EQ(namesOf(posts), Names{"Playback Setup"});
  EXPECT_EQ(textOfField(posts[0], "mFormatID"), "F32LE");
}

TEST_F(SubDevices, AnOwnerThatIsNotKnownGoesByTheSubDevice) {
  OpenSubDevice nobody = speaker("RUNNING");
  nobody.owner = {};
  look(10, nobody, 1);
  EXPECT_EQ(std::get<BeginSession>(actions()[0]).application, "PCH:pcm0p");
}

TEST_F(SubDevices, WithoutTimesTheLookIsTheTime) {
  const OpenSubDevice now = speaker("RUNNING");
  subDevices.looked({now}, at(10));
  EXPECT_EQ(said()[0].stamp, at(10));
}

}  // namespace tarn::streams
