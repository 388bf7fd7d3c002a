// SPDX-License-Identifier: Apache-2.0
#include "adapters/pipewire/core/VolumeLaw.h"

#include <gtest/gtest.h>

#include <cmath>
#include <limits>

namespace tarn::streams {

TEST(PipeWireVolumeLaw, ASliderStandsAtTheCubeRootOfTheFactor) {
  EXPECT_EQ(sliderVolume(0.0), 0.0);
  EXPECT_EQ(sliderVolume(0.001), 0.1);
  EXPECT_EQ(sliderVolume(0.125), 0.5);
  EXPECT_EQ(sliderVolume(0.421875), 0.75);
  EXPECT_EQ(sliderVolume(1.0), 1.0);
}

TEST(PipeWireVolumeLaw, WhatAFloatAddsIsRoundedAway) {
  for (int percent = 0; percent <= 100; ++percent) {
    const double slider = percent / 100.0;
    EXPECT_EQ(sliderVolume(static_cast<double>(static_cast<float>(slider * slider * slider))), slider);
  }
}

TEST(PipeWireVolumeLaw, ASliderEndsAtOneAndTheFactorDoesNot) {
  const VolumeFacts loud{1.0F, false, false, {3.375F}, {}};
  EXPECT_EQ(linearVolume(loud), 3.375);
  EXPECT_EQ(sliderVolume(linearVolume(loud)), 1.0);
}

TEST(PipeWireVolumeLaw, TheLoudestChannelCountsWithTheNodesOwnVolume) {
  EXPECT_EQ(linearVolume({0.5F, false, false, {0.25F, 0.75F, 0.5F}, {1.0F}}), 0.375);
  EXPECT_EQ(linearVolume({0.5F, false, false, {}, {0.25F, 0.5F}}), 0.25);
  EXPECT_EQ(linearVolume({0.5F, false, false, {}, {}}), 0.5);
}

TEST(PipeWireVolumeLaw, WhatIsNoFactorIsSilence) {
  const float nothing = std::numeric_limits<float>::quiet_NaN();
  EXPECT_EQ(linearVolume({nothing, false, false, {}, {}}), 0.0);
  EXPECT_EQ(linearVolume({1.0F, false, false, {-1.0F, nothing}, {}}), 0.0);
}

TEST(PipeWireVolumeLaw, ChannelsAreToldAsTheyAre) {
  EXPECT_EQ(channelVolumesText({1.0F, false, false, {0.125F, 1.0F, 0.3F}, {0.5F}}), "0.125,1,0.3");
  EXPECT_EQ(channelVolumesText({1.0F, false, false, {}, {0.5F}}), "0.5");
  EXPECT_EQ(channelVolumesText({}), "");
}

TEST(PipeWireVolumeLaw, EitherWayOfMutingMutes) {
  EXPECT_FALSE(isMuted({}));
  EXPECT_TRUE(isMuted({1.0F, true, false, {}, {}}));
  EXPECT_TRUE(isMuted({1.0F, false, true, {}, {}}));
}

}  // namespace tarn::streams
