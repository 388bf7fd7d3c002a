// SPDX-License-Identifier: Apache-2.0
// LogFixture: entries and lines for the tests of the log, at a time that stands still.
#pragma once

#include <gtest/gtest.h>

#include <regex>
#include <string>
#include <string_view>

#include "host/log/QueuedLog.h"
#include "testing/ManualClock.h"
#include "tests/host/TemporaryFolder.h"

namespace tarn::linux_host {

inline constexpr platform::LogCategory kTestCategory{"sys.oxbow.tarnkit", "tarnss"};

inline platform::LogEntry entry(std::string_view text) {
  return {kTestCategory, platform::LogLevel::Default, {}, 0, text};
}
// How the entry looks in a file.
inline std::string line(std::string_view text) {
  return "1970-01-01T00:00:05.000000Z default tarnss " + std::string(text) + "\n";
}
// What tells of lost lines, without the number of its source line.
inline std::string lostLine(std::string_view text) {
  return "1970-01-01T00:00:05.000000Z error tarnrs " + std::string(16, ' ') + "QueuedLog: " + std::string(text) + "\n";
}
inline std::string withoutLineNumbers(const std::string& text) {
  return std::regex_replace(text, std::regex("QueuedLog:\\d+ +"), "QueuedLog: ");
}

class LogFixture : public ::testing::Test {
 protected:
  LogFixture() { clock_.setEpochSeconds(5); }

  TemporaryFolder folder_;
  testing::ManualClock clock_;
};

}  // namespace tarn::linux_host
