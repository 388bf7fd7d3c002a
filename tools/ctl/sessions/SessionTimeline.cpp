// SPDX-License-Identifier: Apache-2.0
#include "tools/ctl/sessions/SessionTimeline.h"

#include <algorithm>
#include <optional>
#include <utility>

namespace tarn::ctl {

namespace {

using Span = SessionTimeline::Span;

// Goes over the messages in their order and remembers what runs.
class Walk {
 public:
  explicit Walk(SessionTimeline& timeline) : timeline_(timeline) {}

  void take(const SessionMessage& message);
  void finish() {
    end(timeline_.output, outputRuns_, timeline_.last);
    end(timeline_.input, inputRuns_, timeline_.last);
    end(timeline_.routes, routeIsKnown_, timeline_.last);
  }

 private:
  void note(const std::string& text) { step_.append(step_.empty() ? "" : ", ").append(text); }
  void begin(std::vector<Span>& spans, bool& runs, double at, std::string text = {}) {
    spans.push_back({at, at, std::move(text)});
    runs = true;
  }
  void end(std::vector<Span>& spans, bool& runs, double at) {
    if (runs) {
      spans.back().to = at;
    }
    runs = false;
  }
  void takeRunning(const SessionMessage& message, const char* key, const char* what, std::vector<Span>& spans,
                   bool& runs);
  void takeRoute(const SessionMessage& message);
  void takeVolume(const SessionMessage& message);
  void takeGroup(const SessionMessage& message);
  void takeFaults(const SessionMessage& message);

  SessionTimeline& timeline_;
  bool outputRuns_ = false;
  bool inputRuns_ = false;
  bool routeIsKnown_ = false;
  bool inGroup_ = false;
  std::string step_;  // of the message that is looked at
};

void Walk::takeRunning(const SessionMessage& message, const char* key, const char* what, std::vector<Span>& spans,
                       bool& runs) {
  const plist::ValueView running = message.payload.get(key);
  const bool goesOn = running.present() ? running.asBool() : runs;
  const bool isOver = message.payload.contains("session_duration");
  if (goesOn && !isOver && !runs) {
    begin(spans, runs, message.stamp);
    note(std::string(what) + " runs");
  } else if (runs && (isOver || !goesOn)) {
    end(spans, runs, message.stamp);
    note(std::string(what) + " stops");
  }
}

void Walk::takeRoute(const SessionMessage& message) {
  const plist::ValueView devices = message.payload.get("active_devices");
  if (!devices.present()) return;
  const std::string route = devices.asText();
  if (routeIsKnown_ && timeline_.routes.back().text == route) return;
  end(timeline_.routes, routeIsKnown_, message.stamp);
  begin(timeline_.routes, routeIsKnown_, message.stamp, route);
  note("route " + route);
}

void Walk::takeVolume(const SessionMessage& message) {
  const plist::ValueView volume = message.payload.get("KvSessionVolume");
  if (!volume.present()) return;
  const double value = volume.asDouble();
  if (!timeline_.volumes.empty() && timeline_.volumes.back().value == value) return;
  timeline_.volumes.push_back({message.stamp, value});
  note("volume " + plist::ValueView(value).asText());
}

void Walk::takeGroup(const SessionMessage& message) {
  const plist::ValueView group = message.payload.get("lagoon_session");
  if (!group.present() || inGroup_ == (group.asInt64() == 1)) return;
  inGroup_ = !inGroup_;
  note(inGroup_ ? "joins a group" : "leaves the group");
}

void Walk::takeFaults(const SessionMessage& message) {
  const bool isFault = message.meaning == report::MessageKind::Error || message.meaning == report::MessageKind::Issue;
  const plist::ValueView issue = message.payload.get("issue_type");
  if (isOverload(message)) {
    timeline_.overloads.push_back({message.stamp, message.kind()});
    note("overload");
  } else if (isFault) {
    const std::string what = message.kind() + (issue.present() ? " " + issue.asText() : "");
    timeline_.errors.push_back({message.stamp, what});
    note(what);
  }
}

void Walk::take(const SessionMessage& message) {
  step_.clear();
  takeRunning(message, "session_output_running", "output", timeline_.output, outputRuns_);
  takeRunning(message, "session_input_running", "input", timeline_.input, inputRuns_);
  takeRoute(message);
  takeVolume(message);
  takeGroup(message);
  takeFaults(message);
  if (message.payload.contains("session_duration")) {
    note("the client's session is over");
  }
  if (!step_.empty()) {
    timeline_.steps.push_back({message.stamp, step_});
  }
}

}  // namespace

SessionTimeline timelineOf(const std::vector<SessionMessage>& messages) {
  std::vector<const SessionMessage*> ordered;
  for (const SessionMessage& message : messages) {
    if (!message.isDerived) {
      ordered.push_back(&message);
    }
  }
  std::stable_sort(ordered.begin(), ordered.end(),
                   [](const auto* one, const auto* other) { return one->stamp < other->stamp; });
  SessionTimeline timeline;
  if (ordered.empty()) return timeline;
  timeline.first = ordered.front()->stamp;
  timeline.last = ordered.back()->stamp;
  Walk walk(timeline);
  for (const SessionMessage* message : ordered) {
    walk.take(*message);
  }
  walk.finish();
  return timeline;
}

}  // namespace tarn::ctl
