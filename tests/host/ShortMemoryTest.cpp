// SPDX-License-Identifier: Apache-2.0
// Allocations of the host's own that fail: nothing is lost or left half done.
#include <gtest/gtest.h>
#include <sys/epoll.h>
#include <sys/socket.h>

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <iterator>
#include <memory>
#include <new>
#include <string>

#include "host/loop/LinuxWorkQueues.h"
#include "host/loop/MainLoop.h"
#include "host/loop/ServerQueue.h"
#include "host/machine/LinuxFileSystem.h"
#include "host/machine/OverflowFile.h"
#include "host/system/MemoryReserve.h"
#include "testing/ManualClock.h"
#include "tests/host/Eventually.h"
#include "tests/host/TemporaryFolder.h"
#include "tests/host/loop/RunningLoop.h"
#include "tests/support/FailingAllocations.h"

namespace tarn::linux_host {
namespace {

using namespace std::chrono_literals;
using testing::eventually;
using testing::failEachAllocation;
using testing::FailingAllocations;

constexpr std::size_t kAll = 1000;

class QueueShortMemory : public ::testing::Test {
 protected:
  platform::Work note(char letter) {
    return [this, letter] { ran_ += letter; };
  }

  testing::ManualClock clock_;
  QueueProgress progress_;
  ServerQueue queue_{clock_, progress_};
  std::string ran_;
};

TEST_F(QueueShortMemory, WorkThatThereIsNoMemoryForIsNotHandedOver) {
  const int failed = failEachAllocation([this] { queue_.async(note('a')); }, [] {});
  EXPECT_GT(failed, 0);
  EXPECT_EQ(queue_.waiting(), 1u);
  queue_.run(kAll);
  EXPECT_EQ(ran_, "a");
}

TEST_F(QueueShortMemory, DelayedWorkThatThereIsNoRoomForRunsLater) {
  for (const char letter : {'a', 'b', 'c'}) {
    queue_.asyncAfter(1s, note(letter));
  }
  clock_.advance(2s);
  const int failed = failEachAllocation([this] { queue_.run(kAll); }, [] {});
  EXPECT_GT(failed, 0);
  EXPECT_EQ(ran_, "abc");
  EXPECT_EQ(queue_.waiting(), 0u);
}

class FlushCounter final : public EventHandler {
 public:
  void handleEvents(std::uint32_t) override {}
  void flush() override { ++flushes; }
  int flushes = 0;
};

TEST(MainLoopShortMemory, FlushingLaterNeedsNoneForWhatIsWatched) {
  testing::RunningLoop running;
  int pair[2];
  ASSERT_EQ(::socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, pair), 0);
  const UniqueDescriptor ours(pair[0]);
  const UniqueDescriptor theirs(pair[1]);
  const auto counter = std::make_shared<FlushCounter>();
  ASSERT_TRUE(running.loop.watch(ours.get(), EPOLLIN, counter).ok());
  {
    const FailingAllocations failing(1, FailingAllocations::kAll);
    running.loop.flushLater(counter);
    running.loop.flushAll();
    running.loop.flushLater(counter);
  }
  running.loop.flushAll();
  EXPECT_EQ(counter->flushes, 2);
  running.loop.unwatch(ours.get());
}

TEST(WorkQueuesShortMemory, WhatThereIsNoneForIsNotHandedOverAndWhatComesAfterItRuns) {
  testing::RunningLoop running;
  LinuxWorkQueues queues(running.clock, running.loop.queue());
  std::atomic<int> ran{0};
  for (int i = 0; i < 50; ++i) {
    const auto queue = queues.makeSerialQueue("q", platform::QualityOfService::Utility);
    failEachAllocation([&] { queue->async([&ran] { ++ran; }); }, [] {});
    failEachAllocation([&] { queue->asyncAfter(1ms, [&ran] { ++ran; }); }, [] {});
  }
  EXPECT_TRUE(eventually([&] { return ran == 100; }));
  EXPECT_TRUE(queues.settle(10s));
}

TEST(OverflowFileShortMemory, WhatCouldNotBeKeptTakesNoRoom) {
  constexpr std::size_t kBytes = 3 * OverflowFile::kSlotBytes;
  const TemporaryFolder folder;
  OverflowFile file(folder.path(), {}, std::size_t{1} << 20U);
  const std::string block(kBytes, 'x');
  Result<OverflowFile::Place> kept;
  const int failed = failEachAllocation([&] { kept = file.write(block); }, [&] { EXPECT_EQ(file.size()->load(), 0); });
  EXPECT_GT(failed, 0);
  EXPECT_EQ(file.size()->load(), static_cast<std::int64_t>(kBytes));
  EXPECT_EQ(file.read(kept.value).value, block);
}

std::ptrdiff_t openDescriptors() {
  const std::filesystem::directory_iterator all("/proc/self/fd");
  return std::distance(begin(all), end(all));
}

TEST(LinuxFileSystemShortMemory, AFileThatIsOpenOrClosedEndsWithoutMemory) {
  TemporaryFolder folder;
  folder.write("file", "");
  LinuxFileSystem files{{folder.path("logs"), folder.path()}};
  const std::ptrdiff_t before = openDescriptors();
  for (const bool isClosed : {false, true}) {
    auto file = files.openForWriting(folder.path("file"));
    ASSERT_FALSE(file.failed());
    ASSERT_EQ(isClosed ? file.value->close() : Status(), Status());
    const FailingAllocations failing(1, FailingAllocations::kAll);
    file.value.reset();
    EXPECT_FALSE(failing.happened());
  }
  EXPECT_EQ(openDescriptors(), before);
}

TEST(LinuxFileSystemShortMemory, AFileThatCantBeHeldIsClosed) {
  TemporaryFolder folder;
  folder.write("file", "");
  LinuxFileSystem files{{folder.path("logs"), folder.path()}};
  const std::string path = folder.path("file");
  const std::ptrdiff_t before = openDescriptors();
  const int failed = failEachAllocation([&] { static_cast<void>(files.openForWriting(path)); }, [] {});
  EXPECT_GT(failed, 0);
  EXPECT_EQ(openDescriptors(), before);
}

class MemoryReserveShortMemory : public ::testing::Test {
 protected:
  void SetUp() override { ASSERT_TRUE(MemoryReserve::hold(0ms)); }
  void TearDown() override { std::set_new_handler(nullptr); }
};

TEST_F(MemoryReserveShortMemory, ItIsNotWholeWhileThereIsNone) {
  std::get_new_handler()();
  {
    const FailingAllocations failing(1, FailingAllocations::kAll);
    EXPECT_FALSE(MemoryReserve::isWhole());
  }
  EXPECT_TRUE(MemoryReserve::isWhole());
}

TEST_F(MemoryReserveShortMemory, AnAllocationThatFailsOnceSucceedsWithABlock) {
  const std::uint64_t before = MemoryReserve::counts().blocksUsed;
  {
    const FailingAllocations failing(1);
    EXPECT_NO_THROW(static_cast<void>(std::make_unique<int>(7)));
  }
  EXPECT_EQ(MemoryReserve::counts().blocksUsed, before + 1);
  EXPECT_TRUE(MemoryReserve::isWhole());
}

}  // namespace
}  // namespace tarn::linux_host
