// SPDX-License-Identifier: Apache-2.0
#include "tools/ctl/terminal/Terminal.h"

#include <gtest/gtest.h>

namespace tarn::ctl {
namespace {

TerminalFacts aTerminal() {
  TerminalFacts facts;
  facts.isTerminal = true;
  facts.columns = 120;
  facts.type = "xterm";
  return facts;
}

TEST(Terminal, HasColoursWhenItIsOneAndNobodyObjects) {
  EXPECT_TRUE(terminalOf(aTerminal(), ColorChoice::Auto, false).color);
  TerminalFacts facts = aTerminal();
  facts.noColor = "1";
  EXPECT_FALSE(terminalOf(facts, ColorChoice::Auto, false).color);
  facts = aTerminal();
  facts.type = "dumb";
  EXPECT_FALSE(terminalOf(facts, ColorChoice::Auto, false).color);
  EXPECT_FALSE(terminalOf({}, ColorChoice::Auto, false).color);
}

TEST(Terminal, AChoiceGoesBeforeWhatIsThere) {
  EXPECT_FALSE(terminalOf(aTerminal(), ColorChoice::Never, false).color);
  TerminalFacts facts;
  facts.noColor = "1";
  EXPECT_TRUE(terminalOf(facts, ColorChoice::Always, false).color);
}

TEST(Terminal, IsAsWideAsColumnsSaysElseAsItIs) {
  TerminalFacts facts = aTerminal();
  EXPECT_EQ(terminalOf(facts, ColorChoice::Auto, false).width, 120);
  facts.columnsVariable = "60";
  EXPECT_EQ(terminalOf(facts, ColorChoice::Auto, false).width, 60);
  for (const char* wrong : {"0", "-5", "wide", "60x", ""}) {
    facts.columnsVariable = wrong;
    EXPECT_EQ(terminalOf(facts, ColorChoice::Auto, false).width, 120) << wrong;
  }
  EXPECT_FALSE(terminalOf({}, ColorChoice::Auto, false).width.has_value());
}

TEST(Terminal, TellsProgressWhereComplaintsAreOnATerminal) {
  TerminalFacts facts;
  facts.hasComplaintsOnTerminal = true;
  facts.type = "xterm";
  EXPECT_TRUE(terminalOf(facts, ColorChoice::Auto, false).progress.isTold);
  EXPECT_TRUE(terminalOf(facts, ColorChoice::Never, false).printingProgress.isTold);
  EXPECT_FALSE(terminalOf(facts, ColorChoice::Always, true).progress.isTold);
  EXPECT_FALSE(terminalOf(facts, ColorChoice::Always, true).printingProgress.isTold);
  EXPECT_FALSE(terminalOf(aTerminal(), ColorChoice::Auto, false).progress.isTold);
  facts.type = "dumb";
  EXPECT_FALSE(terminalOf(facts, ColorChoice::Auto, false).progress.isTold);
}

TEST(Terminal, TellsNoProgressBetweenResultsThatAreOnItToo) {
  TerminalFacts facts = aTerminal();
  facts.hasComplaintsOnTerminal = true;
  EXPECT_TRUE(terminalOf(facts, ColorChoice::Auto, false).progress.isTold);
  EXPECT_FALSE(terminalOf(facts, ColorChoice::Auto, false).printingProgress.isTold);
}

TEST(Terminal, PaintsOnlyWhereThereAreColours) {
  Terminal terminal;
  EXPECT_EQ(painted("text", Paint::Red, terminal), "text");
  terminal.color = true;
  EXPECT_EQ(painted("text", Paint::Red, terminal), "\x1b[31mtext\x1b[0m");
  EXPECT_EQ(painted("text", Paint::Plain, terminal), "text");
  EXPECT_EQ(painted("", Paint::Red, terminal), "");
}

TEST(Terminal, CountsCharactersAndCutsBetweenThem) {
  EXPECT_EQ(widthOf("gr\xc3\xbc\xc3\x9f"), 4U);
  EXPECT_EQ(fitted("gr\xc3\xbc\xc3\x9f", 4), "gr\xc3\xbc\xc3\x9f");
  EXPECT_EQ(fitted("gr\xc3\xbc\xc3\x9f"
                   "e",
                   4),
            "gr\xc3\xbc\xe2\x80\xa6");
  EXPECT_EQ(fitted("abc", 1), "\xe2\x80\xa6");
  EXPECT_EQ(fitted("abc", 0), "");
}

}  // namespace
}  // namespace tarn::ctl
