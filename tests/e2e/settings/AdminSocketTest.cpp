// SPDX-License-Identifier: Apache-2.0
// Who may end the service and see others' sessions, over which socket.
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <unistd.h>

#include <csignal>
#include <cstring>

#include "tests/e2e/support/ServiceFixture.h"

namespace tarn::e2e {
namespace {

using Identifiers = std::vector<std::int64_t>;

class AdminSocket : public ServiceFixture {
 protected:
  std::string adminSocket() const { return socket() + "-admin"; }
  std::string separate() {
    writeFile(directory_ / "separate.toml", "[access]\nadmin = \"separate\"\n");
    return directory_ / "separate.toml";
  }
  static unsigned modeOf(const std::string& path) {
    struct stat status {};
    EXPECT_EQ(::lstat(path.c_str(), &status), 0) << path;
    return status.st_mode & 07777U;
  }
  static std::unique_ptr<client::ClientConnection> connectTo(const std::string& path) {
    auto connected = client::ClientConnection::connect(path);
    EXPECT_TRUE(connected.ok()) << connected.error.text();
    return std::move(connected.value);
  }
  // Connects as a user that isn't root, whom the test lets in.
  std::unique_ptr<client::ClientConnection> connectAs(uid_t user) {
    ::chmod(directory_.path().c_str(), 0711);
    ::chmod(socket().c_str(), 0666);
    EXPECT_EQ(::seteuid(user), 0);
    auto client = connectTo(socket());
    EXPECT_EQ(::seteuid(0), 0);
    return client;
  }
  static std::string resultOf(client::ClientConnection& client, const client::Request& request) {
    const client::Reply reply = client.call(request, kDeadline);
    if (!reply.ok()) return "error " + std::to_string(reply.error.code);
    return reply.results.empty() ? "none" : plist::description(reply.results.front().view());
  }
  static std::string begin(client::ClientConnection& client, std::int64_t reporterID, std::uint16_t type) {
    resultOf(client, client::createReportingSession(reporterID));
    return resultOf(client, client::setServiceType(type, reporterID));
  }
};

TEST_F(AdminSocket, KillIsRefusedOverTheOrdinarySocketAndServedOverTheAdmins) {
  ASSERT_TRUE(startService({"--config", separate()}));
  EXPECT_EQ(modeOf(adminSocket()), 0600u);
  EXPECT_EQ(modeOf(socket()), 0660u);
  const Finished refused = ctl({"kill"});
  EXPECT_EQ(refused.status, 1);
  EXPECT_NE(refused.complaints.find("6 only over the admin socket (give --admin)"), std::string::npos)
      << refused.complaints;
  EXPECT_EQ(status().at("requests_refused").at("admin_only"), 1);
  EXPECT_EQ(ctl({"--admin", "status"}).status, 0);
  EXPECT_EQ(ctl({"kill", "--admin"}).status, 0);
  EXPECT_EQ(service().wait(), 2);
  EXPECT_NE(::access(adminSocket().c_str(), F_OK), 0);  // it is removed as the other one is
}

TEST_F(AdminSocket, SharedIsAsEverAlsoBesideANamedAdminSocket) {
  ASSERT_TRUE(startService({"--admin-socket", directory_ / "named"}));
  EXPECT_EQ(modeOf(directory_ / "named"), 0600u);
  EXPECT_TRUE(connectTo(directory_ / "named")->call(client::status(), kDeadline).ok());
  EXPECT_EQ(ctl({"kill"}).status, 0);
  EXPECT_EQ(service().wait(), 2);
}

TEST_F(AdminSocket, ThereIsNoneWhereNobodyAsksForIt) {
  ASSERT_TRUE(startService());
  EXPECT_NE(::access(adminSocket().c_str(), F_OK), 0);
  EXPECT_EQ(ctl({"--admin", "status"}).status, 69);
}

TEST_F(AdminSocket, SessionsOfTheSameUserAreSeenOverEitherSocket) {
  ASSERT_TRUE(startService({"--config", separate()}));
  const auto first = connect();
  const auto second = connect();
  const auto admin = connectTo(adminSocket());
  begin(*first, 7, 3);
  begin(*admin, 8, 4);
  EXPECT_EQ(resultOf(*second, client::getAllReporters()), "(7, 8)");
  EXPECT_EQ(resultOf(*second, client::reporterID(7)), "{reporterID = 7; serviceType = 3}");
  EXPECT_EQ(resultOf(*second, client::getServiceNameForReporterID(8)), "4");
  EXPECT_EQ(resultOf(*admin, client::getAllReporters()), "(7, 8)");
}

// The other users as whom this process may connect: only root has any.
std::vector<uid_t> otherUsers() {
  return ::geteuid() == 0 ? std::vector<uid_t>{65534} : std::vector<uid_t>{};
}

class AdminSocketOfTwoUsers : public AdminSocket, public ::testing::WithParamInterface<uid_t> {};
INSTANTIATE_TEST_SUITE_P(AsRoot, AdminSocketOfTwoUsers, ::testing::ValuesIn(otherUsers()));

TEST_P(AdminSocketOfTwoUsers, AnothersSessionsAreNotSeenButReached) {
  ASSERT_TRUE(startService({"--config", separate()}));
  const auto mine = connect();
  const auto theirs = connectAs(GetParam());
  const auto admin = connectTo(adminSocket());
  begin(*mine, 7, 3);
  begin(*mine, 9, 5);
  begin(*theirs, 8, 4);
  begin(*theirs, 9, 6);
  resultOf(*mine, client::startReportingSessionForID(1));  // unknown: answered at once
  EXPECT_EQ(resultOf(*theirs, client::getAllReporters()), "(8, 9)");
  EXPECT_EQ(resultOf(*mine, client::getAllReporters()), "(7, 9)");
  EXPECT_EQ(resultOf(*admin, client::getAllReporters()), "(7, 9, 8, 9)");
  EXPECT_EQ(resultOf(*theirs, client::reporterID(7)), "{reporterID = 0; serviceType = 65535}");
  EXPECT_EQ(resultOf(*mine, client::reporterID(8)), "{reporterID = 0; serviceType = 65535}");  // root is a user, too
  EXPECT_EQ(resultOf(*theirs, client::reporterID(9)), "{reporterID = 9; serviceType = 6}");
  EXPECT_EQ(resultOf(*theirs, client::getServiceNameForReporterID(7)), "65535");
  EXPECT_EQ(resultOf(*admin, client::getServiceNameForReporterID(8)), "4");
  EXPECT_EQ(resultOf(*theirs, client::killService()), "error 6");

  // A message reaches whose session it names; the answer is that to an unknown one.
  EXPECT_EQ(mine->send(client::startReportingSessionForID(7)), client::SendStatus::Sent);
  EXPECT_EQ(resultOf(*theirs, client::sendMessage({{"a", 1}}, 4, 1, Identifiers{7})), "none");
  EXPECT_EQ(resultOf(*theirs, client::sendMessage({{"a", 1}}, 4, 1, Identifiers{12345})), "none");
  EXPECT_EQ(eventsOnceThereAre(1, "sys.oxbow.tarnkit.Playback.Start").size(), 1u);

  const auto usersSeen = [](client::ClientConnection& client) {
    const client::Reply reply = client.call(client::status(), kDeadline);
    std::string seen;
    const plist::Dictionary status = reply.results.at(0).view().dictionary();
    for (const auto& user : status.get("quotas").dictionary().get("users").dictionary()) {
      seen += std::string(user.key.text()) + " ";
    }
    return seen + std::to_string(status.get("sessions").asInt64());
  };
  EXPECT_EQ(usersSeen(*theirs), "65534 4");
  EXPECT_EQ(usersSeen(*mine), "0 4");
  EXPECT_NE(usersSeen(*admin).find("65534 "), std::string::npos);
  EXPECT_NE(usersSeen(*admin).find("0 "), std::string::npos);
}

TEST_F(AdminSocket, APairIsTakenFromTheServiceManager) {
  const auto listenAt = [](const std::string& path) {
    const int listener = ::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    std::memcpy(address.sun_path, path.data(), path.size());
    EXPECT_EQ(::bind(listener, reinterpret_cast<const sockaddr*>(&address), sizeof address), 0);
    EXPECT_EQ(::listen(listener, 16), 0);
    return listener;
  };
  Process::Setup setup = serviceSetup({"--config", separate()});
  setup.listenFd = listenAt(socket());
  setup.adminListenFd = listenAt(adminSocket());
  service_ = std::make_unique<Process>(setup, directory_);
  ::close(setup.listenFd);
  ::close(setup.adminListenFd);
  EXPECT_EQ(ctl({"kill"}).status, 1);
  EXPECT_EQ(ctl({"--admin", "kill"}).status, 0);
  EXPECT_EQ(service().wait(), 2);
  EXPECT_EQ(::access(socket().c_str(), F_OK), 0);  // the manager's
  EXPECT_EQ(::access(adminSocket().c_str(), F_OK), 0);
}

TEST_F(AdminSocket, ItStandsBesideAHandedOverSocketWhereNoneIsHandedOver) {
  const int listener = ::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
  sockaddr_un address{};
  address.sun_family = AF_UNIX;
  std::memcpy(address.sun_path, socket().data(), socket().size());
  ASSERT_EQ(::bind(listener, reinterpret_cast<const sockaddr*>(&address), sizeof address), 0);
  ASSERT_EQ(::listen(listener, 16), 0);
  Process::Setup setup = serviceSetup({"--config", separate()});
  setup.listenFd = listener;
  service_ = std::make_unique<Process>(setup, directory_);
  ::close(listener);
  ASSERT_EQ(ctl({"status"}).status, 0);
  EXPECT_EQ(modeOf(adminSocket()), 0600u);
  EXPECT_EQ(ctl({"--admin", "kill"}).status, 0);
  EXPECT_EQ(service().wait(), 2);
}

TEST_F(AdminSocket, AReloadTellsThatItWaitsForARestart) {
  writeFile(directory_ / "c.toml", "");
  ASSERT_TRUE(startService({"--config", directory_ / "c.toml"}));
  writeFile(directory_ / "c.toml", "[access]\nadmin = \"separate\"\n");
  service().signal(SIGHUP);
  EXPECT_TRUE(logWillSay("access.admin"));
  EXPECT_EQ(ctl({"kill"}).status, 0);
  EXPECT_EQ(service().wait(), 2);
}

}  // namespace
}  // namespace tarn::e2e
