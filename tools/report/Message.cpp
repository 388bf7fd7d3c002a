// SPDX-License-Identifier: Apache-2.0
#include "tools/report/Message.h"

#include <cmath>

#include "host/system/JsonValues.h"

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

MessageKind derivedKind(const Parts& parts) {
  if (parts.category == "Flume") return MessageKind::DriverCounters;
  if (parts.type != "Summary") return MessageKind::Plain;
  if (parts.category == "Volume") return MessageKind::VolumeSegment;
  if (parts.category == "Input") return MessageKind::InputSegment;
  if (parts.category == "Lagoon") return MessageKind::GroupSegment;
  if (parts.category == "Session_Generic") return MessageKind::SessionSummary;
  return MessageKind::Plain;
}

bool isErrorName(const Parts& parts) {
  return parts.type == "Error" || parts.category == "Error" || parts.category.ends_with("_Error");
}

MessageKind kindOf(const Parts& parts, const plist::Dictionary& fields) {
  const MessageKind derived = derivedKind(parts);
  if (derived != MessageKind::Plain) return derived;
  const plist::ValueView issue = fields.get("issue_type");
  if (issue.isText() && issue.text() == "overload" && !fields.get("session_duration")) return MessageKind::Overload;
  if (parts.type == "IssueDetector") return MessageKind::Issue;
  return isErrorName(parts) ? MessageKind::Error : MessageKind::Plain;
}

}  // namespace

std::optional<Message> Message::of(const EventRow& row) {
  if (row.backend != "tally" || !std::string_view(row.name).starts_with(kMessagePrefix)) return std::nullopt;
  Message message;
  message.name_ = row.name.substr(kMessagePrefix.size());
  message.arrived_ = row.time;
  message.fields_ = plist::ValueView(linux_host::readJson(row.payload).value).dictionary();
  message.kind_ = kindOf(partsOf(message.name_), message.fields_);
  return message;
}

std::optional<double> Message::stamp() const {
  const plist::ValueView stamp = fields_.get("tarnreporting_timestamp");
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
