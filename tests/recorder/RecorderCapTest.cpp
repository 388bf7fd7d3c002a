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
  FileKind summaries() const { return {"summary file", directory_.path() / "summaries", "", true, 4, 120}; }
  void write(const std::filesystem::path& path, std::int64_t bytes) {
    std::filesystem::create_directories(path.parent_path());
    std::ofstream(path) << std::string(static_cast<std::size_t>(bytes), 'x');
  }
};

TEST_P(RecorderCap, AllFilesTogetherStayWithinIt) {
  options_.maxMegabytes = GetParam();
  options_.files = {summaries()};
  options_.maintenanceInterval = std::chrono::milliseconds(1);
  write(file().string() + ".damaged-1000", options_.maxMegabytes * kMegabyte / 8);
  for (int n = 0; n < 4; ++n) {
    write(options_.files.front().folder / std::to_string(n), options_.maxMegabytes * kMegabyte / 16);
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
  StateUsage usage(file(), 90, {}, 8 * kMegabyte, others);
  usage.tidy([](const std::string&) { return 0.0; });
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
  options_.files = {summaries()};
  const auto now = std::filesystem::file_time_type::clock::now();
  const std::filesystem::path elsewhere = directory_.path() / "elsewhere";
  write(elsewhere, 4 * kMegabyte);
  for (int age = 0; age < 3; ++age) {
    const std::filesystem::path path = options_.files.front().folder / std::to_string(age);
    write(path, kMegabyte / 4);
    std::filesystem::last_write_time(path, now - std::chrono::hours(age));
  }
  std::filesystem::create_symlink(elsewhere, options_.files.front().folder / "link");
  start().waitUntilOpened();
  stop();
  EXPECT_TRUE(std::filesystem::exists(options_.files.front().folder / "0"));
  EXPECT_TRUE(std::filesystem::exists(options_.files.front().folder / "1"));
  EXPECT_FALSE(std::filesystem::exists(options_.files.front().folder / "2"));
  EXPECT_TRUE(std::filesystem::exists(options_.files.front().folder / "link"));
  EXPECT_TRUE(std::filesystem::exists(elsewhere));
}

// Of a folder with two kinds each has its own share.
TEST_F(RecorderCap, TracesAndPerfDataFilesTakeNothingOfEachOther) {
  options_.maxMegabytes = 4;
  options_.files = diagnosticFileKinds(directory_.path(), {});
  const std::filesystem::path traces = directory_.path() / "Traces";
  const auto now = std::filesystem::file_time_type::clock::now();
  for (int age = 0; age < 4; ++age) {
    for (const char* const suffix : {".json", ".pdj"}) {
      const std::filesystem::path path = traces / (std::to_string(age) + suffix);
      write(path, kMegabyte / 8 - 1000);
      std::filesystem::last_write_time(path, now - std::chrono::hours(age));
    }
  }
  start().waitUntilOpened();
  stop();
  for (const char* const kept : {"0.json", "1.json", "2.json", "0.pdj"}) {
    EXPECT_TRUE(std::filesystem::exists(traces / kept)) << kept;
  }
  for (const char* const removed : {"3.json", "1.pdj", "2.pdj", "3.pdj"}) {
    EXPECT_FALSE(std::filesystem::exists(traces / removed)) << removed;
  }
  EXPECT_EQ(log_.count("recorder removed the perf-data file 3.pdj: its kind is over its share"), 1U);
}

// Each kind has an age, which is neither the wall clock's nor that of the file's own date.
TEST_F(RecorderCap, FilesGrowOldOnTheRecordersOwnTime) {
  options_.files = diagnosticFileKinds(directory_.path(), {5, 4, 2, 3});
  options_.fileMaxAges.setAside = 5;
  const std::vector<std::pair<int, std::filesystem::path>> files{{2, directory_.path() / "Traces/a.json"},
                                                                 {3, directory_.path() / "Traces/a.pdj"},
                                                                 {4, directory_.path() / "Reporting/a.json"},
                                                                 {5, file().string() + ".damaged-1000"}};
  for (const auto& [days, path] : files) {
    write(path, 100);
    std::filesystem::last_write_time(path, std::filesystem::file_time_type::clock::now() - std::chrono::hours(99'999));
  }
  options_.maintenanceInterval = std::chrono::milliseconds(1);
  const auto look = [&] {
    start();
    ASSERT_TRUE(eventually([&] {
      return askOne(file(), "SELECT count(*) FROM recorder_files") ==
             std::to_string(std::count_if(files.begin(), files.end(),
                                          [](const auto& one) { return std::filesystem::exists(one.second); }));
    }));
    stop();
  };
  look();
  for (int day = 0; day < 7; ++day) {
    for (const auto& [days, path] : files) {
      EXPECT_EQ(std::filesystem::exists(path), day < days) << path << " after days: " << day;
    }
    clock_.setEpochSeconds(clock_.epochSeconds() + 1e8);
    clock_.advance(std::chrono::hours(24) + std::chrono::seconds(1));
    look();
  }
  EXPECT_EQ(log_.count("it is too old"), 4U);
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
