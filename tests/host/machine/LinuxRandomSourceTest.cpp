// SPDX-License-Identifier: Apache-2.0
#include "host/machine/LinuxRandomSource.h"

#include <gtest/gtest.h>

#include <array>
#include <cstdlib>
#include <limits>

#include "host/machine/LinuxProcessEnvironment.h"

namespace tarn::linux_host {
namespace {

TEST(LinuxRandomSource, ABoundOfZeroOrOneGivesZero) {
  LinuxRandomSource random;

  EXPECT_EQ(random.below(0), 0U);
  EXPECT_EQ(random.below(1), 0U);
}

TEST(LinuxRandomSource, EveryNumberBelowTheBoundComesAboutEquallyOften) {
  LinuxRandomSource random;
  std::array<int, 7> counts{};
  for (int i = 0; i < 70'000; ++i) {
    const auto number = random.below(counts.size());
    ASSERT_LT(number, counts.size());
    ++counts[number];
  }
  // Ten standard deviations (of 93) to each side.
  for (const int count : counts) {
    EXPECT_GT(count, 9'070);
    EXPECT_LT(count, 10'930);
  }
}

TEST(LinuxRandomSource, LargeBoundsAreKept) {
  LinuxRandomSource random;
  constexpr std::uint64_t kBound = (std::uint64_t{1} << 63) + 1;  // nearly every second word is drawn again
  bool aboveHalf = false;
  for (int i = 0; i < 1'000; ++i) {
    const auto number = random.below(kBound);
    ASSERT_LT(number, kBound);
    aboveHalf |= number > kBound / 2;
  }
  EXPECT_TRUE(aboveHalf);
}

TEST(LinuxProcessEnvironment, SetsAndReplacesAVariable) {
  LinuxProcessEnvironment environment;
  ASSERT_TRUE(environment.set("TARN_TEST_VARIABLE", "one").ok());

  ASSERT_TRUE(environment.set("TARN_TEST_VARIABLE", "two").ok());

  EXPECT_STREQ(std::getenv("TARN_TEST_VARIABLE"), "two");
  ::unsetenv("TARN_TEST_VARIABLE");
}

TEST(LinuxProcessEnvironment, RefusesAnImpossibleName) {
  LinuxProcessEnvironment environment;

  const auto error = environment.set("A=B", "x");

  ASSERT_TRUE(error.failed());
  EXPECT_EQ(error->text, "Invalid argument");
}

}  // namespace
}  // namespace tarn::linux_host
