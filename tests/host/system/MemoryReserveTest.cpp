// SPDX-License-Identifier: Apache-2.0
#include "host/system/MemoryReserve.h"

#include <gtest/gtest.h>

#include <memory>
#include <stdexcept>

namespace tarn::linux_host {
namespace {

using namespace std::chrono_literals;
using Loss = MemoryReserve::Loss;

class MemoryReserveTest : public ::testing::Test {
 protected:
  void SetUp() override { ASSERT_TRUE(MemoryReserve::hold(0ms)); }
  void TearDown() override {
    EXPECT_TRUE(MemoryReserve::isWhole());
    std::set_new_handler(nullptr);  // other tests of this program let allocations fail without it
  }

  // What operator new does when an allocation fails. False: it throws.
  static bool allocationMayBeTriedAgain() {
    try {
      std::get_new_handler()();
      return true;
    } catch (const std::bad_alloc&) {
      return false;
    }
  }
  static void useUp() {
    for (std::size_t block = 0; block < MemoryReserve::kBlocks; ++block) {
      ASSERT_TRUE(allocationMayBeTriedAgain()) << block;
    }
  }
};

TEST_F(MemoryReserveTest, GivesItsBlocksOneByOneAndThenLetsTheAllocationFail) {
  const std::uint64_t before = MemoryReserve::counts().blocksUsed;
  useUp();
  EXPECT_FALSE(allocationMayBeTriedAgain());
  EXPECT_EQ(MemoryReserve::counts().blocksUsed, before + MemoryReserve::kBlocks);
}

TEST_F(MemoryReserveTest, IsWholeAgainOnceThereIsMemory) {
  useUp();
  EXPECT_TRUE(MemoryReserve::isWhole());
  useUp();
}

TEST_F(MemoryReserveTest, WhatMayBeRefusedFailsAtOnceAndTakesNoBlock) {
  const std::uint64_t before = MemoryReserve::counts().blocksUsed;
  {
    const MemoryReserve::Refusable refusable;
    EXPECT_FALSE(allocationMayBeTriedAgain());
  }
  EXPECT_EQ(MemoryReserve::counts().blocksUsed, before);
  EXPECT_TRUE(allocationMayBeTriedAgain());
}

TEST_F(MemoryReserveTest, ARefusableInsideAnotherLeavesTheOuterOneInForce) {
  const MemoryReserve::Refusable outer;
  { const MemoryReserve::Refusable inner; }
  EXPECT_FALSE(allocationMayBeTriedAgain());
}

TEST_F(MemoryReserveTest, WaitsForWhatOthersFreeWhenNoBlockIsLeftButNotForEver) {
  ASSERT_TRUE(MemoryReserve::hold(3ms));
  useUp();
  EXPECT_TRUE(allocationMayBeTriedAgain());
  EXPECT_TRUE(allocationMayBeTriedAgain());
  EXPECT_TRUE(allocationMayBeTriedAgain());
  EXPECT_FALSE(allocationMayBeTriedAgain());
}

TEST_F(MemoryReserveTest, WaitsAnewAfterItWasWhole) {
  ASSERT_TRUE(MemoryReserve::hold(1ms));
  useUp();
  EXPECT_TRUE(allocationMayBeTriedAgain());
  EXPECT_FALSE(allocationMayBeTriedAgain());
  ASSERT_TRUE(MemoryReserve::isWhole());
  useUp();
  EXPECT_TRUE(allocationMayBeTriedAgain());
}

TEST_F(MemoryReserveTest, WhatIsGivenUpIsCountedByItsKind) {
  const MemoryReserve::Counts before = MemoryReserve::counts();
  EXPECT_FALSE(MemoryReserve::orGiveUp(Loss::Work, [] { throw std::bad_alloc(); }));
  EXPECT_FALSE(MemoryReserve::orGiveUp(Loss::Request, [] { throw std::bad_alloc(); }));
  EXPECT_TRUE(MemoryReserve::orGiveUp(Loss::Connection, [] {}));
  const MemoryReserve::Counts after = MemoryReserve::counts();
  EXPECT_EQ(after.of(Loss::Work), before.of(Loss::Work) + 1);
  EXPECT_EQ(after.of(Loss::Request), before.of(Loss::Request) + 1);
  EXPECT_EQ(after.of(Loss::Connection), before.of(Loss::Connection));
}

TEST_F(MemoryReserveTest, OtherExceptionsPass) {
  EXPECT_THROW(MemoryReserve::orGiveUp(Loss::Work, [] { throw std::runtime_error("another"); }), std::runtime_error);
}

}  // namespace
}  // namespace tarn::linux_host
