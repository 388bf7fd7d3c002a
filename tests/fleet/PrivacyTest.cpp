// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <string>

#include "fleet/privacy/FleetKey.h"
#include "fleet/privacy/JsonMembers.h"
#include "fleet/privacy/PrivacySieve.h"

namespace tarn::fleet {
namespace {

FleetKey someKey(char digit = '7') {
  Result<FleetKey> key = FleetKey::parse(std::string(64, digit));
  EXPECT_TRUE(key.ok());
  return key.value;
}

Rules rulesOf(std::vector<std::string> keys, std::vector<std::string> hashed) {
  Rules rules;
  rules.keys = std::move(keys);
  rules.hashed = std::move(hashed);
  return rules;
}

std::string sieved(PrivacySieve& sieve, const std::string& json) {
  std::string out = ">";
  return sieve.appendObject(out, json) ? out.substr(1) : "refused, " + out;
}

// "KEY=VALUE;" each, "failed" at the end of what isn't an object.
std::string membersOf(std::string_view json) {
  JsonMembers members(json);
  std::string all;
  while (members.next()) {
    all.append(members.key()).append("=").append(members.value()).append(";");
  }
  return members.failed() ? all + "failed" : all;
}

TEST(FleetKey, IsSixtyFourDigitsAndNothingElse) {
  EXPECT_TRUE(FleetKey::parse(std::string(64, 'a') + "\n").ok());
  EXPECT_TRUE(FleetKey::parse(std::string(63, 'a')).failed());
  EXPECT_TRUE(FleetKey::parse(std::string(66, 'a')).failed());
  EXPECT_TRUE(FleetKey::parse(std::string(64, 'g')).failed());
  EXPECT_TRUE(FleetKey::parse(std::string(64, 'a') + " x").failed());
  EXPECT_TRUE(FleetKey::parse("").failed());
}

TEST(FleetKey, ADeviceHasOneNameUnderOneKey) {
  const std::string device = someKey().deviceOf("machine");
  EXPECT_EQ(device.size(), 16U);
  EXPECT_EQ(device, someKey().deviceOf("machine"));
  EXPECT_NE(device, someKey().deviceOf("another"));
  EXPECT_NE(device, someKey('8').deviceOf("machine"));
}

TEST(FleetKey, HashesChangeWithTheEpochAndTheKey) {
  const std::string hash = someKey().hashOf(3, "org.example.music");
  EXPECT_EQ(hash.size(), 26U);
  EXPECT_EQ(hash.substr(0, 2), "3:");
  EXPECT_EQ(hash, someKey().hashOf(3, "org.example.music"));
  EXPECT_NE(hash.substr(2), someKey().hashOf(4, "org.example.music").substr(2));
  EXPECT_NE(hash, someKey('8').hashOf(3, "org.example.music"));
}

TEST(FleetKey, AnEpochBeginsWithItsDay) {
  EXPECT_EQ(epochAt(86400.0 * 7 - 1, 7), 0);
  EXPECT_EQ(epochAt(86400.0 * 7, 7), 1);
  EXPECT_EQ(epochAt(86400.0 * 70, 0), 0);
  EXPECT_EQ(epochAt(-1, 7), 0);
}

TEST(FleetKey, ASampleHasAboutItsShareAndAGreaterOneHasTheSameAndMore) {
  const FleetKey key = someKey();
  int tenth = 0;
  for (int i = 0; i < 10000; ++i) {
    const std::string session = std::to_string(i);
    const bool isIn = key.isInSample(0.1, session);
    tenth += isIn ? 1 : 0;
    EXPECT_TRUE(!isIn || key.isInSample(0.2, session));
    EXPECT_FALSE(key.isInSample(0, session));
    EXPECT_TRUE(key.isInSample(1, session));
  }
  EXPECT_GT(tenth, 850);
  EXPECT_LT(tenth, 1150);
}

TEST(JsonMembers, HandsOnValuesAsTheyStand) {
  EXPECT_EQ(membersOf("{}"), "");
  EXPECT_EQ(membersOf(R"({"a":1.50,"b":"x\"}","c":{"d":[1,{"e":"}"}]},"f":null,"g":true})"),
            R"(a=1.50;b="x\"}";c={"d":[1,{"e":"}"}]};f=null;g=true;)");
  EXPECT_EQ(membersOf(" { \"a\" : 1 , \"b\" : [ ] } "), "a=1;b=[ ];");
}

TEST(JsonMembers, WhatIsNoObjectFails) {
  for (const char* text : {"",
                           " ",
                           "1",
                           "[]",
                           "{",
                           "{\"a\"",
                           "{\"a\":",
                           "{\"a\":1",
                           "{\"a\":1,",
                           "{\"a\":1,}",
                           "{,}",
                           "{\"a\":}",
                           "{\"a\":x}",
                           "{\"a\":1}x",
                           "{\"a\":[}",
                           "{\"a\":[}]}",
                           "{\"a\":\"",
                           "{a:1}",
                           "{\"a\" 1}",
                           "{\"a\":1 \"b\":2}",
                           "{\"a\":\"\n\"}",
                           "{}{}"}) {
    const std::string all = membersOf(text);
    EXPECT_EQ(all.substr(all.size() < 6 ? 0 : all.size() - 6), "failed") << text;
  }
}

TEST(JsonMembers, DepthIsBounded) {
  const auto nested = [](std::size_t depth) {
    return "{\"a\":" + std::string(depth, '[') + std::string(depth, ']') + "}";
  };
  EXPECT_EQ(membersOf(nested(128)).find("failed"), std::string::npos);
  EXPECT_EQ(membersOf(nested(129)), "failed");
}

TEST(PrivacySieve, WhatNoPatternAllowsStays) {
  PrivacySieve sieve(rulesOf({"play_*"}, {}), someKey());
  EXPECT_EQ(sieved(sieve, R"({"play_seconds":2.5,"secret":"x","play_count":3})"),
            R"({"play_seconds":2.5,"play_count":3})");
  EXPECT_EQ(sieved(sieve, R"({"secret":"x"})"), "{}");
}

TEST(PrivacySieve, WhatIdentifiesLeavesAsAHashAlsoWhereAPatternWouldShowIt) {
  PrivacySieve sieve(rulesOf({"*"}, {"name"}), someKey());
  const std::string hash = someKey().hashOf(0, "org.example.music");
  EXPECT_EQ(sieved(sieve, R"({"name":"org.example.music","a":1})"), R"({"name":")" + hash + R"(","a":1})");
  EXPECT_EQ(sieve.textOf("name", "org.example.music"), hash);
  EXPECT_EQ(sieved(sieve, R"({"name":["x"]})"), R"({"name":")" + someKey().hashOf(0, R"(["x"])") + R"("})");
}

TEST(PrivacySieve, ATextOfASessionGoesByItsKey) {
  PrivacySieve sieve(rulesOf({"shown"}, {}), someKey());
  EXPECT_EQ(sieve.textOf("shown", "x"), "x");
  EXPECT_EQ(sieve.textOf("other", "x"), "");
  EXPECT_EQ(sieve.textOf("shown", ""), "");
}

TEST(PrivacySieve, HashesRotateWithTheDay) {
  Rules rules = rulesOf({}, {"name"});
  rules.rotateDays = 1;
  PrivacySieve sieve(rules, someKey());
  sieve.setTime(86400.0 * 5);
  EXPECT_EQ(sieve.textOf("name", "x"), someKey().hashOf(5, "x"));
  sieve.setTime(86400.0 * 6 - 1);
  EXPECT_EQ(sieve.textOf("name", "x"), someKey().hashOf(5, "x"));
  sieve.setTime(86400.0 * 6);
  EXPECT_EQ(sieve.textOf("name", "x"), someKey().hashOf(6, "x"));
}

TEST(PrivacySieve, ATextThatIsNoObjectLeavesNothing) {
  PrivacySieve sieve(rulesOf({"*"}, {}), someKey());
  EXPECT_EQ(sieved(sieve, R"({"a":1,"b")"), "refused, >");
}

TEST(PrivacySieve, MessagesGoByCategoryAndType) {
  Rules rules;
  rules.categories = {"Volume", "Session_*"};
  rules.types = {"Summary"};
  PrivacySieve sieve(rules, someKey());
  EXPECT_TRUE(sieve.allowsKind("tally", "sys.oxbow.tarnkit.Volume.Summary"));
  EXPECT_TRUE(sieve.allowsKind("tally", "sys.oxbow.tarnkit.Session_Generic.Summary"));
  EXPECT_FALSE(sieve.allowsKind("tally", "sys.oxbow.tarnkit.Volume.Start"));
  EXPECT_FALSE(sieve.allowsKind("tally", "sys.oxbow.tarnkit.Input.Summary"));
  EXPECT_FALSE(sieve.allowsKind("tally", "sys.oxbow.tarnkit.Summary"));
  EXPECT_FALSE(sieve.allowsKind("rtc", "sys.oxbow.tarnkit.Volume.Summary"));
}

TEST(PrivacySieve, OtherEventsGoByBackEndAndNameAndStayUnlessAllowed) {
  Rules rules;
  EXPECT_FALSE(PrivacySieve(rules, someKey()).allowsKind("rtc", "sendMessage"));
  EXPECT_FALSE(PrivacySieve(rules, someKey()).allowsKind("tally", "sys.oxbow.longformaudio.Volume.Summary"));
  EXPECT_FALSE(PrivacySieve(rules, someKey()).allowsKind("tally", "sys.oxbow.tarnkit.clientuptime"));
  rules.others = {"snare/*", "tally/sys.oxbow.longformaudio.*", "tally/sys.oxbow.tarnkit.*"};
  PrivacySieve sieve(rules, someKey());
  EXPECT_TRUE(sieve.allowsKind("tally", "sys.oxbow.tarnkit.clientuptime"));
  EXPECT_TRUE(sieve.allowsKind("snare", "requestSnapshot"));
  EXPECT_TRUE(sieve.allowsKind("tally", "sys.oxbow.longformaudio.Volume.Summary"));
  EXPECT_FALSE(sieve.allowsKind("rtc", "sendMessage"));
}

TEST(PrivacySieve, RememberingIsBoundedAndChangesNothing) {
  PrivacySieve sieve(rulesOf({"a*"}, {"b*"}), someKey());
  for (int i = 0; i < 10000; ++i) {
    const std::string number = std::to_string(i);
    EXPECT_EQ(sieved(sieve, "{\"a" + number + "\":" + number + ",\"c" + number + "\":1}"),
              "{\"a" + number + "\":" + number + "}");
    EXPECT_EQ(sieve.textOf("b", number), someKey().hashOf(0, number));
  }
}

}  // namespace
}  // namespace tarn::fleet
