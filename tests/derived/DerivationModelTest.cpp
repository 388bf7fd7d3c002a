// SPDX-License-Identifier: Apache-2.0
// Random streams of messages, tidy and wild, through each derivation and through its model.
#include <gtest/gtest.h>

#include <cmath>
#include <limits>
#include <random>

#include "derived/TarnReportingSessionInputMessagesWorker.h"
#include "derived/TarnReportingSessionLagoonMessagesWorker.h"
#include "derived/TarnReportingSessionVolumeMessagesWorker.h"
#include "service/vocabulary/TarnReportingLog.h"
#include "session/TarnReportingSessionWorkerUtility.h"
#include "testing/FakePlatform.h"
#include "tests/derived/DerivationModels.h"
#include "tests/derived/DerivedMessages.h"
#include "tests/support/Seeds.h"

namespace tarn {
namespace {

using namespace testing;

constexpr std::size_t kMessagesPerRule = 30000;

ModelPayload modelOf(const plist::Dictionary& dictionary) {
  ModelPayload payload;
  for (const auto& entry : dictionary) {
    payload.emplace(entry.key.text(), plist::Value(entry.value));
  }
  return payload;
}

plist::Dictionary dictionaryOf(const ModelPayload& payload) {
  plist::Dictionary dictionary;
  for (const auto& [key, value] : payload) {
    dictionary.set(plist::Key(key), value);
  }
  return dictionary;
}

bool isInteger(plist::Kind kind) {
  return kind == plist::Kind::Signed || kind == plist::Kind::Unsigned;
}

// Equal, and of the same kinds: a float that became a double would print differently.
void expectSame(const plist::Dictionary& actual, const ModelPayload& expected) {
  ASSERT_EQ(modelOf(actual), expected) << plist::description(actual) << "\nexpected\n"
                                       << plist::description(dictionaryOf(expected));
  for (const auto& entry : actual) {
    const plist::Kind kind = expected.at(std::string(entry.key.text())).kind();
    ASSERT_TRUE(entry.value.kind() == kind || (isInteger(entry.value.kind()) && isInteger(kind))) << entry.key.text();
  }
}

class DerivationModel : public ::testing::Test {
 protected:
  DerivationModel() { platform_.log.setThreshold(LogLevel::Error); }

  template <class Values>
  const auto& oneOf(const Values& values) {
    return values[random_() % values.size()];
  }
  bool chance(unsigned percent) { return random_() % 100 < percent; }

  plist::Value wildValue() {
    static const std::vector<plist::Value> kWild{plist::Value("unknown"),
                                                 plist::Value("1"),
                                                 plist::Value("0.5 and more"),
                                                 plist::Value(""),
                                                 plist::Value(1),
                                                 plist::Value(0),
                                                 plist::Value(-3),
                                                 plist::Value(true),
                                                 plist::Value(0.5F),
                                                 plist::Value(1e300),
                                                 plist::Value(-1e300),
                                                 plist::Value(std::nan("")),
                                                 plist::Value(18446744073709551615U),
                                                 plist::Value(std::numeric_limits<double>::infinity()),
                                                 plist::Value(plist::Date{5}),
                                                 plist::Value(plist::Array{1, "a"}),
                                                 plist::Value(plist::Dictionary{{"a", 1}}),
                                                 plist::Value(plist::DataView{"\x01"})};
    return oneOf(kWild);
  }

  // A value that a well-behaved client would send under the key.
  plist::Value tidyValue(const std::string& key) {
    static const std::vector<plist::Value> kTexts{"unknown", "a", "b"};
    static const std::vector<plist::Value> kFlags{true, false, 1, 0};
    static const std::vector<plist::Value> kVolumes{0.0, 0.5F, 0.5, 0.51, 0.1F, 0.1, 1};
    static const std::vector<plist::Value> kChannels{1, 2, 2.0};
    static const std::vector<plist::Value> kRates{"0.0", "8000.0", "16000.0", 48000};
    if (key == "KvSessionVolume") return oneOf(kVolumes);
    if (key == "mChannelsPerFrame") return oneOf(kChannels);
    if (key == "vp_config_primary_vocoderFs") return oneOf(kRates);
    for (const char* flag : {"running", "spatial", "ringer", "lagoon", "duration"}) {
      if (key.find(flag) != std::string::npos) return oneOf(kFlags);
    }
    return oneOf(kTexts);
  }

  ModelPayload randomPayload(const std::vector<std::string>& keys, bool wild) {
    ModelPayload payload;
    const std::size_t count = random_() % 5;
    for (std::size_t i = 0; i < count; ++i) {
      const std::string& key = oneOf(keys);
      payload[key] = wild && chance(15) ? wildValue() : tidyValue(key);
    }
    return payload;
  }

  struct Stream {
    ModelPayloads messages;
    ModelPayload previous;
    std::string process;
  };

  Stream randomStream(const std::vector<std::string>& keys) {
    static const std::vector<double> kSteps{0, 0.1, 0.4, 0.5, 0.6, 1, 2, 3, 4.9, 5, 7, 29, 500};
    const bool wild = chance(40);
    Stream stream;
    stream.process = chance(5) ? "" : "app";
    if (chance(50)) {
      stream.previous = randomPayload(keys, wild);
      stream.previous["tarnreporting_timestamp"] = 50.0;
    }
    double time = 100;
    for (std::size_t count = random_() % 40; count > 0; --count) {
      time += oneOf(kSteps) * (wild && chance(10) ? -1 : 1);
      stream.messages.push_back(randomPayload(keys, wild));
      if (wild && chance(10)) {
        if (chance(60)) {
          stream.messages.back()["tarnreporting_timestamp"] = wildValue();
        }
      } else {
        stream.messages.back()["tarnreporting_timestamp"] = time;
      }
    }
    return stream;
  }

  static TarnReportingSessionMessageList records(const Stream& stream) {
    TarnReportingSessionMessageList messages;
    for (const ModelPayload& payload : stream.messages) {
      messages.append(unstamped(dictionaryOf(payload)));
    }
    return messages;
  }

  static void expectPayloads(const TarnReportingSessionMessageList& actual, const ModelPayloads& expected) {
    ASSERT_EQ(actual.size(), expected.size());
    for (std::size_t i = 0; i < actual.size(); ++i) {
      ASSERT_NO_FATAL_FAILURE(expectSame(actual[i]->message(), expected[i]));
    }
  }

  // Streams until that many messages have gone through; `check` tells how many messages came out.
  template <class Check>
  void run(const std::vector<std::string>& keys, const Check& check) {
    for (const std::uint64_t seed : testSeeds(1)) {
      SCOPED_TRACE(seedNote(seed));
      random_.seed(seed);
      std::size_t sent = 0;
      std::size_t derived = 0;
      while (sent < kMessagesPerRule) {
        Stream stream = randomStream(keys);
        sent += stream.messages.size();
        derived += check(stream);
        if (HasFatalFailure()) return;
      }
      EXPECT_GT(derived, kMessagesPerRule / 100);  // the streams say something
    }
  }

  FakePlatform platform_;
  std::mt19937 random_;
};

TEST_F(DerivationModel, CombiningDoesWhatItsModelSays) {
  run({"A", "B", "C", "D", "other"}, [](Stream& stream) -> std::size_t {
    const TarnReportingSessionMessageList messages = records(stream);
    const std::vector<plist::Key> keys{"A", "B", "C", "D"};
    const auto combined = TarnReportingSessionWorkerUtility::combineRapidMessages(messages, keys, 5);
    const auto expected = combineModel(stream.messages, {"A", "B", "C", "D"}, 5);
    std::vector<std::size_t> left;
    for (std::size_t i = 0; i < messages.size(); ++i) {
      if (!combined.isMerged(i)) {
        left.push_back(i);
      }
    }
    [&] {
      ASSERT_EQ(left, expected);
      ASSERT_NO_FATAL_FAILURE(expectPayloads(messages, stream.messages));
    }();
    return messages.size() - left.size();
  });
}

TEST_F(DerivationModel, VolumeMessagesAreWhatTheirModelSays) {
  run({"session_output_running", "session_output_running", "session_duration", "session_selected_format",
       "active_devices", "spatializationEnabled", "ringerstate", "KvSessionVolume", "spatial-audio-accessory-feature",
       "mFormatID", "mChannelsPerFrame", "other"},
      [](Stream& stream) {
        const TarnReportingSessionMessageList messages = records(stream);
        const auto derived = TarnReportingSessionVolumeMessagesWorker::createVolumeMessages(
            messages, previous(dictionaryOf(stream.previous)), stream.process, 0.5);
        expectPayloads(derived, volumeModel(stream.messages, stream.previous, stream.process));
        expectPayloads(messages, stream.messages);
        return derived.size();
      });
}

TEST_F(DerivationModel, InputMessagesAreWhatTheirModelSays) {
  run({"session_input_running", "session_input_running", "session_duration", "active_devices",
       "vp_config_primary_vocoder", "vp_config_primary_vocoderFs", "vp_config_operation_mode", "vp_config_input_port",
       "session_selected_format", "spatializationEnabled", "spatial-audio-accessory-feature"},
      [](Stream& stream) {
        const TarnReportingSessionMessageList messages = records(stream);
        const auto derived = TarnReportingSessionInputMessagesWorker::createInputMessages(
            messages, previous(dictionaryOf(stream.previous)), stream.process, 0.5);
        expectPayloads(derived, inputModel(stream.messages, stream.previous, stream.process));
        expectPayloads(messages, stream.messages);
        return derived.size();
      });
}

TEST_F(DerivationModel, LagoonMessagesAreWhatTheirModelSays) {
  run({"session_output_running", "session_output_running", "lagoon_session", "lagoon_session", "session_duration",
       "session_selected_format", "active_devices", "mFormatID", "mChannelsPerFrame", "spatializationEnabled"},
      [](Stream& stream) {
        const TarnReportingSessionMessageList messages = records(stream);
        const auto derived = TarnReportingSessionLagoonMessagesWorker::createLagoonMessages(
            messages, previous(dictionaryOf(stream.previous)), 0.5);
        expectPayloads(derived, lagoonModel(stream.messages, stream.previous));
        expectPayloads(messages, stream.messages);
        return derived.size();
      });
}

}  // namespace
}  // namespace tarn
