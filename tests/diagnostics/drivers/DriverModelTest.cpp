// SPDX-License-Identifier: Apache-2.0
// Random channels through the whole road - two samples, their difference, keys and texts - against a model that does
// each step the slow and obvious way.
#include <algorithm>
#include <cstdio>
#include <map>
#include <random>

#include "host/drivers/FlumeSource.h"
#include "host/drivers/LinuxFlumeService.h"
#include "tests/diagnostics/drivers/DriverFixture.h"
#include "tests/support/Seeds.h"

namespace tarn {
namespace {

using namespace testing;
using platform::FlumeBucket;
using platform::FlumeSamples;
using platform::FlumeState;

class Channels final : public linux_host::FlumeSource {
 public:
  FlumeSamples read() override { return channels; }
  FlumeSamples channels;
};

struct Expected {
  std::map<std::string, std::int64_t> simple;
  std::map<std::string, std::string> histogram;
  std::map<std::string, std::string> state;
};

std::string stripped(const std::string& name) {
  std::string kept = name;
  kept.erase(std::remove(kept.begin(), kept.end(), '_'), kept.end());
  kept.erase(std::remove(kept.begin(), kept.end(), ' '), kept.end());
  return kept;
}

std::string keyOf(const FlumeChannelName& name, const std::string& type) {
  std::string key;
  if (name.driver) {
    key += stripped(name.driver->substr(0, name.driver->find("<"))) + "_";
  }
  if (name.group) {
    key += stripped(*name.group) + "_";
  }
  if (name.subGroup) {
    key += stripped(*name.subGroup) + "_";
  }
  return key + type + "_" + stripped(*name.name);
}

bool isInGroup(const FlumeChannelName& name, const char* group, const char* subGroup) {
  return (group == nullptr || (name.group && *name.group == group)) &&
         (subGroup == nullptr || (name.subGroup && *name.subGroup == subGroup));
}

const FlumeChannel* firstOf(const FlumeSamples& samples, const FlumeChannelName& name) {
  for (const FlumeChannel& channel : samples) {
    if (channel.name == name) return &channel;
  }
  return nullptr;
}

void expectSimple(const FlumeChannel& later, const FlumeChannel* earlier, Expected& expected) {
  const std::int64_t value = earlier == nullptr ? later.value : later.value - earlier->value;
  if (value > 0) {
    expected.simple[keyOf(later.name, "Simple")] = value;
  }
}

void expectHistogram(const FlumeChannel& later, const FlumeChannel* earlier, Expected& expected) {
  std::int64_t lower = 0;
  std::int64_t upper = 0;
  std::string buckets;
  for (std::size_t i = 0; i < later.buckets.size(); ++i) {
    const FlumeBucket& bucket = later.buckets[i];
    std::int64_t hits = bucket.hits;
    if (earlier != nullptr && i < earlier->buckets.size() && earlier->buckets[i].hits <= hits) {
      hits -= earlier->buckets[i].hits;
    }
    if (bucket.lower < lower) {
      lower = bucket.lower;
    }
    if (bucket.upper > upper) {
      upper = bucket.upper;
    }
    if (hits == 0) continue;
    if (!buckets.empty()) {
      buckets += ";";
    }
    buckets += std::to_string(bucket.lower) + "-" + std::to_string(bucket.upper) + ":" + std::to_string(hits);
  }
  if (buckets.empty()) return;
  expected.histogram[keyOf(later.name, "Histogram")] =
      "count=" + std::to_string(later.buckets.size()) + ",lower=" + std::to_string(lower) +
      ",upper=" + std::to_string(upper) + ",min=" + std::to_string(later.minimum) +
      ",max=" + std::to_string(later.maximum) + ",unit=" + later.unit.value_or("(null)") + "::" + buckets;
}

void expectState(const FlumeChannel& later, const FlumeChannel* earlier, Expected& expected) {
  std::string text;
  for (const FlumeState& state : later.states) {
    std::uint64_t transitions = state.transitions;
    std::uint64_t residency = state.residency;
    if (earlier != nullptr) {
      for (const FlumeState& before : earlier->states) {
        if (before.name != state.name) continue;
        if (before.transitions <= transitions) {
          transitions -= before.transitions;
        }
        if (before.residency <= residency) {
          residency -= before.residency;
        }
      }
    }
    if (residency == 0) continue;
    char line[512];
    std::snprintf(line, sizeof line, "name:%s,transition:%llu,residency:%llu,duty_cycle:%f;", state.name.c_str(),
                  static_cast<unsigned long long>(transitions), static_cast<unsigned long long>(residency),
                  state.dutyCycle);
    text += line;
  }
  if (!text.empty()) {
    expected.state[keyOf(later.name, "State")] = text;
  }
}

// Groups and channels in the order in which they are walked, so that of equal keys the last one stands.
Expected expectedOf(const FlumeSamples& first, const FlumeSamples& start, const FlumeSamples& stop) {
  constexpr const char* kGroups[][2] = {{"OxbowAE2MCA", nullptr},
                                        {"Speaker", nullptr},
                                        {nullptr, "MCA"},
                                        {"Haptics", "Stats"},
                                        {"StateTransitionTimes_ms", nullptr},
                                        {"Rx", nullptr},
                                        {"Tx", nullptr},
                                        {nullptr, "Tympan2"},
                                        {"pdm", nullptr}};
  Expected expected;
  for (const auto& group : kGroups) {
    for (const FlumeChannel& known : first) {
      const FlumeChannel* later = firstOf(stop, known.name);
      if (firstOf(first, known.name) != &known || !isInGroup(known.name, group[0], group[1]) || later == nullptr) {
        continue;
      }
      const FlumeChannel* earlier = firstOf(start, known.name);
      if (earlier != nullptr && earlier->format != later->format) {
        earlier = nullptr;
      }
      if (later->format == FlumeFormat::Simple) {
        expectSimple(*later, earlier, expected);
      }
      if (later->format == FlumeFormat::Histogram) {
        expectHistogram(*later, earlier, expected);
      }
      if (later->format == FlumeFormat::State) {
        expectState(*later, earlier, expected);
      }
    }
  }
  return expected;
}

class Drawing {
 public:
  explicit Drawing(std::uint64_t seed) : random_(seed) {}
  int below(int bound) { return std::uniform_int_distribution<int>(0, bound - 1)(random_); }
  template <class Item>
  Item of(const std::vector<Item>& items) {
    return items[static_cast<std::size_t>(below(static_cast<int>(items.size())))];
  }

  FlumeSamples channels() {
    FlumeSamples drawn(static_cast<std::size_t>(below(12)));
    for (FlumeChannel& channel : drawn) {
      channel = fresh();
    }
    return drawn;
  }
  // Time passes: channels count on, start again, change, vanish and appear.
  FlumeSamples later(FlumeSamples channels) {
    for (FlumeChannel& channel : channels) {
      channel.value += below(7) - 2;
      for (FlumeBucket& bucket : channel.buckets) {
        bucket.hits = below(6) == 0 ? below(3) : bucket.hits + below(3);
      }
      for (FlumeState& state : channel.states) {
        state.transitions = below(6) == 0 ? 0 : state.transitions + static_cast<std::uint64_t>(below(3));
        state.residency = below(6) == 0 ? 1 : state.residency + static_cast<std::uint64_t>(below(3) * 100);
        state.dutyCycle = below(1000) / 999.0;
      }
      if (below(15) == 0) {
        FlumeChannel changed = fresh();
        changed.name = channel.name;
        channel = changed;
      }
      if (below(4) == 0) {
        std::reverse(channel.states.begin(), channel.states.end());
      }
      if (below(8) == 0 && !channel.buckets.empty()) {
        channel.buckets.pop_back();
      }
      if (below(8) == 0) {
        channel.buckets.push_back({below(100) - 50, below(100), below(5)});
      }
    }
    if (below(4) == 0 && !channels.empty()) {
      channels.erase(channels.begin());
    }
    if (below(4) == 0) {
      channels.insert(channels.begin(), fresh());
    }
    if (below(3) == 0) {
      std::shuffle(channels.begin(), channels.end(), random_);
    }
    return channels;
  }

 private:
  FlumeChannel fresh() {
    FlumeChannel channel;
    channel.name = {of<Name>({{}, "OxbowFoo<0x12>", "Bar_ <a>", "<>"}),
                    of<Name>({{}, "Haptics", "Rx", "Speaker", "pdm", "Nobody", "OxbowAE2MCA"}),
                    of<Name>({{}, "Stats", "MCA", "Tympan2", "x_y z"}), of<std::string>({"a", "a_", "b c", "D-", ""})};
    channel.format =
        of<FlumeFormat>({FlumeFormat::Simple, FlumeFormat::State, FlumeFormat::Histogram, FlumeFormat::SimpleArray});
    channel.unit = of<Name>({{}, "us", "24Mticks"});
    channel.value = below(100) - 30;
    channel.minimum = below(10) - 5;
    channel.maximum = below(1000);
    for (int i = below(5); i > 0; --i) {
      channel.buckets.push_back({below(100) - 50, below(100), below(5)});
    }
    std::vector<std::string> names = {"on", "off", "idle", ""};
    for (int i = below(4); i > 0; --i) {
      const std::string name = of(names);
      names.erase(std::find(names.begin(), names.end(), name));
      channel.states.push_back(
          {name, static_cast<std::uint64_t>(below(9)), static_cast<std::uint64_t>(below(900)), below(1000) / 7.0});
    }
    return channel;
  }
  using Name = std::optional<std::string>;

  std::mt19937 random_;
};

class DriverModel : public DriverFixture {};

template <class Number>
std::map<std::string, Number> asMap(const plist::Dictionary& payload) {
  std::map<std::string, Number> map;
  for (const auto& entry : payload) {
    if constexpr (std::is_same_v<Number, std::string>) {
      map[std::string(entry.key.text())] = std::string(entry.value.text());
    } else {
      map[std::string(entry.key.text())] = entry.value.asInt64();
    }
  }
  return map;
}

// The intake replaces blanks in keys; the keys hold none.
TEST_F(DriverModel, MessagesAgreeWithTheModelOverRandomChannels) {
  for (const std::uint64_t seed : testSeeds(1)) {
    SCOPED_TRACE(seedNote(seed));
    std::size_t compared = 0;
    for (unsigned round = 0; round < 1500; ++round) {
      SCOPED_TRACE("round " + std::to_string(round));
      Drawing drawing(seed + round);
      Channels source;
      linux_host::LinuxFlumeService service({&source});
      platform_.facilities().flume = &service;
      const FlumeSamples first = drawing.channels();
      source.channels = first;
      const auto session = makeSession();
      session->start();
      FlumeSamples start = first;
      for (int run = 0; run < 2; ++run) {
        const FlumeSamples stop = drawing.later(start);
        source.channels = stop;
        session->stop();
        const Expected expected = expectedOf(first, start, stop);
        ASSERT_EQ(asMap<std::int64_t>(received(AudioEventType::Simple)), expected.simple);
        ASSERT_EQ(asMap<std::string>(received(AudioEventType::Histogram)), expected.histogram);
        ASSERT_EQ(asMap<std::string>(received(AudioEventType::State)), expected.state);
        compared += expected.simple.size() + expected.histogram.size() + expected.state.size();
        script().received.clear();
        start = drawing.later(stop);
        source.channels = start;
        session->start();
      }
      installAnew();
      platform_.log.clear();
    }
    platform_.facilities().flume = &platform_.flume;
    EXPECT_GT(compared, 1000U);
  }
}

}  // namespace
}  // namespace tarn
