// SPDX-License-Identifier: Apache-2.0
// EventGroup: the checksums of some events with neighbouring ids, and when they were committed, as one row of the table
// event_groups(first, seconds, hashes).
//
// Which problem: a checksum beside each row would cost a row of its own or a column that everybody sees; one for a
// whole commit couldn't tell which of its events is damaged. How: one row holds the checksums of up to 64 events, and
// one of itself after them.
//
//   hashes: 8 bytes (little-endian) an event, then 8 bytes over `first`, `seconds` and those before
//
// Threads: one at a time.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>

namespace tarn::recorder {

// An event as it stands in the table, but for its id. Looks at texts that others hold.
struct StoredEvent {
  // Epoch seconds, as the back-end was told; the others are texts in UTF-8, payload and detail JSON.
  double time;
  std::string_view backend;
  std::string_view name;
  std::string_view payload;
  std::string_view detail;
  // The row of `sessions` on whose behalf it was handed over, 0 for none.
  std::int64_t session = 0;
};

// The checksum of a row: its id and all its columns, in their order, the session only where there is one: rows that
// are older than sessions keep theirs.
std::uint64_t hashOf(std::int64_t id, const StoredEvent& event) noexcept;

class EventGroup {
 public:
  // So that a damaged row of checksums leaves few events unproven, and few rows of them are needed.
  static constexpr std::int64_t kMostEvents = 64;

  // An empty one, whose first event will be `first`; `seconds` is when it is committed, on the recorder's own time.
  void begin(std::int64_t first, double seconds);
  // The checksum of the next id. Not beyond kMostEvents, which the caller sees to.
  void add(std::uint64_t hash);
  // The column of the group as it is now, with the checksum of the group itself.
  std::string hashes() const;
  // Takes a row of the table; false when its own checksum, or its length, says that it is damaged: the group is empty
  // then.
  [[nodiscard]] bool read(std::int64_t first, double seconds, std::string_view hashes);

  std::int64_t first() const noexcept { return first_; }
  std::int64_t size() const noexcept;
  std::int64_t end() const noexcept { return first_ + size(); }  // the id after the last one
  double seconds() const noexcept { return seconds_; }
  // Whether it has a checksum of this id.
  bool holds(std::int64_t id) const noexcept { return id >= first_ && id < end(); }
  // Of an id that it holds.
  std::uint64_t hash(std::int64_t id) const noexcept;

 private:
  // Over what the row says of itself.
  std::uint64_t ownHash() const noexcept;

  // What one row of the table says: its first id, its time, and eight bytes for each event.
  std::int64_t first_ = 0;
  double seconds_ = 0;
  std::string bytes_;  // of the events' checksums
};

}  // namespace tarn::recorder
