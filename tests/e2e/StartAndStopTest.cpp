// SPDX-License-Identifier: Apache-2.0
// How the service starts, whom it refuses, and what it leaves when it ends.
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <unistd.h>
#include <csignal>

#include <algorithm>
#include <cstring>
#include <sstream>

#include "tests/e2e/support/RawSocket.h"
#include "tests/e2e/support/ServiceFixture.h"

namespace tarn::e2e {
namespace {

class StartAndStop : public ServiceFixture {
 protected:
  // A session that runs, with that many different messages, over a connection that stays open. Two connections need
  // two IDs: a message reaches whoever has its ID.
  std::unique_ptr<client::ClientConnection> sendMessages(int count, std::int64_t reporterID = 1) {
    auto client = connect();
    EXPECT_TRUE(client->call(client::createReportingSession(reporterID)).ok());
    EXPECT_EQ(client->send(client::startReportingSessionForID(reporterID)), client::SendStatus::Sent);
    for (int index = 0; index < count; ++index) {
      EXPECT_TRUE(
          client->call(client::sendMessage({{"number", index}}, 4, 1, std::vector<std::int64_t>{reporterID})).ok());
    }
    return client;
  }
  std::size_t recordedMessages() { return events("sys.oxbow.tarnkit.Playback.Start").size(); }
};

TEST_F(StartAndStop, TermEndsEachClientInOrderCommitsEverythingAndExitsWith0) {
  ASSERT_TRUE(startService());
  const auto first = sendMessages(300);
  const auto second = sendMessages(1, 2);
  EXPECT_EQ(stopService(SIGTERM), 0);
  EXPECT_EQ(recordedMessages(), 301U);
  const auto summaries = events("sys.oxbow.tarnkit.Session_Generic.Summary");
  ASSERT_EQ(summaries.size(), 2U);
  std::vector<int> messages = {summaries[0].payload.at("num_messages"), summaries[1].payload.at("num_messages")};
  std::sort(messages.begin(), messages.end());
  EXPECT_EQ(messages, (std::vector<int>{1, 300}));
  EXPECT_EQ(events("sys.oxbow.tarnkit.tarnreportingclientuptime").size(), 2U + 1U);  // and the asker of startService
  EXPECT_TRUE(logWillSay("reason=service-stopping")) << serviceLog();
}

TEST_F(StartAndStop, TermServesWhatWasSentBefore) {
  ASSERT_TRUE(startService());
  const auto client = connect();
  EXPECT_TRUE(client->call(client::createReportingSession(1)).ok());
  EXPECT_EQ(client->send(client::startReportingSessionForID(1)), client::SendStatus::Sent);
  for (int index = 0; index < 2000; ++index) {
    ASSERT_EQ(client->send(client::sendMessage({{"number", index}}, 4, 1, std::vector<std::int64_t>{1})),
              client::SendStatus::Sent);
  }
  ASSERT_TRUE(client->flush());
  EXPECT_EQ(stopService(SIGTERM), 0);
  EXPECT_EQ(recordedMessages(), 2000U);
  EXPECT_EQ(events("sys.oxbow.tarnkit.Session_Generic.Summary").size(), 1U);
}

TEST_F(StartAndStop, TermStopsTheSingleMessageSession) {
  ASSERT_TRUE(startService());
  play("{\"op\":\"sendMessage\",\"category\":\"Generic\",\"type\":\"Generic\",\"message\":{\"a\":1}}\n");
  EXPECT_EQ(stopService(SIGTERM), 0);
  EXPECT_EQ(events("sys.oxbow.standalone.Generic.Generic").size(), 1U);
  std::vector<std::string> rtc;
  for (const Event& event : events()) {
    if (event.backend == "rtc") {
      rtc.push_back(event.name);
    }
  }
  ASSERT_FALSE(rtc.empty());
  EXPECT_EQ(rtc.back(), "flush");
}

TEST_F(StartAndStop, IntDoesAsTermDoes) {
  ASSERT_TRUE(startService());
  const auto client = sendMessages(50);
  EXPECT_EQ(stopService(SIGINT), 0);
  EXPECT_EQ(recordedMessages(), 50U);
  EXPECT_EQ(events("sys.oxbow.tarnkit.Session_Generic.Summary").size(), 1U);
}

TEST_F(StartAndStop, KillServiceCommitsEverythingAndExitsWith2) {
  ASSERT_TRUE(startService());
  const auto client = sendMessages(300);
  EXPECT_EQ(ctl({"kill"}).status, 0);
  EXPECT_EQ(service().wait(), 2);
  EXPECT_EQ(recordedMessages(), 300U);
  EXPECT_TRUE(events("*.Summary").empty());
}

TEST_F(StartAndStop, KillServiceSendsTheRepliesToWhatCameBefore) {
  using namespace std::string_literals;
  ASSERT_TRUE(startService());
  RawSocket socket(this->socket());
  // [1, 10] and [2, 11] in one write, so that one turn of the service serves both.
  ASSERT_TRUE(socket.send(RawSocket::frame("\x82\x01\x0a"s) + RawSocket::frame("\x82\x02\x0b"s)));
  EXPECT_EQ(socket.receiveFrame(), "\x83\x01\xf6\x80"s);  // [1, null, []]
  EXPECT_TRUE(socket.isAtEnd());
  EXPECT_EQ(service().wait(), 2);
}

TEST_F(StartAndStop, AKilledServiceKeepsWhatWasCommittedAndGoesOnBehindIt) {
  ASSERT_TRUE(startService());
  auto client = sendMessages(100);
  ledgerAtRest();
  EXPECT_EQ(stopService(SIGKILL), 128 + SIGKILL);
  const auto before = events();
  EXPECT_EQ(recordedMessages(), 100U);

  ASSERT_TRUE(startService());
  client = sendMessages(1);
  eventsOnceThereAre(101, "sys.oxbow.tarnkit.Playback.Start");
  const auto after = events();
  ASSERT_GT(after.size(), before.size());
  for (std::size_t index = 0; index < before.size(); ++index) {
    ASSERT_EQ(after[index].id, before[index].id);
    ASSERT_EQ(after[index].payload, before[index].payload);
  }
  EXPECT_GT(after[before.size()].id, before.back().id);
}

TEST_F(StartAndStop, ASecondServiceOnALiveSocketIsRefused) {
  ASSERT_TRUE(startService());
  Process::Setup setup;
  setup.words = {TARNREPORTINGD, "--socket", socket(), "--state-dir", directory_ / "other"};
  const Finished second = runToEnd(setup, directory_);
  EXPECT_EQ(second.status, 1);
  EXPECT_NE(second.complaints.find("another service is listening on " + socket()), std::string::npos)
      << second.complaints;
  EXPECT_EQ(ctl({"status"}).status, 0);
}

TEST_F(StartAndStop, ASecondServiceOnAUsedStateDirectoryIsRefused) {
  ASSERT_TRUE(startService());
  const Finished second = runService({"--socket", directory_ / "other"});
  EXPECT_EQ(second.status, 1);
  EXPECT_NE(second.complaints.find("another service uses the state directory " + state()), std::string::npos)
      << second.complaints;
  EXPECT_NE(::access((directory_ / "other").c_str(), F_OK), 0);
  EXPECT_EQ(ctl({"status"}).status, 0);
}

TEST_F(StartAndStop, AStaleSocketIsReplaced) {
  ASSERT_TRUE(startService());
  EXPECT_EQ(stopService(SIGKILL), 128 + SIGKILL);
  ASSERT_EQ(::access(socket().c_str(), F_OK), 0);
  ASSERT_TRUE(startService());
  EXPECT_EQ(ctl({"status"}).status, 0);
}

TEST_F(StartAndStop, TheSocketIsForOwnerAndGroup) {
  ASSERT_TRUE(startService());
  struct stat facts {};
  ASSERT_EQ(::stat(socket().c_str(), &facts), 0);
  EXPECT_EQ(facts.st_mode & 0777U, 0660U);
}

TEST_F(StartAndStop, AListenerThatIsHandedOverIsUsed) {
  const int listener = ::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
  sockaddr_un address{};
  address.sun_family = AF_UNIX;
  ASSERT_LT(socket().size(), sizeof address.sun_path);
  std::memcpy(address.sun_path, socket().data(), socket().size());
  ASSERT_EQ(::bind(listener, reinterpret_cast<const sockaddr*>(&address), sizeof address), 0);
  ASSERT_EQ(::listen(listener, 16), 0);
  // The client connects before there is a service, as with any activated socket.
  const auto client = connect();
  Process::Setup setup = serviceSetup({"--socket", directory_ / "unused"});
  setup.listenFd = listener;
  service_ = std::make_unique<Process>(setup, directory_);
  const client::Reply reply = client->call(client::getAllReporters(), kDeadline);
  EXPECT_TRUE(reply.ok()) << reply.error.text;
  EXPECT_NE(::access((directory_ / "unused").c_str(), F_OK), 0);
  EXPECT_EQ(stopService(SIGTERM), 0);
  ::close(listener);
}

TEST_F(StartAndStop, ReadinessIsToldOnceTheListenerAccepts) {
  const int manager = ::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0);
  sockaddr_un address{};
  address.sun_family = AF_UNIX;
  const std::string path = directory_ / "notify";
  std::memcpy(address.sun_path, path.data(), path.size());
  ASSERT_EQ(::bind(manager, reinterpret_cast<const sockaddr*>(&address), sizeof address), 0);
  Process::Setup setup = serviceSetup({"--socket", socket()});
  setup.environment = {"NOTIFY_SOCKET=" + path};
  service_ = std::make_unique<Process>(setup, directory_);
  timeval patience{kDeadline.count(), 0};
  ::setsockopt(manager, SOL_SOCKET, SO_RCVTIMEO, &patience, sizeof patience);
  std::string told;
  while (told.find("READY=1") == std::string::npos) {
    char text[512];
    const ssize_t count = ::recv(manager, text, sizeof text, 0);
    ASSERT_GT(count, 0) << "told only: " << told;
    told.append(text, static_cast<std::size_t>(count)).append("\n");
  }
  EXPECT_TRUE(connect());
  ::close(manager);
}

TEST_F(StartAndStop, WrongOptionsAreUsageErrorsThatNameTheOption) {
  const std::pair<std::vector<std::string>, std::string> rows[] = {
      {{"--frobnicate"}, "--frobnicate"},
      {{"--log-level", "loud"}, "--log-level"},
      {{"--socket"}, "--socket"},
      {{"stray"}, "stray"},
  };
  for (const auto& [options, name] : rows) {
    const Finished refused = runService(options);
    EXPECT_EQ(refused.status, 64) << name;
    EXPECT_NE(refused.complaints.find(name), std::string::npos) << refused.complaints;
    EXPECT_EQ(std::count(refused.complaints.begin(), refused.complaints.end(), '\n'), 1) << refused.complaints;
  }
}

TEST_F(StartAndStop, AWrongConfigurationIsRefusedWithFileAndLine) {
  const std::pair<std::string, std::string> rows[] = {
      {"[tally]\nin_use = 5\n", ":2: "},
      {"[tally]\n\nwhat = true\n", ":3: "},
      {"[nothing]\n", ":1: "},
      {"[limits]\nmax_frame_bytes = \"x\"\n", ":2: "},
      {"[tally\n", ":1: "},
  };
  const std::string path = directory_ / "service.toml";
  for (const auto& [text, line] : rows) {
    writeFile(path, text);
    const Finished refused = runService({"--socket", socket(), "--config", path});
    EXPECT_EQ(refused.status, 78) << text;
    EXPECT_NE(refused.complaints.find(path + line), std::string::npos) << refused.complaints;
    EXPECT_EQ(std::count(refused.complaints.begin(), refused.complaints.end(), '\n'), 1) << refused.complaints;
  }
}

TEST_F(StartAndStop, AMissingConfigurationIsRefused) {
  const Finished refused = runService({"--socket", socket(), "--config", directory_ / "none.toml"});
  EXPECT_EQ(refused.status, 78);
  EXPECT_NE(refused.complaints.find(directory_ / "none.toml"), std::string::npos) << refused.complaints;
}

TEST_F(StartAndStop, WrongDevicePropertiesAreRefusedWithFileAndLine) {
  const std::string path = directory_ / "device.json";
  for (const char* text : {"{\"InternalBuild\": 1}", "[]", "{", ""}) {
    writeFile(path, text);
    const Finished refused = runService({"--socket", socket(), "--device-properties", path});
    EXPECT_EQ(refused.status, 78) << text;
    EXPECT_NE(refused.complaints.find(path + ":1"), std::string::npos) << refused.complaints;
  }
}

TEST_F(StartAndStop, HelpAndVersionGoToStdout) {
  const Finished help = runService({"--help"});
  EXPECT_EQ(help.status, 0);
  for (const char* option :
       {"--socket", "--state-dir", "--config", "--device-properties", "--log-level", "--log-target", "--version"}) {
    EXPECT_NE(help.output.find(option), std::string::npos) << option;
  }
  EXPECT_EQ(runService({"--version"}).status, 0);
}

TEST_F(StartAndStop, TheLogGoesToAFileWhenAsked) {
  const std::string path = directory_ / "service.log";
  ASSERT_TRUE(startService({"--log-target", path, "--log-level", "debug"}));
  play("{\"op\":\"createReportingSession\",\"reporterID\":77}\n");
  EXPECT_TRUE(
      eventually([&] { return contentOf(path).find("created reporting session for ID: 77") != std::string::npos; }));
  EXPECT_EQ(stopService(SIGTERM), 0);
  // TIME LEVEL CATEGORY, then the module right-aligned in 25 columns, the line left-aligned in 5.
  const std::string log = contentOf(path);
  const auto at = log.find("created reporting session for ID: 77");
  const auto begin = log.rfind('\n', at) + 1;
  const std::string line = log.substr(begin, at - begin);
  EXPECT_EQ(line.substr(10, 1), "T") << line;
  EXPECT_NE(line.find("Z info tarnrr "), std::string::npos) << line;
  EXPECT_NE(line.find("     TarnReportingSession:"), std::string::npos) << line;
}

// Before there is anything, beside a live service, and where something won't do.
TEST_F(StartAndStop, CheckSaysWhatWouldDoAndTouchesNothing) {
  const std::vector<std::string> names{"options",          "configuration", "device-properties",
                                       "state-directory",  "store",         "space",
                                       "socket-directory", "socket",        "unit"};
  const auto begins = [&](const std::string& output) {
    std::istringstream lines(output);
    std::vector<std::string> found;
    for (std::string line; std::getline(lines, line);) {
      found.push_back(line.substr(0, line.find(':')));
    }
    return found;
  };
  std::vector<std::string> allGood;
  for (const std::string& name : names) {
    allGood.push_back("good " + name);
  }
  const Finished fresh = runService({"--check", "--socket", socket()});
  EXPECT_EQ(fresh.status, 0) << fresh.output << fresh.complaints;
  EXPECT_EQ(begins(fresh.output), allGood);
  EXPECT_NE(::access(state().c_str(), F_OK), 0);
  EXPECT_EQ(ctl({"check"}).status, 0);
  EXPECT_NE(::access(state().c_str(), F_OK), 0);

  ASSERT_TRUE(startService());
  const auto client = sendMessages(3);
  const Finished beside = runService({"--check", "--socket", socket()});
  EXPECT_EQ(beside.status, 0) << beside.output;
  EXPECT_NE(beside.output.find("good socket: " + socket() + " answers, process " + std::to_string(service().id())),
            std::string::npos)
      << beside.output;
  const Finished asJson = ctl({"check", "--json"});
  EXPECT_EQ(asJson.status, 0);
  std::vector<std::string> told;
  for (const json& line : jsonLines(asJson.output)) {
    told.push_back(line.at("check"));
    EXPECT_EQ(line.at("good"), true) << line;
  }
  EXPECT_EQ(told, names);
  EXPECT_EQ(stopService(SIGTERM), 0);
  EXPECT_EQ(recordedMessages(), 3U);

  writeFile(state() + "/recorder.sqlite3", "no database");
  writeFile(directory_ / "bad.toml", "[nothing]\n");
  const Finished bad = runService({"--check", "--socket", socket(), "--config", directory_ / "bad.toml"});
  EXPECT_EQ(bad.status, 78);
  EXPECT_NE(bad.output.find("bad configuration: " + (directory_ / "bad.toml") + ":1: unknown section [nothing]"),
            std::string::npos)
      << bad.output;
  EXPECT_EQ(ctl({"check"}).status, 1);
  EXPECT_EQ(contentOf(state() + "/recorder.sqlite3"), "no database");
}

}  // namespace
}  // namespace tarn::e2e
