// SPDX-License-Identifier: Apache-2.0
#include "recorder/store/GlobPattern.h"

#include <gtest/gtest.h>

#include <string>

namespace tarn::recorder {
namespace {

TEST(GlobPattern, TextMatchesOnlyItself) {
  EXPECT_TRUE(globMatches("sys.oxbow", "sys.oxbow"));
  EXPECT_FALSE(globMatches("sys.oxbow", "sys.oxbow."));
  EXPECT_FALSE(globMatches("sys.oxbow", "sys.oxbo"));
  EXPECT_FALSE(globMatches("sys.oxbow", "Sys.oxbow"));
}

TEST(GlobPattern, StarTakesAnyCharactersNoneToo) {
  EXPECT_TRUE(globMatches("*", ""));
  EXPECT_TRUE(globMatches("*", "sys.oxbow/x"));
  EXPECT_TRUE(globMatches("sys.*.Start", "sys.oxbow.tarnkit.Playback.Start"));
  EXPECT_FALSE(globMatches("sys.*.Start", "sys.oxbow.tarnkit.Playback.Stop"));
  EXPECT_TRUE(globMatches("*a*b*", "xxaxxabxx"));
  EXPECT_FALSE(globMatches("*a*b", "xxaxxabx"));
}

TEST(GlobPattern, EmptyPatternMatchesOnlyTheEmptyName) {
  EXPECT_TRUE(globMatches("", ""));
  EXPECT_FALSE(globMatches("", "a"));
}

TEST(GlobPattern, QuestionMarkTakesOneWholeCharacter) {
  EXPECT_TRUE(globMatches("a?c", "abc"));
  EXPECT_TRUE(globMatches("a?c", "a\u00e9c"));
  EXPECT_TRUE(globMatches("a?c", "a\U0001F600c"));
  EXPECT_FALSE(globMatches("a?c", "ac"));
  EXPECT_FALSE(globMatches("a?c", "abbc"));
}

TEST(GlobPattern, SetTakesOneOfItsCharacters) {
  EXPECT_TRUE(globMatches("[abc]x", "bx"));
  EXPECT_TRUE(globMatches("[a-c0-9]x", "7x"));
  EXPECT_FALSE(globMatches("[a-c]x", "dx"));
  EXPECT_TRUE(globMatches("[!a-c]x", "dx"));
  EXPECT_TRUE(globMatches("[^a-c]x", "dx"));
  EXPECT_FALSE(globMatches("[!a-c]x", "bx"));
  EXPECT_TRUE(globMatches("[]x]", "]"));
  EXPECT_TRUE(globMatches("[a-]", "-"));
  EXPECT_TRUE(globMatches("[\u00e0-\u00ef]", "\u00e9"));
}

TEST(GlobPattern, UnclosedSetStandsForItsCharacters) {
  EXPECT_TRUE(globMatches("a[bc", "a[bc"));
  EXPECT_FALSE(globMatches("a[bc", "ab"));
  EXPECT_TRUE(globMatches("[", "["));
}

TEST(GlobPattern, BackslashTakesTheMeaningAway) {
  EXPECT_TRUE(globMatches("a\\*", "a*"));
  EXPECT_FALSE(globMatches("a\\*", "ab"));
  EXPECT_TRUE(globMatches("a\\", "a\\"));
}

TEST(GlobPattern, OddBytesAreCharactersOfTheirOwn) {
  using namespace std::string_literals;
  EXPECT_TRUE(globMatches("a?c"s, "a\xff"s + "c"));
  EXPECT_TRUE(globMatches("a?c"s, "a\0c"s));
  EXPECT_TRUE(globMatches("a*"s, "a\xe2\x82"s));
  EXPECT_FALSE(globMatches("a"s, "a\0"s));
}

TEST(GlobPattern, ManyStarsAgainstALongNameEndQuickly) {
  std::string pattern;
  for (int i = 0; i < 50; ++i) {
    pattern += "*a";
  }
  EXPECT_FALSE(globMatches(pattern + "b", std::string(20'000, 'a')));
}

}  // namespace
}  // namespace tarn::recorder
