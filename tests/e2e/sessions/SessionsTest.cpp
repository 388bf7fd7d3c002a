// SPDX-License-Identifier: Apache-2.0
// tarnreportingctl sessions, show and export: what a real service recorded of its sessions, and a session played again.
#include <array>
#include <chrono>
#include <csignal>
#include <filesystem>
#include <fstream>
#include <random>

#include "tests/e2e/support/ServiceFixture.h"
#include "tests/support/Seeds.h"

namespace tarn::e2e {
namespace {

constexpr const char* kApplication = "org.example.random";

// A session of one or two periods, whose messages begin and end everything that segments are derived of. Stamps are of
// the last hour, so that no service replaces them.
class RandomScript {
 public:
  // `repeating`: every third message is one from before, with a stamp of its own, and so is the last but one of each
  // period; and none comes before the start.
  explicit RandomScript(std::uint64_t seed, bool repeating = false) : repeating_(repeating), random_(seed) {
    const auto now = std::chrono::system_clock::now().time_since_epoch();
    stamp_ = std::chrono::floor<std::chrono::duration<double>>(now).count() - 3600;
  }

  std::string text() {
    static constexpr std::array<const char*, 4> kTypes{"longformaudio", "telephony", "wisp", "generic"};
    add({{"op", "createReportingSession"}, {"reporterID", 7}});
    add({{"op", "setServiceType"}, {"reporterID", 7}, {"serviceType", kTypes.at(below(kTypes.size()))}});
    const json configuration{{"HostApplicationDisplayID", kApplication}};
    add({{"op", "setConfiguration"}, {"reporterID", 7}, {"configuration", configuration}});
    if (!repeating_) {
      addMessage();
    }
    for (std::size_t period = 1 + below(2); period > 0; --period) {
      add({{"op", "startReportingSessionForID"}, {"reporterID", 7}});
      for (std::size_t messages = 10 + below(40); messages > 0; --messages) {
        addMessage();
      }
      for (int times = repeating_ ? 2 : 0; times > 0; --times) {
        addVolume();
      }
      // What runs on until the stop is measured up to the stop's own time.
      addEnd();
      add({{"op", "stopReportingSessionForID"}, {"reporterID", 7}});
    }
    return text_;
  }

 private:
  std::size_t below(std::size_t bound) { return std::uniform_int_distribution<std::size_t>(0, bound - 1)(random_); }
  void add(const json& line) { text_ += line.dump() + "\n"; }
  void addVolume() {
    stamp_ += 1;
    const json message{{"tarnreporting_timestamp", stamp_}, {"KvSessionVolume", 0.5}};
    add({{"op", "sendMessage"},
         {"reporterIDs", {7}},
         {"category", "Volume"},
         {"type", "Generic"},
         {"message", message}});
  }
  void addEnd() {
    stamp_ += 1;
    const json message{{"tarnreporting_timestamp", stamp_},
                       {"session_output_running", false},
                       {"session_input_running", false},
                       {"session_duration", 1}};
    add({{"op", "sendMessage"},
         {"reporterIDs", {7}},
         {"category", "Playback"},
         {"type", "Stop"},
         {"message", message}});
  }
  void addMessage() {
    static constexpr std::array<const char*, 3> kDevices{"Speaker", "HeadphonesBT", "HDMI"};
    static constexpr std::array<const char*, 5> kCategories{"Playback", "Volume", "RouteChange", "Lagoon", "IO"};
    stamp_ += 0.25 * static_cast<double>(below(80));
    if (repeating_ && !sent_.empty() && below(3) == 0) {
      json again = sent_.at(below(sent_.size()));
      again["message"]["tarnreporting_timestamp"] = stamp_;
      add(again);
      return;
    }
    json message{{"tarnreporting_timestamp", stamp_}};
    const auto sometimes = [&](const char* key, const json& value) {
      if (below(3) == 0) {
        message[key] = value;
      }
    };
    sometimes("session_output_running", below(3) > 0);
    sometimes("session_input_running", below(3) > 0);
    sometimes("KvSessionVolume", 0.0625 * static_cast<double>(below(17)));
    sometimes("active_devices", kDevices.at(below(kDevices.size())));
    sometimes("lagoon_session", below(2));
    sometimes("spatializationEnabled", below(2) == 1);
    sometimes("vp_config_primary_vocoder", below(2) == 1 ? "opus" : "aac");
    sometimes("vp_config_primary_vocoderFs", "16000.0");
    sometimes("issue_type", "overload");
    if (below(12) == 0) {
      message["session_duration"] = below(100);
    }
    sent_.push_back({{"op", "sendMessage"},
                     {"reporterIDs", {7}},
                     {"category", kCategories.at(below(kCategories.size()))},
                     {"type", below(2) == 0 ? "Generic" : "Error"},
                     {"message", message}});
    add(sent_.back());
  }

  const bool repeating_;
  std::vector<json> sent_;
  std::mt19937_64 random_;
  double stamp_ = 0;
  std::string text_;
};

class SessionsCommand : public ServiceFixture {
 protected:
  // Plays it on a service that has nothing yet, and ends that.
  void record(const std::string& script, const std::vector<std::string>& options = {}) {
    std::filesystem::remove_all(state());
    ASSERT_TRUE(startService(options));
    play(script);
    ASSERT_EQ(stopService(SIGTERM), 0);
  }
  std::vector<json> sessions(std::vector<std::string> words = {}) {
    words.insert(words.begin(), {"sessions", "--json"});
    return jsonLines(ctl(words).output);
  }
  // What was derived: the segments but for when they were told, and of the session's own summary what its messages say.
  // With `counts` how many there were too, and how many of them repeated others.
  std::vector<std::string> derived(bool counts = false) {
    std::vector<std::string> all;
    for (const Event& event : events("sys.oxbow.tarnkit.*.Summary")) {
      json payload = event.payload;
      for (const char* key : {"tarnreporting_timestamp", "systemuptime_sec", "invalid_timestamp"}) {
        payload.erase(key);
      }
      if (event.name == "sys.oxbow.tarnkit.Session_Generic.Summary") {
        const json numbers = {payload.at("num_messages"), payload.at("num_redundant_messages")};
        payload = {payload.at("total_active_time"), payload.at("active_count"), payload.at("overload_count"),
                   payload.at("average_active_time"), payload.at("summaryServiceName")};
        if (counts) {
          payload.push_back(numbers);
        }
      }
      all.push_back(event.name + " " + payload.dump());
    }
    return all;
  }
};

TEST_F(SessionsCommand, AreTheSessionsThatClientsMade) {
  record(RandomScript(1).text());
  const auto all = sessions();
  ASSERT_EQ(all.size(), 1U);
  EXPECT_EQ(all[0].at("reporter"), 7);
  EXPECT_EQ(all[0].at("application"), kApplication);
  EXPECT_EQ(all[0].at("process"), "tarnreportingctl");
  EXPECT_EQ(all[0].at("running"), false);
  const Finished shown = ctl({"show", all[0].at("id").dump()});
  EXPECT_EQ(shown.status, 0) << shown.complaints;
  EXPECT_NE(shown.output.find(kApplication), std::string::npos) << shown.output;
}

TEST_F(SessionsCommand, ListOneThatGotItsTypeBeforeItRanOnce) {
  record(RandomScript(1).text());
  EXPECT_EQ(sessions().size(), 1U);
  const auto all = sessions({"--all"});
  ASSERT_EQ(all.size(), 2U);
  EXPECT_EQ(all[0].at("end_reason"), "retyped");
  EXPECT_EQ(all[1], sessions().front());
  const Finished report = ctl({"report"});
  EXPECT_NE(report.output.find(": 1 session.</p>"), std::string::npos);
}

TEST_F(SessionsCommand, AScriptOfOneDerivesTheSameOnAFreshService) {
  for (const std::uint64_t seed : testing::testSeeds(12)) {
    SCOPED_TRACE(testing::seedNote(seed));
    const std::string original = RandomScript(seed).text();
    record(original);
    const std::vector<std::string> before = derived();
    ASSERT_GE(before.size(), 1U);
    const auto all = sessions();
    ASSERT_EQ(all.size(), 1U);
    const Finished exported = ctl({"export", all[0].at("id").dump(), "--format", "script"});
    ASSERT_EQ(exported.status, 0) << exported.complaints;
    record(exported.output);
    EXPECT_EQ(derived(), before) << exported.output;
  }
}

TEST_F(SessionsCommand, AScriptWithTheRepeatedMessagesDerivesTheSameAndCountsThemToo) {
  const std::string configuration = directory_ / "mark.toml";
  std::ofstream(configuration) << "[recorder]\nredundant = \"mark\"\n";
  const std::vector<std::string> options{"--config", configuration};
  std::int64_t repeated = 0;
  for (const std::uint64_t seed : testing::testSeeds(8)) {
    SCOPED_TRACE(testing::seedNote(seed));
    record(RandomScript(seed, true).text(), options);
    const std::vector<std::string> before = derived(true);
    ASSERT_GE(before.size(), 1U);
    const auto all = sessions();
    ASSERT_EQ(all.size(), 1U);
    repeated += all[0].at("redundant").get<std::int64_t>();
    const Finished exported = ctl({"export", all[0].at("id").dump(), "--format", "script"});
    ASSERT_EQ(exported.status, 0);
    ASSERT_EQ(exported.complaints, "");
    record(exported.output, options);
    EXPECT_EQ(derived(true), before) << exported.output;
    EXPECT_EQ(sessions().at(0).at("redundant"), all[0].at("redundant"));
  }
  EXPECT_GT(repeated, 0);
}

}  // namespace
}  // namespace tarn::e2e
