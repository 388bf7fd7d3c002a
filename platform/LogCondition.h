// SPDX-License-Identifier: Apache-2.0
// LogCondition: which of the conditions that a person acts on a log entry tells of, so that a journal can give it an
// identifier that programs watch for and a text that says what to do. host/log/JournalCatalog.h has both.
//
// Most entries tell of none. Threads: each has its own.
#pragma once

#include <cstdint>
#include <utility>

namespace tarn::platform {

enum class LogCondition : std::uint8_t {
  None,
  StoreSetAside,         // the recorder's file can't be used, and a fresh one is begun
  StoreDamaged,          // committed events are missing in it
  StoreUnwritable,       // the disk is full, read-only or failing
  RunKilled,             // the run before ended without committing what it had taken
  QuotaRefused,          // a client or its user has what it may have
  ClientCut,             // a client's connection was closed for what it did
  LogUnavailable,        // the log goes elsewhere, or lines of it were lost
  ReloadRefused,         // the configuration that was to be read anew is wrong
  ConfigurationRefused,  // the service doesn't start with its configuration
};

// While it lives, what the thread logs tells of this condition. Scopes nest: at the end the one before holds again.
class LogConditionScope {
 public:
  explicit LogConditionScope(LogCondition condition) noexcept : previous_(std::exchange(current_, condition)) {}
  LogConditionScope(const LogConditionScope&) = delete;
  LogConditionScope& operator=(const LogConditionScope&) = delete;
  ~LogConditionScope() { current_ = previous_; }

  static LogCondition current() noexcept { return current_; }

 private:
  static inline thread_local LogCondition current_ = LogCondition::None;
  const LogCondition previous_;
};

}  // namespace tarn::platform
