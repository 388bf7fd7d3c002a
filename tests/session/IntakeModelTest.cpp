// SPDX-License-Identifier: Apache-2.0
// Random streams of messages, starts and stops beside a slow and obvious model of the same rules.
#include <algorithm>
#include <functional>
#include <map>
#include <random>

#include "plist/Value.h"
#include "session/TarnReportingSessionKeys.h"
#include "tests/session/SessionFixture.h"
#include "tests/support/Seeds.h"

namespace tarn {
namespace {

using namespace testing;

using Payload = std::map<std::string, plist::Value>;

struct ModelRecord {
  Payload payload;
  AudioEventCategory category;
  AudioEventType type;
};

Payload payloadOf(const plist::Dictionary& dictionary) {
  Payload payload;
  for (const auto& entry : dictionary) {
    payload.emplace(entry.key.text(), plist::Value(entry.value));
  }
  return payload;
}

Payload comparable(Payload payload) {
  for (const char* key : {"processuptime_ms", "systemuptime_sec", "tarnreporting_timestamp"}) {
    payload.erase(key);
  }
  return payload;
}

// The rules, written the long way round.
class Model {
 public:
  // The payload as it is logged, and whether it is redundant.
  std::pair<Payload, bool> take(const std::vector<std::pair<std::string, plist::Value>>& wire,
                                AudioEventCategory category, AudioEventType type, double now) {
    Payload payload(wire.begin(), wire.end());
    stamp(payload, now);
    for (const auto& [key, value] : wire) {
      if (key.find(' ') != std::string::npos) {
        std::string replaced = key;
        std::replace(replaced.begin(), replaced.end(), ' ', '_');
        payload[replaced] = value;
      }
    }
    for (const auto& [key, value] : wire) {
      if (key.find(' ') != std::string::npos) {
        payload.erase(key);
      }
    }
    payload["audiotag"] =
        TarnReportingUtilityCategoryString(category) + std::string(TarnReportingUtilityTypeString(type));
    const auto application = payload.find("HostApplicationDisplayID");
    if (application == payload.end() || application->second == plist::Value("Unknown")) {
      payload["HostApplicationDisplayID"] = "Unknown";
    }
    const bool redundant = isRedundant(payload, category, type);
    for (const auto& [key, value] : payload) {
      previous[key] = value;
    }
    ++total;
    if (!redundant) {
      log.push_back({payload, category, type});
    }
    return {payload, redundant};
  }

  void sort() {
    std::stable_sort(log.begin(), log.end(), [](const ModelRecord& a, const ModelRecord& b) {
      return a.payload.at("tarnreporting_timestamp").view().asDouble() <
             b.payload.at("tarnreporting_timestamp").view().asDouble();
    });
  }

  std::vector<ModelRecord> log;
  Payload previous;
  std::int64_t total = 0;

 private:
  static void stamp(Payload& payload, double now) {
    const auto stamp = payload.find("tarnreporting_timestamp");
    if (stamp == payload.end()) {
      payload["invalid_timestamp"] = "nil";
      payload["tarnreporting_timestamp"] = now;
    } else if (stamp->second.view().asDouble() < now - 365.0 * 86400) {
      payload["invalid_timestamp"] = stamp->second;
      payload["tarnreporting_timestamp"] = now;
    }
  }

  bool isRedundant(const Payload& payload, AudioEventCategory category, AudioEventType type) const {
    if (type == AudioEventType::Error || category == AudioEventCategory::Error) return false;
    for (auto record = log.rbegin(); record != log.rend(); ++record) {
      if (record->type == type && record->category == category) {
        return comparable(record->payload) == comparable(payload);
      }
    }
    return false;
  }
};

class IntakeModel : public SessionFixture {
 protected:
  // A producer that sends at stop, when the log is sorted already.
  class StopSender : public TrailWorker<StopSender>, public TarnReportingSessionWorkerProducerProtocol {
   public:
    static constexpr std::string_view kClassName = "StopSender";
    using TrailWorker::TrailWorker;
    void stop() {
      if (atStop) {
        atStop();
      }
    }
    static inline std::function<void()> atStop;
  };

  std::vector<std::pair<std::string, plist::Value>> randomWire(std::mt19937& random) const {
    static const std::vector<std::string> kKeys{
        "a", "b", "a b", "a_b", "b ", "HostApplicationDisplayID", "systemuptime_sec", "processuptime_ms"};
    std::vector<std::pair<std::string, plist::Value>> wire;
    std::vector<std::string> keys = kKeys;
    std::shuffle(keys.begin(), keys.end(), random);
    keys.resize(random() % 3);
    for (const std::string& key : keys) {
      wire.emplace_back(key, randomValue(random));
    }
    if (random() % 4 != 0) {
      static const std::vector<double> kAges{0, 1, 2, 40000000, -5};
      wire.emplace_back("tarnreporting_timestamp", plist::Value(now() - kAges[random() % kAges.size()]));
    }
    return wire;
  }
  static plist::Value randomValue(std::mt19937& random) {
    switch (random() % 5) {
      case 0:
        return plist::Value(1);
      case 1:
        return plist::Value(1.0);
      case 2:
        return plist::Value(true);
      case 3:
        return plist::Value("Unknown");
      default:
        return plist::Value(plist::Dictionary{{"x", static_cast<int>(random() % 2)}});
    }
  }
};

TEST_F(IntakeModel, RandomStreamsAreLoggedMarkedAndMergedAsTheModelSays) {
  const double beginning = now();
  for (const std::uint64_t seed : testing::testSeeds(1)) {
    SCOPED_TRACE(testing::seedNote(seed));
    platform_.clock.setEpochSeconds(beginning);
    std::mt19937 random(seed);
    useWorkers<StopSender>();
    Model model;
    const auto session = makeSession();
    const std::vector<AudioEventCategory> categories{AudioEventCategory::Playback, AudioEventCategory::Error,
                                                     AudioEventCategory::Setup};
    const std::vector<AudioEventType> types{AudioEventType::Start, AudioEventType::Stop, AudioEventType::Error};
    const auto sendOne = [&] {
      const auto wire = randomWire(random);
      plist::Dictionary payload;
      for (const auto& [key, value] : wire) {
        payload.set(plist::Key(key), value);
      }
      const AudioEventCategory category = categories[random() % categories.size()];
      const AudioEventType type = types[random() % types.size()];
      const auto [expected, redundant] = model.take(wire, category, type, now());
      const auto record = message(payload, category, type);
      session->sendMessage(record);
      ASSERT_EQ(payloadOf(record->message()), expected);
      ASSERT_EQ(record->isRedundant(), redundant);
    };
    const auto takeMarker = [&] {
      const auto& marker = *session->messages().back();
      model.log.push_back({payloadOf(marker.message()), marker.category(), marker.type()});
    };
    StopSender::atStop = [&] {
      // The stop marker went in before the sort; from here on the look-up sees the sorted log.
      for (int i = 0; i < 3; ++i) {
        sendOne();
      }
    };
    for (int period = 0; period < 60; ++period) {
      session->start();
      takeMarker();
      for (int step = 0; step < 60; ++step) {
        ASSERT_NO_FATAL_FAILURE(sendOne());
        platform_.advance(std::chrono::milliseconds(random() % 1500));
      }
      plist::Dictionary stopMarker{{"method", "stop"},
                                   {"messages_at_stop", session->messages().size()},
                                   {"unique_messages_at_stop", session->messages().size()},
                                   {"reporterid", 7},
                                   {"running_at_stop", "YES"},
                                   {"invalid_timestamp", "nil"},
                                   {"tarnreporting_timestamp", now()},
                                   {"audiotag", "SetupStop"}};
      model.log.push_back({payloadOf(stopMarker), AudioEventCategory::Setup, AudioEventType::Stop});
      model.sort();
      EXPECT_EQ(session->totalMessageCount(), model.total);
      session->stop();
      model.log.clear();
      model.total = 0;
      EXPECT_EQ(payloadOf(session->previousValues().dictionary()), model.previous);
    }
    StopSender::atStop = nullptr;
  }
}

}  // namespace
}  // namespace tarn
