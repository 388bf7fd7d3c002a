// SPDX-License-Identifier: Apache-2.0
#include "tools/ctl/sessions/SessionTrace.h"

#include <algorithm>
#include <cmath>
#include <limits>
#include <optional>

#include "tools/ctl/terminal/JsonObject.h"

namespace tarn::ctl {

namespace {

using recorder::PeriodRow;
using recorder::SessionRow;
using Span = SessionTimeline::Span;

// Beyond it a client's stamps are of another time than the wall clock's.
constexpr double kSameTimeSeconds = 3600;

enum Track : std::int64_t { kPeriods = 1, kOutput, kInput, kRoutes, kFaults };

class Trace {
 public:
  explicit Trace(std::int64_t process) : process_(process) {}

  void name(const char* what, std::int64_t track, const std::string& text) {
    JsonObject arguments;
    JsonObject event = begin(what, "M", track);
    add(event.addJson("args", arguments.add("name", text).text()));
  }
  void slice(std::int64_t track, const std::string& text, double from, double to, const std::string& arguments) {
    JsonObject event = begin(text, "X", track);
    add(event.add("ts", microseconds(from))
            .add("dur", microseconds(to) - microseconds(from))
            .addJson("args", arguments));
  }
  void slices(std::int64_t track, const std::string& text, const std::vector<Span>& spans) {
    for (const Span& span : spans) {
      slice(track, span.text.empty() ? text : span.text, span.from, span.to, "{}");
    }
  }
  void level(const std::string& text, double at, double value) {
    JsonObject arguments;
    JsonObject event = begin(text, "C", 0);
    add(event.add("ts", microseconds(at)).addJson("args", arguments.add(text, value).text()));
  }
  void mark(std::int64_t track, const std::string& text, double at) {
    JsonObject event = begin(text, "i", track);
    add(event.add("ts", microseconds(at)).add("s", "t"));
  }

  // The whole, a line an event.
  std::vector<std::string> lines() && {
    std::vector<std::string> all{R"({"displayTimeUnit":"ms","traceEvents":[)"};
    for (std::size_t i = 0; i < events_.size(); ++i) {
      all.push_back(events_[i] + (i + 1 < events_.size() ? "," : ""));
    }
    all.push_back("]}");
    return all;
  }

 private:
  static std::int64_t microseconds(double seconds) {
    constexpr double kBound = 9e15;
    return static_cast<std::int64_t>(std::clamp(std::round(seconds * 1e6), -kBound, kBound));
  }
  JsonObject begin(const std::string& text, const char* phase, std::int64_t track) {
    JsonObject event;
    event.add("name", text).add("ph", phase).add("pid", process_).add("tid", track);
    return event;
  }
  void add(const JsonObject& event) { events_.push_back(event.text()); }

  std::int64_t process_;
  std::vector<std::string> events_;
};

Span spanOf(const PeriodRow& period, const SessionRow& session, const std::vector<SessionMessage>& messages,
            double now) {
  const double stopped = period.stopped.value_or(session.ended.value_or(now));
  Span stamps{std::numeric_limits<double>::infinity(), -std::numeric_limits<double>::infinity(), {}};
  bool isOfAnotherTime = false;
  for (const SessionMessage& message : messages) {
    if (message.isDerived || message.handedOver < period.started || message.handedOver > stopped) continue;
    stamps.from = std::min(stamps.from, message.stamp);
    stamps.to = std::max(stamps.to, message.stamp);
    isOfAnotherTime = isOfAnotherTime || std::abs(message.stamp - message.handedOver) > kSameTimeSeconds;
  }
  return isOfAnotherTime ? stamps : Span{period.started, stopped, {}};
}

void addPeriods(Trace& trace, const SessionRow& session, const std::vector<PeriodRow>& periods,
                const std::vector<SessionMessage>& messages, double now) {
  for (const PeriodRow& period : periods) {
    const Span span = spanOf(period, session, messages, now);
    JsonObject arguments;
    arguments.add("messages", period.messages).add("redundant", period.redundant);
    trace.slice(kPeriods, session.serviceName, span.from, span.to, arguments.text());
  }
}

}  // namespace

std::vector<std::string> traceOf(const SessionRow& session, const std::vector<PeriodRow>& periods,
                                 const std::vector<SessionMessage>& messages, double now) {
  const SessionTimeline timeline = timelineOf(messages);
  Trace trace(session.pid);
  const std::string application = session.application.empty() ? "" : " " + session.application;
  trace.name("process_name", 0, (session.process.empty() ? "a client" : session.process) + application);
  trace.name("thread_name", kPeriods, "session " + std::to_string(session.id));
  trace.name("thread_name", kOutput, "output");
  trace.name("thread_name", kInput, "input");
  trace.name("thread_name", kRoutes, "route");
  trace.name("thread_name", kFaults, "faults");
  addPeriods(trace, session, periods, messages, now);
  trace.slices(kOutput, "output runs", timeline.output);
  trace.slices(kInput, "input runs", timeline.input);
  trace.slices(kRoutes, "no route", timeline.routes);
  for (const auto& volume : timeline.volumes) {
    trace.level("volume", volume.at, volume.value);
  }
  for (const auto& overload : timeline.overloads) {
    trace.mark(kFaults, "overload", overload.at);
  }
  for (const auto& error : timeline.errors) {
    trace.mark(kFaults, error.text, error.at);
  }
  return std::move(trace).lines();
}

}  // namespace tarn::ctl
