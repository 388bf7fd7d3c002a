#include "platform/linux/LinuxWorkQueues.h"

#include <gtest/gtest.h>
#include <pthread.h>

#include <atomic>
#include <future>
#include <string>
#include <vector>

#include "tests/linux/Eventually.h"
#include "tests/linux/RunningLoop.h"

namespace tarn::linux_host {
namespace {

using namespace std::chrono_literals;
using platform::QualityOfService;
using testing::eventually;

class LinuxWorkQueuesTest : public ::testing::Test {
 protected:
  std::shared_ptr<platform::WorkQueue> make() { return queues_.makeSerialQueue("q", QualityOfService::Utility); }
  static void finish(platform::WorkQueue& queue) {
    std::promise<void> done;
    queue.async([&done] { done.set_value(); });
    done.get_future().get();
  }

  testing::RunningLoop running_;
  LinuxWorkQueues queues_{running_.clock, running_.loop.queue()};
};

TEST_F(LinuxWorkQueuesTest, TheServerQueueIsTheMainLoopsAndNoOtherIs) {
  EXPECT_EQ(queues_.makeSerialQueue("sys.oxbow.tarnkit.reporting.server", QualityOfService::UserInteractive),
            running_.loop.queue());
  EXPECT_NE(queues_.makeSerialQueue("a worker's", QualityOfService::UserInteractive), running_.loop.queue());
}

TEST_F(LinuxWorkQueuesTest, OtherQueuesAreQueuesOfTheirOwn) {
  EXPECT_NE(make(), make());
}

TEST_F(LinuxWorkQueuesTest, AQueueKeepsItsOrder) {
  const auto queue = make();
  std::vector<int> ran;
  for (int i = 0; i < 1000; ++i) {
    queue->async([&ran, i] { ran.push_back(i); });
  }
  finish(*queue);
  ASSERT_EQ(ran.size(), 1000u);
  EXPECT_TRUE(std::is_sorted(ran.begin(), ran.end()));
}

TEST_F(LinuxWorkQueuesTest, IsCurrentInsideItsWorkAndNotInsideAnothers) {
  const auto queue = make();
  const auto other = make();
  std::promise<std::pair<bool, bool>> seen;
  queue->async([&] { seen.set_value({queue->isCurrent(), other->isCurrent()}); });
  EXPECT_EQ(seen.get_future().get(), std::pair(true, false));
  EXPECT_FALSE(queue->isCurrent());
}

TEST_F(LinuxWorkQueuesTest, ABlockedQueueDoesNotHoldUpAnother) {
  const auto blocked = make();
  const auto other = make();
  std::promise<void> release;
  blocked->async([future = release.get_future().share()] { future.wait(); });
  finish(*other);
  release.set_value();
  finish(*blocked);
}

TEST_F(LinuxWorkQueuesTest, CountsWhatWaitsBehindRunningWork) {
  const auto queue = make();
  std::promise<void> begun;
  std::promise<void> release;
  queue->async([&begun, future = release.get_future().share()] {
    begun.set_value();
    future.wait();
  });
  begun.get_future().get();
  queue->async([] {});
  queue->async([] {});
  EXPECT_EQ(queue->waiting(), 2u);
  release.set_value();
  finish(*queue);
}

TEST_F(LinuxWorkQueuesTest, WorkOfAQueueThatNobodyHoldsAnyMoreIsRun) {
  std::atomic<int> ran{0};
  auto queue = make();
  std::promise<void> release;
  queue->async([future = release.get_future().share()] { future.wait(); });
  for (int i = 0; i < 10; ++i) {
    queue->async([&ran] { ++ran; });
  }
  queue->asyncAfter(1ms, [&ran] { ++ran; });
  queue.reset();
  release.set_value();
  EXPECT_TRUE(eventually([&] { return ran == 11; }));
}

TEST_F(LinuxWorkQueuesTest, DelayedWorkComesByItsMomentAndNeverEarly) {
  const auto queue = make();
  const auto begin = running_.clock.monotonic();
  std::string ran;
  std::promise<std::chrono::nanoseconds> last;
  queue->asyncAfter(30ms, [&] {
    ran += 'c';
    last.set_value(running_.clock.monotonic());
  });
  queue->asyncAfter(10ms, [&] { ran += 'a'; });
  queue->asyncAfter(20ms, [&] { ran += 'b'; });
  EXPECT_GE(last.get_future().get() - begin, 30ms);
  EXPECT_EQ(ran, "abc");
}

TEST_F(LinuxWorkQueuesTest, TheEndRunsWhatIsReady) {
  std::atomic<int> ran{0};
  {
    LinuxWorkQueues queues(running_.clock, running_.loop.queue());
    const auto queue = queues.makeSerialQueue("q", QualityOfService::Background);
    for (int i = 0; i < 500; ++i) {
      queue->async([&ran] { ++ran; });
    }
  }
  EXPECT_EQ(ran, 500);
}

TEST_F(LinuxWorkQueuesTest, ASystemWithoutThreadsToGiveEndsTheProcess) {
  const auto askForOne = [this] {
    // No address space holds stacks of this size.
    pthread_attr_t attributes;
    ::pthread_attr_init(&attributes);
    ::pthread_attr_setstacksize(&attributes, std::size_t{1} << 60U);
    ::pthread_setattr_default_np(&attributes);
    static_cast<void>(make());
  };
  EXPECT_DEATH(askForOne(), "thread constructor failed");
}

}  // namespace
}  // namespace tarn::linux_host
