// SPDX-License-Identifier: Apache-2.0
// The summary event: which messages it folds together, and how.
#include <gtest/gtest.h>

#include <map>
#include <random>

#include "telemetry/rtc/TarnReportingRtcMirror.h"
#include "telemetry/rtc/TarnReportingRtcSummary.h"
#include "tests/support/HeapUse.h"
#include "tests/support/Seeds.h"
#include "tests/telemetry/rtc/RtcFixture.h"

namespace tarn {
namespace {

using namespace testing;

constexpr std::string_view kSummaryEvent = "Tarn_Session_Summary_Event";

class RtcSummary : public RtcFixture {
 protected:
  // As the worker takes them from a log.
  static TarnReportingRtcMessages logged(const std::vector<std::shared_ptr<TarnReportingSessionMessage>>& messages) {
    TarnReportingRtcMessages stopped;
    for (const auto& message : messages) {
      if (TarnReportingIsForRtcSummary(*message)) {
        stopped.payloads.push_back(message->message());
      }
    }
    return stopped;
  }
  // What the service got at the stop of this session.
  RtcMessage summaryOf(TarnReportingSession& session) {
    session.stop();
    platform_.runUntilIdle();
    const auto messages = onlySession().messages;
    return messages.empty() ? RtcMessage() : messages.back();
  }
  std::string valueOf(TarnReportingSession& session, const char* key) {
    return summaryOf(session).payload[key].asText();
  }
};

TEST_F(RtcSummary, JoinsTheValuesOfAKeyInMessageOrder) {
  const auto session = startSession(AudioServiceType::LongFormAudio);
  session->sendMessage(message({{"n", 1}, {"route", "a"}}));
  session->sendMessage(message({{"n", 2}}));
  session->sendMessage(message({{"n", 3}, {"route", "c"}}));
  const RtcMessage summary = summaryOf(*session);
  EXPECT_EQ(summary.category, 0xFFFF);
  EXPECT_EQ(summary.type, 0xFFFF);
  EXPECT_EQ(summary.payload["route"].text(), "a,c");
  EXPECT_EQ(summary.payload["n"].text(), "1,2,3");
  EXPECT_EQ(summary.payload[kSummaryEvent].text(), "7");
}

TEST_F(RtcSummary, BeginsWithTheEventsOwnKeyThenKeysAsTheyWereFirstSeen) {
  const auto session = startSession();
  session->sendMessage(message({{"b", 1}}));
  session->sendMessage(message({{"a", 1}}));
  std::vector<std::string> keys;
  for (const auto& entry : summaryOf(*session).payload) {
    keys.emplace_back(entry.key.text());
  }
  EXPECT_EQ(keys, (std::vector<std::string>{std::string(kSummaryEvent), "b", "invalid_timestamp", "audiotag",
                                            "HostApplicationDisplayID", "a"}));
}

TEST_F(RtcSummary, ServiceTypeHasSixteenBitsWithoutASign) {
  const auto text = [](std::uint16_t type) {
    return TarnReportingMakeRtcSummary(AudioServiceType{type}, {}).payload[kSummaryEvent].asText();
  };
  EXPECT_EQ(text(0), "0");
  EXPECT_EQ(text(256), "256");
  EXPECT_EQ(text(32768), "32768");
  EXPECT_EQ(text(65535), "65535");
}

TEST_F(RtcSummary, ServiceTypeIsThatOfTheStop) {
  const auto session = startSession(AudioServiceType::Haptics);
  session->setServiceType(AudioServiceType::LongFormAudio);
  session->stop();
  session->setServiceType(AudioServiceType::Telephony);
  platform_.runUntilIdle();
  EXPECT_EQ(onlySession().messages.back().payload[kSummaryEvent].text(), "7");
}

TEST_F(RtcSummary, TimestampStaysOnAnInternalBuild) {
  platform_.deviceProperties.set("InternalBuild", true);
  const auto session = startSession();
  session->sendMessage(message({{"tarnreporting_timestamp", now()}}));
  EXPECT_EQ(valueOf(*session, "tarnreporting_timestamp"), "1750000000");
}

TEST_F(RtcSummary, ValuesOfEveryKindAreWrittenAsTheirDescription) {
  const auto session = startSession();
  const plist::Value values[] = {
      true, -5,   2.5, plist::Date{0}, plist::DataView{"\x0a"}, plist::Array{1, 2}, plist::Dictionary{{"x", "y"}},
      "",   "a,b"};
  for (const plist::Value& value : values) {
    session->sendMessage(message({{"v", value}}));
  }
  EXPECT_EQ(valueOf(*session, "v"), "1,-5,2.5,1970-01-01 00:00:00 +0000,<0a>,(1, 2),{x = y},,a,b");
}

TEST_F(RtcSummary, KeyOfTheEventInAMessageIsJoinedBehindTheServiceType) {
  const auto session = startSession();
  session->sendMessage(message({{kSummaryEvent, "mine"}}));
  EXPECT_EQ(valueOf(*session, "Tarn_Session_Summary_Event"), "3,mine");
}

TEST_F(RtcSummary, RedundantMessageIsAbsent) {
  const auto session = startSession();
  session->sendMessage(message({{"n", 1}, {"tarnreporting_timestamp", now()}}));
  session->sendMessage(message({{"n", 1}, {"tarnreporting_timestamp", now()}}));
  EXPECT_EQ(valueOf(*session, "n"), "1");
}

TEST_F(RtcSummary, MessageThatWasMarkedRedundantInTheLogIsAbsent) {
  const auto session = startSession();
  const auto marked = message({{"n", 1}});
  session->sendMessage(marked);
  session->sendMessage(message({{"n", 2}}));
  marked->setIsRedundant(true);
  EXPECT_EQ(valueOf(*session, "n"), "2");
}

TEST_F(RtcSummary, MessageFromBeforeTheStartAndTheMarkersAreAbsent) {
  const auto session = makeTyped(AudioServiceType::Haptics);
  session->sendMessage(message({{"n", 1}}));
  session->start();
  session->sendMessage(message({{"n", 2}}));
  const RtcMessage summary = summaryOf(*session);
  EXPECT_EQ(summary.payload["n"].text(), "2");
  EXPECT_FALSE(summary.payload.contains("method"));
}

TEST_F(RtcSummary, MessageAddressedToOtherWorkersIsAbsent) {
  const auto session = startSession();
  const auto elsewhere = message({{"n", 1}});
  elsewhere->setDestinationWorkers({"TarnReportingSessionTallyWorker"});
  session->sendMessage(elsewhere);
  const auto here = message({{"n", 2}});
  here->setDestinationWorkers({"TarnReportingSessionTallyWorker", "TarnReportingSessionRtcWorker"});
  session->sendMessage(here);
  const auto everywhere = message({{"n", 3}});
  everywhere->setDestinationWorkers({});
  session->sendMessage(everywhere);
  EXPECT_EQ(valueOf(*session, "n"), "2,3");
  EXPECT_EQ(onlySession().messages.size(), 3U);
}

TEST_F(RtcSummary, HoldsTheLogInTheOrderOfTime) {
  const auto session = startSession();
  session->sendMessage(message({{"n", 2}, {"tarnreporting_timestamp", now() + 2}}));
  session->sendMessage(message({{"n", 1}, {"tarnreporting_timestamp", now() + 1}}));
  EXPECT_EQ(valueOf(*session, "n"), "1,2");
}

TEST_F(RtcSummary, HoldsTheLogAsItWasAtTheStop) {
  const auto session = startSession();
  session->sendMessage(message({{"n", 1}}));
  session->stop();
  session->start();
  session->sendMessage(message({{"n", 2}}));
  platform_.runUntilIdle();
  EXPECT_EQ(platform_.rtcReporting.sessions().at(0).messages.back().payload["n"].text(), "1");
}

TEST_F(RtcSummary, HoldsWhatProducersDerivedBefore) {
  useWorkers<ProducerWorker, TarnReportingSessionRtcWorker>();
  const auto session = makeSession();
  session->start();
  session->stop();
  platform_.runUntilIdle();
  ASSERT_EQ(onlySession().messages.size(), 2U);
  EXPECT_EQ(onlySession().messages[0].payload["derived"].asInt64(), 2);
  EXPECT_EQ(onlySession().messages[1].payload["derived"].text(), "2");
}

TEST_F(RtcSummary, EmptyMessageListSendsNoneButFlushesAndClears) {
  const auto session = makeTyped(AudioServiceType::Haptics);
  const auto worker = TarnReportingSessionRtcWorker::initWithSession(session);
  worker->start();
  worker->stop();
  platform_.runUntilIdle();
  EXPECT_TRUE(onlySession().messages.empty());
  EXPECT_EQ(onlySession().flushes, 1U);
  EXPECT_TRUE(onlySession().released);
  EXPECT_EQ(count("default sending rtc summary event. reporterID=7"), 0U);
  EXPECT_EQ(count("debug stopping and setting session to nil"), 1U);
}

TEST_F(RtcSummary, LogWithoutAMessageForTheWorkerIsNotAnEmptyOne) {
  const auto session = makeTyped(AudioServiceType::Haptics);
  const auto elsewhere = message({{"n", 1}});
  elsewhere->setDestinationWorkers({"TarnReportingSessionTallyWorker"});
  session->sendMessage(elsewhere);
  const auto worker = TarnReportingSessionRtcWorker::initWithSession(session);
  worker->start();
  worker->stop();
  platform_.runUntilIdle();
  ASSERT_EQ(onlySession().messages.size(), 1U);
  EXPECT_EQ(onlySession().messages[0].payload, (plist::Dictionary{{kSummaryEvent, "3"}}));
}

TEST_F(RtcSummary, EveryRecordOfTheLogIsCopiedAndNoneIsChanged) {
  const auto session = startSession();
  const auto addressed = message({{"n", 1}, {"tarnreporting_timestamp", now()}});
  addressed->setDestinationWorkers({"TarnReportingSessionTallyWorker"});
  session->sendMessage(addressed);
  session->stop();
  EXPECT_EQ(platform_.log.count("copyWithZone"), 3U);  // with the markers of start and stop
  platform_.runUntilIdle();
  EXPECT_TRUE(addressed->message().contains("tarnreporting_timestamp"));
  EXPECT_EQ(addressed->destinationWorkers().size(), 1U);
}

TEST_F(RtcSummary, IsCutAtItsLimitBetweenTwoMessages) {
  std::vector<std::shared_ptr<TarnReportingSessionMessage>> messages;
  for (int n = 0; n < 4; ++n) {
    messages.push_back(message({{"a", "xxxxx"}, {"b", n}}));
    messages.back()->setIsSessionStarted(true);
  }
  const auto whole = TarnReportingMakeRtcSummary(AudioServiceType::Generic, logged(messages));
  EXPECT_TRUE(whole.complete);
  EXPECT_EQ(whole.payload["b"].text(), "0,1,2,3");
  // The keys are 28 bytes, "0" and "xxxxx" and "0" seven more, ",xxxxx" and ",1" another eight.
  const auto cut = TarnReportingMakeRtcSummary(AudioServiceType::Generic, logged(messages), 43);
  EXPECT_FALSE(cut.complete);
  EXPECT_EQ(cut.payload["a"].text(), "xxxxx,xxxxx");
  EXPECT_EQ(cut.payload["b"].text(), "0,1");
  EXPECT_EQ(TarnReportingMakeRtcSummary(AudioServiceType::Generic, logged(messages), 44).payload["b"].text(), "0,1,2");
}

TEST_F(RtcSummary, LimitLeavesRoomForTheCopiesOnTheWayToTheDisk) {
  EXPECT_EQ(TarnReportingRtcSummary::kLongestText, 16'777'216U);
}

// A session that ran for long waits for its summary on a queue of its own, beside others that stop.
TEST_F(RtcSummary, WhatWaitsForItsQueueIsAPointerAMessage) {
  constexpr std::ptrdiff_t kMessages = 20'000;
  platform_.log.setThreshold(LogLevel::Error);
  const auto session = startSession();
  for (int n = 0; n < kMessages; ++n) {
    session->sendMessage(message({{"n", n}}));
  }
  platform_.runUntilIdle();
  const HeapGrowth heap;
  TarnReportingSessionRtcWorker worker(session, std::make_shared<TarnReportingRtcMirror>(platform_.rtcReporting));
  worker.stop();
  EXPECT_LT(heap.bytes(), 2 * kMessages * static_cast<std::ptrdiff_t>(sizeof(plist::Dictionary)));
  platform_.runUntilIdle();
}

TEST_F(RtcSummary, CutSummaryIsLoggedWithTheSession) {
  const auto session = makeTyped(AudioServiceType::Haptics);
  TarnReportingSessionRtcWorker worker(session, std::make_shared<TarnReportingRtcMirror>(platform_.rtcReporting, 100));
  session->start();
  worker.start();
  for (int n = 0; n < 3; ++n) {
    session->sendMessage(message({{"n", n}, {"text", std::string(100, 'x')}}));
  }
  worker.stop();
  platform_.runUntilIdle();
  EXPECT_EQ(count("error rtc summary event is cut, the session has too many messages. reporterID=7"), 1U);
  EXPECT_EQ(platform_.rtcReporting.sessions().back().messages.back().payload["n"].text(), "0");
}

TEST_F(RtcSummary, KeysCountTowardsTheLimit) {
  std::vector<std::shared_ptr<TarnReportingSessionMessage>> messages;
  for (const char* const key : {"key number 1", "key number 2", "key number 3"}) {
    messages.push_back(message({{key, ""}}));
    messages.back()->setIsSessionStarted(true);
  }
  const auto cut = TarnReportingMakeRtcSummary(AudioServiceType::Generic, logged(messages), 50);
  EXPECT_FALSE(cut.complete);
  EXPECT_EQ(cut.payload.size(), 3U);  // with the event's own
}

// A slow and obvious model beside a session of random messages.
TEST_F(RtcSummary, IsWhatAnObviousModelSaysOfRandomMessages) {
  platform_.log.setThreshold(LogLevel::Error);
  for (const std::uint64_t seed : testSeeds(1)) {
    SCOPED_TRACE(seedNote(seed));
    std::mt19937 random(seed);
    const auto below = [&](unsigned limit) { return static_cast<unsigned>(random() % limit); };
    const char* const names[] = {"route", "volume", "n", "tarnreporting_timestamp", "audiotag", "two words"};
    const plist::Value values[] = {1, "1", 2.5F, true, "a,b", "", plist::Array{}, plist::Date{1}};
    for (int round = 0; round < 200; ++round) {
      const auto type = AudioServiceType{static_cast<std::uint16_t>(below(11))};
      std::vector<std::shared_ptr<TarnReportingSessionMessage>> messages;
      std::map<std::string, std::vector<std::string>> lists;
      lists[std::string(kSummaryEvent)] = {std::to_string(static_cast<unsigned>(type))};
      for (unsigned count = below(30); count > 0; --count) {
        plist::Dictionary payload;
        for (unsigned entries = below(6); entries > 0; --entries) {
          payload.set(names[below(6)], values[below(8)]);
        }
        const auto each = message(payload);
        each->setIsRedundant(below(4) == 0);
        each->setIsSessionStarted(below(4) != 0);
        messages.push_back(each);
        if (each->isRedundant() || !each->isSessionStarted()) continue;
        for (const char* name : names) {
          if (payload.contains(name)) {
            lists[name].push_back(payload[name].asText());
          }
        }
      }
      plist::Dictionary expected;
      for (const auto& [key, list] : lists) {
        std::string joined;
        for (std::size_t i = 0; i < list.size(); ++i) {
          joined += (i == 0 ? "" : ",") + list[i];
        }
        expected.set(plist::Key(key), joined);
      }
      const auto summary = TarnReportingMakeRtcSummary(type, logged(messages));
      ASSERT_TRUE(summary.complete);
      ASSERT_EQ(summary.payload, expected) << plist::description(summary.payload);
    }
  }
}

}  // namespace
}  // namespace tarn
