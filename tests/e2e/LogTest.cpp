// SPDX-License-Identifier: Apache-2.0
// The service's log under clients and readers that mean it no good.
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <csignal>
#include <sstream>

#include "tests/e2e/support/RawSocket.h"
#include "tests/e2e/support/ServiceFixture.h"

namespace tarn::e2e {
namespace {

class Log : public ServiceFixture {
 protected:
  // Lines of the log that hold this.
  int lines(const std::string& text) const {
    std::istringstream log(serviceLog());
    int count = 0;
    for (std::string line; std::getline(log, line);) {
      count += line.find(text) != std::string::npos ? 1 : 0;
    }
    return count;
  }
};

TEST_F(Log, ThatNobodyReadsStopsNothing) {
  const std::string pipe = directory_ / "pipe";
  ASSERT_EQ(::mkfifo(pipe.c_str(), 0600), 0);
  const int reader = ::open(pipe.c_str(), O_RDWR | O_CLOEXEC);  // holds it open and never reads
  ASSERT_TRUE(startService({"--log-target", pipe, "--log-level", "debug"}));
  const auto client = connect();
  EXPECT_TRUE(client->call(client::createReportingSession(1)).ok());
  EXPECT_EQ(client->send(client::startReportingSessionForID(1)), client::SendStatus::Sent);
  for (int index = 0; index < 1000; ++index) {
    ASSERT_TRUE(
        client->call(client::sendMessage({{"number", index}}, 4, 1, std::vector<std::int64_t>{1}), kDeadline).ok());
  }
  EXPECT_EQ(stopService(SIGTERM), 0);
  EXPECT_EQ(events("sys.oxbow.tarnkit.Playback.Start").size(), 1000U);
  ::close(reader);
}

TEST_F(Log, AFloodOfOneClientIsToldOnceAndCounted) {
  ASSERT_TRUE(startService());
  const auto client = connect();
  for (int index = 0; index < 1000; ++index) {
    ASSERT_TRUE(client->call(client::stopReportingSessionForID(77)).ok());
  }
  EXPECT_EQ(stopService(SIGTERM), 0);
  EXPECT_EQ(lines("Stop called, but session==nil"), 100);
  const std::string who = " of process " + std::to_string(::getpid()) + ", uid " + std::to_string(::getuid()) + ", /";
  EXPECT_EQ(lines("900 lines like that from connection "), 3);  // the three lines that each call makes
  EXPECT_TRUE(logWillSay(who)) << serviceLog();
}

TEST_F(Log, ACutConnectionNamesWhoAndWhy) {
  ASSERT_TRUE(startService());
  RawSocket raw(socket());
  ASSERT_TRUE(raw.send(std::string(4, '\xff')));
  EXPECT_TRUE(raw.isAtEnd());
  EXPECT_EQ(stopService(SIGTERM), 0);
  const std::string who = " of process " + std::to_string(::getpid()) + ", uid " + std::to_string(::getuid()) + ", /";
  EXPECT_EQ(lines("cut off connection "), 1);
  EXPECT_NE(serviceLog().find(who, serviceLog().find("cut off connection ")), std::string::npos);
  EXPECT_TRUE(logWillSay(": frame of 4294967295 bytes")) << serviceLog();
}

TEST_F(Log, NoClientForgesAnEntryOrSteersATerminal) {
  ASSERT_TRUE(startService());
  const auto client = connect();
  const std::string forged = "1999-01-01T00:00:00.000000Z error tarnrs forged";
  ASSERT_TRUE(client->call(client::createReportingSession(1)).ok());
  ASSERT_TRUE(
      client->call(client::setConfiguration({{"HostApplicationDisplayID", "app\n" + forged + "\x1b[2J\u202e"}}, 1))
          .ok());
  ASSERT_TRUE(client->call(client::stopReportingSessionForID(1)).ok());  // never started, which is told with all of it
  EXPECT_EQ(stopService(SIGTERM), 0);
  EXPECT_TRUE(logWillSay("HostApplicationDisplayID=app\n\t" + forged + "\\u001b[2J\\u202e")) << serviceLog();
  EXPECT_FALSE(logSays("\n" + forged));
  EXPECT_FALSE(logSays("\x1b"));
}

}  // namespace
}  // namespace tarn::e2e
