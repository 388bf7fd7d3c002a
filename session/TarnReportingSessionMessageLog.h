// SPDX-License-Identifier: Apache-2.0
// TarnReportingSessionMessageLog: the records of a session since its start, in order, and the look-up for the
// redundancy rule.
//
// The rule is defined by a walk from the newest record to the oldest for one of the same category and type. The log
// keeps the answer of that walk for every pair of category and type, so that a look-up costs the same in a long session
// as in a short one. A sort changes what the walk would find: then the log is walked again, but only when a kind is
// asked for, no further than to its newest record, and over pages that have what isn't found yet. What the walk passes
// is noted, so that all look-ups together walk the log once.
//
// A record that went to the overflow store is read back when it is looked up. Of a bounded number of kinds it is kept
// then; a client that has thousands of kinds pays with a read for each of its messages, and not with memory.
//
// Owner: the session. Threads: the server queue.
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <unordered_map>

#include "session/TarnReportingSessionMessageList.h"

namespace tarn {

class TarnReportingSessionMessageLog {
 public:
  using Record = TarnReportingSessionMessageList::Record;

  // The ID is for lines about the overflow alone.
  explicit TarnReportingSessionMessageLog(std::int64_t reporterID) : reporterID_(reporterID) {}

  void setAccount(std::shared_ptr<TarnReportingSessionLogAccount> account);
  // The record is the newest of its category and type from now on. Without the memory for it nothing has changed.
  void append(Record record);
  // Sorts by time stamp (TarnReportingSessionMessage::sortMessages). Costs the look-up nothing when nothing moved. When
  // memory is missing for it, nothing counts as the newest of a kind any more, and of a log with pages those are gone
  // that weren't merged yet.
  void sort();
  // The log is as new.
  void clear();

  // The record nearest to the end of the log, as it now stands, of this category and type; null when there is none. It
  // holds until the next look-up. One hash look-up; a read from the store when the record overflowed and isn't kept.
  // The first time after a sort that moved something it is looked for, back from the end.
  const TarnReportingSessionMessage* newest(AudioEventCategory category, AudioEventType type) const;

  // Who changes a record of it in place does so by the list's change(). Of an empty log it is another list than later.
  const TarnReportingSessionMessageList& messages() const noexcept;
  // In records, the markers of start and stop included.
  std::size_t size() const noexcept { return messages().size(); }

 private:
  static constexpr std::size_t kNone = static_cast<std::size_t>(-1);
  // Where the newest record of a kind is.
  struct Newest {
    std::size_t index = kNone;
    const TarnReportingSessionMessage* recent = nullptr;  // while the log itself has it in memory
    Record kept;                                          // else, when it was read back
  };
  // Kinds whose overflowed record is kept in memory, at the cost of a record each.
  static constexpr std::size_t kMostKept = 256;

  // What a log has with its first record and until it is cleared: most sessions of a client that has thousands never
  // get a message.
  struct Body {
    explicit Body(std::int64_t reporterID) : messages(reporterID) {}
    // Replaces what was the newest record of a kind, and lets go of its copy.
    void note(Newest& newest, std::size_t index, const TarnReportingSessionMessage* recent) noexcept;
    // Nothing counts as the newest of a kind any more, until it is looked for among the first so many records.
    void forgetPlaces(std::size_t unseenRecords) noexcept;
    // Looks further back, until that one is found or nothing is left.
    void lookFor(const Newest& sought);
    // Lets go of all copies: a producer changed one.
    void forgetKept();

    TarnReportingSessionMessageList messages;
    std::unordered_map<TarnReportingSessionMessage::Kind, Newest> newest;
    // So many of the first records weren't looked at since a sort; what is missing in `newest` is among them.
    std::size_t unseen = 0;
    std::size_t kept = 0;
    std::uint64_t changesSeen = 0;  // of the records that are kept here
    Record looked;
  };

  const std::int64_t reporterID_;
  std::shared_ptr<TarnReportingSessionLogAccount> account_;
  std::unique_ptr<Body> body_;
};

}  // namespace tarn
