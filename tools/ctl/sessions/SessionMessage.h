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

namespace tarn::ctl {

struct SessionMessage {
  std::int64_t event = 0;
  double handedOver = 0;  // epoch seconds of the event
  double stamp = 0;       // epoch seconds of what it tells of
  std::string category;   // as it is printed: "DSP_Playback"
  std::string type;
  // As the workers got it, of JSON's kinds: a date is its text.
  plist::Dictionary payload;
  // The service made it of others or of the drivers' counters, when the session stopped.
  bool isDerived = false;

  std::string kind() const { return category + "." + type; }
  bool is(std::string_view otherCategory, std::string_view otherType) const {
    return category == otherCategory && type == otherType;
  }
};

// The message of an analytics event; nothing for another event, and for a payload that is no JSON object.
std::optional<SessionMessage> messageOf(const recorder::EventRow& row);
// All of a session, each once, in the order in which they were handed over. The error names the file.
Result<std::vector<SessionMessage>> messagesOf(const std::filesystem::path& file, std::int64_t session);

// Whether it tells of an overload, as the session's own summary counts them.
bool isOverload(const SessionMessage& message);
// Whether it is the session's own summary.
bool isSessionSummary(const SessionMessage& message);

// The seconds of a date as JSON has it (2026-11-20T10:00:00Z); nothing for a text that no date is written as.
std::optional<double> secondsOfDateText(std::string_view text);

// The numbers that the service prints as these names, the least of several; nothing for a text that is none.
std::optional<std::uint32_t> categoryNumber(std::string_view name);
std::optional<std::uint16_t> typeNumber(std::string_view name);

}  // namespace tarn::ctl
