// SPDX-License-Identifier: Apache-2.0
#include "tools/report/Page.h"

#include <set>

#include "tools/report/Markup.h"
#include "tools/report/PageFrame.h"
#include "tools/report/RangeSection.h"
#include "tools/report/SessionSection.h"
#include "tools/report/Table.h"
#include "tools/report/Texts.h"

namespace tarn::report {

namespace {

constexpr std::size_t kNameCharacters = 60;
constexpr std::size_t kPageEnd = 4096;  // headings between the parts, and what ends the page

std::string nameText(const std::string& name) {
  return name.empty() ? "unknown" : shortened(name, kNameCharacters);
}

void writeIntroduction(Markup& markup, const Report& report) {
  std::string text = "Made at " + preciseTimeText(report.made) + ". All times are UTC.";
  if (report.range) {
    text += " From " + timeText(report.range->from) + " to " + timeText(report.range->to) + ": " +
            std::to_string(report.range->sessions.size()) +
            (report.range->sessions.size() == 1 ? " session." : " sessions.");
  }
  markup.line().element("p", {}, text);
}

// Sections that are in the page, and whose.
struct Sections {
  std::string markup;
  std::set<std::int64_t> ids;
};

// As many as there is room for; all of them without a bound.
Sections sectionsWithin(const std::vector<SessionPicture>& sessions, std::optional<std::size_t> room) {
  Sections sections;
  for (const SessionPicture& picture : sessions) {
    if (sections.ids.contains(picture.session.id)) continue;
    Markup section;
    writeSession(section, picture);
    if (room && sections.markup.size() + section.size() > *room) continue;
    sections.markup += section.written();
    sections.ids.insert(picture.session.id);
  }
  return sections;
}

std::vector<Cell> rowOf(const SessionFigures& figures) {
  const SessionRow& session = figures.session;
  return {numberText(session.id),
          timeText(session.created),
          nameText(session.application),
          nameText(session.serviceName),
          nameText(session.process) + " " + std::to_string(session.pid),
          figures.activeSeconds,
          figures.messages,
          figures.redundant,
          figures.overloads,
          figures.errors,
          figures.issues,
          session.ended ? nameText(session.endReason) : "open"};
}

// Those that have a section are linked to it.
std::string tableOf(const RangePicture& range, const std::set<std::int64_t>& linked) {
  Markup markup;
  markup.line().open("section", {{"id", "all"}}).element("h2", {}, "All sessions");
  std::size_t shown = 0;
  {
    Table table(markup, "All sessions, the newest first",
                {"Session", "Created", "Application", "Type", "Client", "Active, s", "Messages", "Repeated",
                 "Overloads", "Errors", "Issues", "Ended"});
    for (const SessionFigures& figures : range.sessions) {
      if (markup.size() > kMostTableBytes) break;
      const std::int64_t id = figures.session.id;
      table.row(rowOf(figures), linked.contains(id) ? "#" + sectionId(id) : std::string());
      ++shown;
    }
  }
  if (shown < range.sessions.size()) {
    markup.line().element("p", {{"class", "quiet"}},
                          "The page has room for " + std::to_string(shown) + " of " +
                              std::to_string(range.sessions.size()) + " sessions here; the overview has all of them.");
  }
  markup.close();
  return markup.written();
}

std::string overviewOf(const RangePicture& range, const std::set<std::int64_t>& linked) {
  Markup markup;
  writeRange(markup, range, linked);
  return markup.written();
}

void writeSections(Markup& markup, const Sections& sections) {
  if (sections.ids.empty()) return;
  markup.line().element("h2", {}, "Sessions one by one").literal(sections.markup);
}

// Overview and table are the longest when every session is linked, so that much is kept for them.
void writeWithRange(Markup& markup, const Report& report) {
  std::set<std::int64_t> all;
  for (const SessionPicture& picture : report.sessions) {
    all.insert(picture.session.id);
  }
  const std::size_t taken =
      markup.size() + overviewOf(*report.range, all).size() + tableOf(*report.range, all).size() + kPageEnd;
  const std::size_t room = taken < kMostBytes ? kMostBytes - taken : 0;
  const Sections sections =
      sectionsWithin(report.sessions, report.isComplete ? std::nullopt : std::optional<std::size_t>(room));
  markup.literal(overviewOf(*report.range, sections.ids));
  writeSections(markup, sections);
  markup.literal(tableOf(*report.range, sections.ids));
}

}  // namespace

std::string page(const Report& report) {
  Markup markup;
  openPage(markup, "Audio sessions: report");
  writeIntroduction(markup, report);
  if (report.range) {
    writeWithRange(markup, report);
  } else {
    writeSections(markup, sectionsWithin(report.sessions, std::nullopt));
  }
  closePage(markup);
  return markup.written();
}

}  // namespace tarn::report
