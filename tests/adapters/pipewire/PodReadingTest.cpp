// SPDX-License-Identifier: Apache-2.0
#include "adapters/pipewire/graph/PodReading.h"

#include <gtest/gtest.h>
#include <spa/param/audio/raw.h>
#include <spa/param/format.h>
#include <spa/param/param.h>
#include <spa/param/profiler.h>
#include <spa/param/props.h>
#include <spa/param/route.h>
#include <spa/pod/builder.h>

#include <array>
#include <string>

namespace tarn::streams {

// Builds one POD in room of its own.
class PipeWirePods : public testing::Test {
 protected:
  void SetUp() override { spa_pod_builder_init(&builder, room.data(), static_cast<std::uint32_t>(room.size())); }
  void object(std::uint32_t type, std::uint32_t id) {
    spa_pod_builder_push_object(&builder, &frames[depth++], type, id);
  }
  void member() { spa_pod_builder_push_struct(&builder, &frames[depth++]); }
  void key(std::uint32_t which) { spa_pod_builder_prop(&builder, which, 0); }
  const spa_pod* pop() { return static_cast<const spa_pod*>(spa_pod_builder_pop(&builder, &frames[--depth])); }
  void factors(std::uint32_t which, std::array<float, 2> values) {
    key(which);
    spa_pod_builder_array(&builder, sizeof(float), SPA_TYPE_Float, values.size(), values.data());
  }
  // Nothing left to choose from, as PipeWire tells a format that was agreed on.
  template <class Add>
  void chosen(std::uint32_t which, Add add) {
    key(which);
    spa_pod_builder_push_choice(&builder, &frames[depth++], SPA_CHOICE_None, 0);
    add();
    add();
    pop();
  }
  void block(std::uint32_t which, std::int32_t id, std::int32_t status, spa_fraction latency) {
    key(which);
    member();
    spa_pod_builder_int(&builder, id);
    spa_pod_builder_string(&builder, "node");
    for (int i = 0; i < 4; ++i) {
      spa_pod_builder_long(&builder, i);
    }
    spa_pod_builder_int(&builder, status);
    spa_pod_builder_fraction(&builder, latency.num, latency.denom);
    pop();
  }

  alignas(8) std::array<std::uint8_t, 4096> room{};
  spa_pod_builder builder{};
  std::array<spa_pod_frame, 8> frames{};
  std::size_t depth = 0;
};

TEST_F(PipeWirePods, VolumesAreThoseOfTheProps) {
  object(SPA_TYPE_OBJECT_Props, SPA_PARAM_Props);
  key(SPA_PROP_volume);
  spa_pod_builder_float(&builder, 0.5F);
  key(SPA_PROP_mute);
  spa_pod_builder_bool(&builder, true);
  factors(SPA_PROP_channelVolumes, {0.125F, 0.25F});
  key(SPA_PROP_softMute);
  spa_pod_builder_bool(&builder, false);
  factors(SPA_PROP_softVolumes, {1.0F, 0.75F});
  const auto volumes = volumesOf(pop());
  ASSERT_TRUE(volumes);
  EXPECT_EQ(volumes->volume, 0.5F);
  EXPECT_TRUE(volumes->muted);
  EXPECT_FALSE(volumes->softMuted);
  EXPECT_EQ(volumes->channelVolumes, (std::vector<float>{0.125F, 0.25F}));
  EXPECT_EQ(volumes->softVolumes, (std::vector<float>{1.0F, 0.75F}));
}

TEST_F(PipeWirePods, PropsWithoutVolumesAreNone) {
  object(SPA_TYPE_OBJECT_Props, SPA_PARAM_Props);
  key(SPA_PROP_mute);
  spa_pod_builder_bool(&builder, true);
  EXPECT_FALSE(volumesOf(pop()));
}

TEST_F(PipeWirePods, AFormatIsReadAlsoWhereNothingIsLeftToChoose) {
  object(SPA_TYPE_OBJECT_Format, SPA_PARAM_Format);
  chosen(SPA_FORMAT_mediaType, [this] { spa_pod_builder_id(&builder, SPA_MEDIA_TYPE_audio); });
  chosen(SPA_FORMAT_mediaSubtype, [this] { spa_pod_builder_id(&builder, SPA_MEDIA_SUBTYPE_raw); });
  chosen(SPA_FORMAT_AUDIO_format, [this] { spa_pod_builder_id(&builder, SPA_AUDIO_FORMAT_S24_LE); });
  key(SPA_FORMAT_AUDIO_rate);
  spa_pod_builder_int(&builder, 96000);
  chosen(SPA_FORMAT_AUDIO_channels, [this] { spa_pod_builder_int(&builder, 6); });
  EXPECT_EQ(formatOf(pop()), (FormatFacts{"S24LE", 96000, 6}));
}

TEST_F(PipeWirePods, ACodecThatIsPassedThroughIsItsName) {
  object(SPA_TYPE_OBJECT_Format, SPA_PARAM_Format);
  key(SPA_FORMAT_mediaType);
  spa_pod_builder_id(&builder, SPA_MEDIA_TYPE_audio);
  key(SPA_FORMAT_mediaSubtype);
  spa_pod_builder_id(&builder, SPA_MEDIA_SUBTYPE_iec958);
  EXPECT_EQ(formatOf(pop()), (FormatFacts{"iec958", 0, 0}));
}

TEST_F(PipeWirePods, AFormatOfSomethingElseIsNone) {
  object(SPA_TYPE_OBJECT_Format, SPA_PARAM_Format);
  key(SPA_FORMAT_mediaType);
  spa_pod_builder_id(&builder, SPA_MEDIA_TYPE_video);
  EXPECT_FALSE(formatOf(pop()));
}

TEST_F(PipeWirePods, ARouteTellsItsPort) {
  object(SPA_TYPE_OBJECT_ParamRoute, SPA_PARAM_Route);
  key(SPA_PARAM_ROUTE_direction);
  spa_pod_builder_id(&builder, SPA_DIRECTION_OUTPUT);
  key(SPA_PARAM_ROUTE_device);
  spa_pod_builder_int(&builder, 4);
  key(SPA_PARAM_ROUTE_name);
  spa_pod_builder_string(&builder, "hdmi-output-0");
  key(SPA_PARAM_ROUTE_info);
  member();
  spa_pod_builder_int(&builder, 2);
  for (const char* const word : {"route.other", "x", "port.type", "hdmi"}) {
    spa_pod_builder_string(&builder, word);
  }
  pop();
  const auto route = routeOf(pop());
  ASSERT_TRUE(route);
  EXPECT_TRUE(route->isOutput);
  EXPECT_EQ(route->device, 4);
  EXPECT_EQ(route->port.name, "hdmi-output-0");
  EXPECT_EQ(route->port.type, "hdmi");
}

TEST_F(PipeWirePods, ACycleTellsWhoWasNotDone) {
  member();
  object(SPA_TYPE_OBJECT_Profiler, 0);
  key(SPA_PROFILER_info);
  member();
  spa_pod_builder_long(&builder, 4711);
  for (int i = 0; i < 3; ++i) {
    spa_pod_builder_float(&builder, 0.5F);
  }
  spa_pod_builder_int(&builder, 3);
  pop();
  key(SPA_PROFILER_clock);
  member();
  spa_pod_builder_int(&builder, 0);
  spa_pod_builder_int(&builder, 7);
  spa_pod_builder_string(&builder, "clock");
  spa_pod_builder_long(&builder, 1000);
  spa_pod_builder_fraction(&builder, 1, 48000);
  spa_pod_builder_long(&builder, 99);
  spa_pod_builder_long(&builder, 1024);
  pop();
  block(SPA_PROFILER_driverBlock, 40, 3, {0, 1});
  block(SPA_PROFILER_followerBlock, 50, 3, {512, 24000});
  block(SPA_PROFILER_followerBlock, 51, 2, {0, 0});
  pop();
  const auto cycles = cyclesOf(pop(), 5'000'000);
  ASSERT_EQ(cycles.size(), 1U);
  const CycleFacts& cycle = cycles[0];
  EXPECT_EQ(cycle.driver, 40U);
  EXPECT_EQ(cycle.counter, 4711);
  EXPECT_EQ(cycle.xruns, 3);
  EXPECT_EQ(cycle.at, 5'001'000);
  EXPECT_EQ(cycle.frames, 1024);
  EXPECT_EQ(cycle.rate, 48000U);
  ASSERT_EQ(cycle.followers.size(), 2U);
  EXPECT_EQ(cycle.followers[0].node, 50U);
  EXPECT_TRUE(cycle.followers[0].finished);
  EXPECT_EQ(cycle.followers[0].latencyFrames, 1024U);
  EXPECT_EQ(cycle.followers[1].node, 51U);
  EXPECT_FALSE(cycle.followers[1].finished);
  EXPECT_EQ(cycle.followers[1].latencyFrames, 0U);
}

TEST_F(PipeWirePods, WhatIsSomethingElseGivesNothing) {
  EXPECT_FALSE(volumesOf(nullptr));
  EXPECT_FALSE(formatOf(nullptr));
  EXPECT_FALSE(routeOf(nullptr));
  EXPECT_TRUE(cyclesOf(nullptr, 0).empty());
  member();
  spa_pod_builder_int(&builder, 1);
  const spa_pod* const other = pop();
  EXPECT_FALSE(volumesOf(other));
  EXPECT_FALSE(formatOf(other));
  EXPECT_FALSE(routeOf(other));
  EXPECT_TRUE(cyclesOf(other, 0).empty());
}

}  // namespace tarn::streams
