// SPDX-License-Identifier: Apache-2.0
// EventScan: goes through the rows of the recorder's events as retention sees them: whose, of which sort, how large.
//
// Rows are read alone; the texts that they name are asked for once, as neighbours share them. Owner: the retention.
// Threads: the writer's. What fails answers SQLite's code.
#pragma once

#include <cstddef>
#include <cstdint>
#include <unordered_map>
#include <vector>

#include "recorder/store/retention/EventOwner.h"
#include "recorder/store/rows/Connection.h"
#include "recorder/store/rows/Statement.h"

namespace tarn::recorder {

struct ScannedEvent {
  std::int64_t id = 0;
  Owner owner = kServiceItself;
  EventSort sort = EventSort::Message;
  std::int64_t bytes = 0;  // as countedBytes() says
};

class EventScan {
 public:
  EventScan() = default;
  EventScan(const EventScan&) = delete;
  EventScan& operator=(const EventScan&) = delete;

  // Gets ready for a connection, which outlives it until finalize().
  [[nodiscard]] int prepare(Connection& connection);
  void finalize() noexcept;
  // After a rollback: what it remembers may never have been.
  void forget() noexcept;

  // Puts the rows with ids from `from` on and below `end` in place of `events`, `most` of them at the most. A row whose
  // texts are gone counts for what is there.
  [[nodiscard]] int read(std::int64_t from, std::int64_t end, std::int64_t most, std::vector<ScannedEvent>& events);
  // Of a row of `sessions`.
  [[nodiscard]] int readOwner(std::int64_t session, Owner& owner);

 private:
  struct Kind {
    EventSort sort = EventSort::Message;
    std::int64_t bytes = 0;
  };

  [[nodiscard]] int readKind(std::int64_t id, Kind& kind);
  [[nodiscard]] int readPayloadBytes(std::int64_t id, std::int64_t& bytes);

  Statement rows_;
  Statement kind_;
  Statement payload_;
  Statement owner_;
  // By the event that brought the kind, and by the row of `sessions`.
  std::unordered_map<std::int64_t, Kind> kinds_;
  std::unordered_map<std::int64_t, Owner> owners_;
  std::int64_t lastPayload_ = 0;  // 0: none
  std::int64_t lastPayloadBytes_ = 0;
};

}  // namespace tarn::recorder
