// SPDX-License-Identifier: Apache-2.0
// How many events may wait at the pace of a slow disk or processor. The fakes hold a call of the disk up while the
// manual clock is moved, so the recorder measures what the test wants.
#include <sys/resource.h>

#include <atomic>
#include <thread>

#include "tests/recorder/RecorderFixture.h"
#include "tests/recorder/faults/FaultyFiles.h"

namespace tarn::recorder {
namespace {

using std::chrono::milliseconds;

class RecorderPace : public RecorderFixture {
 protected:
  RecorderPace() {
    options_.oldestWaiting = std::chrono::seconds(30);
    options_.verifyInterval = options_.verifyRest = options_.maintenanceInterval = std::chrono::hours(1);
  }
  ~RecorderPace() override { stop(); }  // before its files go

  // A recorder that has looked at its file and is at rest.
  void startAndRest() {
    recorder_ = std::make_unique<Recorder>(options_, log_, clock_);
    recorder_->setRoomHandler([this] { ++rooms_; });
    recorder_->start();
    for (int i = 0; i < 2; ++i) {
      record("first");
      ASSERT_TRUE(flush());
    }
  }
  // One commit of so many events, of whose transaction a call takes so long.
  void commitSlowly(int events, FaultyFiles::Call call, milliseconds duration) {
    files_.stall(call);
    recordMany(events);
    std::thread flushing([this] { EXPECT_TRUE(flush()); });
    EXPECT_TRUE(eventually([this] { return files_.isStalled(); }));
    clock_.advance(duration);
    files_.letGo();
    flushing.join();
  }

  FaultyFiles files_;
  std::atomic<int> rooms_{0};
};

TEST_F(RecorderPace, NothingComesInWhileASlowCommitIsUnderWay) {
  options_.groupTime = options_.quietTime = milliseconds(1);
  startAndRest();
  commitSlowly(1, FaultyFiles::Call::Sync, milliseconds(100));
  EXPECT_FALSE(recorder_->isFull());

  files_.stall(FaultyFiles::Call::Sync);
  record("waits for its commit");
  EXPECT_TRUE(eventually([this] { return files_.isStalled(); }));
  EXPECT_TRUE(recorder_->isFull());
  EXPECT_EQ(rooms_, 0);

  files_.letGo();
  EXPECT_TRUE(eventually([this] { return rooms_ == 1; }));
  EXPECT_FALSE(recorder_->isFull());
}

TEST_F(RecorderPace, FastCommitsLetEventsInAllTheWhile) {
  options_.groupTime = options_.quietTime = milliseconds(1);
  startAndRest();
  files_.stall(FaultyFiles::Call::Sync);
  record("waits for its commit");
  EXPECT_TRUE(eventually([this] { return files_.isStalled(); }));
  EXPECT_FALSE(recorder_->isFull());
  files_.letGo();
}

TEST_F(RecorderPace, WriterGoesAheadWhereThatIsPermitted) {
  const auto niceness = [] { return ::getpriority(PRIO_PROCESS, 0); };
  int permitted = 0;
  std::thread([&] {
    static_cast<void>(::setpriority(PRIO_PROCESS, 0, niceness() - 5));
    permitted = niceness();
  }).join();
  std::atomic<int> writers{100};
  options_.highWaterEvents = 1;
  recorder_ = std::make_unique<Recorder>(options_, log_, clock_);
  recorder_->setRoomHandler([&] { writers = niceness(); });
  recorder_->start();

  record("makes it full");

  EXPECT_TRUE(eventually([&writers] { return writers != 100; }));
  EXPECT_EQ(writers, permitted);
  stop();
}

}  // namespace
}  // namespace tarn::recorder
