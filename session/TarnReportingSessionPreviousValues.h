// SPDX-License-Identifier: Apache-2.0
// TarnReportingSessionPreviousValues: for every key ever seen in a message of a session, its latest value.
//
// Which problem: every message, a dozen keys and more, is merged here. How: messages come in a few shapes over and
// over, and a later message supersedes an earlier one of the same keys as a whole. So the latest payload of each of the
// last few shapes is kept as it came (one reference count), newest first, and only what falls off the end is merged key
// by key. A value is looked for in that order, so the outcome is that of merging each message when it came.
//
// Owner: the session. Threads: the server queue.
#pragma once

#include <cstddef>
#include <memory>
#include <unordered_map>
#include <vector>

#include "plist/Dictionary.h"
#include "plist/Value.h"

namespace tarn {

class TarnReportingSessionPreviousValues {
 public:
  // The latest value per key wins. A payload of a shape that was seen lately costs a reference count; one of a new
  // shape, once 16 are kept, has the oldest of them merged key by key.
  void merge(const plist::Dictionary& payload);
  // What the other one has wins, as if its messages had come last.
  void merge(const TarnReportingSessionPreviousValues& other);

  // The latest value of the key, absent when it was never seen. Ends with the next merge. At most 17 look-ups.
  plist::ValueView get(const plist::Key& key) const noexcept;
  // How many keys there are; for tests and for looking at a session.
  std::size_t size() const { return dictionary().size(); }
  // All of it. The order of the keys has no meaning. Made anew by each call, in one pass; size() makes it too.
  plist::Dictionary dictionary() const;

 private:
  // More shapes than a client usually takes turns with, and few enough to look through for a key.
  static constexpr std::size_t kRecentLimit = 16;

  std::vector<plist::Dictionary> recent_;  // oldest first, no two of the same key list
  // From the seventeenth shape on: most sessions see a few, and many none.
  std::unique_ptr<std::unordered_map<plist::Key, plist::Value>> older_;
};

}  // namespace tarn
