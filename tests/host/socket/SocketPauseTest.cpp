// SPDX-License-Identifier: Apache-2.0
// What happens while requests may not be taken.

#include <future>
#include <string>
#include <vector>

#include "tests/host/socket/SocketFixture.h"

namespace tarn::linux_host {
namespace {

class SocketPauseTest : public testing::SocketFixture {
 protected:
  // Steps that the loop makes until work that is delayed by this much runs.
  std::uint64_t stepsWithin(std::chrono::milliseconds time) {
    const auto before = running_.loop.progress().sample().steps;
    std::promise<void> over;
    running_.loop.queue()->asyncAfter(time, [&] { over.set_value(); });
    over.get_future().get();
    return running_.loop.progress().sample().steps - before;
  }
};

TEST_F(SocketPauseTest, APausedConnectionStopsAtItsHeadRequestAndGoesOnLater) {
  serve();
  paused = true;
  TestClient client(path_);
  client.send(encoded(1, messageRequest({{"a", 1}})) + encoded(2, messageRequest({{"a", 2}})));
  ASSERT_TRUE(eventually([&] { return held() == 1; }));
  EXPECT_TRUE(events().empty());
  resumeRequests();
  const auto first = client.reply();
  const auto second = client.reply();
  ASSERT_TRUE(first && second);
  EXPECT_EQ(first->id, 1u);
  EXPECT_EQ(second->id, 2u);
  EXPECT_TRUE(client.status());
}

TEST_F(SocketPauseTest, StatusOfOthersIsAnsweredWhilePausedAndNewClientsAreAccepted) {
  serve();
  TestClient other(path_);
  ASSERT_TRUE(other.status());
  paused = true;
  TestClient client(path_);
  client.request(1, messageRequest({{"a", 1}}));
  ASSERT_TRUE(eventually([&] { return held() == 1; }));
  EXPECT_TRUE(other.status());
  TestClient late(path_);
  EXPECT_TRUE(late.status());
  EXPECT_FALSE(client.readable(0));
  resumeRequests();
  EXPECT_TRUE(client.reply());
}

TEST_F(SocketPauseTest, RequestAfterOneThatShutTheGateIsHeld) {
  serve();
  running_.onQueue([this] { host_->gate.setPauseSource([this] { return paused && !service_->events.empty(); }); });
  paused = true;
  TestClient client(path_);
  client.send(encoded(1, requestOf(Operation::CreateReportingSession, 7)) +
              encoded(2, requestOf(Operation::CreateReportingSession, 8)));
  ASSERT_TRUE(eventually([&] { return held() == 1; }));
  EXPECT_EQ(events(), std::vector<std::string>{"1 createReportingSession 7"});
  resumeRequests();
  EXPECT_TRUE(client.reply());
  EXPECT_TRUE(client.reply());
}

TEST_F(SocketPauseTest, StatusBehindAHeldRequestWaitsForIt) {
  serve();
  paused = true;
  TestClient client(path_);
  client.send(encoded(1, messageRequest({{"a", 1}})) + encoded(2, requestOf(Operation::Status)));
  ASSERT_TRUE(eventually([&] { return held() == 1; }));
  EXPECT_FALSE(client.readable(0));
  resumeRequests();
  // Status is the host's own, so it may overtake; both come.
  const auto first = client.reply();
  const auto second = client.reply();
  ASSERT_TRUE(first && second);
  EXPECT_EQ(first->id + second->id, 3u);
}

TEST_F(SocketPauseTest, TimersGoOnWhilePaused) {
  serve();
  paused = true;
  TestClient client(path_);
  client.request(1, messageRequest({{"a", 1}}));
  ASSERT_TRUE(eventually([&] { return held() == 1; }));
  std::promise<void> ran;
  running_.loop.queue()->asyncAfter(std::chrono::milliseconds(2), [&] { ran.set_value(); });
  EXPECT_EQ(ran.get_future().wait_for(std::chrono::seconds(20)), std::future_status::ready);
}

TEST_F(SocketPauseTest, APausedLoopSleepsAlthoughInputWaits) {
  serve();
  paused = true;
  TestClient client(path_);
  client.request(1, messageRequest({{"a", 1}}));
  ASSERT_TRUE(eventually([&] { return held() == 1; }));
  client.request(2, messageRequest({{"a", 2}}));
  auto& progress = running_.loop.progress();
  // A loop that spins over the unread input would make many thousands of steps in this time.
  ASSERT_TRUE(eventually([&] { return progress.sample().idle; }));
  EXPECT_LT(stepsWithin(std::chrono::milliseconds(100)), 20u);
  resumeRequests();
  EXPECT_TRUE(client.reply());
  EXPECT_TRUE(client.reply());
}

TEST_F(SocketPauseTest, AClientThatLeavesWhilePausedIsServedThenInvalidated) {
  serve();
  paused = true;
  {
    TestClient client(path_);
    client.send(encoded(1, requestOf(Operation::StartReportingSessionForID, 1)) +
                encoded(2, requestOf(Operation::StartReportingSessionForID, 2)));
    ASSERT_TRUE(eventually([&] { return held() == 1; }));
  }
  auto& progress = running_.loop.progress();
  ASSERT_TRUE(eventually([&] { return progress.sample().idle; }));
  EXPECT_LT(stepsWithin(std::chrono::milliseconds(50)), 20u);
  resumeRequests();
  ASSERT_TRUE(eventuallyHappens("1 invalidated"));
  EXPECT_EQ(events(), (std::vector<std::string>{"1 startReportingSessionForID 1", "1 startReportingSessionForID 2",
                                                "1 invalidated"}));
}

TEST_F(SocketPauseTest, RepliesGoOutToAPausedClient) {
  serve();
  TestClient client(path_);
  client.request(1, requestOf(Operation::StartReportingSessionForID, 1));
  ASSERT_TRUE(eventuallyHappens("1 startReportingSessionForID 1"));
  paused = true;
  client.request(2, messageRequest({{"a", 1}}));
  ASSERT_TRUE(eventually([&] { return held() == 1; }));
  running_.onQueue([this] { service_->heldStarts.at(0).reply(std::nullopt, true); });
  const auto reply = client.reply();
  ASSERT_TRUE(reply);
  EXPECT_EQ(reply->id, 1u);
  resumeRequests();
  EXPECT_TRUE(client.reply());
}

TEST_F(SocketPauseTest, TheQueueStaysWithinItsBoundWhateverClientsSend) {
  limits.maxQueuedWork = 8;
  serve();
  TestClient client(path_);
  std::string bytes;
  for (std::uint64_t id = 0; id < 1000; ++id) {
    bytes += encoded(id, requestOf(Operation::CreateReportingSession, 1));
  }
  ASSERT_TRUE(client.send(bytes));
  for (std::uint64_t id = 0; id < 1000; ++id) {
    const auto reply = client.reply();
    ASSERT_TRUE(reply);
    ASSERT_EQ(reply->id, id);
  }
  EXPECT_LE(running_.onQueue([this] { return service_->mostWaiting; }), 8u);
}

}  // namespace
}  // namespace tarn::linux_host
