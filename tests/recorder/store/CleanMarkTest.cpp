// SPDX-License-Identifier: Apache-2.0
#include "recorder/store/files/CleanMark.h"

#include <fcntl.h>
#include <sys/stat.h>

#include <array>
#include <fstream>

#include "tests/recorder/RecorderFixture.h"

namespace tarn::recorder {
namespace {

class CleanMarkTest : public ::testing::Test {
 protected:
  std::filesystem::path database() const { return directory_.path() / "database"; }
  std::filesystem::path mark() const { return directory_.path() / "database.clean"; }
  static void write(const std::filesystem::path& path, const std::string& text) {
    std::ofstream(path, std::ios::binary | std::ios::trunc) << text;
  }
  CleanMark of(const std::string& boot = "a-boot") const { return {database(), boot}; }
  void leave() const {
    CleanMark mark = of();
    mark.leave();
  }
  bool take() const {
    CleanMark mark = of();
    return mark.take();
  }

  TemporaryDirectory directory_;
};

TEST_F(CleanMarkTest, AFileThatIsAsItWasLeftIsKnownOnce) {
  write(database(), "content");
  EXPECT_FALSE(take());
  leave();
  EXPECT_TRUE(take());
  EXPECT_FALSE(std::filesystem::exists(mark()));
  EXPECT_FALSE(take()) << "who takes it and is killed leaves none";
  leave();
  leave();
  EXPECT_TRUE(take());
}

TEST_F(CleanMarkTest, AChangeRightAfterItIsSeenAlsoOfTheSameLength) {
  for (int n = 0; n < 200; ++n) {
    write(database(), "content");
    leave();
    {
      std::fstream file(database(), std::ios::in | std::ios::out | std::ios::binary);
      file << 'C';
    }
    ASSERT_FALSE(take()) << n;
  }
}

TEST_F(CleanMarkTest, AnotherFileInItsPlaceIsSeen) {
  write(database(), "content");
  leave();
  struct stat status {};
  ASSERT_EQ(::stat(database().c_str(), &status), 0);
  std::filesystem::rename(database(), directory_.path() / "aside");
  write(database(), "CONTENT");
  const std::array<timespec, 2> times{status.st_atim, status.st_mtim};
  ASSERT_EQ(::utimensat(AT_FDCWD, database().c_str(), times.data(), 0), 0);
  EXPECT_FALSE(take());
}

TEST_F(CleanMarkTest, HoldsInItsBootAlone) {
  write(database(), "content");
  leave();
  CleanMark after = of("another-boot");
  EXPECT_FALSE(after.take());
  EXPECT_FALSE(take()) << "it is gone by then";
  CleanMark unknown = of("");
  unknown.leave();
  EXPECT_FALSE(std::filesystem::exists(mark()));
}

TEST_F(CleanMarkTest, NothingIsLeftWhereTheLogHoldsSomething) {
  write(database(), "content");
  write(database().string() + "-wal", "log");
  leave();
  EXPECT_FALSE(std::filesystem::exists(mark()));
  write(database().string() + "-wal", "");
  leave();
  EXPECT_TRUE(std::filesystem::exists(mark()));
  write(database().string() + "-wal", "log");
  EXPECT_FALSE(take());
}

TEST_F(CleanMarkTest, WithoutADatabaseThereIsNothingToMark) {
  leave();
  EXPECT_FALSE(std::filesystem::exists(mark()));
  write(mark(), "a-boot 1 7 1 1\n");
  EXPECT_FALSE(take());
  EXPECT_FALSE(std::filesystem::exists(mark()));
}

TEST_F(CleanMarkTest, WhatStandsInItsPlaceIsNeitherFollowedNorBelieved) {
  write(database(), "content");
  leave();
  std::filesystem::rename(mark(), directory_.path() / "elsewhere");
  std::filesystem::create_symlink(directory_.path() / "elsewhere", mark());
  EXPECT_FALSE(take());
  EXPECT_TRUE(std::filesystem::exists(directory_.path() / "elsewhere"));
  leave();
  EXPECT_FALSE(std::filesystem::is_symlink(mark()));
  EXPECT_TRUE(take());
  for (const std::string& text : {std::string(), std::string("a-boot"), std::string(1000, 'x')}) {
    write(mark(), text);
    EXPECT_FALSE(take()) << text;
  }
  std::filesystem::remove(mark());
  std::filesystem::create_directory(mark());
  EXPECT_FALSE(take());
}

class CleanStart : public RecorderFixture {
 protected:
  // Damages the file's end and gives it its times back, so that nobody sees that it was changed.
  void damageWithoutATrace() {
    struct stat status {};
    ASSERT_EQ(::stat(file().c_str(), &status), 0);
    {
      std::fstream content(file(), std::ios::in | std::ios::out | std::ios::binary);
      content.seekp(-2000, std::ios::end);
      content << std::string(2000, '\xA5');
    }
    const std::array<timespec, 2> times{status.st_atim, status.st_mtim};
    ASSERT_EQ(::utimensat(AT_FDCWD, file().c_str(), times.data(), 0), 0);
  }
  // Enough of it that reading it through takes long.
  void fillAndStop(int events = 2000) {
    start();
    recordMany(events, 3000);
    ASSERT_TRUE(flush());
    stop();
  }
};

TEST_F(CleanStart, AfterAnOrderlyEndTheFileIsNotReadThroughAgain) {
  fillAndStop();
  ASSERT_TRUE(std::filesystem::exists(file().string() + ".clean"));
  damageWithoutATrace();
  options_.verifyInterval = options_.verifyRest = std::chrono::hours(1);
  start().waitUntilOpened();
  EXPECT_TRUE(filesSetAside().empty()) << "this could only be seen by reading it through";
  EXPECT_FALSE(std::filesystem::exists(file().string() + ".clean"));
}

TEST_F(CleanStart, ASmallFileIsReadThroughAllTheSame) {
  fillAndStop(200);
  damageWithoutATrace();
  options_.verifyInterval = options_.verifyRest = std::chrono::hours(1);
  start().waitUntilOpened();
  EXPECT_FALSE(filesSetAside().empty());
}

TEST_F(CleanStart, WhatNobodySawChangeIsFoundWhileItRuns) {
  fillAndStop();
  damageWithoutATrace();
  options_.verifyInterval = std::chrono::milliseconds(1);
  start();
  EXPECT_TRUE(eventually([&] { return !filesSetAside().empty(); }));
}

TEST_F(CleanStart, InAnotherBootItIsReadThrough) {
  options_.boot = "one";
  fillAndStop();
  damageWithoutATrace();
  options_.boot = "two";
  options_.verifyInterval = options_.verifyRest = std::chrono::hours(1);
  start().waitUntilOpened();
  EXPECT_FALSE(filesSetAside().empty());
}

TEST_F(CleanStart, AChangeIsFoundByReadingItThrough) {
  fillAndStop();
  {
    std::fstream content(file(), std::ios::in | std::ios::out | std::ios::binary);
    content.seekp(-2000, std::ios::end);
    content << std::string(2000, '\xA5');
  }
  options_.verifyInterval = options_.verifyRest = std::chrono::hours(1);
  start().waitUntilOpened();
  EXPECT_FALSE(filesSetAside().empty());
}

}  // namespace
}  // namespace tarn::recorder
