// SPDX-License-Identifier: Apache-2.0
#include "tools/report/Message.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <cmath>
#include <utility>

#include "host/system/JsonValues.h"
#include "plist/formats/Json.h"

namespace tarn::report {

namespace {

// Category and type, as a name has them.
struct Parts {
  std::string_view category;
  std::string_view type;
};

Parts partsOf(std::string_view name) {
  const std::size_t point = name.rfind('.');
  if (point == std::string_view::npos) return {name, {}};
  return {name.substr(0, point), name.substr(point + 1)};
}

// What a message of this name is when the service made it.
MessageKind derivedKind(const Parts& parts) {
  if (parts.category == "Flume") return MessageKind::DriverCounters;
  if (parts.type != "Summary") return MessageKind::Plain;
  if (parts.category == "Volume") return MessageKind::VolumeSegment;
  if (parts.category == "Input") return MessageKind::InputSegment;
  if (parts.category == "Lagoon") return MessageKind::GroupSegment;
  if (parts.category == "Session_Generic") return MessageKind::SessionSummary;
  return MessageKind::Plain;
}

bool hasKeyWith(const plist::Dictionary& fields, const std::string& part) {
  return std::any_of(fields.begin(), fields.end(),
                     [&part](const auto& entry) { return entry.key.text().find(part) != std::string_view::npos; });
}

// From a client's message of the same name it differs by what the service alone writes.
bool isMadeByTheService(MessageKind kind, const Parts& parts, const plist::Dictionary& fields) {
  if (kind == MessageKind::Plain) return false;
  if (kind == MessageKind::SessionSummary) return fields.contains("summaryServiceName");
  if (kind == MessageKind::DriverCounters) return hasKeyWith(fields, "_" + std::string(parts.type) + "_");
  return fields.contains("msgidx") && fields.contains("msgcnt");
}

bool isErrorName(const Parts& parts) {
  return parts.type == "Error" || parts.category == "Error" || parts.category.ends_with("_Error");
}

MessageKind kindOf(const Parts& parts, const plist::Dictionary& fields) {
  const MessageKind derived = derivedKind(parts);
  if (isMadeByTheService(derived, parts, fields)) return derived;
  const plist::ValueView issue = fields.get("issue_type");
  if (issue.isText() && issue.text() == "overload" && !fields.get("session_duration")) return MessageKind::Overload;
  if (parts.type == "IssueDetector") return MessageKind::Issue;
  return isErrorName(parts) ? MessageKind::Error : MessageKind::Plain;
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

std::optional<Message> Message::of(const EventRow& row) {
  if (row.backend != "tally" || !std::string_view(row.name).starts_with(kMessagePrefix)) return std::nullopt;
  const std::string_view name = std::string_view(row.name).substr(kMessagePrefix.size());
  std::optional<Message> message = from(name, row.time, row.payload);
  return message ? std::move(message) : from(name, row.time, "{}");
}

std::optional<Message> Message::from(std::string_view name, double arrived, std::string_view payload) {
  const linux_host::JsonReading reading =
      linux_host::readJson(payload, linux_host::kMaximumJsonNesting, linux_host::JsonNull::Absent);
  if (plist::ValueView(reading.value).kind() != plist::Kind::Dictionary) return std::nullopt;
  Message message;
  message.name_ = name;
  message.arrived_ = arrived;
  message.fields_ = plist::ValueView(reading.value).dictionary();
  message.kind_ = kindOf(partsOf(message.name_), message.fields_);
  return message;
}

std::string_view Message::category() const noexcept {
  return partsOf(name_).category;
}

std::string_view Message::type() const noexcept {
  return partsOf(name_).type;
}

std::optional<double> Message::stamp() const {
  const plist::ValueView stamp = fields_.get("tarnreporting_timestamp");
  if (stamp.isText()) return secondsOfDateText(stamp.text());
  if (!stamp.isNumber() || !std::isfinite(stamp.asDouble())) return std::nullopt;
  return stamp.asDouble();
}

std::string Message::text(std::string_view key) const {
  const plist::ValueView value = fields_.get(key);
  return value ? value.asText() : std::string();
}

bool isCountedByName(std::string_view eventName) {
  if (!eventName.starts_with(kMessagePrefix)) return false;
  const Parts parts = partsOf(eventName.substr(kMessagePrefix.size()));
  return isErrorName(parts) || parts.type == "IssueDetector" || derivedKind(parts) == MessageKind::VolumeSegment;
}

}  // namespace tarn::report
