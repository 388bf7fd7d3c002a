// SPDX-License-Identifier: Apache-2.0
// Which of the recorder's lines tell of a condition that a person acts on.
#include <unistd.h>

#include <filesystem>
#include <fstream>

#include "tests/recorder/RecorderFixture.h"
#include "tests/recorder/faults/ChildProcess.h"
#include "tests/support/ConditionLog.h"

namespace tarn::recorder {
namespace {

using platform::LogCondition;

class RecorderConditions : public RecorderFixture {
 protected:
  // A run on the file as it is; whether it wrote an event.
  bool run() {
    Recorder recorder(options_, conditions_, clock_);
    recorder.start();
    recorder.record("tally", "event", {}, {}, clock_.epochSeconds());
    return recorder.flush(kPatience);
  }

  tarn::testing::ConditionLog conditions_;
};

TEST_F(RecorderConditions, AFileThatIsSetAsideIsOne) {
  std::ofstream(file()) << std::string(10'000, 'x');
  EXPECT_TRUE(run());
  EXPECT_EQ(filesSetAside().size(), 1U);
  EXPECT_EQ(conditions_.countOf(LogCondition::StoreSetAside), 1U);
}

TEST_F(RecorderConditions, AFileThatCannotBeWrittenIsOne) {
  EXPECT_TRUE(run());
  change(file(), "PRAGMA user_version = 99");  // of a newer service, and left alone
  {
    Recorder recorder(options_, conditions_, clock_);
    recorder.start();
    recorder.record("tally", "waits", {}, {}, clock_.epochSeconds());
    EXPECT_TRUE(eventually([this] { return conditions_.countOf(LogCondition::StoreUnwritable) == 1; }));
  }
  EXPECT_EQ(conditions_.countOf(LogCondition::StoreSetAside), 0U);
}

TEST_F(RecorderConditions, CommittedEventsThatAreGoneAreOne) {
  EXPECT_TRUE(run());
  std::filesystem::remove(file());
  EXPECT_TRUE(run());
  EXPECT_EQ(conditions_.countOf(LogCondition::StoreDamaged), 1U);
}

TEST_F(RecorderConditions, ARunThatWasKilledAndLostEventsIsOne) {
  ChildProcess child([this] {
    gatherForLong();
    start().waitUntilOpened();
    recordMany(5);
    ::_exit(0);
  });
  ASSERT_EQ(child.wait(), 0);
  EXPECT_TRUE(run());
  EXPECT_EQ(conditions_.countOf(LogCondition::RunKilled), 1U);
}

TEST_F(RecorderConditions, ARunWithoutAFaultTellsOfNone) {
  EXPECT_TRUE(run());
  EXPECT_TRUE(run());
  for (const LogCondition condition : {LogCondition::StoreSetAside, LogCondition::StoreUnwritable,
                                       LogCondition::StoreDamaged, LogCondition::RunKilled}) {
    EXPECT_EQ(conditions_.countOf(condition), 0U);
  }
}

}  // namespace
}  // namespace tarn::recorder
