// SPDX-License-Identifier: Apache-2.0
// StoreTail: the recorder's file from an id on, as it is written: pages of events, and the sessions that they are of.
// The file is opened for reading alone.
//
//   read(after) -> page, sessions() ... read(page.lookedUpTo) ...
//
// Threads: one.
#pragma once

#include <chrono>
#include <cstddef>
#include <filesystem>
#include <memory>

#include "fleet/store/StoredSessions.h"
#include "recorder/store/reading/EventReader.h"

namespace tarn::fleet {

// What tells one store from another in its place: its newest run.
struct StoreMark {
  std::int64_t run = 0;  // 0: there is none
  std::string boot;
  double started = 0;
  friend bool operator==(const StoreMark&, const StoreMark&) = default;
};

class StoreTail final : public StoredSessions {
 public:
  explicit StoreTail(const std::filesystem::path& file) : file_(file), events_(file), earlier_(file) {}

  // Events after an id, so many at the most; from `since` (epoch seconds) on where that is given.
  Result<recorder::EventPage> read(std::int64_t after, std::size_t limit, std::optional<double> since = {});
  // The same of ids that were read before, without moving the place where read() notices that the file is another.
  Result<recorder::EventPage> readEarlier(std::int64_t after, std::size_t limit);
  // Lets find() tell of the file as it is now. Nothing before that; the error when there is nothing to look at.
  [[nodiscard]] Status look();
  Result<std::optional<StoredSession>> find(std::int64_t id) override;
  // Its run of this number; a mark without a run when there is none. After look().
  Result<StoreMark> markOf(std::int64_t run);
  // Lets the writer have its log again.
  void rest() { sessions_.reset(); }
  bool waitForChange(std::chrono::milliseconds timeout) { return events_.waitForChange(timeout); }

 private:
  const std::filesystem::path file_;
  recorder::EventReader events_;
  recorder::EventReader earlier_;
  std::unique_ptr<recorder::SessionReader> sessions_;
};

}  // namespace tarn::fleet
