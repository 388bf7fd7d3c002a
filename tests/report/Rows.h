// SPDX-License-Identifier: Apache-2.0
// Builders of the rows that reports are made of. Times are seconds after kStart.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "tools/report/Rows.h"
#include "tools/report/SessionPicture.h"

namespace tarn::report {

inline constexpr double kStart = 1'795'168'800;  // 2026-11-20 10:00:00 UTC

inline SessionRow sessionRow(std::int64_t id, double created, std::optional<double> ended) {
  SessionRow session;
  session.id = id;
  session.reporter = 1000 + id;
  session.pid = 4711;
  session.uid = 1000;
  session.process = "player";
  session.application = "org.example.player";
  session.serviceName = "longformaudio";
  session.created = kStart + created;
  if (ended) {
    session.ended = kStart + *ended;
    session.endReason = "stopped";
  }
  return session;
}

inline PeriodRow periodRow(std::int64_t session, double started, std::optional<double> stopped,
                           std::int64_t messages = 0, std::int64_t redundant = 0) {
  PeriodRow period;
  period.session = session;
  period.started = kStart + started;
  if (stopped) {
    period.stopped = kStart + *stopped;
  }
  period.messages = messages;
  period.redundant = redundant;
  return period;
}

// A message's event, without a stamp; `members` are those of its payload: "\"issue_type\":\"overload\"".
inline EventRow messageRow(std::int64_t session, double arrived, const std::string& name, const std::string& members) {
  EventRow event;
  event.session = session;
  event.time = kStart + arrived;
  event.backend = "tally";
  event.name = "sys.oxbow.tarnkit." + name;
  event.payload = "{" + members + "}";
  return event;
}

// The rows of one session from 0 s to 100 s, with one period from 10 s to 90 s.
class OneSession {
 public:
  OneSession() : session(sessionRow(1, 0, 100)), periods{periodRow(1, 10, 90, 20, 3)} {}

  // A message that arrived when it happened.
  OneSession& message(double at, const std::string& name, const std::string& members) {
    return stamped(at, at, name, members);
  }
  OneSession& stamped(double arrived, double stamp, const std::string& name, const std::string& members) {
    const std::string time = "\"tarnreporting_timestamp\":" + std::to_string(kStart + stamp);
    events.push_back(messageRow(1, arrived, name, members.empty() ? time : members + "," + time));
    events.back().id = static_cast<std::int64_t>(events.size());
    return *this;
  }
  SessionPicture picture(double now = 1000) const { return sessionPicture(session, periods, events, kStart + now); }

  SessionRow session;
  std::vector<PeriodRow> periods;
  std::vector<EventRow> events;
};

// Spans without kStart, to be compared with short numbers.
inline std::vector<Span> fromStart(std::vector<Span> spans) {
  for (Span& span : spans) {
    span.from -= kStart;
    span.to -= kStart;
  }
  return spans;
}

template <class Item>
std::vector<double> timesOf(const std::vector<Item>& items) {
  std::vector<double> times;
  for (const Item& item : items) {
    times.push_back(item.at - kStart);
  }
  return times;
}

}  // namespace tarn::report
