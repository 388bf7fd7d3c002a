// SPDX-License-Identifier: Apache-2.0
#include <cmath>

#include "diagnostics/TarnReportingSessionWattlogWorker.h"
#include "tests/session/SessionFixture.h"

namespace tarn {
namespace {

using namespace testing;
using Strings = std::vector<std::string>;

constexpr const char* kNoName = "failed to get app name for wattlog";
constexpr const char* kNoTimestamp = "failed to get TarnReporting timestamp for wattlog";

class WattlogWorker : public SessionFixture {
 protected:
  WattlogWorker() { useWorkers<TarnReportingSessionWattlogWorker>(); }

  static std::shared_ptr<TarnReportingSessionMessage> haptics(plist::Dictionary payload) {
    return message(std::move(payload), AudioEventCategory::Generic, AudioEventType::Wattlog);
  }
  static std::shared_ptr<TarnReportingSession> sessionOf(const plist::ValueView& application) {
    auto session = makeSession();
    const plist::Dictionary configuration{{"HostApplicationDisplayID", application}};
    session->updateConfigurationWithContentsOfConfiguration(&configuration);
    return session;
  }
  // The worker alone: what the intake adds to a message is not there.
  void handle(const std::shared_ptr<TarnReportingSession>& session, plist::Dictionary payload) {
    platform_.wattlog.clear();
    TarnReportingSessionWattlogWorker::initWithSession(session)->handleMessage(haptics(std::move(payload)));
  }
  const FakeWattlogService::Event& event(std::size_t index = 0) const { return platform_.wattlog.events().at(index); }
  Strings names() const {
    Strings found;
    for (const auto& event : platform_.wattlog.events()) {
      EXPECT_EQ(event.agentIdentifier, 28);
      found.push_back(event.name);
    }
    return found;
  }
  Strings errors() const {
    Strings texts;
    for (const auto& entry : platform_.log.entries(platform::LogLevel::Error)) {
      EXPECT_EQ(entry.category, "tarnrp");
      EXPECT_EQ(entry.module, "TarnReportingSessionWattlogWorker");
      texts.push_back(entry.message());
    }
    return texts;
  }
};

// Every kind of value, for keys whose values are passed on.
std::vector<plist::Value> everyKind() {
  return {plist::Value(true),
          plist::Value(-3),
          plist::Value(UINT64_MAX),
          plist::Value(0.1F),
          plist::Value(2.5),
          plist::Value(std::nan("")),
          plist::Value(plist::Date{1763632800.25}),
          plist::Value("text"),
          plist::Value(plist::DataView{"\x0a\x1b"}),
          plist::Value(plist::Array{1, "two"}),
          plist::Value(plist::Dictionary{{"a", plist::Array()}})};
}

TEST_F(WattlogWorker, MessageWithAllThreeKeysYieldsThreeEventsInOrder) {
  const auto session = sessionOf("org.example.game");
  session->sendMessage(haptics({{"Active_Clients", plist::Array{"one", "two"}},
                                {"Haptic_Active_Hardware_Time_Seconds", 61},
                                {"EngineState", "EngineOn"},
                                {"EngineOnTime", 0.25},
                                {"tarnreporting_timestamp", now()},
                                {"unrelated", 1}}));
  ASSERT_EQ(names(),
            (Strings{"Loom_Haptics_EngineOnDuration", "Loom_Haptics_ClientStatus", "LeakedHapticsSessionInfo"}));
  EXPECT_EQ(event(0).payload,
            (plist::Dictionary{
                {"EngineOnDuration", 0.25}, {"ApplicationName", "org.example.game"}, {"TimestampEnd", now()}}));
  EXPECT_EQ(event(1).payload,
            (plist::Dictionary{{"Status", 1}, {"ApplicationName", "org.example.game"}, {"TimestampEnd", now()}}));
  EXPECT_EQ(event(2).payload, (plist::Dictionary{{"Haptic_Active_Hardware_Time_Seconds", 61},
                                                 {"Active_Clients", plist::Array{"one", "two"}}}));
  EXPECT_TRUE(errors().empty());
}

TEST_F(WattlogWorker, MessageWithoutATriggerKeyPostsNothing) {
  const auto session = sessionOf("org.example.game");
  session->sendMessage(haptics({{"Active_Clients", 1}, {"engineontime", 1}, {"Status", 1}}));
  session->sendMessage(haptics({}));
  EXPECT_TRUE(names().empty());
  EXPECT_TRUE(errors().empty());
}

TEST_F(WattlogWorker, MessagesOfEveryOtherTypePostNothing) {
  const auto session = makeSession();
  for (unsigned type = 0; type <= 20; ++type) {
    if (type != 8) {
      session->sendMessage(message({{"EngineOnTime", 1}, {"EngineState", "EngineOn"}}, AudioEventCategory::Generic,
                                   AudioEventType(type)));
    }
  }
  session->sendMessage(
      message({{"Haptic_Active_Hardware_Time_Seconds", 1}}, AudioEventCategory::Generic, AudioEventType::Unknown));
  EXPECT_TRUE(names().empty());
  EXPECT_TRUE(errors().empty());
}

TEST_F(WattlogWorker, NoMessagePostsNothing) {
  TarnReportingSessionWattlogWorker::initWithSession(makeSession())->handleMessage(nullptr);
  EXPECT_TRUE(names().empty());
}

TEST_F(WattlogWorker, EventsAreIndependentOfEachOther) {
  const auto session = sessionOf("a");
  handle(session, {{"EngineState", "EngineOff"}, {"Haptic_Active_Hardware_Time_Seconds", 1}});
  EXPECT_EQ(names(), (Strings{"Loom_Haptics_ClientStatus", "LeakedHapticsSessionInfo"}));
  handle(session, {{"Haptic_Active_Hardware_Time_Seconds", 1}});
  EXPECT_EQ(names(), (Strings{"LeakedHapticsSessionInfo"}));
}

// The application's name.

TEST_F(WattlogWorker, UnknownApplicationIsLeftOutOfTheDurationAndLoggedButNotOfTheStatus) {
  handle(makeSession(), {{"EngineOnTime", 1}, {"EngineState", "EngineOn"}, {"tarnreporting_timestamp", 5.0}});
  ASSERT_EQ(names(), (Strings{"Loom_Haptics_EngineOnDuration", "Loom_Haptics_ClientStatus"}));
  EXPECT_EQ(event(0).payload, (plist::Dictionary{{"EngineOnDuration", 1}, {"TimestampEnd", 5.0}}));
  EXPECT_EQ(event(1).payload,
            (plist::Dictionary{{"Status", 1}, {"ApplicationName", "Unknown"}, {"TimestampEnd", 5.0}}));
  EXPECT_EQ(errors(), (Strings{kNoName}));
}

TEST_F(WattlogWorker, ApplicationThatIsCalledUnknownCountsAsUnknown) {
  handle(sessionOf("Unknown"), {{"EngineOnTime", 1}, {"tarnreporting_timestamp", 5.0}});
  EXPECT_FALSE(event().payload.contains("ApplicationName"));
  EXPECT_EQ(errors(), (Strings{kNoName}));
}

TEST_F(WattlogWorker, OnlyTheExactWordIsUnknown) {
  for (const char* name : {"unknown", "Unknown ", ""}) {
    handle(sessionOf(name), {{"EngineOnTime", 1}, {"tarnreporting_timestamp", 5.0}});
    EXPECT_EQ(event().payload["ApplicationName"].text(), name);
  }
  EXPECT_TRUE(errors().empty());
}

TEST_F(WattlogWorker, ApplicationComesFromTheConfigurationNotFromTheMessage) {
  const auto session = makeSession();
  const plist::Dictionary configuration{{"KvHostApplicationDisplayID", "org.example.game"}};
  session->updateConfigurationWithContentsOfConfiguration(&configuration);
  session->sendMessage(haptics({{"EngineOnTime", 1}, {"HostApplicationDisplayID", "org.example.other"}}));
  EXPECT_EQ(event().payload["ApplicationName"].text(), "org.example.game");
}

TEST_F(WattlogWorker, ApplicationOfAnyKindIsItsText) {
  handle(sessionOf(42), {{"EngineOnTime", 1}, {"EngineState", 1}});
  EXPECT_EQ(event(0).payload["ApplicationName"].text(), "42");
  EXPECT_EQ(event(1).payload["ApplicationName"].text(), "42");
  handle(sessionOf(plist::Array{1, 2}), {{"EngineState", 1}});
  EXPECT_EQ(event().payload["ApplicationName"].text(), "(1, 2)");
}

TEST_F(WattlogWorker, SessionThatIsGoneIsLoggedForTheDurationAloneAndStopsNothing) {
  TarnReportingSessionWattlogWorker worker{std::weak_ptr<TarnReportingSession>()};
  worker.handleMessage(haptics({{"EngineOnTime", 1},
                                {"EngineState", "EngineOn"},
                                {"Haptic_Active_Hardware_Time_Seconds", 2},
                                {"tarnreporting_timestamp", 5.0}}));
  ASSERT_EQ(names().size(), 3U);
  EXPECT_FALSE(event(0).payload.contains("ApplicationName"));
  EXPECT_EQ(event(1).payload, (plist::Dictionary{{"Status", 1}, {"TimestampEnd", 5.0}}));
  EXPECT_EQ(errors(), (Strings{kNoName}));
}

// The time stamp.

TEST_F(WattlogWorker, MissingTimestampIsLoggedForTheDurationAloneAndStopsNothing) {
  handle(sessionOf("a"), {{"EngineOnTime", 1}, {"EngineState", "EngineOn"}});
  ASSERT_EQ(names().size(), 2U);
  EXPECT_EQ(event(0).payload, (plist::Dictionary{{"EngineOnDuration", 1}, {"ApplicationName", "a"}}));
  EXPECT_EQ(event(1).payload, (plist::Dictionary{{"Status", 1}, {"ApplicationName", "a"}}));
  EXPECT_EQ(errors(), (Strings{kNoTimestamp}));
}

TEST_F(WattlogWorker, BothMissingAreLoggedInOrder) {
  handle(makeSession(), {{"EngineOnTime", 1}});
  EXPECT_EQ(event().payload, (plist::Dictionary{{"EngineOnDuration", 1}}));
  EXPECT_EQ(errors(), (Strings{kNoName, kNoTimestamp}));
}

TEST_F(WattlogWorker, TimestampThatTheIntakePutsThereIsTaken) {
  sessionOf("a")->sendMessage(haptics({{"EngineOnTime", 1}}));
  EXPECT_EQ(event().payload["TimestampEnd"].asDouble(), now());
  EXPECT_TRUE(errors().empty());
}

// The values.

TEST_F(WattlogWorker, StatusIsOneForTheExactWordAlone) {
  const auto session = sessionOf("a");
  const auto statusOf = [&](const plist::ValueView& state) {
    handle(session, {{"EngineState", state}});
    EXPECT_EQ(event().payload["Status"].kind(), plist::Kind::Signed);
    return event().payload["Status"].asInt64();
  };
  EXPECT_EQ(statusOf("EngineOn"), 1);
  for (const char* state : {"EngineOff", "engineon", "ENGINEON", "EngineOn ", "EngineO", ""}) {
    EXPECT_EQ(statusOf(state), 0) << state;
  }
  EXPECT_EQ(statusOf(std::string("EngineOn\0", 9)), 0);
}

TEST_F(WattlogWorker, StateThatIsNoTextIsOff) {
  const auto session = sessionOf("a");
  for (const plist::Value& state : everyKind()) {
    handle(session, {{"EngineState", state}});
    EXPECT_EQ(event().payload["Status"].asInt64(), 0);
  }
  handle(session, {{"EngineState", plist::DataView{"EngineOn"}}});
  EXPECT_EQ(event().payload["Status"].asInt64(), 0);
}

TEST_F(WattlogWorker, ValuesOfEveryKindArePassedOnUnchanged) {
  const auto session = sessionOf("a");
  for (const plist::Value& value : everyKind()) {
    handle(session, {{"EngineOnTime", value},
                     {"EngineState", "EngineOn"},
                     {"tarnreporting_timestamp", value},
                     {"Haptic_Active_Hardware_Time_Seconds", value},
                     {"Active_Clients", value}});
    ASSERT_EQ(names().size(), 3U);
    for (const plist::ValueView& passed :
         {event(0).payload["EngineOnDuration"], event(0).payload["TimestampEnd"], event(1).payload["TimestampEnd"],
          event(2).payload["Haptic_Active_Hardware_Time_Seconds"], event(2).payload["Active_Clients"]}) {
      EXPECT_EQ(passed.kind(), value.kind());
      EXPECT_TRUE(passed == value.view());
    }
  }
  EXPECT_TRUE(errors().empty());
}

TEST_F(WattlogWorker, LeakWithoutClientsIsReportedWithoutThem) {
  handle(makeSession(), {{"Haptic_Active_Hardware_Time_Seconds", 61.5}, {"tarnreporting_timestamp", 5.0}});
  EXPECT_EQ(event().payload, (plist::Dictionary{{"Haptic_Active_Hardware_Time_Seconds", 61.5}}));
  EXPECT_TRUE(errors().empty());
}

// Where it runs.

TEST_F(WattlogWorker, RunsBeforeTheStartAndAddsNothingAtTheStop) {
  const auto session = sessionOf("a");
  EXPECT_EQ(session->workerInstanceCount(), 1U);
  session->sendMessage(haptics({{"EngineState", "EngineOn"}}));
  session->start();
  session->sendMessage(haptics({{"EngineState", "EngineOff"}}));
  session->stop();
  EXPECT_EQ(names().size(), 2U);
}

TEST_F(WattlogWorker, RunsInSingleMessageSessions) {
  makeSession(1, TarnReportingSession::Mode::SingleMessage)->sendMessage(haptics({{"EngineState", "EngineOn"}}));
  EXPECT_EQ(names().size(), 1U);
}

TEST_F(WattlogWorker, WithoutAPowerLogThereIsNoWorker) {
  platform_.facilities().wattlog = nullptr;
  const auto session = makeSession();
  EXPECT_EQ(session->workerInstanceCount(), 0U);
  session->sendMessage(haptics({{"EngineOnTime", 1}}));
  EXPECT_TRUE(errors().empty());
}

TEST_F(WattlogWorker, WhatIsMissingIsToldBeforeTheEvent) {
  const auto session = makeSession();
  const auto worker = TarnReportingSessionWattlogWorker::initWithSession(session);
  platform_.order.start();
  worker->handleMessage(haptics({{"EngineOnTime", 1}, {"EngineState", 1}, {"Haptic_Active_Hardware_Time_Seconds", 1}}));
  EXPECT_EQ(platform_.order.entries(), (Strings{std::string("log ") + kNoName, std::string("log ") + kNoTimestamp,
                                                "power Loom_Haptics_EngineOnDuration",
                                                "power Loom_Haptics_ClientStatus", "power LeakedHapticsSessionInfo"}));
}

}  // namespace
}  // namespace tarn
