// SPDX-License-Identifier: Apache-2.0
// RecorderFixture: a directory of its own, a recorder's options on it, and a second look at the file through SQLite
// alone.
#pragma once

#include <gtest/gtest.h>
#include <sqlite3.h>
#include <unistd.h>

#include <chrono>
#include <cstdint>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <functional>
#include <memory>
#include <string>
#include <thread>
#include <vector>

#include "recorder/Recorder.h"
#include "testing/ManualClock.h"
#include "testing/RecordingLog.h"

namespace tarn::recorder {

using plist::Dictionary;

constexpr std::chrono::seconds kPatience{20};

// Looks again and again until it holds; false when patience ends.
inline bool eventually(const std::function<bool()>& holds) {
  const auto until = std::chrono::steady_clock::now() + kPatience;
  while (!holds()) {
    if (std::chrono::steady_clock::now() > until) return false;
    std::this_thread::sleep_for(std::chrono::milliseconds(2));
  }
  return true;
}

class TemporaryDirectory {
 public:
  TemporaryDirectory() {
    std::string pattern = (std::filesystem::temp_directory_path() / "recorder-XXXXXX").string();
    path_ = ::mkdtemp(pattern.data());
  }
  ~TemporaryDirectory() {
    std::error_code ignored;
    std::filesystem::remove_all(path_, ignored);
  }
  TemporaryDirectory(const TemporaryDirectory&) = delete;
  TemporaryDirectory& operator=(const TemporaryDirectory&) = delete;
  const std::filesystem::path& path() const { return path_; }

 private:
  std::filesystem::path path_;
};

// All rows of a question, columns joined with '|', as the stock tool prints them; a failure is the only row.
inline std::vector<std::string> ask(const std::filesystem::path& file, const std::string& sql) {
  std::vector<std::string> rows;
  sqlite3* database = nullptr;
  int code = sqlite3_open_v2(file.c_str(), &database, SQLITE_OPEN_READONLY, nullptr);
  sqlite3_busy_timeout(database, 5000);
  if (code == SQLITE_OK) {
    const auto addRow = [](void* out, int columns, char** values, char**) {
      std::string row;
      for (int i = 0; i < columns; ++i) {
        row.append(i == 0 ? "" : "|").append(values[i] == nullptr ? "NULL" : values[i]);
      }
      static_cast<std::vector<std::string>*>(out)->push_back(row);
      return 0;
    };
    code = sqlite3_exec(database, sql.c_str(), addRow, &rows, nullptr);
  }
  if (code != SQLITE_OK) {
    rows = {std::string("failed: ") + sqlite3_errmsg(database)};
  }
  sqlite3_close(database);
  return rows;
}

inline std::string askOne(const std::filesystem::path& file, const std::string& sql) {
  const std::vector<std::string> rows = ask(file, sql);
  return rows.empty() ? std::string() : rows.front();
}

// Changes a file, once a recorder that has it open is at rest.
inline void change(const std::filesystem::path& file, const std::string& sql) {
  sqlite3* database = nullptr;
  ASSERT_EQ(sqlite3_open(file.c_str(), &database), SQLITE_OK);
  sqlite3_busy_timeout(database, 10'000);
  EXPECT_EQ(sqlite3_exec(database, sql.c_str(), nullptr, nullptr, nullptr), SQLITE_OK) << sqlite3_errmsg(database);
  sqlite3_close(database);
}

class RecorderFixture : public ::testing::Test {
 protected:
  RecorderFixture() {
    options_.file = directory_.path() / "recorder.sqlite3";
    options_.firstRetry = std::chrono::milliseconds(10);
    options_.lastRetry = std::chrono::milliseconds(40);
    options_.shutdownRetry = std::chrono::milliseconds(10);
  }

  const std::filesystem::path& file() const { return options_.file; }

  // No group is written for its age, and none is too old to wait.
  void gatherForLong() {
    options_.quietTime = options_.groupTime = options_.busyGroupTime = options_.oldestWaiting =
        std::chrono::seconds(30);
  }
  // A started recorder on the options as they are.
  Recorder& start() {
    recorder_ = std::make_unique<Recorder>(options_, log_, clock_);
    recorder_->start();
    return *recorder_;
  }
  void stop() { recorder_.reset(); }
  void record(const std::string& name, const Dictionary& payload = {}) {
    recorder_->record("tally", name, payload, {}, clock_.epochSeconds());
  }
  void recordMany(int count, std::size_t payloadBytes = 10) {
    for (int i = 0; i < count; ++i) {
      record("event" + std::to_string(i), {{"text", std::string(payloadBytes, 'x')}});
    }
  }
  bool flush() { return recorder_->flush(kPatience); }
  std::size_t errors() const { return log_.entries(platform::LogLevel::Error).size(); }
  std::vector<std::filesystem::path> filesSetAside() const {
    std::vector<std::filesystem::path> aside;
    for (const auto& entry : std::filesystem::directory_iterator(directory_.path())) {
      const std::string name = entry.path().filename().string();
      const bool companion = name.ends_with("-wal") || name.ends_with("-shm");
      if (name.find(".damaged-") != std::string::npos && !companion) {
        aside.push_back(entry.path());
      }
    }
    return aside;
  }

  TemporaryDirectory directory_;
  RecorderOptions options_;
  tarn::testing::RecordingLog log_;
  tarn::testing::ManualClock clock_;
  std::unique_ptr<Recorder> recorder_;
};

}  // namespace tarn::recorder
