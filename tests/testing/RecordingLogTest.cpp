// SPDX-License-Identifier: Apache-2.0
#include "testing/RecordingLog.h"

#include <gtest/gtest.h>

#include <thread>
#include <vector>

namespace tarn::testing {
namespace {

using platform::LogLevel;

constexpr platform::LogCategory kCategory{"sys.example", "code"};

TEST(RecordingLog, KeepsCopiesOfWhatWasWritten) {
  RecordingLog log;
  {
    const std::string text = "                   Module:7     text";
    log.write({kCategory, LogLevel::Info, "Module", 7, text});
  }
  const auto entries = log.entries();
  ASSERT_EQ(entries.size(), 1U);
  EXPECT_EQ(entries[0].category, "code");
  EXPECT_EQ(entries[0].message(), "text");
}

TEST(RecordingLog, CountsAndFindsParts) {
  RecordingLog log;
  log.write({kCategory, LogLevel::Info, "", 1, "one two"});
  log.write({kCategory, LogLevel::Error, "", 1, "two"});
  EXPECT_EQ(log.count("two"), 2U);
  EXPECT_TRUE(log.contains(LogLevel::Error, "two"));
  EXPECT_FALSE(log.contains(LogLevel::Error, "one"));
  EXPECT_FALSE(log.contains("three"));
  EXPECT_EQ(log.entries(LogLevel::Error).size(), 1U);
}

TEST(RecordingLog, TakesEntriesFromManyThreads) {
  RecordingLog log;
  std::vector<std::thread> threads;
  threads.reserve(4);
  for (int thread = 0; thread < 4; ++thread) {
    threads.emplace_back([&log] {
      for (int entry = 0; entry < 500; ++entry) {
        log.write({kCategory, LogLevel::Info, "", 1, "text"});
      }
    });
  }
  for (std::thread& thread : threads) {
    thread.join();
  }
  EXPECT_EQ(log.count("text"), 2000U);
}

}  // namespace
}  // namespace tarn::testing
