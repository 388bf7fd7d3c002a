// SPDX-License-Identifier: Apache-2.0
// SessionMessage: a message of a session, read back from the analytics event that it became. Stateless. Threads: any.
#pragma once

#include <cstdint>
#include <filesystem>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "plist/Dictionary.h"
#include "plist/Result.h"
#include "recorder/store/reading/EventReader.h"
#include "recorder/store/reading/SessionReader.h"
#include "tools/ctl/terminal/Progress.h"
#include "tools/report/Message.h"

namespace tarn::ctl {

struct SessionMessage {
  std::int64_t event = 0;
  double handedOver = 0;  // epoch seconds of the event
  double stamp = 0;       // epoch seconds of what it tells of
  std::string category;   // as it is printed: "DSP_Playback"
  std::string type;
  // As the workers got it, of JSON's kinds: a date is its text.
  plist::Dictionary payload;
  report::MessageKind meaning = report::MessageKind::Plain;
  // The service made it of others or of the drivers' counters, when the session stopped.
  bool isDerived = false;

  std::string kind() const { return category + "." + type; }
  bool is(std::string_view otherCategory, std::string_view otherType) const {
    return category == otherCategory && type == otherType;
  }
};

// The message of an analytics event; nothing for another event, and for a payload that is no JSON object.
std::optional<SessionMessage> messageOf(const recorder::EventRow& row);
// All of a session, each once, in the order in which they were handed over; by its periods it is told how far that is.
// The error names the file.
Result<std::vector<SessionMessage>> messagesOf(const std::filesystem::path& file, std::int64_t session,
                                               const std::vector<recorder::PeriodRow>& periods = {},
                                               const ProgressHandler& progress = {});

// Whether it tells of an overload, as the session's own summary counts them.
inline bool isOverload(const SessionMessage& message) {
  return message.meaning == report::MessageKind::Overload;
}
// Whether it is the session's own summary.
inline bool isSessionSummary(const SessionMessage& message) {
  return message.meaning == report::MessageKind::SessionSummary;
}

// The numbers that the service prints as these names, the least of several; nothing for a text that is none.
std::optional<std::uint32_t> categoryNumber(std::string_view name);
std::optional<std::uint16_t> typeNumber(std::string_view name);

}  // namespace tarn::ctl
