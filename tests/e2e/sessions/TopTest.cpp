// SPDX-License-Identifier: Apache-2.0
// tarnreportingctl top as people and scripts see it, beside a real service: idle, busy, gone and back.
#include <fcntl.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <csignal>
#include <sstream>

#include "tests/e2e/support/PseudoTerminal.h"
#include "tests/e2e/support/ServiceFixture.h"

namespace tarn::e2e {
namespace {

class Top : public ServiceFixture {
 protected:
  // Whole lines that it has printed so far.
  static std::vector<json> linesOf(const Process& top) {
    const std::string output = top.output();
    return jsonLines(output.substr(0, output.rfind('\n') + 1));
  }
  // Whether a line comes of which that holds.
  static bool comes(const Process& top, const std::function<bool(const json&)>& holds) {
    return eventually([&] {
      const auto lines = linesOf(top);
      return std::any_of(lines.begin(), lines.end(), holds);
    });
  }
  // A client with a running session of an application.
  std::unique_ptr<client::ClientConnection> player(std::int64_t reporter, const std::string& application) {
    auto client = connect();
    EXPECT_TRUE(client->call(client::createReportingSession(reporter)).ok());
    plist::Dictionary configuration{{"HostApplicationDisplayID", application}};
    EXPECT_TRUE(client->call(client::setConfiguration(std::move(configuration), reporter)).ok());
    EXPECT_EQ(client->send(client::startReportingSessionForID(reporter)), client::SendStatus::Sent);
    EXPECT_TRUE(client->call(client::status()).ok());
    return client;
  }
  static void sendMessages(client::ClientConnection& client, std::int64_t reporter, int count) {
    for (int index = 0; index < count; ++index) {
      const plist::Dictionary message{{"n", std::int64_t{index}}};
      client.send(client::sendMessage(message, 4, 1, std::vector<std::int64_t>{reporter}));
    }
    EXPECT_TRUE(client.flush(kDeadline));
  }
};

const json* sessionOf(const json& line, std::int64_t reporter) {
  for (const json& session : line.at("sessions")) {
    if (session.at("reporter") == reporter) return &session;
  }
  return nullptr;
}

TEST_F(Top, PrintsOneObjectALine) {
  ASSERT_TRUE(startService());
  const Finished finished = ctl({"top", "--json", "--count", "2", "--interval", "0.05"});
  EXPECT_EQ(finished.status, 0) << finished.complaints;
  const std::vector<json> lines = jsonLines(finished.output);
  ASSERT_EQ(lines.size(), 2U);
  EXPECT_EQ(lines[0].at("up"), true);
  EXPECT_EQ(lines[0].at("status").at("connections_open"), 1);
  EXPECT_TRUE(lines[0].at("rates").empty());
  EXPECT_GT(lines[1].at("rates").at("replies_sent"), 0);
  EXPECT_FALSE(lines[1].at("status").contains("quotas"));
}

TEST_F(Top, PrintsViewsWithAnEmptyLineBetween) {
  ASSERT_TRUE(startService());
  const Finished finished = ctl({"top", "--count", "2", "--interval", "0.05"});
  EXPECT_EQ(finished.status, 0) << finished.complaints;
  EXPECT_NE(finished.output.find("UTC  the service is up\nlevels  "), std::string::npos) << finished.output;
  EXPECT_NE(finished.output.find("\n\n20"), std::string::npos) << finished.output;
  EXPECT_EQ(finished.output.find('\x1b'), std::string::npos);
}

TEST_F(Top, WritesATerminalAnewWithoutAskingForMoreRoomThanItHas) {
  ASSERT_TRUE(startService());
  std::vector<std::unique_ptr<client::ClientConnection>> clients;
  for (std::int64_t reporter = 1; reporter <= 40; ++reporter) {
    clients.push_back(player(reporter, "org.example.an.application.with.a.long.name"));
  }
  PseudoTerminal terminal(60, 24);
  const auto top = startCtl({"top", "--count", "2", "--interval", "0.05"}, "", terminal.fd());
  EXPECT_EQ(top->wait(), 0) << top->complaints();
  const std::string& written = terminal.written();
  const std::string clear = "\x1b[H\x1b[2J";
  const std::size_t second = written.rfind(clear);
  ASSERT_NE(second, std::string::npos);
  EXPECT_EQ(written.find(clear), 0U);
  EXPECT_NE(second, 0U);
  std::istringstream view(written.substr(second + clear.size()));
  std::size_t lines = 0;
  for (std::string line; std::getline(view, line); ++lines) {
    std::size_t width = 0;
    for (const char byte : line) {
      width += (static_cast<unsigned char>(byte) & 0xC0U) != 0x80U && byte != '\r' ? 1 : 0;
    }
    EXPECT_LE(width, 60U) << line;
  }
  EXPECT_LT(lines, 24U);
  EXPECT_NE(written.find(" more\r\n"), std::string::npos) << written;
}

TEST_F(Top, WithoutAServiceIs69) {
  const Finished finished = ctl({"top", "--count", "1"});
  EXPECT_EQ(finished.status, 69);
  EXPECT_EQ(finished.output, "");
  EXPECT_NE(finished.complaints.find(socket()), std::string::npos) << finished.complaints;
}

TEST_F(Top, ShowsTheSessionsOfABusyServiceTheBusiestFirst) {
  ASSERT_TRUE(startService());
  const auto idle = player(1, "org.example.idle");
  const auto slow = player(2, "org.example.slow");
  const auto busy = player(3, "org.example.busy");
  const auto top = startCtl({"top", "--json", "--interval", "0.05"});
  const auto isShown = [](const json& line) {
    if (line.at("sessions").size() != 3 || !line.at("sessions").at(0).contains("rate")) return false;
    const json* first = &line.at("sessions").at(0);
    const json* second = &line.at("sessions").at(1);
    return first->at("application") == "org.example.busy" && second->at("application") == "org.example.slow" &&
           first->at("rate") > second->at("rate") && second->at("rate") > 0 && first->at("last") == "Playback.Start" &&
           sessionOf(line, 1)->at("rate") == 0 && line.at("rates").contains("messages_received") &&
           line.at("rates").at("messages_received") > 0;
  };
  const bool wasShown = eventually([&] {
    sendMessages(*slow, 2, 20);
    sendMessages(*busy, 3, 2000);
    const auto lines = linesOf(*top);
    return std::any_of(lines.begin(), lines.end(), isShown);
  });
  EXPECT_TRUE(wasShown) << (linesOf(*top).empty() ? "" : linesOf(*top).back().dump());
  top->signal(SIGINT);
  EXPECT_EQ(top->wait(), 0);
  EXPECT_EQ(top->complaints(), "");
}

TEST_F(Top, ShowsThatTheServiceEndedAndThatItIsBack) {
  ASSERT_TRUE(startService());
  const auto top = startCtl({"top", "--json", "--interval", "0.05"});
  ASSERT_TRUE(comes(*top, [](const json& line) { return line.at("up") == true; }));
  EXPECT_EQ(stopService(SIGTERM), 0);
  EXPECT_TRUE(comes(*top, [this](const json& line) {
    return line.at("up") == false && line.at("why_not").get<std::string>().find(socket()) != std::string::npos;
  }));
  const std::size_t linesBefore = linesOf(*top).size();
  ASSERT_TRUE(startService());
  EXPECT_TRUE(eventually([&] {
    const auto lines = linesOf(*top);
    return lines.size() > linesBefore && lines.back().at("up") == true;
  }));
  top->signal(SIGTERM);
  EXPECT_EQ(top->wait(), 0);
  EXPECT_EQ(top->complaints(), "");
}

TEST_F(Top, GoesOnBesideAServiceThatIsKilledInAFlood) {
  ASSERT_TRUE(startService());
  const auto busy = player(3, "org.example.busy");
  const auto top = startCtl({"top", "--json", "--interval", "0.05"});
  sendMessages(*busy, 3, 5000);
  ASSERT_TRUE(comes(*top, [](const json& line) { return sessionOf(line, 3) != nullptr; }));
  stopService(SIGKILL);
  EXPECT_TRUE(comes(*top, [](const json& line) { return line.at("up") == false; }));
  ASSERT_TRUE(startService());
  // The next run has closed what that one left.
  EXPECT_TRUE(eventually([&] {
    const auto lines = linesOf(*top);
    return lines.back().at("up") == true && sessionOf(lines.back(), 3) == nullptr;
  }));
  top->signal(SIGTERM);
  EXPECT_EQ(top->wait(), 0);
  EXPECT_EQ(top->complaints(), "");
}

TEST_F(Top, TellsOfAServiceThatDoesNotAnswer) {
  ASSERT_TRUE(startService());
  const auto top = startCtl({"--timeout", "0.1", "top", "--json", "--interval", "0.05"});
  ASSERT_TRUE(comes(*top, [](const json& line) { return line.at("up") == true; }));
  service().signal(SIGSTOP);
  EXPECT_TRUE(comes(*top, [](const json& line) {
    return line.at("up") == false &&
           line.at("why_not").get<std::string>().find("does not answer within 0.1 s") != std::string::npos;
  }));
  service().signal(SIGCONT);
  top->signal(SIGTERM);
  EXPECT_EQ(top->wait(), 0);
}

TEST_F(Top, EndsQuietlyWhenItIsInterrupted) {
  ASSERT_TRUE(startService());
  const auto top = startCtl({"top", "--json", "--interval", "60"});
  ASSERT_TRUE(eventually([&] { return !top->output().empty(); }));
  top->signal(SIGINT);
  EXPECT_EQ(top->wait(), 0);
  EXPECT_EQ(top->complaints(), "");
}

TEST_F(Top, EndsQuietlyWhenNobodyReads) {
  ASSERT_TRUE(startService());
  std::array<int, 2> pipe{};
  ASSERT_EQ(::pipe2(pipe.data(), O_CLOEXEC), 0);
  const auto top = startCtl({"top", "--interval", "60"}, "", pipe[1]);
  ::close(pipe[1]);
  char byte = 0;
  ASSERT_EQ(::read(pipe[0], &byte, 1), 1);
  ::close(pipe[0]);
  EXPECT_EQ(top->wait(), 0);
  EXPECT_EQ(top->complaints(), "");
}

TEST_F(Top, RefusesNonsense) {
  for (const std::vector<std::string>& words : {std::vector<std::string>{"top", "--count", "0"},
                                                {"top", "--count", "-1"},
                                                {"top", "--interval", "0"},
                                                {"top", "--interval", "nan"},
                                                {"top", "now"}}) {
    const Finished finished = ctl(words);
    EXPECT_EQ(finished.status, 64) << words.back();
    EXPECT_EQ(finished.output, "") << words.back();
  }
}

}  // namespace
}  // namespace tarn::e2e
