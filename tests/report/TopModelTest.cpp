// SPDX-License-Identifier: Apache-2.0
#include "tools/ctl/views/TopModel.h"

#include <gtest/gtest.h>

#include <algorithm>

namespace tarn::ctl {
namespace {

OpenSession session(std::int64_t id, std::optional<std::int64_t> newMessages) {
  OpenSession open;
  open.id = id;
  open.pid = 4711;
  open.process = "player";
  open.application = "org.example.player";
  open.serviceName = "longformaudio";
  open.created = 1000;
  open.newMessages = newMessages;
  return open;
}

TopSample sample(double steady, const plist::Dictionary& status) {
  TopSample looked;
  looked.steady = steady;
  looked.time = 1'795'168'800 + steady;
  looked.status = status;
  return looked;
}

const TopNumber* named(const std::vector<TopNumber>& numbers, const std::string& name) {
  for (const TopNumber& number : numbers) {
    if (number.name == name) return &number;
  }
  return nullptr;
}

TEST(TopModel, FirstLookHasNoRates) {
  TopSample now = sample(5, {{"frames_received", 100}});
  now.sessions = {session(1, std::nullopt)};
  const TopView view = topView(now, nullptr);
  ASSERT_EQ(view.ledger.size(), 1U);
  EXPECT_EQ(view.ledger[0].value, 100);
  EXPECT_FALSE(view.ledger[0].rate);
  EXPECT_FALSE(view.sessions.at(0).rate);
}

TEST(TopModel, RatesAreBySecondsBetweenTwoLooks) {
  const TopSample before = sample(5, {{"frames_received", 100}});
  TopSample now = sample(7, {{"frames_received", 130}});
  now.sessions = {session(1, 8)};
  const TopView view = topView(now, &before);
  EXPECT_EQ(view.ledger.at(0).rate, 15);
  EXPECT_EQ(view.sessions.at(0).rate, 4);
}

TEST(TopModel, CounterThatFellHasNoRate) {
  const TopSample before = sample(5, {{"frames_received", 100}});
  const TopView view = topView(sample(7, {{"frames_received", 3}}), &before);
  EXPECT_FALSE(view.ledger.at(0).rate);
}

TEST(TopModel, LevelsAreToldApartFromWhatIsCounted) {
  const TopView view = topView(sample(5, {{"queued", 3}, {"replies_sent", 9}, {"recorder_waiting", 4}}), nullptr);
  EXPECT_EQ(view.levels.size(), 2U);
  ASSERT_NE(named(view.levels, "recorder_waiting"), nullptr);
  EXPECT_EQ(named(view.levels, "recorder_waiting")->value, 4);
  EXPECT_EQ(named(view.ledger, "queued"), nullptr);
  EXPECT_NE(named(view.ledger, "replies_sent"), nullptr);
}

TEST(TopModel, CountersByReasonCountAsTheirSum) {
  const plist::Dictionary reasons{{"reset", 2}, {"half_frame", 3}};
  const TopView view = topView(sample(5, {{"connections_cut", reasons}}), nullptr);
  EXPECT_EQ(view.ledger.at(0).value, 5);
}

TEST(TopModel, QuotasAreNoNumbers) {
  const plist::Dictionary quotas{{"limits", 7}};
  EXPECT_TRUE(topView(sample(5, {{"quotas", quotas}}), nullptr).ledger.empty());
}

TEST(TopModel, BusiestSessionsComeFirstThenTheNewest) {
  const TopSample before = sample(5, {});
  TopSample now = sample(6, {});
  now.sessions = {session(1, 0), session(2, 5), session(3, 0)};
  const TopView view = topView(now, &before);
  ASSERT_EQ(view.sessions.size(), 3U);
  EXPECT_EQ(view.sessions[0].session.id, 2);
  EXPECT_EQ(view.sessions[1].session.id, 3);
  EXPECT_EQ(view.sessions[2].session.id, 1);
}

TEST(TopLines, ShowSessionsWithRateAndLastMessage) {
  const TopSample before = sample(5, {});
  TopSample now = sample(6, {{"queued", 3}});
  now.sessions = {session(12, 5)};
  now.sessions[0].lastMessage = "Playback.Start";
  now.sessions[0].lastTime = 1'795'168'800;
  const std::vector<std::string> lines = topLines(topView(now, &before), 200, 100);
  ASSERT_EQ(lines.size(), 6U);
  EXPECT_EQ(lines[0], "2026-11-20 10:00:06 UTC  the service is up");
  EXPECT_EQ(lines[1], "levels  queued 3");
  EXPECT_EQ(lines[2], "ledger");
  EXPECT_EQ(lines[5],
            "12       5.0        org.example.player           longformaudio      player 4711            "
            "10:00:00  Playback.Start");
}

TEST(TopLines, HeadingStandsAboveItsColumns) {
  TopSample now = sample(6, {});
  now.sessions = {session(12, std::nullopt)};
  const std::vector<std::string> lines = topLines(topView(now, nullptr), 200, 100);
  ASSERT_EQ(lines.size(), 6U);
  for (const char* const pair : {"APPLICATION|org.example", "TYPE|longform", "CLIENT|player 4711"}) {
    const std::string text = pair;
    const std::size_t bar = text.find('|');
    EXPECT_EQ(lines[4].find(text.substr(0, bar)), lines[5].find(text.substr(bar + 1))) << pair;
  }
}

TEST(TopLines, NoneIsWiderOrMoreThanThereIsRoomFor) {
  plist::Dictionary status;
  for (int index = 0; index < 40; ++index) {
    status.set(std::string_view("counter_" + std::to_string(index)), 1000 + index);
  }
  TopSample now = sample(6, status);
  for (std::int64_t id = 1; id <= 100; ++id) {
    now.sessions.push_back(session(id, 1));
    now.sessions.back().application = std::string(500, 'x');
    now.sessions.back().lastMessage = std::string(500, 'y');
  }
  const std::vector<std::string> lines = topLines(topView(now, nullptr), 80, 30);
  EXPECT_EQ(lines.size(), 30U);
  EXPECT_TRUE(lines.back().starts_with("and ")) << lines.back();
  for (const std::string& line : lines) {
    const auto isFirst = [](char byte) { return (static_cast<unsigned char>(byte) & 0xC0U) != 0x80; };
    EXPECT_LE(std::count_if(line.begin(), line.end(), isFirst), 80) << line;
  }
}

TEST(TopLines, SayWhyThereIsNoServiceAndWhyNoSession) {
  TopSample now;
  now.whyNot = "nobody listens";
  now.storeTrouble = "there is no store";
  const std::vector<std::string> lines = topLines(topView(now, nullptr), 200, 100);
  ASSERT_EQ(lines.size(), 3U);
  EXPECT_NE(lines[0].find("the service doesn't answer: nobody listens"), std::string::npos);
  EXPECT_EQ(lines[2], "no sessions: there is no store");
}

TEST(TopLines, TextsOfClientsSteerNoTerminal) {
  TopSample now = sample(6, {});
  now.sessions = {session(1, 0)};
  now.sessions[0].process = "\x1b[2J";
  now.sessions[0].application = "a\nb";
  for (const std::string& line : topLines(topView(now, nullptr), 200, 100)) {
    EXPECT_EQ(line.find_first_of("\x1b\n"), std::string::npos) << line;
  }
}

TEST(TopJson, HasTheServicesDictionaryRatesAndSessions) {
  const TopSample before = sample(5, {{"frames_received", 100}, {"quotas", plist::Dictionary{{"limits", 7}}}});
  TopSample now = sample(7, {{"frames_received", 130}, {"quotas", plist::Dictionary{{"limits", 7}}}});
  now.sessions = {session(1, 8), session(2, 0)};
  now.sessions[0].lastMessage = "Playback.Start";
  now.sessions[0].lastTime = 6.5;
  EXPECT_EQ(
      topJson(topView(now, &before)),
      "{\"time\":1795168807.0,\"up\":true,\"status\":{\"frames_received\":130},\"rates\":{\"frames_received\":15.0},"
      "\"sessions\":[{\"id\":1,\"reporter\":0,\"pid\":4711,\"process\":\"player\",\"application\":"
      "\"org.example.player\",\"service_name\":\"longformaudio\",\"created\":1000.0,\"rate\":4.0,"
      "\"last\":\"Playback.Start\",\"last_time\":6.5},{\"id\":2,\"reporter\":0,\"pid\":4711,\"process\":\"player\","
      "\"application\":\"org.example.player\",\"service_name\":\"longformaudio\",\"created\":1000.0,\"rate\":0.0}]}");
}

TEST(TopJson, SaysThatTheServiceIsNotUp) {
  TopSample now;
  now.whyNot = "nobody listens";
  EXPECT_EQ(topJson(topView(now, nullptr)),
            "{\"time\":0.0,\"up\":false,\"why_not\":\"nobody listens\",\"sessions\":[]}");
}

}  // namespace
}  // namespace tarn::ctl
