// SPDX-License-Identifier: Apache-2.0
// The configuration is read anew by a signal: what is in force after it, what is told, and that no client notices.
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <unistd.h>

#include <csignal>

#include "tests/e2e/support/ServiceFixture.h"

namespace tarn::e2e {
namespace {

// The service manager's end of the notifications.
class NotifySocket {
 public:
  explicit NotifySocket(const std::string& path)
      : socket_(::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0)) {
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    path.copy(address.sun_path, sizeof address.sun_path - 1);
    EXPECT_EQ(::bind(socket_, reinterpret_cast<const sockaddr*>(&address), sizeof address), 0);
  }
  NotifySocket(const NotifySocket&) = delete;
  NotifySocket& operator=(const NotifySocket&) = delete;
  ~NotifySocket() { ::close(socket_); }

  // What was told so far, one datagram each.
  const std::vector<std::string>& told() {
    char text[4096];
    for (ssize_t size = 0; (size = ::recv(socket_, text, sizeof text, 0)) > 0;) {
      told_.emplace_back(text, static_cast<std::size_t>(size));
    }
    return told_;
  }

 private:
  int socket_;
  std::vector<std::string> told_;
};

class Reload : public ServiceFixture {
 protected:
  std::string file() const { return directory_ / "c.toml"; }
  bool startWith(const std::string& configuration) {
    writeFile(file(), configuration);
    return startService({"--config", file()});
  }
  // The log is written by a thread of its own.
  // Another file and the signal; waits until the service has looked at it, and gives the status then.
  json reload(const std::string& configuration) {
    writeFile(file(), configuration);
    const auto reloads = [this] {
      const json now = status();
      return now.at("configuration_generation").get<int>() + now.at("configuration_reloads_refused").get<int>();
    };
    const int before = reloads();
    service_->signal(SIGHUP);
    EXPECT_TRUE(eventually([&] { return reloads() > before; }));
    return status();
  }
};

TEST_F(Reload, AGoodFileIsInForceForClientsThatAreThere) {
  ASSERT_TRUE(startWith("[limits]\nsessions_per_connection = 1\n"));
  const auto client = connect();
  ASSERT_TRUE(client->call(client::createReportingSession(1)).ok());
  EXPECT_FALSE(client->call(client::createReportingSession(2)).ok());
  const json status = reload("[limits]\nsessions_per_connection = 2\n");
  EXPECT_EQ(status.at("configuration_generation"), 1);
  EXPECT_GT(status.at("configuration_reload_time"), 1.7e9);
  EXPECT_TRUE(client->call(client::createReportingSession(2)).ok());
  EXPECT_TRUE(logWillSay("configuration 1 is in force, changed: limits.sessions_per_connection"));
}

TEST_F(Reload, ABadDropInLeavesWhatWasInForceAndIsToldWithFileLineAndKey) {
  ASSERT_TRUE(startWith("[limits]\nsessions_per_connection = 1\n"));
  ASSERT_EQ(::mkdir((file() + ".d").c_str(), 0755), 0);
  writeFile(file() + ".d/x.toml", "\n[limits]\nsession_per_user = 1\n");
  const json status = reload("[limits]\nsessions_per_connection = 2\n");
  const std::string why = file() + ".d/x.toml:3: unknown key \"limits.session_per_user\"";
  EXPECT_EQ(status.at("configuration_generation"), 0);
  EXPECT_EQ(status.at("configuration_reloads_refused"), 1);
  EXPECT_EQ(status.at("configuration_fault"), why);
  EXPECT_EQ(status.at("quotas").at("limits").at("sessions_per_connection"), 1);
  EXPECT_TRUE(logWillSay("configuration 0 stays in force: " + why));
  EXPECT_NE(ctl({"status"}).output.find(why), std::string::npos);
}

TEST_F(Reload, KeysThatNeedARestartAreNamedAndInForceAfterIt) {
  ASSERT_TRUE(startWith(""));
  const std::string changed = "[recorder]\nenabled = false\nmax_age_days = 3\n";
  EXPECT_EQ(reload(changed).at("configuration_waiting"), json({"recorder.enabled"}));
  EXPECT_TRUE(logWillSay("changed: recorder.max_age_days; these changed keys wait for a restart: recorder.enabled"));
  EXPECT_TRUE(connect()->call(client::createReportingSession(1)).ok());
  ASSERT_EQ(stopService(SIGTERM), 0);
  ASSERT_TRUE(startService({"--config", file()}));
  EXPECT_EQ(status().at("configuration_waiting"), json::array());
}

TEST_F(Reload, TheLevelOfTheLogChangesUnlessAnOptionSaysIt) {
  ASSERT_TRUE(startWith("[log]\nlevel = \"error\"\n"));
  EXPECT_FALSE(logSays(" default "));
  reload("[log]\nlevel = \"debug\"\n");
  EXPECT_TRUE(logWillSay("configuration 1 is in force, changed: log.level"));
  ASSERT_EQ(stopService(SIGTERM), 0);
  ASSERT_TRUE(startService({"--config", file(), "--log-level", "error"}));
  reload("[log]\nlevel = \"default\"\n");
  EXPECT_FALSE(logSays("is in force")) << serviceLog();
}

TEST_F(Reload, TheManagerIsToldOfEachReloadAndOfSessionsAndMessages) {
  NotifySocket manager(directory_ / "notify");
  writeFile(file(), "");
  Process::Setup setup = serviceSetup({"--socket", socket(), "--config", file()});
  setup.environment = {"NOTIFY_SOCKET=" + (directory_ / "notify")};
  service_ = std::make_unique<Process>(setup, directory_);
  ASSERT_TRUE(eventually([&] { return manager.told().size() >= 2; }));
  EXPECT_EQ(manager.told(),
            (std::vector<std::string>{"READY=1", "STATUS=0 sessions of 0 clients, 0 waiting, 0 messages"}));
  writeFile(file(), "bad");
  service_->signal(SIGHUP);
  ASSERT_TRUE(eventually([&] { return manager.told().size() >= 4; }));
  EXPECT_EQ(manager.told()[2].find("RELOADING=1\nMONOTONIC_USEC="), 0U) << manager.told()[2];
  EXPECT_EQ(manager.told()[3], "READY=1");
  const auto client = connect();
  ASSERT_TRUE(client->call(client::createReportingSession(1)).ok());
  EXPECT_TRUE(eventually([&] {
    return manager.told().back() == "STATUS=1 session of 1 client, 0 waiting, 0 messages";
  })) << manager.told().back();
}

}  // namespace
}  // namespace tarn::e2e
