// SPDX-License-Identifier: Apache-2.0
// What each look at an installation says, of a good one and of each thing that won't do.
#include "host/check/Check.h"

#include <gtest/gtest.h>
#include <sqlite3.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <unistd.h>

#include <cstring>
#include <filesystem>
#include <set>

#include "host/check/SettingsChecks.h"
#include "host/check/SocketChecks.h"
#include "host/check/StateChecks.h"
#include "host/check/StoreHead.h"
#include "host/check/UnitCheck.h"
#include "host/system/FileLock.h"
#include "host/system/UniqueDescriptor.h"
#include "recorder/store/rows/Connection.h"
#include "tests/host/TemporaryFolder.h"

namespace tarn::linux_host {
namespace {

class CheckTest : public ::testing::Test {
 protected:
  CheckTest() {
    std::filesystem::create_directory(state());
    ::chmod(state().c_str(), 0750);
    subject_.options.stateDirectory = state();
    subject_.options.socketPath = folder_.path("socket");
  }
  std::string state() const { return folder_.path("state"); }
  std::string store() const { return state() + "/recorder.sqlite3"; }
  static void expectGood(const Check& check, const std::string& text) {
    EXPECT_TRUE(check.isGood) << check.text;
    EXPECT_NE(check.text.find(text), std::string::npos) << check.text;
  }
  static void expectBad(const Check& check, const std::string& text) {
    EXPECT_FALSE(check.isGood) << check.text;
    EXPECT_NE(check.text.find(text), std::string::npos) << check.text;
  }
  std::set<std::string> files() const {
    std::set<std::string> names;
    for (const auto& entry : std::filesystem::recursive_directory_iterator(folder_.path())) {
      names.insert(entry.path().string());
    }
    return names;
  }

  TemporaryFolder folder_;
  CheckSubject subject_;
};

TEST_F(CheckTest, AGoodInstallationIsGoodInEachLineAndNothingIsMade) {
  const auto before = files();
  const std::vector<Check> checks = checkAll(subject_);
  std::vector<std::string> names;
  for (const Check& check : checks) {
    names.push_back(check.name);
    EXPECT_TRUE(check.isGood) << lineOf(check);
  }
  EXPECT_EQ(names, (std::vector<std::string>{"options", "configuration", "device-properties", "state-directory",
                                             "store", "space", "socket-directory", "socket", "unit"}));
  EXPECT_TRUE(areGood(checks));
  EXPECT_EQ(files(), before);
}

TEST_F(CheckTest, AdminSocketHasALineWhereTheConfigurationWantsOne) {
  folder_.write("c.toml", "[access]\nadmin = \"separate\"\n");
  subject_.options.configurationFile = folder_.path("c.toml");
  const std::vector<Check> checks = checkAll(subject_);
  ASSERT_EQ(checks.size(), 10u);
  EXPECT_EQ(lineOf(checks[8]),
            "good admin-socket: " + folder_.path("socket-admin") + " isn't there, the service makes it");
}

TEST_F(CheckTest, AdminSocketIsTheNamedOneElseTheOneBesideTheSocket) {
  expectGood(checkAdminSocket(subject_), folder_.path("socket-admin") + " isn't there");
  folder_.write("socket-admin", "");
  expectBad(checkAdminSocket(subject_), "remove it, or name another with --admin-socket");
  subject_.options.adminSocketPath = folder_.path("named");
  expectGood(checkAdminSocket(subject_), folder_.path("named") + " isn't there");
  subject_.options.adminSocketPath.reset();
  subject_.options.socketPath.reset();
  expectBad(checkAdminSocket(subject_), "name one with --admin-socket");
  subject_.isHandedOver = true;
  expectGood(checkAdminSocket(subject_), "handed over by the service manager");
}

TEST_F(CheckTest, AdminSocketIsTheManagersWhereTheOrdinaryOneIs) {
  const auto listenAt = [](const std::string& path) {
    UniqueDescriptor socket(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    std::memcpy(address.sun_path, path.data(), path.size());
    EXPECT_EQ(::bind(socket.get(), reinterpret_cast<const sockaddr*>(&address), sizeof address), 0);
    EXPECT_EQ(::listen(socket.get(), 1), 0);
    return socket;
  };
  subject_.unitFolders = {folder_.path("units")};
  const UniqueDescriptor ordinary = listenAt(folder_.path("socket"));
  expectBad(checkAdminSocket(subject_), "systemctl enable --now tarnreportingd-admin.socket");
  const UniqueDescriptor admin = listenAt(folder_.path("socket-admin"));
  expectGood(checkAdminSocket(subject_), folder_.path("socket-admin") + " is the service manager's");
}

TEST_F(CheckTest, ALineIsOneLineWhateverItNames) {
  EXPECT_EQ(lineOf(good("store", "a\nb")), "good store: a\\u000ab");
  EXPECT_EQ(lineOf(bad("store", "x")), "bad store: x");
  EXPECT_FALSE(areGood({good("a", ""), bad("b", "")}));
}

TEST_F(CheckTest, OptionsNameALogThatCanBeWritten) {
  expectGood(checkOptions(subject_.options), "stderr");
  subject_.options.logTarget = folder_.path("log");
  expectGood(checkOptions(subject_.options), folder_.path("log"));
  EXPECT_FALSE(std::filesystem::exists(folder_.path("log")));
  subject_.options.logTarget = folder_.path("none/log");
  expectBad(checkOptions(subject_.options), "No such file or directory; name another file with --log-target");
  // The folder of a name without one is the one that the service is started in.
  subject_.options.logTarget = "log-that-is-not-there";
  expectGood(checkOptions(subject_.options), "the log goes to log-that-is-not-there");
}

TEST_F(CheckTest, ConfigurationIsReadWithItsDropIns) {
  HostConfiguration read;
  subject_.options.defaultConfigurationFile = folder_.path("c.toml");
  expectGood(checkConfiguration(subject_.options, read), "isn't there, the defaults hold");
  folder_.write("c.toml", "[recorder]\nmax_megabytes = 7\n");
  expectGood(checkConfiguration(subject_.options, read), folder_.path("c.toml"));
  EXPECT_EQ(read.recorder.maxMegabytes, 7);
  folder_.write("c.toml.d/a.toml", "[nothing]\n");
  expectBad(checkConfiguration(subject_.options, read), folder_.path("c.toml.d/a.toml") + ":1: unknown section");
  subject_.options.configurationFile = folder_.path("none.toml");
  expectBad(checkConfiguration(subject_.options, read), "No such file or directory");
}

TEST_F(CheckTest, DeviceProperties) {
  subject_.options.defaultDevicePropertiesFile = folder_.path("d.json");
  expectGood(checkDeviceProperties(subject_.options), "isn't there");
  folder_.write("d.json", "{}");
  expectGood(checkDeviceProperties(subject_.options), folder_.path("d.json"));
  folder_.write("d.json", "{");
  expectBad(checkDeviceProperties(subject_.options), "mend the file");
}

TEST_F(CheckTest, DevicePropertiesThatAreNamedHaveToBeThere) {
  subject_.options.defaultDevicePropertiesFile = folder_.path("d.json");
  folder_.write("d.json", "{}");
  subject_.options.devicePropertiesFile = folder_.path("named.json");
  expectBad(checkDeviceProperties(subject_.options), "No such file or directory");
  folder_.write("named.json", "{}");
  expectGood(checkDeviceProperties(subject_.options), folder_.path("named.json"));
}

TEST_F(CheckTest, StateDirectory) {
  expectGood(checkStateDirectory(state()), "mode 0750");
  expectGood(checkStateDirectory(folder_.path("a/b")), "the service makes it");
  EXPECT_FALSE(std::filesystem::exists(folder_.path("a")));
  folder_.write("file", "");
  expectBad(checkStateDirectory(folder_.path("file")), "is no folder");
  std::filesystem::create_symlink("nowhere", folder_.path("link"));
  expectBad(checkStateDirectory(folder_.path("link")), "is a link to nothing");
}

TEST_F(CheckTest, StateDirectoryThatOthersMayChange) {
  for (const auto& [mode, text] : {std::pair<mode_t, const char*>{0777, "0777"}, {0770, "0770"}, {0702, "0702"}}) {
    ::chmod(state().c_str(), mode);
    expectBad(checkStateDirectory(state()), std::string("has mode ") + text);
  }
  ::chmod(state().c_str(), 0755);
  expectGood(checkStateDirectory(state()), "mode 0755");
}

TEST_F(CheckTest, StateDirectoryWithALinkInTheLocksPlace) {
  std::filesystem::create_symlink("nowhere", state() + "/.lock");
  expectBad(checkStateDirectory(state()), "is a link, which no service takes");
}

TEST_F(CheckTest, StateDirectoryWithWhatIsSomebodyElses) {
  if (::geteuid() != 0) return;  // only root gives files away
  folder_.write("state/recorder.sqlite3", "");
  ASSERT_EQ(::chown(store().c_str(), 4711, 4711), 0);
  expectBad(checkStateDirectory(state()), "belongs to uid 4711");
}

TEST_F(CheckTest, StateDirectoryTellsWhoUsesIt) {
  FileLock lock;
  ASSERT_TRUE(lock.take(state() + "/.lock", std::chrono::milliseconds(0)).ok());
  expectGood(checkStateDirectory(state()), "used by process " + std::to_string(::getpid()));
}

TEST_F(CheckTest, Store) {
  expectGood(checkStore(state(), true), "the service makes it");
  folder_.write("state/recorder.sqlite3", std::string(4096, 'x'));
  expectBad(checkStore(state(), true), "is no database");
  expectGood(checkStore(state(), false), "the recorder is off");
}

TEST_F(CheckTest, StoreOfANewerServiceIsBadAlsoWhereOnlyTheLogSaysSo) {
  recorder::Connection writer;
  ASSERT_EQ(writer.open(store(), SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE), SQLITE_OK);
  ASSERT_EQ(writer.run("PRAGMA journal_mode = WAL; PRAGMA wal_autocheckpoint = 0; CREATE TABLE t(a); "
                       "PRAGMA user_version = 2; PRAGMA wal_checkpoint(TRUNCATE)"),
            SQLITE_OK);
  expectGood(checkStore(state(), true), "layout 2");
  ASSERT_EQ(writer.run("PRAGMA user_version = 99"), SQLITE_OK);
  const auto before = files();
  expectBad(checkStore(state(), true), "has layout 99, of a newer service");
  EXPECT_EQ(files(), before);
  ASSERT_EQ(writer.run("PRAGMA wal_checkpoint(TRUNCATE)"), SQLITE_OK);
  EXPECT_EQ(layoutVersionOf(store()).value, 99);
  ASSERT_EQ(writer.run("PRAGMA user_version = 1"), SQLITE_OK);
  expectGood(checkStore(state(), true), "layout 1, which the service brings to the present one");
}

TEST_F(CheckTest, Space) {
  HostConfiguration configuration;
  configuration.recorder.maxMegabytes = 1;
  expectGood(checkSpace(state(), configuration), "of the 1 MiB");
  configuration.recorder.maxMegabytes = 1 << 30;  // a pebibyte
  expectBad(checkSpace(state(), configuration), "lower [recorder] max_megabytes");
  configuration.recorderEnabled = false;
  expectGood(checkSpace(state(), configuration), "the recorder is off");
}

TEST_F(CheckTest, SocketDirectory) {
  expectGood(checkSocketDirectory(subject_), folder_.path());
  subject_.options.socketPath = folder_.path("run/socket");
  expectBad(checkSocketDirectory(subject_), "No such file or directory");
  subject_.options.socketIsDefault = true;
  expectGood(checkSocketDirectory(subject_), "the service makes it");
  std::filesystem::create_directory(folder_.path("run"));
  ::chmod(folder_.path("run").c_str(), 0777);
  expectBad(checkSocketDirectory(subject_), "anybody may put a socket in its place");
  subject_.isHandedOver = true;
  expectGood(checkSocketDirectory(subject_), "the service manager's");
  subject_.isHandedOver = false;
  subject_.options.socketPath.reset();
  expectBad(checkSocketDirectory(subject_), "name one with --socket");
}

TEST_F(CheckTest, SocketThatIsNone) {
  expectGood(checkSocket(subject_), "the service makes it");
  folder_.write("socket", "");
  expectBad(checkSocket(subject_), "is no socket");
  subject_.options.socketPath = folder_.path(std::string(120, 'a'));
  expectBad(checkSocket(subject_), "is longer than the 107 bytes");
  subject_.isHandedOver = true;
  expectGood(checkSocket(subject_), "handed over by the service manager");
}

TEST_F(CheckTest, StaleSocketIsGoodAndStays) {
  const UniqueDescriptor socket(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
  sockaddr_un address{};
  address.sun_family = AF_UNIX;
  const std::string path = folder_.path("socket");
  std::memcpy(address.sun_path, path.data(), path.size());
  ASSERT_EQ(::bind(socket.get(), reinterpret_cast<const sockaddr*>(&address), sizeof address), 0);
  expectGood(checkSocket(subject_), "is stale");
  EXPECT_TRUE(std::filesystem::exists(path));
}

TEST_F(CheckTest, SocketOfAnotherProgramIsBadAndTheManagersIsNotTouched) {
  const std::string path = folder_.path("socket");
  const UniqueDescriptor socket(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
  sockaddr_un address{};
  address.sun_family = AF_UNIX;
  std::memcpy(address.sun_path, path.data(), path.size());
  ASSERT_EQ(::bind(socket.get(), reinterpret_cast<const sockaddr*>(&address), sizeof address), 0);
  ASSERT_EQ(::listen(socket.get(), 0), 0);
  subject_.unitFolders = {folder_.path("units")};
  expectGood(checkSocket(subject_), "is the service manager's");
  EXPECT_LT(::accept(socket.get(), nullptr, nullptr), 0);
  subject_.unitFolders.clear();
  // One that waits fills the line, so the next isn't let in at all.
  const UniqueDescriptor first(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
  ASSERT_EQ(::connect(first.get(), reinterpret_cast<const sockaddr*>(&address), sizeof address), 0);
  expectBad(checkSocket(subject_), "is taken by another program");
}

TEST_F(CheckTest, UnitNamesWhatIsChecked) {
  expectGood(checkUnit(subject_), "there is no service manager");
  subject_.unitFolders = {folder_.path("etc"), folder_.path("lib")};
  expectGood(checkUnit(subject_), "none is installed");
  const std::string unit = "tarnreportingd.service";
  folder_.write("lib/" + unit, "[Service]\nExecStart=\"/usr/bin/tarnreportingd\" --state-dir " + state() + "\n");
  expectGood(checkUnit(subject_), "names the files that are checked");
  folder_.write("etc/" + unit + ".d/x.conf",
                "[Service]\nExecStart=\nExecStart=tarnreportingd --state-dir=/elsewhere\n");
  expectBad(checkUnit(subject_), "with /elsewhere, checked is " + state());
  folder_.write("etc/" + unit + ".d/y.conf",
                "[Service]\nExecStart=tarnreportingd --state-dir " + state() + " --config /c.toml\n");
  expectBad(checkUnit(subject_), "with /c.toml");
  subject_.options.configurationFile = "/c.toml";
  expectGood(checkUnit(subject_), "names the files");
  folder_.write("etc/" + unit, "[Service]\n");
  std::filesystem::remove_all(folder_.path("etc/" + unit + ".d"));
  expectBad(checkUnit(subject_), "has no command line");
  std::filesystem::remove(folder_.path("etc/" + unit));
  std::filesystem::create_symlink("/dev/null", folder_.path("etc/" + unit));
  expectBad(checkUnit(subject_), "is masked");
}

TEST_F(CheckTest, TheSystemsStateDirectoryStandsForItsSpecifier) {
  subject_.unitFolders = {folder_.path("lib")};
  folder_.write("lib/tarnreportingd.service", "ExecStart=tarnreportingd --state-dir %S/tarnreporting\n");
  subject_.options.stateDirectory = "/var/lib/tarnreporting";
  expectGood(checkUnit(subject_), "names the files");
}

}  // namespace
}  // namespace tarn::linux_host
