// SPDX-License-Identifier: Apache-2.0
#include "tools/ctl/terminal/TextTable.h"

#include <gtest/gtest.h>

#include "tests/ctl/OutputCapture.h"

namespace tarn::ctl {
namespace {

std::string printed(const TextTable& table, const Terminal& terminal, const std::string& indent = {}) {
  OutputCapture capture;
  table.print(capture.output(), terminal, indent);
  return capture.text();
}

class TextTableTest : public ::testing::Test {
 protected:
  TextTableTest() {
    table_.add({{"7"}, {"a name"}, {"end"}});
    table_.add({{"123"}, {"a much longer name"}, {"x"}});
  }
  TextTable table_{{{"N", true}, {"NAME", false, true}, {"LAST"}}};
};

TEST_F(TextTableTest, ColumnsAreAsWideAsWhatStandsInThem) {
  EXPECT_EQ(printed(table_, {}),
            "  N  NAME                LAST\n"
            "  7  a name              end\n"
            "123  a much longer name  x\n");
}

TEST_F(TextTableTest, QuietLeavesTheHeadingsOut) {
  Terminal quiet;
  quiet.quiet = true;
  EXPECT_EQ(printed(table_, quiet, "  "),
            "    7  a name              end\n"
            "  123  a much longer name  x\n");
}

TEST_F(TextTableTest, ANarrowTerminalShrinksWhatMayShrink) {
  Terminal narrow;
  narrow.width = 22;
  EXPECT_EQ(printed(table_, narrow),
            "  N  NAME         LAST\n"
            "  7  a name       end\n"
            "123  a much lon\xe2\x80\xa6  x\n");
  narrow.width = 5;  // no narrower than can be read
  EXPECT_NE(printed(table_, narrow).find("123  a much \xe2\x80\xa6  x\n"), std::string::npos)
      << printed(table_, narrow);
}

TEST_F(TextTableTest, PaintDoesNotChangeWhereColumnsStand) {
  TextTable table({{"A"}, {"B"}});
  table.add({{"x", Paint::Red}, {"y"}});
  Terminal colored;
  colored.color = true;
  EXPECT_EQ(printed(table, colored), "\x1b[1mA\x1b[0m  \x1b[1mB\x1b[0m\n\x1b[31mx\x1b[0m  y\n");
}

TEST_F(TextTableTest, WhatATerminalWouldObeyIsShown) {
  TextTable table({{"A"}});
  table.add({{"a\x1b[2J\n"}});
  EXPECT_EQ(printed(table, {}), "A\na\\u001b[2J\\u000a\n");
}

TEST_F(TextTableTest, WithoutRowsThereIsNothing) {
  EXPECT_EQ(printed(TextTable({{"A"}}), {}), "");
}

}  // namespace
}  // namespace tarn::ctl
