// SPDX-License-Identifier: Apache-2.0
#include "session/TarnReportingSessionPreviousValues.h"
#include "tests/support/Seeds.h"

#include <gtest/gtest.h>

#include <random>

namespace tarn {
namespace {

TEST(TarnReportingSessionPreviousValues, LatestValueOfAKeyWins) {
  TarnReportingSessionPreviousValues values;
  values.merge({{"a", 1}, {"b", 1}});
  values.merge({{"b", 2}, {"c", 2}});
  values.merge({{"a", 3}, {"b", 3}});
  EXPECT_EQ(values.dictionary(), (plist::Dictionary{{"a", 3}, {"b", 3}, {"c", 2}}));
  EXPECT_EQ(values.get("b").asInt64(), 3);
  EXPECT_FALSE(values.get("d").present());
  EXPECT_EQ(values.size(), 3U);
}

TEST(TarnReportingSessionPreviousValues, MergeOfAnotherSessionsValues) {
  TarnReportingSessionPreviousValues old;
  old.merge({{"a", 1}, {"b", 1}});
  TarnReportingSessionPreviousValues values;
  values.merge(old);
  values.merge({{"b", 2}});
  EXPECT_EQ(values.dictionary(), (plist::Dictionary{{"a", 1}, {"b", 2}}));
}

TEST(TarnReportingSessionPreviousValues, AnotherSessionsValuesWinOverOwnOnes) {
  TarnReportingSessionPreviousValues other;
  plist::Dictionary model{{"own", 1}, {"key0", "own"}, {"key29", "own"}};
  TarnReportingSessionPreviousValues values;
  values.merge(model);
  for (int i = 0; i < 30; ++i) {  // more shapes than are kept whole
    const plist::Dictionary payload{{"key" + std::to_string(i), i}, {"last", i}};
    other.merge(payload);
    model.merge(payload);
  }
  values.merge(other);
  EXPECT_EQ(values.dictionary(), model);
  EXPECT_EQ(values.get("key0").asInt64(), 0);
  EXPECT_EQ(values.get("last").asInt64(), 29);
}

TEST(TarnReportingSessionPreviousValues, ManyShapesMergeAsOneByOne) {
  for (const std::uint64_t seed : testing::testSeeds(1)) {
    SCOPED_TRACE(testing::seedNote(seed));
    std::mt19937 random(seed);
    TarnReportingSessionPreviousValues values;
    plist::Dictionary model;
    for (int i = 0; i < 5000; ++i) {
      plist::Dictionary payload;
      for (std::size_t keys = random() % 4; keys > 0; --keys) {
        payload.set(plist::Key("key" + std::to_string(random() % 12)), i);
      }
      values.merge(payload);
      model.merge(payload);
    }
    EXPECT_EQ(values.dictionary(), model);
    for (const auto& entry : model) {
      EXPECT_EQ(values.get(entry.key), entry.value);
    }
  }
}

}  // namespace
}  // namespace tarn
