// SPDX-License-Identifier: Apache-2.0
// Whoever reads along is woken by writes to the file and what lies beside it under its name, and by nothing else.
#include "recorder/store/files/ChangeWatch.h"

#include "tests/recorder/RecorderFixture.h"

namespace tarn::recorder {
namespace {

constexpr std::chrono::microseconds kAtOnce{0};

class ChangeWatchTest : public ::testing::Test {
 protected:
  static void write(const std::filesystem::path& path) { std::ofstream(path, std::ios::app) << "x"; }
  std::filesystem::path folder() const { return directory_.path() / "state"; }
  std::filesystem::path file() const { return folder() / "recorder.sqlite3"; }

  TemporaryDirectory directory_;
};

TEST_F(ChangeWatchTest, AWriteToTheFileOrItsLogIsNoticedOnce) {
  std::filesystem::create_directory(folder());
  ChangeWatch watch(file());
  EXPECT_FALSE(watch.wait(kAtOnce));
  for (const char* const suffix : {"", "-wal"}) {
    write(file().string() + suffix);
    EXPECT_TRUE(watch.wait(kAtOnce)) << suffix;
    EXPECT_FALSE(watch.wait(kAtOnce)) << suffix;
  }
}

TEST_F(ChangeWatchTest, AFileThatIsMovedIntoThePlaceIsNoticed) {
  std::filesystem::create_directory(folder());
  write(directory_.path() / "elsewhere");
  ChangeWatch watch(file());
  EXPECT_FALSE(watch.wait(kAtOnce));
  std::filesystem::rename(directory_.path() / "elsewhere", file());
  EXPECT_TRUE(watch.wait(kAtOnce));
}

TEST_F(ChangeWatchTest, WritesToOtherFilesOfTheFolderAreNot) {
  std::filesystem::create_directory(folder());
  ChangeWatch watch(file());
  EXPECT_FALSE(watch.wait(kAtOnce));
  write(folder() / "status.json");
  EXPECT_FALSE(watch.wait(kAtOnce));
}

TEST_F(ChangeWatchTest, AFolderThatComesLaterIsWatchedFromThenOn) {
  ChangeWatch watch(file());
  EXPECT_FALSE(watch.wait(kAtOnce));
  std::filesystem::create_directory(folder());
  EXPECT_FALSE(watch.wait(kAtOnce));
  write(file());
  EXPECT_TRUE(watch.wait(kAtOnce));
}

TEST_F(ChangeWatchTest, AFolderThatIsMadeAnewIsWatchedAgain) {
  std::filesystem::create_directory(folder());
  ChangeWatch watch(file());
  EXPECT_FALSE(watch.wait(kAtOnce));
  std::filesystem::remove(folder());
  EXPECT_FALSE(watch.wait(kAtOnce));
  std::filesystem::create_directory(folder());
  EXPECT_FALSE(watch.wait(kAtOnce));
  write(file());
  EXPECT_TRUE(watch.wait(kAtOnce));
}

TEST_F(ChangeWatchTest, AFileWithoutAFolderInItsNameIsWatchedInTheCurrentOne) {
  const std::filesystem::path before = std::filesystem::current_path();
  std::filesystem::current_path(directory_.path());
  ChangeWatch watch("recorder.sqlite3");
  EXPECT_FALSE(watch.wait(kAtOnce));
  write("recorder.sqlite3");
  EXPECT_TRUE(watch.wait(kAtOnce));
  std::filesystem::current_path(before);
}

}  // namespace
}  // namespace tarn::recorder
