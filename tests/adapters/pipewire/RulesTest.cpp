// SPDX-License-Identifier: Apache-2.0
#include "adapters/pipewire/core/Rules.h"

#include <gtest/gtest.h>

namespace tarn::streams {

TEST(PipeWireRules, APatternIsATextWithStarsAndQuestionMarks) {
  EXPECT_TRUE(matchesGlob("firefox", "firefox"));
  EXPECT_FALSE(matchesGlob("firefox", "firefox-esr"));
  EXPECT_FALSE(matchesGlob("firefox", "Firefox"));
  EXPECT_TRUE(matchesGlob("firefox*", "firefox"));
  EXPECT_TRUE(matchesGlob("*fox", "firefox"));
  EXPECT_TRUE(matchesGlob("org.*.Player", "org.a.b.Player"));
  EXPECT_FALSE(matchesGlob("org.*.Player", "org.Player"));
  EXPECT_TRUE(matchesGlob("m?v", "mpv"));
  EXPECT_FALSE(matchesGlob("m?v", "mv"));
  EXPECT_TRUE(matchesGlob("*", ""));
  EXPECT_TRUE(matchesGlob("", ""));
  EXPECT_FALSE(matchesGlob("", "a"));
  EXPECT_TRUE(matchesGlob("*a*b*", "xxaxxabxx"));
  EXPECT_FALSE(matchesGlob("*a*b", "xxaxxbx"));
  EXPECT_FALSE(matchesGlob("a?", "a"));
}

TEST(PipeWireRules, AManyStarredPatternIsQuick) {
  EXPECT_FALSE(matchesGlob("*a*a*a*a*a*a*a*a*a*a*b", std::string(2000, 'a')));
}

TEST(PipeWireRules, RolesHaveTheirTypes) {
  const Rules rules;
  const auto nameOf = [&rules](std::string_view role) { return serviceTypeName(rules.serviceTypeOf(role, "")); };
  EXPECT_EQ(nameOf("Music"), "longformaudio");
  EXPECT_EQ(nameOf("Movie"), "longformaudio");
  EXPECT_EQ(nameOf("Game"), "nonlongformaudio");
  EXPECT_EQ(nameOf("Communication"), "telephony");
  EXPECT_EQ(nameOf("Notification"), "alerts");
  EXPECT_EQ(nameOf("Accessibility"), "systemsounds");
  EXPECT_EQ(nameOf("Production"), "standalone");
  EXPECT_EQ(nameOf("Test"), "test");
  EXPECT_EQ(nameOf(""), "generic");
  EXPECT_EQ(nameOf("music"), "generic");
}

TEST(PipeWireRules, ServiceTypesHaveNamesBothWays) {
  for (std::uint16_t number = 0; number <= 13; ++number) {
    EXPECT_EQ(serviceTypeNamed(serviceTypeName(number)), number);
  }
  EXPECT_EQ(serviceTypeNamed("unknown"), std::nullopt);
  EXPECT_EQ(serviceTypeNamed(""), std::nullopt);
  EXPECT_EQ(serviceTypeName(14), "unknown");
}

TEST(PipeWireRules, DenyGoesBeforeAllowAndOffBeforeBoth) {
  Rules rules;
  EXPECT_TRUE(rules.mayReport("oxplay"));
  rules.allow = {"ox*", "mpv"};
  EXPECT_TRUE(rules.mayReport("mpv"));
  EXPECT_FALSE(rules.mayReport("firefox"));
  rules.deny = {"oxrecord"};
  EXPECT_FALSE(rules.mayReport("oxrecord"));
  EXPECT_TRUE(rules.mayReport("oxplay"));
  rules.allow.clear();
  EXPECT_FALSE(rules.mayReport("oxplay"));
  rules = {};
  rules.off = true;
  EXPECT_FALSE(rules.mayReport("oxplay"));
}

}  // namespace tarn::streams
