// SPDX-License-Identifier: Apache-2.0
#include "tests/adapters/pipewire/StreamBookFixture.h"

namespace tarn::streams {

using Names = std::vector<std::string>;

class PipeWireFaults : public StreamBookFixture {
 protected:
  void SetUp() override {
    addSinks();
    addPlayer(at(10));
    run(at(11));
    book.take();
  }
  // One of 1024 frames at 48000 a second, in which the player is done in time or isn't.
  static CycleFacts cycle(double seconds, bool finished, std::int64_t xruns = 0) {
    return {kSpeaker,
            static_cast<std::int64_t>(seconds * 1000),
            at(seconds),
            1024,
            48000,
            xruns,
            {{kPlayer, finished, 2048}}};
  }
  void settled(const CycleFacts& facts) {
    book.cycleSeen(facts);
    book.settle();
  }
};

TEST_F(PipeWireFaults, TheGraphsQuantumIsSaidOnceItIsKnown) {
  settled(cycle(12, true));
  const auto posts = said();
  ASSERT_EQ(namesOf(posts), Names{"Playback Setup"});
  EXPECT_EQ(textOfField(posts[0], "graph_quantum"), "1024");
  EXPECT_EQ(textOfField(posts[0], "graph_rate"), "48000");
  EXPECT_EQ(textOfField(posts[0], "stream_latency_frames"), "2048");
  settled(cycle(12.1, true));
  EXPECT_TRUE(book.take().empty());
}

TEST_F(PipeWireFaults, CyclesMissedInARowAreOneOverloadAsLongAsTheyLasted) {
  settled(cycle(12, true));
  book.take();
  book.cycleSeen(cycle(12.5, false));
  book.cycleSeen(cycle(12.75, false));
  EXPECT_TRUE(book.take().empty());
  book.cycleSeen(cycle(13, true));
  const auto posts = said();
  ASSERT_EQ(namesOf(posts), Names{"IO Error"});
  EXPECT_EQ(posts[0].stamp, at(12.5));
  EXPECT_EQ(textOfField(posts[0], "issue_type"), "overload");
  EXPECT_EQ(textOfField(posts[0], "smallest_buffer_frame_size"), "1024");
  EXPECT_EQ(textOfField(posts[0], "io_cycle"), "12500");
  EXPECT_EQ(textOfField(posts[0], "overload_cycles"), "2");
  EXPECT_EQ(textOfField(posts[0], "overload_seconds"), "0.5");
  book.cycleSeen(cycle(13.1, true));
  EXPECT_TRUE(book.take().empty());
}

TEST_F(PipeWireFaults, AnOverloadEndsWithTheRun) {
  settled(cycle(12, true));
  book.cycleSeen(cycle(12.5, false));
  book.take();
  pause(at(12.75));
  const auto posts = said();
  ASSERT_EQ(namesOf(posts), (Names{"IO Error", "Playback Stop"}));
  EXPECT_EQ(textOfField(posts[0], "overload_seconds"), "0.25");
}

TEST_F(PipeWireFaults, AnXrunOfTheDriverAloneIsOneOfItsStreams) {
  settled(cycle(12, true, 7));  // what was before isn't this run's
  book.take();
  book.cycleSeen(cycle(12.5, true, 8));
  book.cycleSeen(cycle(12.75, true, 8));
  const auto posts = said();
  ASSERT_EQ(namesOf(posts), Names{"IO Error"});
  EXPECT_EQ(textOfField(posts[0], "overload_cycles"), "1");
}

TEST_F(PipeWireFaults, AnXrunIsItsWhoWasNotDone) {
  book.nodeKnown(41, at(11), nodeOf(NodeState::Running, {{"media.class", "Stream/Output/Audio"}, {"node.name", "b"}}));
  CycleFacts both = cycle(12, true);
  both.followers.push_back({41, true, 0});
  settled(both);
  book.take();
  both = cycle(12.5, false, 1);
  both.followers.push_back({41, true, 0});
  book.cycleSeen(both);
  both = cycle(12.75, true, 1);
  both.followers.push_back({41, true, 0});
  book.cycleSeen(both);
  const auto posts = said();
  ASSERT_EQ(namesOf(posts), Names{"IO Error"});
  EXPECT_EQ(posts[0].stream, 1U);
}

TEST_F(PipeWireFaults, WhoDoesNotRunMissesNothing) {
  settled(cycle(12, true));
  pause(at(12.5));
  book.take();
  book.cycleSeen(cycle(13, false));
  book.cycleSeen(cycle(14, true));
  EXPECT_TRUE(book.take().empty());
}

TEST_F(PipeWireFaults, AnErrorOfTheNodeIsSaidOnceWithItsText) {
  book.nodeKnown(kPlayer, at(12), {NodeState::Error, "no more buffers", playerProperties()});
  const auto posts = said();
  ASSERT_EQ(namesOf(posts), (Names{"Playback Stop", "Error Error"}));
  EXPECT_EQ(posts[1].stamp, at(12));
  EXPECT_EQ(textOfField(posts[1], "issue_type"), "node-error");
  EXPECT_EQ(textOfField(posts[1], "error_text"), "no more buffers");
  book.nodeKnown(kPlayer, at(13), {NodeState::Error, "no more buffers", playerProperties()});
  EXPECT_TRUE(book.take().empty());
}

TEST_F(PipeWireFaults, AnErrorOfADeviceIsThatOfItsStreams) {
  book.nodeKnown(kSpeaker, at(12),
                 {NodeState::Error, "gone", {{"media.class", "Audio/Sink"}, {"node.name", "speaker"}}});
  const auto posts = said();
  ASSERT_EQ(namesOf(posts), Names{"Error Error"});
  EXPECT_EQ(textOfField(posts[0], "issue_type"), "device-error");
  book.nodeKnown(kHeadset, at(12),
                 {NodeState::Error, "gone", {{"media.class", "Audio/Sink"}, {"node.name", "headset"}}});
  EXPECT_TRUE(book.take().empty());
}

TEST_F(PipeWireFaults, AnErrorOfALinkIsSaidOnce) {
  book.linkKnown(60, at(12), {kPlayer, kSpeaker, true, "no format"});
  auto posts = said();
  ASSERT_EQ(namesOf(posts), Names{"Error Error"});
  EXPECT_EQ(textOfField(posts[0], "issue_type"), "link-error");
  EXPECT_EQ(textOfField(posts[0], "error_text"), "no format");
  book.linkKnown(60, at(13), {kPlayer, kSpeaker, true, "no format"});
  EXPECT_TRUE(book.take().empty());
}

TEST_F(PipeWireFaults, ATextOfAnErrorHasABound) {
  book.linkKnown(60, at(12), {kPlayer, kSpeaker, true, std::string(10000, 'x')});
  EXPECT_EQ(textOfField(said().at(0), "error_text").size(), 256U);
}

}  // namespace tarn::streams
