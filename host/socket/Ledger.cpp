// SPDX-License-Identifier: Apache-2.0
#include "host/socket/Ledger.h"

#include <span>
#include <string_view>

namespace tarn::linux_host {

namespace {

constexpr std::array<std::string_view, wire::kErrorCodes> kRefusalNames{
    "unknown_operation", "bad_arguments", "not_property_list", "over_quota", "out_of_memory", "admin_only"};
constexpr std::array<std::string_view, kCutReasons> kCutNames{
    "unreadable_frame", "oversize_frame", "unread_replies", "half_frame", "stale_frame", "reset", "out_of_memory"};

plist::Dictionary byReason(std::span<const std::string_view> names, std::span<const std::uint64_t> counts) {
  plist::Dictionary dictionary;
  for (std::size_t i = 0; i < names.size(); ++i) {
    dictionary.set(names[i], counts[i]);
  }
  return dictionary;
}

}  // namespace

plist::Dictionary Ledger::status(const ServiceCounts& service, std::uint64_t queued,
                                 const RecorderCounts& recorder) const {
  const auto refused = byReason(kRefusalNames, requestsRefused);
  const auto cut = byReason(kCutNames, connectionsCut);
  return {{"frames_received", framesReceived},
          {"messages_received", messagesReceived},
          {"messages_delivered", service.delivered},
          {"messages_redundant", service.redundant},
          {"messages_unwanted", service.unwanted},
          {"messages_undeliverable", service.undeliverable},
          {"messages_without_session", service.withoutSession},
          {"messages_refused", service.refused + messagesOverQuota},
          {"messages_waiting", messagesReceived - messagesOverQuota - service.dealtWith()},
          {"replies_sent", repliesSent},
          {"replies_dropped", repliesDropped},
          {"questions_dropped", questionsDropped},
          {"requests_refused", refused},
          {"connections_open", connectionsOpen},
          {"connections_total", connectionsTotal},
          {"connections_cut", cut},
          {"accept_pauses", acceptPauses},
          {"sessions", service.sessions},
          {"queued", queued},
          {"log_bytes", service.logs.bytes},
          {"log_overflow_bytes", service.logs.overflowBytes},
          {"log_overflow_sessions", service.logs.overflowing},
          {"log_overflow_failures", service.logs.failures},
          {"log_messages_lost", service.logs.lost},
          {"recorder_handed_over", recorder.handedOver},
          {"recorder_committed", recorder.committed},
          {"recorder_waiting", recorder.waiting},
          {"recorder_expired", recorder.expired},
          {"recorder_failed", recorder.failed},
          {"recorder_lost_before", recorder.lostBefore}};
}

}  // namespace tarn::linux_host
