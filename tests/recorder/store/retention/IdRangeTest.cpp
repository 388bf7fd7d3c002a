// SPDX-License-Identifier: Apache-2.0
#include "recorder/store/retention/IdRange.h"

#include <gtest/gtest.h>

namespace tarn::recorder {
namespace {

TEST(IdRange, WhatRisingRangesHaveInCommon) {
  using Ranges = std::vector<IdRange>;
  EXPECT_EQ(commonOf({{1, 5}, {8, 20}}, {{4, 9}, {11, 12}, {20, 30}}), (Ranges{{4, 5}, {8, 9}, {11, 12}, {20, 20}}));
  EXPECT_EQ(commonOf({}, {{1, 2}}), Ranges());
  EXPECT_EQ(commonOf({{1, 2}}, {{3, 4}}), Ranges());
}

}  // namespace
}  // namespace tarn::recorder
