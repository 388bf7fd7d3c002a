// SPDX-License-Identifier: Apache-2.0
#include "tests/support/Seeds.h"

#include <gtest/gtest.h>

#include <optional>

namespace tarn::testing {
namespace {

class Seeds : public ::testing::Test {
 protected:
  Seeds() {
    if (const char* const value = std::getenv(kSeedVariable)) {
      before_ = value;
    }
    ::unsetenv(kSeedVariable);
  }
  ~Seeds() override {
    if (before_) {
      ::setenv(kSeedVariable, before_->c_str(), 1);
    } else {
      ::unsetenv(kSeedVariable);
    }
  }
  static void ask(const char* value) { ::setenv(kSeedVariable, value, 1); }

 private:
  std::optional<std::string> before_;
};

TEST_F(Seeds, AreTheFixedOneAndAFreshOne) {
  const auto first = testSeeds(7);
  const auto second = testSeeds(7);
  const auto third = testSeeds(7);
  ASSERT_EQ(first.size(), 2U);
  EXPECT_EQ(first[0], 7U);
  // Three of 32 bits that are all the same come from no random device.
  EXPECT_FALSE(first[1] == second[1] && second[1] == third.at(1));
}

TEST_F(Seeds, AreTheOneThatIsAskedForAlone) {
  ask("18446744073709551615");
  EXPECT_EQ(testSeeds(7), std::vector<std::uint64_t>{18446744073709551615U});
  ask("0");
  EXPECT_EQ(testSeeds(7), std::vector<std::uint64_t>{0});
}

TEST_F(Seeds, AreRefusedWhenWhatIsAskedForIsNoNumber) {
  for (const char* const wrong : {"", "x", "-1", "7x", " 7", "18446744073709551616"}) {
    SCOPED_TRACE(wrong);
    ask(wrong);
    EXPECT_THROW(static_cast<void>(testSeeds(7)), std::invalid_argument);
  }
}

TEST_F(Seeds, ArePrintedWithTheWayToRepeatThem) {
  ::testing::internal::CaptureStdout();
  const auto seeds = testSeeds(7);
  EXPECT_EQ(::testing::internal::GetCapturedStdout(), seedNote(7) + "\n" + seedNote(seeds.at(1)) + "\n");
  EXPECT_EQ(seedNote(7), "seed 7, to repeat: TARN_TEST_SEED=7");
}

TEST_F(Seeds, ThatWereFreshAreTakenAgain) {
  const std::uint64_t fresh = testSeeds(7).at(1);
  ask(std::to_string(fresh).c_str());
  EXPECT_EQ(testSeeds(7), std::vector<std::uint64_t>{fresh});
}

}  // namespace
}  // namespace tarn::testing
