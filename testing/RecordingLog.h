// SPDX-License-Identifier: Apache-2.0
// RecordingLog: a log that keeps every entry. It starts with the threshold Debug, so that a test sees every line.
//
// Threads: any.
#pragma once

#include <cstddef>
#include <mutex>
#include <string>
#include <string_view>
#include <vector>

#include "platform/Log.h"
#include "testing/backends/OrderRecord.h"

namespace tarn::testing {

class RecordingLog final : public platform::Log, public Recorded {
 public:
  struct Entry {
    std::string subsystem;
    std::string category;  // the short code
    platform::LogLevel level;
    std::string module;
    int line;
    std::string text;  // with its prefix
    // The text after the prefix of module and line; the whole text of an entry without a module.
    std::string message() const;
  };

  RecordingLog() noexcept { platform::Log::setThreshold(platform::LogLevel::Debug); }
  RecordingLog(const RecordingLog&) = delete;
  RecordingLog& operator=(const RecordingLog&) = delete;

  // The interface.
  void write(const platform::LogEntry& entry) noexcept override;

  // Controls.
  void setThreshold(platform::LogLevel level) noexcept { platform::Log::setThreshold(level); }
  void clear();

  // Observations.
  std::vector<Entry> entries() const;
  std::vector<Entry> entries(platform::LogLevel level) const;
  // The whole texts, and the texts without their prefixes.
  std::vector<std::string> texts() const;
  std::vector<std::string> messages() const;
  // Whether an entry's text holds this, and how many do.
  bool contains(std::string_view part) const { return count(part) > 0; }
  bool contains(platform::LogLevel level, std::string_view part) const;
  std::size_t count(std::string_view part) const;

 private:
  mutable std::mutex mutex_;
  std::vector<Entry> entries_;  // guarded by mutex_
};

}  // namespace tarn::testing
