// SPDX-License-Identifier: Apache-2.0
// SessionEvents: goes through the events of a session, and tells messages from their repetitions. Threads: one.
#pragma once

#include <cstdint>
#include <filesystem>
#include <functional>
#include <string>

#include "plist/Result.h"
#include "recorder/store/reading/EventReader.h"

namespace tarn::ctl {

// Hands over the events of a session with ids greater than `after`, in their order, until `take` answers false. No more
// than a page of them is in memory. The error names the file.
Status eachEvent(const std::filesystem::path& file, std::int64_t session, std::int64_t after,
                 const std::function<bool(recorder::EventRow&&)>& take);

// Lets each message through once: not its mirror, nor the second of its analytics events when the first was there,
// which is handed over just before. Events that are no messages go through.
class MessageSieve {
 public:
  MessageSieve() = default;
  MessageSieve(const MessageSieve&) = delete;
  MessageSieve& operator=(const MessageSieve&) = delete;

  // For each event in its order.
  bool letsThrough(const recorder::EventRow& row);

 private:
  // Of the analytics event before, when it was a first name: what the second one of that message must have.
  std::string kind_;
  std::string payload_;
};

}  // namespace tarn::ctl
