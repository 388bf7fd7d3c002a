// SPDX-License-Identifier: Apache-2.0
#include "host/socket/UserSessions.h"

namespace tarn::linux_host {

std::optional<std::uint16_t> UserSessions::serviceTypeOf(std::uint32_t user, std::int64_t reporterID) const {
  auto entry = clients_.lower_bound({user, Place().connection});
  for (; entry != clients_.end() && entry->first.first == user; ++entry) {
    const auto client = entry->second.lock();
    if (const auto type = client ? client->serviceTypeOf(reporterID) : std::nullopt) return type;
  }
  return std::nullopt;
}

bool UserSessions::list(std::uint32_t user, Place& place, std::size_t atMost,
                        std::vector<std::int64_t>& reporters) const {
  const auto entry = clients_.lower_bound({user, place.connection});
  if (entry == clients_.end() || entry->first.first != user) return false;
  if (entry->first.second != place.connection) {
    place = {entry->first.second, 0};
  }
  const auto client = entry->second.lock();
  if (client == nullptr || !client->listReporterIDs(place.session, atMost, reporters)) {
    place = {place.connection + 1, 0};
  }
  return true;
}

}  // namespace tarn::linux_host
