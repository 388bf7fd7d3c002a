// SPDX-License-Identifier: Apache-2.0
// EventTable: where an event goes in the database: a short row of its own, and texts that it shares with others.
//
//   event_rows(id, time, kind, payload, cut, session)
//   event_texts(id, backend, name, text)     2 * id:      the payload of the event `id`
//                                            2 * id + 1:  a kind of event, as the event `id` was the first to have it
//   session_spans(session, first)            the session has events among the kReach ids from `first` on, a multiple of
//   it event_times(block, earliest, latest)     of the events whose id, divided by 1024, is `block`
//
// Which problem: a message becomes two analytics events and a mirror's, with one payload, and names that repeat
// endlessly; stored as they are they take twice the room and twice the writing. How: a row names its kind (back-end,
// name and detail together) and its payload by how far back the event lies that brought them. A mirror's payload is the
// message's without its stamp: the row says which part is cut out. `events` is a view that puts all of it together.
//
// A row only looks back so far, however many events there are: the writer needs no look-up in the database, what isn't
// needed any more is found by its id alone, and damage reaches no further. As kinds and spans are written anew after
// that, they also tell where to look for a name or a session; so there is no index of rows. A row lies in one span of
// its session, which the view `events` joins with it.
//
// Owner: the event file. Threads: the writer's. What fails answers SQLite's code.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <unordered_map>

#include "recorder/store/rows/Connection.h"
#include "recorder/store/rows/EventGroup.h"
#include "recorder/store/rows/RecentPayloads.h"
#include "recorder/store/rows/Statement.h"

namespace tarn::recorder {

class EventTable {
 public:
  // How far back a row's kind may lie, and its session's span (a power of two); and how far its payload.
  static constexpr std::int64_t kReach = 256;
  static constexpr std::int64_t kPayloadReach = 2048;
  // Ids of a block, as a power of two.
  static constexpr int kBlockBits = 10;

  EventTable() = default;
  EventTable(const EventTable&) = delete;
  EventTable& operator=(const EventTable&) = delete;

  // Gets ready for a connection, which outlives it until finalize().
  [[nodiscard]] int prepare(Connection& connection);
  void finalize() noexcept;
  // After a rollback: what it knows of the last rows isn't there.
  void forget() noexcept;

  // Adds an event, with ids that rise. `repeatsPayload`: its payload is that of the event added before, as far as that
  // is still known. An id that is there already is an error, or with `replacing` replaced.
  [[nodiscard]] int insert(std::int64_t id, const StoredEvent& event, bool repeatsPayload, bool replacing = false);

 private:
  struct TextHash {
    using is_transparent = void;
    std::size_t operator()(std::string_view text) const noexcept { return std::hash<std::string_view>()(text); }
  };
  // Where an event's payload stands, as its row says it.
  struct Place {
    bool empty = false;     // "{}", which stands nowhere
    std::int64_t back = 0;  // ids
    std::int64_t cut = 0;   // 0: nothing is cut out
  };

  [[nodiscard]] int placeKind(std::int64_t id, const StoredEvent& event, std::int64_t& first);
  [[nodiscard]] int placePayload(std::int64_t id, const StoredEvent& event, bool repeats, Place& place);
  [[nodiscard]] int noteSession(std::int64_t id, std::int64_t session);
  [[nodiscard]] int noteTime(std::int64_t id, double time);
  [[nodiscard]] int writeTimes();

  Statement insert_;
  Statement replace_;
  Statement insertText_;
  Statement insertSpan_;
  Statement insertTimes_;
  Statement readTimes_;
  // Kinds by back-end, name and detail, with the id of the event that brought them; some are too old to be used.
  std::unordered_map<std::string, std::int64_t, TextHash, std::equal_to<>> kinds_;
  std::string key_;  // of the kind that is looked up; kept for its room
  // Sessions, with the beginning of their last span.
  std::unordered_map<std::int64_t, std::int64_t> spans_;
  std::int64_t lastSession_ = 0;
  std::int64_t lastSpan_ = 0;
  // Of the payload added last; 0 for none.
  std::int64_t lastPayload_ = 0;
  // Only where there are mirrors; without them nobody would look.
  RecentPayloads recent_;
  bool hasMirrors_ = false;
  // The block of the event added last, -1 when it isn't known, and what is known of its times.
  std::int64_t block_ = -1;
  double earliest_ = 0;
  double latest_ = 0;
};

}  // namespace tarn::recorder
