// SPDX-License-Identifier: Apache-2.0
#include "tools/ctl/views/LiveSource.h"

#include <gtest/gtest.h>

#include "tests/report/StoreFile.h"

namespace tarn::ctl {
namespace {

class LiveSourceLook : public ::testing::Test {
 protected:
  // Nobody listens there.
  ServiceAddress nowhere() const {
    ServiceAddress address;
    address.sockets = {file_.folder() + "/socket"};
    return address;
  }

  testing::StoreFile file_;
  LiveSource source_{nowhere(), file_.path()};
};

TEST_F(LiveSourceLook, TellsWhyTheServiceDoesNotAnswer) {
  const TopSample sample = source_.look();
  EXPECT_FALSE(sample.status);
  EXPECT_NE(sample.whyNot.find("/socket"), std::string::npos) << sample.whyNot;
}

TEST_F(LiveSourceLook, OpenSessionsAreShownTheNewestFirst) {
  file_.session(1, 10, "NULL");
  file_.session(2, 20, "30");
  file_.session(3, 30, "NULL");
  const TopSample sample = source_.look();
  EXPECT_EQ(sample.storeTrouble, "");
  ASSERT_EQ(sample.sessions.size(), 2U);
  EXPECT_EQ(sample.sessions[0].id, 3);
  EXPECT_EQ(sample.sessions[1].id, 1);
  EXPECT_EQ(sample.sessions[1].reporter, 1001);
  EXPECT_EQ(sample.sessions[1].pid, 4711);
  EXPECT_EQ(sample.sessions[1].process, "player");
  EXPECT_EQ(sample.sessions[1].application, "org.example.player");
  EXPECT_EQ(sample.sessions[1].serviceName, "longformaudio");
  EXPECT_EQ(sample.sessions[1].created, 10);
}

TEST_F(LiveSourceLook, FirstLookKnowsLastMessagesAndNoCounts) {
  file_.session(1, 10, "NULL");
  file_.message("1", 11, "Playback.Start");
  file_.message("1", 12, "Playback.Stop");
  const TopSample sample = source_.look();
  ASSERT_EQ(sample.sessions.size(), 1U);
  EXPECT_FALSE(sample.sessions[0].newMessages);
  EXPECT_EQ(sample.sessions[0].lastMessage, "Playback.Stop");
  EXPECT_EQ(sample.sessions[0].lastTime, 12);
}

TEST_F(LiveSourceLook, LaterLooksCountWhatCameMeanwhileEachMessageOnce) {
  file_.session(1, 10, "NULL");
  file_.session(2, 10, "NULL");
  file_.message("1", 11, "Playback.Start");
  static_cast<void>(source_.look());
  for (double time = 12; time < 15; ++time) {
    file_.message("1", time, "Performance.Generic");
    file_.event("1", time, "tally", "sys.oxbow.longformaudio.Performance.Generic", "{}");
    file_.event("1", time, "rtc", "sendMessage", "{}");
  }
  const TopSample second = source_.look();
  ASSERT_EQ(second.sessions.size(), 2U);
  EXPECT_EQ(second.sessions[0].newMessages, 0);
  EXPECT_EQ(second.sessions[1].newMessages, 3);
  EXPECT_EQ(second.sessions[1].lastMessage, "Performance.Generic");
  EXPECT_EQ(second.sessions[1].lastTime, 14);
  const TopSample third = source_.look();
  EXPECT_EQ(third.sessions.at(1).newMessages, 0);
  EXPECT_EQ(third.sessions.at(1).lastMessage, "Performance.Generic");
}

TEST_F(LiveSourceLook, FileThatBeginsAnewIsCountedAnew) {
  file_.session(1, 10, "NULL");
  for (int count = 0; count < 5; ++count) {
    file_.message("1", 11, "Playback.Start");
  }
  static_cast<void>(source_.look());
  file_.sql("DELETE FROM events");
  file_.message("1", 12, "Playback.Stop");
  EXPECT_FALSE(source_.look().sessions.at(0).newMessages);
  file_.message("1", 13, "Playback.Start");
  EXPECT_EQ(source_.look().sessions.at(0).newMessages, 1);
}

TEST_F(LiveSourceLook, StoreThatCanNotBeReadIsTold) {
  LiveSource none(nowhere(), file_.folder() + "/none.sqlite3");
  EXPECT_NE(none.look().storeTrouble.find("/none.sqlite3"), std::string::npos);
  file_.sql("DROP TABLE sessions");
  EXPECT_NE(source_.look().storeTrouble.find("sessions"), std::string::npos);
}

}  // namespace
}  // namespace tarn::ctl
