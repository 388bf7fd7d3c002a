// SPDX-License-Identifier: Apache-2.0
// The cap holds for all that the recorder keeps and for the folders that it is told of.
#include <fcntl.h>

#include <atomic>

#include "recorder/store/files/StateUsage.h"
#include "tests/recorder/RecorderFixture.h"
#include "tests/recorder/faults/ChildProcess.h"

namespace tarn::recorder {
namespace {

constexpr std::int64_t kMegabyte = 1 << 20;

class RecorderCap : public RecorderFixture, public ::testing::WithParamInterface<int> {
 protected:
  std::uintmax_t bytesOfAll() const {
    std::uintmax_t bytes = 0;
    for (const auto& entry : std::filesystem::recursive_directory_iterator(directory_.path())) {
      std::error_code gone;
      const auto size = entry.is_regular_file(gone) ? std::filesystem::file_size(entry.path(), gone) : 0;
      bytes += gone ? 0 : size;
    }
    return bytes;
  }
  void write(const std::filesystem::path& path, std::int64_t bytes) {
    std::filesystem::create_directories(path.parent_path());
    std::ofstream(path) << std::string(static_cast<std::size_t>(bytes), 'x');
  }
};

TEST_P(RecorderCap, AllFilesTogetherStayWithinIt) {
  options_.maxMegabytes = GetParam();
  options_.folders = {directory_.path() / "summaries"};
  options_.maintenanceInterval = std::chrono::milliseconds(1);
  write(file().string() + ".damaged-1000", options_.maxMegabytes * kMegabyte / 8);
  for (int n = 0; n < 4; ++n) {
    write(options_.folders.front() / std::to_string(n), options_.maxMegabytes * kMegabyte / 16);
  }
  start();
  std::uintmax_t largest = 0;
  for (int round = 0; round < 60; ++round) {
    recordMany(100 * GetParam(), 1000);
    ASSERT_TRUE(flush());
    largest = std::max(largest, bytesOfAll());
  }
  EXPECT_LE(largest, static_cast<std::uintmax_t>(options_.maxMegabytes * kMegabyte));
  EXPECT_GE(largest, static_cast<std::uintmax_t>(options_.maxMegabytes * kMegabyte / 2));
}

INSTANTIATE_TEST_SUITE_P(Sizes, RecorderCap, ::testing::Values(2, 8));

TEST_F(RecorderCap, WhatOthersKeepCountsAsItIsNow) {
  const auto others = std::make_shared<std::atomic<std::int64_t>>(0);
  StateUsage usage(file(), {}, 8 * kMegabyte, others);
  usage.tidy();
  const std::int64_t before = usage.databaseBytes(0);
  *others = kMegabyte;
  EXPECT_EQ(usage.databaseBytes(0), before - kMegabyte);
  *others = 0;
  EXPECT_EQ(usage.databaseBytes(0), before);
}

TEST_F(RecorderCap, OfFilesSetAsideTheFirstIsKeptLongest) {
  options_.maxMegabytes = 4;
  for (const char* const name : {".damaged-1000", ".damaged-2000", ".damaged-2000-wal", ".damaged-3000"}) {
    write(file().string() + name, kMegabyte / 2);
  }
  start().waitUntilOpened();
  stop();
  EXPECT_TRUE(std::filesystem::exists(file().string() + ".damaged-1000"));
  EXPECT_TRUE(std::filesystem::exists(file().string() + ".damaged-2000"));
  EXPECT_FALSE(std::filesystem::exists(file().string() + ".damaged-2000-wal"));
  EXPECT_FALSE(std::filesystem::exists(file().string() + ".damaged-3000"));
  EXPECT_EQ(log_.count("its kind is over its share"), 2U);
}

TEST_F(RecorderCap, OfAFolderTheOldestFilesGoAndNoLinkIsFollowed) {
  options_.maxMegabytes = 4;
  options_.folders = {directory_.path() / "summaries"};
  const auto now = std::filesystem::file_time_type::clock::now();
  const std::filesystem::path elsewhere = directory_.path() / "elsewhere";
  write(elsewhere, 4 * kMegabyte);
  for (int age = 0; age < 3; ++age) {
    const std::filesystem::path path = options_.folders.front() / std::to_string(age);
    write(path, kMegabyte / 4);
    std::filesystem::last_write_time(path, now - std::chrono::hours(age));
  }
  std::filesystem::create_symlink(elsewhere, options_.folders.front() / "link");
  start().waitUntilOpened();
  stop();
  EXPECT_TRUE(std::filesystem::exists(options_.folders.front() / "0"));
  EXPECT_TRUE(std::filesystem::exists(options_.folders.front() / "1"));
  EXPECT_FALSE(std::filesystem::exists(options_.folders.front() / "2"));
  EXPECT_TRUE(std::filesystem::exists(options_.folders.front() / "link"));
  EXPECT_TRUE(std::filesystem::exists(elsewhere));
}

TEST_F(RecorderCap, AReaderThatHoldsUpTheLogIsNamed) {
  options_.longLogBytes = kMegabyte;
  int go[2];
  int ready[2];
  ASSERT_EQ(::pipe(go), 0);
  ASSERT_EQ(::pipe(ready), 0);
  ChildProcess child([&] {
    char got = 0;
    ASSERT_EQ(::read(go[0], &got, 1), 1);
    sqlite3* reader = nullptr;
    ASSERT_EQ(sqlite3_open_v2(file().c_str(), &reader, SQLITE_OPEN_READONLY, nullptr), SQLITE_OK);
    ASSERT_EQ(sqlite3_exec(reader, "BEGIN; SELECT count(*) FROM events", nullptr, nullptr, nullptr), SQLITE_OK);
    ASSERT_EQ(::write(ready[1], "x", 1), 1);
    ::pause();
  });
  ::close(go[0]);
  ::close(ready[1]);
  start();
  recordMany(10);
  ASSERT_TRUE(flush());
  ASSERT_EQ(::write(go[1], "x", 1), 1);
  char got = 0;
  ASSERT_EQ(::read(ready[0], &got, 1), 1);
  for (int round = 0; round < 10; ++round) {
    recordMany(500, 1000);
    ASSERT_TRUE(flush());
  }
  EXPECT_TRUE(eventually([&] { return log_.count("MiB, held up by readers of an old state: process ") == 1; }));
  EXPECT_EQ(errors(), 1U);
  child.killAndWait();
  ::close(go[1]);
  ::close(ready[0]);
}

}  // namespace
}  // namespace tarn::recorder
