// SPDX-License-Identifier: Apache-2.0
#include "tools/report/Page.h"

#include <gtest/gtest.h>

#include <set>
#include <string>

#include "tests/report/Rows.h"

namespace tarn::report {
namespace {

std::size_t countOf(const std::string& text, const std::string& part) {
  std::size_t count = 0;
  for (std::size_t at = text.find(part); at != std::string::npos; at = text.find(part, at + 1)) {
    ++count;
  }
  return count;
}

// What stands between this and the next quote, wherever it stands.
std::set<std::string> idsAfter(const std::string& text, const std::string& part) {
  std::set<std::string> ids;
  for (std::size_t at = text.find(part); at != std::string::npos; at = text.find(part, at + 1)) {
    const std::size_t begin = at + part.size();
    ids.insert(text.substr(begin, text.find('"', begin) - begin));
  }
  return ids;
}

// A session of which there is as much of everything as can be, and more than has room.
SessionPicture busySession(std::int64_t id) {
  SessionPicture picture;
  picture.session = sessionRow(id, 0, 100'000);
  picture.session.application = std::string(5000, '"');
  picture.from = picture.session.created;
  picture.to = *picture.session.ended;
  for (int index = 0; index < 3000; ++index) {
    const double at = kStart + index * 30;
    const Span span{at, at + 20, std::string(500, '<')};
    for (auto* spans : {&picture.running, &picture.output, &picture.input, &picture.routes, &picture.groups}) {
      spans->push_back(span);
    }
    for (auto* marks : {&picture.overloads, &picture.errors, &picture.issues}) {
      marks->push_back({at, std::string(500, '&'), 1});
    }
    picture.volume.push_back({at, index % 100 / 100.0});
    picture.segments.push_back({Segment::Kind::Output, 20, 0.5, std::string(500, '"'), "aac"});
    picture.counters.push_back({at, std::string(500, '<'), std::string(500, '&')});
  }
  return picture;
}

// A range of so many sessions, all of names that take much room.
RangePicture rangeOf(std::int64_t count, const std::string& name) {
  RangeBuilder builder({}, kStart + 1e6);
  for (std::int64_t id = 1; id <= count; ++id) {
    SessionRow session = sessionRow(id, static_cast<double>(id), static_cast<double>(id + 50));
    session.application = name + std::to_string(id % 37);
    session.process = name;
    builder.add(session);
    builder.add(periodRow(id, static_cast<double>(id), static_cast<double>(id + 50), 1000, 10));
    builder.add(messageRow(id, static_cast<double>(id), "IO.Error", R"("issue_type":"overload")"));
  }
  return builder.picture();
}

TEST(ReportPage, SessionHasItsFactsItsTimelineAndItsSegments) {
  Report report;
  report.sessions.push_back(
      OneSession()
          .message(20, "Playback.Start", R"("session_output_running":true)")
          .message(90, "Volume.Summary", R"("msgidx":1,"msgcnt":1,"play_seconds":20,"KvSessionVolume":0.5)")
          .picture());
  const std::string html = page(report);
  EXPECT_NE(html.find("<section id=\"session-1\"><h3>Session 1: org.example.player, longformaudio</h3>"),
            std::string::npos);
  EXPECT_EQ(countOf(html, "<svg "), 2U);
  EXPECT_EQ(countOf(html, "<figure id=\"session-1-timeline\">"), 1U);
  EXPECT_EQ(countOf(html, "<figure id=\"session-1-segments\">"), 1U);
  EXPECT_EQ(countOf(html, "</html>"), 1U);
}

TEST(ReportPage, NothingIsFetchedAndNothingRuns) {
  Report report;
  report.range = rangeOf(3, "x");
  report.sessions.push_back(busySession(1));
  const std::string html = page(report);
  EXPECT_EQ(countOf(html, "<script"), 0U);
  EXPECT_EQ(countOf(html, " src="), 0U);
  EXPECT_EQ(countOf(html, "<link"), 0U);
  EXPECT_EQ(countOf(html, "url("), 0U);
  EXPECT_EQ(countOf(html, "http"), countOf(html, "http-equiv") + countOf(html, "http://www.w3.org/"));
}

TEST(ReportPage, TextsOfClientsAreEscaped) {
  Report report;
  OneSession rows;
  rows.session.application = "<script>alert(1)</script>";
  rows.session.process = "\"&'";
  report.sessions.push_back(rows.message(20, "Error.Error", R"("issue_type":"</svg><b>")").picture());
  const std::string html = page(report);
  EXPECT_EQ(countOf(html, "<script"), 0U);
  EXPECT_EQ(countOf(html, "<b>"), 0U);
  EXPECT_NE(html.find("&lt;/svg&gt;&lt;b&gt;"), std::string::npos);
}

TEST(ReportPage, SectionOfTheBusiestSessionIsBounded) {
  Report report;
  report.isComplete = true;
  report.sessions.push_back(busySession(1));
  const std::string html = page(report);
  EXPECT_LT(html.size(), 400'000U);  // of texts that escape to six bytes a character
  EXPECT_NE(html.find("There is more than can be shown"), std::string::npos);
  EXPECT_NE(html.find("of 3000 counters"), std::string::npos);
}

TEST(ReportPage, PageOverARangeStaysWithinItsBound) {
  for (const char* const name :
       {"org.example.player", "\"\"\"\"\"\"\"\"\"\"\"\"\"\"\"\"\"\"\"\"\"\"\"\"\"\"\"\"\"\""}) {
    Report report;
    report.range = rangeOf(1000, name);
    for (std::int64_t id = 1; id <= 40; ++id) {
      report.sessions.push_back(busySession(id));
    }
    EXPECT_LE(page(report).size(), kMostBytes) << name;
  }
}

TEST(ReportPage, ThousandOrdinarySessionsHaveARowEach) {
  Report report;
  report.range = rangeOf(1000, "org.example.player");
  const std::string html = page(report);
  EXPECT_EQ(html.find("The page has room for"), std::string::npos);
  EXPECT_EQ(countOf(html, "player 4711</td>"), 1000U);
}

TEST(ReportPage, RowsBeyondTheirShareAreCounted) {
  Report report;
  report.range = rangeOf(5000, "org.example.player");
  const std::string html = page(report);
  EXPECT_LE(html.size(), kMostBytes);
  EXPECT_NE(html.find(" of 5000 sessions here; the overview has all of them."), std::string::npos);
}

TEST(ReportPage, NoLinkLeadsToASectionThatHasNoRoom) {
  Report report;
  report.range = rangeOf(1000, "org.example.player");
  for (std::int64_t id = 1; id <= 40; ++id) {
    report.sessions.push_back(busySession(id));
  }
  const std::string html = page(report);
  const std::set<std::string> sections = idsAfter(html, "<section id=\"session-");
  EXPECT_GT(sections.size(), 1U);
  EXPECT_LT(sections.size(), 40U);
  EXPECT_EQ(idsAfter(html, "href=\"#session-"), sections);
}

TEST(ReportPage, NamedSessionsAreAllThere) {
  Report report;
  report.range = rangeOf(1000, "org.example.player");
  report.isComplete = true;
  for (std::int64_t id = 1; id <= 40; ++id) {
    report.sessions.push_back(busySession(id));
  }
  EXPECT_EQ(countOf(page(report), "<section id=\"session-"), 40U);
}

TEST(ReportPage, EmptyRangeIsAPageToo) {
  Report report;
  report.range = rangeOf(0, "");
  const std::string html = page(report);
  EXPECT_NE(html.find("0 sessions."), std::string::npos);
  EXPECT_NE(html.find("No session had an overload or an error."), std::string::npos);
}

}  // namespace
}  // namespace tarn::report
