// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <sums/Sums.h>

TEST(Sums, LargerOfTwo) {
  EXPECT_EQ(sums::larger(1, 2), 2);
  EXPECT_EQ(sums::larger(2, 1), 2);
}

TEST(Sums, Limited) {
  EXPECT_EQ(sums::limited(4), 4);
  EXPECT_EQ(sums::limited(7), 5);
}

TEST(Sums, StepsInTheirOrder) {
  EXPECT_EQ(sums::steps(false), (std::vector<std::string>{"one", "two"}));
  EXPECT_EQ(sums::steps(true), (std::vector<std::string>{"one"}));
}

TEST(Sums, Small) {
  EXPECT_TRUE(sums::isSmall(9));
  EXPECT_FALSE(sums::isSmall(10));
}

TEST(Sums, RefusesANegativeNumber) {
  sums::refuseNegative(0);
  EXPECT_DEATH(sums::refuseNegative(-1), "");
}
