// SPDX-License-Identifier: Apache-2.0
// The sockets while a piece of work on the server queue waits on purpose; run under ThreadSanitizer as well.

#include <future>
#include <thread>

#include "host/loop/LinuxConditions.h"
#include "tests/host/socket/SocketFixture.h"

namespace tarn::linux_host {
namespace {

using namespace std::chrono_literals;
using testing::encoded;
using testing::eventually;
using testing::messageRequest;
using testing::requestOf;
using testing::TestClient;
using wire::Operation;

class DeliberateWait : public testing::SocketFixture {
 protected:
  // Hands over a piece of work that waits until endWait(), and comes back once it waits.
  void beginWait() {
    running_.loop.queue()->async([this] {
      condition_->lock();
      while (!over_) {
        condition_->waitFor(60s);
      }
      condition_->unlock();
    });
    ASSERT_TRUE(eventually([this] { return running_.loop.progress().sample().waitingSince.has_value(); }));
  }
  void endWait() {
    condition_->lock();
    over_ = true;
    condition_->signal();
    condition_->unlock();
  }
  void TearDown() override {
    endWait();
    SocketFixture::TearDown();
  }
  // What the queue's work found a wait of this length to answer, and how long it took.
  std::pair<bool, std::chrono::nanoseconds> waitOnQueue(std::chrono::duration<double> timeout) {
    return running_.onQueue([&] {
      const auto begin = running_.clock.monotonic();
      condition_->lock();
      const bool signalled = condition_->waitFor(timeout);
      condition_->unlock();
      return std::pair(signalled, running_.clock.monotonic() - begin);
    });
  }

  LinuxConditions conditions_{running_.loop};
  const std::shared_ptr<platform::Condition> condition_ = conditions_.makeCondition();
  bool over_ = false;  // guarded by the condition
};

TEST_F(DeliberateWait, StatusAndNewClientsAreAnswered) {
  serve();
  TestClient client(path_);
  ASSERT_TRUE(client.status());
  beginWait();
  for (int i = 0; i < 3; ++i) {
    const auto status = client.status();
    ASSERT_TRUE(status);
    EXPECT_EQ(status->get("frames_received").asInt64(), 2 + 2 * i);
    TestClient late(path_);
    EXPECT_TRUE(late.status());
  }
}

TEST_F(DeliberateWait, RequestsStayWithTheirConnectionsUntilItsEnd) {
  serve();
  TestClient client(path_);
  ASSERT_TRUE(client.status());
  beginWait();
  client.send(encoded(1, messageRequest({{"a", 1}})) + encoded(2, requestOf(Operation::Status)));
  TestClient other(path_);
  std::int64_t asked = 0;
  ASSERT_TRUE(eventually([&] { return other.status()->get("frames_received").asInt64() == ++asked + 2; }));
  EXPECT_FALSE(client.readable(0));  // its head request is held, and what follows with it
  endWait();
  const auto first = client.reply();
  const auto second = client.reply();
  ASSERT_TRUE(first && second);
  EXPECT_EQ(first->id + second->id, 3u);
}

TEST_F(DeliberateWait, RepliesOfTheWorkBeforeItGoOut) {
  serve();
  TestClient client(path_);
  ASSERT_TRUE(client.status());
  // Both pieces in one turn: the reply is appended, then the next piece waits.
  std::promise<void> release;
  running_.loop.queue()->async([&] { release.get_future().wait(); });
  client.request(1, messageRequest({{"a", 1}}));
  client.request(2, requestOf(Operation::StartReportingSessionForID, 7));
  release.set_value();
  ASSERT_TRUE(eventuallyHappens("1 startReportingSessionForID 7"));
  running_.loop.queue()->async([this] { service_->heldStarts.at(0).reply(std::nullopt, true); });
  beginWait();
  EXPECT_TRUE(client.reply());
  EXPECT_TRUE(client.reply());
}

TEST_F(DeliberateWait, ConnectionsThatEndMeanwhileAreInvalidatedAfterIt) {
  serve();
  {
    TestClient client(path_);
    ASSERT_TRUE(client.status());
    beginWait();
  }
  TestClient other(path_);
  ASSERT_TRUE(other.status());
  endWait();
  EXPECT_TRUE(eventuallyHappens("1 invalidated"));
}

TEST_F(DeliberateWait, EndsAtItsTimeHoweverMuchIsAsked) {
  serve();
  std::atomic<bool> done{false};
  std::thread asker([&] {
    TestClient client(path_);
    while (!done) {
      EXPECT_TRUE(client.status());
    }
  });
  const auto [signalled, took] = waitOnQueue(50ms);
  done = true;
  asker.join();
  EXPECT_FALSE(signalled);
  EXPECT_GE(took, 50ms);
}

TEST_F(DeliberateWait, EndsWithASignalAndSaysSo) {
  serve();
  std::thread signaller([&] {
    EXPECT_TRUE(eventually([this] { return running_.loop.progress().sample().waitingSince.has_value(); }));
    condition_->lock();
    condition_->signal();
    condition_->unlock();
  });
  const auto [signalled, took] = waitOnQueue(60s);
  signaller.join();
  EXPECT_TRUE(signalled);
  EXPECT_LT(took, 30s);
}

TEST_F(DeliberateWait, GoesOnAfterTheLoopWasStopped) {
  serve();
  TestClient client(path_);
  ASSERT_TRUE(client.status());
  beginWait();
  running_.loop.stop();
  client.request(1, requestOf(Operation::Status));
  std::thread signaller([&] { endWait(); });
  running_.stop();  // returns only when the work has ended
  signaller.join();
  EXPECT_FALSE(running_.loop.progress().sample().waitingSince.has_value());
}

TEST_F(DeliberateWait, IsToldToNobodyByTheSteps) {
  serve();
  TestClient client(path_);
  ASSERT_TRUE(client.status());
  beginWait();
  const auto before = running_.loop.progress().sample().steps;
  ASSERT_TRUE(client.status());
  EXPECT_EQ(running_.loop.progress().sample().steps, before);  // or a wait without end would look alive
}

TEST_F(DeliberateWait, DoesNotBeginInsideItself) {
  serve();
  running_.onQueue([this] {
    const auto begin = running_.clock.monotonic();
    int asked = 0;
    running_.loop.waitUntil(begin + 60s, [&] {
      EXPECT_TRUE(running_.loop.waits());
      running_.loop.waitUntil(begin + 60s, [] { return false; });
      running_.loop.queue()->wake();  // so that it is asked again
      return ++asked == 2;
    });
    EXPECT_EQ(asked, 2);
    EXPECT_LT(running_.clock.monotonic() - begin, 30s);
    EXPECT_FALSE(running_.loop.waits());
  });
}

TEST_F(DeliberateWait, ManySignalsAndManyClientsStress) {
  constexpr int kWaits = 2000;
  constexpr int kClients = 3;
  serve();
  std::atomic<bool> done{false};
  int given = 0;  // guarded by the condition
  int taken = 0;  // likewise
  std::thread backEnd([&] {
    for (int i = 0; i < kWaits; ++i) {
      std::unique_lock lock(*condition_);
      ++given;
      condition_->signal();
      lock.unlock();
      running_.loop.queue()->wake();  // as others do meanwhile
      std::this_thread::yield();
    }
  });
  std::vector<std::thread> clients;
  for (int i = 0; i < kClients; ++i) {
    clients.emplace_back([&] {
      while (!done) {
        TestClient client(path_);
        EXPECT_TRUE(client.status());
        EXPECT_TRUE(client.ask(1, messageRequest({{"a", 1}})));
      }
    });
  }
  for (int waits = 0; taken < kWaits; ++waits) {
    running_.onQueue([&] {
      const std::lock_guard lock(*condition_);
      for (auto left = given - taken; left == 0; left = given - taken) {
        ASSERT_TRUE(condition_->waitFor(60s));
      }
      taken = given;
    });
  }
  backEnd.join();
  done = true;
  for (std::thread& client : clients) {
    client.join();
  }
  EXPECT_EQ(taken, kWaits);
}

}  // namespace
}  // namespace tarn::linux_host
