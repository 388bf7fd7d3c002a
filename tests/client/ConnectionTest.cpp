// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>
#include <sys/un.h>

#include <cerrno>
#include <cstdlib>
#include <filesystem>

#include "tests/client/ScriptedServer.h"

namespace tarn::client {
namespace {

using testing::Outcomes;
using testing::Pair;
using testing::ScriptedServer;
using testing::Served;
using Strings = std::vector<std::string>;

class SocketPath {
 public:
  SocketPath() {
    std::string pattern = (std::filesystem::temp_directory_path() / "tarnclient.XXXXXX").string();
    directory_ = ::mkdtemp(pattern.data());
  }
  ~SocketPath() { std::filesystem::remove_all(directory_); }
  SocketPath(const SocketPath&) = delete;
  SocketPath& operator=(const SocketPath&) = delete;
  std::string path() const { return directory_ + "/s"; }

 private:
  std::string directory_;
};

int listenAt(const std::string& path) {
  sockaddr_un address{};
  address.sun_family = AF_UNIX;
  path.copy(address.sun_path, sizeof address.sun_path - 1);
  const int fd = ::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
  if (::bind(fd, reinterpret_cast<const sockaddr*>(&address), sizeof address) != 0 || ::listen(fd, 5) != 0) return -1;
  return fd;
}

TEST(ClientConnection, ConnectsToAListeningSocket) {
  const SocketPath place;
  const int listener = listenAt(place.path());
  ASSERT_GE(listener, 0);
  const auto connected = ClientConnection::connect(place.path());
  ASSERT_TRUE(connected.ok()) << connected.error->text;
  EXPECT_TRUE(connected.value->connected());
  ScriptedServer server(::accept(listener, nullptr, nullptr));
  const Served serving([&] { server.acknowledge(1); });
  EXPECT_TRUE(connected.value->call(createReportingSession(5)).ok());
  ::close(listener);
}

TEST(ClientConnection, SaysWhyItCannotConnect) {
  const SocketPath place;
  const auto missing = ClientConnection::connect(place.path());
  EXPECT_EQ(missing.value, nullptr);
  EXPECT_EQ(missing.error.code(), ENOENT);
  EXPECT_NE(missing.error.text().find(place.path()), std::string::npos);
  ::close(listenAt(place.path()));
  EXPECT_EQ(ClientConnection::connect(place.path()).error.code(), ECONNREFUSED);
  EXPECT_EQ(ClientConnection::connect(std::string(200, 'x')).error.code(), ENAMETOOLONG);
  EXPECT_EQ(ClientConnection::connect("").value, nullptr);
}

TEST(ClientConnection, ALostConnectionFailsEverythingOutstandingThenTellsTheOwner) {
  Outcomes outcomes;
  Pair pair;
  Strings lost;
  pair.client->setLostHandler([&](const std::string& why) {
    lost.push_back(why);
    EXPECT_EQ(outcomes.heard().size(), 3U);
  });
  pair.client->send(startReportingSessionForID(5), outcomes.handler("start"));
  pair.client->send(getAllReporters(), outcomes.handler("all"));
  pair.client->send(reporterID(5), outcomes.handler("valid"));
  pair.server->hangUp();
  while (pair.client->connected()) {
    pair.client->wait(std::chrono::seconds(5));
  }
  EXPECT_EQ(outcomes.heard(), (Strings{"start connection lost", "all connection lost", "valid connection lost"}));
  EXPECT_EQ(lost, Strings{"the service ended the connection"});
  EXPECT_EQ(pair.client->outstanding(), 0U);
  EXPECT_EQ(pair.client->fd(), -1);
}

TEST(ClientConnection, RepliesThatCameBeforeTheEndAreStillDelivered) {
  Outcomes outcomes;
  Pair pair;
  pair.client->send(getAllReporters(), outcomes.handler("first"));
  pair.client->send(getAllReporters(), outcomes.handler("second"));
  pair.client->flush();
  const auto first = pair.server->take();
  ASSERT_TRUE(first.has_value());
  pair.server->reply(first->id);
  pair.server->hangUp();
  pair.client->trySend(getAllReporters(), outcomes.handler("third"));
  while (pair.client->connected()) {
    pair.client->dispatch();
  }
  EXPECT_EQ(outcomes.heard(), (Strings{"first ok", "second connection lost", "third connection lost"}));
}

TEST(ClientConnection, ACallOnALostConnectionSaysSo) {
  Pair pair;
  pair.server->hangUp();
  EXPECT_EQ(pair.client->call(getAllReporters()).outcome, Outcome::ConnectionLost);
  EXPECT_EQ(pair.client->call(getAllReporters()).outcome, Outcome::ConnectionLost);
  EXPECT_EQ(pair.client->send(getAllReporters()), SendStatus::NotConnected);
  EXPECT_EQ(pair.client->wait(std::chrono::seconds(5)), 0U);
}

TEST(ClientConnection, ABrokenPipeRaisesNoSignal) {
  Options options;
  options.autoFlushBytes = 0;
  Pair pair(options);
  pair.server->hangUp();
  Outcomes outcomes;
  EXPECT_EQ(pair.client->trySend(getAllReporters(), outcomes.handler("first")), SendStatus::Sent);
  EXPECT_EQ(pair.client->trySend(getAllReporters()), SendStatus::NotConnected);
  EXPECT_TRUE(outcomes.heard().empty());  // trySend calls no handler
  pair.client->dispatch();
  EXPECT_EQ(outcomes.heard(), Strings{"first connection lost"});
}

TEST(ClientConnection, AnUnreadableReplyEndsTheConnectionAndSaysWhy) {
  Pair pair;
  std::string why;
  pair.client->setLostHandler([&](const std::string& text) { why = text; });
  pair.server->write(std::string("\1\0\0\0\xF6", 5));
  pair.client->wait(std::chrono::seconds(5));
  EXPECT_FALSE(pair.client->connected());
  EXPECT_EQ(why, "an unreadable reply: not a reply array");
}

TEST(ClientConnection, AReplyOverTheLimitEndsTheConnection) {
  Options options;
  options.maxReplyBytes = 10;
  Pair pair(options);
  std::string why;
  pair.client->setLostHandler([&](const std::string& text) { why = text; });
  pair.server->write(std::string("\x0B\0\0\0", 4));
  pair.client->wait(std::chrono::seconds(5));
  EXPECT_EQ(why, "a reply of 11 bytes is too long");
}

TEST(ClientConnection, CloseCancelsEverythingOutstanding) {
  Outcomes outcomes;
  Pair pair;
  bool lost = false;
  pair.client->setLostHandler([&](const std::string&) { lost = true; });
  pair.client->send(startReportingSessionForID(5), outcomes.handler("start"));
  pair.client->send(getAllReporters(), outcomes.handler("all"));
  pair.client->close();
  EXPECT_EQ(outcomes.heard(), (Strings{"start cancelled", "all cancelled"}));
  EXPECT_FALSE(lost);
  EXPECT_EQ(pair.client->send(getAllReporters()), SendStatus::NotConnected);
}

TEST(ClientConnection, DestructionCancelsToo) {
  Outcomes outcomes;
  {
    Pair pair;
    pair.client->send(startReportingSessionForID(5), outcomes.handler("start"));
  }
  EXPECT_EQ(outcomes.heard(), Strings{"start cancelled"});
}

TEST(ClientConnection, AHandlerMayClose) {
  Outcomes outcomes;
  Pair pair;
  pair.client->send(getAllReporters(), [&](Reply&&) { pair.client->close(); });
  pair.client->send(getAllReporters(), outcomes.handler("other"));
  pair.client->flush();
  pair.server->acknowledge(2);
  pair.client->wait(std::chrono::seconds(5));
  EXPECT_EQ(outcomes.heard(), Strings{"other cancelled"});
}

TEST(ClientConnection, TheEndOfTheConnectionIsTheReplyToKillService) {
  Outcomes outcomes;
  Pair pair;
  pair.client->send(getAllReporters(), outcomes.handler("other"));
  const Served serving([&] {
    while (const auto request = pair.server->take()) {
      if (request->operation == wire::Operation::KillService) break;
    }
    pair.server->hangUp();
  });
  EXPECT_TRUE(pair.client->call(killService()).ok());
  EXPECT_EQ(outcomes.heard(), Strings{"other connection lost"});
}

}  // namespace
}  // namespace tarn::client
