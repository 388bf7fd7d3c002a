// SPDX-License-Identifier: Apache-2.0
// Each remote operation as it reaches the service, and its result as it reaches the owner.
#include <gtest/gtest.h>

#include "tests/client/ScriptedServer.h"

namespace tarn::client {
namespace {

using testing::Pair;
using testing::Served;
using wire::Operation;

// Runs the call against a server that answers with the results; returns the request that the server saw.
template <class Call>
wire::DecodedRequest requestOf(Pair& pair, std::initializer_list<plist::ValueView> results, const Call& call) {
  wire::DecodedRequest seen;
  {
    const Served serving([&] {
      seen = pair.server->take().value();
      pair.server->reply(seen.id, results);
    });
    call(*pair.client);
  }
  return seen;
}

TEST(Requests, OperationsOnOneSession) {
  const std::pair<Request, Operation> requests[] = {
      {createReportingSession(-7), Operation::CreateReportingSession},
      {getServiceNameForReporterID(-7), Operation::GetServiceNameForReporterID},
      {stopReportingSessionForID(-7), Operation::StopReportingSessionForID},
      {destroyReportingSession(-7), Operation::DestroyReportingSession},
      {reporterID(-7), Operation::ReporterID}};
  for (const auto& [request, operation] : requests) {
    Pair pair;
    const auto seen =
        requestOf(pair, {true}, [&made = request](ClientConnection& client) { EXPECT_TRUE(client.call(made).ok()); });
    EXPECT_EQ(seen.operation, operation);
    EXPECT_EQ(seen.reporterID, -7);
  }
}

TEST(Requests, SetServiceType) {
  Pair pair;
  const auto seen =
      requestOf(pair, {true}, [](ClientConnection& client) { EXPECT_TRUE(client.call(setServiceType(11, 5)).ok()); });
  EXPECT_EQ(seen.operation, Operation::SetServiceType);
  EXPECT_EQ(seen.serviceType, 11);
  EXPECT_EQ(seen.reporterID, 5);
}

TEST(Requests, SetConfiguration) {
  Pair pair;
  const auto seen = requestOf(pair, {true}, [](ClientConnection& client) {
    EXPECT_TRUE(client.call(setConfiguration({{"a", 1}}, 5)).ok());
  });
  EXPECT_EQ(seen.operation, Operation::SetConfiguration);
  EXPECT_EQ(seen.dictionary, (plist::Dictionary{{"a", 1}}));
}

TEST(Requests, SendMessage) {
  Pair pair;
  const auto seen = requestOf(pair, {}, [](ClientConnection& client) {
    EXPECT_TRUE(client.call(sendMessage({{"a", 1}}, 4, 2, std::vector<std::int64_t>{5, 6})).ok());
  });
  EXPECT_EQ(seen.operation, Operation::SendMessage);
  EXPECT_EQ(seen.category, 4U);
  EXPECT_EQ(seen.type, 2);
  EXPECT_EQ(seen.reporterIDs, (std::vector<std::int64_t>{5, 6}));
}

TEST(Requests, GetServiceNameAnswersANumber) {
  Pair pair;
  requestOf(pair, {65535},
            [](ClientConnection& client) { EXPECT_EQ(client.call(getServiceNameForReporterID(5)).number(), 65535); });
}

TEST(Requests, GetAllReportersAnswersNumbers) {
  Pair pair;
  const plist::Array ids{5, -6};
  const auto seen = requestOf(pair, {ids}, [](ClientConnection& client) {
    EXPECT_EQ(client.call(getAllReporters()).numbers(), (std::vector<std::int64_t>{5, -6}));
  });
  EXPECT_EQ(seen.operation, Operation::GetAllReporters);
}

TEST(Requests, StatusAnswersADictionary) {
  Pair pair;
  const plist::Dictionary counters{{"sessions", 3}};
  const auto seen = requestOf(
      pair, {counters}, [&](ClientConnection& client) { EXPECT_EQ(client.call(status()).dictionary(), counters); });
  EXPECT_EQ(seen.operation, Operation::Status);
}

TEST(Requests, SettleIsAnsweredWithoutAResult) {
  Pair pair;
  const auto seen = requestOf(pair, {}, [&](ClientConnection& client) { EXPECT_TRUE(client.call(settle()).ok()); });
  EXPECT_EQ(seen.operation, Operation::Settle);
}

TEST(Requests, StartIsSentAndDoesNotWait) {
  Pair pair;
  EXPECT_EQ(pair.client->send(startReportingSessionForID(5)), SendStatus::Sent);
  pair.client->flush();
  EXPECT_EQ(pair.server->take()->operation, Operation::StartReportingSessionForID);
}

TEST(Requests, ResultsOfAnotherKindReadAsNothing) {
  Reply reply;
  EXPECT_EQ(reply.number(), 0);
  reply.results.emplace_back("text");
  EXPECT_EQ(reply.number(), 0);
  EXPECT_TRUE(reply.dictionary().empty());
  EXPECT_TRUE(reply.numbers().empty());
}

TEST(Reply, EveryOutcomeHasAName) {
  const std::vector<std::string_view> names{"ok",        "error", "cancelled", "connection lost",
                                            "timed out", "full",  "too large"};
  for (std::size_t at = 0; at < names.size(); ++at) {
    EXPECT_EQ(outcomeName(static_cast<Outcome>(at)), names[at]);
  }
  EXPECT_EQ(static_cast<std::size_t>(Outcome::TooLarge), names.size() - 1);
}

TEST(Reply, ResultsReadAsWhatTheyAre) {
  Reply reply;
  reply.results.emplace_back(plist::Array{1, -2});
  EXPECT_EQ(reply.numbers(), (std::vector<std::int64_t>{1, -2}));
  EXPECT_EQ(reply.number(), 0);
  reply.results.front() = plist::Value(-7);
  EXPECT_EQ(reply.number(), -7);
}

}  // namespace
}  // namespace tarn::client
