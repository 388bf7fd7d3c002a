// SPDX-License-Identifier: Apache-2.0
#include "testing/backends/FakeFlumeService.h"

#include <gtest/gtest.h>

namespace tarn::testing {
namespace {

using platform::FlumeChannel;
using platform::FlumeFormat;
using Step = FakeFlumeService::Step;

FlumeChannel channel(std::optional<std::string> group, std::optional<std::string> subGroup, std::string name) {
  FlumeChannel made;
  made.name = {"OxbowFoo<0x12>", std::move(group), std::move(subGroup), std::move(name)};
  return made;
}

FlumeChannel simple(std::int64_t value) {
  auto made = channel("Haptics", "Stats", "Engine On");
  made.format = FlumeFormat::Simple;
  made.value = value;
  return made;
}

// The samples of all channels of a group, by the whole road.
std::shared_ptr<const platform::FlumeSamples> sample(FakeFlumeService& service, const std::string& group) {
  const auto subscribed = service.subscribe(*service.copyChannels(group, {}).value);
  return service.createSamples(*subscribed.subscription, *subscribed.channels).value;
}

TEST(FakeFlumeService, AMissingNameOfTheAskerMatchesAny) {
  FakeFlumeService service;
  service.setChannel(channel("Haptics", "Stats", "a"));
  service.setChannel(channel("Haptics", {}, "b"));
  service.setChannel(channel({}, "Stats", "c"));

  EXPECT_EQ(service.copyChannels("Haptics", {}).value->size(), 2U);
  EXPECT_EQ(service.copyChannels({}, "Stats").value->size(), 2U);
  EXPECT_EQ(service.copyChannels("Haptics", "Stats").value->size(), 1U);
  EXPECT_EQ(service.copyChannels({}, {}).value->size(), 3U);
  EXPECT_TRUE(service.copyChannels("Rx", {}).value->empty());
}

TEST(FakeFlumeService, SamplesAreSnapshots) {
  FakeFlumeService service;
  service.setChannel(simple(3));
  const auto before = sample(service, "Haptics");

  service.setChannel(simple(10));

  EXPECT_EQ(before->at(0).value, 3);
  EXPECT_EQ(sample(service, "Haptics")->at(0).value, 10);
}

TEST(FakeFlumeService, ADeltaSubtractsValuesAlsoBelowZero) {
  FakeFlumeService service;
  service.setChannel(simple(10));
  const auto before = sample(service, "Haptics");
  service.setChannel(simple(3));

  const auto delta = service.createDelta(before, sample(service, "Haptics"));

  EXPECT_EQ(delta.value->at(0).value, -7);
}

TEST(FakeFlumeService, HitsThatFellCountAsTheyAre) {
  FakeFlumeService service;
  auto histogram = channel("Haptics", "Stats", "Latency");
  histogram.format = FlumeFormat::Histogram;
  histogram.minimum = 1;
  histogram.buckets = {{0, 10, 5, 0}, {10, 20, 8, 0}};
  service.setChannel(histogram);
  const auto before = sample(service, "Haptics");
  histogram.minimum = 2;
  histogram.buckets = {{0, 10, 9, 0}, {10, 20, 3, 0}};
  service.setChannel(histogram);

  const auto delta = service.createDelta(before, sample(service, "Haptics")).value;

  EXPECT_EQ(delta->at(0).buckets[0].hits, 4);
  EXPECT_EQ(delta->at(0).buckets[1].hits, 3);
  EXPECT_EQ(delta->at(0).minimum, 2);
}

TEST(FakeFlumeService, StatesAreMatchedByName) {
  FakeFlumeService service;
  auto states = channel("Haptics", "Stats", "Power");
  states.format = FlumeFormat::State;
  states.states = {{"On", 4, 100, 0.5}, {"Off", 1, 50, 0.5}};
  service.setChannel(states);
  const auto before = sample(service, "Haptics");
  states.states = {{"Off", 3, 70, 0.25}, {"On", 4, 130, 0.75}};
  service.setChannel(states);

  const auto delta = service.createDelta(before, sample(service, "Haptics")).value;

  EXPECT_EQ(delta->at(0).states[0].transitions, 2U);
  EXPECT_EQ(delta->at(0).states[0].residency, 20U);
  EXPECT_EQ(delta->at(0).states[1].residency, 30U);
  EXPECT_EQ(delta->at(0).states[1].dutyCycle, 0.75);
}

TEST(FakeFlumeService, ADeltaAgainstNothingIsTheLaterSample) {
  FakeFlumeService service;
  service.setChannel(simple(10));
  const auto later = sample(service, "Haptics");

  EXPECT_EQ(service.createDelta(nullptr, later).value, later);
}

TEST(FakeFlumeService, AChannelThatVanishedIsMissingFromTheSamples) {
  FakeFlumeService service;
  service.setChannel(simple(1));
  const auto subscribed = service.subscribe(*service.copyChannels("Haptics", {}).value);
  service.removeChannel(simple(1).name);

  const auto samples = service.createSamples(*subscribed.subscription, *subscribed.channels);

  EXPECT_FALSE(samples.failed());
  EXPECT_TRUE(samples.value->empty());
}

TEST(FakeFlumeService, AStepFailsWithACodeOrWithNothing) {
  FakeFlumeService service;
  service.fail(Step::CopyChannels, -536870206);
  service.fail(Step::Subscribe, {});

  const auto channels = service.copyChannels("Haptics", {});
  const auto subscribed = service.subscribe({});

  EXPECT_EQ(channels.value, nullptr);
  EXPECT_EQ(channels.error->code, -536870206);
  EXPECT_EQ(subscribed.subscription, nullptr);
  EXPECT_TRUE(subscribed.error.ok());
  EXPECT_EQ(service.calls(Step::CopyChannels), 1U);
  service.restore(Step::CopyChannels);
  EXPECT_FALSE(service.copyChannels("Haptics", {}).failed());
}

TEST(FakeFlumeService, ASubscriptionSamplesNoChannelThatItDoesNotCover) {
  FakeFlumeService service;
  service.setChannel(channel("Haptics", "Stats", "a"));
  service.setChannel(channel("Haptics", "Stats", "b"));
  service.refuseSubscription(channel("Haptics", "Stats", "a").name);
  const auto asked = service.copyChannels("Haptics", {}).value;
  const auto subscribed = service.subscribe(*asked);
  EXPECT_EQ(asked->size(), 2U);
  EXPECT_EQ(subscribed.channels->size(), 1U);
  EXPECT_EQ(service.createSamples(*subscribed.subscription, *asked).value->size(), 1U);
}

}  // namespace
}  // namespace tarn::testing
