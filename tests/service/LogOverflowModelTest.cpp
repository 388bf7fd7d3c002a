// SPDX-License-Identifier: Apache-2.0
// Whole sessions with all workers, once with room for every message in memory, once with next to none: what reaches the
// back-ends, the files and the log is the same, to the last value and in the same order.
#include <gtest/gtest.h>

#include <algorithm>
#include <bit>
#include <chrono>
#include <functional>
#include <random>
#include <string>
#include <vector>

#include "derived/TarnReportingSystemMonitor.h"
#include "platform/OverflowStore.h"
#include "service/TarnReportingWorkerClasses.h"
#include "service/vocabulary/ProcessState.h"
#include "service/vocabulary/TarnReportingUtility.h"
#include "session/TarnReportingSession.h"
#include "session/TarnReportingSessionLogMemory.h"
#include "testing/FakePlatform.h"
#include "tests/support/Seeds.h"

namespace tarn {
namespace {

using namespace testing;

constexpr std::size_t kNoBound = std::size_t{1} << 40U;

struct Bounds {
  std::size_t ofSession;
  std::size_t inAll;
};

// Plays the same random life of some sessions whenever it is made with the same seed.
class RandomLife {
 public:
  RandomLife(std::uint64_t seed, Bounds bounds) : random_(static_cast<std::mt19937::result_type>(seed)) {
    platform_.overflow.setBounds(bounds.ofSession, bounds.inAll);
    platform_.clock.setEpochSeconds(1750000000);
    platform_.deviceProperties.set("InternalBuild", chance(30));
    platform_.order.start();
    TarnReportingSession::setAllWorkerClasses(TarnReportingWorkerClasses());
    TarnReportingSystemMonitor::initializeWithQueue(TarnReportingUtilityGetReportingServerQueue());
    platform_.runUntilIdle();
  }

  void play() {
    std::vector<std::shared_ptr<TarnReportingSession>> sessions;
    for (std::int64_t id = 1; id <= 3; ++id) {
      sessions.push_back(TarnReportingSession::initWithID(id, {4711}));
      sessions.back()->setServiceType(
          oneOf<AudioServiceType>({AudioServiceType::Generic, AudioServiceType::Test, AudioServiceType::Telephony,
                                   AudioServiceType::APIUsage}));
      const plist::Dictionary configuration{{"HostApplicationDisplayID", "app " + std::to_string(id)}};
      sessions.back()->updateConfigurationWithContentsOfConfiguration(&configuration);
    }
    for (int period = 0; period < 2; ++period) {
      for (const auto& session : sessions) {
        session->start();
        platform_.runUntilIdle();
      }
      for (int message = 0; message < 150; ++message) {
        platform_.advance(std::chrono::milliseconds(oneOf<int>({0, 100, 400, 700, 2000, 9000})));
        send(*oneOf(sessions));
      }
      for (const auto& session : sessions) {
        moved_ += session->messages().overflowed();
        session->stop();
        platform_.runUntilIdle();
      }
    }
  }

  // Everything that can be seen from outside, with the kinds of values.
  std::string outcome() const {
    std::string text;
    for (const auto& event : platform_.tally.events()) {
      text += "tally " + event.name + " " + kinds(event.payload) + "\n";
    }
    for (const auto& event : platform_.wattlog.events()) {
      text += "wattlog " + event.name + " " + kinds(event.payload) + "\n";
    }
    for (const auto& metric : platform_.pylon.metrics()) {
      text += "pylon " + kinds(metric.fields) + "\n";
    }
    for (const auto& call : platform_.snare.calls()) {
      text += "snare " + std::to_string(static_cast<int>(call.kind)) + " " + std::to_string(call.reporter) + "\n";
    }
    for (const auto& session : platform_.rtcReporting.sessions()) {
      text += "rtc " + kinds(session.userInfo) + "\n";
      for (const auto& message : session.messages) {
        text += "  " + std::to_string(message.category) + " " + std::to_string(message.type) + " " +
                kinds(message.payload) + "\n";
      }
    }
    for (const std::string& file : platform_.fileSystem.files()) {
      text += file + "\n" + *platform_.fileSystem.content(file) + "\n";
    }
    for (const std::string& entry : platform_.order.entries()) {
      // What tells of the overflow itself, and of copies that pages need not make.
      if (entry.find("the log has no more room in memory") == std::string::npos && entry != "log copyWithZone") {
        text += entry + "\n";
      }
    }
    return text;
  }
  std::size_t moved() const { return moved_; }
  std::size_t blocks() const { return platform_.overflow.blocks(); }
  std::size_t blocksRead() const { return platform_.overflow.blocksRead(); }
  static TarnReportingSessionLogMemory::Usage usage() {
    return ProcessState::of<TarnReportingSessionLogMemory>()->usage();
  }

 private:
  bool chance(unsigned percent) { return random_() % 100 < percent; }
  template <class Item>
  Item oneOf(const std::vector<Item>& items) {
    return items[random_() % items.size()];
  }
  static std::string kinds(const plist::Dictionary& payload) {
    std::string text;
    for (const plist::Dictionary::Entry& entry : payload) {
      text += std::string(entry.key.text()) + "=" + std::to_string(static_cast<int>(entry.value.kind())) + ":" +
              entry.value.asText() + ";";
    }
    return text;
  }

  plist::Value valueOf(const std::string& key) {
    if (key.ends_with("running") || key.ends_with("Enabled") || key.ends_with("feature") || key == "ringerstate") {
      return chance(95) ? plist::Value(chance(50)) : plist::Value("1");
    }
    if (key == "lagoon_session") return plist::Value(static_cast<std::int64_t>(random_() % 2));
    if (key == "KvSessionVolume") return plist::Value(oneOf<double>({0, 0.25, 0.5, 0.75, 1, -0.0}));
    if (key == "session_duration") return plist::Value(12.5);
    if (key == "list") return plist::Value(plist::Array{1, "two", plist::Dictionary{{"x", 2.5F}}});
    if (key == "odd") {
      return oneOf<plist::Value>({std::bit_cast<double>(std::uint64_t{0x7FF8000000000007}), std::uint64_t{1}, -1, 1.5F,
                                  plist::Date{5}, plist::DataView{std::string_view("\0x", 2)}});
    }
    return plist::Value(oneOf<std::string>({"a", "b", "c"}));
  }
  plist::Dictionary payload() {
    static const std::vector<std::string> kKeys{"session_output_running",
                                                "session_output_running",
                                                "session_input_running",
                                                "session_duration",
                                                "session_selected_format",
                                                "active_devices",
                                                "spatializationEnabled",
                                                "spatial-audio-accessory-feature",
                                                "ringerstate",
                                                "KvSessionVolume",
                                                "lagoon_session",
                                                "mFormatID",
                                                "vp_config_primary_vocoder",
                                                "vp_config_primary_vocoderFs",
                                                "list",
                                                "odd",
                                                "a key"};
    plist::Dictionary payload;
    for (auto left = 1 + random_() % 5; left > 0; --left) {
      const std::string key = oneOf(kKeys);
      payload.set(plist::Key(key), valueOf(key).view());
    }
    if (chance(80)) {
      const double late = chance(10) ? -static_cast<double>(random_() % 60) : 0;
      payload.set("tarnreporting_timestamp", platform_.clock.epochSeconds() + late);
    }
    return payload;
  }
  void send(TarnReportingSession& session) {
    if (last_.empty() || !chance(10)) {
      last_ = payload();  // else the same once more, for redundancy
    }
    session.sendMessage(std::make_shared<TarnReportingSessionMessage>(
        last_,
        oneOf<AudioEventCategory>(
            {AudioEventCategory::Playback, AudioEventCategory::Input, AudioEventCategory::Volume}),
        oneOf<AudioEventType>({AudioEventType::State, AudioEventType::Start, AudioEventType::Error})));
    platform_.runUntilIdle();
  }

  std::mt19937 random_;
  FakePlatform platform_;
  plist::Dictionary last_;
  std::size_t moved_ = 0;
};

TEST(LogOverflowModel, WhatReachesTheBackEndsIsTheSameHoweverLittleMemoryThereIs) {
  for (const std::uint64_t seed : testSeeds(1)) {
    SCOPED_TRACE(seedNote(seed));
    for (std::uint64_t round = 0; round < 4; ++round) {
      std::string expected;
      {
        RandomLife life(seed + round, {kNoBound, kNoBound});
        life.play();
        expected = life.outcome();
        ASSERT_EQ(life.moved(), 0U);
      }
      for (const Bounds bounds : {Bounds{1, kNoBound}, Bounds{3000, kNoBound}, Bounds{kNoBound, 20'000}}) {
        RandomLife life(seed + round, bounds);
        life.play();
        const std::string outcome = life.outcome();
        const auto differs = std::mismatch(outcome.begin(), outcome.end(), expected.begin(), expected.end());
        const auto at = static_cast<std::size_t>(differs.first - outcome.begin());
        const std::size_t from = at > 300 ? at - 300 : 0;
        ASSERT_TRUE(outcome == expected) << outcome.substr(from, 600) << "\nexpected\n" << expected.substr(from, 600);
        EXPECT_GT(life.moved(), 100U);
        EXPECT_GT(life.blocksRead(), 0U);
        EXPECT_EQ(life.blocks(), 0U);
        EXPECT_EQ(RandomLife::usage(), TarnReportingSessionLogMemory::Usage{});
      }
    }
  }
}

}  // namespace
}  // namespace tarn
