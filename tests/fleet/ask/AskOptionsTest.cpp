// SPDX-License-Identifier: Apache-2.0
#include "fleet/ask/AskOptions.h"

#include <gtest/gtest.h>

#include <vector>

namespace tarn::fleet {
namespace {

AskCommand parsed(std::vector<const char*> words) {
  words.insert(words.begin(), "tarnreporting-fleet");
  return parseAskCommand(static_cast<int>(words.size()), words.data());
}

TEST(FleetAskOptions, EachQuestionHasItsUsualValues) {
  const auto top = parsed({"top"});
  ASSERT_TRUE(top.options);
  EXPECT_EQ(top.options->question, Question::Top);
  EXPECT_EQ(top.options->database, "dbname=tarnreporting");
  EXPECT_EQ(top.options->color, "auto");
  EXPECT_FALSE(top.options->quiet);
  EXPECT_EQ(top.options->top.limit, 10U);
  EXPECT_EQ(top.options->top.by, "");
  EXPECT_FALSE(top.options->top.asJson);
  const auto sessions = parsed({"sessions"});
  ASSERT_TRUE(sessions.options);
  EXPECT_EQ(sessions.options->question, Question::Sessions);
  EXPECT_EQ(sessions.options->sessions.limit, 100U);
  EXPECT_FALSE(sessions.options->sessions.open || sessions.options->sessions.all || sessions.options->sessions.asJson);
  const auto report = parsed({"report"});
  ASSERT_TRUE(report.options);
  EXPECT_EQ(report.options->question, Question::Report);
  EXPECT_EQ(report.options->report.file, "");
  EXPECT_FALSE(report.options->report.exact);
}

TEST(FleetAskOptions, EachOptionIsTaken) {
  const auto top = parsed({"top", "--by", "release", "--limit", "3", "--json", "--since", "-1h", "--until", "today"});
  ASSERT_TRUE(top.options);
  EXPECT_EQ(top.options->top.by, "release");
  EXPECT_EQ(top.options->top.limit, 3U);
  EXPECT_TRUE(top.options->top.asJson);
  EXPECT_EQ(top.options->top.range.sinceText, "-1h");
  EXPECT_EQ(top.options->top.range.untilText, "today");
  const auto sessions = parsed({"sessions", "--device", "ab*", "--app", "org.*", "--release", "1.?", "--open", "--all",
                                "--json", "--limit", "7", "--since", "@5"});
  ASSERT_TRUE(sessions.options);
  const SessionsArguments& asked = sessions.options->sessions;
  EXPECT_EQ(asked.deviceGlob, "ab*");
  EXPECT_EQ(asked.applicationGlob, "org.*");
  EXPECT_EQ(asked.releaseGlob, "1.?");
  EXPECT_TRUE(asked.open && asked.all && asked.asJson);
  EXPECT_EQ(asked.limit, 7U);
  EXPECT_EQ(asked.range.sinceText, "@5");
  const auto report = parsed({"report", "-o", "page.html", "--exact", "--until", "@9"});
  ASSERT_TRUE(report.options);
  EXPECT_EQ(report.options->report.file, "page.html");
  EXPECT_TRUE(report.options->report.exact);
  EXPECT_EQ(report.options->report.range.untilText, "@9");
}

TEST(FleetAskOptions, CommonOptionsStandBeforeAndAfterTheQuestion) {
  for (const auto& words : {std::vector<const char*>{"--db", "dbname=x", "-q", "--color", "never", "top"},
                            std::vector<const char*>{"top", "--db", "dbname=x", "-q", "--color", "never"}}) {
    const auto command = parsed(words);
    ASSERT_TRUE(command.options) << command.usage.text();
    EXPECT_EQ(command.options->database, "dbname=x");
    EXPECT_TRUE(command.options->quiet);
    EXPECT_EQ(command.options->color, "never");
  }
}

TEST(FleetAskOptions, OfTwoColoursTheLastCounts) {
  EXPECT_EQ(parsed({"--color", "never", "top", "--color", "always"}).options->color, "always");
}

TEST(FleetAskOptions, WhatIsWrongIsOneLineThatNamesIt) {
  struct Wrong {
    std::vector<const char*> words;
    const char* named;
  };
  for (const Wrong& wrong : {Wrong{{}, "subcommand"}, Wrong{{"ask"}, "ask"}, Wrong{{"top", "--by", "device"}, "--by"},
                             Wrong{{"top", "--limit", "0"}, "--limit"}, Wrong{{"top", "--limit", "-1"}, "--limit"},
                             Wrong{{"top", "--limit", "many"}, "--limit"}, Wrong{{"sessions", "--exact"}, "--exact"},
                             Wrong{{"report", "--json"}, "--json"}, Wrong{{"--color", "red", "top"}, "--color"},
                             Wrong{{"top", "more"}, "more"}, Wrong{{"report", "-o"}, "-o"}}) {
    const auto command = parsed(wrong.words);
    EXPECT_FALSE(command.options);
    EXPECT_TRUE(command.output.empty());
    ASSERT_TRUE(command.usage.failed()) << wrong.named;
    EXPECT_NE(command.usage->text.find(wrong.named), std::string::npos) << command.usage->text;
    EXPECT_EQ(command.usage->text.find('\n'), std::string::npos) << command.usage->text;
    EXPECT_NE(command.usage->text.find("(--help tells more)"), std::string::npos);
  }
}

TEST(FleetAskOptions, HelpAndVersionAreForStdout) {
  const auto help = parsed({"--help"});
  EXPECT_FALSE(help.options || help.usage.failed());
  for (const char* const word : {"top", "sessions", "report", "--db"}) {
    EXPECT_NE(help.output.find(word), std::string::npos) << word;
  }
  const auto ofOne = parsed({"sessions", "--help"});
  EXPECT_FALSE(ofOne.options);
  EXPECT_NE(ofOne.output.find("--device"), std::string::npos);
  EXPECT_EQ(parsed({"--version"}).output.rfind("tarnreporting-fleet ", 0), 0U);
}

}  // namespace
}  // namespace tarn::fleet
