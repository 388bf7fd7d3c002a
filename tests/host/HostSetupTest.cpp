#include "host/HostSetup.h"

#include <gtest/gtest.h>

#include <filesystem>

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
      if (prepared.ok()) return setup.log && setup.socket && setup.signals ? 0 : 99;
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

TEST_F(HostSetupTest, BadDevicePropertiesAreRefusedAsConfiguration) {
  ServiceOptions bad = options();
  bad.devicePropertiesFile = folder_.path("none");
  EXPECT_EQ(statusOf(bad, folder_.path("none") + ": No such file or directory"), kExitConfiguration);
}

TEST_F(HostSetupTest, NoSocketIsRefused) {
  ServiceOptions bad = options();
  bad.socketPath.reset();
  EXPECT_EQ(statusOf(bad, "no socket: none was handed over, and neither --socket nor XDG_RUNTIME_DIR names one"),
            kExitFailure);
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
