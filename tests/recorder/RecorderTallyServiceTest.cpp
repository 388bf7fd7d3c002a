// SPDX-License-Identifier: Apache-2.0
#include "recorder/RecorderTallyService.h"

#include "tests/recorder/RecorderFixture.h"

namespace tarn::recorder {
namespace {

class RecorderTallyServiceTest : public RecorderFixture {
 protected:
  RecorderTallyService makeService(std::vector<std::string> inUse) {
    return RecorderTallyService(start(), clock_, std::move(inUse));
  }
};

TEST_F(RecorderTallyServiceTest, RecordsNamePayloadAndTheMomentOfTheHandOver) {
  RecorderTallyService service = makeService({"*"});
  clock_.setEpochSeconds(1763632800.5);
  service.sendEventLazy("sys.oxbow.wisp.Playback.Start", [] { return Dictionary{{"volume", 0.5}}; });
  ASSERT_TRUE(flush());
  EXPECT_EQ(askOne(file(), "SELECT id, time, backend, name, payload, detail FROM events"),
            R"(1|1763632800.5|tally|sys.oxbow.wisp.Playback.Start|{"volume":0.5}|{})");
}

TEST_F(RecorderTallyServiceTest, NamesAreInUseByPattern) {
  RecorderTallyService service = makeService({"sys.oxbow.tarnkit.*", "*.Summary"});
  EXPECT_TRUE(service.eventIsInUse("sys.oxbow.tarnkit.Playback.Start"));
  EXPECT_TRUE(service.eventIsInUse("sys.oxbow.wisp.Session_Generic.Summary"));
  EXPECT_FALSE(service.eventIsInUse("sys.oxbow.wisp.Playback.Start"));
}

TEST_F(RecorderTallyServiceTest, OtherPatternsHoldAlsoForNamesThatWereAskedFor) {
  RecorderTallyService service = makeService({"a*"});
  EXPECT_TRUE(service.eventIsInUse("a1"));
  EXPECT_FALSE(service.eventIsInUse("b1"));
  service.setInUse({"b*"});
  EXPECT_FALSE(service.eventIsInUse("a1"));
  EXPECT_TRUE(service.eventIsInUse("b1"));
  service.setInUse({"*"});
  EXPECT_TRUE(service.eventIsInUse("a1"));
}

TEST_F(RecorderTallyServiceTest, NothingIsInUseWithoutPatterns) {
  RecorderTallyService service = makeService({});
  EXPECT_FALSE(service.eventIsInUse("sys.oxbow.tarnkit.Playback.Start"));
}

TEST_F(RecorderTallyServiceTest, PayloadIsAskedForOnceAtHandOver) {
  RecorderTallyService service = makeService({"*"});
  int asked = 0;
  service.sendEventLazy("wanted", [&asked] {
    ++asked;
    return Dictionary{};
  });
  EXPECT_EQ(asked, 1);
}

TEST_F(RecorderTallyServiceTest, AnswersStayRightBeyondWhatIsRemembered) {
  RecorderTallyService service = makeService({"even.*"});
  const auto nameOf = [](std::size_t i) { return (i % 2 == 0 ? "even." : "odd.") + std::to_string(i); };
  for (int round = 0; round < 2; ++round) {
    for (std::size_t i = 0; i < RecorderTallyService::kRememberedNames + 100; ++i) {
      ASSERT_EQ(service.eventIsInUse(nameOf(i)), i % 2 == 0) << i;
    }
  }
}

TEST_F(RecorderTallyServiceTest, OddNamesAreAnsweredAndRecorded) {
  using namespace std::string_literals;
  RecorderTallyService service = makeService({"", "a?b", "long*"});
  EXPECT_TRUE(service.eventIsInUse(""));
  EXPECT_TRUE(service.eventIsInUse("a\0b"s));
  EXPECT_TRUE(service.eventIsInUse("a\xff"s + "b"));
  EXPECT_TRUE(service.eventIsInUse("long" + std::string(100'000, 'x')));
  EXPECT_FALSE(service.eventIsInUse(std::string(100'000, 'x')));
  service.sendEventLazy("a\0b"s, [] { return Dictionary{}; });
  ASSERT_TRUE(flush());
  EXPECT_EQ(askOne(file(), "SELECT hex(name) FROM events"), "610062");
}

}  // namespace
}  // namespace tarn::recorder
