// SPDX-License-Identifier: Apache-2.0
// The messages that the service derives when a session stops, from the client's script to the recorder's rows.
#include <chrono>

#include "tests/e2e/support/ServiceFixture.h"

namespace tarn::e2e {
namespace {

// Stamps that are old are replaced, so these are far in the future.
constexpr double kZero = 4102444800;

double epochSeconds() {
  return std::chrono::duration<double>(std::chrono::system_clock::now().time_since_epoch()).count();
}

class DerivedMessages : public ServiceFixture {
 protected:
  struct Message {
    json stamp;  // a number is seconds after kZero
    json payload;
  };

  void SetUp() override { ASSERT_TRUE(startService()); }

  // Plays a session of these messages, each an event Playback.Generic.
  void playSession(const std::vector<Message>& messages) {
    std::vector<json> steps = {
        {{"op", "createReportingSession"}, {"reporterID", 7}},
        {{"op", "setServiceType"}, {"reporterID", 7}, {"serviceType", "wisp"}},
        {{"op", "setConfiguration"}, {"reporterID", 7}, {"configuration", {{"HostApplicationDisplayID", "org.app"}}}},
        {{"op", "startReportingSessionForID"}, {"reporterID", 7}}};
    for (const Message& message : messages) {
      json payload = message.payload;
      payload["tarnreporting_timestamp"] =
          message.stamp.is_number() ? json(kZero + message.stamp.get<double>()) : message.stamp;
      steps.push_back({{"op", "sendMessage"},
                       {"reporterIDs", {7}},
                       {"category", "Playback"},
                       {"type", "Generic"},
                       {"message", payload}});
    }
    steps.push_back({{"op", "stopReportingSessionForID"}, {"reporterID", 7}});
    std::string script;
    for (const json& step : steps) {
      script += step.dump() + "\n";
    }
    startedAt_ = epochSeconds();
    play(script);
    ledgerAtRest();
  }

  // The names of what the stop led to, in the order of the rows.
  std::vector<std::string> namesOfTheStop() {
    std::vector<std::string> found;
    for (const Event& event : events("sys.oxbow.*.*.Summary")) {
      EXPECT_EQ(event.backend, "tally");
      EXPECT_EQ(event.detail, json::object());
      found.push_back(event.name);
    }
    return found;
  }
  // Expects both events of each of these messages of a kind, one after the other, with just these payloads besides what
  // the intake adds.
  void expectDerived(const std::string& kind, const std::vector<json>& messages) {
    const std::vector<Event> found = events("sys.oxbow.*." + kind + ".Summary");
    ASSERT_EQ(found.size(), 2 * messages.size());
    for (std::size_t index = 0; index < found.size(); ++index) {
      json expected = messages[index / 2];
      expected.update({{"HostApplicationDisplayID", "org.app"},
                       {"audiotag", kind + "Summary"},
                       {"invalid_timestamp", "nil"},
                       {"msgidx", index / 2 + 1},
                       {"msgcnt", messages.size()}});
      json payload = found[index].payload;
      const json stamp = payload.value("tarnreporting_timestamp", json(0));
      payload.erase("tarnreporting_timestamp");
      EXPECT_EQ(found[index].name, (index % 2 == 0 ? "sys.oxbow.tarnkit." : "sys.oxbow.wisp.") + kind + ".Summary");
      EXPECT_EQ(payload, expected);
      EXPECT_GE(stamp, startedAt_ - 1);
      EXPECT_LE(stamp, epochSeconds() + 1);
    }
  }

  static json volume(const json& device, const json& value, const char* label, double seconds, const char* length) {
    return {{"session_selected_format", "unknown"},
            {"mFormatID", "unknown"},
            {"active_devices", device},
            {"KvSessionVolume", value},
            {"KvSessionVolumeBucketed", label},
            {"play_seconds", seconds},
            {"play_secondsBucketed", length},
            {"spatial-audio-accessory-feature", false},
            {"spatializationEnabled", false},
            {"ringerstate", false},
            {"mChannelsPerFrame", -1}};
  }
  static json input(const char* device, double seconds, const char* length) {
    return {{"inputrunning_seconds", seconds},
            {"inputrunning_secondsBucketed", length},
            {"vp_config_operation_mode", "unknown"},
            {"vp_config_input_port", "unknown"},
            {"active_devices", device}};
  }
  static json group(const char* device, const char* format, int channels, double seconds, const char* length) {
    return {{"session_selected_format", "unknown"}, {"active_devices", device}, {"mFormatID", format},
            {"mChannelsPerFrame", channels},        {"play_seconds", seconds},  {"play_secondsBucketed", length}};
  }

  double startedAt_ = 0;
};

using Names = std::vector<std::string>;

TEST_F(DerivedMessages, EachVolumeIsAMessageOfItsOwnBeforeTheSummary) {
  playSession({{0, {{"session_output_running", true}, {"active_devices", "Speaker"}, {"KvSessionVolume", 0.5}}},
               {20, {{"KvSessionVolume", 0.75}}},
               {30.25, {{"session_output_running", false}}}});
  expectDerived("Volume", {volume("Speaker", 0.5, "0.5", 20, "30"), volume("Speaker", 0.75, "0.75", 10.25, "10")});
  EXPECT_EQ(namesOfTheStop(),
            (Names{"sys.oxbow.tarnkit.Volume.Summary", "sys.oxbow.wisp.Volume.Summary",
                   "sys.oxbow.tarnkit.Volume.Summary", "sys.oxbow.wisp.Volume.Summary",
                   "sys.oxbow.tarnkit.Session_Generic.Summary", "sys.oxbow.wisp.Session_Generic.Summary"}));
}

TEST_F(DerivedMessages, VolumesThatArriveOutOfOrderCountInTheOrderOfTheirStamps) {
  playSession({{30.25, {{"session_output_running", false}}},
               {20, {{"KvSessionVolume", 0.75}}},
               {0, {{"session_output_running", true}, {"active_devices", "Speaker"}, {"KvSessionVolume", 0.5}}},
               {31, {{"session_output_running", false}, {"late", true}}}});
  expectDerived("Volume", {volume("Speaker", 0.5, "0.5", 20, "30"), volume("Speaker", 0.75, "0.75", 10.25, "10")});
}

TEST_F(DerivedMessages, VolumesOfOtherTypesAreReadByTheirLeadingNumbers) {
  playSession({{"4102444800.5 s",
                {{"session_output_running", "1 of 1"}, {"active_devices", 7}, {"KvSessionVolume", "0.5 of 1"}}},
               {10.5, {{"session_output_running", "off"}}}});
  expectDerived("Volume", {volume(7, "0.5 of 1", "0.5", 10, "10")});
}

TEST_F(DerivedMessages, EachInputDeviceIsAMessageOfItsOwnAfterTheSummary) {
  playSession({{0,
                {{"session_input_running", true},
                 {"active_devices", "Microphone"},
                 {"vp_config_primary_vocoder", "opus"},
                 {"vp_config_primary_vocoderFs", "16000.0"}}},
               {10, {{"vp_config_primary_vocoder", "aac"}, {"vp_config_primary_vocoderFs", "44100.0"}}},
               {15, {{"vp_config_primary_vocoder", "raw"}, {"vp_config_primary_vocoderFs", "0.0"}}},
               {30, {{"active_devices", "Headset"}}},
               {50, {{"session_input_running", false}}}});
  json first = input("Microphone", 30, "30");
  first["vocoders"] = "aac:44100.0,opus:16000.0";
  expectDerived("Input", {first, input("Headset", 20, "30")});
  EXPECT_EQ(namesOfTheStop(),
            (Names{"sys.oxbow.tarnkit.Session_Generic.Summary", "sys.oxbow.wisp.Session_Generic.Summary",
                   "sys.oxbow.tarnkit.Input.Summary", "sys.oxbow.wisp.Input.Summary", "sys.oxbow.tarnkit.Input.Summary",
                   "sys.oxbow.wisp.Input.Summary"}));
}

TEST_F(DerivedMessages, CodecsThatAreNumbersAreListedAsText) {
  playSession(
      {{0, {{"session_input_running", 1}, {"vp_config_primary_vocoder", 3}, {"vp_config_primary_vocoderFs", 16000}}},
       {10, {{"vp_config_primary_vocoder", "x"}, {"vp_config_primary_vocoderFs", 0.5}}},
       {20, {{"session_input_running", 0}}}});
  json only = input("unknown", 20, "30");
  only["vocoders"] = "3:16000";
  expectDerived("Input", {only});
}

TEST_F(DerivedMessages, EachFormatWithinAGroupIsAMessageOfItsOwn) {
  playSession({{0,
                {{"session_output_running", true},
                 {"active_devices", "Speaker"},
                 {"mFormatID", "aac"},
                 {"mChannelsPerFrame", 2}}},
               {10, {{"lagoon_session", 1}}},
               {50, {{"mFormatID", "alac"}}},
               {110, {{"lagoon_session", 0}}},
               {120, {{"session_output_running", false}}}});
  expectDerived("Lagoon", {group("Speaker", "aac", 2, 40, "30"), group("Speaker", "alac", 2, 60, "60")});
  EXPECT_EQ(namesOfTheStop(),
            (Names{"sys.oxbow.tarnkit.Lagoon.Summary", "sys.oxbow.wisp.Lagoon.Summary",
                   "sys.oxbow.tarnkit.Lagoon.Summary", "sys.oxbow.wisp.Lagoon.Summary",
                   "sys.oxbow.tarnkit.Session_Generic.Summary", "sys.oxbow.wisp.Session_Generic.Summary"}));
}

TEST_F(DerivedMessages, AGroupFlagOfAnotherTypeIsReadAsItsNumber) {
  playSession({{0, {{"session_output_running", true}, {"lagoon_session", "1 friend"}, {"mChannelsPerFrame", "6"}}},
               {30, {{"lagoon_session", true}, {"mChannelsPerFrame", 6}}},
               {100, {{"session_duration", "long"}}},
               {101, {{"session_output_running", false}}}});
  expectDerived("Lagoon", {group("unknown", "unknown", 6, 100, "60")});
}

TEST_F(DerivedMessages, NothingIsDerivedFromWhatIsTooShort) {
  playSession({{0,
                {{"session_output_running", true},
                 {"session_input_running", true},
                 {"lagoon_session", 1},
                 {"KvSessionVolume", 0.5}}},
               {0.5, {{"session_output_running", false}, {"session_input_running", false}}}});
  EXPECT_EQ(namesOfTheStop(),
            (Names{"sys.oxbow.tarnkit.Session_Generic.Summary", "sys.oxbow.wisp.Session_Generic.Summary"}));
}

}  // namespace
}  // namespace tarn::e2e
