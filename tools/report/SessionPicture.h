// SPDX-License-Identifier: Apache-2.0
// SessionPicture: what is to be seen of one session, made of its rows by a pure function.
//
// Which problem: rows tell of changes, a picture shows stretches. Messages are brought into the order of their own
// stamps, and each lane is read off them: output and input run from a message that says so until one that says
// otherwise, until session_duration or until the period stops; a route and a volume hold until the next one.
//
// Stamps are the clients' word. Where most of them lie within the session's life, a minute around it included, those
// that don't count as of their arrival. Where most don't, as in a session that was played again, the picture is drawn
// in the messages' own time, and the periods aren't shown on it. Threads: any; everything is a value.
#pragma once

#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <vector>

#include "tools/report/Message.h"
#include "tools/report/Rows.h"

namespace tarn::report {

// Something lasts.
struct Span {
  double from = 0;
  double to = 0;
  std::string label;
  friend bool operator==(const Span&, const Span&) = default;
};

// The volume from here on.
struct Step {
  double at = 0;
  double value = 0;
  friend bool operator==(const Step&, const Step&) = default;
};

// Something happened: once, or `count` times from here on where marks were joined (Thinning.h).
struct Mark {
  double at = 0;
  std::string what;
  std::int64_t count = 1;
  friend bool operator==(const Mark&, const Mark&) = default;
};

// A derived segment. It has a length and no place in time: the session told it at its stop.
struct Segment {
  enum class Kind { Output, Input, Group };
  Kind kind = Kind::Output;
  double seconds = 0;
  std::optional<double> volume;  // of output alone
  std::string route;
  std::string format;  // the format, or the codecs of input
  friend bool operator==(const Segment&, const Segment&) = default;
};

// What a driver counted meanwhile.
struct Counter {
  double at = 0;
  std::string name;
  std::string value;
  friend bool operator==(const Counter&, const Counter&) = default;
};

// The last summary that the session sent of itself.
struct SessionTotals {
  double activeSeconds = 0;
  std::int64_t activeCount = 0;
  std::int64_t overloads = 0;
  std::int64_t messages = 0;
  std::int64_t unique = 0;
  friend bool operator==(const SessionTotals&, const SessionTotals&) = default;
};

struct SessionPicture {
  SessionRow session;
  std::vector<PeriodRow> periods;
  // What the time axis shows; `to` is never before `from`.
  double from = 0;
  double to = 0;
  bool inMessagesTime = false;  // no period is on the axis
  // The lanes, each in the order of time.
  std::vector<Span> running;
  std::vector<Span> output;
  std::vector<Span> input;
  std::vector<Span> routes;
  std::vector<Span> groups;
  std::vector<Step> volume;
  std::vector<Mark> overloads;
  std::vector<Mark> errors;
  std::vector<Mark> issues;
  // In the order of hand-over.
  std::vector<Segment> segments;
  std::vector<Counter> counters;
  std::optional<SessionTotals> totals;
  std::map<std::string, std::int64_t> events;  // by back-end
  double activeSeconds = 0;                    // of its periods
  std::int64_t messages = 0;                   // of its periods, repeated ones included
};

// `now` stands for the end of what hasn't ended. Events come in the order of their ids; those of other sessions must
// not be among them.
SessionPicture sessionPicture(const SessionRow& session, const std::vector<PeriodRow>& periods,
                              const std::vector<EventRow>& events, double now);

}  // namespace tarn::report
