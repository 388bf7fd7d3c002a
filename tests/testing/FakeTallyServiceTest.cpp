// SPDX-License-Identifier: Apache-2.0
#include "testing/backends/FakeTallyService.h"

#include <gtest/gtest.h>

namespace tarn::testing {
namespace {

// Hands an event over and tells whether its callback was called by the end of the call.
bool sendCallsBack(FakeTallyService& tally, const char* name) {
  bool called = false;
  tally.sendEventLazy(name, [&called] {
    called = true;
    return plist::Dictionary{{"key", 1}};
  });
  return called;
}

TEST(FakeTallyService, RecordsNameAndPayloadAtOnce) {
  FakeTallyService tally;
  EXPECT_TRUE(sendCallsBack(tally, "event"));
  ASSERT_EQ(tally.events().size(), 1U);
  EXPECT_EQ(tally.payloads("event").front(), (plist::Dictionary{{"key", 1}}));
}

TEST(FakeTallyService, EventThatNobodyWantsIsNotRecorded) {
  FakeTallyService tally;
  tally.useOnly({"wanted"});
  EXPECT_TRUE(tally.eventIsInUse("wanted"));
  EXPECT_FALSE(tally.eventIsInUse("event"));
  EXPECT_FALSE(sendCallsBack(tally, "event"));
  EXPECT_TRUE(tally.events().empty());
  EXPECT_EQ(tally.sentNames(), std::vector<std::string>{"event"});
}

TEST(FakeTallyService, LateCallbacksAreCalledInOrderWhenTold) {
  FakeTallyService tally;
  tally.setPayloadCalls(FakeTallyService::PayloadCalls::Later);
  tally.sendEventLazy("one", [] { return plist::Dictionary{}; });
  tally.sendEventLazy("two", [] { return plist::Dictionary{}; });
  EXPECT_TRUE(tally.events().empty());
  EXPECT_EQ(tally.callPending(), 2U);
  EXPECT_EQ(tally.events().front().name, "one");
}

TEST(FakeTallyService, CallbacksMayNeverBeCalled) {
  FakeTallyService tally;
  tally.setPayloadCalls(FakeTallyService::PayloadCalls::Never);
  EXPECT_FALSE(sendCallsBack(tally, "event"));
  EXPECT_EQ(tally.callPending(), 0U);
  EXPECT_TRUE(tally.events().empty());
}

}  // namespace
}  // namespace tarn::testing
