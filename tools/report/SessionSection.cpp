// SPDX-License-Identifier: Apache-2.0
#include "tools/report/SessionSection.h"

#include <algorithm>
#include <utility>
#include <vector>

#include "tools/report/Bars.h"
#include "tools/report/Table.h"
#include "tools/report/Texts.h"
#include "tools/report/Thinning.h"
#include "tools/report/Timeline.h"

namespace tarn::report {

namespace {

constexpr std::size_t kMostSpans = 40;
constexpr std::size_t kMostSteps = 60;
constexpr std::size_t kMostMarks = 60;
constexpr std::size_t kMostSegments = 40;
constexpr std::size_t kMostCounters = 40;
constexpr std::size_t kNameCharacters = 80;
constexpr std::size_t kValueCharacters = 200;

std::string nameText(const std::string& name) {
  return name.empty() ? "unknown" : shortened(name, kNameCharacters);
}

// The lanes as picture and table have room for them.
SessionPicture fitted(SessionPicture picture) {
  for (auto* spans : {&picture.running, &picture.output, &picture.input, &picture.routes, &picture.groups}) {
    *spans = longest(*spans, kMostSpans);
  }
  for (auto* marks : {&picture.overloads, &picture.errors, &picture.issues}) {
    *marks = joined(*marks, kMostMarks);
  }
  picture.volume = thinned(picture.volume, kMostSteps);
  if (picture.counters.size() > kMostCounters) {
    picture.counters.resize(kMostCounters);
  }
  return picture;
}

std::string plural(std::size_t count, const char* one, const char* more) {
  return std::to_string(count) + " " + (count == 1 ? one : more);
}

std::int64_t redundantOf(const SessionPicture& picture) {
  std::int64_t redundant = 0;
  for (const PeriodRow& period : picture.periods) {
    redundant += period.redundant;
  }
  return redundant;
}

void writeFacts(Markup& markup, const SessionPicture& picture) {
  const SessionRow& session = picture.session;
  FactTable facts(markup, "Session " + std::to_string(session.id) + ": facts");
  facts.row("Client", nameText(session.process) + ", process " + std::to_string(session.pid) + ", user " +
                          std::to_string(session.uid));
  facts.row("Application", nameText(session.application));
  facts.row("Service type", nameText(session.serviceName));
  facts.row("Reporter ID", session.reporter);
  facts.row("Created", preciseTimeText(session.created));
  facts.row("Ended", session.ended ? preciseTimeText(*session.ended) + ", " + nameText(session.endReason)
                                   : std::string("still open"));
  facts.row("Periods", static_cast<std::int64_t>(picture.periods.size()));
  facts.row("Active, s", picture.activeSeconds);
  facts.row("Messages", picture.messages);
  facts.row("Repeated messages", redundantOf(picture));
  facts.row("Overloads", static_cast<std::int64_t>(picture.overloads.size()));
  facts.row("Errors", static_cast<std::int64_t>(picture.errors.size()));
  facts.row("Issues", static_cast<std::int64_t>(picture.issues.size()));
  for (const auto& [backend, count] : picture.events) {
    facts.row("Events of " + nameText(backend), count);
  }
  if (picture.totals) {
    facts.row("Its own summary", durationText(picture.totals->activeSeconds) + " active in " +
                                     std::to_string(picture.totals->activeCount) +
                                     (picture.totals->activeCount == 1 ? " stretch, " : " stretches, ") +
                                     std::to_string(picture.totals->overloads) + " overloads, " +
                                     std::to_string(picture.totals->messages) + " messages in its last period");
  }
}

// A row of the timeline's table, at its time.
struct TimelineRow {
  double at = 0;
  std::string what;
  std::string until;
  Cell value;
};

std::vector<TimelineRow> timelineRows(const SessionPicture& picture) {
  std::vector<TimelineRow> rows;
  const auto addSpans = [&](const char* what, const std::vector<Span>& spans) {
    for (const Span& span : spans) {
      rows.push_back({span.from, what, preciseTimeText(span.to),
                      span.label.empty() ? Cell(durationText(span.to - span.from))
                                         : Cell(shortened(span.label, kNameCharacters))});
    }
  };
  const auto addMarks = [&](const char* what, const std::vector<Mark>& marks) {
    for (const Mark& mark : marks) {
      const std::string times = mark.count > 1 ? ", " + std::to_string(mark.count) + " from then on" : "";
      rows.push_back({mark.at, what, "", shortened(mark.what, kNameCharacters) + times});
    }
  };
  addSpans("running", picture.running);
  addSpans("output", picture.output);
  addSpans("input", picture.input);
  addSpans("route", picture.routes);
  for (const Step& step : picture.volume) {
    rows.push_back({step.at, "volume", "", Cell(step.value)});
  }
  addSpans("group", picture.groups);
  addMarks("overload", picture.overloads);
  addMarks("error", picture.errors);
  addMarks("issue", picture.issues);
  std::stable_sort(rows.begin(), rows.end(), [](const TimelineRow& a, const TimelineRow& b) { return a.at < b.at; });
  return rows;
}

std::size_t itemsOf(const SessionPicture& picture) {
  return picture.running.size() + picture.output.size() + picture.input.size() + picture.routes.size() +
         picture.groups.size() + picture.volume.size() + picture.overloads.size() + picture.errors.size() +
         picture.issues.size();
}

std::string timelineText(const SessionPicture& picture) {
  std::string text =
      "From " + preciseTimeText(picture.from) + " to " + preciseTimeText(picture.to) + ": " +
      plural(picture.running.size(), "period", "periods") + ", " +
      plural(picture.output.size(), "stretch of output", "stretches of output") + ", " +
      plural(picture.input.size(), "of input", "of input") + ", " + plural(picture.volume.size(), "volume", "volumes") +
      ", " + plural(picture.overloads.size(), "overload", "overloads") + ", " +
      plural(picture.errors.size(), "error", "errors") + ", " + plural(picture.issues.size(), "issue", "issues") + ".";
  if (picture.inMessagesTime) {
    text += " The messages' stamps lie outside the session's life, so this is their time, and no period is shown.";
  }
  return text;
}

void openDetails(Markup& markup, const std::string& summary) {
  markup.line().open("details").element("summary", {}, summary);
}

void writeTimeline(Markup& markup, const SessionPicture& whole) {
  const SessionPicture picture = fitted(whole);
  if (itemsOf(picture) == 0) {
    markup.line().element("p", {}, "There is nothing to draw: no period and no message.");
    return;
  }
  const std::string name = "Session " + std::to_string(whole.session.id) + ": timeline";
  drawTimeline(markup, {sectionId(whole.session.id) + "-timeline", name, timelineText(whole)}, picture);
  if (itemsOf(picture) < itemsOf(whole)) {
    markup.line().element("p", {{"class", "quiet"}},
                          "There is more than can be shown: of " + std::to_string(itemsOf(whole)) + " items " +
                              std::to_string(itemsOf(picture)) +
                              " are in the picture and its table. Of stretches the longest stand, faults are joined.");
  }
  openDetails(markup, "Numbers of the timeline");
  {
    Table table(markup, name, {"Time (UTC)", "What", "Until", "Value"});
    for (const TimelineRow& row : timelineRows(picture)) {
      table.row({preciseTimeText(row.at), row.what, row.until, row.value});
    }
  }
  markup.close();
}

const char* kindText(Segment::Kind kind) {
  switch (kind) {
    case Segment::Kind::Output:
      return "output";
    case Segment::Kind::Input:
      return "input";
    default:
      return "group";
  }
}

std::string segmentLabel(const Segment& segment) {
  std::string label = kindText(segment.kind);
  if (segment.volume) {
    label += " at " + numberText(*segment.volume);
  }
  return segment.route.empty() ? label : label + ", " + shortened(segment.route, kNameCharacters);
}

void writeSegments(Markup& markup, const SessionPicture& picture) {
  if (picture.segments.empty()) return;
  const std::vector<Segment> shown =
      longest(picture.segments, kMostSegments, [](const Segment& segment) { return segment.seconds; });
  double total = 0;
  for (const Segment& segment : picture.segments) {
    total += segment.seconds;
  }
  std::vector<Bar> bars;
  for (const Segment& segment : shown) {
    bars.push_back({segmentLabel(segment), segment.seconds, durationText(segment.seconds), kindText(segment.kind)});
  }
  const std::string name = "Session " + std::to_string(picture.session.id) + ": derived segments";
  const std::string text =
      plural(picture.segments.size(), "segment", "segments") + " of " + numberText(total) + " s together" +
      (shown.size() < picture.segments.size() ? "; the longest " + std::to_string(shown.size()) + " are shown." : ".");
  markup.line().element("p", {}, "What was derived at the stop: " + text);
  drawBars(markup, {sectionId(picture.session.id) + "-segments", name, text}, bars);
  openDetails(markup, "Numbers of the segments");
  {
    Table table(markup, name, {"What", "Seconds", "Volume", "Route", "Format or codecs"});
    for (const Segment& segment : shown) {
      table.row({kindText(segment.kind), segment.seconds, segment.volume ? Cell(*segment.volume) : Cell(""),
                 shortened(segment.route, kNameCharacters), shortened(segment.format, kNameCharacters)});
    }
  }
  markup.close();
}

void writeCounters(Markup& markup, const SessionPicture& picture) {
  if (picture.counters.empty()) return;
  const std::size_t shown = std::min(picture.counters.size(), kMostCounters);
  Table table(markup,
              "Session " + std::to_string(picture.session.id) + ": what drivers counted meanwhile" +
                  (shown < picture.counters.size()
                       ? ", " + std::to_string(shown) + " of " + std::to_string(picture.counters.size()) + " counters"
                       : ""),
              {"Counter", "Value"});
  for (std::size_t index = 0; index < shown; ++index) {
    const Counter& counter = picture.counters[index];
    table.row({shortened(counter.name, kNameCharacters), shortened(counter.value, kValueCharacters)});
  }
}

}  // namespace

std::string sectionId(std::int64_t session) {
  return "session-" + std::to_string(session);
}

void writeSession(Markup& markup, const SessionPicture& picture) {
  const SessionRow& session = picture.session;
  markup.line().open("section", {{"id", sectionId(session.id)}});
  markup.element("h3", {},
                 "Session " + std::to_string(session.id) + ": " + nameText(session.application) + ", " +
                     nameText(session.serviceName));
  writeFacts(markup, picture);
  writeTimeline(markup, picture);
  writeSegments(markup, picture);
  writeCounters(markup, picture);
  markup.close();
}

}  // namespace tarn::report
