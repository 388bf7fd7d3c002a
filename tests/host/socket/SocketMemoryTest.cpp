// SPDX-License-Identifier: Apache-2.0
// What a client sees when memory is missing for its request, for its connection and for its end.
#include "host/system/MemoryReserve.h"
#include "tests/host/socket/SocketFixture.h"

namespace tarn::linux_host {
namespace {

using testing::eventually;
using testing::messageRequest;
using testing::requestOf;
using testing::TestClient;
using wire::Operation;
using Short = testing::RecordingService::Short;
using Loss = MemoryReserve::Loss;

class SocketMemoryTest : public testing::SocketFixture {
 protected:
  void beShort(Short where) {
    running_.onQueue([&] { service_->shortOfMemory = where; });
  }
  static void expectRefused(const std::optional<wire::DecodedReply>& reply) {
    ASSERT_TRUE(reply);
    ASSERT_TRUE(reply->error);
    EXPECT_EQ(reply->error->domain, wire::kErrorDomain);
    EXPECT_EQ(reply->error->code, 5);
    EXPECT_EQ(reply->error->text, "out of memory");
  }
  static void expectServed(const std::optional<wire::DecodedReply>& reply) {
    ASSERT_TRUE(reply);
    EXPECT_FALSE(reply->error);
  }
  std::uint64_t refused() { return ledger().requestsRefused[4]; }
};

TEST_F(SocketMemoryTest, ARequestThatCanNotBeHandedOverIsRefusedAndTheNextOneServed) {
  serve();
  TestClient client(path_);
  beShort(Short::HandingOver);
  expectRefused(client.ask(1, requestOf(Operation::CreateReportingSession, 7)));
  expectRefused(client.ask(2, messageRequest({{"a", 1}})));
  beShort(Short::Nowhere);
  expectServed(client.ask(3, requestOf(Operation::CreateReportingSession, 7)));
  EXPECT_EQ(refused(), 2U);
  EXPECT_EQ(events(), (std::vector<std::string>{"1 createReportingSession 7"}));
}

TEST_F(SocketMemoryTest, ARequestWhoseWorkFailsIsRefusedAndTheNextOneServed) {
  serve();
  TestClient client(path_);
  const auto before = MemoryReserve::counts();
  beShort(Short::Working);
  expectRefused(client.ask(1, requestOf(Operation::SetConfiguration, 7)));
  beShort(Short::Nowhere);
  expectServed(client.ask(2, requestOf(Operation::SetConfiguration, 7)));
  EXPECT_EQ(refused(), 1U);
  const auto after = MemoryReserve::counts();
  EXPECT_EQ(after.of(Loss::Request), before.of(Loss::Request) + 1);
  EXPECT_EQ(after.of(Loss::Work), before.of(Loss::Work) + 1);
  EXPECT_EQ(after.of(Loss::Connection), before.of(Loss::Connection));
}

TEST_F(SocketMemoryTest, ARequestThatWasAnsweredBeforeItsWorkFailedIsNotAnsweredAgain) {
  serve();
  TestClient client(path_);
  beShort(Short::AfterTheReply);
  expectServed(client.ask(1, requestOf(Operation::SetConfiguration, 7)));
  beShort(Short::Nowhere);
  const auto next = client.ask(2, requestOf(Operation::SetConfiguration, 7));
  expectServed(next);
  EXPECT_EQ(next->id, 2U);
  EXPECT_EQ(refused(), 0U);
}

TEST_F(SocketMemoryTest, AReplyThatIsHeldComesThoughALaterRequestFails) {
  serve();
  TestClient client(path_);
  ASSERT_TRUE(client.request(1, requestOf(Operation::StartReportingSessionForID, 7)));
  ASSERT_TRUE(eventuallyHappens("1 startReportingSessionForID 7"));
  beShort(Short::Working);
  expectRefused(client.ask(2, messageRequest({{"a", 1}})));
  beShort(Short::Nowhere);
  running_.onQueue([&] { service_->heldStarts.front().reply(std::nullopt, true); });
  const auto held = client.reply();
  expectServed(held);
  EXPECT_EQ(held->id, 1U);
}

TEST_F(SocketMemoryTest, RequestsThatWaitBehindOneThatFailsAreServedInTheirOrder) {
  serve();
  TestClient client(path_);
  beShort(Short::Working);
  for (std::uint64_t id = 1; id <= 50; ++id) {
    ASSERT_TRUE(client.request(id, messageRequest({{"number", id}})));
  }
  for (std::uint64_t id = 1; id <= 50; ++id) {
    const auto reply = client.reply();
    expectRefused(reply);
    EXPECT_EQ(reply->id, id);
  }
}

TEST_F(SocketMemoryTest, AClientThatCanNotBeTakenIsClosedAndTheNextOneTaken) {
  serve();
  beShort(Short::Accepting);
  TestClient first(path_);
  EXPECT_TRUE(first.ended());
  beShort(Short::Nowhere);
  TestClient second(path_);
  EXPECT_TRUE(second.status());
  EXPECT_EQ(ledger().connectionsOpen, 1U);
}

TEST_F(SocketMemoryTest, AnEndWhoseHandlersFailIsAnEnd) {
  serve();
  {
    TestClient client(path_);
    ASSERT_TRUE(client.status());
    beShort(Short::Ending);
    ASSERT_TRUE(client.send("\xff\xff\xff\xff"));  // a frame that is too long: it is cut off
    EXPECT_TRUE(client.ended());
  }
  ASSERT_TRUE(eventuallyHappens("1 invalidated"));
  ASSERT_TRUE(eventually([&] { return ledger().connectionsOpen == 0; }));
  EXPECT_EQ(events(), (std::vector<std::string>{"1 interrupted", "1 invalidated"}));
  beShort(Short::Nowhere);
  TestClient next(path_);
  EXPECT_TRUE(next.status());
}

}  // namespace
}  // namespace tarn::linux_host
