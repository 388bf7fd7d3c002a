// SPDX-License-Identifier: Apache-2.0
#include "testing/FakeCommandRunner.h"

#include <gtest/gtest.h>

namespace tarn::testing {
namespace {

using namespace std::chrono_literals;
using platform::CommandEnd;

TEST(FakeCommandRunner, ACommandThatNobodyDescribedIsNotFound) {
  FakeCommandRunner runner;
  auto started = runner.start("/usr/bin/tool", 60s);
  ASSERT_FALSE(started.failed());

  EXPECT_EQ(started.value->readLine(100), std::nullopt);
  EXPECT_EQ(started.value->close().status, CommandEnd::kNotFound);
}

TEST(FakeCommandRunner, GivesTheOutputInLinesAndPieces) {
  FakeCommandRunner runner;
  runner.describe("tool", {"one\ntwotwotwo\nend", {}, {}});
  auto started = runner.start("tool", 60s);

  EXPECT_EQ(started.value->readLine(5), "one\n");
  EXPECT_EQ(started.value->readLine(5), "twotw");
  EXPECT_EQ(started.value->readLine(5), "otwo\n");
  EXPECT_EQ(started.value->readLine(5), "end");
  EXPECT_EQ(started.value->readLine(5), std::nullopt);
  EXPECT_FALSE(runner.runs().at(0).closed);
  EXPECT_EQ(started.value->close().kind, CommandEnd::Kind::Exited);
  EXPECT_TRUE(runner.runs().at(0).closed);
  EXPECT_EQ(runner.runs().at(0).timeLimit, 60s);
}

TEST(FakeCommandRunner, AHangingCommandGivesWhatItPrintedAndTimesOut) {
  FakeCommandRunner runner;
  runner.describeHanging("tool", "begun\n");
  auto started = runner.start("tool", 60s);

  EXPECT_EQ(started.value->readLine(100), "begun\n");
  EXPECT_EQ(started.value->readLine(100), std::nullopt);
  EXPECT_EQ(started.value->close().kind, CommandEnd::Kind::TimedOut);
}

TEST(FakeCommandRunner, ARefusedCommandDoesNotRun) {
  FakeCommandRunner runner;
  runner.describe("tool", {"", {}, Error{11, "no more processes"}});

  const auto started = runner.start("tool", 60s);

  ASSERT_TRUE(started.failed());
  EXPECT_EQ(started.error->code, 11);
  EXPECT_TRUE(runner.runs().empty());
}

}  // namespace
}  // namespace tarn::testing
