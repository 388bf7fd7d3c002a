// SPDX-License-Identifier: Apache-2.0
#include "host/system/FileReplacement.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <cerrno>
#include <utility>

#include "tests/host/TemporaryFolder.h"

namespace tarn::linux_host {
namespace {

class FileReplacementTest : public testing::Test {
 protected:
  void begin(FileReplacement& replacement) const {
    UniqueDescriptor made(::open(folder_.path(".f.tmp").c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0600));
    ASSERT_TRUE(made);
    replacement.begin(std::move(made), folder_.path(".f.tmp"));
  }
  bool isThere(std::string_view name) const { return std::filesystem::exists(folder_.path(name)); }

  const TemporaryFolder folder_;
};

TEST_F(FileReplacementTest, WhatIsThereStaysUntilTheNewFileIsWhole) {
  folder_.write("f", "old");
  FileReplacement replacement;
  begin(replacement);
  replacement.write("new");
  EXPECT_EQ(folder_.read("f"), "old");

  EXPECT_TRUE(replacement.takePlace(folder_.path("f")).ok());

  EXPECT_EQ(folder_.read("f"), "new");
  EXPECT_FALSE(isThere(".f.tmp"));
  EXPECT_FALSE(replacement.isOpen());
}

TEST_F(FileReplacementTest, OneThatIsLetGoOfLeavesNothing) {
  folder_.write("f", "old");
  {
    FileReplacement replacement;
    begin(replacement);
    replacement.write("new");
  }
  EXPECT_EQ(folder_.read("f"), "old");
  EXPECT_FALSE(isThere(".f.tmp"));
}

TEST_F(FileReplacementTest, AfterAFailedWriteNothingTakesThePlace) {
  folder_.write("f", "old");
  folder_.write(".f.tmp", "");
  FileReplacement replacement;
  replacement.begin(UniqueDescriptor(::open("/dev/full", O_WRONLY | O_CLOEXEC)), folder_.path(".f.tmp"));
  replacement.write("new");
  ASSERT_TRUE(replacement.failure().failed());
  EXPECT_EQ(replacement.failure()->code, ENOSPC);

  const auto error = replacement.takePlace(folder_.path("f"));

  ASSERT_TRUE(error.failed());
  EXPECT_EQ(error->code, ENOSPC);
  EXPECT_EQ(folder_.read("f"), "old");
  EXPECT_FALSE(isThere(".f.tmp"));
}

TEST_F(FileReplacementTest, ReplacedFileHandsDownItsMode) {
  folder_.write("f", "old");
  ASSERT_EQ(::chmod(folder_.path("f").c_str(), 0604), 0);

  EXPECT_TRUE(replaceFile(folder_.path("f"), folder_.path(".f.tmp"), "new").ok());

  struct stat facts {};
  ASSERT_EQ(::stat(folder_.path("f").c_str(), &facts), 0);
  EXPECT_EQ(facts.st_mode & 0777U, 0604U);
  EXPECT_EQ(folder_.read("f"), "new");
}

TEST_F(FileReplacementTest, ReplacedFileLeavesNoTemporaryBehindEvenWhenItFails) {
  EXPECT_TRUE(replaceFile(folder_.path("f"), folder_.path(".f.tmp"), "content").ok());
  EXPECT_EQ(folder_.read("f"), "content");
  std::filesystem::create_directory(folder_.path("taken"));

  const auto error = replaceFile(folder_.path("taken"), folder_.path(".t.tmp"), "content");

  ASSERT_TRUE(error.failed());
  EXPECT_EQ(error->code, EISDIR);
  EXPECT_FALSE(isThere(".t.tmp"));
  EXPECT_FALSE(isThere(".f.tmp"));
}

}  // namespace
}  // namespace tarn::linux_host
