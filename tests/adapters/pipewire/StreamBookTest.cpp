// SPDX-License-Identifier: Apache-2.0
#include "adapters/pipewire/core/StreamBook.h"

#include <tuple>

#include "tests/adapters/pipewire/StreamBookFixture.h"

namespace tarn::streams {

using Names = std::vector<std::string>;

class PipeWireStreams : public StreamBookFixture {
 protected:
  void SetUp() override { addSinks(); }
};

TEST_F(PipeWireStreams, AStreamHasASessionFromWhenItIsSeenToWhenItGoes) {
  addPlayer(at(10));
  const Actions begun = book.take();
  ASSERT_EQ(begun.size(), 1U);
  const BeginSession& session = std::get<BeginSession>(begun[0]);
  EXPECT_EQ(session.stream, 1U);
  EXPECT_EQ(session.serviceType, 7U);
  EXPECT_EQ(session.application, "oxplay");

  book.removed(kPlayer, at(12));
  const Actions ended = book.take();
  ASSERT_EQ(ended.size(), 2U);
  const PostMessage& last = std::get<PostMessage>(ended[0]);
  EXPECT_EQ(nameOf(last), "Generic Stop");
  EXPECT_EQ(textOfField(last, "end_reason"), "stream-ended");
  EXPECT_EQ(textOfField(last, "session_duration"), "(none)");  // it never ran
  EXPECT_EQ(std::get<EndSession>(ended[1]).stream, 1U);
  EXPECT_EQ(std::get<EndSession>(ended[1]).stamp, at(12));
}

TEST_F(PipeWireStreams, ARunBeginsWithAllThatIsKnownAndEndsWithItsTime) {
  addPlayer(at(10));
  book.take();

  run(at(11));
  const auto start = said();
  ASSERT_EQ(namesOf(start), Names{"Playback Start"});
  EXPECT_EQ(start[0].stamp, at(11));
  EXPECT_EQ(textOfField(start[0], "stream_run"), "1");
  EXPECT_EQ(textOfField(start[0], "session_output_running"), "true");
  EXPECT_EQ(textOfField(start[0], "KvSessionVolume"), "0.5");
  EXPECT_EQ(textOfField(start[0], "volume_linear"), "0.125");
  EXPECT_EQ(textOfField(start[0], "channel_volumes"), "0.125,0.125");
  EXPECT_EQ(textOfField(start[0], "muted"), "false");
  EXPECT_EQ(textOfField(start[0], "active_devices"), "speaker");
  EXPECT_EQ(textOfField(start[0], "device_bus"), "virtual");
  EXPECT_EQ(textOfField(start[0], "session_selected_format"), "S16LE 48000 Hz 2 ch");
  EXPECT_EQ(textOfField(start[0], "mFormatID"), "S16LE");
  EXPECT_EQ(textOfField(start[0], "mChannelsPerFrame"), "2");
  EXPECT_EQ(textOfField(start[0], "lagoon_session"), "0");

  pause(at(14.5));
  const auto stop = said();
  ASSERT_EQ(namesOf(stop), Names{"Playback Stop"});
  EXPECT_EQ(stop[0].stamp, at(14.5));
  EXPECT_EQ(textOfField(stop[0], "session_output_running"), "false");
}

TEST_F(PipeWireStreams, RunsAreNumberedAndAddUp) {
  addPlayer(at(10));
  run(at(11));
  pause(at(13));
  book.take();
  run(at(20));
  EXPECT_EQ(textOfField(said().at(0), "stream_run"), "2");
  book.removed(kPlayer, at(21.5));
  const auto last = said();
  ASSERT_EQ(namesOf(last), (Names{"Playback Stop", "Generic Stop"}));
  EXPECT_EQ(textOfField(last[0], "stream_run"), "2");
  EXPECT_EQ(last[1].stamp, at(21.5));
  EXPECT_EQ(textOfField(last[1], "session_duration"), "3.5");
}

TEST_F(PipeWireStreams, WhatComesInPiecesIsSaidAtOnceWithTheTimeOfTheRun) {
  book.nodeKnown(kPlayer, at(10), nodeOf(NodeState::Running, playerProperties()));
  book.volumesKnown(kPlayer, at(10.5), volumeOf(1.0F));
  EXPECT_FALSE(book.isSettled());
  EXPECT_TRUE(book.take().empty());
  book.clientKnown(kClient, {{"application.process.binary", "oxplay"}});
  book.linkKnown(60, at(11), {kPlayer, kSpeaker, false, {}});
  book.settle();
  const auto start = said();
  ASSERT_EQ(namesOf(start), Names{"Playback Start"});
  EXPECT_EQ(start[0].stamp, at(10));
  EXPECT_EQ(textOfField(start[0], "active_devices"), "speaker");
  EXPECT_TRUE(book.isSettled());
}

TEST_F(PipeWireStreams, AStreamWaitsForItsClientToBeKnown) {
  book.nodeKnown(kPlayer, at(10), nodeOf(NodeState::Running, playerProperties()));
  book.settle();
  EXPECT_TRUE(book.take().empty());
  book.clientKnown(kClient, {{"application.id", "org.example.Player"}});
  book.settle();
  const Actions actions = book.take();
  ASSERT_EQ(actions.size(), 2U);
  EXPECT_EQ(std::get<BeginSession>(actions[0]).application, "org.example.Player");
  EXPECT_EQ(std::get<PostMessage>(actions[1]).stamp, at(10));
}

TEST_F(PipeWireStreams, ARunThatIsOverBeforeAllWasToldIsSaidAllTheSame) {
  book.nodeKnown(kPlayer, at(10), nodeOf(NodeState::Running, playerProperties()));
  book.removed(kPlayer, at(10.25));
  const Actions actions = book.take();
  ASSERT_EQ(actions.size(), 5U);
  EXPECT_EQ(std::get<BeginSession>(actions[0]).application, "player");
  EXPECT_EQ(nameOf(std::get<PostMessage>(actions[1])), "Playback Start");
  EXPECT_EQ(nameOf(std::get<PostMessage>(actions[2])), "Playback Stop");
  EXPECT_EQ(textOfField(std::get<PostMessage>(actions[3]), "session_duration"), "0.25");
  EXPECT_TRUE(book.isSettled());
}

TEST_F(PipeWireStreams, ARunThatPausesBeforeAllWasToldIsSaidAllTheSame) {
  addPlayer(at(10));
  book.take();
  book.nodeKnown(kPlayer, at(11), nodeOf(NodeState::Running, playerProperties()));
  book.nodeKnown(kPlayer, at(11.5), nodeOf(NodeState::Idle, playerProperties()));
  const auto posts = said();
  ASSERT_EQ(namesOf(posts), (Names{"Playback Start", "Playback Stop"}));
  EXPECT_EQ(posts[0].stamp, at(11));
  EXPECT_EQ(posts[1].stamp, at(11.5));
}

TEST_F(PipeWireStreams, APauseBetweenTwoLooksIsNotLost) {
  addPlayer(at(10));
  run(at(11));
  book.take();
  book.nodeKnown(kPlayer, at(12), nodeOf(NodeState::Idle, playerProperties()));
  book.nodeKnown(kPlayer, at(13), nodeOf(NodeState::Running, playerProperties()));
  book.settle();
  const auto posts = said();
  ASSERT_EQ(namesOf(posts), (Names{"Playback Stop", "Playback Start"}));
  EXPECT_EQ(posts[0].stamp, at(12));
  EXPECT_EQ(posts[1].stamp, at(13));
}

TEST_F(PipeWireStreams, AChangeOfVolumeIsSaidWithItsTimeWhileTheStreamRuns) {
  addPlayer(at(10));
  book.volumesKnown(kPlayer, at(10.5), volumeOf(0.001F));
  book.settle();
  book.take();
  run(at(11));
  book.take();
  book.volumesKnown(kPlayer, at(12), volumeOf(0.421875F));
  book.settle();
  auto posts = said();
  ASSERT_EQ(namesOf(posts), Names{"Volume Generic"});
  EXPECT_EQ(posts[0].stamp, at(12));
  EXPECT_EQ(textOfField(posts[0], "KvSessionVolume"), "0.75");
  EXPECT_EQ(textOfField(posts[0], "stream_run"), "1");

  VolumeFacts muted = volumeOf(0.421875F);
  muted.muted = true;
  book.volumesKnown(kPlayer, at(13), muted);
  book.settle();
  posts = said();
  ASSERT_EQ(namesOf(posts), Names{"Volume Generic"});
  EXPECT_EQ(textOfField(posts[0], "KvSessionVolume"), "0.");
  EXPECT_EQ(textOfField(posts[0], "muted"), "true");
  EXPECT_EQ(textOfField(posts[0], "volume_linear"), "0.421875");

  book.volumesKnown(kPlayer, at(14), muted);
  book.settle();
  EXPECT_TRUE(book.take().empty());
}

TEST_F(PipeWireStreams, AMoveToAnotherSinkIsAChangeOfRouteAndPlayingNowhereIsNone) {
  addPlayer(at(10));
  run(at(11));
  book.take();
  book.removed(60, at(12));
  book.settle();
  EXPECT_TRUE(book.take().empty());
  book.linkKnown(61, at(12.25), {kPlayer, kHeadset, false, {}});
  book.settle();
  const auto posts = said();
  ASSERT_EQ(namesOf(posts), Names{"RouteChange Generic"});
  EXPECT_EQ(posts[0].stamp, at(12.25));
  EXPECT_EQ(textOfField(posts[0], "active_devices"), "headset");
}

TEST_F(PipeWireStreams, SeveralSinksAreAGroup) {
  addPlayer(at(10));
  run(at(11));
  book.take();
  book.linkKnown(61, at(12), {kPlayer, kHeadset, false, {}});
  book.settle();
  auto posts = said();
  ASSERT_EQ(namesOf(posts), (Names{"RouteChange Generic", "Lagoon Start"}));
  EXPECT_EQ(textOfField(posts[0], "active_devices"), "headset,speaker");
  EXPECT_EQ(textOfField(posts[1], "lagoon_session"), "1");
  EXPECT_EQ(textOfField(posts[1], "device_count"), "2");

  book.removed(60, at(13));
  book.settle();
  posts = said();
  ASSERT_EQ(namesOf(posts), (Names{"RouteChange Generic", "Lagoon Stop"}));
  EXPECT_EQ(textOfField(posts[1], "lagoon_session"), "0");
}

TEST_F(PipeWireStreams, AGroupIsOverWhenTheRunIs) {
  addPlayer(at(10));
  book.linkKnown(61, at(10), {kPlayer, kHeadset, false, {}});
  run(at(11));
  EXPECT_EQ(textOfField(said().at(0), "lagoon_session"), "1");
  pause(at(12));
  EXPECT_EQ(textOfField(said().at(0), "lagoon_session"), "0");
}

TEST_F(PipeWireStreams, ADefaultThatTheStreamDoesNotFollowIsToldAllTheSame) {
  addPlayer(at(10));
  book.defaultKnown(at(10), true, "speaker");
  run(at(11));
  EXPECT_EQ(textOfField(said().at(0), "device_is_default"), "true");
  book.defaultKnown(at(12), true, "headset");
  book.settle();
  const auto posts = said();
  ASSERT_EQ(namesOf(posts), Names{"RouteChange Generic"});
  EXPECT_EQ(textOfField(posts[0], "active_devices"), "speaker");
  EXPECT_EQ(textOfField(posts[0], "device_is_default"), "false");
}

TEST_F(PipeWireStreams, WhoPlaysToWhatIsNotTheDefaultMakesTheDefaultDoubtful) {
  book.defaultKnown(1, true, "speaker");
  addPlayer(at(1));
  run(at(2));
  const bool atTheDefault = book.takeDoubtOfDefault();
  book.removed(60, at(3));
  book.settle();
  const bool nowhere = book.takeDoubtOfDefault();
  book.linkKnown(61, at(3), {kPlayer, kHeadset, false, {}});
  book.settle();
  const bool elsewhere = book.takeDoubtOfDefault();
  EXPECT_EQ(std::tuple(atTheDefault, nowhere, elsewhere, book.takeDoubtOfDefault()),
            std::tuple(false, false, true, false));
}

TEST_F(PipeWireStreams, ARunThatBeginsElsewhereMakesTheDefaultDoubtfulUntilPipeWireGoes) {
  book.defaultKnown(1, true, "headset");
  addPlayer(at(1));
  EXPECT_FALSE(book.takeDoubtOfDefault());
  run(at(2));
  EXPECT_TRUE(book.takeDoubtOfDefault());
  pause(at(3));
  run(at(4));
  book.end(at(5), "gone");
  EXPECT_FALSE(book.takeDoubtOfDefault());
}

TEST_F(PipeWireStreams, ADevicesVolumeIsToldBesideTheStreams) {
  addPlayer(at(10));
  run(at(11));
  book.take();
  book.volumesKnown(kSpeaker, at(12), volumeOf(0.001F));
  book.settle();
  const auto posts = said();
  ASSERT_EQ(namesOf(posts), Names{"Volume Generic"});
  EXPECT_EQ(textOfField(posts[0], "KvSessionVolume"), "0.5");
  EXPECT_EQ(textOfField(posts[0], "device_volume"), "0.1");
}

TEST_F(PipeWireStreams, AnotherFormatIsASetup) {
  addPlayer(at(10));
  run(at(11));
  book.take();
  book.formatKnown(kPlayer, at(12), FormatFacts{"F32LE", 96000, 6});
  book.settle();
  auto posts = said();
  ASSERT_EQ(namesOf(posts), Names{"Playback Setup"});
  EXPECT_EQ(textOfField(posts[0], "session_selected_format"), "F32LE 96000 Hz 6 ch");
  EXPECT_EQ(textOfField(posts[0], "sample_rate"), "96000");
  book.formatKnown(kPlayer, at(13), std::nullopt);
  book.settle();
  EXPECT_TRUE(book.take().empty());
}

TEST_F(PipeWireStreams, ARecordingIsInputWithItsPortAndCodec) {
  book.deviceKnown(70, at(9),
                   {{"device.api", "bluez5"}, {"device.bus", "bluetooth"}, {"device.form-factor", "headset"}});
  book.portKnown(70, at(9), false, 3, {"headset-input", "headset"});
  book.nodeKnown(52, at(9),
                 nodeOf(NodeState::Idle, {{"media.class", "Audio/Source"},
                                          {"node.name", "bluez_input.AA_BB_CC_DD_EE_FF.0"},
                                          {"device.id", "70"},
                                          {"card.profile.device", "3"},
                                          {"api.bluez5.codec", "msbc"},
                                          {"api.bluez5.profile", "headset-head-unit"}}));
  book.formatKnown(52, at(9), FormatFacts{"S16LE", 16000, 1});
  const Properties recorder{{"media.class", "Stream/Input/Audio"}, {"node.name", "recorder"}};
  book.nodeKnown(41, at(10), nodeOf(NodeState::Running, recorder));
  book.linkKnown(62, at(10), {52, 41, false, {}});
  book.settle();
  auto posts = said();
  ASSERT_EQ(namesOf(posts), Names{"Input Start"});
  EXPECT_EQ(textOfField(posts[0], "session_input_running"), "true");
  EXPECT_EQ(textOfField(posts[0], "active_devices").substr(0, 12), "bluez_input.");
  EXPECT_EQ(textOfField(posts[0], "active_devices").find("AA_BB"), std::string::npos);
  EXPECT_EQ(textOfField(posts[0], "vp_config_input_port"), "headset-input");
  EXPECT_EQ(textOfField(posts[0], "vp_config_primary_vocoder"), "msbc");
  EXPECT_EQ(textOfField(posts[0], "vp_config_primary_vocoderFs"), "16000.0");
  EXPECT_EQ(textOfField(posts[0], "device_form_factor"), "headset");
  EXPECT_EQ(textOfField(posts[0], "device_profile"), "headset-head-unit");
  EXPECT_EQ(textOfField(posts[0], "lagoon_session"), "(none)");

  book.nodeKnown(41, at(12), nodeOf(NodeState::Suspended, recorder));
  posts = said();
  ASSERT_EQ(namesOf(posts), Names{"Input Stop"});
  EXPECT_EQ(textOfField(posts[0], "session_input_running"), "false");
  EXPECT_EQ(textOfField(posts[0], "vp_config_primary_vocoder"), "none");
  EXPECT_EQ(textOfField(posts[0], "vp_config_primary_vocoderFs"), "0.0");
}

TEST_F(PipeWireStreams, WhatPlaysIsRecordedFromItsMonitor) {
  book.nodeKnown(41, at(10),
                 nodeOf(NodeState::Running, {{"media.class", "Stream/Input/Audio"}, {"node.name", "meter"}}));
  book.linkKnown(62, at(10), {kSpeaker, 41, false, {}});
  book.settle();
  EXPECT_EQ(textOfField(said().at(0), "active_devices"), "speaker.monitor");
}

TEST_F(PipeWireStreams, AStreamThatAnotherRecordsHasNoDeviceByThat) {
  addPlayer(at(10));
  book.nodeKnown(41, at(10), nodeOf(NodeState::Idle, {{"media.class", "Stream/Input/Audio"}, {"node.name", "meter"}}));
  book.linkKnown(62, at(10), {kPlayer, 41, false, {}});
  run(at(11));
  EXPECT_EQ(textOfField(said().at(0), "active_devices"), "speaker");
}

TEST_F(PipeWireStreams, WhenPipeWireGoesEverySessionEndsThen) {
  addPlayer(at(10));
  run(at(11));
  book.take();
  book.end(at(15), kPipeWireEnded);
  const auto posts = said();
  ASSERT_EQ(namesOf(posts), (Names{"Playback Stop", "Generic Stop"}));
  EXPECT_EQ(posts[0].stamp, at(15));
  EXPECT_EQ(textOfField(posts[1], "end_reason"), "pipewire-ended");
  EXPECT_EQ(textOfField(posts[1], "session_duration"), "4.");
  EXPECT_TRUE(book.look().empty());
}

TEST_F(PipeWireStreams, ANumberThatIsUsedAgainIsAnotherStream) {
  addPlayer(at(10));
  book.removed(kPlayer, at(11));
  book.take();
  addPlayer(at(12));
  const Actions actions = book.take();
  ASSERT_EQ(actions.size(), 1U);
  EXPECT_EQ(std::get<BeginSession>(actions[0]).stream, 2U);
}

TEST_F(PipeWireStreams, WhoIsNotReportedLeavesNothing) {
  Rules rules;
  rules.deny = {"ox*"};
  StreamBook quiet(rules);
  quiet.clientKnown(kClient, {{"application.process.binary", "oxplay"}});
  quiet.nodeKnown(kPlayer, at(10), nodeOf(NodeState::Running, playerProperties()));
  quiet.settle();
  quiet.volumesKnown(kPlayer, at(11), volumeOf(0.5F));
  quiet.settle();
  EXPECT_FALSE(quiet.anyRuns());
  ASSERT_EQ(quiet.look().size(), 1U);
  EXPECT_FALSE(quiet.look()[0].isReported);
  quiet.nodeKnown(kPlayer, at(12), {NodeState::Error, "broken", playerProperties()});
  quiet.removed(kPlayer, at(13));
  EXPECT_TRUE(quiet.take().empty());
}

TEST_F(PipeWireStreams, NodesThatAreNoStreamsOfSoundHaveNoSession) {
  book.nodeKnown(41, at(10), nodeOf(NodeState::Running, {{"media.class", "Stream/Output/Video"}}));
  book.nodeKnown(42, at(10), nodeOf(NodeState::Running, {{"media.class", "Midi/Bridge"}}));
  book.nodeKnown(43, at(10), nodeOf(NodeState::Running, {{"media.class", "Audio/Source/Virtual"}}));
  book.settle();
  EXPECT_TRUE(book.take().empty());
  EXPECT_TRUE(book.look().empty());
}

TEST_F(PipeWireStreams, ANodeThatGoesBeforeItsLinksLeavesNoTrace) {
  addPlayer(at(10));
  run(at(11));
  book.take();
  book.removed(kSpeaker, at(12));
  book.settle();
  book.removed(60, at(12));
  book.settle();
  EXPECT_TRUE(book.take().empty());
}

}  // namespace tarn::streams
