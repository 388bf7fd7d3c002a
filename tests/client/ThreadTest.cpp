// The rules of threads and handlers, and use by several threads in turn.
#include <gtest/gtest.h>

#include <atomic>
#include <mutex>

#include "tests/client/ScriptedServer.h"

namespace tarn::client {
namespace {

using testing::Pair;
using testing::Served;

TEST(ClientConnectionDeathTest, ACallInsideAHandlerEndsTheProcess) {
  GTEST_FLAG_SET(death_test_style, "threadsafe");
  EXPECT_DEATH(
      {
        Pair pair;
        pair.client->send(getAllReporters(), [&](Reply&&) { pair.client->call(getAllReporters()); });
        pair.client->flush();
        pair.server->acknowledge(1);
        pair.client->wait(std::chrono::seconds(5));
      },
      "call inside a reply handler");
}

TEST(ClientConnectionDeathTest, UseByTwoThreadsAtOnceEndsTheProcess) {
  GTEST_FLAG_SET(death_test_style, "threadsafe");
  EXPECT_DEATH(
      {
        OwnerCheck check;
        const OwnerCheck::Use use(check);
        std::thread([&] { const OwnerCheck::Use other(check); }).join();
      },
      "used by two threads at the same time");
}

TEST(ClientConnection, ThreadsMayUseOneClientInTurn) {
  Pair pair;
  constexpr std::size_t kThreads = 4;
  constexpr std::size_t kCalls = 200;
  const Served serving([&] { pair.server->acknowledge(kThreads * kCalls); });
  std::mutex turn;
  std::size_t good = 0;
  std::vector<std::thread> threads;
  for (std::size_t i = 0; i < kThreads; ++i) {
    threads.emplace_back([&] {
      for (std::size_t n = 0; n < kCalls; ++n) {
        const std::lock_guard lock(turn);
        good += pair.client->call(getAllReporters()).ok() ? 1U : 0U;
      }
    });
  }
  for (std::thread& thread : threads) {
    thread.join();
  }
  EXPECT_EQ(good, kThreads * kCalls);
}

TEST(ClientConnection, ManyClientsOnTheirOwnThreadsDoNotMeet) {
  std::vector<std::thread> threads;
  std::atomic<std::size_t> good{0};
  for (int i = 0; i < 4; ++i) {
    threads.emplace_back([&] {
      Pair pair;
      const Served serving([&] { pair.server->acknowledge(500); });
      for (int n = 0; n < 500; ++n) {
        pair.client->send(sendMessage({{"volume", n}}, 4, 1), [&](Reply&& reply) { good += reply.ok() ? 1U : 0U; });
      }
      pair.client->flush();
      while (pair.client->outstanding() > 0) {
        pair.client->wait(std::chrono::seconds(5));
      }
    });
  }
  for (std::thread& thread : threads) {
    thread.join();
  }
  EXPECT_EQ(good, 2000U);
}

}  // namespace
}  // namespace tarn::client
