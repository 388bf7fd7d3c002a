// SPDX-License-Identifier: Apache-2.0
#include "tools/report/RangeSection.h"

#include <algorithm>
#include <string>
#include <vector>

#include "tools/report/Bars.h"
#include "tools/report/SessionSection.h"
#include "tools/report/Table.h"
#include "tools/report/Texts.h"

namespace tarn::report {

namespace {

constexpr double kHour = 3600;
constexpr std::size_t kMostGroups = 20;  // as bars and as rows; the rest is one more
constexpr std::size_t kNameCharacters = 60;
constexpr std::size_t kLabelCharacters = 22;  // of an application, so that the type has room after it

std::string nameText(const std::string& name) {
  return name.empty() ? "unknown" : shortened(name, kNameCharacters);
}

std::string countText(std::int64_t count, const char* one, const char* more) {
  return numberText(count) + " " + (count == 1 ? one : more);
}

void writeTotals(Markup& markup, const RangePicture& picture) {
  FactTable facts(markup, "All sessions together");
  facts.row("Sessions", static_cast<std::int64_t>(picture.sessions.size()));
  facts.row("Active, h", picture.totals.activeSeconds / kHour);
  facts.row("Messages", picture.totals.messages);
  facts.row("Repeated messages", picture.totals.redundant);
  facts.row("Overloads", picture.totals.overloads);
  facts.row("Errors", picture.totals.errors);
  facts.row("Issues", picture.totals.issues);
}

// The first ones, and one that is all the others.
std::vector<GroupFigures> shownGroups(const RangePicture& picture) {
  std::vector<GroupFigures> shown = picture.groups;
  if (shown.size() <= kMostGroups) return shown;
  GroupFigures rest;
  rest.application = std::to_string(shown.size() - kMostGroups) + " others";
  rest.serviceName = "several";
  for (std::size_t index = kMostGroups; index < shown.size(); ++index) {
    rest.sessions += shown[index].sessions;
    rest.activeSeconds += shown[index].activeSeconds;
    rest.overloads += shown[index].overloads;
    rest.errors += shown[index].errors;
  }
  shown.resize(kMostGroups);
  shown.push_back(rest);
  return shown;
}

void writeGroups(Markup& markup, const RangePicture& picture) {
  const std::vector<GroupFigures> groups = shownGroups(picture);
  std::vector<Bar> bars;
  for (const GroupFigures& group : groups) {
    bars.push_back({shortened(nameText(group.application), kLabelCharacters) + ", " + nameText(group.serviceName),
                    static_cast<double>(group.sessions), countText(group.sessions, "session", "sessions"), "output"});
  }
  const std::string name = "Sessions by application and type";
  markup.line().element("h3", {}, name);
  drawBars(markup,
           {"applications", name, "A bar for each application and service type, those with the most sessions first."},
           bars);
  Table table(markup, name, {"Application", "Type", "Sessions", "Active, h", "Overloads", "Errors"});
  for (const GroupFigures& group : groups) {
    table.row({nameText(group.application), nameText(group.serviceName), group.sessions, group.activeSeconds / kHour,
               group.overloads, group.errors});
  }
}

double perDay(const TimeBin& bin) {
  return bin.activeSeconds / kHour / ((bin.to - bin.from) / (24 * kHour));
}

void writeDays(Markup& markup, const RangePicture& picture) {
  std::vector<Bar> columns;
  for (const TimeBin& bin : picture.days) {
    columns.push_back({dayText(bin.from), perDay(bin), {}, "running"});
  }
  const std::string name = "Active hours a day";
  markup.line().element("h3", {}, name);
  drawColumns(
      markup,
      {"days", name, "A column for each day, or for several where the range is long: the hours of all sessions."},
      columns, "hours a day");
  markup.line().open("details").element("summary", {}, "Numbers of the days");
  {
    Table table(markup, name, {"From (UTC)", "Days", "Active, h", "Active, h a day"});
    for (const TimeBin& bin : picture.days) {
      table.row({dayText(bin.from), (bin.to - bin.from) / (24 * kHour), bin.activeSeconds / kHour, perDay(bin)});
    }
  }
  markup.close();
}

// For each hour in which a session was active; 0 where none was.
double rateOf(const TimeBin& bin) {
  return bin.activeSeconds > 0 ? static_cast<double>(bin.overloads) / (bin.activeSeconds / kHour) : 0;
}

void writeOverloads(Markup& markup, const RangePicture& picture) {
  const bool byTheHour = !picture.hours.empty() && picture.hours.front().to - picture.hours.front().from <= kHour;
  std::vector<Bar> columns;
  for (const TimeBin& bin : picture.hours) {
    const std::string time = timeText(bin.from);
    columns.push_back({byTheHour ? time.substr(0, 16) : dayText(bin.from), rateOf(bin), {}, "overload"});
  }
  const std::string name = "Overloads an hour";
  markup.line().element("h3", {}, name);
  drawColumns(markup, {"overloads", name, "Overloads for each hour in which sessions were active, over the range."},
              columns, "overloads an active hour");
  markup.line().open("details").element("summary", {}, "Numbers of the overloads");
  {
    Table table(markup, name, {"From (UTC)", "Hours", "Active, h", "Overloads", "Overloads an active hour"});
    for (const TimeBin& bin : picture.hours) {
      table.row(
          {timeText(bin.from), (bin.to - bin.from) / kHour, bin.activeSeconds / kHour, bin.overloads, rateOf(bin)});
    }
  }
  markup.close();
}

void writeVolumes(Markup& markup, const RangePicture& picture) {
  double total = 0;
  for (const double seconds : picture.playSeconds) {
    total += seconds;
  }
  std::vector<Bar> columns;
  for (std::size_t index = 0; index < kVolumeBuckets; ++index) {
    columns.push_back({numberText(static_cast<double>(index) / 16), picture.playSeconds[index] / kHour, {}, "output"});
  }
  const std::string name = "Volume";
  markup.line().element("h3", {}, name);
  drawColumns(markup,
              {"volumes", name,
               "Hours of play by volume, to the nearest sixteenth, of the derived segments: " + durationText(total) +
                   " together."},
              columns, "hours of play");
  markup.line().open("details").element("summary", {}, "Numbers of the volumes");
  {
    Table table(markup, name, {"Volume", "Seconds of play", "Share, %"});
    for (std::size_t index = 0; index < kVolumeBuckets; ++index) {
      const double seconds = picture.playSeconds[index];
      table.row({numberText(static_cast<double>(index) / 16), seconds, total > 0 ? seconds / total * 100 : 0.0});
    }
  }
  markup.close();
}

void writeWorst(Markup& markup, const RangePicture& picture, const std::set<std::int64_t>& linked) {
  const std::string name = "The worst sessions";
  markup.line().element("h3", {}, name);
  if (picture.worst.empty()) {
    markup.line().element("p", {}, "No session had an overload or an error.");
    return;
  }
  std::vector<Bar> bars;
  for (const std::size_t index : picture.worst) {
    const SessionFigures& figures = picture.sessions[index];
    bars.push_back(
        {"session " + std::to_string(figures.session.id) + ", " + nameText(figures.session.application),
         static_cast<double>(figures.overloads + figures.errors),
         countText(figures.overloads, "overload", "overloads") + ", " + countText(figures.errors, "error", "errors"),
         "overload"});
  }
  drawBars(markup, {"worst", name, "Those with the most overloads and errors together, at most ten."}, bars);
  Table table(markup, name, {"Session", "Application", "Type", "Active, s", "Overloads", "Errors", "Issues"});
  for (const std::size_t index : picture.worst) {
    const SessionFigures& figures = picture.sessions[index];
    table.row(
        {numberText(figures.session.id), nameText(figures.session.application), nameText(figures.session.serviceName),
         figures.activeSeconds, figures.overloads, figures.errors, figures.issues},
        linked.contains(figures.session.id) ? "#" + sectionId(figures.session.id) : std::string());
  }
}

}  // namespace

void writeRange(Markup& markup, const RangePicture& picture, const std::set<std::int64_t>& linked) {
  markup.line().open("section", {{"id", "overview"}}).element("h2", {}, "Overview");
  writeTotals(markup, picture);
  writeGroups(markup, picture);
  writeDays(markup, picture);
  writeOverloads(markup, picture);
  writeVolumes(markup, picture);
  writeWorst(markup, picture, linked);
  markup.close();
}

}  // namespace tarn::report
