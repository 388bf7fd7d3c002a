// TarnReportingSessionMessageLog: the records of a session since its start, in order, and the look-up for the
// redundancy rule.
//
// The rule is defined by a walk from the newest record to the oldest for one of the same category and type. The log
// keeps the answer of that walk for every pair of category and type, so that a look-up costs the same in a long session
// as in a short one. A sort changes what the walk would find: the answers are then computed again in one pass.
//
// Owner: the session. Threads: the server queue.
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <unordered_map>

#include "session/TarnReportingSessionMessage.h"

namespace tarn {

class TarnReportingSessionMessageLog {
 public:
  using Record = std::shared_ptr<TarnReportingSessionMessage>;

  void append(Record record);
  // Sorts by time stamp (TarnReportingSessionMessage::sortMessages).
  void sort();
  void clear();

  // The record nearest to the end of the log, as it now stands, of this category and type; null when there is none.
  const TarnReportingSessionMessage* newest(AudioEventCategory category, AudioEventType type) const;

  const TarnReportingSessionMessages& messages() const noexcept { return messages_; }
  std::size_t size() const noexcept { return messages_.size(); }

 private:
  TarnReportingSessionMessages messages_;
  std::unordered_map<std::uint64_t, const TarnReportingSessionMessage*> newest_;
};

}  // namespace tarn
