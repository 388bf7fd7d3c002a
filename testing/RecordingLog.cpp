// SPDX-License-Identifier: Apache-2.0
#include "testing/RecordingLog.h"

#include <algorithm>
#include <utility>

#include "testing/backends/OwnMemory.h"

namespace tarn::testing {

namespace {

constexpr std::size_t kModuleWidth = 25;
constexpr std::size_t kLineWidth = 5;

}  // namespace

std::string RecordingLog::Entry::message() const {
  if (module.empty()) return text;
  const std::size_t prefix =
      std::max(module.size(), kModuleWidth) + 1 + std::max(std::to_string(line).size(), kLineWidth) + 1;
  return prefix < text.size() ? text.substr(prefix) : std::string();
}

void RecordingLog::write(const platform::LogEntry& entry) noexcept {
  const OwnMemory own;
  Entry kept{std::string(entry.category.subsystem),
             std::string(entry.category.code),
             entry.level,
             std::string(entry.module),
             entry.line,
             std::string(entry.text)};
  if (isRecorded()) {
    happened("log", kept.message());
  }
  const std::lock_guard lock(mutex_);
  entries_.push_back(std::move(kept));
}

void RecordingLog::clear() {
  const std::lock_guard lock(mutex_);
  entries_.clear();
}

std::vector<RecordingLog::Entry> RecordingLog::entries() const {
  const std::lock_guard lock(mutex_);
  return entries_;
}

std::vector<RecordingLog::Entry> RecordingLog::entries(platform::LogLevel level) const {
  std::vector<Entry> chosen = entries();
  std::erase_if(chosen, [level](const Entry& entry) { return entry.level != level; });
  return chosen;
}

std::vector<std::string> RecordingLog::texts() const {
  const std::lock_guard lock(mutex_);
  std::vector<std::string> texts;
  for (const Entry& entry : entries_) {
    texts.push_back(entry.text);
  }
  return texts;
}

std::vector<std::string> RecordingLog::messages() const {
  const std::lock_guard lock(mutex_);
  std::vector<std::string> messages;
  for (const Entry& entry : entries_) {
    messages.push_back(entry.message());
  }
  return messages;
}

bool RecordingLog::contains(platform::LogLevel level, std::string_view part) const {
  const std::lock_guard lock(mutex_);
  return std::any_of(entries_.begin(), entries_.end(), [&](const Entry& entry) {
    return entry.level == level && entry.text.find(part) != std::string::npos;
  });
}

std::size_t RecordingLog::count(std::string_view part) const {
  const std::lock_guard lock(mutex_);
  return static_cast<std::size_t>(std::count_if(entries_.begin(), entries_.end(), [&](const Entry& entry) {
    return entry.text.find(part) != std::string::npos;
  }));
}

}  // namespace tarn::testing
