// SPDX-License-Identifier: Apache-2.0
#include "host/machine/OverflowFile.h"

#include <gtest/gtest.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <csignal>
#include <filesystem>
#include <fstream>
#include <map>
#include <random>
#include <string>
#include <thread>
#include <vector>

#include "tests/support/Seeds.h"

namespace tarn::linux_host {
namespace {

constexpr std::size_t kMuch = std::size_t{1} << 30U;

class OverflowFileTest : public ::testing::Test {
 protected:
  OverflowFileTest() {
    std::string pattern = std::filesystem::temp_directory_path() / "tarn-overflow.XXXXXX";
    const char* made = ::mkdtemp(pattern.data());
    if (made != nullptr) {
      directory_ = made;
    }
  }
  ~OverflowFileTest() override {
    std::error_code ignored;
    std::filesystem::remove_all(directory_, ignored);
  }
  void SetUp() override { ASSERT_FALSE(directory_.empty()); }

  std::vector<std::string> names() const {
    std::vector<std::string> names;
    for (const auto& entry : std::filesystem::directory_iterator(directory_)) {
      names.push_back(entry.path().filename());
    }
    return names;
  }
  static std::string block(std::size_t size, char first) {
    std::string bytes(size, first);
    for (std::size_t at = 0; at < size; at += 1000) {
      bytes[at] = static_cast<char>(at / 1000);
    }
    return bytes;
  }

  std::string directory_;
};

TEST_F(OverflowFileTest, BlocksOfAnySizeComeBack) {
  OverflowFile file(directory_, {}, kMuch);
  std::map<platform::OverflowStore::Place, std::string> kept;
  for (const std::size_t size : {std::size_t{1}, OverflowFile::kSlotBytes - 1, OverflowFile::kSlotBytes,
                                 OverflowFile::kSlotBytes + 1, std::size_t{1'000'000}}) {
    const std::string bytes = block(size, 'a');
    const auto written = file.write(bytes);
    ASSERT_TRUE(written.ok());
    kept[written.value] = bytes;
  }
  EXPECT_EQ(kept.size(), 5U);
  for (const auto& [place, bytes] : kept) {
    EXPECT_EQ(file.read(place).value, bytes);
  }
}

TEST_F(OverflowFileTest, FileHasNoNameAndIsMadeWithTheFirstBlock) {
  OverflowFile file(directory_, {}, kMuch);
  ASSERT_TRUE(file.write("abc").ok());
  EXPECT_TRUE(names().empty());
}

TEST_F(OverflowFileTest, WhatAKilledProcessLeftIsRemovedAndNoLinkIsFollowed) {
  std::ofstream(directory_ + "/target") << "theirs";
  std::filesystem::create_symlink(directory_ + "/target", directory_ + "/log-overflow");
  OverflowFile file(directory_, {}, kMuch);
  ASSERT_TRUE(file.write("abc").ok());
  EXPECT_EQ(names(), std::vector<std::string>{"target"});
  std::string content;
  std::ifstream(directory_ + "/target") >> content;
  EXPECT_EQ(content, "theirs");
}

TEST_F(OverflowFileTest, SizeIsThatOfTheSlotsInUse) {
  OverflowFile file(directory_, {}, kMuch);
  const auto size = file.size();
  EXPECT_EQ(*size, 0);
  const auto first = file.write("abc");
  const auto second = file.write(std::string(OverflowFile::kSlotBytes + 1, 'x'));
  EXPECT_EQ(*size, static_cast<std::int64_t>(3 * OverflowFile::kSlotBytes));
  file.remove(first.value);
  EXPECT_EQ(*size, static_cast<std::int64_t>(2 * OverflowFile::kSlotBytes));
  file.remove(second.value);
  EXPECT_EQ(*size, 0);
}

TEST_F(OverflowFileTest, BeyondItsShareItIsFullUntilSomethingIsRemoved) {
  OverflowFile file(directory_, {}, 2 * OverflowFile::kSlotBytes);
  const auto first = file.write("abc");
  ASSERT_TRUE(file.write("def").ok());
  const auto refused = file.write("ghi");
  EXPECT_EQ(refused.error.code(), ENOSPC);
  EXPECT_EQ(refused.error.text(), "the share of the disk for messages is used up");
  file.remove(first.value);
  EXPECT_TRUE(file.write("ghi").ok());
}

TEST_F(OverflowFileTest, MissingFolderIsAnErrorAndNothingIsCounted) {
  OverflowFile file(directory_ + "/missing", {}, kMuch);
  const auto refused = file.write("abc");
  EXPECT_EQ(refused.error.code(), ENOENT);
  EXPECT_EQ(refused.error.text(), directory_ + "/missing: No such file or directory");
  EXPECT_EQ(*file.size(), 0);
}

TEST_F(OverflowFileTest, FailedWriteGivesItsSlotsBack) {
  OverflowFile file(directory_, {}, kMuch);
  const auto first = file.write("abc");
  ASSERT_TRUE(first.ok());
  // A file of this size and no more: what the system says then is what a full disk says, but for the number.
  rlimit before{};
  ASSERT_EQ(::getrlimit(RLIMIT_FSIZE, &before), 0);
  const rlimit tight{OverflowFile::kSlotBytes, before.rlim_max};
  const auto handler = std::signal(SIGXFSZ, SIG_IGN);
  ASSERT_EQ(::setrlimit(RLIMIT_FSIZE, &tight), 0);
  const auto refused = file.write(std::string(3 * OverflowFile::kSlotBytes, 'x'));
  ASSERT_EQ(::setrlimit(RLIMIT_FSIZE, &before), 0);
  std::signal(SIGXFSZ, handler);
  EXPECT_EQ(refused.error.code(), EFBIG);
  EXPECT_EQ(*file.size(), static_cast<std::int64_t>(OverflowFile::kSlotBytes));
  const auto second = file.write(std::string(3 * OverflowFile::kSlotBytes, 'y'));
  EXPECT_EQ(file.read(second.value).value, std::string(3 * OverflowFile::kSlotBytes, 'y'));
  EXPECT_EQ(file.read(first.value).value, "abc");
}

TEST_F(OverflowFileTest, NothingIsFoundWhereNothingIsKept) {
  OverflowFile file(directory_, {}, kMuch);
  EXPECT_TRUE(file.read(1).failed());
  const auto written = file.write("abc");
  file.remove(written.value);
  EXPECT_TRUE(file.read(written.value).failed());
  file.remove(written.value);  // does nothing
  EXPECT_EQ(*file.size(), 0);
}

TEST_F(OverflowFileTest, AnyOrderOfWritesAndRemovalsLeavesTheOthersAsTheyWere) {
  for (const std::uint64_t seed : testing::testSeeds(1)) {
    SCOPED_TRACE(testing::seedNote(seed));
    std::mt19937 random(static_cast<std::mt19937::result_type>(seed));
    OverflowFile file(directory_, {}, kMuch);
    std::map<platform::OverflowStore::Place, std::string> kept;
    for (int step = 0; step < 2000; ++step) {
      if (random() % 2 == 0 || kept.empty()) {
        const std::string bytes(1 + random() % 20'000, static_cast<char>(random()));
        kept[file.write(bytes).value] = bytes;
      } else {
        const auto chosen = std::next(kept.begin(), static_cast<std::ptrdiff_t>(random() % kept.size()));
        ASSERT_EQ(file.read(chosen->first).value, chosen->second);
        file.remove(chosen->first);
        kept.erase(chosen);
      }
    }
    for (const auto& [place, bytes] : kept) {
      ASSERT_EQ(file.read(place).value, bytes);
    }
  }
}

TEST_F(OverflowFileTest, ThreadsDoNotSeeEachOthersBlocks) {
  OverflowFile file(directory_, {}, kMuch);
  std::vector<std::thread> threads;
  std::atomic<int> wrong = 0;
  for (char each = 'a'; each < 'e'; ++each) {
    threads.emplace_back([&file, &wrong, each] {
      const std::string bytes(10'000, each);
      for (int round = 0; round < 300; ++round) {
        const auto written = file.write(bytes);
        wrong += file.read(written.value).value == bytes ? 0 : 1;
        file.remove(written.value);
      }
    });
  }
  for (std::thread& thread : threads) {
    thread.join();
  }
  EXPECT_EQ(wrong, 0);
  EXPECT_EQ(*file.size(), 0);
}

}  // namespace
}  // namespace tarn::linux_host
