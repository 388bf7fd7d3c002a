// SPDX-License-Identifier: Apache-2.0
// tarnreportingctl's contract with scripts: exit statuses, replies, complaints.
#include <fcntl.h>
#include <unistd.h>

#include <array>
#include <csignal>
#include <fstream>

#include "tests/e2e/support/ServiceFixture.h"

namespace tarn::e2e {
namespace {

class Ctl : public ServiceFixture {};

TEST_F(Ctl, WrongUsageIs64) {
  const std::vector<std::vector<std::string>> rows = {{},
                                                      {"frobnicate"},
                                                      {"status", "extra"},
                                                      {"events", "--after"},
                                                      {"defaults"},
                                                      {"defaults", "read"},
                                                      {"notify"},
                                                      {"--what", "status"},
                                                      {"--timeout", "nan", "status"},
                                                      {"--wait=nan", "status"},
                                                      {"events", "--after", "x"}};
  for (const auto& words : rows) {
    const Finished finished = ctl(words);
    EXPECT_EQ(finished.status, 64) << (words.empty() ? "nothing" : words.front());
    EXPECT_EQ(finished.output, "");
    EXPECT_NE(finished.complaints, "");
  }
}

TEST_F(Ctl, AServiceThatIsNotThereIs69) {
  for (const std::vector<std::string>& words : {std::vector<std::string>{"status"}, {"reporters"}, {"kill"}}) {
    const Finished finished = ctl(words);
    EXPECT_EQ(finished.status, 69) << words.front();
    EXPECT_NE(finished.complaints.find(socket()), std::string::npos) << finished.complaints;
  }
  EXPECT_EQ(ctl({"run"}, "{\"op\":\"getAllReporters\"}\n").status, 69);
  EXPECT_EQ(ctl({"run"}, "").status, 0);
}

TEST_F(Ctl, WaitIsForTheServiceToBeThere) {
  const auto waiting = startCtl({"--wait=8", "status"});
  const auto script = startCtl({"run", "--wait", "-"}, "{\"op\":\"getAllReporters\"}\n");
  ASSERT_TRUE(startService());
  EXPECT_EQ(waiting->wait(), 0) << waiting->complaints();
  EXPECT_EQ(script->wait(), 0) << script->complaints();
  Process::Setup impatient;
  impatient.words = {TARNREPORTINGCTL, "--socket", directory_ / "none", "--wait=0.05", "status"};
  const Finished tired = runToEnd(impatient, directory_);
  EXPECT_EQ(tired.status, 69);
  EXPECT_NE(tired.complaints.find("(waited 0.05 s)"), std::string::npos) << tired.complaints;
}

TEST_F(Ctl, AServiceThatDoesNotAnswerInTimeIs69) {
  ASSERT_TRUE(startService());
  service().signal(SIGSTOP);
  const std::vector<std::vector<std::string>> rows = {
      {"status"}, {"reporters"}, {"run"}, {"events", "--settled"}, {"events", "--wait=0.1"}};
  for (const auto& row : rows) {
    std::vector<std::string> words = {"--timeout", "0.1"};
    words.insert(words.end(), row.begin(), row.end());
    const Finished finished = ctl(words, "{\"op\":\"getAllReporters\"}\n");
    EXPECT_EQ(finished.status, 69) << row.front();
    EXPECT_NE(finished.complaints.find("does not answer within 0.1 s"), std::string::npos) << finished.complaints;
  }
  service().signal(SIGCONT);
  EXPECT_EQ(ctl({"status"}).status, 0);
}

TEST_F(Ctl, TheEnvironmentNamesTheSocket) {
  ASSERT_TRUE(startService());
  Process::Setup setup;
  setup.words = {TARNREPORTINGCTL, "status"};
  setup.environment = {"TARNREPORTING_SOCKET=" + socket()};
  const Finished finished = runToEnd(setup, directory_);
  EXPECT_EQ(finished.status, 0) << finished.complaints;
  EXPECT_TRUE(finished.output.starts_with("the service is up at " + socket() + "\n")) << finished.output;
}

TEST_F(Ctl, SettledEventsHoldAllThatCameBefore) {
  ASSERT_TRUE(startService());
  for (int round = 1; round <= 5; ++round) {
    play("{\"op\":\"sendMessage\",\"category\":\"Generic\",\"type\":\"Error\",\"message\":{\"a\":1}}\n");
    const Finished listed = ctl({"events", "--settled", "--json", "--name", "sys.oxbow.standalone.Generic.Error"});
    EXPECT_EQ(listed.status, 0) << listed.complaints;
    EXPECT_EQ(jsonLines(listed.output).size(), static_cast<std::size_t>(round));
  }
}

TEST_F(Ctl, EveryCommandHasItsHelp) {
  for (const std::vector<std::string>& words : {std::vector<std::string>{"--help"},
                                                {"run", "--help"},
                                                {"events", "--help"},
                                                {"defaults", "--help"},
                                                {"defaults", "read", "--help"},
                                                {"defaults", "write", "--help"},
                                                {"defaults", "delete", "--help"},
                                                {"notify", "--help"},
                                                {"reporters", "--help"},
                                                {"kill", "--help"},
                                                {"status", "--help"},
                                                {"sessions", "--help"},
                                                {"show", "--help"},
                                                {"export", "--help"},
                                                {"report", "--help"},
                                                {"top", "--help"},
                                                {"lint", "--help"},
                                                {"explain", "--help"}}) {
    const Finished finished = ctl(words);
    EXPECT_EQ(finished.status, 0) << words.front();
    EXPECT_NE(finished.output.find("tarnreportingctl"), std::string::npos) << words.front();
    EXPECT_EQ(finished.complaints, "");
  }
  EXPECT_TRUE(ctl({"--version"}).output.starts_with("tarnreportingctl "));
}

TEST_F(Ctl, RepliesAreOneObjectALineWithTheirFiveMembersInOrder) {
  ASSERT_TRUE(startService());
  const Finished played = ctl({"run"},
                              "\n{\"op\":\"createReportingSession\",\"reporterID\":1,\"client\":\"a\"}\n"
                              "{\"op\":\"sendMessage\",\"category\":1,\"type\":1,\"message\":{}}");
  EXPECT_EQ(played.status, 0) << played.complaints;
  EXPECT_EQ(played.output,
            "{\"client\":\"a\",\"line\":2,\"op\":\"createReportingSession\",\"error\":null,\"result\":true}\n"
            "{\"client\":\"main\",\"line\":3,\"op\":\"sendMessage\",\"error\":null,\"result\":null}\n");
}

TEST_F(Ctl, ABadLineStopsTheScriptWithFileAndLine) {
  ASSERT_TRUE(startService());
  const std::string path = directory_ / "bad.jsonl";
  writeFile(path,
            "{\"op\":\"createReportingSession\",\"reporterID\":1}\n{\"op\":\"nonsense\"}\n"
            "{\"op\":\"createReportingSession\",\"reporterID\":2}\n");
  const Finished played = ctl({"run", path});
  EXPECT_EQ(played.status, 65);
  EXPECT_EQ(jsonLines(played.output).size(), 1U);
  EXPECT_TRUE(played.complaints.starts_with(path + ":2: ")) << played.complaints;
  EXPECT_NE(played.complaints.find("expected"), std::string::npos) << played.complaints;
}

TEST_F(Ctl, AScriptThatIsNotThereIs65) {
  const Finished played = ctl({"run", directory_ / "none.jsonl"});
  EXPECT_EQ(played.status, 65);
  EXPECT_NE(played.complaints.find("none.jsonl"), std::string::npos);
}

TEST_F(Ctl, AServiceLostDuringAScriptIs69) {
  ASSERT_TRUE(startService());
  const auto script = startCtl({"run"}, "{\"op\":\"getAllReporters\"}\n{\"op\":\"sleep\",\"seconds\":60}\n");
  ASSERT_TRUE(eventually([&] { return !script->output().empty(); }));
  stopService(SIGKILL);
  EXPECT_EQ(script->wait(), 69);
  EXPECT_NE(script->complaints().find("stdin:2: "), std::string::npos) << script->complaints();
}

TEST_F(Ctl, AScriptMayEndTheService) {
  ASSERT_TRUE(startService());
  EXPECT_EQ(ctl({"run"}, "{\"op\":\"createReportingSession\",\"reporterID\":1}\n{\"op\":\"killService\"}\n").status, 0);
  EXPECT_EQ(service().wait(), 2);
}

TEST_F(Ctl, ALineBehindTheEndOfTheServiceIs69) {
  ASSERT_TRUE(startService());
  const Finished played = ctl({"run"}, "{\"op\":\"killService\"}\n{\"op\":\"getAllReporters\"}\n");
  EXPECT_EQ(played.status, 69);
  EXPECT_TRUE(played.complaints.starts_with("stdin:2: ")) << played.complaints;
}

TEST_F(Ctl, KillReturnsOnceTheServiceHasEnded) {
  ASSERT_TRUE(startService());
  EXPECT_EQ(ctl({"kill"}).status, 0);
  EXPECT_EQ(service().wait(std::chrono::seconds(2)), 2);
}

TEST_F(Ctl, AScriptIsPlayedWhileItComes) {
  ASSERT_TRUE(startService());
  std::array<int, 2> pipe{};
  ASSERT_EQ(::pipe2(pipe.data(), O_CLOEXEC), 0);
  Process::Setup setup;
  setup.words = {TARNREPORTINGCTL, "--socket", socket(), "run"};
  setup.inputFd = pipe[0];
  Process player(setup, directory_);
  ::close(pipe[0]);
  const std::string first = R"({"op":"createReportingSession","reporterID":1}
{"op":)";
  ASSERT_EQ(::write(pipe[1], first.data(), first.size()), static_cast<ssize_t>(first.size()));
  EXPECT_TRUE(eventually([&] { return jsonLines(player.output()).size() == 1; }));
  const std::string second = R"("getAllReporters"}
)";
  ASSERT_EQ(::write(pipe[1], second.data(), second.size()), static_cast<ssize_t>(second.size()));
  ::close(pipe[1]);
  EXPECT_EQ(player.wait(), 0);
  EXPECT_EQ(jsonLines(player.output()).size(), 2U);
}

TEST_F(Ctl, ALongScriptIsPlayedToItsEnd) {
  ASSERT_TRUE(startService());
  std::string script = "{\"op\":\"createReportingSession\",\"reporterID\":1}\n";
  for (int index = 0; index < 3000; ++index) {
    script += R"({"op":"sendMessage","reporterIDs":[1],"category":4,"type":1,"message":{"n":)" + std::to_string(index) +
              "}}\n";
  }
  EXPECT_EQ(play(script).size(), 3001U);
  EXPECT_EQ(eventsOnceThereAre(3000, "sys.oxbow.tarnkit.Playback.Start").size(), 3000U);
}

TEST_F(Ctl, AReaderThatLeavesEndsTheProgramWithoutAWord) {
  ASSERT_TRUE(startService());
  play("{\"op\":\"sendMessage\",\"category\":4,\"type\":1,\"message\":{}}\n");
  eventsOnceThereAre(2, "*.Playback.Start");
  for (const std::vector<std::string>& words :
       {std::vector<std::string>{"events"}, {"events", "--follow"}, {"status"}}) {
    std::array<int, 2> pipe{};
    ASSERT_EQ(::pipe2(pipe.data(), O_CLOEXEC), 0);
    ::close(pipe[0]);
    const auto process = startCtl(words, "", pipe[1]);
    ::close(pipe[1]);
    EXPECT_EQ(process->wait(), 0) << words.front();
    EXPECT_EQ(process->complaints(), "");
  }
}

TEST_F(Ctl, StatusAndReportersTellWhatIsThere) {
  ASSERT_TRUE(startService());
  const auto client = connect();
  ASSERT_TRUE(client->call(client::createReportingSession(-5)).ok());
  ASSERT_TRUE(client->call(client::createReportingSession(6)).ok());
  EXPECT_EQ(ctl({"reporters"}).output, "-5\n6\n");
  const json ledger = json::parse(ctl({"status", "--json"}).output);
  EXPECT_EQ(ledger.at("sessions"), 2);
  EXPECT_EQ(ledger.at("connections_open"), 2);
  const std::string text = ctl({"status"}).output;
  EXPECT_NE(text.find("the service is up"), std::string::npos) << text;
  EXPECT_NE(text.find("recorder_committed"), std::string::npos) << text;
}

TEST_F(Ctl, QuotasAreToldBeforeTheyAreUsedUpAndRefusalsNameThem) {
  const std::string file = directory_ / "service.toml";
  std::ofstream(file) << "[limits]\nsessions_per_connection = 2\n";
  ASSERT_TRUE(startService({"--config", file}));
  const auto client = connect();
  ASSERT_TRUE(client->call(client::createReportingSession(1)).ok());
  ASSERT_TRUE(client->call(client::createReportingSession(2)).ok());
  const std::string text = ctl({"status", "--quotas"}).output;
  EXPECT_NE(text.find("sessions_per_connection 2\n"), std::string::npos) << text;
  EXPECT_NE(text.find("uid " + std::to_string(::getuid()) + ": connections 2 sessions 2 waiting_bytes 0 log_bytes "),
            std::string::npos)
      << text;
  const json quotas = json::parse(ctl({"status", "--quotas", "--json"}).output);
  EXPECT_EQ(quotas.at("limits").at("sessions_per_connection"), 2);
  const client::Reply refused = client->call(client::createReportingSession(3));
  EXPECT_EQ(refused.outcome, client::Outcome::Error);
  EXPECT_EQ(refused.error.code, 4);
  EXPECT_EQ(refused.error.text, "over quota: sessions 2 of 2");
  EXPECT_TRUE(client->call(client::createReportingSession(2)).ok());
  EXPECT_EQ(status().at("requests_refused").at("over_quota"), 1);
}

}  // namespace
}  // namespace tarn::e2e
