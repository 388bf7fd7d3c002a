// SPDX-License-Identifier: Apache-2.0
// Every call that the recorder's files take fails once, each in a life of its own: nothing may be lost, doubled or
// taken for damage.
#include "tests/recorder/RecorderFixture.h"
#include "tests/recorder/faults/FaultyFiles.h"

namespace tarn::recorder {
namespace {

using Call = FaultyFiles::Call;
using Fault = FaultyFiles::Fault;

class RecorderOrdinals : public RecorderFixture, public ::testing::WithParamInterface<Call> {
 protected:
  RecorderOrdinals() { options_.firstRetry = options_.lastRetry = std::chrono::milliseconds(1); }
  ~RecorderOrdinals() override { stop(); }  // before the files

  // Two runs of the recorder with a few commits each; how many events.
  int live() {
    for (int run = 0; run < 2; ++run) {
      start();
      for (int commit = 0; commit < 3; ++commit) {
        recordMany(kEvents);
        EXPECT_TRUE(flush());
      }
      stop();
    }
    return 2 * 3 * kEvents;
  }
  void expectWhole(int events, const std::string& what) {
    const std::string count = std::to_string(events);
    ASSERT_EQ(askOne(file(), "SELECT count(*), min(id), max(id) FROM events"), count + "|1|" + count) << what;
    ASSERT_EQ(askOne(file(), "SELECT count(*) FROM events WHERE name <> 'event' || ((id - 1) % " +
                                 std::to_string(kEvents) + ")"),
              "0")
        << what;
    ASSERT_EQ(askOne(file(), "PRAGMA integrity_check"), "ok") << what;
    ASSERT_EQ(filesSetAside().size(), 0U) << what;
  }
  // A folder of its own for each life.
  void moveOn(int life) { options_.file = directory_.path() / std::to_string(life) / "recorder.sqlite3"; }

  static constexpr int kEvents = 5;
  FaultyFiles files_;
};

TEST_P(RecorderOrdinals, LosesAndDoublesNothing) {
  int lives = 0;
  for (const Fault fault : FaultyFiles::kFaults) {
    for (int ordinal = 1;; ++ordinal) {
      moveOn(++lives);
      files_.fail(GetParam(), ordinal, fault);
      const int events = live();
      files_.heal();
      const std::string what = "fault " + std::to_string(static_cast<int>(fault)) + ", call " + std::to_string(ordinal);
      ASSERT_NO_FATAL_FAILURE(expectWhole(events, what));
      if (!files_.hasFailed()) break;
      std::filesystem::remove_all(file().parent_path());
    }
  }
  EXPECT_GT(lives, 8) << "no such call was made";
}

INSTANTIATE_TEST_SUITE_P(Calls, RecorderOrdinals, ::testing::ValuesIn(FaultyFiles::kCalls),
                         [](const auto& tested) { return FaultyFiles::nameOf(tested.param); });

class RecorderReading : public RecorderFixture {
 protected:
  ~RecorderReading() override { stop(); }
  FaultyFiles files_;
};

TEST_F(RecorderReading, AFileThatCanNotBeReadForAWhileIsNotDamaged) {
  start();
  recordMany(2000, 100);
  stop();
  for (const Fault fault : {Fault::InputOutput, Fault::NoMemory}) {
    // From the middle of the file's first look on.
    for (const int ordinal : {1, 5, 20}) {
      log_.clear();
      files_.fail(Call::Read, ordinal, fault, 12);
      start();
      recordMany(1);
      EXPECT_TRUE(flush());
      stop();
      EXPECT_TRUE(files_.hasFailed());
      files_.heal();
      EXPECT_EQ(filesSetAside().size(), 0U);
      EXPECT_EQ(errors(), 1U);
      EXPECT_EQ(log_.count("recorder writes to "), 1U);
    }
  }
  EXPECT_EQ(askOne(file(), "SELECT count(*), max(id) FROM events"), "2006|2006");
}

TEST_F(RecorderReading, OneReadThatIsCutIsLookedAtAgainAndIsNoDamage) {
  start();
  recordMany(2000, 100);
  stop();
  for (int ordinal = 1; ordinal < 40; ++ordinal) {
    files_.fail(Call::Read, ordinal, Fault::Short);
    start().waitUntilOpened();
    stop();
    files_.heal();
    ASSERT_EQ(filesSetAside().size(), 0U) << ordinal;
  }
  EXPECT_EQ(askOne(file(), "SELECT count(*), max(id) FROM events"), "2000|2000");
}

}  // namespace
}  // namespace tarn::recorder
