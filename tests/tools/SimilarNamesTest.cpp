// SPDX-License-Identifier: Apache-2.0
#include "tools/ctl/SimilarNames.h"

#include <gtest/gtest.h>

namespace tarn::ctl {
namespace {

TEST(SimilarNames, DifferenceInCaseAndPunctuationAloneIsSimilar) {
  EXPECT_TRUE(areSimilar("kvsessionvolume", "KvSessionVolume"));
  EXPECT_TRUE(areSimilar("kv_session-volume", "KvSessionVolume"));
  EXPECT_TRUE(areSimilar("Node", "node"));
}

TEST(SimilarNames, OneWrongLetterIsSimilarInNamesOfFiveLetters) {
  EXPECT_TRUE(areSimilar("methd", "method"));
  EXPECT_TRUE(areSimilar("methood", "method"));
  EXPECT_TRUE(areSimilar("mathod", "method"));
  EXPECT_TRUE(areSimilar("mehtod", "method"));
  EXPECT_FALSE(areSimilar("mathad", "method"));
  EXPECT_FALSE(areSimilar("nodes", "node"));
  EXPECT_FALSE(areSimilar("mode", "node"));
}

TEST(SimilarNames, TwoWrongLettersAreSimilarInNamesOfTenLetters) {
  EXPECT_TRUE(areSimilar("active_divicez", "active_devices"));
  EXPECT_TRUE(areSimilar("active_devic", "active_devices"));
  EXPECT_FALSE(areSimilar("active_divicexy", "active_device"));
  EXPECT_FALSE(areSimilar("abcdefghi", "abcdefgxy"));
  EXPECT_TRUE(areSimilar("abcdefghij", "abcdefghxy"));
  EXPECT_FALSE(areSimilar("abcdefghij", "abcdefgxyz"));
}

TEST(SimilarNames, AUnitAtTheEndIsTakenAway) {
  EXPECT_EQ(withoutUnit("session_duration_ms"), "session_duration");
  EXPECT_EQ(withoutUnit("any_channel_silence_seconds"), "any_channel_silence");
  EXPECT_EQ(withoutUnit("level_dB"), "level");
  EXPECT_EQ(withoutUnit("session_duration"), "session_duration");
  EXPECT_EQ(withoutUnit("status"), "status");
  EXPECT_EQ(withoutUnit("_ms"), "_ms");
  EXPECT_EQ(withoutUnit(""), "");
}

}  // namespace
}  // namespace tarn::ctl
