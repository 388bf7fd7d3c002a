// SPDX-License-Identifier: Apache-2.0
#include "tools/ctl/sessions/SessionEvents.h"

#include "tests/ctl/SessionStoreFixture.h"

namespace tarn::ctl {
namespace {

using Names = std::vector<std::string>;

class SessionEventsTest : public testing::SessionStoreFixture {
 protected:
  Names events(std::int64_t session, std::int64_t after = 0) {
    Names names;
    const Status read = eachEvent(file(), session, after, [&](recorder::EventRow&& row) {
      names.push_back(std::to_string(row.id) + " " + row.name);
      return true;
    });
    EXPECT_TRUE(read.ok()) << read.text();
    return names;
  }
};

TEST_F(SessionEventsTest, AreThoseOfTheSession) {
  makeStore();
  addEvent(1, 1, "tally", "a", "{}");
  addEvent(2, 2, "tally", "b", "{}");
  addEvent(0, 3, "tally", "c", "{}");
  addEvent(1, 4, "rtc", "d", "{}");
  EXPECT_EQ(events(1), (Names{"1 a", "4 d"}));
  EXPECT_EQ(events(1, 1), Names{"4 d"});
}

TEST_F(SessionEventsTest, GoOnFromPageToPage) {
  makeStore();
  sql("BEGIN;");
  for (int i = 0; i < 2500; ++i) {
    addEvent(1, i, "tally", "n", "{}");
  }
  sql("COMMIT;");
  EXPECT_EQ(events(1).size(), 2500U);
}

TEST_F(SessionEventsTest, WhoHasEnoughGetsNoMore) {
  makeStore();
  addEvent(1, 1, "tally", "a", "{}");
  addEvent(1, 2, "tally", "b", "{}");
  int taken = 0;
  EXPECT_TRUE(eachEvent(file(), 1, 0, [&](recorder::EventRow&&) { return ++taken < 1; }).ok());
  EXPECT_EQ(taken, 1);
}

TEST_F(SessionEventsTest, AFileThatCannotBeReadIsAnError) {
  makeStore();
  addEvent(1, 1, "tally", "a", "{}");
  sql("DROP TABLE event_texts;");
  const Status read = eachEvent(file(), 1, 0, [](recorder::EventRow&&) { return true; });
  EXPECT_TRUE(read.text().starts_with(file().string() + ": no such table: ")) << read.text();
}

bool letsThrough(MessageSieve& sieve, const std::string& name, const std::string& payload,
                 const std::string& backend = "tally") {
  return sieve.letsThrough({1, 1, backend, name, payload, "{}"});
}

TEST(MessageSieve, LeavesOutTheSecondNameAndTheMirror) {
  MessageSieve sieve;
  for (const char* payload : {R"({"n":1})", R"({"n":2})"}) {
    EXPECT_TRUE(letsThrough(sieve, "sys.oxbow.tarnkit.Playback.Start", payload));
    EXPECT_FALSE(letsThrough(sieve, "sendMessage", payload, "rtc"));
    EXPECT_FALSE(letsThrough(sieve, "sys.oxbow.wisp.Playback.Start", payload));
  }
}

TEST(MessageSieve, OtherEventsGoThrough) {
  MessageSieve sieve;
  EXPECT_TRUE(letsThrough(sieve, "sys.oxbow.tarnkit.tarnreportingclientuptime", "{}"));
  EXPECT_TRUE(letsThrough(sieve, "flush", "{}", "rtc"));
  EXPECT_TRUE(letsThrough(sieve, "createSession", "{}", "rtc"));
  EXPECT_TRUE(letsThrough(sieve, "Loom_Haptics_ClientStatus", "{}", "wattlog"));
}

TEST(MessageSieve, ASecondNameWhoseFirstIsNotThereGoesThrough) {
  MessageSieve sieve;
  EXPECT_TRUE(letsThrough(sieve, "sys.oxbow.wisp.Playback.Start", R"({"n":1})"));
  EXPECT_TRUE(letsThrough(sieve, "sys.oxbow.tarnkit.Playback.Start", R"({"n":2})"));
  EXPECT_TRUE(letsThrough(sieve, "sys.oxbow.wisp.Playback.Start", R"({"n":3})"));
  EXPECT_TRUE(letsThrough(sieve, "sys.oxbow.tarnkit.Playback.Start", R"({"n":4})"));
  EXPECT_TRUE(letsThrough(sieve, "sys.oxbow.wisp.Playback.Stop", R"({"n":4})"));
  EXPECT_TRUE(letsThrough(sieve, "sys.oxbow.wisp.Playback.Start", R"({"n":4})"));
}

}  // namespace
}  // namespace tarn::ctl
