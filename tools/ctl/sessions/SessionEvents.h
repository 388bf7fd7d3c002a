// SPDX-License-Identifier: Apache-2.0
// SessionEvents: goes through the events of a session, and tells messages from their repetitions. Threads: one.
#pragma once

#include <cstdint>
#include <filesystem>
#include <functional>
#include <optional>
#include <string>
#include <vector>

#include "plist/Result.h"
#include "recorder/store/reading/EventReader.h"
#include "recorder/store/reading/SessionReader.h"
#include "tools/ctl/terminal/Progress.h"

namespace tarn::ctl {

// Hands over the events of a session, or of all, with ids greater than `after`, in their order, until `take` answers
// false. No more than a page of them is in memory. The error names the file.
Status eachEvent(recorder::EventReader& reader, std::optional<std::int64_t> session, std::int64_t after,
                 const std::function<bool(recorder::EventRow&&)>& take);
Status eachEvent(const std::filesystem::path& file, std::int64_t session, std::int64_t after,
                 const std::function<bool(recorder::EventRow&&)>& take);

// Tells how far going through a session's events is, by their ids. Of one that goes on nothing is told.
class EventProgress {
 public:
  // The session's periods in their order. Without a handler nothing is told.
  EventProgress(const std::vector<recorder::PeriodRow>& periods, ProgressHandler handler);
  EventProgress(const EventProgress&) = delete;
  EventProgress& operator=(const EventProgress&) = delete;

  // For each event.
  void at(std::int64_t event) {
    if (handler_) {
      handler_(static_cast<double>(event - first_) / static_cast<double>(last_ - first_));
    }
  }

 private:
  ProgressHandler handler_;
  std::int64_t first_ = 0;
  std::int64_t last_ = 0;
};

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
