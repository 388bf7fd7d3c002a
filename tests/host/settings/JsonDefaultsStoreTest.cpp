// SPDX-License-Identifier: Apache-2.0
#include "host/settings/JsonDefaultsStore.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <atomic>
#include <chrono>
#include <cmath>
#include <filesystem>
#include <limits>
#include <thread>
#include <vector>

#include "host/system/UniqueDescriptor.h"
#include "testing/RecordingLog.h"
#include "tests/host/Eventually.h"
#include "tests/host/TemporaryFolder.h"

namespace tarn::linux_host {
namespace {

using testing::eventually;

constexpr const char* kSuite = "sys.oxbow.tarnkit";
constexpr const char* kFile = "defaults/sys.oxbow.tarnkit.json";

class JsonDefaults : public ::testing::Test {
 protected:
  std::string file() const { return folder_.path(kFile); }
  std::vector<std::string> faults() const { return log_.messages(); }

  TemporaryFolder folder_;
  testing::RecordingLog log_;
  JsonDefaultsStore store_{folder_.path("defaults"), log_};
};

TEST_F(JsonDefaults, LinkIsNotFollowed) {
  folder_.write("elsewhere.json", "{\"a\": 1}");
  folder_.write("defaults/other.json", "{}");  // so that the folder is there
  std::filesystem::create_symlink(folder_.path("elsewhere.json"), folder_.path(kFile));
  EXPECT_FALSE(store_.value(kSuite, "a").present());
  EXPECT_EQ(faults().size(), 1U);
}

TEST_F(JsonDefaults, UnknownSuiteKeyAndUserReadAbsentWithoutALine) {
  EXPECT_FALSE(store_.value(kSuite, "device_name").present());
  ASSERT_TRUE(store_.setValue(kSuite, "device_name", "bench"));
  EXPECT_FALSE(store_.value(kSuite, "other").present());
  EXPECT_FALSE(store_.preference("device_name", kSuite, "root").present());
  EXPECT_TRUE(log_.entries().empty());
}

TEST_F(JsonDefaults, WrittenValueIsReadBackByAnotherStore) {
  ASSERT_TRUE(store_.setValue(kSuite, "date", plist::Date{1.5}));
  ASSERT_TRUE(store_.setValue(kSuite, "count", 3));
  const JsonDefaultsStore other(folder_.path("defaults"), log_);
  EXPECT_EQ(other.value(kSuite, "date"), plist::Value(plist::Date{1.5}));
  EXPECT_EQ(other.value(kSuite, "count").kind(), plist::Kind::Signed);
  EXPECT_EQ(folder_.read(kFile), "{\n  \"date\": {\"$date\": 1.5},\n  \"count\": 3\n}\n");
}

TEST_F(JsonDefaults, PreferencesOfTheUserMobileAreTheDomainsSuite) {
  ASSERT_TRUE(store_.setValue("sys.oxbow.app", "spatial", true));
  EXPECT_EQ(store_.preference("spatial", "sys.oxbow.app", "mobile"), plist::Value(true));
}

TEST_F(JsonDefaults, AbsentValueRemovesTheKeyAndOnlyIt) {
  ASSERT_TRUE(store_.setValue(kSuite, "a", 1));
  ASSERT_TRUE(store_.setValue(kSuite, "b", 2));
  ASSERT_TRUE(store_.setValue(kSuite, "a", plist::ValueView()));
  ASSERT_TRUE(store_.setValue(kSuite, "b", plist::ValueView()));
  ASSERT_TRUE(store_.setValue(kSuite, "never there", plist::ValueView()));
  EXPECT_EQ(folder_.read(kFile), "{}\n");
}

TEST_F(JsonDefaults, ChangeByAnotherIsSeenByTheNextRead) {
  for (int round = 0; round < 50; ++round) {
    // The same size each time, in place and by replacement in turn, faster than the file system's clock ticks.
    const std::string text = "{\"n\": " + std::to_string(10 + round) + "}";
    if (round % 2 == 0) {
      folder_.write(kFile, text);
    } else {
      folder_.write("defaults/new", text);
      std::filesystem::rename(folder_.path("defaults/new"), file());
    }
    ASSERT_EQ(store_.value(kSuite, "n"), plist::Value(10 + round));
  }
  std::filesystem::remove(file());
  EXPECT_FALSE(store_.value(kSuite, "n").present());
}

TEST_F(JsonDefaults, ChangeOfAFileThatWasReadLongAgoIsSeen) {
  folder_.write(kFile, "{\"n\": 1}");
  const auto later = std::chrono::steady_clock::now() + std::chrono::milliseconds(150);
  ASSERT_TRUE(eventually([&] { return std::chrono::steady_clock::now() > later; }));
  EXPECT_EQ(store_.value(kSuite, "n"), plist::Value(1));
  EXPECT_EQ(store_.value(kSuite, "n"), plist::Value(1));
  folder_.write(kFile, "{\"n\": 2}");
  EXPECT_EQ(store_.value(kSuite, "n"), plist::Value(2));
}

TEST_F(JsonDefaults, BrokenFileReadsAsEmptyAndIsLoggedOnceWithItsPlace) {
  folder_.write(kFile, "{\n  \"device_name\": \"x\",\n  \"other\": nope\n}");
  for (int read = 0; read < 3; ++read) {
    EXPECT_FALSE(store_.value(kSuite, "device_name").present());
  }
  EXPECT_EQ(faults(), (std::vector<std::string>{"defaults file is broken and reads as empty: " + file() +
                                                ":3:13: syntax error while parsing value - invalid literal; last "
                                                "read: '\"other\": no'"}));
  EXPECT_EQ(log_.entries()[0].level, platform::LogLevel::Error);
}

TEST_F(JsonDefaults, BrokenFileThatChangedIsLoggedAgainAndAMendedOneIsRead) {
  folder_.write(kFile, "{");
  EXPECT_FALSE(store_.value(kSuite, "n").present());
  folder_.write(kFile, "{{");
  EXPECT_FALSE(store_.value(kSuite, "n").present());
  EXPECT_EQ(faults().size(), 2U);
  folder_.write(kFile, "{\"n\": 1}");
  EXPECT_EQ(store_.value(kSuite, "n"), plist::Value(1));
  EXPECT_EQ(faults().size(), 2U);
}

TEST_F(JsonDefaults, FileThatIsNoObjectIsBroken) {
  folder_.write(kFile, "[1]");
  EXPECT_FALSE(store_.value(kSuite, "n").present());
  EXPECT_EQ(faults(), (std::vector<std::string>{"defaults file is broken and reads as empty: " + file() +
                                                ":1:1: a defaults file holds one JSON object"}));
}

TEST_F(JsonDefaults, EmptyFileIsBroken) {
  folder_.write(kFile, "");
  EXPECT_FALSE(store_.value(kSuite, "n").present());
  EXPECT_EQ(faults().size(), 1U);
}

TEST_F(JsonDefaults, FolderPipeAndOversizeInPlaceOfTheFileAreBroken) {
  std::filesystem::create_directories(file());
  EXPECT_EQ(store_.suite(kSuite).error.text(), file() + ": Is a directory");
  std::filesystem::remove(file());
  ASSERT_EQ(::mkfifo(file().c_str(), 0600), 0);
  EXPECT_EQ(store_.suite(kSuite).error.text(), file() + ": No such device");
  std::filesystem::remove(file());
  folder_.write(kFile, std::string(JsonDefaultsStore::kMaximumFileBytes + 1, ' '));
  EXPECT_EQ(store_.suite(kSuite).error.text(), file() + ": File too large");
}

TEST_F(JsonDefaults, BrokenFileIsReplacedNeitherByAReadNorByAWrite) {
  folder_.write(kFile, "{\"keep\": me}");
  EXPECT_FALSE(store_.value(kSuite, "keep").present());
  EXPECT_FALSE(store_.setValue(kSuite, "n", 1));
  EXPECT_EQ(folder_.read(kFile), "{\"keep\": me}");
  const std::string place =
      file() + ":1:10: syntax error while parsing value - invalid literal; last read: '\"keep\": m'";
  EXPECT_EQ(faults().back(), "defaults not written: the file is broken and is left as it is: " + place);
}

TEST_F(JsonDefaults, NamesThatAreNoPlainFileNamesHoldNothingAndTakeNothing) {
  const std::string tooLong(201, 'x');
  for (const std::string_view name :
       {std::string_view(""), std::string_view("."), std::string_view("../up"), std::string_view("a/b"),
        std::string_view("a\0b", 3), std::string_view(tooLong)}) {
    EXPECT_FALSE(store_.value(name, "n").present());
    EXPECT_EQ(store_.store(name, "n", 1).text(), "\"" + std::string(name) + "\" can't name a suite");
  }
  EXPECT_FALSE(std::filesystem::exists(folder_.path("defaults")));
  EXPECT_EQ(store_.store(std::string(200, 'x'), "n", 1).text(), "");
}

TEST_F(JsonDefaults, ValueWithoutAJsonFormIsRefused) {
  EXPECT_EQ(store_.store(kSuite, "n", std::numeric_limits<double>::infinity()).text(),
            "the value of \"n\" has no JSON form");
  EXPECT_EQ(store_.store(kSuite, "n", plist::Dictionary{{"$date", 5}}).text(), "the value of \"n\" has no JSON form");
  EXPECT_FALSE(std::filesystem::exists(file()));
}

TEST_F(JsonDefaults, SuiteThatWouldGrowBeyondItsBoundIsRefused) {
  const std::string large(JsonDefaultsStore::kMaximumFileBytes, 'x');
  EXPECT_EQ(store_.store(kSuite, "n", large).text(), file() + " would be larger than 1048576 bytes");
}

TEST_F(JsonDefaults, FolderThatCannotBeMadeIsToldWithItsPath) {
  folder_.write("defaults", "a file");
  EXPECT_EQ(store_.store(kSuite, "n", 1).text(), folder_.path("defaults") + ": Not a directory");
  EXPECT_FALSE(store_.value(kSuite, "n").present());
}

TEST_F(JsonDefaults, LockThatIsNeverFreedMakesTheWriteFail) {
  std::filesystem::create_directory(folder_.path("defaults"));
  const UniqueDescriptor holder(::open(folder_.path("defaults/.lock").c_str(), O_RDWR | O_CREAT | O_CLOEXEC, 0600));
  ASSERT_EQ(::flock(holder.get(), LOCK_EX), 0);
  JsonDefaultsStore hasty(folder_.path("defaults"), log_, std::chrono::milliseconds(20));
  EXPECT_EQ(hasty.store(kSuite, "n", 1).text(), folder_.path("defaults/.lock") + ": Connection timed out");
}

TEST_F(JsonDefaults, ReplacedFileKeepsItsMode) {
  folder_.write(kFile, "{}");
  ASSERT_EQ(::chmod(file().c_str(), 0664), 0);
  ASSERT_TRUE(store_.setValue(kSuite, "n", 1));
  struct stat facts {};
  ASSERT_EQ(::stat(file().c_str(), &facts), 0);
  EXPECT_EQ(facts.st_mode & 0777U, 0664U);
}

TEST_F(JsonDefaults, WritersInSeveralProcessesLoseNoKey) {
  constexpr int kWriters = 3;
  constexpr int kKeys = 40;
  std::vector<pid_t> children;
  for (int writer = 0; writer < kWriters; ++writer) {
    const pid_t child = ::fork();
    ASSERT_GE(child, 0);
    if (child == 0) {
      testing::RecordingLog log;
      JsonDefaultsStore store(folder_.path("defaults"), log);
      bool stored = true;
      for (int key = 0; key < kKeys; ++key) {
        stored = store.setValue(kSuite, std::to_string(writer) + "." + std::to_string(key), key) && stored;
      }
      ::_exit(stored ? 0 : 1);
    }
    children.push_back(child);
  }
  // Readers meanwhile see whole files only.
  bool running = true;
  while (running) {
    EXPECT_EQ(store_.suite(kSuite).error.text(), "");
    running = !children.empty();
    std::erase_if(children, [](pid_t child) {
      int status = 0;
      const bool ended = ::waitpid(child, &status, WNOHANG) == child;
      EXPECT_TRUE(!ended || status == 0);
      return ended;
    });
  }
  EXPECT_EQ(store_.suite(kSuite).value.size(), static_cast<std::size_t>(kWriters * kKeys));
}

TEST_F(JsonDefaults, ThreadsMayReadAndWriteAtOnce) {
  std::atomic<bool> done{false};
  std::thread reader([&] {
    while (!done) {
      EXPECT_EQ(store_.suite(kSuite).error.text(), "");
    }
  });
  std::vector<std::thread> writers;
  for (int writer = 0; writer < 2; ++writer) {
    writers.emplace_back([this, writer] {
      for (int key = 0; key < 30; ++key) {
        EXPECT_TRUE(store_.setValue(kSuite, std::to_string(writer) + "." + std::to_string(key), key));
      }
    });
  }
  for (std::thread& writer : writers) {
    writer.join();
  }
  done = true;
  reader.join();
  EXPECT_EQ(store_.suite(kSuite).value.size(), 60U);
}

TEST_F(JsonDefaults, ManySuitesAreReadThoughFewAreKeptInMemory) {
  for (int suite = 0; suite < 200; ++suite) {
    folder_.write("defaults/s" + std::to_string(suite) + ".json", "{\"n\": " + std::to_string(suite) + "}");
  }
  for (int suite = 0; suite < 200; ++suite) {
    EXPECT_EQ(store_.value("s" + std::to_string(suite), "n"), plist::Value(suite));
  }
}

TEST_F(JsonDefaults, NullIsAsGoodAsNoMember) {
  ASSERT_TRUE(store_.setValue(kSuite, "kept", 1));
  folder_.write(kFile, R"({"kept": 1, "gone": null, "list": {"inner": null, "other": 2}})");
  EXPECT_EQ(store_.value(kSuite, "kept"), plist::Value(1));
  EXPECT_FALSE(store_.value(kSuite, "gone").present());
  EXPECT_EQ(store_.value(kSuite, "list"), plist::Value(plist::Dictionary{{"other", 2}}));
  EXPECT_TRUE(faults().empty());
}

}  // namespace
}  // namespace tarn::linux_host
