// SPDX-License-Identifier: Apache-2.0
#include "adapters/pipewire/core/StreamMemory.h"

#include "tests/adapters/pipewire/StreamBookFixture.h"

namespace tarn::streams {

class PipeWireStreamMemory : public StreamBookFixture {
 protected:
  void SetUp() override {
    addSinks();
    addPlayer(at(10));
    memory = StreamMemory(std::get<BeginSession>(book.take().at(0)));
    run(at(11));
    hear();
  }
  void hear() {
    for (const PostMessage& post : said()) {
      memory.remember(post);
    }
  }

  StreamMemory memory{BeginSession{}};
};

TEST_F(PipeWireStreamMemory, ARunIsRestatedAsItBegan) {
  const auto restated = memory.restatement();
  ASSERT_TRUE(restated);
  EXPECT_EQ(nameOf(*restated), "Playback Start");
  EXPECT_EQ(restated->stamp, at(11));
  EXPECT_EQ(textOfField(*restated, "restated"), "true");
  EXPECT_EQ(textOfField(*restated, "KvSessionVolume"), "0.5");
  EXPECT_EQ(memory.begin().application, "oxplay");
}

TEST_F(PipeWireStreamMemory, WhatChangedSinceIsRestatedWithTheTimeOfTheChange) {
  book.volumesKnown(kPlayer, at(12), volumeOf(1.0F));
  book.settle();
  book.linkKnown(61, at(13), {kPlayer, kHeadset, false, {}});
  book.settle();
  hear();
  const auto restated = memory.restatement();
  ASSERT_TRUE(restated);
  EXPECT_EQ(restated->stamp, at(13));
  EXPECT_EQ(textOfField(*restated, "KvSessionVolume"), "1.");
  EXPECT_EQ(textOfField(*restated, "active_devices"), "headset,speaker");
  EXPECT_EQ(textOfField(*restated, "lagoon_session"), "1");
}

TEST_F(PipeWireStreamMemory, WhatEndsNoSegmentLeavesTheTime) {
  book.cycleSeen({kSpeaker, 1, at(12), 1024, 48000, 0, {{kPlayer, true, 0}}});
  book.settle();
  book.cycleSeen({kSpeaker, 2, at(13), 1024, 48000, 0, {{kPlayer, false, 0}}});
  book.cycleSeen({kSpeaker, 3, at(14), 1024, 48000, 0, {{kPlayer, true, 0}}});
  hear();
  const auto restated = memory.restatement();
  ASSERT_TRUE(restated);
  EXPECT_EQ(restated->stamp, at(11));
  EXPECT_EQ(textOfField(*restated, "graph_quantum"), "1024");
  EXPECT_EQ(textOfField(*restated, "issue_type"), "(none)");
}

TEST_F(PipeWireStreamMemory, WhatDoesNotRunIsNotRestated) {
  pause(at(12));
  hear();
  EXPECT_FALSE(memory.restatement());
  book.removed(kPlayer, at(13));
  hear();
  EXPECT_FALSE(memory.restatement());
}

}  // namespace tarn::streams
