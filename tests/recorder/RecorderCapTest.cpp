// The cap holds for all that the recorder keeps and for the folders that it is told of.
#include <fcntl.h>
#include <sys/stat.h>

#include "recorder/store/StateUsage.h"
#include "tests/recorder/ChildProcess.h"
#include "tests/recorder/RecorderFixture.h"

namespace tarn::recorder {
namespace {

constexpr std::int64_t kMegabyte = 1 << 20;

constexpr double kSecondsADay = 86'400;

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
  std::filesystem::path summaries() const { return directory_.path() / "summaries"; }
  std::filesystem::path traces() const { return directory_.path() / "traces"; }
  void write(const std::filesystem::path& path, std::int64_t bytes) {
    std::filesystem::create_directories(path.parent_path());
    std::ofstream(path) << std::string(static_cast<std::size_t>(bytes), 'x');
  }
};

TEST_P(RecorderCap, AllFilesTogetherStayWithinIt) {
  options_.maxMegabytes = GetParam();
  options_.kinds = {{summaries(), "", 365}};
  options_.maintenanceInterval = std::chrono::milliseconds(1);
  write(file().string() + ".damaged-1000", options_.maxMegabytes * kMegabyte / 8);
  for (int n = 0; n < 4; ++n) {
    write(summaries() / std::to_string(n), options_.maxMegabytes * kMegabyte / 16);
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
  options_.kinds = {{summaries(), "", 365}};
  const auto now = std::filesystem::file_time_type::clock::now();
  const std::filesystem::path elsewhere = directory_.path() / "elsewhere";
  write(elsewhere, 4 * kMegabyte);
  for (int age = 0; age < 3; ++age) {
    const std::filesystem::path path = summaries() / std::to_string(age);
    write(path, kMegabyte / 4);
    std::filesystem::last_write_time(path, now - std::chrono::hours(age));
  }
  std::filesystem::create_symlink(elsewhere, summaries() / "link");
  start().waitUntilOpened();
  stop();
  EXPECT_TRUE(std::filesystem::exists(summaries() / "0"));
  EXPECT_TRUE(std::filesystem::exists(summaries() / "1"));
  EXPECT_FALSE(std::filesystem::exists(summaries() / "2"));
  EXPECT_TRUE(std::filesystem::exists(summaries() / "link"));
  EXPECT_TRUE(std::filesystem::exists(elsewhere));
}

TEST_F(RecorderCap, EachKindOfAFolderHasAShare) {
  options_.maxMegabytes = 4;
  options_.kinds = {{traces(), ".json", 30}, {traces(), "", 90}};
  for (const char* const name : {"1.json", "2.json", "1.pdj", "2.pdj", "3.pdj"}) {
    write(traces() / name, kMegabyte / 4);
  }
  start().waitUntilOpened();
  stop();
  EXPECT_TRUE(std::filesystem::exists(traces() / "1.json"));
  EXPECT_TRUE(std::filesystem::exists(traces() / "2.json"));
  EXPECT_EQ(log_.count("its kind is over its share"), 1U);
  EXPECT_EQ(log_.count(".pdj: its kind is over its share"), 1U);
}

// Files whose wall-clock time is that of the test's clock at their writing.
class RecorderFileAge : public RecorderCap {
 protected:
  RecorderFileAge() {
    options_.kinds = {{summaries(), "", 30}, {traces(), ".json", 10}, {traces(), "", 20}};
    options_.asideMaxAgeDays = 40;
  }
  void writeNow(const std::filesystem::path& path) {
    write(path, 10);
    const auto seconds = static_cast<std::time_t>(clock_.epochSeconds());
    const timespec times[] = {{seconds, 0}, {seconds, 0}};
    ASSERT_EQ(::utimensat(AT_FDCWD, path.c_str(), times, 0), 0);
  }
  void pass(double days) { clock_.advance(std::chrono::seconds(static_cast<std::int64_t>(days * kSecondsADay))); }
  void step(double days) { clock_.setEpochSeconds(clock_.epochSeconds() + days * kSecondsADay); }
  // A run of the recorder that only looks.
  void look() {
    start().waitUntilOpened();
    stop();
  }
};

TEST_F(RecorderFileAge, EachKindGoesAtItsOwnAge) {
  look();
  const std::filesystem::path aside = file().string() + ".damaged-1000";
  const std::vector<std::filesystem::path> byAge{traces() / "a.json", traces() / "a.pdj", summaries() / "a.json",
                                                 aside};
  for (const auto& path : byAge) {
    writeNow(path);
  }
  for (std::size_t gone = 0; gone < byAge.size(); ++gone) {
    pass(9.9);
    look();
    EXPECT_TRUE(std::filesystem::exists(byAge[gone])) << byAge[gone];
    pass(0.1 + 1.0 / kSecondsADay);
    look();
    EXPECT_FALSE(std::filesystem::exists(byAge[gone])) << byAge[gone];
  }
  EXPECT_EQ(log_.count("it is older than its kind may get"), 4U);
}

TEST_F(RecorderFileAge, ARecorderThatRunsRemovesThemToo) {
  options_.maintenanceInterval = std::chrono::milliseconds(1);
  start().waitUntilOpened();
  writeNow(summaries() / "a.json");
  pass(31);
  EXPECT_TRUE(eventually([&] { return !std::filesystem::exists(summaries() / "a.json"); }));
}

TEST_F(RecorderFileAge, AStepOfTheWallClockMakesNoFileOlder) {
  options_.maintenanceInterval = std::chrono::milliseconds(1);
  for (const double days : {400.0, -400.0, -3000.0, 20'000.0, -1.0, 1.0}) {
    start().waitUntilOpened();
    writeNow(summaries() / "before.json");
    step(days);
    writeNow(summaries() / "after.json");
    pass(29);
    stop();
    look();
    EXPECT_TRUE(std::filesystem::exists(summaries() / "before.json")) << days;
    EXPECT_TRUE(std::filesystem::exists(summaries() / "after.json")) << days;
  }
}

TEST_F(RecorderFileAge, AStepWhileNoRecorderRunsMakesNoFileOlder) {
  for (const double days : {400.0, -400.0, 1.0}) {
    look();
    writeNow(summaries() / "before.json");
    step(days);
    look();
    writeNow(summaries() / "after.json");
    pass(29);
    look();
    EXPECT_TRUE(std::filesystem::exists(summaries() / "before.json")) << days;
    EXPECT_TRUE(std::filesystem::exists(summaries() / "after.json")) << days;
  }
}

TEST_F(RecorderFileAge, WhatIsOlderThanTheStoreIsAsOldAsItAtTheLeast) {
  writeNow(summaries() / "a.json");
  pass(100);
  look();
  EXPECT_TRUE(std::filesystem::exists(summaries() / "a.json"));
  pass(29);
  look();
  EXPECT_TRUE(std::filesystem::exists(summaries() / "a.json"));
  pass(2);
  look();
  EXPECT_FALSE(std::filesystem::exists(summaries() / "a.json"));
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
