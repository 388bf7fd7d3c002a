// SPDX-License-Identifier: Apache-2.0
#include "host/machine/LinuxFileSystem.h"

#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <filesystem>
#include <fstream>
#include <sstream>
#include <string>

namespace tarn::linux_host {
namespace {

class LinuxFileSystemTest : public testing::Test {
 protected:
  LinuxFileSystemTest() {
    std::string pattern = std::filesystem::temp_directory_path() / "tarn-files.XXXXXX";
    const char* made = ::mkdtemp(pattern.data());
    if (made != nullptr) {
      directory_ = made;
    }
  }
  ~LinuxFileSystemTest() override {
    std::error_code ignored;
    std::filesystem::remove_all(directory_, ignored);
  }
  void SetUp() override { ASSERT_FALSE(directory_.empty()); }

  std::string path(const std::string& name) const { return directory_ + "/" + name; }
  std::string content(const std::string& name) const {
    std::ostringstream text;
    text << std::ifstream(path(name)).rdbuf();
    return text.str();
  }
  void put(const std::string& name, const std::string& text) const { std::ofstream(path(name)) << text; }

  std::string directory_;
  LinuxFileSystem files_{{"/var/logs/DiagnosticLogs", "/tmp"}};
};

TEST_F(LinuxFileSystemTest, KnowsTheDirectoriesThatItWasGiven) {
  EXPECT_EQ(files_.wellKnownDirectory(platform::WellKnownDirectory::DiagnosticLogs), "/var/logs/DiagnosticLogs");
  EXPECT_EQ(files_.wellKnownDirectory(platform::WellKnownDirectory::Temporary), "/tmp");
}

TEST_F(LinuxFileSystemTest, CreatesMissingDirectoriesAboveWithThePermissionsLessTheMask) {
  const mode_t mask = ::umask(027);
  const auto error = files_.createDirectories(path("a/b/c"), 0777);
  ::umask(mask);

  ASSERT_TRUE(error.ok()) << error.text();
  for (const auto* name : {"a", "a/b", "a/b/c"}) {
    struct stat status {};
    ASSERT_EQ(::stat(path(name).c_str(), &status), 0) << name;
    EXPECT_EQ(status.st_mode & 0777U, 0750U) << name;
  }
}

TEST_F(LinuxFileSystemTest, CreatingADirectoryThatIsThereSucceedsAndLeavesItsPermissions) {
  ASSERT_TRUE(files_.createDirectories(path("a"), 0700).ok());

  EXPECT_TRUE(files_.createDirectories(path("a"), 0777).ok());

  struct stat status {};
  ASSERT_EQ(::stat(path("a").c_str(), &status), 0);
  EXPECT_EQ(status.st_mode & 0777U, 0700U);
}

TEST_F(LinuxFileSystemTest, CreatingADirectoryBelowAFileFails) {
  put("file", "x");

  const auto error = files_.createDirectories(path("file/below"), 0777);

  ASSERT_TRUE(error.failed());
  EXPECT_EQ(error->code, ENOTDIR);
  EXPECT_EQ(error->text, "Not a directory");
}

TEST_F(LinuxFileSystemTest, CreateFileMakesAnEmptyFileOnce) {
  ASSERT_TRUE(files_.createFile(path("new")).ok());
  EXPECT_TRUE(files_.exists(path("new")));
  EXPECT_EQ(content("new"), "");

  const auto again = files_.createFile(path("new"));

  ASSERT_TRUE(again.failed());
  EXPECT_EQ(again->code, EEXIST);
}

TEST_F(LinuxFileSystemTest, CreateFileInAMissingDirectoryFails) {
  const auto error = files_.createFile(path("missing/new"));

  ASSERT_TRUE(error.failed());
  EXPECT_EQ(error->code, ENOENT);
}

TEST_F(LinuxFileSystemTest, OpeningForWritingEmptiesTheFile) {
  put("file", "old content");
  auto opened = files_.openForWriting(path("file"));
  ASSERT_FALSE(opened.failed());

  EXPECT_TRUE(opened.value->write("one\n").ok());
  EXPECT_TRUE(opened.value->write("two\n").ok());
  EXPECT_TRUE(opened.value->close().ok());

  EXPECT_EQ(content("file"), "one\ntwo\n");
}

TEST_F(LinuxFileSystemTest, ALinkIsNeitherWrittenThroughNorMadeOver) {
  put("target", "untouched");
  std::filesystem::create_symlink(path("target"), path("link"));
  const auto opened = files_.openForWriting(path("link"));
  ASSERT_TRUE(opened.failed());
  EXPECT_EQ(opened.error->code, ELOOP);
  const auto made = files_.createFile(path("link"));
  ASSERT_TRUE(made.failed());
  EXPECT_EQ(made->code, EEXIST);
  EXPECT_EQ(content("target"), "untouched");
}

TEST_F(LinuxFileSystemTest, AFileDestroyedUnclosedHoldsWhatWasWritten) {
  put("file", "");
  ASSERT_TRUE(files_.openForWriting(path("file")).value->write("kept").ok());

  EXPECT_EQ(content("file"), "kept");
}

TEST_F(LinuxFileSystemTest, AWriteIsInTheFileWhenItReturns) {
  put("file", "");
  auto opened = files_.openForWriting(path("file"));
  ASSERT_FALSE(opened.failed());

  ASSERT_TRUE(opened.value->write("one\n").ok());
  EXPECT_EQ(content("file"), "one\n");
  ASSERT_TRUE(opened.value->write("two\n").ok());
  EXPECT_EQ(content("file"), "one\ntwo\n");
}

TEST_F(LinuxFileSystemTest, AFullDiskIsToldByTheWriteThatItRefuses) {
  auto opened = files_.openForWriting("/dev/full");
  ASSERT_FALSE(opened.failed());

  const auto error = opened.value->write("[\n");

  ASSERT_TRUE(error.failed());
  EXPECT_EQ(error->code, ENOSPC);
  EXPECT_TRUE(opened.value->close().ok());
}

TEST_F(LinuxFileSystemTest, ManyWritesArriveInOrder) {
  put("file", "");
  auto opened = files_.openForWriting(path("file"));
  ASSERT_FALSE(opened.failed());
  std::string expected;
  for (int i = 0; i < 5000; ++i) {
    const std::string line = std::to_string(i) + std::string(static_cast<std::size_t>(i % 90), 'x') + "\n";
    expected += line;
    ASSERT_TRUE(opened.value->write(line).ok());
  }
  ASSERT_TRUE(opened.value->close().ok());

  EXPECT_EQ(content("file"), expected);
}

TEST_F(LinuxFileSystemTest, AClosedFileRefusesMoreCalls) {
  put("file", "");
  auto opened = files_.openForWriting(path("file"));
  ASSERT_FALSE(opened.failed());
  ASSERT_TRUE(opened.value->close().ok());

  EXPECT_EQ(opened.value->write("late").code(), EBADF);
  EXPECT_EQ(opened.value->close().code(), EBADF);
  EXPECT_EQ(content("file"), "");
}

TEST_F(LinuxFileSystemTest, OpeningAMissingFileFails) {
  const auto opened = files_.openForWriting(path("missing"));

  ASSERT_TRUE(opened.failed());
  EXPECT_EQ(opened.error->code, ENOENT);
  EXPECT_EQ(opened.value, nullptr);
}

TEST_F(LinuxFileSystemTest, ReadsAFileOfExactlyTheLimitAndRefusesOneByteMore) {
  put("file", std::string(1000, 'a'));

  EXPECT_EQ(files_.readFile(path("file"), 1000).value, std::string(1000, 'a'));
  const auto refused = files_.readFile(path("file"), 999);

  ASSERT_TRUE(refused.failed());
  EXPECT_EQ(refused.error->code, EFBIG);
}

TEST_F(LinuxFileSystemTest, ReadingADirectoryFails) {
  const auto read = files_.readFile(directory_, 1000);

  ASSERT_TRUE(read.failed());
  EXPECT_EQ(read.error->code, EISDIR);
}

TEST_F(LinuxFileSystemTest, MovingReplacesWhatIsThere) {
  put("from", "new");
  put("to", "old");

  ASSERT_TRUE(files_.moveFile(path("from"), path("to")).ok());

  EXPECT_FALSE(files_.exists(path("from")));
  EXPECT_EQ(content("to"), "new");
}

TEST_F(LinuxFileSystemTest, MovingAMissingFileFails) {
  const auto error = files_.moveFile(path("missing"), path("to"));

  ASSERT_TRUE(error.failed());
  EXPECT_EQ(error->code, ENOENT);
  EXPECT_FALSE(files_.exists(path("to")));
}

TEST_F(LinuxFileSystemTest, MovingToAnotherFileSystemCopiesTheWholeFile) {
  std::string pattern = "/dev/shm/tarn-files.XXXXXX";
  const char* const other = ::mkdtemp(pattern.data());
  ASSERT_NE(other, nullptr);
  const std::string content(200'000, 'm');
  put("from", content);
  const std::string target = std::string(other) + "/to";

  const auto error = files_.moveFile(path("from"), target);

  EXPECT_TRUE(error.ok()) << error.text();
  EXPECT_FALSE(files_.exists(path("from")));
  EXPECT_EQ(files_.readFile(target, content.size()).value, content);
  const auto entries = std::distance(std::filesystem::directory_iterator(other), std::filesystem::directory_iterator());
  EXPECT_EQ(entries, 1);
  std::filesystem::remove_all(other);
}

}  // namespace
}  // namespace tarn::linux_host
