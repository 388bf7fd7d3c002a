// SPDX-License-Identifier: Apache-2.0
// tarnreportingctl events: what the recorder holds, with and without a running service.
#include <csignal>

#include <algorithm>
#include <filesystem>
#include <fstream>

#include "tests/e2e/support/ServiceFixture.h"

namespace tarn::e2e {
namespace {

constexpr const char* kThreeMessages = R"({"op":"createReportingSession","reporterID":1}
{"op":"sendMessage","reporterIDs":[1],"category":4,"type":1,"message":{"n":1}}
{"op":"sendMessage","reporterIDs":[1],"category":4,"type":2,"message":{"n":2}}
{"op":"sendMessage","reporterIDs":[1],"category":14,"type":0,"message":{"n":3}}
)";

class EventsCommand : public ServiceFixture {
 protected:
  std::vector<json> listed(std::vector<std::string> words) {
    words.insert(words.begin(), {"events", "--json"});
    const Finished finished = ctl(words);
    EXPECT_EQ(finished.status, 0) << finished.complaints;
    return jsonLines(finished.output);
  }
  void record(const std::string& script) {
    ASSERT_TRUE(startService());
    play(script);
    ASSERT_EQ(stopService(SIGTERM), 0);
  }
};

TEST_F(EventsCommand, ShowsEveryMemberWithoutARunningService) {
  record(kThreeMessages);
  const auto all = listed({"--name", "sys.oxbow.*.Playback.*"});
  ASSERT_EQ(all.size(), 4U);
  for (const json& event : all) {
    for (const char* name : {"id", "time", "backend", "name", "payload", "detail"}) {
      EXPECT_TRUE(event.contains(name)) << name;
    }
    EXPECT_EQ(event.at("backend"), "tally");
    EXPECT_EQ(event.at("detail"), json::object());
    EXPECT_GT(event.at("time"), 1.7e9);
  }
  EXPECT_EQ(all[0].at("payload").at("n"), 1);
}

TEST_F(EventsCommand, FiltersByNameBackEndAndId) {
  record(kThreeMessages);
  EXPECT_EQ(listed({"--name", "sys.oxbow.tarnkit.Volume.*"}).size(), 1U);
  EXPECT_EQ(listed({"--name", "*.Volume.*", "--backend", "wattlog"}).size(), 0U);
  const auto all = listed({"--backend", "tally"});
  ASSERT_GE(all.size(), 6U);
  const auto later = listed({"--after", all[1].at("id").dump()});
  ASSERT_EQ(later.size(), all.size() - 2);
  EXPECT_EQ(later[0], all[2]);
}

TEST_F(EventsCommand, PrintsATableForPeople) {
  record(kThreeMessages);
  const std::string table = ctl({"events", "--name", "*.Volume.Generic"}).output;
  EXPECT_NE(table.find("ID"), std::string::npos);
  EXPECT_NE(table.find("BACKEND"), std::string::npos);
  EXPECT_NE(table.find("sys.oxbow.tarnkit.Volume.Generic"), std::string::npos);
  EXPECT_EQ(std::count(table.begin(), table.end(), '\n'), 3) << table;
}

TEST_F(EventsCommand, SaysThatThereIsNoRecorder) {
  const Finished finished = ctl({"events"});
  EXPECT_EQ(finished.status, 1);
  EXPECT_NE(finished.complaints.find("recorder.sqlite3"), std::string::npos);
}

TEST_F(EventsCommand, NamesAFileThatIsNoRecordersOnce) {
  std::filesystem::create_directories(state());
  const std::string file = state() + "/recorder.sqlite3";
  std::ofstream(file) << "something else";
  const Finished finished = ctl({"events"});
  EXPECT_EQ(finished.status, 1);
  EXPECT_EQ(finished.complaints, "tarnreportingctl: can't read " + file + ": file is not a database\n");
}

TEST_F(EventsCommand, FollowPrintsWhatIsThereThenWhatComesUntilInterrupted) {
  ASSERT_TRUE(startService());
  play("{\"op\":\"sendMessage\",\"category\":4,\"type\":1,\"message\":{\"n\":1}}\n");
  eventsOnceThereAre(2, "*.Playback.Start");
  const auto tail = startCtl({"events", "--follow", "--json", "--name", "sys.oxbow.tarnkit.Playback.*"});
  EXPECT_TRUE(eventually([&] { return jsonLines(tail->output()).size() == 1; }));
  play("{\"op\":\"sendMessage\",\"category\":4,\"type\":2,\"message\":{\"n\":2}}\n");
  EXPECT_TRUE(eventually([&] { return jsonLines(tail->output()).size() == 2; }));
  EXPECT_TRUE(tail->isRunning());
  tail->signal(SIGINT);
  EXPECT_EQ(tail->wait(), 0);
  EXPECT_EQ(tail->complaints(), "");
  const auto printed = jsonLines(tail->output());
  ASSERT_EQ(printed.size(), 2U);
  EXPECT_EQ(printed[0].at("name"), "sys.oxbow.tarnkit.Playback.Start");
  EXPECT_EQ(printed[1].at("name"), "sys.oxbow.tarnkit.Playback.Stop");
}

TEST_F(EventsCommand, FollowWaitsForARecorderThatIsNotThereYet) {
  const auto tail = startCtl({"events", "--follow", "--json", "--name", "sys.oxbow.tarnkit.Playback.*"});
  ASSERT_TRUE(startService());
  play("{\"op\":\"sendMessage\",\"category\":4,\"type\":1,\"message\":{\"n\":1}}\n");
  EXPECT_TRUE(eventually([&] { return jsonLines(tail->output()).size() == 1; }));
  tail->signal(SIGTERM);
  EXPECT_EQ(tail->wait(), 0);
}

}  // namespace
}  // namespace tarn::e2e
