// SPDX-License-Identifier: Apache-2.0
// Clients that send garbage, stop in the middle, don't read, come in crowds; and a system that has no descriptors left.

#include <sys/resource.h>
#include <unistd.h>

#include <thread>

#include "host/system/DescriptorLimit.h"
#include "tests/host/socket/SocketFixture.h"

namespace tarn::linux_host {
namespace {

using namespace std::string_literals;
using testing::framed;

class SocketFaultTest : public testing::SocketFixture {
 protected:
  // The error code that answers this frame, after which the same connection serves on; 0 when it went otherwise.
  std::int64_t refusalOf(const std::string& body) {
    TestClient client(path_);
    client.send(framed(body));
    const auto reply = client.reply();
    if (!reply || !reply->error || reply->error->domain != wire::kErrorDomain || !client.status()) return 0;
    EXPECT_EQ(reply->id, 7u);
    EXPECT_EQ(errorLines(), 0u);
    return reply->error->code;
  }
  // These bytes cut off their sender for this reason, with one error line, and nobody else.
  void expectCut(const std::string& bytes, CutReason reason) {
    serve();
    TestClient other(path_);
    EXPECT_TRUE(other.status());
    TestClient client(path_);
    client.send(bytes);
    EXPECT_TRUE(client.ended());
    EXPECT_TRUE(eventuallyHappens("2 invalidated"));
    EXPECT_EQ(events(), (std::vector<std::string>{"2 interrupted", "2 invalidated"}));
    EXPECT_EQ(cuts(reason), 1u);
    EXPECT_EQ(errorLines(), 1u);
    EXPECT_TRUE(log_.contains(platform::LogLevel::Error, "cut off connection 2 of process"));
    EXPECT_TRUE(other.status());
  }
};

TEST_F(SocketFaultTest, AnUnknownOperationIsAnswered) {
  serve();
  EXPECT_EQ(refusalOf("\x82\x07\x18\x32"s), 1);
  EXPECT_EQ(ledger().requestsRefused[0], 1u);
}

TEST_F(SocketFaultTest, AWrongCountOfArgumentsIsAnswered) {
  serve();
  EXPECT_EQ(refusalOf("\x82\x07\x01"s), 2);
  EXPECT_EQ(ledger().requestsRefused[1], 1u);
}

TEST_F(SocketFaultTest, AValueThatIsNoPropertyListIsAnswered) {
  serve();
  EXPECT_EQ(refusalOf("\x86\x07\x06\xa1\x61\x61\xf6\x01\x02\xf6"s), 3);
  EXPECT_EQ(ledger().requestsRefused[2], 1u);
}

TEST_F(SocketFaultTest, AFrameThatIsNoArrayCutsOnlyItsSender) {
  expectCut(framed("\x01"s), CutReason::UnreadableFrame);
}

TEST_F(SocketFaultTest, AFrameWithoutAReadableIdCutsOnlyItsSender) {
  expectCut(framed("\x82\x61\x61\x0a"s), CutReason::UnreadableFrame);
}

TEST_F(SocketFaultTest, BytesBehindTheArrayCutOnlyTheirSender) {
  expectCut(framed("\x82\x07\x0a\x00"s), CutReason::UnreadableFrame);
}

TEST_F(SocketFaultTest, AnEmptyFrameCutsOnlyItsSender) {
  expectCut(framed(""s), CutReason::UnreadableFrame);
}

TEST_F(SocketFaultTest, AnOversizeFrameIsCutBeforeItsBytesCome) {
  expectCut("\x01\x00\x10\x00"s, CutReason::OversizeFrame);
  EXPECT_TRUE(log_.contains("frame of 1048577 bytes, 1048576 are allowed"));
}

TEST_F(SocketFaultTest, AConfiguredFrameLimitCounts) {
  limits.maxFrameBytes = 100;
  expectCut("\x65\x00\x00\x00"s, CutReason::OversizeFrame);
}

TEST_F(SocketFaultTest, FramesBeforeTheGarbageAreServedAndNoneBehindIt) {
  serve();
  TestClient client(path_);
  client.send(encoded(1, messageRequest({{"a", 1}})) + framed("\x01"s) + encoded(2, messageRequest({{"a", 2}})));
  ASSERT_TRUE(eventuallyHappens("1 invalidated"));
  EXPECT_EQ(events(), (std::vector<std::string>{"1 sendMessage {a = 1} 3 4 none", "1 interrupted", "1 invalidated"}));
}

TEST_F(SocketFaultTest, HalfAFrameThatWaitsCostsNobodyElseTime) {
  serve();
  const auto frame = encoded(3, messageRequest({{"key", "value"}}));
  TestClient slow(path_);
  slow.send(frame.substr(0, 2));
  TestClient other(path_);
  for (std::uint64_t id = 0; id < 50; ++id) {
    ASSERT_TRUE(other.ask(id, messageRequest({{"a", 1}})));
  }
  slow.send(frame.substr(2, 7));
  ASSERT_TRUE(other.status());
  slow.send(frame.substr(9));
  const auto reply = slow.reply();
  ASSERT_TRUE(reply);
  EXPECT_EQ(reply->id, 3u);
}

TEST_F(SocketFaultTest, AClientThatVanishesInTheMiddleOfAFrameIsLoggedOnce) {
  serve();
  {
    TestClient client(path_);
    client.send(encoded(1, messageRequest({{"a", 1}})).substr(0, 6));
  }
  ASSERT_TRUE(eventuallyHappens("1 invalidated"));
  EXPECT_EQ(events(), (std::vector<std::string>{"1 interrupted", "1 invalidated"}));
  EXPECT_EQ(cuts(CutReason::HalfFrame), 1u);
  EXPECT_EQ(errorLines(), 1u);
}

TEST_F(SocketFaultTest, AClientThatNeverReadsIsCutOff) {
  limits.maxUnreadReplyBytes = 65536;
  serve();
  running_.onQueue([this] { service_->replyPadding = 10000; });
  TestClient client(path_);
  TestClient other(path_);
  std::uint64_t sent = 0;
  while (sent < 1000 && client.request(sent, requestOf(Operation::ReporterID, 1))) {
    ++sent;
  }
  ASSERT_TRUE(eventuallyHappens("1 invalidated"));
  EXPECT_EQ(cuts(CutReason::UnreadReplies), 1u);
  EXPECT_EQ(errorLines(), 1u);
  EXPECT_TRUE(log_.contains(platform::LogLevel::Error, "bytes of replies left unread"));
  EXPECT_TRUE(other.status());
}

TEST_F(SocketFaultTest, AClientThatReadsLateLosesNothingBelowTheLimit) {
  serve();
  running_.onQueue([this] { service_->replyPadding = 10000; });
  TestClient client(path_);
  for (std::uint64_t id = 0; id < 100; ++id) {  // more than the socket holds, less than the limit
    ASSERT_TRUE(client.request(id, requestOf(Operation::ReporterID, 1)));
  }
  ASSERT_TRUE(eventually([&] { return events().size() == 100; }));
  for (std::uint64_t id = 0; id < 100; ++id) {
    const auto reply = client.reply();
    ASSERT_TRUE(reply);
    ASSERT_EQ(reply->id, id);
  }
  EXPECT_TRUE(eventually([&] { return ledger().repliesSent == 100; }));
}

TEST_F(SocketFaultTest, FiveHundredConnectionsAreServed) {
  if (raiseDescriptorLimit() < 1200) {
    FAIL() << "the machine's limit of open descriptors is too low for this test";
  }
  serve();
  std::vector<std::unique_ptr<TestClient>> clients;
  for (int i = 0; i < 500; ++i) {
    clients.push_back(std::make_unique<TestClient>(path_));
    ASSERT_TRUE(clients.back()->connected());
  }
  for (auto& client : clients) {
    ASSERT_TRUE(client->request(1, messageRequest({{"a", 1}})));
  }
  for (auto& client : clients) {
    ASSERT_TRUE(client->reply());
  }
  EXPECT_EQ(ledger().connectionsOpen, 500u);
  clients.clear();
  EXPECT_TRUE(eventually([&] { return ledger().connectionsOpen == 0; }));
  EXPECT_EQ(errorLines(), 0u);
}

TEST_F(SocketFaultTest, BeyondTheConnectionLimitClientsWaitForRoom) {
  limits.maxConnections = 2;
  serve();
  auto first = std::make_unique<TestClient>(path_);
  TestClient second(path_);
  ASSERT_TRUE(first->status() && second.status());
  TestClient third(path_);
  ASSERT_TRUE(third.request(1, messageRequest({{"a", 1}})));
  ASSERT_TRUE(eventually([&] { return ledger().acceptPauses >= 2; }));
  EXPECT_FALSE(third.readable(0));
  EXPECT_EQ(errorLines(), 1u);
  first.reset();
  EXPECT_TRUE(third.reply());
  EXPECT_TRUE(log_.contains("accepting clients again"));
}

TEST_F(SocketFaultTest, WithoutDescriptorsClientsWaitAndTheLogTellsItOnce) {
  serve();
  TestClient other(path_);
  ASSERT_TRUE(other.status());
  TestClient client;  // has its descriptor already
  rlimit before{};
  ASSERT_EQ(::getrlimit(RLIMIT_NOFILE, &before), 0);
  const int lowestFree = ::dup(0);
  ::close(lowestFree);
  rlimit none = before;
  none.rlim_cur = static_cast<rlim_t>(lowestFree);
  ASSERT_EQ(::setrlimit(RLIMIT_NOFILE, &none), 0);
  EXPECT_TRUE(client.connect(path_));
  EXPECT_TRUE(eventually([&] { return ledger().acceptPauses >= 3; }));
  EXPECT_TRUE(other.status());
  EXPECT_EQ(errorLines(), 1u);
  ASSERT_EQ(::setrlimit(RLIMIT_NOFILE, &before), 0);
  EXPECT_TRUE(client.status());
  EXPECT_TRUE(log_.contains("accepting clients again"));
}

TEST_F(SocketFaultTest, ClientsThatComeAndVanishAllTheTimeLeaveNothingBehind) {
  serve();
  std::vector<std::thread> threads;
  for (int thread = 0; thread < 4; ++thread) {
    threads.emplace_back([this, thread] {
      for (int round = 0; round < 100; ++round) {
        TestClient client(path_);
        client.send(encoded(1, messageRequest({{"a", 1}})).substr(0, static_cast<std::size_t>(5 * thread + round % 9)));
      }
    });
  }
  for (auto& thread : threads) {
    thread.join();
  }
  EXPECT_TRUE(eventually([&] {
    const auto counts = ledger();
    return counts.connectionsTotal == 400 && counts.connectionsOpen == 0;
  }));
  TestClient client(path_);
  EXPECT_TRUE(client.status());
}

}  // namespace
}  // namespace tarn::linux_host
