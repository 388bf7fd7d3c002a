// SPDX-License-Identifier: Apache-2.0
#include "session/TarnReportingSessionMessage.h"

#include <sys/syscall.h>
#include <unistd.h>

#include <atomic>
#include <chrono>
#include <cmath>
#include <fstream>
#include <iterator>
#include <mutex>
#include <thread>

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
  TarnReportingSessionMessages messages{stamped("0.5", 0.5), stamped("nan", std::nan("")), stamped("-0.5", -0.5)};
  TarnReportingSessionMessage::sortMessages(messages);
  EXPECT_EQ(names(messages), (std::vector<std::string>{"-0.5", "nan", "0.5"}));
}

TEST_F(TarnReportingSessionMessageTest, SortingLeavesWhatIsInTimeOrderWhereItStands) {
  TarnReportingSessionMessages messages{stamped("1", 1), stamped("2", 2)};
  const auto* const first = &messages.front();
  TarnReportingSessionMessage::sortMessages(messages);
  EXPECT_EQ(&messages.front(), first);
}

// The state of a thread of this process, as the kernel tells it; 'S' while it sleeps.
char stateOf(long thread) {
  std::ifstream file("/proc/self/task/" + std::to_string(thread) + "/stat");
  const std::string text(std::istreambuf_iterator<char>(file), {});
  const std::size_t name = text.rfind(") ");
  return name == std::string::npos ? '?' : text[name + 2];
}

TEST_F(TarnReportingSessionMessageTest, ThreadThatWaitsForTheGuardSleepsUntilItIsFree) {
  const auto record = message({});
  std::atomic<long> thread{0};
  std::atomic<bool> taken{false};
  record->lock();
  std::thread other([&] {
    thread = ::syscall(SYS_gettid);
    const std::lock_guard guard(*record);
    taken = true;
  });
  // A thread that spins is seen running now and then, one that sleeps never is.
  const auto limit = std::chrono::steady_clock::now() + std::chrono::seconds(10);
  for (int asleep = 0; asleep < 1000 && std::chrono::steady_clock::now() < limit;) {
    asleep = thread != 0 && stateOf(thread) == 'S' ? asleep + 1 : 0;
  }
  EXPECT_EQ(stateOf(thread), 'S');
  EXPECT_FALSE(taken);
  record->unlock();
  other.join();
  EXPECT_TRUE(taken);
}

}  // namespace
}  // namespace tarn
