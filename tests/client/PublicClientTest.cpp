// SPDX-License-Identifier: Apache-2.0
// The client as an outside program has it: requests, values and replies of the public headers.
#include <gtest/gtest.h>

#include <chrono>
#include <set>

#include "client/Requests.h"
#include "client/tarnkit/Values.h"
#include "tests/client/ScriptedServer.h"

#include <tarnkit/TarnReportingClient.h>

namespace tarn::client {
namespace {

using testing::Pair;
using testing::Served;

// A public client and the service's end of its connection.
struct PublicPair {
  explicit PublicPair(Pair pair = Pair()) : client(std::move(pair.client)), server(std::move(pair.server)) {}

  tarnkit::TarnReportingClient client;
  std::unique_ptr<testing::ScriptedServer> server;
};

std::string frameOf(const wire::Request& request) {
  std::string frame;
  wire::Encoder(frame).request(1, request);
  return frame;
}

TEST(PublicRequests, EachOperationIsThatOfTheWire) {
  const tarnkit::Dictionary values{{"a", 1}, {"b", "two"}};
  const plist::Dictionary packedValues{{"a", 1}, {"b", "two"}};
  const wire::ReporterIDs ids = std::vector<std::int64_t>{5, -6};
  const std::pair<tarnkit::Request, Request> rows[] = {
      {tarnkit::createReportingSession(-7), createReportingSession(-7)},
      {tarnkit::setServiceType(11, 5), setServiceType(11, 5)},
      {tarnkit::getServiceNameForReporterID(5), getServiceNameForReporterID(5)},
      {tarnkit::setConfiguration(values, 5), setConfiguration(packedValues, 5)},
      {tarnkit::startReportingSessionForID(5), startReportingSessionForID(5)},
      {tarnkit::sendMessage(values, 4, 2, ids), sendMessage(packedValues, 4, 2, ids)},
      {tarnkit::stopReportingSessionForID(5), stopReportingSessionForID(5)},
      {tarnkit::destroyReportingSession(5), destroyReportingSession(5)},
      {tarnkit::reporterID(5), reporterID(5)},
      {tarnkit::getAllReporters(), getAllReporters()},
      {tarnkit::killService(), killService()},
      {tarnkit::status(), status()},
      {tarnkit::settle(), settle()}};
  std::set<Operation> seen;
  for (const auto& [request, ours] : rows) {
    EXPECT_EQ(frameOf(request.content()), frameOf(ours)) << wire::operationName(ours.operation);
    seen.insert(request.content().operation);
  }
  EXPECT_EQ(seen.size(), wire::kOperations.size() - 2);  // all but those of the shared rings
}

TEST(PublicRequests, AMessageWithoutIDsGoesToEveryRunningSession) {
  EXPECT_EQ(tarnkit::sendMessage({}, 1, 2).content().reporterIDs, std::nullopt);
}

TEST(PublicValues, EveryKindIsPackedAsItself) {
  const plist::Dictionary found = packed({{"bool", true},
                                          {"signed", -3},
                                          {"unsigned", 18446744073709551615U},
                                          {"float", 0.5F},
                                          {"double", 2.5},
                                          {"date", tarnkit::Date{12.5}},
                                          {"text", "word"},
                                          {"data", tarnkit::Data{std::string("a\0b", 3)}},
                                          {"array", tarnkit::Array{1, tarnkit::Array{"x"}}},
                                          {"dictionary", tarnkit::Dictionary{{"z", 1}, {"y", tarnkit::Dictionary()}}}});
  const plist::Dictionary expected{{"bool", true},
                                   {"signed", -3},
                                   {"unsigned", 18446744073709551615U},
                                   {"float", 0.5F},
                                   {"double", 2.5},
                                   {"date", plist::Date{12.5}},
                                   {"text", "word"},
                                   {"data", plist::DataView{std::string_view("a\0b", 3)}},
                                   {"array", plist::Array{1, plist::Array{"x"}}},
                                   {"dictionary", plist::Dictionary{{"z", 1}, {"y", plist::Dictionary()}}}};
  EXPECT_EQ(found, expected);
  EXPECT_TRUE(found.sharesKeysWith(expected));
  EXPECT_EQ(found.get("bool").kind(), plist::Kind::Bool);
  EXPECT_EQ(found.get("float").kind(), plist::Kind::Float);
  EXPECT_EQ(found.get("dictionary").asText(), "{z = 1; y = {}}");
}

TEST(PublicValues, EveryKindIsUnpackedAsItself) {
  const tarnkit::Value value =
      unpacked(plist::Array{true, -3, 18446744073709551615U, 0.5F, 2.5, plist::Date{12.5}, "word",
                            plist::DataView{"ab"}, plist::Array{1}, plist::Dictionary{{"z", 1}, {"a", 2}}});
  const auto& items = *value.as<tarnkit::Array>();
  ASSERT_EQ(items.size(), 10U);
  EXPECT_EQ(*items[0].as<bool>(), true);
  EXPECT_EQ(*items[1].as<std::int64_t>(), -3);
  EXPECT_EQ(*items[2].as<std::uint64_t>(), 18446744073709551615U);
  EXPECT_EQ(*items[3].as<float>(), 0.5F);
  EXPECT_EQ(*items[4].as<double>(), 2.5);
  EXPECT_EQ(items[5].as<tarnkit::Date>()->epochSeconds, 12.5);
  EXPECT_EQ(*items[6].as<std::string>(), "word");
  EXPECT_EQ(items[7].as<tarnkit::Data>()->bytes, "ab");
  EXPECT_EQ(*items[8].as<tarnkit::Array>()->front().as<std::int64_t>(), 1);
  EXPECT_EQ(items[9].as<tarnkit::Dictionary>()->begin()->key, "z");
  EXPECT_EQ(items[0].as<std::int64_t>(), nullptr);
}

TEST(PublicValues, AKeyGivenTwiceKeepsItsPlaceAndTheLaterValue) {
  const tarnkit::Dictionary dictionary{{"a", 1}, {"b", 2}, {"a", 3}};
  EXPECT_EQ(dictionary.size(), 2U);
  EXPECT_EQ(dictionary.begin()->key, "a");
  EXPECT_EQ(*dictionary.find("a")->as<std::int64_t>(), 3);
  EXPECT_EQ(dictionary.find("c"), nullptr);
}

TEST(PublicClient, ACallAnswersWithPlainValues) {
  PublicPair pair;
  const Served serving([&] {
    pair.server->reply(pair.server->take()->id, {65535});
    pair.server->reply(pair.server->take()->id, {plist::Array{5, -6}});
    pair.server->reply(pair.server->take()->id, {plist::Dictionary{{"sessions", 3}}});
  });
  EXPECT_EQ(pair.client.call(tarnkit::getServiceNameForReporterID(5)).number(), 65535);
  EXPECT_EQ(pair.client.call(tarnkit::getAllReporters()).numbers(), (std::vector<std::int64_t>{5, -6}));
  const tarnkit::Dictionary status = pair.client.call(tarnkit::status()).dictionary();
  ASSERT_NE(status.find("sessions"), nullptr);
  EXPECT_EQ(*status.find("sessions")->as<std::int64_t>(), 3);
}

TEST(PublicClient, ResultsOfAnotherKindReadAsNothing) {
  tarnkit::Reply reply;
  EXPECT_EQ(reply.number(), 0);
  reply.results.emplace_back("text");
  EXPECT_EQ(reply.number(), 0);
  EXPECT_TRUE(reply.dictionary().empty());
  EXPECT_TRUE(reply.numbers().empty());
}

TEST(PublicClient, ErrorsReachTheHandlerWithDomainCodeAndText) {
  PublicPair pair;
  tarnkit::Reply heard;
  ASSERT_EQ(
      pair.client.send(tarnkit::setConfiguration({}, 5), [&](tarnkit::Reply&& reply) { heard = std::move(reply); }),
      SendStatus::Sent);
  EXPECT_TRUE(pair.client.flush());
  pair.server->fail(pair.server->take()->id, 3, "no");
  EXPECT_EQ(pair.client.wait(std::chrono::seconds(5)), 1U);
  EXPECT_EQ(heard.outcome, Outcome::Error);
  EXPECT_EQ(heard.error.domain, "domain");
  EXPECT_EQ(heard.error.code, 3);
  EXPECT_EQ(heard.error.text, "no");
}

TEST(PublicClient, FuturesBecomeReadyWhileTheOwnerDrives) {
  PublicPair pair;
  std::future<tarnkit::Reply> first = pair.client.sendForFuture(tarnkit::getAllReporters());
  std::future<tarnkit::Reply> second = pair.client.sendForFuture(tarnkit::getAllReporters());
  pair.client.flush();
  pair.server->acknowledge(1);
  pair.client.wait(std::chrono::seconds(5));
  ASSERT_EQ(first.wait_for(std::chrono::seconds(0)), std::future_status::ready);
  EXPECT_TRUE(first.get().ok());
  pair.client.close();
  EXPECT_EQ(second.get().outcome, Outcome::Cancelled);
  EXPECT_EQ(pair.client.sendForFuture(tarnkit::getAllReporters()).get().outcome, Outcome::ConnectionLost);
}

TEST(PublicClient, TellsTheOwnerWhenTheConnectionIsLost) {
  PublicPair pair;
  std::string why;
  pair.client.setLostHandler([&](const std::string& reason) { why = reason; });
  EXPECT_GE(pair.client.fd(), 0);
  pair.server->hangUp();
  pair.client.wait(std::chrono::seconds(5));
  EXPECT_EQ(why, "the service ended the connection");
  EXPECT_FALSE(pair.client.connected());
  EXPECT_EQ(pair.client.fd(), -1);
}

TEST(PublicClient, SaysWhyItCannotConnect) {
  const auto missing = tarnkit::TarnReportingClient::connect("/nonexistent/socket");
  EXPECT_EQ(missing.client, nullptr);
  EXPECT_EQ(missing.errorNumber, ENOENT);
  EXPECT_NE(missing.error.find("/nonexistent/socket"), std::string::npos);
}

}  // namespace
}  // namespace tarn::client
