// SPDX-License-Identifier: Apache-2.0
#include "host/loop/MainLoop.h"

#include <gtest/gtest.h>
#include <sys/epoll.h>
#include <sys/socket.h>

#include <atomic>
#include <csignal>
#include <future>
#include <thread>

#include "host/loop/SignalSource.h"
#include "tests/host/Eventually.h"
#include "tests/host/InChild.h"
#include "tests/host/loop/RunningLoop.h"

namespace tarn::linux_host {
namespace {

using namespace std::chrono_literals;
using testing::eventually;

class ByteCounter final : public EventHandler {
 public:
  explicit ByteCounter(int descriptor) : descriptor_(descriptor) {}
  void handleEvents(std::uint32_t) override {
    char byte = 0;
    bytes += static_cast<int>(::recv(descriptor_, &byte, 1, MSG_DONTWAIT) == 1);
  }
  void flush() override { ++flushes; }
  std::atomic<int> bytes{0};
  std::atomic<int> flushes{0};

 private:
  int descriptor_;
};

class MainLoopTest : public ::testing::Test {
 protected:
  void SetUp() override {
    int pair[2];
    ASSERT_EQ(::socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, pair), 0);
    ours_ = UniqueDescriptor(pair[0]);
    theirs_ = UniqueDescriptor(pair[1]);
    counter_ = std::make_shared<ByteCounter>(ours_.get());
  }
  void sendByte() { EXPECT_EQ(::send(theirs_.get(), "x", 1, MSG_NOSIGNAL), 1); }

  UniqueDescriptor ours_;
  UniqueDescriptor theirs_;
  std::shared_ptr<ByteCounter> counter_;
  testing::RunningLoop running_;
};

TEST_F(MainLoopTest, CallsTheHandlerOfAWatchedDescriptor) {
  ASSERT_EQ(running_.loop.setUp().text(), "");
  ASSERT_TRUE(running_.loop.watch(ours_.get(), EPOLLIN, counter_).ok());
  running_.start();
  sendByte();
  EXPECT_TRUE(eventually([&] { return counter_->bytes == 1; }));
}

TEST_F(MainLoopTest, LetsGoOfAHandlerThatIsUnwatched) {
  ASSERT_TRUE(running_.loop.watch(ours_.get(), EPOLLIN, counter_).ok());
  running_.start();
  running_.onQueue([&] { running_.loop.unwatch(ours_.get()); });
  EXPECT_EQ(counter_.use_count(), 1);
}

TEST_F(MainLoopTest, CanNotWatchWhatIsNoDescriptorOfTheProcess) {
  const int number = theirs_.get();
  theirs_.reset();
  EXPECT_TRUE(running_.loop.watch(number, EPOLLIN, counter_).failed());
}

TEST_F(MainLoopTest, FlushesOnceATurn) {
  running_.start();
  running_.onQueue([&] { running_.loop.flushLater(counter_); });
  EXPECT_TRUE(eventually([&] { return counter_->flushes == 1; }));
  running_.onQueue([] {});
  EXPECT_EQ(counter_->flushes, 1);
}

TEST_F(MainLoopTest, WhatRunsOutOfMemoryEndsAloneAndTheLoopGoesOn) {
  struct Failing : EventHandler {
    void handleEvents(std::uint32_t) override { throw std::bad_alloc(); }
    void flush() override { throw std::bad_alloc(); }
  };
  const auto failing = std::make_shared<Failing>();
  const auto hookFailed = std::make_shared<bool>(false);  // turns go on after this test's body
  running_.loop.addTurnHook([hookFailed] {
    if (!std::exchange(*hookFailed, true)) throw std::bad_alloc();
  });
  ASSERT_TRUE(running_.loop.watch(ours_.get(), EPOLLIN | EPOLLET, failing).ok());
  sendByte();
  running_.start();
  running_.onQueue([&] {
    running_.loop.flushLater(failing);
    running_.loop.flushLater(counter_);
  });
  EXPECT_TRUE(eventually([&] { return counter_->flushes == 1; }));
  EXPECT_TRUE(running_.onQueue([&] {
    running_.loop.unwatch(ours_.get());
    return *hookFailed;
  }));
}

TEST_F(MainLoopTest, FlushesWhatIsReadyWhenItIsStopped) {
  running_.start();
  running_.onQueue([&] {
    running_.loop.stop();
    running_.loop.flushLater(counter_);
  });
  running_.stop();
  EXPECT_EQ(counter_->flushes, 1);
}

TEST_F(MainLoopTest, WorkThatNeverEndsDoesNotStarveTheSockets) {
  ASSERT_TRUE(running_.loop.watch(ours_.get(), EPOLLIN, counter_).ok());
  struct Again {
    ServerQueue* queue;
    void operator()() const { queue->async(Again{queue}); }
  };
  running_.loop.queue()->async(Again{running_.loop.queue().get()});
  running_.start();
  sendByte();
  EXPECT_TRUE(eventually([&] { return counter_->bytes == 1; }));
}

TEST_F(MainLoopTest, SocketsThatAreNeverQuietDoNotStarveTheWork) {
  ASSERT_TRUE(running_.loop.watch(ours_.get(), EPOLLIN, counter_).ok());
  running_.start();
  std::atomic<bool> done{false};
  std::thread sender([&] {
    while (!done) {
      sendByte();
    }
  });
  for (int i = 0; i < 100; ++i) {
    EXPECT_EQ(running_.onQueue([i] { return i; }), i);
  }
  done = true;
  sender.join();
}

TEST_F(MainLoopTest, RunsDelayedWorkWhileItSleeps) {
  running_.start();
  const auto begin = running_.clock.monotonic();
  std::promise<std::chrono::nanoseconds> ran;
  running_.loop.queue()->asyncAfter(15ms, [&] { ran.set_value(running_.clock.monotonic()); });
  EXPECT_GE(ran.get_future().get() - begin, 15ms);
}

TEST_F(MainLoopTest, AHookThatIsWokenWhileAnotherOneWaitsLooksAfterwards) {
  testing::RunningLoop running;
  bool isWoken = false;
  bool hasWaited = false;
  std::atomic<bool> hasLooked{false};
  running.loop.addTurnHook([&] { hasLooked = isWoken; });
  running.loop.addTurnHook([&] {
    if (std::exchange(hasWaited, true)) return;
    isWoken = true;
    running.loop.queue()->wake();
    running.loop.waitUntil(running.clock.monotonic() + std::chrono::milliseconds(20), [] { return false; });
  });
  running.start();
  EXPECT_TRUE(eventually([&] { return hasLooked.load(); }));
}

TEST_F(MainLoopTest, IsIdleWhenItHasNothingToDo) {
  running_.start();
  EXPECT_TRUE(eventually([&] { return running_.loop.progress().sample().idle; }));
}

TEST_F(MainLoopTest, IsNotIdleWhileWorkBlocksIt) {
  running_.start();
  std::promise<void> begun;
  std::promise<void> release;
  running_.loop.queue()->async([&begun, future = release.get_future().share()] {
    begun.set_value();
    future.wait();
  });
  begun.get_future().get();
  const auto before = running_.loop.progress().sample();
  const auto after = running_.loop.progress().sample();
  release.set_value();
  EXPECT_FALSE(after.idle);
  EXPECT_EQ(before.steps, after.steps);
}

// The number of the signal that the loop's handler got, after which the loop ended in order.
int signalInChild(int signal) {
  return testing::inChild([signal] {
    const auto source = std::make_shared<SignalSource>();
    testing::SteadyClock clock;
    MainLoop loop(clock);
    int received = 0;
    const Status heard = SignalSource::start(source, loop, [&](int which) {
      received = which;
      loop.stop();
    });
    if (heard.failed()) return 100;
    loop.queue()->async([signal] { ::kill(::getpid(), signal); });
    loop.run();
    return received;
  });
}

TEST(SignalSource, HandsTheTerminationSignalToTheLoop) {
  EXPECT_EQ(signalInChild(SIGTERM), SIGTERM);
}

TEST(SignalSource, HandsTheInterruptSignalToTheLoop) {
  EXPECT_EQ(signalInChild(SIGINT), SIGINT);
}

TEST(SignalSource, ASignalThatCameBeforeTheLoopRanIsNotLost) {
  EXPECT_EQ(testing::inChild([] {
              const auto source = std::make_shared<SignalSource>();
              ::kill(::getpid(), SIGTERM);
              testing::SteadyClock clock;
              MainLoop loop(clock);
              const Status heard = SignalSource::start(source, loop, [&](int) { loop.stop(); });
              loop.run();
              return heard.ok() ? 0 : 1;
            }),
            0);
}

TEST(SignalSource, ABrokenPipeDoesNotEndTheProcess) {
  EXPECT_EQ(testing::inChild([] {
              const SignalSource source;
              int pipe[2];
              if (::pipe(pipe) != 0 || ::close(pipe[0]) != 0) return 1;
              return ::write(pipe[1], "x", 1) == -1 && errno == EPIPE ? 0 : 2;
            }),
            0);
}

}  // namespace
}  // namespace tarn::linux_host
