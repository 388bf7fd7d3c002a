#include "session/TarnReportingSessionMessage.h"

#include <cmath>

#include "tests/session/SessionFixture.h"

namespace tarn {
namespace {

class TarnReportingSessionMessageTest : public testing::SessionFixture {
 protected:
  static std::shared_ptr<TarnReportingSessionMessage> stamped(const char* name, double time) {
    return message({{"name", name}, {"tarnreporting_timestamp", time}});
  }
  static std::vector<std::string> names(const TarnReportingSessionMessages& messages) {
    std::vector<std::string> all;
    for (const auto& each : messages) {
      all.emplace_back(each->message()["name"].text());
    }
    return all;
  }
};

TEST_F(TarnReportingSessionMessageTest, RecordOfAnEmptyDictionaryHasAnEmptyMutablePayload) {
  const auto record = message({});
  EXPECT_TRUE(record->message().empty());
  record->mutableMessage().set("a", 1);
  EXPECT_EQ(record->message(), (plist::Dictionary{{"a", 1}}));
  EXPECT_FALSE(record->isRedundant());
  EXPECT_FALSE(record->isSessionStarted());
  EXPECT_TRUE(record->destinationWorkers().empty());
}

TEST_F(TarnReportingSessionMessageTest, RecordDoesNotChangeTheDictionaryItWasMadeFrom) {
  const plist::Dictionary source{{"a", 1}};
  const auto record = message(source);
  record->mutableMessage().set("a", 2);
  EXPECT_EQ(source["a"].signedValue(), 1);
}

TEST_F(TarnReportingSessionMessageTest, DescriptionNamesCategoryTypeAndPayload) {
  EXPECT_EQ(message({{"volume", 0.5}})->description(), "category=Playback type=Start {volume = 0.5}");
}

TEST_F(TarnReportingSessionMessageTest, ChangingTheCopyNeverChangesTheSourceAlsoForNestedValues) {
  const auto source = message({{"list", plist::Array{1}}, {"nested", plist::Dictionary{{"x", 1}}}});
  const auto copy = source->copyWithZone();
  plist::Dictionary nested = copy->message()["nested"].dictionary();
  nested.set("x", 2);
  copy->mutableMessage().set("nested", nested);
  plist::Array list = copy->message()["list"].array();
  list.append(2);
  copy->mutableMessage().set("list", list);
  EXPECT_EQ(source->message(), (plist::Dictionary{{"list", plist::Array{1}}, {"nested", plist::Dictionary{{"x", 1}}}}));
}

TEST_F(TarnReportingSessionMessageTest, CopyTakesTheFlagsButNotTheDestinations) {
  const auto source = message({{"a", 1}}, AudioEventCategory::Volume, AudioEventType::Summary);
  source->setIsRedundant(true);
  source->setIsSessionStarted(true);
  source->setDestinationWorkers({"SomeWorker"});
  const auto copy = source->copyWithZone();
  EXPECT_EQ(copy->category(), AudioEventCategory::Volume);
  EXPECT_EQ(copy->type(), AudioEventType::Summary);
  EXPECT_TRUE(copy->isRedundant());
  EXPECT_TRUE(copy->isSessionStarted());
  EXPECT_TRUE(copy->destinationWorkers().empty());
  EXPECT_TRUE(platform_.log.contains(LogLevel::Debug, "copyWithZone"));
}

TEST_F(TarnReportingSessionMessageTest, SortingKeepsEqualTimesInOrderAndUnstampedFirst) {
  TarnReportingSessionMessages messages{stamped("t=5", 5), message({{"name", "none"}}), stamped("t=3", 3),
                                        stamped("t=5'", 5)};
  TarnReportingSessionMessage::sortMessages(messages);
  EXPECT_EQ(names(messages), (std::vector<std::string>{"none", "t=3", "t=5", "t=5'"}));
}

TEST_F(TarnReportingSessionMessageTest, SortingCountsAStampThatIsNoNumberAsNone) {
  TarnReportingSessionMessages messages{stamped("5", 5), stamped("nan", std::nan("")), stamped("-1", -1)};
  TarnReportingSessionMessage::sortMessages(messages);
  EXPECT_EQ(names(messages), (std::vector<std::string>{"-1", "nan", "5"}));
}

}  // namespace
}  // namespace tarn
