// SPDX-License-Identifier: Apache-2.0
#include "recorder/NewestMessages.h"

#include <gtest/gtest.h>

namespace tarn::recorder {
namespace {

using plist::Dictionary;

class NewestMessagesTest : public ::testing::Test {
 protected:
  static Dictionary message(const char* tag, int volume, double stamp = 1) {
    return {{"audiotag", tag},
            {"volume", volume},
            {"tarnreporting_timestamp", stamp},
            {"systemuptime_sec", stamp},
            {"processuptime_ms", stamp}};
  }
  NewestMessages newest_;
};

TEST_F(NewestMessagesTest, FindTheEventThatSaysTheSameAtAnotherTime) {
  newest_.begin();
  newest_.note(1, 5, message("PlaybackStart", 3));
  newest_.note(1, 7, message("VolumeGeneric", 3));
  EXPECT_EQ(newest_.find(1, message("PlaybackStart", 3, 2)), 5);
  EXPECT_EQ(newest_.find(1, message("VolumeGeneric", 3, 2)), 7);
  EXPECT_EQ(newest_.find(1, message("PlaybackStart", 4)), 0) << "it says something else";
  EXPECT_EQ(newest_.find(1, message("PlaybackStop", 3)), 0);
  EXPECT_EQ(newest_.find(2, message("PlaybackStart", 3)), 0) << "another session's";
}

TEST_F(NewestMessagesTest, TheFirstOfAMessagesEventsIsItsEvent) {
  newest_.begin();
  const Dictionary payload = message("PlaybackStart", 3);
  newest_.note(1, 5, payload);
  newest_.note(1, 6, payload);
  EXPECT_EQ(newest_.find(1, message("PlaybackStart", 3)), 5);
  newest_.note(1, 8, message("PlaybackStart", 3));
  EXPECT_EQ(newest_.find(1, message("PlaybackStart", 3)), 8) << "a message of its own";
}

TEST_F(NewestMessagesTest, WhatIsNobodysOrNoMessageIsNotNoted) {
  newest_.begin();
  newest_.note(0, 5, message("PlaybackStart", 3));
  newest_.note(1, 6, {{"volume", 3}});
  EXPECT_EQ(newest_.find(0, message("PlaybackStart", 3)), 0);
  EXPECT_EQ(newest_.find(1, {{"volume", 3}}), 0);
}

TEST_F(NewestMessagesTest, WhatWasNotCommittedIsAsItWasBefore) {
  newest_.begin();
  newest_.note(1, 5, message("PlaybackStart", 3));
  newest_.commit();
  newest_.begin();
  newest_.note(1, 6, message("PlaybackStart", 4));
  newest_.note(1, 7, message("PlaybackStart", 5));
  newest_.note(1, 8, message("PlaybackStop", 5));
  newest_.begin();
  EXPECT_EQ(newest_.find(1, message("PlaybackStart", 3)), 5);
  EXPECT_EQ(newest_.find(1, message("PlaybackStop", 5)), 0);
  newest_.note(1, 6, message("PlaybackStart", 4));
  newest_.commit();
  newest_.begin();
  EXPECT_EQ(newest_.find(1, message("PlaybackStart", 4)), 6);
}

TEST_F(NewestMessagesTest, AnEndedSessionIsForgottenWithTheCommit) {
  newest_.begin();
  newest_.note(1, 5, message("PlaybackStart", 3));
  newest_.commit();
  newest_.begin();
  newest_.end(1);
  newest_.begin();
  EXPECT_EQ(newest_.find(1, message("PlaybackStart", 3)), 5) << "its end wasn't committed";
  newest_.end(1);
  newest_.commit();
  EXPECT_EQ(newest_.find(1, message("PlaybackStart", 3)), 0);
}

TEST_F(NewestMessagesTest, BeyondItsBoundsAllIsForgotten) {
  newest_.begin();
  newest_.note(1, 1, message("PlaybackStart", 3));
  for (std::size_t session = 2; session <= NewestMessages::kMost; ++session) {
    newest_.note(static_cast<platform::SessionNumber>(session), 2, message("PlaybackStart", 3));
  }
  EXPECT_EQ(newest_.find(1, message("PlaybackStart", 3)), 1);
  newest_.note(1, 3, message("PlaybackStop", 3));
  EXPECT_EQ(newest_.find(1, message("PlaybackStart", 3)), 0);
  EXPECT_EQ(newest_.find(1, message("PlaybackStop", 3)), 3);
  const Dictionary large{{"audiotag", "Large"}, {"text", std::string(NewestMessages::kMostBytes, 'x')}};
  newest_.note(2, 4, large);
  EXPECT_EQ(newest_.find(2, large), 4);
  newest_.note(2, 5, message("PlaybackStop", 3));
  EXPECT_EQ(newest_.find(2, large), 0);
}

}  // namespace
}  // namespace tarn::recorder
