// SPDX-License-Identifier: Apache-2.0
// Message: what an analytics event says of a message of a session, with its fields by their keys. Whoever looks at
// sessions goes by this: what counts as an overload, an error or an issue, what the service derived, and when a message
// happened.
//
// Every message becomes two analytics events and, as a rule, one of the mirrored session; the one that is named after
// the system alone stands for the message in a report. Threads: plain data.
#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "plist/Dictionary.h"
#include "tools/report/Rows.h"

namespace tarn::report {

// What a message is to the report. One is of one kind only.
enum class MessageKind {
  Plain,
  Overload,       // its issue_type is overload, and it tells no duration: as the session's own summary counts
  Error,          // of the category or the type Error, and no overload
  Issue,          // of the type IssueDetector, and no overload
  VolumeSegment,  // derived at the stop, as all that follow: told from a client's by what the service alone writes
  InputSegment,
  GroupSegment,
  SessionSummary,
  DriverCounters,
};

// The names of the analytics events that stand for messages begin so.
inline constexpr std::string_view kMessagePrefix = "sys.oxbow.tarnkit.";

// A message, as its event has it.
class Message {
 public:
  // Nothing for events of other back-ends and of other names. A payload that is no JSON object reads as an empty one.
  static std::optional<Message> of(const EventRow& row);
  // Of this name ("Playback.Start"), handed over at that time; nothing for a payload that is no JSON object.
  static std::optional<Message> from(std::string_view name, double arrived, std::string_view payload);

  MessageKind kind() const noexcept { return kind_; }
  // The service made it of others or of the drivers' counters, when the session stopped.
  bool isDerived() const noexcept { return kind_ >= MessageKind::VolumeSegment; }
  // "Playback.Start", and its parts.
  std::string_view name() const noexcept { return name_; }
  std::string_view category() const noexcept;
  std::string_view type() const noexcept;
  // When it was handed over, and when it happened by its own stamp, a number or a date; nothing without one.
  double arrived() const noexcept { return arrived_; }
  std::optional<double> stamp() const;

  const plist::Dictionary& fields() const noexcept { return fields_; }
  bool has(std::string_view key) const noexcept { return fields_.get(key).present(); }
  // Conversions as the service makes them: see plist::ValueView. 0 or empty for what isn't there.
  double number(std::string_view key) const noexcept { return fields_.get(key).asDouble(); }
  std::string text(std::string_view key) const;

 private:
  std::string name_;
  double arrived_ = 0;
  plist::Dictionary fields_;
  MessageKind kind_ = MessageKind::Plain;
};

// The seconds of a date as JSON has it (2026-11-20T10:00:00Z); nothing for a text that no date is written as.
std::optional<double> secondsOfDateText(std::string_view text);

// Whether the fields may tell what the kind is or hold what a report over many sessions counts, by the event's name
// alone; without one of these a payload need not be read unless it mentions an overload.
bool isCountedByName(std::string_view eventName);

}  // namespace tarn::report
