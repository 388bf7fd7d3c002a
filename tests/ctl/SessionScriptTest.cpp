// SPDX-License-Identifier: Apache-2.0
#include "tools/ctl/sessions/SessionScript.h"

#include <array>
#include <cmath>
#include <random>

#include "plist/Value.h"
#include "plist/formats/Json.h"
#include "service/vocabulary/TarnReportingVocabulary.h"
#include "tests/ctl/SessionMessages.h"
#include "tests/support/Seeds.h"
#include "tools/script/ScriptParser.h"

namespace tarn::ctl {
namespace {

using script::ScriptStep;

constexpr const char* kSummary =
    R"("summaryServiceName":"longformaudio","HostApplicationDisplayID":"org.example.music")";
constexpr const char* kOfTheApplication = R"("HostApplicationDisplayID":"org.example.music")";

class SessionScriptTest : public ::testing::Test {
 protected:
  SessionScriptTest() {
    session_.reporter = 41;
    session_.connection = 3;
    session_.serviceType = 7;
    session_.serviceName = "longformaudio";
    session_.endReason = "stopped";
  }
  void addPeriod(std::optional<std::int64_t> firstEvent, std::optional<std::int64_t> lastEvent, bool stopped = true) {
    recorder::PeriodRow period;
    period.started = static_cast<double>(firstEvent.value_or(0));
    period.firstEvent = firstEvent;
    period.lastEvent = lastEvent;
    period.stopped = stopped ? std::optional<double>(1000) : std::nullopt;
    periods_.push_back(period);
  }
  void add(std::int64_t event, const std::string& kind, const std::string& members = kOfTheApplication) {
    messages_.push_back(messageAt(static_cast<double>(event), kind, members, event));
  }
  // The script's steps; every line must be one.
  std::vector<ScriptStep> steps() {
    const SessionScript script = scriptOf(session_, periods_, messages_, repeated_);
    EXPECT_TRUE(script.leftOut.empty());
    std::vector<ScriptStep> all;
    for (std::size_t i = 0; i < script.lines.size(); ++i) {
      auto step = script::parseLine(script.lines[i], i + 1);
      EXPECT_TRUE(step.ok()) << script.lines[i] << ": " << step.error.text();
      all.push_back(std::move(step.value));
    }
    return all;
  }
  // "createReportingSession setServiceType ... Playback.Start": messages by their kinds.
  std::vector<std::string> told() {
    std::vector<std::string> all;
    for (const ScriptStep& step : steps()) {
      all.push_back(step.op == "sendMessage" ? kindOf(step) : step.op);
    }
    return all;
  }
  static std::string kindOf(const ScriptStep& step) {
    return TarnReportingUtilityCategoryString(static_cast<AudioEventCategory>(step.request.category)) + "." +
           std::string(TarnReportingUtilityTypeString(static_cast<AudioEventType>(step.request.type)));
  }

  recorder::SessionRow session_;
  std::vector<recorder::PeriodRow> periods_;
  // The n-th row of a message that repeats that of an event, after another event.
  void repeat(std::optional<std::int64_t> event, std::int64_t after, std::int64_t period, double stamp) {
    const auto id = static_cast<std::int64_t>(repeated_.size()) + 1;
    repeated_.push_back({id, period, stamp, stamp, event, after});
  }

  std::vector<SessionMessage> messages_;
  std::vector<recorder::RepeatedRow> repeated_;
};

using Told = std::vector<std::string>;

TEST_F(SessionScriptTest, MakesTypesConfiguresStartsAndStops) {
  session_.application = "org.example.music";
  add(5, "Playback.Start");
  addPeriod(4, 9);
  EXPECT_EQ(told(), (Told{"createReportingSession", "setServiceType", "startReportingSessionForID", "setConfiguration",
                          "Playback.Start", "stopReportingSessionForID"}));
  const auto all = steps();
  EXPECT_EQ(all[0].request.reporterID, 41);
  EXPECT_EQ(all[1].request.serviceType, 7);
  EXPECT_EQ(all[3].request.dictionary.get("HostApplicationDisplayID").text(), "org.example.music");
  EXPECT_EQ(all[4].request.reporterIDs, (wire::ReporterIDs{{41}}));
}

TEST_F(SessionScriptTest, MessagesStandBeforeBetweenAndAfterPeriods) {
  add(1, "Setup.Setup");
  add(5, "Playback.Start");
  add(20, "Volume.Generic");
  add(31, "Playback.Stop");
  add(50, "RouteChange.Generic");
  addPeriod(4, 9);
  addPeriod(30, 40);
  EXPECT_EQ(told(), (Told{"createReportingSession", "setServiceType", "Setup.Setup", "startReportingSessionForID",
                          "Playback.Start", "stopReportingSessionForID", "Volume.Generic", "startReportingSessionForID",
                          "Playback.Stop", "stopReportingSessionForID", "RouteChange.Generic"}));
}

TEST_F(SessionScriptTest, RepeatedMessagesStandWhereTheyCameWithTheirOwnStamps) {
  add(5, "Playback.Start");
  add(8, "Volume.Generic");
  add(31, "Playback.Stop");
  addPeriod(4, 9);
  addPeriod(30, 40);
  periods_[0].id = 1;
  periods_[1].id = 2;
  repeat(5, 6, 1, 6.5);
  repeat(5, 25, 1, 24.5);  // others' events came before it
  repeat(31, 70, 2, 50);
  EXPECT_EQ(told(),
            (Told{"createReportingSession", "setServiceType", "startReportingSessionForID", "Playback.Start",
                  "Playback.Start", "Volume.Generic", "Playback.Start", "stopReportingSessionForID",
                  "startReportingSessionForID", "Playback.Stop", "Playback.Stop", "stopReportingSessionForID"}));
  const auto all = steps();
  EXPECT_EQ(all[3].request.dictionary.get("tarnreporting_timestamp").asDouble(), 5);
  EXPECT_EQ(all[4].request.dictionary.get("tarnreporting_timestamp").asDouble(), 6.5);
  EXPECT_EQ(all[6].request.dictionary.get("tarnreporting_timestamp").asDouble(), 24.5);
  EXPECT_EQ(all[6].request.dictionary.get("HostApplicationDisplayID").text(), "org.example.music");
}

TEST_F(SessionScriptTest, ARepeatedMessageOfWhichNothingIsKnownIsLeftOutAndTold) {
  add(5, "Playback.Start");
  add(7, "Session_Generic.Summary", kSummary);
  addPeriod(4, 9);
  periods_[0].id = 1;
  repeat(std::nullopt, 5, 1, 6);
  repeat(3, 5, 1, 6);  // gone
  repeat(7, 7, 1, 8);  // the service's own
  EXPECT_EQ(told(), (Told{"createReportingSession", "setServiceType", "startReportingSessionForID", "Playback.Start",
                          "stopReportingSessionForID"}));
  EXPECT_EQ(scriptOf(session_, periods_, messages_, repeated_).unknownRepeated, 2U);
}

TEST_F(SessionScriptTest, ARepeatedMessagesStampIsADateWhereTheFirstOnesWas) {
  messages_.push_back(*messageOf({5, 5, "tally", "sys.oxbow.tarnkit.Playback.Start",
                                  R"({"tarnreporting_timestamp":"2026-11-20T07:00:00Z"})", "{}"}));
  addPeriod(4, 9);
  periods_[0].id = 1;
  repeat(5, 5, 1, 1795158001.25);
  const plist::Dictionary message = steps().at(4).request.dictionary;
  EXPECT_EQ(message.get("tarnreporting_timestamp").kind(), plist::Kind::Date);
  EXPECT_EQ(message.get("tarnreporting_timestamp").asDouble(), 1795158001.25);
}

TEST_F(SessionScriptTest, PeriodsWithoutEventsAreThereToo) {
  add(5, "Playback.Start");
  addPeriod(4, 9);
  addPeriod(std::nullopt, std::nullopt);
  periods_.back().started = 500;
  EXPECT_EQ(told(), (Told{"createReportingSession", "setServiceType", "startReportingSessionForID", "Playback.Start",
                          "stopReportingSessionForID", "startReportingSessionForID", "stopReportingSessionForID"}));
}

TEST_F(SessionScriptTest, WhatTheServiceDerivedIsLeftOut) {
  add(5, "Playback.Start");
  add(6, "Volume.Summary", R"("msgidx":1,"msgcnt":1)");
  add(7, "Session_Generic.Summary", kSummary);
  add(8, "Flume.Simple", R"("D_G_S_Simple_C":1)");
  addPeriod(4, 9);
  EXPECT_EQ(told(), (Told{"createReportingSession", "setServiceType", "startReportingSessionForID", "Playback.Start",
                          "stopReportingSessionForID"}));
}

TEST_F(SessionScriptTest, TheApplicationIsToldWhenItWasKnown) {
  session_.application = "org.example.music";
  add(5, "Playback.Start", R"("HostApplicationDisplayID":"Unknown")");
  add(8, "Session_Generic.Summary", kSummary);
  add(9, "Playback.Stop");
  addPeriod(4, 8);
  EXPECT_EQ(told(), (Told{"createReportingSession", "setServiceType", "startReportingSessionForID", "Playback.Start",
                          "setConfiguration", "stopReportingSessionForID", "Playback.Stop"}));
}

TEST_F(SessionScriptTest, ASessionThatWasReplacedWhileItRanDerivesNothing) {
  session_.endReason = "replaced";
  add(5, "Playback.Start");
  addPeriod(4, 5);
  EXPECT_EQ(told(), (Told{"createReportingSession", "setServiceType", "startReportingSessionForID", "Playback.Start",
                          "createReportingSession"}));
  add(6, "Session_Generic.Summary", kSummary);
  periods_.front().lastEvent = 6;
  EXPECT_EQ(told().back(), "stopReportingSessionForID");
}

TEST_F(SessionScriptTest, OneThatWasDestroyedIsDestroyed) {
  session_.endReason = "destroyed";
  EXPECT_EQ(told(), (Told{"createReportingSession", "setServiceType", "destroyReportingSession"}));
}

TEST_F(SessionScriptTest, OneThatStillRunsIsNotStopped) {
  session_.endReason = "";
  add(5, "Playback.Start");
  addPeriod(4, std::nullopt, false);
  EXPECT_EQ(told().back(), "Playback.Start");
}

TEST_F(SessionScriptTest, MessagesOfNobodysSessionNameNone) {
  session_.connection = 0;
  session_.reporter = 1;
  session_.serviceType = 5;
  add(5, "Playback.Start");
  addPeriod(4, 9);
  const auto all = steps();
  ASSERT_EQ(all.size(), 1U);
  EXPECT_FALSE(all[0].request.reporterIDs.has_value());
}

TEST_F(SessionScriptTest, ATypeWithoutANameIsToldByItsNumber) {
  session_.serviceType = 99;
  session_.serviceName = "unknown";
  EXPECT_EQ(steps().at(1).request.serviceType, 99);
  session_.serviceType = 65535;
  EXPECT_EQ(told(), Told{"createReportingSession"});
}

TEST_F(SessionScriptTest, WhatNoScriptCanSayIsLeftOutAndTold) {
  add(5, "Playback.Start", R"("odd":{"$date":5,"x":1})");
  messages_.back().payload.set("odd", plist::Dictionary{{"$date", 5}});
  add(6, "Nothing.Start");
  add(7, "Playback.Stop");
  const SessionScript script = scriptOf(session_, periods_, messages_);
  EXPECT_EQ(script.leftOut, (std::vector<std::int64_t>{5, 6}));
  EXPECT_EQ(script.lines.size(), 3U);
}

TEST_F(SessionScriptTest, ADateStampIsADateAgain) {
  messages_.push_back(
      *messageOf({5, 5, "tally", "sys.oxbow.tarnkit.Playback.Start",
                  R"({"tarnreporting_timestamp":"2026-11-20T07:00:00.25Z","other":"2026-11-20T07:00:00Z"})", "{}"}));
  const plist::Dictionary message = steps().back().request.dictionary;
  EXPECT_EQ(message.get("tarnreporting_timestamp").kind(), plist::Kind::Date);
  EXPECT_EQ(message.get("tarnreporting_timestamp").asDouble(), 1795158000.25);
  EXPECT_EQ(message.get("other").kind(), plist::Kind::Text);
}

// Random sessions: what is read back of a script is what was recorded, in its order.
class RandomSession {
 public:
  explicit RandomSession(std::uint64_t seed) : random_(seed) {}

  std::size_t below(std::size_t bound) { return std::uniform_int_distribution<std::size_t>(0, bound - 1)(random_); }
  plist::Value value(int depth) {
    switch (below(depth > 0 ? 9 : 7)) {
      case 0:
        return plist::Value(below(2) == 1);
      case 1:
        return plist::Value(static_cast<std::int64_t>(random_()));
      case 2:
        return plist::Value(std::uint64_t{random_()});
      case 3:
        return plist::Value(std::ldexp(static_cast<double>(static_cast<std::int64_t>(random_())), -40));
      case 4:
        return plist::Value(static_cast<double>(below(1000)));
      case 5:
        return plist::Value(text());
      case 6:
        return plist::Value(static_cast<std::int64_t>(below(10)));
      case 7: {
        plist::Array items;
        for (std::size_t i = below(4); i > 0; --i) {
          items.append(value(depth - 1));
        }
        return plist::Value(items);
      }
      default:
        return plist::Value(dictionary(depth - 1));
    }
  }
  plist::Dictionary dictionary(int depth) {
    plist::Dictionary made;
    for (std::size_t i = below(5); i > 0; --i) {
      made.set(plist::Key("k" + std::to_string(below(9)) + text()), value(depth));
    }
    return made;
  }
  std::string text() {
    static constexpr std::array<const char*, 8> kTexts{
        "", "Speaker", "\"", "\\u", "\n\t\x01", "gr\xc3\xbc\xc3\x9f", "nan", "2026-11-20T07:00:00Z"};
    return kTexts.at(below(kTexts.size()));
  }
  // Never one that the service itself makes, nor one whose number has no name of its own.
  std::pair<std::uint32_t, std::uint16_t> kind() {
    constexpr std::array<std::uint32_t, 4> kDomains{0, 0x10000000, 0x80000000, 0x04000000};
    return {kDomains.at(below(kDomains.size())) | static_cast<std::uint32_t>(1 + below(17)),
            static_cast<std::uint16_t>(below(20))};
  }

 private:
  std::mt19937_64 random_;
};

TEST_F(SessionScriptTest, SaysWhatWasRecorded) {
  for (const std::uint64_t seed : testing::testSeeds(4711)) {
    SCOPED_TRACE(testing::seedNote(seed));
    RandomSession random(seed);
    messages_.clear();
    std::vector<std::pair<std::string, plist::Dictionary>> sent;
    for (std::int64_t event = 1; event <= 300; ++event) {
      plist::Dictionary payload = random.dictionary(3);
      const bool isDate = random.below(2) == 0;
      const double stamp = 1795158000 + static_cast<double>(random.below(1'000'000)) / 64;
      payload.set("tarnreporting_timestamp", isDate ? plist::ValueView(plist::Date{stamp}) : plist::ValueView(stamp));
      const auto [category, type] = random.kind();
      const std::string kind = TarnReportingUtilityCategoryString(static_cast<AudioEventCategory>(category)) + "." +
                               std::string(TarnReportingUtilityTypeString(static_cast<AudioEventType>(type)));
      std::string recorded;
      plist::appendJson(recorded, payload);
      auto message = messageOf({event, stamp, "tally", "sys.oxbow.tarnkit." + kind, recorded, "{}"});
      ASSERT_TRUE(message.has_value()) << recorded;
      EXPECT_EQ(message->stamp, stamp);
      messages_.push_back(std::move(*message));
      sent.emplace_back(kind, payload);
    }
    auto all = steps();
    ASSERT_EQ(all.size(), 2 + sent.size());
    for (std::size_t i = 0; i < sent.size(); ++i) {
      EXPECT_EQ(kindOf(all[i + 2]), sent[i].first);
      EXPECT_EQ(plist::description(all[i + 2].request.dictionary), plist::description(sent[i].second));
      EXPECT_TRUE(plist::ValueView(all[i + 2].request.dictionary) == plist::ValueView(sent[i].second)) << i;
    }
  }
}

}  // namespace
}  // namespace tarn::ctl
