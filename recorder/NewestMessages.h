// SPDX-License-Identifier: Apache-2.0
// NewestMessages: which event has the newest message of each kind of each session, so that a message that repeats one
// is stored with the id of what it repeats.
//
// What it finds says the same as what is looked for, but for the keys that tell when: where it doesn't know, it finds
// nothing. It holds on to the messages, which their sessions hold anyway. Owner: the event writer. Threads: the
// writer's.
//
//   begin() -> note(), find(), end() ... -> commit()        begin() without a commit() before it: nothing was written
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "platform/SessionRecords.h"
#include "plist/Dictionary.h"

namespace tarn::recorder {

class NewestMessages {
 public:
  // Messages of all sessions, and their bytes; beyond either all are forgotten.
  static constexpr std::size_t kMost = 16'384;
  static constexpr std::size_t kMostBytes = std::size_t{16} << 20;

  NewestMessages() = default;
  NewestMessages(const NewestMessages&) = delete;
  NewestMessages& operator=(const NewestMessages&) = delete;

  // A transaction begins; what the one before noted is true when it was committed, else it comes again.
  void begin() noexcept;
  void commit() noexcept;
  // An analytics event with this payload was appended. The second event of a message changes nothing, nor does what is
  // no message.
  void note(platform::SessionNumber session, std::int64_t event, const plist::Dictionary& payload);
  // The event whose message this one repeats; 0 where it isn't known.
  std::int64_t find(platform::SessionNumber session, const plist::Dictionary& message) const;
  // The session is over.
  void end(platform::SessionNumber session) { ended_.push_back(session); }

 private:
  struct Message {
    std::int64_t event = 0;
    plist::Dictionary payload;
  };
  struct TextHash {
    using is_transparent = void;
    std::size_t operator()(std::string_view text) const noexcept { return std::hash<std::string_view>()(text); }
  };
  // By the tag of category and type.
  using Kinds = std::unordered_map<std::string, Message, TextHash, std::equal_to<>>;
  // What a transaction replaced; event 0: there was nothing.
  struct Change {
    Message* message;
    Message before;
  };

  void forget() noexcept;

  std::unordered_map<platform::SessionNumber, Kinds> sessions_;
  std::size_t count_ = 0;
  std::size_t bytes_ = 0;
  // Of the transaction.
  std::vector<Change> changes_;
  std::vector<platform::SessionNumber> ended_;
};

}  // namespace tarn::recorder
