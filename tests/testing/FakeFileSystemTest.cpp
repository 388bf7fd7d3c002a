// SPDX-License-Identifier: Apache-2.0
#include "testing/FakeFileSystem.h"

#include <gtest/gtest.h>

namespace tarn::testing {
namespace {

using Operation = FakeFileSystem::Operation;

TEST(FakeFileSystem, AFileNeedsItsDirectory) {
  FakeFileSystem files;
  ASSERT_TRUE(files.createFile("/a/b/file").failed());

  ASSERT_TRUE(files.createDirectories("/a/b", 0777).ok());

  EXPECT_TRUE(files.createFile("/a/b/file").ok());
  EXPECT_EQ(files.directoryPermissions("/a"), 0777U);
  EXPECT_EQ(files.content("/a/b/file"), "");
}

TEST(FakeFileSystem, AFileIsCreatedOnce) {
  FakeFileSystem files;
  ASSERT_TRUE(files.createFile("/file").ok());

  const auto again = files.createFile("/file");

  ASSERT_TRUE(again.failed());
  EXPECT_EQ(again->text, "File exists");
}

TEST(FakeFileSystem, WritesAreSeenAndTheCloseIsCounted) {
  FakeFileSystem files;
  files.putFile("/logs/file", "old");
  auto opened = files.openForWriting("/logs/file");
  ASSERT_FALSE(opened.failed());
  EXPECT_EQ(files.openFiles(), 1U);

  EXPECT_TRUE(opened.value->write("new").ok());
  EXPECT_EQ(files.content("/logs/file"), "new");
  EXPECT_TRUE(opened.value->close().ok());

  EXPECT_EQ(files.openFiles(), 0U);
  EXPECT_EQ(opened.value->close()->text, "Bad file descriptor");
}

TEST(FakeFileSystem, AnOpenFileMayOutliveTheFileSystem) {
  std::unique_ptr<platform::WritableFile> file;
  {
    FakeFileSystem files;
    files.putFile("/file", "");
    file = files.openForWriting("/file").value;
  }

  EXPECT_TRUE(file->write("late").ok());
}

TEST(FakeFileSystem, AnOrderedFailureComesOnceAfterTheSkippedCalls) {
  FakeFileSystem files;
  files.putFile("/file", "");
  auto opened = files.openForWriting("/file");
  files.failNext(Operation::Write, {5, "Input/output error"}, 1);

  EXPECT_TRUE(opened.value->write("a").ok());
  const auto failed = opened.value->write("b");
  EXPECT_TRUE(opened.value->write("c").ok());

  ASSERT_TRUE(failed.failed());
  EXPECT_EQ(failed->code, 5);
  EXPECT_EQ(files.content("/file"), "ac");
}

TEST(FakeFileSystem, AFullDiskKeepsWhatFits) {
  FakeFileSystem files;
  files.putFile("/file", "");
  auto opened = files.openForWriting("/file");
  files.setFreeBytes(5);

  EXPECT_TRUE(opened.value->write("123").ok());
  const auto failed = opened.value->write("456");

  ASSERT_TRUE(failed.failed());
  EXPECT_EQ(failed->code, 28);
  EXPECT_EQ(files.content("/file"), "12345");
}

TEST(FakeFileSystem, ReadsUpToTheLimit) {
  FakeFileSystem files;
  files.putFile("/file", "12345");

  EXPECT_EQ(files.readFile("/file", 5).value, "12345");
  EXPECT_TRUE(files.readFile("/file", 4).failed());
  EXPECT_TRUE(files.readFile("/missing", 4).failed());
}

TEST(FakeFileSystem, MovesAndReplaces) {
  FakeFileSystem files;
  files.putFile("/from", "new");
  files.putFile("/to", "old");

  EXPECT_TRUE(files.moveFile("/from", "/to").ok());

  EXPECT_EQ(files.files(), std::vector<std::string>{"/to"});
  EXPECT_EQ(files.content("/to"), "new");
  EXPECT_TRUE(files.moveFile("/from", "/to").failed());
}

}  // namespace
}  // namespace tarn::testing
