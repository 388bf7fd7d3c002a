// SPDX-License-Identifier: Apache-2.0
// Every line that a client's requests write, whole: category, level, text and order.
#include "tests/service/ServiceFixture.h"

namespace tarn {
namespace {

using namespace testing;

constexpr std::string_view kClient = "tarnrc";
constexpr std::string_view kService = "tarnrs";

class LogLines : public ServiceFixture {
 protected:
  using Lines = std::vector<std::string>;

  LogLines() : client_(connect(41)) { platform_.log.clear(); }

  // The lines of the category since the last call, which are then forgotten with all others.
  Lines take(std::string_view category) {
    Lines found = lines(category);
    platform_.log.clear();
    return found;
  }
  void startQuietly(std::int64_t reporterID) {
    create(client_, reporterID);
    start(client_, reporterID, held_);
    platform_.log.clear();
  }

  Client client_;
  Answer<bool> held_;
};

TEST_F(LogLines, Connecting) {
  connect(42);
  EXPECT_EQ(lines(kClient), (Lines{"debug new client with pid 42"}));
  EXPECT_EQ(lines(kService), (Lines{"default newConnection: connection from pid 42"}));
}

TEST_F(LogLines, Create) {
  create(client_, 10);
  EXPECT_EQ(take(kClient),
            (Lines{"default creating session for reporter 10", "default session created for reporter 10"}));
}

TEST_F(LogLines, SetServiceType) {
  create(client_, 10);
  platform_.log.clear();
  const Lines expected{"default setting service type 3 for reporter 10", "default service type 3 set for reporter  10"};
  retype(client_, 3, 10);
  EXPECT_EQ(take(kClient), expected);
  retype(client_, 3, 10);
  EXPECT_EQ(platform_.log.count("setting service type haptics"), 1U);  // an equal type is set again
  EXPECT_EQ(take(kClient), expected);
  retype(client_, 3, 0);
  EXPECT_EQ(take(kClient),
            (Lines{"default setting service type 3 for reporter 0", "default service type 3 set for reporter  0"}));
}

TEST_F(LogLines, GetServiceName) {
  serviceType(client_, 0);
  EXPECT_EQ(take(kClient), (Lines{"default fetching seviceType"}));
}

TEST_F(LogLines, SetConfiguration) {
  configure(client_, {}, 10);
  EXPECT_EQ(take(kClient), (Lines{"default setting configuration"}));
}

TEST_F(LogLines, Start) {
  create(client_, 10);
  platform_.log.clear();
  const std::string session =
      "reporterID=10,serviceName=unknown,ownerPid=41,clientProcessName=player,"
      "HostApplicationDisplayID=Unknown,started=1,singleMessageSession=0";
  start(client_, 10, held_);
  EXPECT_EQ(lines(kService), (Lines{"default sessions for client 41 : (" + session + ")",
                                    "default 1 active reporting session(s) (" + session + ")"}));
  EXPECT_EQ(take(kClient), (Lines{"default starting session for reporter 10"}));
  start(client_, 10, held_);
  EXPECT_EQ(lines(kService), Lines{});
  EXPECT_EQ(take(kClient), (Lines{"default starting session for reporter 10"}));
}

TEST_F(LogLines, SendMessage) {
  create(client_, 10);
  platform_.log.clear();
  send(client_, {{"a", 1}}, std::vector<std::int64_t>{10});
  EXPECT_EQ(lines(kService), (Lines{"info found reporting session 10 for client 41"}));
  EXPECT_EQ(take(kClient), (Lines{"debug sending message for reporter (10)"}));
}

TEST_F(LogLines, SendMessageWithoutIDs) {
  const Client other = connect(42);
  platform_.log.clear();
  send(client_, {{"a", 1}}, std::nullopt);
  // The lists are asked for twice: to find the sessions and to tell them.
  EXPECT_EQ(lines(kService),
            (Lines{"default sessions for client 41 : ()", "default sessions for client 42 : ()",
                   "default sessions for client 41 : ()", "default sessions for client 42 : ()",
                   "default 0 active reporting session(s) ()", "default Creating singleMessageSession"}));
  EXPECT_EQ(take(kClient), (Lines{"debug sending message for reporter (null)"}));
}

TEST_F(LogLines, SendMessageToNobody) {
  send(client_, {{"a", 1}}, std::vector<std::int64_t>{0, 99});
  EXPECT_EQ(lines(kService), (Lines{"error failed to find reporting session 99"}));
  platform_.log.clear();
  service_->setReportingEnabled(false);
  service_->findReportingSessionForID(99);
  EXPECT_EQ(lines(kService), Lines{});
}

TEST_F(LogLines, Stop) {
  startQuietly(10);
  stop(client_, 10);
  EXPECT_EQ(lines(kService),
            (Lines{"default sessions for client 41 : ()", "default 0 active reporting session(s) ()"}));
  EXPECT_EQ(take(kClient), (Lines{"default stopping session for reporter 10", "default stopping 10"}));
}

TEST_F(LogLines, StopOfWhatDoesNotRun) {
  create(client_, 10);
  platform_.log.clear();
  stop(client_, 10);
  EXPECT_EQ(take(kClient), (Lines{"default stopping session for reporter 10",
                                  "error Stop called, but session==nil or session.started==false. reporterID=10 "
                                  "session=reporterID=10,serviceName=unknown,ownerPid=41,clientProcessName=player,"
                                  "HostApplicationDisplayID=Unknown,started=0,singleMessageSession=0 session.started=0",
                                  "default stopping 10"}));
  stop(client_, 0);
  EXPECT_EQ(lines(kService), Lines{});
  EXPECT_EQ(take(kClient), (Lines{"default stopping session for reporter 0"}));
}

TEST_F(LogLines, Destroy) {
  startQuietly(10);
  destroy(client_, 10);
  EXPECT_EQ(lines(kService),
            (Lines{"default sessions for client 41 : ()", "default 0 active reporting session(s) ()"}));
  EXPECT_EQ(take(kClient), (Lines{"default destroying session for reporter 10", "default destroying 10"}));
  destroy(client_, 0);
  EXPECT_EQ(take(kClient), (Lines{"default destroying session for reporter 0", "default destroying 0"}));
}

TEST_F(LogLines, DestroyIsToldBeforeTheListOfWhatRuns) {
  create(client_, 10);
  platform_.log.clear();
  destroy(client_, 10);
  EXPECT_EQ(platform_.log.messages(),
            (Lines{"destroying session for reporter 10", "deallocing this session 10", "destroying 10",
                   "sessions for client 41 : ()", "0 active reporting session(s) ()"}));
}

TEST_F(LogLines, Questions) {
  Answer<plist::Dictionary> reporter;
  client_.remote().reporterID(10, reporter.reply());
  platform_.runUntilIdle();
  EXPECT_EQ(take(kClient), (Lines{"default validating reporter 10"}));
  Answer<std::vector<std::int64_t>> all;
  client_.remote().getAllReporters(all.reply());
  platform_.runUntilIdle();
  EXPECT_EQ(take(kClient), Lines{});
}

TEST_F(LogLines, KillService) {
  client_.remote().killService();
  platform_.runUntilIdle();
  EXPECT_EQ(take(kClient), (Lines{"default DESTROYING SERVICE"}));
}

TEST_F(LogLines, ConnectionLoss) {
  client_.connection->interrupt();
  EXPECT_EQ(take(kService), (Lines{"default interruptionHandler: connection exited"}));
  client_.connection->invalidate();
  EXPECT_EQ(take(kService), (Lines{"default invalidationHandler: connection exited process=player uptime_sec=0"}));
  platform_.runUntilIdle();
  EXPECT_EQ(lines(kClient), (Lines{"default removing 41 from the server client list",
                                   "default dealloc 41 from the server client list"}));
}

TEST_F(LogLines, LossOfANamelessClient) {
  const Client nameless = connect(43, std::nullopt);
  platform_.log.clear();
  nameless.connection->invalidate();
  EXPECT_EQ(lines(kService), (Lines{"default invalidationHandler: connection exited process=(null) uptime_sec=0",
                                    "default clientProcessName is nil. clientpid=43"}));
  EXPECT_TRUE(platform_.tally.payloads("sys.oxbow.tarnkit.tarnreportingclientuptime").empty());
}

TEST_F(LogLines, LossOfANamelessClientBeforeItsTime) {
  const Client nameless = connect(43, std::nullopt);
  platform_.clock.setEpochSeconds(platform_.clock.epochSeconds() - 1);
  platform_.log.clear();
  nameless.connection->invalidate();
  EXPECT_EQ(lines(kService), (Lines{"default clientStartDate is in the past. clientpid=43 clientprocessname=(null)",
                                    "default invalidationHandler: connection exited process=(null) uptime_sec=1",
                                    "default clientProcessName is nil. clientpid=43"}));
}

TEST_F(LogLines, EndOfTheService) {
  service_.reset();
  EXPECT_EQ(take(kService), (Lines{"default destroying service"}));
}

TEST_F(LogLines, ModulesAreThoseOfTheStatements) {
  create(client_, 10);
  send(client_, {{"a", 1}}, std::nullopt);
  for (const auto& entry : platform_.log.entries()) {
    if (entry.category == kClient) {
      EXPECT_EQ(entry.module, "TarnReportingClientServerInstance");
    } else if (entry.category == kService) {
      EXPECT_EQ(entry.module, "TarnReportingService");
    }
  }
}

}  // namespace
}  // namespace tarn
