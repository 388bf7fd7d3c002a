// SPDX-License-Identifier: Apache-2.0
#include "tools/report/SessionPicture.h"

#include <algorithm>
#include <cmath>
#include <string_view>
#include <utility>

namespace tarn::report {

namespace {

// How far outside the session's life a stamp may lie: clients gather messages and send them later.
constexpr double kTolerance = 60;

// A message at the moment at which it is drawn.
struct Moment {
  double at = 0;
  const Message* message = nullptr;
};

double endOf(const SessionRow& session, double now) {
  return std::max(session.created, session.ended.value_or(now));
}

bool isWithin(double stamp, const SessionPicture& picture) {
  return stamp >= picture.from - kTolerance && stamp <= picture.to + kTolerance;
}

// Sets whose time is drawn, and with it the ends of the axis.
void chooseTime(const std::vector<Message>& messages, SessionPicture& picture) {
  std::size_t inside = 0;
  std::vector<double> outside;
  for (const Message& message : messages) {
    const std::optional<double> stamp = message.stamp();
    if (message.isDerived() || !stamp) continue;
    if (isWithin(*stamp, picture)) {
      ++inside;
    } else {
      outside.push_back(*stamp);
    }
  }
  picture.inMessagesTime = outside.size() > inside;
  if (picture.inMessagesTime) {
    const auto [first, last] = std::minmax_element(outside.begin(), outside.end());
    picture.from = *first;
    picture.to = *last;
  }
}

// In the messages' own time those without a place in it stand at its end, as what is derived does.
std::vector<Moment> momentsOf(const std::vector<Message>& messages, const SessionPicture& picture) {
  std::vector<Moment> moments;
  for (const Message& message : messages) {
    const double stamp = message.stamp().value_or(message.arrived());
    const bool fits = picture.inMessagesTime ? stamp >= picture.from && stamp <= picture.to : isWithin(stamp, picture);
    const double instead = picture.inMessagesTime ? picture.to : message.arrived();
    moments.push_back({message.isDerived() || !fits ? instead : stamp, &message});
  }
  std::stable_sort(moments.begin(), moments.end(), [](const Moment& a, const Moment& b) { return a.at < b.at; });
  return moments;
}

// Reads the lanes off messages in the order of time.
class Lanes {
 public:
  explicit Lanes(SessionPicture& picture) : picture_(picture) {}

  void take(const Moment& moment);
  void finish();

 private:
  // What lasts, as long as it does.
  struct Open {
    std::optional<Span> span;
    std::vector<Span>* lane;
  };

  // Where what begins then ends at the latest: the stop of its period.
  double latestEnd(double from) const;
  void begin(Open& open, double at, std::string label);
  void end(Open& open, double at);
  void takeState(const Moment& moment);
  void takeFault(const Moment& moment);

  SessionPicture& picture_;
  Open output_{std::nullopt, &picture_.output};
  Open input_{std::nullopt, &picture_.input};
  Open route_{std::nullopt, &picture_.routes};
  Open group_{std::nullopt, &picture_.groups};
};

double Lanes::latestEnd(double from) const {
  for (const Span& running : picture_.running) {
    if (from >= running.from && from < running.to) return running.to;
  }
  return picture_.to;
}

void Lanes::begin(Open& open, double at, std::string label) {
  if (open.span && open.span->label == label && at <= latestEnd(open.span->from)) return;
  end(open, at);
  open.span = Span{at, at, std::move(label)};
}

void Lanes::end(Open& open, double at) {
  if (!open.span) return;
  open.span->to = std::max(open.span->from, std::min(at, latestEnd(open.span->from)));
  open.lane->push_back(std::move(*open.span));
  open.span.reset();
}

void Lanes::takeState(const Moment& moment) {
  const Message& message = *moment.message;
  const auto follow = [&](Open& open, std::string_view key) {
    if (!message.has(key)) return;
    if (message.number(key) != 0) {
      begin(open, moment.at, {});
    } else {
      end(open, moment.at);
    }
  };
  follow(output_, "session_output_running");
  follow(input_, "session_input_running");
  follow(group_, "lagoon_session");
  if (message.has("active_devices")) {
    begin(route_, moment.at, message.text("active_devices"));
  }
  if (message.has("KvSessionVolume")) {
    const double volume = message.number("KvSessionVolume");
    const bool isNew = picture_.volume.empty() || picture_.volume.back().value != volume;
    if (std::isfinite(volume) && isNew) {
      picture_.volume.push_back({moment.at, volume});
    }
  }
  if (message.has("session_duration")) {
    end(output_, moment.at);
    end(input_, moment.at);
    end(group_, moment.at);
  }
}

void Lanes::takeFault(const Moment& moment) {
  const Message& message = *moment.message;
  const std::string issue = message.text("issue_type");
  std::string what = issue.empty() ? std::string(message.name()) : issue;
  if (const std::string node = message.text("node"); !node.empty()) {
    what += " at " + node;
  }
  if (message.kind() == MessageKind::Overload) {
    picture_.overloads.push_back({moment.at, std::string(message.name())});
  } else if (message.kind() == MessageKind::Error) {
    picture_.errors.push_back({moment.at, std::move(what)});
  } else if (message.kind() == MessageKind::Issue) {
    picture_.issues.push_back({moment.at, std::move(what)});
  }
}

void Lanes::take(const Moment& moment) {
  if (moment.message->isDerived()) return;
  takeState(moment);
  takeFault(moment);
}

void Lanes::finish() {
  for (Open* open : {&output_, &input_, &route_, &group_}) {
    end(*open, picture_.to);
  }
}

// What was chosen says more than the kind of the format, and isn't always told.
std::string formatOf(const Message& message) {
  std::string chosen = message.text("session_selected_format");
  const bool isTold = !chosen.empty() && chosen != "unknown";
  return isTold ? std::move(chosen) : message.text("mFormatID");
}

Segment segmentOf(const Message& message) {
  Segment segment;
  const bool isInput = message.kind() == MessageKind::InputSegment;
  segment.kind = isInput                                        ? Segment::Kind::Input
                 : message.kind() == MessageKind::VolumeSegment ? Segment::Kind::Output
                                                                : Segment::Kind::Group;
  const double seconds = message.number(isInput ? "inputrunning_seconds" : "play_seconds");
  segment.seconds = std::isfinite(seconds) ? std::max(0.0, seconds) : 0;
  if (segment.kind == Segment::Kind::Output && message.has("KvSessionVolume")) {
    segment.volume = message.number("KvSessionVolume");
  }
  segment.route = message.text("active_devices");
  segment.format = isInput ? message.text("vocoders") : formatOf(message);
  return segment;
}

void takeCounters(const Moment& moment, std::vector<Counter>& counters) {
  for (const auto& field : moment.message->fields()) {
    const std::string_view key = field.key.text();
    for (const std::string_view part : {"_Simple_", "_Histogram_", "_State_"}) {
      if (key.find(part) == std::string_view::npos) continue;
      counters.push_back({moment.at, std::string(key), field.value.asText()});
      break;
    }
  }
}

SessionTotals totalsOf(const Message& message) {
  const auto count = [&](std::string_view key) { return message.fields().get(key).asInt64(); };
  return {message.number("total_active_time"), count("active_count"), count("overload_count"), count("num_messages"),
          count("num_unique_messages")};
}

void takeDerived(const Moment& moment, SessionPicture& picture) {
  switch (moment.message->kind()) {
    case MessageKind::VolumeSegment:
    case MessageKind::InputSegment:
    case MessageKind::GroupSegment:
      picture.segments.push_back(segmentOf(*moment.message));
      return;
    case MessageKind::SessionSummary:
      picture.totals = totalsOf(*moment.message);
      return;
    case MessageKind::DriverCounters:
      takeCounters(moment, picture.counters);
      return;
    default:
      return;
  }
}

void takePeriods(const std::vector<PeriodRow>& periods, double now, SessionPicture& picture) {
  picture.periods = periods;
  std::stable_sort(picture.periods.begin(), picture.periods.end(),
                   [](const PeriodRow& a, const PeriodRow& b) { return a.started < b.started; });
  for (const PeriodRow& period : picture.periods) {
    const double stopped = std::max(period.started, period.stopped.value_or(endOf(picture.session, now)));
    picture.running.push_back({period.started, stopped, {}});
    picture.activeSeconds += stopped - period.started;
    picture.messages += period.messages;
    picture.from = std::min(picture.from, period.started);
    picture.to = std::max(picture.to, stopped);
  }
}

// What was drawn outside the axis widens it.
void widen(const std::vector<Moment>& moments, SessionPicture& picture) {
  if (moments.empty()) return;
  picture.from = std::min(picture.from, moments.front().at);
  picture.to = std::max(picture.to, moments.back().at);
}

}  // namespace

SessionPicture sessionPicture(const SessionRow& session, const std::vector<PeriodRow>& periods,
                              const std::vector<EventRow>& events, double now) {
  SessionPicture picture;
  picture.session = session;
  picture.from = session.created;
  picture.to = endOf(session, now);
  takePeriods(periods, now, picture);
  std::vector<Message> messages;
  for (const EventRow& event : events) {
    ++picture.events[event.backend];
    if (std::optional<Message> message = Message::of(event)) {
      messages.push_back(std::move(*message));
    }
  }
  chooseTime(messages, picture);
  if (picture.inMessagesTime) {
    picture.running.clear();
  }
  const std::vector<Moment> moments = momentsOf(messages, picture);
  widen(moments, picture);
  Lanes lanes(picture);
  for (const Moment& moment : moments) {
    lanes.take(moment);
    takeDerived(moment, picture);
  }
  lanes.finish();
  return picture;
}

}  // namespace tarn::report
