#include "host/socket/Ledger.h"

#include <span>
#include <string_view>

namespace tarn::linux_host {

namespace {

constexpr std::array<std::string_view, 3> kRefusalNames{"unknown_operation", "bad_arguments", "not_property_list"};
constexpr std::array<std::string_view, kCutReasons> kCutNames{"unreadable_frame", "oversize_frame", "unread_replies",
                                                              "half_frame", "reset"};

plist::Dictionary byReason(std::span<const std::string_view> names, std::span<const std::uint64_t> counts) {
  plist::Dictionary dictionary;
  for (std::size_t i = 0; i < names.size(); ++i) {
    dictionary.set(names[i], counts[i]);
  }
  return dictionary;
}

}  // namespace

plist::Dictionary Ledger::status(std::uint64_t sessions, std::uint64_t queued, const RecorderCounts& recorder) const {
  const auto refused = byReason(kRefusalNames, requestsRefused);
  const auto cut = byReason(kCutNames, connectionsCut);
  return {{"frames_received", framesReceived},
          {"messages_received", messagesReceived},
          {"replies_sent", repliesSent},
          {"replies_dropped", repliesDropped},
          {"requests_refused", refused},
          {"connections_open", connectionsOpen},
          {"connections_total", connectionsTotal},
          {"connections_cut", cut},
          {"accept_pauses", acceptPauses},
          {"sessions", sessions},
          {"queued", queued},
          {"recorder_handed_over", recorder.handedOver},
          {"recorder_committed", recorder.committed},
          {"recorder_waiting", recorder.waiting},
          {"recorder_expired", recorder.expired},
          {"recorder_failed", recorder.failed},
          {"recorder_lost_before", recorder.lostBefore}};
}

}  // namespace tarn::linux_host
