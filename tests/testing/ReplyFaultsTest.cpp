// SPDX-License-Identifier: Apache-2.0
#include "testing/backends/ReplyFaults.h"

#include <gtest/gtest.h>

#include <atomic>
#include <string>
#include <utility>
#include <vector>

namespace tarn::testing {
namespace {

using namespace std::chrono_literals;

// Keeps delayed work until told.
class KeepingQueue final : public platform::WorkQueue {
 public:
  void async(platform::Work work) override { asyncAfter(0s, std::move(work)); }
  void asyncAfter(std::chrono::nanoseconds delay, platform::Work work) override {
    kept.emplace_back(delay, std::move(work));
  }
  bool isCurrent() const noexcept override { return false; }
  std::size_t waiting() const noexcept override { return kept.size(); }

  std::vector<std::pair<std::chrono::nanoseconds, platform::Work>> kept;
};

// Tells when it is destroyed.
struct Farewell {
  explicit Farewell(int& count) : destroyed(&count) {}
  Farewell(Farewell&& other) noexcept : destroyed(std::exchange(other.destroyed, nullptr)) {}
  Farewell& operator=(Farewell&&) = delete;
  Farewell(const Farewell&) = delete;
  Farewell& operator=(const Farewell&) = delete;
  ~Farewell() {
    if (destroyed != nullptr) {
      ++*destroyed;
    }
  }
  int* destroyed;
};

TEST(ReplyFaults, WithoutAFaultTheReplyIsCalledAtOnce) {
  ReplyFaults faults;
  int calls = 0;

  faults.deliver([&] { ++calls; });

  EXPECT_EQ(calls, 1);
}

TEST(ReplyFaults, ADroppedReplyIsDestroyedUncalled) {
  ReplyFaults faults;
  int calls = 0;
  int destroyed = 0;
  faults.set(ReplyFault::Drop);

  faults.deliver([&calls, farewell = Farewell(destroyed)] { ++calls; });

  EXPECT_EQ(calls, 0);
  EXPECT_EQ(destroyed, 1);
}

TEST(ReplyFaults, HeldRepliesComeInOrderWhenTold) {
  ReplyFaults faults;
  std::string order;
  faults.set(ReplyFault::Hold);
  faults.deliver([&] { order += 'a'; });
  faults.deliver([&] { order += 'b'; });
  EXPECT_EQ(order, "");
  EXPECT_EQ(faults.held(), 2U);

  EXPECT_EQ(faults.deliverHeld(), 2U);

  EXPECT_EQ(order, "ab");
  EXPECT_EQ(faults.held(), 0U);
}

TEST(ReplyFaults, AHeldReplyMayAskAgain) {
  ReplyFaults faults;
  std::string order;
  faults.set(ReplyFault::Hold);
  faults.deliver([&] {
    order += 'a';
    faults.deliver([&] { order += 'b'; });
  });

  EXPECT_EQ(faults.deliverHeld(), 1U);
  EXPECT_EQ(faults.deliverHeld(), 1U);

  EXPECT_EQ(order, "ab");
}

TEST(ReplyFaults, HeldRepliesEndWithTheObject) {
  int calls = 0;
  int destroyed = 0;
  {
    ReplyFaults faults;
    faults.set(ReplyFault::Hold);
    faults.deliver([&calls, farewell = Farewell(destroyed)] { ++calls; });
  }

  EXPECT_EQ(calls, 0);
  EXPECT_EQ(destroyed, 1);
}

TEST(ReplyFaults, DropAllDestroysHeldRepliesAndWaitsForThreads) {
  ReplyFaults faults;
  int calls = 0;
  int destroyed = 0;
  bool onThread = false;
  faults.set(ReplyFault::Hold);
  faults.deliver([&calls, farewell = Farewell(destroyed)] { ++calls; });
  faults.set(ReplyFault::OtherThread);
  faults.deliver([&] { onThread = true; });

  faults.dropAll();

  EXPECT_EQ(calls, 0);
  EXPECT_EQ(destroyed, 1);
  EXPECT_TRUE(onThread);
  EXPECT_EQ(faults.deliverHeld(), 0U);
}

TEST(ReplyFaults, ADelayedReplyGoesOverTheQueue) {
  ReplyFaults faults;
  const auto queue = std::make_shared<KeepingQueue>();
  int calls = 0;
  faults.delayOn(queue, 9s);

  faults.deliver([&] { ++calls; });

  EXPECT_EQ(calls, 0);
  ASSERT_EQ(queue->kept.size(), 1U);
  EXPECT_EQ(queue->kept[0].first, 9s);
  queue->kept[0].second();
  EXPECT_EQ(calls, 1);
}

TEST(ReplyFaults, ADoubledReplyIsCalledTwiceWithTheSameContent) {
  ReplyFaults faults;
  std::vector<std::string> seen;
  faults.set(ReplyFault::Twice);

  faults.deliver([&, text = std::string("content")] { seen.push_back(text); });

  EXPECT_EQ(seen, (std::vector<std::string>{"content", "content"}));
}

TEST(ReplyFaults, AReplyOnAnotherThreadRunsWhileTheCallerGoesOn) {
  ReplyFaults faults;
  std::atomic<bool> released = false;
  std::thread::id repliedOn;
  faults.set(ReplyFault::OtherThread);

  faults.deliver([&] {
    while (!released) {
      std::this_thread::yield();
    }
    repliedOn = std::this_thread::get_id();
  });
  released = true;
  faults.joinThreads();

  EXPECT_NE(repliedOn, std::thread::id());
  EXPECT_NE(repliedOn, std::this_thread::get_id());
}

}  // namespace
}  // namespace tarn::testing
