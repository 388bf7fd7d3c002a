// SPDX-License-Identifier: Apache-2.0
#include "tools/ctl/sessions/SessionTrace.h"

#include <nlohmann/json.hpp>

#include "tests/ctl/SessionMessages.h"

namespace tarn::ctl {
namespace {

using nlohmann::json;

class SessionTraceTest : public ::testing::Test {
 protected:
  SessionTraceTest() {
    session_.id = 12;
    session_.pid = 812;
    session_.process = "player";
    session_.application = "org.example.music";
    session_.serviceName = "longformaudio";
  }
  void addPeriod(double started, std::optional<double> stopped) {
    recorder::PeriodRow period;
    period.started = started;
    period.stopped = stopped;
    period.messages = 4;
    period.redundant = 1;
    periods_.push_back(period);
  }
  // The events of one name.
  std::vector<json> traced(const std::string& name) {
    std::string text;
    for (const std::string& line : traceOf(session_, periods_, messages_, 5000)) {
      text += line + "\n";
    }
    const json whole = json::parse(text);
    EXPECT_EQ(whole.at("displayTimeUnit"), "ms");
    std::vector<json> found;
    for (const json& event : whole.at("traceEvents")) {
      EXPECT_EQ(event.at("pid"), 812);
      if (event.at("name") == name) {
        found.push_back(event);
      }
    }
    return found;
  }
  recorder::SessionRow session_;
  std::vector<recorder::PeriodRow> periods_;
  std::vector<SessionMessage> messages_;
};

TEST_F(SessionTraceTest, TracksAreNamed) {
  EXPECT_EQ(traced("process_name").front().at("args").at("name"), "player org.example.music");
  std::vector<std::string> names;
  for (const json& event : traced("thread_name")) {
    EXPECT_EQ(event.at("ph"), "M");
    names.push_back(event.at("args").at("name"));
  }
  EXPECT_EQ(names, (std::vector<std::string>{"session 12", "output", "input", "route", "faults"}));
}

TEST_F(SessionTraceTest, APeriodIsASlice) {
  addPeriod(1000.5, 1010);
  const json slice = traced("longformaudio").at(0);
  EXPECT_EQ(slice.at("ph"), "X");
  EXPECT_EQ(slice.at("ts"), 1'000'500'000);
  EXPECT_EQ(slice.at("dur"), 9'500'000);
  EXPECT_EQ(slice.at("args"), json::parse(R"({"messages":4,"redundant":1})"));
}

TEST_F(SessionTraceTest, APeriodThatRunsEndsNow) {
  addPeriod(1000, std::nullopt);
  EXPECT_EQ(traced("longformaudio").at(0).at("dur"), 4'000'000'000);
}

TEST_F(SessionTraceTest, APeriodOfAnotherTimeIsToldByItsStamps) {
  addPeriod(1000, 1010);
  SessionMessage message = messageAt(1001, "Playback.Start");
  message.stamp = 4'102'444'800;
  messages_.push_back(message);
  message.stamp = 4'102'444'860;
  messages_.push_back(message);
  EXPECT_EQ(traced("longformaudio").at(0).at("ts"), 4'102'444'800'000'000);
  EXPECT_EQ(traced("longformaudio").at(0).at("dur"), 60'000'000);
}

TEST_F(SessionTraceTest, TheTimelineIsOnItsTracks) {
  messages_ = {messageAt(10, "Playback.Start",
                         R"("session_output_running":true,"session_input_running":true,"active_devices":"Speaker",)"
                         R"("KvSessionVolume":0.5)"),
               messageAt(12, "IO.Error", R"("issue_type":"overload")"), messageAt(13, "Playback.Error"),
               messageAt(20, "Playback.Stop", R"("session_output_running":false)")};
  const json output = traced("output runs").at(0);
  EXPECT_EQ(output.at("ts"), 10'000'000);
  EXPECT_EQ(output.at("dur"), 10'000'000);
  EXPECT_EQ(traced("input runs").at(0).at("dur"), 10'000'000);
  EXPECT_NE(traced("input runs").at(0).at("tid"), output.at("tid"));
  EXPECT_EQ(traced("Speaker").at(0).at("dur"), 10'000'000);
  const json volume = traced("volume").at(0);
  EXPECT_EQ(volume.at("ph"), "C");
  EXPECT_EQ(volume.at("args").at("volume"), 0.5);
  const json overload = traced("overload").at(0);
  EXPECT_EQ(overload.at("ph"), "i");
  EXPECT_EQ(overload.at("ts"), 12'000'000);
  EXPECT_EQ(traced("Playback.Error").at(0).at("ts"), 13'000'000);
}

}  // namespace
}  // namespace tarn::ctl
