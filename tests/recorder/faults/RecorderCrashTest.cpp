// SPDX-License-Identifier: Apache-2.0
// A process that ends without warning leaves a sound file that holds all that was committed.
#include <sys/mman.h>

#include <atomic>
#include <new>

#include "tests/recorder/RecorderFixture.h"
#include "tests/recorder/faults/ChildProcess.h"

namespace tarn::recorder {
namespace {

class RecorderCrash : public RecorderFixture {
 protected:
  struct Shared {
    std::atomic<std::uint64_t> committed{0};
  };

  RecorderCrash() {
    void* const memory = ::mmap(nullptr, sizeof(Shared), PROT_READ | PROT_WRITE, MAP_SHARED | MAP_ANONYMOUS, -1, 0);
    shared_ = ::new (memory) Shared;
  }
  ~RecorderCrash() override { ::munmap(shared_, sizeof(Shared)); }

  // Writes at full speed until it is killed.
  void writeForEver() {
    start();
    for (std::uint64_t n = 0;; ++n) {
      while (recorder_->isFull()) {
        std::this_thread::sleep_for(std::chrono::microseconds(100));
      }
      record("event" + std::to_string(n), {{"n", n}});
      if (n % 64 == 0) {
        shared_->committed = recorder_->counters().committed;
      }
    }
  }

  Shared* shared_;
};

TEST_F(RecorderCrash, KilledAtFullSpeedTheFileIsSoundAndHoldsWhatWasCommitted) {
  std::uint64_t known = 0;
  for (std::uint64_t round = 1; round <= 3; ++round) {
    shared_->committed = 0;
    ChildProcess child([this] { writeForEver(); });
    ASSERT_TRUE(eventually([&] { return shared_->committed > 5'000 * round; }));
    child.killAndWait();
    known += shared_->committed;
    EXPECT_EQ(askOne(file(), "PRAGMA integrity_check"), "ok");
    const std::uint64_t held = std::stoull(askOne(file(), "SELECT count(*) FROM events"));
    EXPECT_GE(held, known);
    known = held;
    EXPECT_EQ(askOne(file(), "SELECT min(id), max(id) - count(*) FROM events"), "1|0");
  }
  EXPECT_EQ(filesSetAside().size(), 0U);
}

TEST_F(RecorderCrash, TheNextRunGoesOnBehindTheLastCommittedEvent) {
  {
    ChildProcess child([this] { writeForEver(); });
    ASSERT_TRUE(eventually([&] { return shared_->committed > 1'000; }));
  }
  start();
  record("next");
  ASSERT_TRUE(flush());
  EXPECT_EQ(errors(), log_.count("recorder lost ")) << "what the kill has cost is all that there is to tell";
  EXPECT_EQ(askOne(file(), "SELECT name FROM events ORDER BY id DESC LIMIT 1"), "next");
  EXPECT_EQ(askOne(file(), "SELECT min(id), max(id) - count(*) FROM events"), "1|0");
}

}  // namespace
}  // namespace tarn::recorder
