// SPDX-License-Identifier: Apache-2.0
#include "fleet/ask/FleetPage.h"

#include <algorithm>
#include <cmath>
#include <vector>

#include "tools/report/Bars.h"
#include "tools/report/Markup.h"
#include "tools/report/PageFrame.h"
#include "tools/report/Table.h"
#include "tools/report/Texts.h"

namespace tarn::fleet {

namespace {

using report::Bar;
using report::Cell;
using report::FactTable;
using report::Markup;
using report::numberText;
using report::Table;

constexpr double kHour = 3600;
constexpr double kDay = 24 * kHour;
constexpr std::size_t kWorst = 10;
constexpr std::size_t kMostColumns = 62;
constexpr std::size_t kMostIssues = 20;
constexpr std::size_t kNameCharacters = 60;

std::string nameText(const std::string& name) {
  return name.empty() ? "unknown" : report::shortened(name, kNameCharacters);
}

// "from 2026-11-20 10:00:00 to ..."; of all time where nothing bounds it.
std::string spanText(const Span& span) {
  if (!span.since && !span.until) return "of all time";
  return (span.since ? "from " + report::timeText(*span.since) : std::string("from the beginning")) +
         (span.until ? " to " + report::timeText(*span.until) : "");
}

Played sumOf(const std::vector<Played>& parts) {
  Played sum;
  for (const Played& part : parts) {
    sum.segments += part.segments;
    sum.seconds += part.seconds;
    sum.overloads += part.overloads;
  }
  return sum;
}

std::string intervalText(const std::optional<Rate>& rate) {
  return rate ? rateText(rate->between.low) + " to " + rateText(rate->between.high) : "-";
}

void writeTotals(Markup& markup, const FleetPicture& picture) {
  const Played all = sumOf(picture.played.routes);
  const auto rate = rateOf(all);
  markup.line().open("section", {{"id", "totals"}}).element("h2", {}, "All devices together");
  {
    FactTable facts(markup, "What was asked of, " + spanText(picture.span));
    facts.row("Devices that had sessions", picture.sessionDevices);
    facts.row("Sessions", picture.sessions);
    facts.row("Play, h", all.seconds / kHour);
    facts.row("Segments of play", all.segments);
    facts.row("Overloads", all.overloads);
    facts.row("Overloads an hour of play", rate ? rateText(rate->value) : "-");
    facts.row("95% interval", intervalText(rate));
  }
  markup.close();
}

void writeAccount(Markup& markup, const FleetPicture& picture) {
  const FleetAccount& account = picture.account;
  markup.line().open("section", {{"id", "account"}}).element("h2", {}, "The account");
  markup.line().element("p", {},
                        "What became of every record that the devices told of, of all time: it is stored here, stayed "
                        "on its device, or was gone before it could leave; else it is missing.");
  {
    FactTable facts(markup, picture.isExact ? "Records, made of the events" : "Records, by the collectors' counts");
    facts.row("Devices", account.devices);
    facts.row("Made", account.made);
    facts.row("Stored", account.stored);
    facts.row("Gone before they could leave", account.gaps);
    facts.row("Left out on the device", account.leftOut);
    facts.row("Missing", account.missing);
    facts.row("Not told of yet", account.untold);
    facts.row("Messages refused", account.refused);
  }
  if (account.surplus > 0) {
    markup.line().element("p", {{"class", "quiet"}},
                          numberText(account.surplus) +
                              (picture.isExact ? " records are of stores that another one replaced."
                                               : " ids seem to be more than one thing, as where a device's store was "
                                                 "replaced; --exact makes the account of the events themselves."));
  }
  markup.close();
}

void writeWorst(Markup& markup, const std::vector<Played>& all, const char* id, const std::string& what,
                const char* heading) {
  const std::vector<Rated> worst = worstOf(all, kWorst);
  const std::string name = "The worst " + what;
  markup.line().element("h3", {}, name);
  if (worst.empty()) {
    markup.line().element("p", {}, "Nothing was played.");
    return;
  }
  std::vector<Bar> bars;
  for (const Rated& rated : worst) {
    bars.push_back({nameText(rated.played.name), rated.rate ? rated.rate->value : 0,
                    rated.rate ? rateText(rated.rate->value) + " (" + intervalText(rated.rate) + ")" : "no play",
                    "overload"});
  }
  drawBars(markup,
           {id, name,
            "Overloads an hour of play, at most ten of " + std::to_string(all.size()) + " " + what +
                ": first what is at least so bad, as far as so much play tells."},
           bars);
  Table table(markup, name, {heading, "Play, h", "Segments", "Overloads", "Overloads an hour", "95% interval"});
  for (const Rated& rated : worst) {
    table.row({nameText(rated.played.name), rated.played.seconds / kHour, rated.played.segments, rated.played.overloads,
               Cell(rated.rate ? rateText(rated.rate->value) : "-"), Cell(intervalText(rated.rate))});
  }
}

// Hours that are drawn as one.
struct Stretch {
  double begin = 0;
  double length = kHour;
  Played played;
};

// The shortest that leaves no more columns than a picture has room for.
double stretchLength(const std::vector<PlayedHour>& hours) {
  const double whole = hours.back().begin + kHour - hours.front().begin;
  for (const double length : {kHour, 3 * kHour, 6 * kHour, 12 * kHour, kDay, 2 * kDay, 7 * kDay, 28 * kDay}) {
    // One more, since they begin at round times.
    if (whole / length + 1 <= static_cast<double>(kMostColumns)) return length;
  }
  return std::ceil(whole / kDay / static_cast<double>(kMostColumns - 1)) * kDay;
}

std::vector<Stretch> stretchesOf(const std::vector<PlayedHour>& hours) {
  std::vector<Stretch> stretches;
  if (hours.empty()) return stretches;
  const double length = stretchLength(hours);
  const double begin = std::floor(hours.front().begin / length) * length;
  for (double at = begin; at <= hours.back().begin; at += length) {
    stretches.push_back({at, length, {}});
  }
  for (const PlayedHour& hour : hours) {
    Played& played = stretches.at(static_cast<std::size_t>((hour.begin - begin) / length)).played;
    played.seconds += hour.seconds;
    played.overloads += hour.overloads;
  }
  return stretches;
}

// "3 h", "7 d"
std::string lengthText(double length) {
  return length < kDay ? numberText(length / kHour) + " h" : numberText(length / kDay) + " d";
}

std::string beginText(const Stretch& stretch) {
  return stretch.length < kDay ? report::timeText(stretch.begin).substr(0, 16) : report::dayText(stretch.begin);
}

double rateIn(const Stretch& stretch) {
  const auto rate = rateOf(stretch.played);
  return rate ? rate->value : 0;
}

void writeTime(Markup& markup, const FleetPicture& picture) {
  const std::vector<Stretch> stretches = stretchesOf(picture.played.hours);
  std::vector<Bar> play;
  std::vector<Bar> overloads;
  for (const Stretch& stretch : stretches) {
    play.push_back({beginText(stretch), stretch.played.seconds / kHour, {}, "output"});
    overloads.push_back({beginText(stretch), rateIn(stretch), {}, "overload"});
  }
  markup.line().open("section", {{"id", "time"}}).element("h2", {}, "Over time");
  if (stretches.empty()) {
    markup.line().element("p", {}, "Nothing was played.").close();
    return;
  }
  const std::string each = lengthText(stretches.front().length);
  markup.line().element("h3", {}, "Play");
  drawColumns(markup, {"play", "Play", "A column for each " + each + ": the hours played by all devices."}, play,
              "hours of play");
  markup.line().element("h3", {}, "Overloads an hour of play");
  drawColumns(markup, {"rate", "Overloads an hour of play", "A column for each " + each + ", of all devices."},
              overloads, "overloads an hour");
  markup.line().open("details").element("summary", {}, "Numbers over time");
  {
    Table table(markup, "Each " + each, {"From (UTC)", "Play, h", "Overloads", "Overloads an hour", "95% interval"});
    for (const Stretch& stretch : stretches) {
      const auto rate = rateOf(stretch.played);
      table.row({beginText(stretch), stretch.played.seconds / kHour, stretch.played.overloads,
                 Cell(rate ? rateText(rate->value) : "-"), Cell(intervalText(rate))});
    }
  }
  markup.close().close();
}

std::string tenthText(std::size_t tenth) {
  return numberText(static_cast<double>(tenth) / 10) + " to " + numberText(static_cast<double>(tenth + 1) / 10);
}

void writeVolumes(Markup& markup, const FleetPicture& picture) {
  double total = 0;
  std::vector<Bar> columns;
  for (std::size_t tenth = 0; tenth < kVolumeTenths; ++tenth) {
    total += picture.volumes.at(tenth);
    columns.push_back({tenthText(tenth), picture.volumes.at(tenth) / kHour, {}, "output"});
  }
  markup.line().open("section", {{"id", "volume"}}).element("h2", {}, "Volume");
  drawColumns(markup, {"volumes", "Volume", "Hours of play by tenths of the volume, of all devices."}, columns,
              "hours of play");
  {
    Table table(markup, "Volume", {"Volume", "Play, h", "Share, %"});
    for (std::size_t tenth = 0; tenth < kVolumeTenths; ++tenth) {
      const double seconds = picture.volumes.at(tenth);
      table.row({tenthText(tenth), seconds / kHour, total > 0 ? seconds / total * 100 : 0.0});
    }
  }
  markup.close();
}

// The first ones, and one that is all the others.
std::vector<std::pair<std::string, std::int64_t>> shownIssues(const FleetPicture& picture) {
  auto shown = picture.issues;
  if (shown.size() <= kMostIssues) return shown;
  std::pair<std::string, std::int64_t> rest{std::to_string(shown.size() - kMostIssues) + " others", 0};
  for (std::size_t i = kMostIssues; i < shown.size(); ++i) {
    rest.second += shown[i].second;
  }
  shown.resize(kMostIssues);
  shown.push_back(rest);
  return shown;
}

void writeIssues(Markup& markup, const FleetPicture& picture) {
  const auto issues = shownIssues(picture);
  markup.line().open("section", {{"id", "issues"}}).element("h2", {}, "Issues by type");
  if (issues.empty()) {
    markup.line().element("p", {}, "No device told of any.").close();
    return;
  }
  std::vector<Bar> bars;
  for (const auto& [type, count] : issues) {
    bars.push_back({nameText(type), static_cast<double>(count), numberText(count), "issue"});
  }
  drawBars(markup, {"issue-types", "Issues by type", "How often detectors and programs told of each."}, bars);
  {
    Table table(markup, "Issues by type", {"Type", "Issues"});
    for (const auto& [type, count] : issues) {
      table.row({nameText(type), count});
    }
  }
  markup.close();
}

}  // namespace

std::string fleetPage(const FleetPicture& picture) {
  Markup markup;
  report::openPage(markup, "Audio on many devices: report");
  markup.line().element("p", {},
                        "Made at " + report::preciseTimeText(picture.made) + ", " + spanText(picture.span) +
                            ". All times are UTC. An hour that only a part of lies in the time counts whole.");
  writeTotals(markup, picture);
  markup.line().open("section", {{"id", "worst"}}).element("h2", {}, "Where overloads come most often");
  writeWorst(markup, picture.played.routes, "routes", "routes", "Route");
  writeWorst(markup, picture.played.releases, "releases", "releases", "Release");
  writeWorst(markup, picture.played.applications, "applications", "applications", "Application");
  markup.close();
  writeTime(markup, picture);
  writeVolumes(markup, picture);
  writeIssues(markup, picture);
  writeAccount(markup, picture);
  report::closePage(markup);
  return markup.written();
}

}  // namespace tarn::fleet
