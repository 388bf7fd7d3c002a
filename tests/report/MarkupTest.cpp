// SPDX-License-Identifier: Apache-2.0
#include "tools/report/Markup.h"

#include <gtest/gtest.h>

namespace tarn::report {
namespace {

std::string escaped(std::string_view text) {
  std::string out;
  appendEscaped(out, text);
  return out;
}

TEST(ReportMarkup, ElementsNestAndAttributesAreQuoted) {
  Markup markup;
  markup.open("p", {{"class", "note"}}).text("one").element("b", {}, "two").close();
  EXPECT_EQ(markup.written(), "<p class=\"note\">one<b>two</b></p>");
  EXPECT_EQ(markup.depth(), 0U);
}

TEST(ReportMarkup, ElementWithoutTextStillHasItsEnd) {
  Markup markup;
  markup.element("td", {}, "").empty("rect", {{"x", "1"}});
  EXPECT_EQ(markup.written(), "<td></td><rect x=\"1\"/>");
}

TEST(ReportMarkup, WhatWouldBeMarkupIsEscapedInTextsAndAttributes) {
  Markup markup;
  markup.element("a", {{"href", "\"><script>"}}, "<script>alert('x' & \"y\")</script>");
  EXPECT_EQ(markup.written(),
            "<a href=\"&quot;&gt;&lt;script&gt;\">&lt;script&gt;alert('x' &amp; &quot;y&quot;)&lt;/script&gt;</a>");
}

TEST(ReportMarkup, WhatNobodySeesIsWrittenOut) {
  EXPECT_EQ(escaped(std::string_view("a\0b", 3)), "a\\u0000b");
  EXPECT_EQ(escaped("a\nb\tc\x1b"), "a\\u000ab\\u0009c\\u001b");
  EXPECT_EQ(escaped("\u202egnp"), "\\u202egnp");
}

TEST(ReportMarkup, BytesThatAreNoTextAreWrittenOut) {
  EXPECT_EQ(escaped("\xff<"), "\\u00ff&lt;");
}

TEST(ReportMarkup, CharactersThatStandForNothingAreWrittenOut) {
  EXPECT_EQ(escaped("\uffff"), "\\uffff");
  EXPECT_EQ(escaped("\ufdd0"), "\\ufdd0");
  EXPECT_EQ(escaped("\U0001fffe"), "\\u1fffe");
  EXPECT_EQ(escaped("\xed\xa0\x80"), "\\ud800");  // a surrogate
}

TEST(ReportMarkup, OtherCharactersStayAsTheyAre) {
  EXPECT_EQ(escaped("Stra\u00dfe \U0001f3b5"), "Stra\u00dfe \U0001f3b5");
}

}  // namespace
}  // namespace tarn::report
