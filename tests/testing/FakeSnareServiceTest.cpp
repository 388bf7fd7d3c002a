// SPDX-License-Identifier: Apache-2.0
#include "testing/backends/FakeSnareService.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <string>

namespace tarn::testing {
namespace {

using platform::SnareReplyKeys;
using platform::SnareSignatureKeys;
using Reply = std::optional<plist::Dictionary>;

platform::SnareReporter::ReplyHandler keepIn(std::vector<Reply>& replies) {
  return [&replies](const Reply& reply) { replies.push_back(reply); };
}

TEST(FakeSnareService, LeavesAbsentFieldsOutOfASignature) {
  FakeSnareService service;
  platform::SnareSignature signature{"domain", "type", "sub", "context", {}, {}};

  const auto bare = service.createReporter()->makeSignature(signature);
  signature.detectedProcess = "player";
  const auto whole = service.createReporter()->makeSignature(signature);

  EXPECT_EQ(bare.size(), 4U);
  EXPECT_FALSE(bare.contains(SnareSignatureKeys::kDetectedProcess));
  EXPECT_EQ(whole.get(SnareSignatureKeys::kDetectedProcess).text(), "player");
  EXPECT_EQ(whole.get(SnareSignatureKeys::kSubTypeContext).text(), "context");
}

TEST(FakeSnareService, RepliesWithAFreshIdentifierToEachRequest) {
  FakeSnareService service;
  std::vector<Reply> replies;
  const auto reporter = service.createReporter();

  EXPECT_TRUE(reporter->requestSnapshot({}, keepIn(replies)));
  EXPECT_TRUE(reporter->startSession({{}, 60, {}}, keepIn(replies)));

  ASSERT_EQ(replies.size(), 2U);
  EXPECT_TRUE(replies[0]->get(SnareReplyKeys::kSuccess).boolValue());
  EXPECT_EQ(replies[0]->get(SnareReplyKeys::kSessionIdentifier).text(), "capture-1");
  EXPECT_EQ(replies[1]->get(SnareReplyKeys::kSessionIdentifier).text(), "capture-2");
  EXPECT_EQ(service.calls()[1].kind, FakeSnareService::Kind::StartSession);
  EXPECT_EQ(service.calls()[1].request.durationSeconds, 60);
}

TEST(FakeSnareService, RefusesWithTheReason) {
  FakeSnareService service;
  std::vector<Reply> replies;
  service.refuseWith(platform::SnareReason::DailyLimitExceeded);

  EXPECT_TRUE(service.createReporter()->requestSnapshot({}, keepIn(replies)));

  ASSERT_EQ(replies.size(), 1U);
  EXPECT_FALSE(replies[0]->get(SnareReplyKeys::kSuccess).boolValue());
  EXPECT_EQ(replies[0]->get(SnareReplyKeys::kReasonCode).asInt64(), 6);
}

TEST(FakeSnareService, ARequestThatIsNotAcceptedHasNoReply) {
  FakeSnareService service;
  std::vector<Reply> replies;
  service.setAccepts(false);

  EXPECT_FALSE(service.createReporter()->requestSnapshot({}, keepIn(replies)));

  EXPECT_TRUE(replies.empty());
  ASSERT_EQ(service.calls().size(), 1U);
  EXPECT_FALSE(service.calls()[0].accepted);
}

TEST(FakeSnareService, AReplyMayBeScriptedOrNone) {
  FakeSnareService service;
  std::vector<Reply> replies;
  service.replyNextWith(std::nullopt);
  service.replyNextWith(plist::Dictionary{{"success", true}});
  const auto reporter = service.createReporter();

  EXPECT_TRUE(reporter->requestSnapshot({}, keepIn(replies)));
  EXPECT_TRUE(reporter->requestSnapshot({}, keepIn(replies)));

  ASSERT_EQ(replies.size(), 2U);
  EXPECT_FALSE(replies[0]);
  EXPECT_EQ(replies[1]->size(), 1U);
}

TEST(FakeSnareService, KeepsCancelsAndWhichReporterAsked) {
  FakeSnareService service;
  service.createReporter();

  service.createReporter()->cancelSession("capture-1");

  ASSERT_EQ(service.calls().size(), 1U);
  EXPECT_EQ(service.calls()[0].kind, FakeSnareService::Kind::CancelSession);
  EXPECT_EQ(service.calls()[0].cancelledIdentifier, "capture-1");
  EXPECT_EQ(service.calls()[0].reporter, 2U);
  EXPECT_EQ(service.reporters(), 2U);
}

TEST(FakeSnareService, AHeldReplyComesAfterItsReporterIsGone) {
  FakeSnareService service;
  std::vector<Reply> replies;
  service.replies().set(ReplyFault::Hold);
  EXPECT_TRUE(service.createReporter()->requestSnapshot({}, keepIn(replies)));
  EXPECT_TRUE(replies.empty());

  service.replies().deliverHeld();

  EXPECT_EQ(replies.size(), 1U);
}

}  // namespace
}  // namespace tarn::testing
