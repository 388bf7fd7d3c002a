// SPDX-License-Identifier: Apache-2.0
// Whatever waits has a deadline: a service that is stuck holds nobody up for longer.
#include <gtest/gtest.h>
#include <sys/un.h>

#include <cerrno>
#include <chrono>

#include "tests/client/ScriptedServer.h"
#include "tests/host/ScratchFolder.h"

#include <tarnkit/TarnReportingClient.h>

namespace tarn::client {
namespace {

using testing::Pair;
using testing::Served;
using Clock = std::chrono::steady_clock;
using std::chrono::milliseconds;

constexpr milliseconds kShort(30);

Options impatient() {
  Options options;
  options.timeout = kShort;
  return options;
}

// Fills the socket and, a bit over it, the client's own buffer.
void clog(ClientConnection& client, const ReplyHandler& handler = {}) {
  const std::string text(60000, 'a');
  while (client.trySend(sendMessage({{"text", text}}, 4, 1), handler) == SendStatus::Sent) {
  }
}

TEST(Deadlines, AClientOfAnOutsiderWaitsTwoSeconds) {
  EXPECT_EQ(tarnkit::Options().timeout, std::chrono::seconds(2));
}

TEST(Deadlines, ACallGivesUpAfterTheTimeOfTheOptions) {
  Pair pair(impatient());
  const auto start = Clock::now();
  EXPECT_EQ(pair.client->call(getAllReporters()).outcome, Outcome::TimedOut);
  EXPECT_GE(Clock::now() - start, kShort);
}

TEST(Deadlines, ACallThatHearsOtherRepliesKeepsItsTime) {
  Pair pair(impatient());
  std::size_t heard = 0;
  for (int i = 0; i < 3; ++i) {
    pair.client->send(getAllReporters(), [&](Reply&&) { ++heard; });
  }
  pair.client->flush();
  pair.server->acknowledge(3);
  EXPECT_EQ(pair.client->call(getAllReporters()).outcome, Outcome::TimedOut);
  EXPECT_EQ(heard, 3U);
}

TEST(Deadlines, ACallWhoseRequestCannotBeWrittenGivesUp) {
  Pair pair(impatient());
  clog(*pair.client);
  EXPECT_EQ(pair.client->call(getAllReporters()).outcome, Outcome::TimedOut);
}

TEST(Deadlines, ASendWithoutRoomIsFullAfterItsTime) {
  Options options = impatient();
  options.maxOutgoingBytes = 65536;
  Pair pair(options);
  clog(*pair.client);
  EXPECT_EQ(pair.client->send(sendMessage({{"text", std::string(60000, 'a')}}, 4, 1)), SendStatus::Full);
  EXPECT_TRUE(pair.client->connected());
}

TEST(Deadlines, ASendOverTheCountIsFullAfterItsTime) {
  Options options = impatient();
  options.maxOutstanding = 1;
  Pair pair(options);
  EXPECT_EQ(pair.client->send(getAllReporters()), SendStatus::Sent);
  EXPECT_EQ(pair.client->send(getAllReporters()), SendStatus::Full);
}

TEST(Deadlines, AFlushGivesUpAndMayBeRepeated) {
  Pair pair;
  clog(*pair.client);
  EXPECT_FALSE(pair.client->flush(kShort));
  EXPECT_TRUE(pair.client->connected());
  EXPECT_TRUE(pair.client->wantsToWrite());
  const std::size_t waiting = pair.client->outstanding();
  const Served serving([&] { pair.server->acknowledge(waiting); });
  EXPECT_TRUE(pair.client->flush());
}

TEST(Deadlines, ADestructionWritesWhatIsWaiting) {
  Pair pair;
  constexpr std::size_t kMessages = 200;
  for (std::size_t i = 0; i < kMessages; ++i) {
    ASSERT_EQ(pair.client->trySend(sendMessage({{"text", std::string(9000, 'a')}}, 4, 1)), SendStatus::Sent);
  }
  std::size_t taken = 0;
  {
    const Served serving([&] {
      while (pair.server->take()) {
        ++taken;
      }
    });
    pair.client.reset();
  }
  EXPECT_EQ(taken, kMessages);
}

TEST(Deadlines, ADestructionGivesUpOnAServiceThatTakesNothing) {
  Pair pair(impatient());
  std::size_t cancelled = 0;
  clog(*pair.client, [&](Reply&& reply) { cancelled += reply.outcome == Outcome::Cancelled ? 1U : 0U; });
  const std::size_t outstanding = pair.client->outstanding();
  const auto start = Clock::now();
  pair.client.reset();
  EXPECT_GE(Clock::now() - start, kShort);
  EXPECT_GT(outstanding, 0U);
  EXPECT_EQ(cancelled, outstanding);
}

TEST(Deadlines, ConnectingGivesUpOnAListenerThatAcceptsNobody) {
  const testing::ScratchFolder folder;
  const std::string path = folder.file("socket");
  sockaddr_un address{};
  address.sun_family = AF_UNIX;
  path.copy(address.sun_path, sizeof address.sun_path - 1);
  const Socket listener(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
  ASSERT_EQ(::bind(listener.fd(), reinterpret_cast<const sockaddr*>(&address), sizeof address), 0);
  ASSERT_EQ(::listen(listener.fd(), 0), 0);
  std::vector<std::unique_ptr<ClientConnection>> others;
  for (;;) {
    auto connected = ClientConnection::connect(path, impatient());
    if (connected.failed()) {
      EXPECT_EQ(connected.error.code(), ETIMEDOUT);
      EXPECT_NE(connected.error.text().find(path), std::string::npos);
      break;
    }
    others.push_back(std::move(connected.value));
    ASSERT_LT(others.size(), 100U);
  }
}

TEST(Deadlines, AHandlerMayDestroyItsClient) {
  Pair pair;
  auto client = std::make_unique<tarnkit::TarnReportingClient>(std::move(pair.client));
  std::vector<tarnkit::Outcome> heard;
  client->send(tarnkit::getAllReporters(), [&](tarnkit::Reply&& reply) {
    heard.push_back(reply.outcome);
    client.reset();
  });
  client->send(tarnkit::getAllReporters(), [&](tarnkit::Reply&& reply) { heard.push_back(reply.outcome); });
  client->flush();
  pair.server->acknowledge(2);
  tarnkit::TarnReportingClient& used = *client;
  used.wait(std::chrono::seconds(60));
  EXPECT_EQ(client, nullptr);
  ASSERT_EQ(heard.size(), 2U);
  EXPECT_EQ(heard.front(), tarnkit::Outcome::Ok);
}

}  // namespace
}  // namespace tarn::client
