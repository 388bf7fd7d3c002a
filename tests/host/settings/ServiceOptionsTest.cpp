// SPDX-License-Identifier: Apache-2.0
#include "host/settings/ServiceOptions.h"

#include <gtest/gtest.h>
#include <sys/stat.h>

#include <algorithm>
#include <vector>

#include "host/settings/StateDirectory.h"
#include "tests/host/TemporaryFolder.h"

namespace tarn::linux_host {
namespace {

const HostEnvironment kUser{false, "/run/user/7", "/srv/u/state", "/srv/u"};

ServiceCommand parse(std::vector<const char*> arguments, const HostEnvironment& environment = kUser) {
  arguments.insert(arguments.begin(), "tarnreportingd");
  return parseServiceCommand(static_cast<int>(arguments.size()), arguments.data(), environment, "tarnreportingd 7");
}

std::string complaintOf(std::vector<const char*> arguments, const HostEnvironment& environment = kUser) {
  const ServiceCommand command = parse(std::move(arguments), environment);
  EXPECT_FALSE(command.options);
  EXPECT_EQ(command.usage.code(), 64);
  EXPECT_EQ(command.output, "");
  EXPECT_EQ(command.usage.text().find('\n'), std::string::npos);
  return command.usage.text();
}

TEST(HostPaths, ConfigurationIsThatOfTheProgramsInstallation) {
  const auto of = [](const char* program) {
    HostEnvironment environment = kUser;
    environment.program = program;
    return defaultConfigurationFile(environment);
  };
  EXPECT_EQ(of("/usr/bin/tarnreportingd"), "/etc/tarnreporting/tarnreportingd.toml");
  EXPECT_EQ(of("/bin/tarnreportingd"), "/etc/tarnreporting/tarnreportingd.toml");
  EXPECT_EQ(of("/usr/local/bin/tarnreportingd"), "/usr/local/etc/tarnreporting/tarnreportingd.toml");
  EXPECT_EQ(of("/opt/x/bin/tarnreportingd"), "/etc/opt/x/tarnreporting/tarnreportingd.toml");
  EXPECT_EQ(of("/srv/tree/build/bin/tarnreportingd"), "/srv/tree/build/etc/tarnreporting/tarnreportingd.toml");
  EXPECT_EQ(of("an unknown program"), "");
  EXPECT_EQ(of(""), "");
}

TEST(HostPaths, DevicePropertiesLieBesideTheConfiguration) {
  HostEnvironment installed = kUser;
  installed.program = "/usr/bin/tarnreportingd";
  EXPECT_EQ(defaultDevicePropertiesFile(installed), "/etc/tarnreporting/device.json");
  EXPECT_EQ(defaultDevicePropertiesFile(HostEnvironment{}), "");
}

TEST(HostPaths, ClientsLookAtTheNamedSocketElseTheUsersThenTheSystems) {
  using Paths = std::vector<std::string>;
  HostEnvironment environment = kUser;
  EXPECT_EQ(serviceSocketPaths(environment), (Paths{"/run/user/7/tarnreporting.sock", "/run/tarnreporting/socket"}));
  environment.runtimeDirectory = "";
  EXPECT_EQ(serviceSocketPaths(environment), (Paths{"/run/tarnreporting/socket"}));
  environment.serviceSocket = "/srv/socket";
  EXPECT_EQ(serviceSocketPaths(environment), (Paths{"/srv/socket"}));
  EXPECT_EQ(serviceSocketPaths({true, "/run/user/0", "", ""}), (Paths{"/run/tarnreporting/socket"}));
}

TEST(ServiceOptions, DefaultsFollowTheUsersFolders) {
  const ServiceCommand command = parse({});
  ASSERT_TRUE(command.options);
  EXPECT_EQ(command.options->socketPath, "/run/user/7/tarnreporting.sock");
  EXPECT_EQ(command.options->stateDirectory, "/srv/u/state/tarnreporting");
  EXPECT_EQ(command.options->adminSocketPath, std::nullopt);
  EXPECT_FALSE(command.options->configurationFile);
  EXPECT_FALSE(command.options->devicePropertiesFile);
  EXPECT_EQ(command.options->logLevel, std::nullopt);
  EXPECT_EQ(command.options->logTarget, "stderr");
}

TEST(ServiceOptions, DefaultsOfRootAreTheSystemsWhateverItsEnvironment) {
  const ServiceCommand command = parse({}, {true, "/run/user/0", "/srv/root/state", "/srv/root"});
  ASSERT_TRUE(command.options);
  EXPECT_EQ(command.options->socketPath, "/run/tarnreporting/socket");
  EXPECT_TRUE(command.options->socketIsDefault);
  EXPECT_EQ(command.options->stateDirectory, "/var/lib/tarnreporting");
}

TEST(ServiceOptions, UnsetAndRelativeVariablesDoNotCount) {
  const ServiceCommand command = parse({}, {false, "run", "state", "/srv/u"});
  ASSERT_TRUE(command.options);
  EXPECT_FALSE(command.options->socketPath);
  EXPECT_EQ(command.options->stateDirectory, "/srv/u/.local/state/tarnreporting");
  EXPECT_EQ(complaintOf({}, {false, "", "", ""}),
            "--state-dir: must be given, neither XDG_STATE_HOME nor HOME names a folder");
}

TEST(ServiceOptions, EveryOptionIsTaken) {
  const ServiceCommand command = parse({"--socket", "/s", "--admin-socket", "/a", "--state-dir=/d", "--config", "c",
                                        "--device-properties", "p", "--log-level", "debug", "--log-target", "journal"});
  ASSERT_TRUE(command.options);
  EXPECT_EQ(command.options->socketPath, "/s");
  EXPECT_FALSE(command.options->socketIsDefault);
  EXPECT_EQ(command.options->adminSocketPath, "/a");
  EXPECT_EQ(command.options->stateDirectory, "/d");
  EXPECT_EQ(command.options->configurationFile, "c");
  EXPECT_EQ(command.options->devicePropertiesFile, "p");
  EXPECT_EQ(command.options->logLevel, platform::LogLevel::Debug);
  EXPECT_EQ(command.options->logTarget, "journal");
}

TEST(ServiceOptions, UsageErrorsAreOneLineThatNamesTheOption) {
  EXPECT_EQ(complaintOf({"--log-level", "loud"}), "--log-level: \"loud\" is none of debug, info, default, error");
  EXPECT_EQ(complaintOf({"--socket="}), "--socket: 1 required PATH missing");
  EXPECT_EQ(complaintOf({"--state-dir", ""}), "--state-dir: must not be empty");
  EXPECT_NE(complaintOf({"--config"}).find("--config"), std::string::npos);
  EXPECT_NE(complaintOf({"--loud"}).find("--loud"), std::string::npos);
  EXPECT_NE(complaintOf({"stray\nline"}).find("stray line"), std::string::npos);
  EXPECT_NE(complaintOf({"--socket", "a", "--socket", "b"}).find("--socket"), std::string::npos);
}

TEST(ServiceOptions, HelpNamesEveryOptionDefaultAndExitStatus) {
  const ServiceCommand command = parse({"--help"});
  EXPECT_FALSE(command.options);
  EXPECT_TRUE(command.usage.ok());
  for (const char* part : {"--socket PATH",
                           "--admin-socket PATH",
                           "--state-dir DIR",
                           "--config FILE",
                           "--device-properties FILE",
                           "--log-level LEVEL",
                           "--log-target stderr|journal|FILE",
                           "--version",
                           "--help",
                           "$XDG_RUNTIME_DIR/tarnreporting.sock",
                           "/run/tarnreporting/socket",
                           "$XDG_STATE_HOME/tarnreporting",
                           "/var/lib/tarnreporting",
                           "LISTEN_FDS",
                           "debug, info, default or error",
                           "Exit status: 0",
                           "64 for wrong usage",
                           "78 for a wrong configuration",
                           "1 when it can't serve",
                           "2 when a client ended it"}) {
    EXPECT_NE(command.output.find(part), std::string::npos) << part;
  }
}

TEST(ServiceOptions, VersionIsOneLine) {
  const ServiceCommand command = parse({"--version"});
  EXPECT_FALSE(command.options);
  EXPECT_TRUE(command.usage.ok());
  EXPECT_EQ(command.output, "tarnreportingd 7\n");
}

TEST(StateDirectory, IsMadeWithItsParents) {
  const TemporaryFolder folder;
  EXPECT_EQ(prepareStateDirectory(folder.path("a/b/tarnreporting")).text(), "");
  struct stat facts {};
  ASSERT_EQ(::stat(folder.path("a/b/tarnreporting").c_str(), &facts), 0);
  EXPECT_EQ(facts.st_mode & 0777U & ~0750U, 0U);
  EXPECT_EQ(prepareStateDirectory(folder.path("a/b/tarnreporting/")).text(), "");
}

TEST(StateDirectory, OneThatCannotBeMadeIsToldWithItsPathAndReason) {
  const TemporaryFolder folder;
  folder.write("file", "");
  EXPECT_EQ(prepareStateDirectory(folder.path("file")).text(),
            "state directory " + folder.path("file") + ": Not a directory");
  EXPECT_EQ(prepareStateDirectory(folder.path("file/below")).text(),
            "state directory " + folder.path("file/below") + ": Not a directory");
  EXPECT_EQ(prepareStateDirectory("/proc/none").text(), "state directory /proc/none: No such file or directory");
}

TEST(StateDirectory, IsHeldByOneServiceAtATime) {
  constexpr std::chrono::milliseconds kPatience{20};
  const TemporaryFolder folder;
  FileLock second;
  {
    FileLock first;
    EXPECT_EQ(holdStateDirectory(folder.path(), first, kPatience).text(), "");
    EXPECT_EQ(holdStateDirectory(folder.path(), second, kPatience).text(),
              "another service uses the state directory " + folder.path());
  }
  EXPECT_EQ(holdStateDirectory(folder.path(), second, kPatience).text(), "");
}

TEST(StateDirectory, OneThatCannotBeHeldIsToldWithItsPathAndReason) {
  const TemporaryFolder folder;
  FileLock lock;
  EXPECT_EQ(holdStateDirectory(folder.path("none"), lock).text(),
            "state directory " + folder.path("none") + ": No such file or directory");
}

}  // namespace
}  // namespace tarn::linux_host
