// SPDX-License-Identifier: Apache-2.0
#include "host/system/Files.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <array>
#include <cerrno>
#include <thread>

#include "host/system/UniqueDescriptor.h"
#include "tests/host/TemporaryFolder.h"

namespace tarn::linux_host {
namespace {

TEST(WriteAll, WritesMoreThanAPipeHolds) {
  std::array<int, 2> ends{};
  ASSERT_EQ(::pipe2(ends.data(), O_CLOEXEC), 0);
  const UniqueDescriptor reading(ends[0]);
  UniqueDescriptor writing(ends[1]);
  const std::string content(1'000'000, 'p');  // more than a pipe holds
  std::string seen;
  std::thread reader([&] {
    std::array<char, 4096> block{};
    ssize_t count = 0;
    while ((count = ::read(reading.get(), block.data(), block.size())) > 0) {
      seen.append(block.data(), static_cast<std::size_t>(count));
    }
  });

  const auto error = writeAll(writing.get(), content);

  writing.reset();
  reader.join();
  EXPECT_TRUE(error.ok());
  EXPECT_EQ(seen, content);
}

TEST(WriteAll, WhatWasTakenInPartIsNotTakenForAll) {
  std::array<int, 2> ends{};
  ASSERT_EQ(::pipe2(ends.data(), O_CLOEXEC | O_NONBLOCK), 0);
  const UniqueDescriptor reading(ends[0]);
  const UniqueDescriptor writing(ends[1]);

  const auto error = writeAll(writing.get(), std::string(10'000'000, 'p'));

  ASSERT_TRUE(error.failed());
  EXPECT_EQ(error->code, EAGAIN);
}

TEST(WriteAll, FullDiskIsTold) {
  const UniqueDescriptor full(::open("/dev/full", O_WRONLY | O_CLOEXEC));
  ASSERT_TRUE(full);

  const auto error = writeAll(full.get(), "x");

  ASSERT_TRUE(error.failed());
  EXPECT_EQ(error->code, ENOSPC);
  EXPECT_EQ(error->text, "No space left on device");
}

TEST(CreateDirectories, MakesWhatIsMissingAndLeavesWhatIsThere) {
  const TemporaryFolder folder;
  std::filesystem::create_directory(folder.path("a"));
  ASSERT_EQ(::chmod(folder.path("a").c_str(), 0700), 0);

  EXPECT_TRUE(createDirectories(folder.path("a/b/c/"), 0750).ok());

  struct stat facts {};
  ASSERT_EQ(::stat(folder.path("a/b/c").c_str(), &facts), 0);
  EXPECT_EQ(facts.st_mode & 0777U & ~0750U, 0U);
  ASSERT_EQ(::stat(folder.path("a").c_str(), &facts), 0);
  EXPECT_EQ(facts.st_mode & 0777U, 0700U);
}

TEST(CreateDirectories, OneThatIsThereIsFineWhereNothingCanBeMade) {
  EXPECT_TRUE(createDirectories("/proc/self", 0750).ok());
}

TEST(CreateDirectories, WhatCannotBeMadeIsTold) {
  const TemporaryFolder folder;
  folder.write("file", "");
  const auto codeOf = [](const std::string& path) {
    const auto error = createDirectories(path, 0750);
    return error.code();
  };
  EXPECT_EQ(codeOf(folder.path("file")), ENOTDIR);
  EXPECT_EQ(codeOf(folder.path("file/below")), ENOTDIR);
  EXPECT_EQ(codeOf("/proc/none"), ENOENT);
  EXPECT_EQ(codeOf(""), ENOENT);
}

}  // namespace
}  // namespace tarn::linux_host
