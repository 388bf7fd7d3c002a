// SPDX-License-Identifier: Apache-2.0
#include "host/socket/Ledger.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "host/system/DescriptorLimit.h"

namespace tarn::linux_host {
namespace {

TEST(Ledger, StatusHasEveryMemberFromTheStart) {
  const auto status = Ledger().status(0, 0, {});
  for (const char* member : {"frames_received", "messages_received", "replies_sent", "connections_open",
                             "connections_total", "sessions", "queued", "recorder_handed_over", "recorder_committed",
                             "recorder_waiting", "recorder_expired", "recorder_failed", "recorder_lost_before"}) {
    EXPECT_EQ(status.get(member), plist::ValueView(0)) << member;
  }
  EXPECT_EQ(plist::description(status.get("requests_refused")),
            "{unknown_operation = 0; bad_arguments = 0; not_property_list = 0; over_quota = 0; out_of_memory = 0; "
            "admin_only = 0}");
  EXPECT_EQ(plist::description(status.get("connections_cut")),
            "{unreadable_frame = 0; oversize_frame = 0; unread_replies = 0; half_frame = 0; stale_frame = 0; reset = "
            "0; out_of_memory = 0}");
}

TEST(Ledger, StatusTellsWhatOthersCount) {
  const auto status = Ledger().status(std::uint64_t{3}, 4, {10, 7, 2, 5, 1, 6});
  EXPECT_EQ(status.get("sessions").asInt64(), 3);
  EXPECT_EQ(status.get("queued").asInt64(), 4);
  EXPECT_EQ(status.get("recorder_handed_over").asInt64(), 10);
  EXPECT_EQ(status.get("recorder_committed").asInt64(), 7);
  EXPECT_EQ(status.get("recorder_waiting").asInt64(), 2);
  EXPECT_EQ(status.get("recorder_expired").asInt64(), 5);
  EXPECT_EQ(status.get("recorder_failed").asInt64(), 1);
  EXPECT_EQ(status.get("recorder_lost_before").asInt64(), 6);
}

TEST(Ledger, CountsRefusalsAndCutsByReason) {
  Ledger ledger;
  ledger.countRefusal(wire::ErrorCode::BadArguments);
  ledger.countRefusal(wire::ErrorCode::BadArguments);
  ledger.countCut(CutReason::UnreadReplies);
  const auto status = ledger.status(0, 0, {});
  EXPECT_EQ(plist::description(status.get("requests_refused")),
            "{unknown_operation = 0; bad_arguments = 2; not_property_list = 0; over_quota = 0; out_of_memory = 0; "
            "admin_only = 0}");
  EXPECT_EQ(plist::description(status.get("connections_cut")),
            "{unreadable_frame = 0; oversize_frame = 0; unread_replies = 1; half_frame = 0; stale_frame = 0; reset = "
            "0; out_of_memory = 0}");
}

TEST(Ledger, EachMessageIsInOneMember) {
  Ledger ledger;
  ledger.messagesReceived = 100;
  ledger.messagesOverQuota = 4;
  ServiceCounts service;
  service.delivered = 40;
  service.redundant = 20;
  service.unwanted = 10;
  service.undeliverable = 5;
  service.withoutSession = 8;
  service.refused = 3;
  const auto status = ledger.status(service, 0, {});
  EXPECT_EQ(status.get("messages_delivered").asInt64(), 40);
  EXPECT_EQ(status.get("messages_redundant").asInt64(), 20);
  EXPECT_EQ(status.get("messages_unwanted").asInt64(), 10);
  EXPECT_EQ(status.get("messages_undeliverable").asInt64(), 5);
  EXPECT_EQ(status.get("messages_without_session").asInt64(), 8);
  EXPECT_EQ(status.get("messages_refused").asInt64(), 7);
  EXPECT_EQ(status.get("messages_waiting").asInt64(), 10);
}

TEST(Ledger, TellsWhatTheLogsOfSessionsTake) {
  ServiceCounts service;
  service.logs = {1000, 2000, 3, 4, 5};
  const auto status = Ledger().status(service, 0, {});
  EXPECT_EQ(status.get("log_bytes").asInt64(), 1000);
  EXPECT_EQ(status.get("log_overflow_bytes").asInt64(), 2000);
  EXPECT_EQ(status.get("log_overflow_sessions").asInt64(), 3);
  EXPECT_EQ(status.get("log_overflow_failures").asInt64(), 4);
  EXPECT_EQ(status.get("log_messages_lost").asInt64(), 5);
}

TEST(DescriptorLimit, LeavesRoomForTheRestOfTheProcess) {
  EXPECT_EQ(connectionsWithin(1024), 960u);
  EXPECT_EQ(connectionsWithin(129), 65u);
  EXPECT_EQ(connectionsWithin(128), 64u);
  EXPECT_EQ(connectionsWithin(1), 1u);
}

TEST(DescriptorLimit, IsRaisedAsFarAsTheSystemLets) {
  const auto raised = raiseDescriptorLimit();
  EXPECT_EQ(raiseDescriptorLimit(), raised);
  EXPECT_GE(raised, 256u);
}

}  // namespace
}  // namespace tarn::linux_host
