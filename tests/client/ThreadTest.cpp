// SPDX-License-Identifier: Apache-2.0
// The rules of threads and handlers, and use by several threads in turn.
#include <gtest/gtest.h>

#include <atomic>
#include <mutex>

#include "tests/client/ScriptedServer.h"

namespace tarn::client {
namespace {

using testing::Pair;
using testing::Served;

TEST(ClientConnection, WhatAHandlerMayNotDoIsRefused) {
  Pair pair;
  Outcome called = Outcome::Ok;
  bool flushed = true;
  std::size_t dispatched = 1;
  pair.client->send(getAllReporters(), [&](Reply&&) {
    called = pair.client->call(getAllReporters()).outcome;
    flushed = pair.client->flush();
    dispatched = pair.client->dispatch() + pair.client->wait(std::chrono::seconds(5));
  });
  pair.client->flush();
  pair.server->acknowledge(1);
  EXPECT_EQ(pair.client->wait(std::chrono::seconds(60)), 1U);
  EXPECT_EQ(called, Outcome::Misuse);
  EXPECT_FALSE(flushed);
  EXPECT_EQ(dispatched, 0U);
  EXPECT_TRUE(pair.client->connected());
  EXPECT_FALSE(pair.server->hasInput());
}

TEST(ClientConnection, AnOperationOfASecondThreadIsRefused) {
  Pair pair;
  Outcome called = Outcome::Ok;
  std::vector<SendStatus> sent;
  bool flushed = true;
  std::size_t waited = 1;
  pair.client->send(getAllReporters(), [&](Reply&&) {
    std::thread([&] {
      called = pair.client->call(getAllReporters()).outcome;
      sent = {pair.client->send(getAllReporters()), pair.client->trySend(getAllReporters())};
      flushed = pair.client->flush();
      waited = pair.client->wait(std::chrono::seconds(5));
      pair.client->close();
    }).join();
  });
  pair.client->flush();
  pair.server->acknowledge(1);
  EXPECT_EQ(pair.client->wait(std::chrono::seconds(60)), 1U);
  EXPECT_EQ(called, Outcome::Misuse);
  EXPECT_EQ(sent, (std::vector<SendStatus>{SendStatus::Misuse, SendStatus::Misuse}));
  EXPECT_FALSE(flushed);
  EXPECT_EQ(waited, 0U);
  EXPECT_TRUE(pair.client->connected());
  EXPECT_FALSE(pair.server->hasInput());
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
