// SPDX-License-Identifier: Apache-2.0
// Messages that need no shape of the program's, with the real service: reports, and fields of any keys.
#include <signal.h>
#include <tarnreporting_reports.hpp>

#include <chrono>
#include <string>

#include "tests/clients/ServiceRingFixture.h"

namespace tarn::reporting {
namespace {

using nlohmann::json;

class ServiceReports : public ServiceRing {
 protected:
  static std::string named(const std::string& what) { return "sys.oxbow.tarnkit." + what; }

  // The payload of the one event of that name, without what is added to every message.
  json payload(const std::string& what) {
    json found = eventsOnceThereAre(1, named(what)).at(0).payload;
    for (const char* const added : {"tarnreporting_timestamp", "audiotag", "HostApplicationDisplayID"}) {
      found.erase(added);
    }
    return found;
  }
  int postKey(const std::string& key, std::int64_t value) {
    const tarnreporting_field field = {key.c_str(), tarnreporting_integer(value)};
    const tarnreporting_message_options options = {sizeof options, 4, 1, &field, 1, 0};
    return tarnreporting_post_fields(library_.writer_, library_.session_, &options);
  }
};

TEST_F(ServiceReports, EachReportIsAMessageOfItsKeys) {
  ASSERT_TRUE(startService());
  tarnreporting::Client client(socket().c_str());
  tarnreporting::Session session = client.begin({7, "org.example.engine"});
  const tarnreporting::Reports reports(session);
  tarnreporting::Writer writer = client.writer();
  for (const tarnreporting::Result result :
       {reports.outputRunning(writer, 0.5, "Speaker"), reports.volumeChanged(writer, 0.75),
        reports.routeChanged(writer, "HeadphonesBT"), reports.outputStopped(writer),
        reports.inputRunning(writer, "MicrophoneBuiltIn", "opus", 48000), reports.codecChanged(writer, "amr-wb", 16000),
        reports.inputStopped(writer), reports.overload(writer, 512, 88231), reports.error(writer, "no device"),
        reports.sessionDuration(writer, 12.5)}) {
    EXPECT_TRUE(result.ok()) << result.text();
  }
  const json running = {{"session_output_running", true}, {"KvSessionVolume", 0.5}, {"active_devices", "Speaker"}};
  const json input = {{"session_input_running", true},
                      {"active_devices", "MicrophoneBuiltIn"},
                      {"vp_config_primary_vocoder", "opus"},
                      {"vp_config_primary_vocoderFs", "48000.0"}};
  const json codec = {{"vp_config_primary_vocoder", "amr-wb"}, {"vp_config_primary_vocoderFs", "16000.0"}};
  const json overload = {{"issue_type", "overload"}, {"smallest_buffer_frame_size", 512}, {"io_cycle", 88231}};
  EXPECT_EQ(payload("Playback.Start"), running);
  EXPECT_EQ(payload("Playback.Stop"), json({{"session_output_running", false}}));
  EXPECT_EQ(payload("Volume.Generic"), json({{"KvSessionVolume", 0.75}}));
  EXPECT_EQ(payload("RouteChange.Generic"), json({{"active_devices", "HeadphonesBT"}}));
  EXPECT_EQ(payload("Input.Start"), input);
  EXPECT_EQ(payload("Input.Setup"), codec);
  EXPECT_EQ(payload("Input.Stop"), json({{"session_input_running", false}}));
  EXPECT_EQ(payload("IO.Error"), overload);
  EXPECT_EQ(payload("Error.Error"), json({{"issue_type", "no device"}}));
  EXPECT_EQ(payload("Generic.Stop"), json({{"session_duration", 12.5}}));
}

TEST_F(ServiceReports, AnEngineThatKnowsNoKeyGetsItsVolumeSummary) {
  ASSERT_TRUE(startService());
  library_.openAll(socket());
  tarnreporting_reports reports = {};
  ASSERT_EQ(tarnreporting_reports_declare(library_.session_, &reports), TARNREPORTING_OK);
  const auto now =
      std::chrono::duration_cast<std::chrono::nanoseconds>(std::chrono::system_clock::now().time_since_epoch());
  const auto stamp = static_cast<std::uint64_t>(now.count());
  ASSERT_EQ(tarnreporting_report_output_running_at(library_.writer_, &reports, stamp, 0.5, "Speaker"),
            TARNREPORTING_OK);
  ASSERT_EQ(tarnreporting_report_output_stopped_at(library_.writer_, &reports, stamp + 1250000000), TARNREPORTING_OK);
  ASSERT_EQ(tarnreporting_session_end(library_.session_), TARNREPORTING_OK);
  const json summary = eventsOnceThereAre(1, named("Volume.Summary")).at(0).payload;
  EXPECT_EQ(summary.at("KvSessionVolume"), 0.5);
  EXPECT_EQ(summary.at("active_devices"), "Speaker");
  EXPECT_NEAR(summary.at("play_seconds"), 1.25, 1e-3);
}

TEST_F(ServiceReports, FieldsOfAnyKeysArriveWithTheirValuesAndStamp) {
  ASSERT_TRUE(startService());
  library_.openAll(socket());
  const tarnreporting_field fields[] = {{"integer", tarnreporting_integer(-7)},
                                        {"unsigned", tarnreporting_unsigned(7)},
                                        {"double", tarnreporting_double(0.25)},
                                        {"boolean", tarnreporting_boolean(1)},
                                        {"text", text("caf\xC3\xA9")}};
  const auto now =
      std::chrono::duration_cast<std::chrono::seconds>(std::chrono::system_clock::now().time_since_epoch());
  const std::uint64_t stamp = (static_cast<std::uint64_t>(now.count()) - 100) * 1000000000 + 500000000;
  const tarnreporting_message_options options = {sizeof options, 4, 0, fields, 5, stamp};
  ASSERT_EQ(tarnreporting_post_fields(library_.writer_, library_.session_, &options), TARNREPORTING_OK);
  const json expected = {
      {"integer", -7}, {"unsigned", 7}, {"double", 0.25}, {"boolean", true}, {"text", "caf\xC3\xA9"}};
  EXPECT_EQ(payload("Playback.Generic"), expected);
  EXPECT_EQ(events(named("Playback.Generic")).at(0).payload.at("tarnreporting_timestamp"),
            static_cast<double>(now.count()) - 99.5);
}

TEST_F(ServiceReports, MoreSetsOfKeysThanASessionRemembersAreAllServed) {
  ASSERT_TRUE(startService());
  library_.openAll(socket());
  for (std::int64_t i = 0; i < 300; ++i) {
    // The oldest set goes only once the service has taken its messages.
    ASSERT_TRUE(e2e::eventually([&] { return postKey("key" + std::to_string(i), i) == TARNREPORTING_OK; })) << i;
  }
  const auto events = eventsOnceThereAre(300, kName);
  ASSERT_EQ(events.size(), 300U);
  for (std::int64_t i = 0; i < 300; ++i) {
    EXPECT_EQ(events.at(static_cast<std::size_t>(i)).payload.value("key" + std::to_string(i), std::int64_t{-1}), i);
  }
  EXPECT_EQ(library_.state().refused, 0U);
}

TEST_F(ServiceReports, AShapeDeclaredAfterAnotherIsGoneIsReadByItsOwnKeys) {
  ASSERT_TRUE(startService());
  library_.openAt(socket());
  library_.openWriter();
  for (std::int64_t i = 0; i < 100; ++i) {
    const std::string key = "key" + std::to_string(i);
    const tarnreporting_key keys[] = {{key.c_str(), TARNREPORTING_INTEGER}};
    const tarnreporting_shape_options options = {sizeof options, 4, 1, keys, 1};
    const tarnreporting_value value = tarnreporting_integer(i);
    library_.beginSession();
    ASSERT_EQ(tarnreporting_shape_declare(library_.session_, &options, &library_.shape_), TARNREPORTING_OK);
    ASSERT_EQ(tarnreporting_post(library_.writer_, library_.shape_, &value, 1), TARNREPORTING_OK);
    ASSERT_EQ(tarnreporting_client_flush(library_.client_, 20000), TARNREPORTING_OK);
    ASSERT_EQ(tarnreporting_session_end(library_.session_), TARNREPORTING_OK);
  }
  const auto events = eventsOnceThereAre(100, kName);
  ASSERT_EQ(events.size(), 100U);
  for (std::int64_t i = 0; i < 100; ++i) {
    EXPECT_EQ(events.at(static_cast<std::size_t>(i)).payload.value("key" + std::to_string(i), std::int64_t{-1}), i);
  }
}

TEST_F(ServiceReports, FieldsThatWerePostedWhileTheServiceWasGoneAreServed) {
  ASSERT_TRUE(startService());
  library_.openAll(socket());
  ASSERT_EQ(postKey("before", 1), TARNREPORTING_OK);
  ASSERT_TRUE(e2e::eventually([&] { return library_.state().committed == 1; }));
  service().signal(SIGKILL);
  service().wait();
  ASSERT_EQ(postKey("before", 2), TARNREPORTING_OK);
  ASSERT_EQ(postKey("meanwhile", 3), TARNREPORTING_OK);
  ASSERT_TRUE(startService());
  const auto events = eventsOnceThereAre(3, kName);
  ASSERT_EQ(events.size(), 3U);
  EXPECT_EQ(events.at(1).payload.at("before"), 2);
  EXPECT_EQ(events.at(2).payload.at("meanwhile"), 3);
}

}  // namespace
}  // namespace tarn::reporting
