// SPDX-License-Identifier: Apache-2.0
#include "host/socket/Quotas.h"

#include <cstdint>

namespace tarn::linux_host {

namespace {

// Users that are told; `status` stays small however many there are.
constexpr std::size_t kMostUsers = 64;

}  // namespace

std::string overQuota(std::string_view quota, std::size_t use, std::size_t limit) {
  return "over quota: " + std::string(quota) + " " + std::to_string(use) + " of " + std::to_string(limit);
}

bool beyondRate(MessageRate& rate, std::size_t limit, std::int64_t second) noexcept {
  if (limit == 0) return false;
  if (rate.second != second) {
    rate = {second, 0};
  }
  if (rate.messages >= limit) return true;
  ++rate.messages;
  return false;
}

plist::Dictionary quotaStatus(const HostLimits::Quotas& quotas, const FairShares& shares,
                              std::optional<std::uint32_t> onlyUser) {
  const plist::Dictionary limits{{"connections_per_user", quotas.connectionsPerUser},
                                 {"sessions_per_connection", quotas.sessionsPerConnection},
                                 {"sessions_per_user", quotas.sessionsPerUser},
                                 {"waiting_bytes_per_user", quotas.waitingBytesPerUser},
                                 {"waiting_bytes", quotas.waitingBytes},
                                 {"log_bytes_per_connection", quotas.logBytesPerConnection},
                                 {"log_bytes_per_user", quotas.logBytesPerUser},
                                 {"messages_per_second_per_connection", quotas.messagesPerSecondPerConnection},
                                 {"messages_per_second_per_user", quotas.messagesPerSecondPerUser}};
  plist::Dictionary users;
  shares.forEachParty([&](const ShareParty& party) {
    if (users.size() == kMostUsers || party.user != onlyUser.value_or(party.user)) return;
    const plist::Dictionary use{{"connections", party.connections},
                                {"sessions", party.sessions},
                                {"waiting_bytes", party.waitingBytes},
                                {"log_bytes", party.logBytes},
                                {"log_bytes_of_one_connection", party.largestLog}};
    users.set(plist::Key(std::to_string(party.user)), use);
  });
  return {{"limits", limits}, {"users", users}};
}

}  // namespace tarn::linux_host
