// SPDX-License-Identifier: Apache-2.0
#include "tools/report/Timeline.h"

#include <algorithm>
#include <string>

#include "tools/report/Scale.h"
#include "tools/report/Texts.h"

namespace tarn::report {

namespace {

constexpr double kLeft = 100;
constexpr double kWidth = kPictureWidth - kLeft - 20;
constexpr double kLane = 26;
constexpr double kVolumeLane = 70;
constexpr double kBar = 14;
constexpr double kGap = 6;
constexpr double kAxis = 24;
constexpr int kTicks = 7;
constexpr double kNarrowest = 1.5;       // so that something short is seen
constexpr double kCharacterWidth = 6.5;  // about, to tell whether a label has room

// Draws the lanes from above to below.
class Drawing {
 public:
  Drawing(Markup& markup, const PictureHead& head, const SessionPicture& session)
      : session_(session),
        scale_{session.from, session.to, kLeft, kWidth},
        height_(heightOf(session)),
        picture_(markup, head, height_ + kAxis) {}

  void draw();

 private:
  static double heightOf(const SessionPicture& session);
  void spans(const char* kind, const char* label, const std::vector<Span>& spans);
  void volume();
  void marks(const char* kind, const char* label, const std::vector<Mark>& marks);
  void counters();
  void axis();
  void name(const char* label) { picture_.text("end", kLeft - 8, y_ + kGap + kBar - 2, label); }

  const SessionPicture& session_;
  const Scale scale_;
  const double height_;
  Picture picture_;
  double y_ = 0;
};

double Drawing::heightOf(const SessionPicture& session) {
  double height = 0;
  for (const auto* spans : {&session.running, &session.output, &session.input, &session.routes, &session.groups}) {
    height += spans->empty() ? 0 : kLane;
  }
  for (const auto* marks : {&session.overloads, &session.errors, &session.issues}) {
    height += marks->empty() ? 0 : kLane;
  }
  height += session.counters.empty() ? 0 : kLane;
  return height + (session.volume.empty() ? 0 : kVolumeLane);
}

void Drawing::spans(const char* kind, const char* label, const std::vector<Span>& spans) {
  if (spans.empty()) return;
  name(label);
  for (const Span& span : spans) {
    const double x = scale_.at(span.from);
    const double width = std::max(kNarrowest, scale_.at(span.to) - x);
    picture_.box(kind, x, y_ + kGap, width, kBar);
    const auto room = static_cast<std::size_t>(width / kCharacterWidth);
    if (!span.label.empty() && room >= 4) {
      picture_.text("start", x + 4, y_ + kGap + kBar - 3, shortened(span.label, room - 2));
    }
  }
  y_ += kLane;
}

void Drawing::volume() {
  if (session_.volume.empty()) return;
  double highest = 1;
  for (const Step& step : session_.volume) {
    highest = std::max(highest, step.value);
  }
  const double bottom = y_ + kVolumeLane - kGap;
  const Scale height{0, highest, 0, kVolumeLane - 3 * kGap};
  name("volume");
  for (const double value : {0.0, highest}) {
    const double y = bottom - height.at(value);
    picture_.line("grid", kLeft, y, kLeft + kWidth, y);
    picture_.text("start", kLeft + kWidth + 3, y + 4, numberText(value));
  }
  std::string points;
  const auto point = [&](double x, double y) { points += placeText(x) + "," + placeText(y) + " "; };
  double y = 0;
  for (const Step& step : session_.volume) {
    const double x = scale_.at(step.at);
    if (!points.empty()) {
      point(x, y);
    }
    y = bottom - height.at(step.value);
    point(x, y);
  }
  point(kLeft + kWidth, y);
  points.pop_back();
  picture_.steps("volume", points);
  y_ += kVolumeLane;
}

void Drawing::marks(const char* kind, const char* label, const std::vector<Mark>& marks) {
  if (marks.empty()) return;
  name(label);
  for (const Mark& mark : marks) {
    picture_.box(kind, scale_.at(mark.at) - 1.5, y_ + kGap, 3, kBar);
  }
  y_ += kLane;
}

void Drawing::counters() {
  std::vector<Mark> moments;
  for (const Counter& counter : session_.counters) {
    if (moments.empty() || moments.back().at != counter.at) {
      moments.push_back({counter.at, {}});
    }
  }
  marks("driver", "drivers", moments);
}

void Drawing::axis() {
  for (const Tick& tick : timeTicks(session_.from, session_.to, kTicks)) {
    const double x = scale_.at(tick.value);
    picture_.line("grid", x, 0, x, height_);
    picture_.text("middle", x, height_ + 16, tick.text);
  }
}

void Drawing::draw() {
  axis();
  spans("running", "running", session_.running);
  spans("output", "output", session_.output);
  spans("input", "input", session_.input);
  spans("route", "route", session_.routes);
  volume();
  spans("group", "group", session_.groups);
  marks("overload", "overloads", session_.overloads);
  marks("error", "errors", session_.errors);
  marks("issue", "issues", session_.issues);
  counters();
}

}  // namespace

void drawTimeline(Markup& markup, const PictureHead& head, const SessionPicture& session) {
  Drawing(markup, head, session).draw();
}

}  // namespace tarn::report
