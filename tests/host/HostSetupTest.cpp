// SPDX-License-Identifier: Apache-2.0
#include "host/HostSetup.h"

#include <gtest/gtest.h>
#include <sys/stat.h>

#include <filesystem>
#include <fstream>
#include <iterator>

#include "tests/host/InChild.h"
#include "tests/host/TemporaryFolder.h"

namespace tarn::linux_host {
namespace {

class HostSetupTest : public ::testing::Test {
 protected:
  ServiceOptions options() const {
    ServiceOptions options;
    options.socketPath = folder_.path("socket");
    options.stateDirectory = folder_.path("state");
    return options;
  }
  // In a process of its own, as signals stay blocked. The refusal's status, 0 when there is none; 99 when its complaint
  // is another one or something is missing.
  static int statusOf(const ServiceOptions& options, const std::string& complaint) {
    return testing::inChild([&] {
      HostSetup setup;
      const Status prepared = setup.prepare(options);
      if (prepared.ok()) return setup.log && setup.sockets.ordinary && setup.signals ? 0 : 99;
      return prepared->text == complaint ? static_cast<int>(prepared->code) : 99;
    });
  }

  TemporaryFolder folder_;
};

TEST_F(HostSetupTest, GoodOptionsLeaveNothingInTheWay) {
  EXPECT_EQ(statusOf(options(), ""), 0);
  EXPECT_TRUE(std::filesystem::is_directory(folder_.path("state")));
}

TEST_F(HostSetupTest, BadConfigurationIsRefusedBeforeAnythingIsMade) {
  folder_.write("c.toml", "[nothing]\n");
  ServiceOptions bad = options();
  bad.configurationFile = folder_.path("c.toml");
  EXPECT_EQ(statusOf(bad, folder_.path("c.toml") + ":1: unknown section [nothing]"), kExitConfiguration);
  EXPECT_FALSE(std::filesystem::exists(folder_.path("state")));
}

TEST_F(HostSetupTest, InstalledConfigurationIsReadWhenNoneIsNamedAndMayBeAbsent) {
  ServiceOptions installed = options();
  installed.defaultConfigurationFile = folder_.path("installed.toml");
  EXPECT_EQ(statusOf(installed, ""), 0);
  folder_.write("installed.toml", "[nothing]\n");
  EXPECT_EQ(statusOf(installed, folder_.path("installed.toml") + ":1: unknown section [nothing]"), kExitConfiguration);
  folder_.write("named.toml", "");
  installed.configurationFile = folder_.path("named.toml");
  EXPECT_EQ(statusOf(installed, ""), 0);
}

TEST_F(HostSetupTest, DropInsAreReadOfWhicheverConfigurationIsUsed) {
  folder_.write("installed.toml.d/a.toml", "[wrong]\n");
  folder_.write("named.toml", "");
  folder_.write("named.toml.d/b.toml", "[recorder]\nmax_age_days = 3\n");
  ServiceOptions installed = options();
  installed.defaultConfigurationFile = folder_.path("installed.toml");
  EXPECT_EQ(statusOf(installed, folder_.path("installed.toml.d/a.toml") + ":1: unknown section [wrong]"),
            kExitConfiguration);
  installed.configurationFile = folder_.path("named.toml");
  EXPECT_EQ(statusOf(installed, ""), 0);
}

TEST_F(HostSetupTest, AnOptionHasTheLastWordOverTheFileAlsoWhenThatIsReadAnew) {
  folder_.write("c.toml", "[log]\nlevel = \"error\"\n");
  ServiceOptions named = options();
  named.configurationFile = folder_.path("c.toml");
  const auto levelsOf = [&](const ServiceOptions& given) {
    return testing::inChild([&] {
      HostSetup setup;
      if (setup.prepare(given).failed()) return 99;
      const int before = static_cast<int>(setup.log->threshold());
      folder_.write("c.toml", "[log]\nlevel = \"info\"\n");
      setup.setLogLevel(setup.readConfiguration().value.logLevel);
      return before * 10 + static_cast<int>(setup.log->threshold());
    });
  };
  EXPECT_EQ(levelsOf(named), 31);
  named.logLevel = platform::LogLevel::Debug;
  EXPECT_EQ(levelsOf(named), 0);
}

TEST_F(HostSetupTest, WhatIsMadeIsForUserAndGroupAlone) {
  const int status = testing::inChild([&] {
    ::umask(0);
    HostSetup setup;
    if (setup.prepare(options()).failed()) return 1;
    std::filesystem::create_directory(folder_.path("made"));
    return ::umask(0) == 027 ? 0 : 2;
  });
  EXPECT_EQ(status, 0);
  EXPECT_EQ(std::filesystem::status(folder_.path("state")).permissions(), std::filesystem::perms(0750));
  EXPECT_EQ(std::filesystem::status(folder_.path("made")).permissions(), std::filesystem::perms(0750));
}

TEST_F(HostSetupTest, ATighterMaskOfTheCallerStays) {
  EXPECT_EQ(testing::inChild([&] {
              ::umask(077);
              HostSetup setup;
              return setup.prepare(options()).failed() || ::umask(0) != 077 ? 1 : 0;
            }),
            0);
}

TEST_F(HostSetupTest, BadDevicePropertiesAreRefusedAsConfiguration) {
  ServiceOptions bad = options();
  bad.devicePropertiesFile = folder_.path("none");
  EXPECT_EQ(statusOf(bad, folder_.path("none") + ": No such file or directory"), kExitConfiguration);
}

TEST_F(HostSetupTest, InstalledDevicePropertiesAreReadWhenNoneAreNamedAndMayBeAbsent) {
  ServiceOptions installed = options();
  installed.defaultDevicePropertiesFile = folder_.path("device.json");
  EXPECT_EQ(statusOf(installed, ""), 0);
  folder_.write("device.json", "[]");
  EXPECT_EQ(statusOf(installed, folder_.path("device.json") + ":1:1: device properties are one JSON object"),
            kExitConfiguration);
  folder_.write("named.json", "{}");
  installed.devicePropertiesFile = folder_.path("named.json");
  EXPECT_EQ(statusOf(installed, ""), 0);
}

TEST_F(HostSetupTest, NoSocketIsRefused) {
  ServiceOptions bad = options();
  bad.socketPath.reset();
  EXPECT_EQ(statusOf(bad, "no socket: none was handed over, and neither --socket nor XDG_RUNTIME_DIR names one"),
            kExitFailure);
}

// The path of the admin socket that is claimed; "none" or the complaint.
std::string adminPathOf(const ServiceOptions& options, const std::string& scratch) {
  EXPECT_EQ(testing::inChild([&] {
              HostSetup setup;
              const Status prepared = setup.prepare(options);
              std::ofstream(scratch) << (prepared.failed()     ? prepared->text
                                         : setup.sockets.admin ? setup.sockets.admin.path()
                                                               : "none");
              return 0;
            }),
            0);
  std::ifstream file(scratch);
  return {std::istreambuf_iterator<char>(file), {}};
}

TEST_F(HostSetupTest, AdminSocketIsThereWhereItIsNamedOrTheConfigurationWantsIt) {
  const auto path = [this](const ServiceOptions& given) { return adminPathOf(given, folder_.path("told")); };
  ServiceOptions given = options();
  EXPECT_EQ(path(given), "none");
  given.adminSocketPath = folder_.path("named");
  EXPECT_EQ(path(given), folder_.path("named"));
  folder_.write("c.toml", "[access]\nadmin = \"separate\"\n");
  given.configurationFile = folder_.path("c.toml");
  EXPECT_EQ(path(given), folder_.path("named"));
  given.adminSocketPath.reset();
  EXPECT_EQ(path(given), folder_.path("socket-admin"));
  folder_.write("c.toml", "[access]\nadmin = \"shared\"\n");
  EXPECT_EQ(path(given), "none");
  given.adminSocketPath = *given.socketPath;
  EXPECT_EQ(path(given), "another service is listening on " + *given.socketPath);
}

TEST_F(HostSetupTest, FolderOfTheDefaultSocketIsMade) {
  ServiceOptions ours = options();
  ours.socketPath = folder_.path("run/socket");
  ours.socketIsDefault = true;
  EXPECT_EQ(statusOf(ours, ""), 0);
  EXPECT_TRUE(std::filesystem::is_directory(folder_.path("run")));
}

}  // namespace
}  // namespace tarn::linux_host
