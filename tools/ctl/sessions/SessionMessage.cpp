// SPDX-License-Identifier: Apache-2.0
#include "tools/ctl/sessions/SessionMessage.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <utility>

#include "host/system/JsonValues.h"
#include "plist/formats/Json.h"
#include "service/vocabulary/TarnReportingVocabulary.h"
#include "session/TarnReportingSessionKeys.h"
#include "tools/ctl/sessions/SessionEvents.h"

namespace tarn::ctl {

namespace {

constexpr std::string_view kEventPrefix = "sys.oxbow.";
constexpr const char* kSessionDuration = "session_duration";

// "Playback" and "Start" of "sys.oxbow.tarnkit.Playback.Start".
std::optional<std::pair<std::string, std::string>> kindOf(std::string_view name) {
  if (!name.starts_with(kEventPrefix)) return std::nullopt;
  name.remove_prefix(kEventPrefix.size());
  const std::size_t source = name.find('.');
  const std::size_t type = name.rfind('.');
  if (source == std::string_view::npos || type == source) return std::nullopt;
  return std::pair(std::string(name.substr(source + 1, type - source - 1)), std::string(name.substr(type + 1)));
}

bool hasKeyWith(const plist::Dictionary& payload, std::string_view part) {
  return std::any_of(payload.begin(), payload.end(),
                     [part](const auto& entry) { return entry.key.text().find(part) != std::string_view::npos; });
}

// Of a client's message of the same kind it differs by what the service alone writes.
bool isMadeByTheService(const SessionMessage& message) {
  if (isSessionSummary(message)) return true;
  if (message.category == "Flume") return hasKeyWith(message.payload, "_" + message.type + "_");
  const bool isSegment = message.type == "Summary" &&
                         (message.category == "Volume" || message.category == "Input" || message.category == "Lagoon");
  return isSegment && message.payload.contains("msgidx") && message.payload.contains("msgcnt");
}

double stampOf(const plist::Dictionary& payload, double otherwise) {
  const plist::ValueView stamp = payload.get(keys::kTimestamp);
  if (stamp.isText()) return secondsOfDateText(stamp.text()).value_or(otherwise);
  return stamp.isNumber() ? stamp.asDouble() : otherwise;
}

// Digits up to the character after them, which goes too.
std::optional<std::int64_t> takeNumber(std::string_view& text, char after) {
  std::int64_t number = 0;
  const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), number);
  if (error != std::errc() || end == text.data() + text.size() || *end != after) return std::nullopt;
  text.remove_prefix(static_cast<std::size_t>(end - text.data()) + 1);
  return number;
}

// Days from 1970-01-01 to a day of the proleptic Gregorian calendar, whose years are taken to begin in March.
std::int64_t daysOf(std::int64_t year, std::int64_t month, std::int64_t day) {
  year -= month <= 2 ? 1 : 0;
  const std::int64_t era = year / 400;
  const std::int64_t yearOfEra = year - era * 400;
  const std::int64_t dayOfYear = (153 * (month + (month > 2 ? -3 : 9)) + 2) / 5 + day - 1;
  return era * 146097 + yearOfEra * 365 + yearOfEra / 4 - yearOfEra / 100 + dayOfYear - 719468;
}

}  // namespace

std::optional<double> secondsOfDateText(std::string_view text) {
  constexpr std::array<char, 5> kAfter{'-', '-', 'T', ':', ':'};
  std::array<std::int64_t, 5> parts{};
  std::string_view rest = text;
  for (std::size_t i = 0; i < parts.size(); ++i) {
    const auto part = takeNumber(rest, kAfter.at(i));
    if (!part || *part < 0 || *part > 9999) return std::nullopt;
    parts.at(i) = *part;
  }
  double second = 0;
  const auto [end, error] = std::from_chars(rest.data(), rest.data() + rest.size(), second, std::chars_format::fixed);
  if (error != std::errc() || std::string_view(end, rest.size() - static_cast<std::size_t>(end - rest.data())) != "Z") {
    return std::nullopt;
  }
  const std::int64_t minutes = (daysOf(parts[0], parts[1], parts[2]) * 24 + parts[3]) * 60 + parts[4];
  const double seconds = static_cast<double>(minutes) * 60 + second;
  // A date is what reads back as it was written; anything else is somebody's text.
  std::string again;
  plist::appendJson(again, plist::Date{seconds});
  return again == "\"" + std::string(text) + "\"" ? std::optional(seconds) : std::nullopt;
}

std::optional<SessionMessage> messageOf(const recorder::EventRow& row) {
  if (row.backend != "tally") return std::nullopt;
  auto kind = kindOf(row.name);
  if (!kind) return std::nullopt;
  const linux_host::JsonReading reading =
      linux_host::readJson(row.payload, linux_host::kMaximumJsonNesting, linux_host::JsonNull::Absent);
  const plist::ValueView payload = reading.value;
  if (payload.kind() != plist::Kind::Dictionary) return std::nullopt;
  SessionMessage message;
  message.event = row.id;
  message.handedOver = row.time;
  message.category = std::move(kind->first);
  message.type = std::move(kind->second);
  message.payload = payload.dictionary();
  message.stamp = stampOf(message.payload, row.time);
  message.isDerived = isMadeByTheService(message);
  return message;
}

Result<std::vector<SessionMessage>> messagesOf(const std::filesystem::path& file, std::int64_t session) {
  Result<std::vector<SessionMessage>> found;
  MessageSieve sieve;
  found.error = eachEvent(file, session, 0, [&](recorder::EventRow&& row) {
    auto message = sieve.letsThrough(row) ? messageOf(row) : std::nullopt;
    if (message) {
      found.value.push_back(std::move(*message));
    }
    return true;
  });
  return found;
}

bool isOverload(const SessionMessage& message) {
  const plist::ValueView issue = message.payload.get("issue_type");
  return issue.isText() && issue.text() == "overload" && !message.payload.contains(kSessionDuration);
}

bool isSessionSummary(const SessionMessage& message) {
  return message.is("Session_Generic", "Summary") && message.payload.contains("summaryServiceName");
}

std::optional<std::uint32_t> categoryNumber(std::string_view name) {
  constexpr std::uint32_t kNoDomain = 0;
  constexpr std::uint32_t kUnknownDomain = 0x00010000;
  constexpr auto kLast = static_cast<std::uint32_t>(AudioEventCategory::Tessels);
  for (const std::uint32_t domain : {kNoDomain, static_cast<std::uint32_t>(AudioEventCategory::DomainMIDI),
                                     static_cast<std::uint32_t>(AudioEventCategory::DomainSession),
                                     static_cast<std::uint32_t>(AudioEventCategory::DomainDSP),
                                     static_cast<std::uint32_t>(AudioEventCategory::DomainHAL),
                                     static_cast<std::uint32_t>(AudioEventCategory::DomainRouting),
                                     static_cast<std::uint32_t>(AudioEventCategory::DomainToolbox), kUnknownDomain}) {
    for (std::uint32_t low = 0; low <= kLast; ++low) {
      if (TarnReportingUtilityCategoryString(static_cast<AudioEventCategory>(domain | low)) == name) {
        return domain | low;
      }
    }
  }
  return std::nullopt;
}

std::optional<std::uint16_t> typeNumber(std::string_view name) {
  if (name == TarnReportingUtilityTypeString(AudioEventType::Unknown)) {
    return static_cast<std::uint16_t>(AudioEventType::Unknown);
  }
  for (std::uint16_t number = 0; number <= static_cast<std::uint16_t>(AudioEventType::MemoryLog); ++number) {
    if (TarnReportingUtilityTypeString(static_cast<AudioEventType>(number)) == name) return number;
  }
  return std::nullopt;
}

}  // namespace tarn::ctl
