// SPDX-License-Identifier: Apache-2.0
#include "tools/ctl/EventText.h"

#include <gtest/gtest.h>

#include "tools/ctl/terminal/Output.h"

namespace tarn::ctl {
namespace {

recorder::EventRow row() {
  return {42, 1795158000.125, "tally", "sys.oxbow.tarnkit.Volume.Summary", R"({"a":1})", "{}"};
}

TEST(EventText, JsonHoldsTheSixMembersInTheirOrder) {
  EXPECT_EQ(eventJson(row(), false),
            R"({"id":42,"time":1795158000.125,"backend":"tally","name":"sys.oxbow.tarnkit.Volume.Summary",)"
            R"("payload":{"a":1},"detail":{}})");
}

TEST(EventText, JsonTellsTheSessionWhereThereAreSessions) {
  recorder::EventRow event = row();
  EXPECT_TRUE(eventJson(event, true).ends_with(R"("detail":{},"session":null})"));
  event.session = 12;
  EXPECT_TRUE(eventJson(event, true).ends_with(R"("detail":{},"session":12})"));
}

TEST(EventText, JsonEscapesNames) {
  recorder::EventRow odd = row();
  odd.name = "a\"b\n";
  EXPECT_NE(eventJson(odd, false).find(R"("name":"a\"b\n")"), std::string::npos);
}

TEST(EventText, LineStartsEachColumnBelowItsHeading) {
  const std::string line = eventLine(row());
  const std::string heading = eventHeading();
  EXPECT_EQ(line.find("2026-11-20T07:00:00.125Z"), heading.find("TIME"));
  EXPECT_EQ(line.find("tally"), heading.find("BACKEND"));
  EXPECT_EQ(line.find("sys.oxbow"), heading.find("NAME"));
  EXPECT_EQ(line.find("{\"a\""), heading.find("PAYLOAD"));
}

TEST(EventText, LineLeavesAnEmptyDetailOutAndShowsAnother) {
  recorder::EventRow event = row();
  EXPECT_EQ(eventLine(event).find("{}"), std::string::npos);
  event.detail = R"({"agent":28})";
  EXPECT_TRUE(eventLine(event).ends_with(R"({"a":1}  {"agent":28})"));
}

TEST(EventText, LineKeepsNamesThatAreLongerThanTheirColumn) {
  recorder::EventRow event = row();
  event.name = std::string(80, 'n');
  EXPECT_NE(eventLine(event).find(event.name + "  {"), std::string::npos);
}

TEST(EventText, LineShowsWhatATerminalWouldObey) {
  recorder::EventRow event = row();
  event.name = "a\x1b[2J";
  EXPECT_NE(eventLine(event).find("a\\u001b[2J"), std::string::npos);
}

TEST(Output, PrintableLeavesTextAboveAsciiAlone) {
  EXPECT_EQ(printable("gr\xc3\xbc\xc3\x9f"), "gr\xc3\xbc\xc3\x9f");
}

}  // namespace
}  // namespace tarn::ctl
